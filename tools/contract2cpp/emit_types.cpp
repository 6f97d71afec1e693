// emit_types.cpp - the type ids, the tables of dispatch by type id, and the namespace tables.
#include <map>

#include "emit.h"

namespace {

// A row of the table of types; fields that stay at their defaults are left out.
std::string type_row(const identified_type &type)
{
    static const std::map<std::string, std::string> simple = {{"xsd:int", "simple_int"},
                                                              {"xsd:byte", "simple_byte"},
                                                              {"xsd:unsignedInt", "simple_unsigned_int"},
                                                              {"xsd:unsignedByte", "simple_unsigned_byte"},
                                                              {"xsd:boolean", "simple_boolean"},
                                                              {"xsd:double", "simple_double"}};
    const auto row = [&](const std::string &kind, const std::string &more) {
        return "{.kind = type_kind::" + kind + ", .xml_name = " + string_literal(type.xml_name) + more + "}";
    };
    switch (type.kind) {
    case id_kind::primitive: {
        const auto found = simple.find(type.xml_name);
        return found == simple.end() ? row("chars", "") : row("simple", ", .simple = &" + found->second);
    }
    case id_kind::text:
        return row("text", "");
    case id_kind::binary:
    case id_kind::object:
        return row("object", ", .ops = &traits<" + type.name + ">::ops");
    case id_kind::code:
        return row("enumeration", ", .names = &enum_of<" + type.name + ">");
    case id_kind::vector: {
        const bool text = type.item_name == "std::string";
        const std::string item = type.item_name + (type.item_form == held::object ? " *" : "");
        const std::string kind = text ? "text" : type.item_form == held::object ? "object" : "code";
        return row(kind + "_vector", ", .vector = &vector_of<" + item + ">, .item = " + type.item);
    }
    case id_kind::envelope:
        return row("envelope", ", .item = " + type.constant);
    case id_kind::request:
        return row("request", ", .item = " + type.item + ", .element = " + string_literal(type.element));
    case id_kind::response:
        return row("response", ", .item = " + type.item + ", .element = " + string_literal(type.element));
    case id_kind::pointer:
        return row("pointer", ", .item = " + type.item);
    }
    return {};
}

std::string type_table(const contract_model &model)
{
    std::string text = "static_assert(TYPE_ID_MAX == " + std::to_string(TYPE_ID_MAX) +
                       " && DISPATCH_ID_MAX == " + std::to_string(DISPATCH_ID_MAX) +
                       ");\n\n"
                       "constinit const type_entry type_entries[TYPE_ID_MAX + 1] = {\n";
    auto next = model.types.begin();
    for (int id = 0; id <= TYPE_ID_MAX; ++id) {
        const bool named = next != model.types.end() && next->id == id;
        text += "    " + (named ? type_row(*next) : std::string("{}")) + ", // " + std::to_string(id) + "\n";
        if (named)
            ++next;
    }
    return text + "};\n";
}

bool is_element_name(const identified_type &type)
{
    return type.kind == id_kind::object && type.name[0] == '_' &&
           type.xml_name.find('-') == std::string::npos;
}

// XML types by which xsi:type or an element's name can name a type. If one has two ids, the normal form
// is used.
bool is_type_name(const contract_model &model, const identified_type &type)
{
    if (type.kind == id_kind::primitive) {
        for (const identified_type &other : model.types) {
            if (other.kind == id_kind::text && other.xml_name == type.xml_name)
                return false;
        }
        return true;
    }
    return type.kind == id_kind::text || type.kind == id_kind::binary || type.kind == id_kind::code ||
           (type.kind == id_kind::object && !is_element_name(type));
}

std::string name_table(const std::string &name, const std::vector<const identified_type *> &types)
{
    std::string text = "constexpr auto " + name + " = index_of_names(std::array<type_name, " +
                       std::to_string(types.size()) + ">{{\n";
    for (const identified_type *type : types)
        text += "    {" + string_literal(type->xml_name) + ", " + type->constant + "},\n";
    return text + "}});\n";
}

std::string resolved_uri(const std::string &uri, const std::string &authority)
{
    return uri.starts_with(CONTRACT_AUTHORITY) ? authority + uri.substr(CONTRACT_AUTHORITY.size()) : uri;
}

std::string namespace_rows(const contract_model &model, const std::string &authority)
{
    std::string text;
    for (const namespace_declaration &row : model.table)
        text += "    {" + string_literal(row.prefix) + ", " +
                string_literal(resolved_uri(row.uri, authority)) + ", " +
                (row.pattern.empty() ? "nullptr" : string_literal(row.pattern)) + ", nullptr},\n";
    return text + "    {nullptr, nullptr, nullptr, nullptr},\n";
}

} // namespace

