// check_command.cpp - see check_command.h.
#include "check_command.h"

#include <cstdio>
#include <sstream>

#include <pugixml.hpp>
#include <zuv_client_pro/soap_registry.h>

#include "check.h"
#include "documents.h"
#include "failure.h"
#include "json.h"
#include "new_command.h"
#include "text_files.h"

namespace cli {

namespace {

// The document under its class's name, by which the library knows what to read.
std::string under_class_name(const std::string &xml, const contract::data_class &type)
{
    pugi::xml_document document;
    document.load_buffer(xml.data(), xml.size(), pugi::parse_full, pugi::encoding_utf8);
    pugi::xml_node root = document.document_element();
    const std::string_view name = type.name;
    const std::string prefix(name.substr(0, name.find(':')));
    for (const soap_namespace *row = soap_program_namespaces; row->prefix != nullptr; ++row)
        if (prefix == row->prefix) {
            const std::string declaration = "xmlns:" + prefix;
            root.remove_attribute(declaration.c_str());
            root.append_attribute(declaration.c_str()) = row->uri;
        }
    root.set_name(type.name);
    std::ostringstream text;
    document.save(text, "", pugi::format_raw);
    return text.str();
}

// Why the library's strict reader refuses a document that the contract allows; empty if it doesn't.
std::string reader_problem(const std::string &xml, const contract::data_class &type)
{
    document_reader reader;
    std::string problem;
    int id = 0;
    reader.read(
        under_class_name(xml, type), [&id](soap *ctx) { return soap_read_element(ctx, &id); }, problem);
    return problem;
}

bool check_file(const std::string &file, const contract::data_class *expected)
{
    const std::string name = file == "-" ? "standard input" : printable(file);
    const std::string given = read_file(file);
    std::string xml = given;
    if (is_json(given)) {
        try {
            if (expected == nullptr)
                throw failure(EXIT_DOCUMENT, name + ": JSON doesn't name its class: give it by --class");
            xml = xml_of(given, *expected, name);
        } catch (const failure &problem) {
            std::fprintf(stderr, "%s\n", problem.what());
            return false;
        }
    }
    const checked_document checked = check_document(xml, expected);
    std::string problems = finding_lines(name, checked.findings);
    if (checked.findings.empty() && checked.type != nullptr) {
        const std::string problem = reader_problem(xml, *checked.type);
        if (!problem.empty())
            problems = name + ": the library refuses it: " + problem + "\n";
    }
    std::fputs(problems.c_str(), stderr);
    if (problems.empty())
        std::printf("%s: valid, %s\n", name.c_str(),
                    checked.type != nullptr ? checked.type->name : "a SOAP message");
    return problems.empty();
}

} // namespace

exit_code check_files(const std::vector<std::string> &files, const std::string &class_name)
{
    const contract::data_class *const expected = class_name.empty() ? nullptr : &class_named(class_name);
    bool valid = true;
    for (const std::string &file : files)
        valid = check_file(file, expected) && valid;
    return valid ? EXIT_DONE : EXIT_DOCUMENT;
}

} // namespace cli
