// contract_files.h - the contract as the service hands it out: its files as they stand, and the WSDL of each
// port at the port's own address, from where a toolkit finds all the rest.
#pragma once

#include <span>
#include <string>
#include <string_view>

namespace service {

constexpr std::string_view CONTRACT_PATH = "/zuv/v1.0/contract/";

struct contract_file {
    std::string_view name; // such as "profile/profile.xsd", also below CONTRACT_PATH
    std::string_view text;
};

// All files of the contract, for ever; the build makes them part of the program.
std::span<const contract_file> contract_files();

// What stands at a path with its query: a file below CONTRACT_PATH, or the WSDL of a port, asked for by the
// query "wsdl". Empty for anything else. In the WSDL the ports have addresses below `root`, the URL of this
// service as the client named it, "http://host:9080"; one that is no plain URL is left out.
std::string contract_document(std::string_view path_and_query, std::string_view root);

} // namespace service
