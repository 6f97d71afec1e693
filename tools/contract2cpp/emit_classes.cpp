// emit_classes.cpp - the member lists of a namespace's classes, and the units that define the classes from
// them.
#include <map>

#include "emit.h"
#include "layout.h"

namespace {

std::string element_row(const class_member &member)
{
    static const std::map<occurs, std::string> makers = {{occurs::optional, "optional"},
                                                         {occurs::required, "required"},
                                                         {occurs::value, "required"},
                                                         {occurs::always, "always"},
                                                         {occurs::many, "many"}};
    std::vector<std::string> arguments = {string_literal(member.tag), "&self::" + member.name,
                                          member.item_id};
    if (member.how == occurs::many) {
        arguments.push_back(member.vector_id);
        if (member.minimum > 0)
            arguments.push_back(std::to_string(member.minimum));
    } else if (!member.initial.empty()) {
        arguments.push_back(member.initial);
    }
    return makers.at(member.how) + "(" + joined(arguments, ", ") + ")";
}

std::string tuple(const std::vector<std::string> &rows)
{
    return rows.empty() ? "std::make_tuple()"
                        : "std::make_tuple(\n        " + joined(rows, ",\n        ") + ")";
}

std::string traits_text(const data_class &type)
{
    std::vector<std::string> attributes, elements;
    for (const class_attribute &attribute : type.attributes)
        attributes.push_back("attribute{" + string_literal(attribute.xml_name) + ", &self::" +
                             attribute.name + ", " + (attribute.required ? "true" : "false") + "}");
    for (const class_member &member : type.members)
        elements.push_back(element_row(member));
    return "template <> struct traits<" + type.name + "> {\n" + "    using self = " + type.name + ";\n" +
           "    using base = " + (type.base.empty() ? "void" : type.base) + ";\n" +
           "    static constexpr int type_id = " + type.type_id + ";\n" +
           "    static constexpr char xml_type[] = " + string_literal(type.xml_type) + ";\n" +
           "    static constexpr bool global_element = " + (type.top_level ? "true" : "false") + ";\n" +
           "    static constexpr std::string self::*text = " +
           (type.simple_content ? "&self::value" : "nullptr") + ";\n" +
           "    static constexpr auto attributes = " + tuple(attributes) + ";\n" +
           "    static constexpr auto elements = " + tuple(elements) + ";\n" +
           "    static const class_ops ops;\n" + "};\n";
}

std::string enumeration_traits(const enumeration &type)
{
    const std::string count = std::to_string(type.literals.size());
    return "template <> struct enum_traits<" + type.name + "> {\n" +
           "    static constexpr int type_id = " + type.type_id + ";\n" +
           "    static constexpr char xml_type[] = " + string_literal(type.xml_type) + ";\n" +
           "    static constexpr std::uint32_t count = " + count + ";\n" +
           "    static const soap_code_row codes[count + 1]; // ends with a null name\n" + "};\n";
}

std::string codes_text(const enumeration &type)
{
    std::string text = "const soap_code_row enum_traits<" + type.name + ">::codes[] = {\n";
    for (std::size_t code = 0; code < type.literals.size(); ++code)
        text += "    {" + std::to_string(code) + ", " + string_literal(type.literals[code].text) + "},\n";
    return text + "    {0, nullptr},\n};\n";
}

const data_class *class_of(const contract_model &model, const std::string &name)
{
    for (const service_namespace &service : model.services) {
        for (const data_class &type : service.classes) {
            if (type.name == name)
                return &type;
        }
    }
    return nullptr;
}

// Namespaces whose member lists the rules of a class look into: its own, its bases' and those of all members.
std::set<std::string> traits_needed(const contract_model &model, const data_class &type)
{
    std::set<std::string> prefixes;
    for (const data_class *part = &type; part; part = class_of(model, part->base)) {
        prefixes.insert(part->prefix);
        for (const class_attribute &attribute : part->attributes)
            prefixes.insert(attribute.type_prefix);
        for (const class_member &member : part->members) {
            if (member.form == held::object || member.form == held::code)
                prefixes.insert(member.type_prefix);
        }
    }
    return prefixes;
}

emitted_file emit_class_unit(const contract_model &model, const service_namespace &service, std::size_t unit,
                             std::size_t first, std::size_t last)
{
    const std::string name = "classes_" + service.prefix + "_" + std::to_string(unit) + ".cpp";
    std::set<std::string> traits = {service.prefix};
    for (std::size_t i = first; i < last; ++i)
        traits.merge(traits_needed(model, service.classes[i]));
    std::string text = opening(name, service.file, "");
    text += "#include \"binding/class_rules.h\"\n";
    for (const std::string &prefix : traits)
        text += "#include \"traits_" + prefix + ".h\"\n";
    if (unit == 1 && !service.enumerations.empty()) {
        text += "\nnamespace binding {\n\n";
        for (const enumeration &type : service.enumerations)
            text += codes_text(type);
        text += "\n} // namespace binding\n";
    }
    text += "\n";
    for (std::size_t i = first; i < last; ++i)
        text += "BINDING_DEFINE_CLASS(" + service.classes[i].name + ")\n";
    return {"src/" + name, text};
}

} // namespace

emitted_file emit_traits_header(const service_namespace &service)
{
    const std::string name = "traits_" + service.prefix + ".h";
    std::set<std::string> headers = {service.prefix, "type_ids"};
    for (const data_class &type : service.classes) {
        for (const class_member &member : type.members) {
            if (member.form == held::binary)
                headers.insert("soap_binary");
        }
    }
    std::string text = opening(name, service.file, "The member lists of the classes, in wire order.");
    text += "#pragma once\n\n" + public_includes(headers) +
            "\n#include \"binding/traits.h\"\n\nnamespace binding {\n\n";
    for (const enumeration &type : service.enumerations)
        text += enumeration_traits(type);
    for (const data_class &type : service.classes)
        text += traits_text(type);
    return {"src/" + name, text + "\n} // namespace binding\n"};
}

std::vector<emitted_file> emit_class_units(const contract_model &model, const service_namespace &service)
{
    const std::size_t count = service.classes.size();
    const std::size_t units = count == 0 ? 1 : (count + CLASSES_PER_UNIT - 1) / CLASSES_PER_UNIT;
    std::vector<emitted_file> files;
    for (std::size_t unit = 0; unit < units; ++unit)
        files.push_back(
            emit_class_unit(model, service, unit + 1, count * unit / units, count * (unit + 1) / units));
    return files;
}
