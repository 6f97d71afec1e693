// emit_headers.cpp - the public header of a namespace: its enumerations and classes.
#include <map>

#include "emit.h"

namespace {

// How C++ holds a member.
std::string held_type(const class_member &member)
{
    switch (member.how) {
    case occurs::value:
    case occurs::always:
        return member.type + " ";
    case occurs::optional:
    case occurs::required:
        return member.type + " *";
    case occurs::many:
        break;
    }
    return "std::vector<" + member.type + (member.form == held::object ? " *" : "") + "> ";
}

// The start of a member; vectors and texts start empty.
std::string start_of(const class_member &member)
{
    if (member.how == occurs::optional || member.how == occurs::required)
        return " = nullptr";
    return member.initial.empty() ? "" : " = " + member.initial;
}

std::string comment_of(const class_member &member)
{
    std::string text = member.documentation;
    const auto add = [&](const std::string &more) { text += (text.empty() ? "" : " ") + more; };
    if (member.how == occurs::required || member.how == occurs::value)
        add("Required.");
    if (member.how == occurs::many && member.minimum > 0)
        add("At least " + std::to_string(member.minimum) + ".");
    return text;
}

std::string enumeration_text(const enumeration &type)
{
    std::string text = comment(type.documentation);
    text += "enum class " + type.name + " : int {\n";
    for (const literal &literal : type.literals) {
        std::string note = literal.documentation;
        if (literal.name != literal.text)
            note.insert(0, string_literal(literal.text) + (note.empty() ? "" : ": "));
        text += documented(literal.name + ",", note, "    ");
    }
    return text + "};\n\n";
}

std::string class_text(const data_class &type)
{
    const bool root = type.base.empty();
    std::string text = comment(type.documentation);
    text += "class ZUV_CLASS " + type.name + (root ? "" : " : public " + type.base) + " {\npublic:\n";
    if (type.simple_content)
        text += "    std::string value; // the text of the element\n";
    for (const class_attribute &attribute : type.attributes) {
        const std::string declaration = attribute.required
                                            ? attribute.type + " " + attribute.name + "{};"
                                            : attribute.type + " *" + attribute.name + " = nullptr;";
        text += documented(declaration, attribute.documentation, "    ");
    }
    for (const class_member &member : type.members)
        text +=
            documented(held_type(member) + member.name + start_of(member) + ";", comment_of(member), "    ");
    if (root)
        text += "    struct soap *soap = nullptr; // the context that made the object, or null\n";
    text += type.members.empty() && type.attributes.empty() && !root ? "    " : "\n    ";
    text +=
        std::string(root ? "SOAP_CLASS_OPERATIONS(" : "SOAP_DERIVED_CLASS_OPERATIONS(") + type.name + ")\n";
    return text + "};\n\n";
}

// What a header needs before its own declarations.
struct needs {
    std::set<std::string> headers;     // of the library
    std::set<std::string> standard;    // of C++
    std::map<std::string, bool> names; // of other declarations: true for an enumeration
};

needs needs_of(const service_namespace &service)
{
    needs needs{{"soap_class", "type_ids"}, {}, {}};
    for (const data_class &type : service.classes) {
        needs.names.emplace(type.name, false);
        if (!type.base.empty() && type.base_prefix != service.prefix)
            needs.headers.insert(type.base_prefix);
        if (type.simple_content)
            needs.standard.insert("string");
        for (const class_attribute &attribute : type.attributes) {
            if (attribute.type_prefix != service.prefix)
                needs.names.emplace(attribute.type, true);
        }
        for (const class_member &member : type.members) {
            if (member.form == held::text)
                needs.standard.insert("string");
            if (member.how == occurs::many)
                needs.standard.insert("vector");
            if (member.form == held::object || member.form == held::binary)
                needs.names.emplace(member.type, false);
            if (member.form == held::code && member.type_prefix != service.prefix) {
                needs.names.emplace(member.type, true);
                if (!member.initial.empty())
                    needs.headers.insert(member.type_prefix);
            }
        }
    }
    return needs;
}

} // namespace

emitted_file emit_service_header(const service_namespace &service)
{
    const needs needs = needs_of(service);
    std::string text = opening(service.prefix + ".h", service.file, service.documentation);
    text += "#pragma once\n\n#include <cstddef>\n";
    for (const std::string &name : needs.standard)
        text += "#include <" + name + ">\n";
    text += "\n" + public_includes(needs.headers) + "\n";
    for (const auto &[name, code] : needs.names)
        text += code ? "enum class " + name + " : int;\n" : "class " + name + ";\n";
    text += "\n";
    for (const enumeration &type : service.enumerations)
        text += enumeration_text(type);
    for (const data_class &type : service.classes)
        text += class_text(type);
    text += comment("Makers of managed objects; see soap_class.h.");
    for (const data_class &type : service.classes)
        text += "SOAP_CLASS_MAKER(" + type.name + ")\n";
    return {"include/zuv_client_pro/" + service.prefix + ".h", text};
}
