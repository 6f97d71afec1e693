// emit_description.cpp - the contract as data for the command line: its operations as a list of macros, its
// types as data with their documentation.
//
// Elsewhere: the records that the data fills, and what is done with them (cli/contract.h).
#include <map>
#include <sstream>

#include "emit.h"

namespace {

constexpr std::string_view LIST = "operation_list.h", DESCRIPTION = "contract_description.cpp";

// A literal of a text, each run of white space as one blank.
std::string words_literal(const std::string &text)
{
    std::istringstream words(text);
    std::string line;
    for (std::string word; words >> word;)
        line += (line.empty() ? "" : " ") + word;
    return string_literal(line);
}

std::string macro(const std::string &name, const std::vector<std::string> &rows)
{
    std::string text = "\n#define " + name + "(X)";
    for (const std::string &row : rows)
        text += " \\\n    X(" + row + ")";
    return text + "\n";
}

std::string operation_row(const port &port, const operation &operation)
{
    return joined({port.name, operation.name, operation.request.object, operation.request.name,
                   string_literal(operation.request.element), operation.response.object,
                   operation.response.name, string_literal(operation.response.element),
                   words_literal(operation.documentation)},
                  ", ");
}

emitted_file operation_list(const contract_model &model)
{
    std::set<std::string> headers;
    std::vector<std::string> with_proxy, without_proxy, ports;
    for (const port &port : model.ports) {
        headers.insert(port.binding + (port.proxy ? "Proxy" : ""));
        ports.push_back(joined({port.name, string_literal(port.address), port.proxy ? "true" : "false",
                                words_literal(port.documentation)},
                               ", "));
        for (const operation &operation : port.operations)
            (port.proxy ? with_proxy : without_proxy).push_back(operation_row(port, operation));
    }
    return {"tools/" + std::string(LIST),
            opening(LIST, "the WSDL files",
                    "Every port: name, address, whether it has a proxy class, documentation. Every "
                    "operation: port, name, class "
                    "and record and element of the request, the same of the response, documentation.") +
                "#pragma once\n\n" + public_includes(headers) + macro("PORTS", ports) +
                macro("OPERATIONS_WITH_PROXY", with_proxy) +
                macro("OPERATIONS_WITHOUT_PROXY", without_proxy)};
}

using type_names = std::map<std::string, std::string>; // XML type by the constant of its id

std::string member_row(const class_member &member, const type_names &types)
{
    const bool required = member.how == occurs::required || member.how == occurs::value;
    const std::string initial = member.how == occurs::always ? member.initial : "";
    return "{" +
           joined({string_literal(member.tag), string_literal(types.at(member.item_id)),
                   std::to_string(member.how == occurs::many ? member.minimum
                                  : required                 ? 1U
                                                             : 0U),
                   member.how == occurs::many ? "true" : "false", string_literal(initial),
                   words_literal(member.documentation)},
                  ", ") +
           "}";
}

std::string attribute_row(const class_attribute &attribute,
                          const std::map<std::string, std::string> &enumerations)
{
    return "{" +
           joined({string_literal(attribute.xml_name), string_literal(enumerations.at(attribute.type)),
                   attribute.required ? "true" : "false", words_literal(attribute.documentation)},
                  ", ") +
           "}";
}

// A named array with the rows, or nothing; and what names it in a span.
std::string rows_of(const std::string &type, const std::string &name, const std::vector<std::string> &rows)
{
    return rows.empty() ? ""
                        : "const " + type + " " + name + "[] = {\n    " + joined(rows, ",\n    ") + "};\n";
}
std::string span_of(const std::string &name, bool empty)
{
    return empty ? "{}" : name;
}

std::string class_data(const data_class &described, const type_names &types,
                       const std::map<std::string, std::string> &enumerations)
{
    std::vector<std::string> members, attributes;
    for (const class_member &member : described.members)
        members.push_back(member_row(member, types));
    for (const class_attribute &attribute : described.attributes)
        attributes.push_back(attribute_row(attribute, enumerations));
    return rows_of("member", "members_" + described.name, members) +
           rows_of("attribute", "attributes_" + described.name, attributes);
}

std::string class_row(const data_class &described, const std::map<std::string, std::string> &classes)
{
    const std::string base = described.base.empty() ? "" : classes.at(described.base);
    return "    {" +
           joined({string_literal(described.xml_type), string_literal(base),
                   described.simple_content ? "true" : "false", words_literal(described.documentation),
                   span_of("members_" + described.name, described.members.empty()),
                   span_of("attributes_" + described.name, described.attributes.empty())},
                  ", ") +
           "},\n";
}

std::string enumeration_data(const enumeration &described)
{
    std::vector<std::string> words;
    for (const literal &word : described.literals)
        words.push_back("{" + string_literal(word.text) + ", " + words_literal(word.documentation) + "}");
    return rows_of("word", "words_" + described.name, words);
}

std::string enumeration_row(const enumeration &described)
{
    return "    {" +
           joined({string_literal(described.xml_type), words_literal(described.documentation),
                   span_of("words_" + described.name, described.literals.empty())},
                  ", ") +
           "},\n";
}

emitted_file description(const contract_model &model)
{
    type_names types;
    for (const identified_type &type : model.types)
        types[type.constant] = type.xml_name;
    std::map<std::string, std::string> classes, enumerations; // XML type by C++ name
    std::string data, class_rows, enumeration_rows;
    for (const service_namespace &service : model.services)
        for (const enumeration &described : service.enumerations) {
            enumerations[described.name] = described.xml_type;
            data += enumeration_data(described);
            enumeration_rows += enumeration_row(described);
        }
    for (const service_namespace &service : model.services)
        for (const data_class &described : service.classes)
            classes[described.name] = described.xml_type;
    for (const service_namespace &service : model.services)
        for (const data_class &described : service.classes) {
            data += class_data(described, types, enumerations);
            class_rows += class_row(described, classes);
        }
    return {"tools/" + std::string(DESCRIPTION),
            opening(DESCRIPTION, "the contract", "") +
                "#include \"contract.h\"\n\nnamespace contract {\n\nnamespace {\n\n" + data +
                "\nconst data_class class_rows[] = {\n" + class_rows +
                "};\n\nconst enumeration enumeration_rows[] = {\n" + enumeration_rows +
                "};\n\n} // namespace\n\nconst std::span<const data_class> classes = class_rows;\n"
                "const std::span<const enumeration> enumerations = enumeration_rows;\n\n} // namespace "
                "contract\n"};
}

} // namespace

std::vector<emitted_file> emit_description(const contract_model &model)
{
    return {operation_list(model), description(model)};
}
