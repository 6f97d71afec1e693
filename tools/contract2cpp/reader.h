// reader.h - the read stage: the files of the contract to declarations.
//
// Always: what can't be translated is refused, with its place. Whatever isn't known to be harmless is
// refused too.
#pragma once

#include <filesystem>

#include "declarations.h"

// Reads namespaces.txt, type_ids.txt and every XSD and WSDL below a directory, in the order of their names.
contract_declarations read_contract(const std::filesystem::path &directory);

// Single files. `name` is what messages call the file.
std::vector<namespace_declaration> read_namespaces(const std::filesystem::path &path,
                                                   const std::string &name);
std::vector<type_id_declaration> read_type_ids(const std::filesystem::path &path, const std::string &name);
schema_declaration read_schema(const std::filesystem::path &path, const std::string &name);
port_declaration read_port(const std::filesystem::path &path, const std::string &name);

// The bytes of a file; contract_error if it can't be read.
std::string read_bytes(const std::filesystem::path &path, const std::string &name);
