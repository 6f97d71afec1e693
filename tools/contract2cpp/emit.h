// emit.h - the emit stage: the model to files of C++.
//
// Here: what the emitters share. Elsewhere: public headers of the types (emit_headers.cpp), member lists and
// class units (emit_classes.cpp), type ids and registry (emit_types.cpp), ports (emit_ports.cpp), clients of
// the ports (emit_clients.cpp), data for the command line (emit_description.cpp).
//
// Always: the text depends on the model and the authority alone.
#pragma once

#include <filesystem>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "model.h"

struct emitted_file {
    std::string path; // below the output directory
    std::string text;
};

// All files of the program. `authority` stands for CONTRACT_AUTHORITY in the URIs of the namespace table.
std::vector<emitted_file> emit_contract(const contract_model &model, const std::string &authority);

// The families of files.
emitted_file emit_type_ids(const contract_model &model);
emitted_file emit_service_header(const service_namespace &service);
emitted_file emit_traits_header(const service_namespace &service);
std::vector<emitted_file> emit_class_units(const contract_model &model, const service_namespace &service);
emitted_file emit_class_list(const contract_model &model);
emitted_file emit_registry_tables(const contract_model &model);
std::vector<emitted_file> emit_namespace_table(const contract_model &model, const std::string &authority);
std::vector<emitted_file> emit_port(const port &port);
std::vector<emitted_file> emit_clients(const contract_model &model);
std::vector<emitted_file> emit_description(const contract_model &model);

// Writes a file below a directory, which is created if needed. contract_error if that fails.
void write_file(const std::filesystem::path &directory, const emitted_file &file);

inline constexpr std::string_view CONTRACT_AUTHORITY = "http://www.zuv.example";

// A file's opening comment: what it was made from, then `about`.
std::string opening(std::string_view file, const std::string &source, const std::string &about);
// Text as lines of comment, wrapped; empty for no text.
std::string comment(const std::string &text, std::string_view indent = "");
// A declaration with its comment: after it if the line is long enough, else above.
std::string documented(const std::string &declaration, const std::string &text, std::string_view indent);
// A string literal of C++.
std::string string_literal(std::string_view text);
// Parts with a separator between them.
std::string joined(const std::vector<std::string> &parts, std::string_view separator);
// #include lines for headers of the project, <...> and sorted.
std::string public_includes(const std::set<std::string> &names);
