// contract_files.h - the contract as the service hands it out: its files, the WSDL of each port at the port's
// own address, and one that leads to these at the service's. Each link in them is a whole URL of this
// service, without dots for a toolkit to resolve, and so are the addresses of the ports.
#pragma once

#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "request_target.h"

namespace service {

constexpr std::string_view CONTRACT_PATH = "/zuv/v1.0/contract/";

struct contract_file {
    std::string_view name; // such as "profile/profile.xsd", also below CONTRACT_PATH
    std::string_view text;
};

// All files of the contract; the build makes them part of the program, so they live as long as it.
std::span<const contract_file> contract_files();

// A document of XML: a file below CONTRACT_PATH; at the path of a port its WSDL, with the query "wsdl" in
// capitals or small letters or with none; at "/" with that query what leads to all. Empty for anything else.
std::string contract_document(const request_target &target);

// Namespaces of the schemas that declare an element of this local name, each once.
std::vector<std::string_view> namespaces_of_element(std::string_view local_name);

// Items of an HTML list that lead to the WSDLs of the ports and to the files.
std::string contract_links(const request_target &target);

} // namespace service