emitted_file emit_type_ids(const contract_model &model)
{
    std::string text =
        opening("type_ids.h", "type_ids.txt",
                "One number for each type that can be on the wire or in the managed lists of a "
                "context. A published number keeps its type.");
    text += "#pragma once\n\n// The type ids. A comment gives the XML name.\nenum soap_type_id : int {\n";
    for (const identified_type &type : model.types)
        text += documented(type.constant + " = " + std::to_string(type.id) + ",", type.xml_name, "    ");
    return {"include/zuv_client_pro/type_ids.h", text + "};\n"};
}

emitted_file emit_class_list(const contract_model &model)
{
    std::string text = opening("class_list.h", "type_ids.txt", "Every class of the contract, by namespace.");
    text += "#pragma once\n\n";
    for (const service_namespace &service : model.services)
        text += "#include \"traits_" + service.prefix + ".h\"\n";
    for (const service_namespace &service : model.services) {
        text += "\n#define CLASSES_OF_" + service.prefix + "(X)";
        for (const data_class &type : service.classes)
            text += " \\\n    X(" + type.name + ")";
        text += "\n";
    }
    return {"src/class_list.h", text};
}

emitted_file emit_registry_tables(const contract_model &model)
{
    std::string text = opening("registry_tables.cpp", "type_ids.txt", "");
    text += "#include <zuv_client_pro/type_ids.h>\n\n#include \"binding/traits_binary.h\"\n#include "
            "\"binding/name_index.h\"\n#include \"binding/registry.h\"\n";
    for (const service_namespace &service : model.services)
        text += "#include \"traits_" + service.prefix + ".h\"\n";
    std::vector<const identified_type *> types, elements;
    for (const identified_type &type : model.types) {
        if (is_element_name(type))
            elements.push_back(&type);
        else if (is_type_name(model, type))
            types.push_back(&type);
    }
    text += "\nnamespace binding {\n\n" + type_table(model) + "\nnamespace {\n\n" +
            name_table("type_storage", types) + name_table("element_storage", elements) +
            "\n} // namespace\n\n";
    text +=
        "constinit const name_index type_index = view_of(type_storage);\n"
        "constinit const name_index element_index = view_of(element_storage);\n\n} // namespace binding\n";
    return {"src/registry_tables.cpp", text};
}

std::vector<emitted_file> emit_namespace_table(const contract_model &model, const std::string &authority)
{
    const std::string about =
        "The namespace table: the program's own, which contexts start from and may change, and one "
        "for each port with a proxy.";
    const std::string rows = namespace_rows(model, authority);
    std::string header = opening("contract_namespaces.h", "namespaces.txt", about);
    header += "#pragma once\n\n#include <zuv_client_pro/soap.h>\n\n";
    std::string source = opening("contract_namespaces.cpp", "namespaces.txt", "");
    source += "#include \"contract_namespaces.h\"\n\nsoap_namespace soap_program_namespaces[] = {\n" + rows +
              "};\n";
    for (const port &port : model.ports) {
        if (!port.proxy)
            continue;
        header += "extern const soap_namespace " + port.name + "_namespaces[];\n";
        source += "\nconst soap_namespace " + port.name + "_namespaces[] = {\n" + rows + "};\n";
    }
    return {{"src/contract_namespaces.h", header}, {"src/contract_namespaces.cpp", source}};
}
