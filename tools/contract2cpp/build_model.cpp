// build_model.cpp - the model stage: declarations to what the program will hold.
//
// In this order: namespaces get their prefixes, type ids their constants, types are collected by name, then
// members, bases and operations are resolved against them. Elsewhere: what a file may hold at all
// (read_xsd.cpp).
#include "model.h"

#include <algorithm>
#include <map>
#include <set>

#include "layout.h"
#include "names.h"
#include "xml_file.h"

namespace {

constexpr std::string_view RESERVED[] = {"soap",     "soap_type", "soap_default", "soap_serialize",
                                         "soap_put", "soap_out",  "soap_get",     "soap_in"};

// A type that an element or attribute can name.
struct known_type {
    place at;
    held form;
    std::string xml_type;
    std::string name; // of C++
    std::string prefix;
    std::string type_id;
    const simple_declaration *simple = nullptr;
    bool simple_content = false;
};

std::string spoken(const qualified_name &name)
{
    return "\"" + name.local + "\" of " + (name.uri.empty() ? "no namespace" : name.uri);
}

class model_builder {
public:
    explicit model_builder(const contract_declarations &declared) : contract(declared) {}
    contract_model build();

private:
    using qualified_key = std::pair<std::string, std::string>;

    void collect_prefixes();
    void collect_type_ids();
    void add_type_id(const type_id_declaration &row);
    std::string free_id() const;
    const std::string &type_id_of(const place &at, const std::string &kind, const std::string &name,
                                  const std::string &what);
    void refuse_unused_type_ids() const;

    void collect_built_in_types();
    void collect_types(const schema_declaration &schema);
    void collect_simple(const std::string &uri, const std::string &local, const simple_declaration &type);
    void collect_class(const std::string &uri, const std::string &local, const complex_declaration &type,
                       bool top_level);
    void add_type(const std::string &uri, const std::string &local, known_type type);
    const known_type &find_type(const qualified_name &name) const;
    const std::string &prefix_of(const std::string &uri, const place &at) const;

    void build_services();
    static enumeration build_enumeration(const known_type &type);
    void add_anonymous(service_namespace &service, const std::string &uri, const complex_declaration &type);
    data_class build_class(const std::string &uri, const known_type &type,
                           const complex_declaration &declared);
    class_attribute build_attribute(const attribute_declaration &declared) const;
    class_member build_member(const std::string &uri, const std::string &owner,
                              const element_declaration &declared);
    void resolve_reference(const element_declaration &declared, class_member &member,
                           const element_declaration *&typed, std::string &uri) const;
    const known_type &member_type(const std::string &uri, const std::string &owner,
                                  const element_declaration &declared) const;
    void give_form(const element_declaration &declared, const known_type &type, class_member &member);
    static std::string initial_of(const place &at, const known_type &type,
                                  const std::optional<std::string> &text);

    void check_members(const data_class &type) const;
    static void check_own_members(const data_class &type);
    static void sort_by_bases(std::vector<data_class> &classes);
    const data_class *find_class(const std::string &name) const;

    void build_ports();
    operation build_operation(const port &owner, const operation_declaration &declared);
    message_record build_record(const port &owner, const operation_declaration &declared,
                                const qualified_name &element, const std::string &kind,
                                const std::string &suffix);
    void describe_types();

    const contract_declarations &contract;
    contract_model model;
    std::map<std::string, std::string> prefixes; // by URI
    std::map<qualified_key, known_type> types;   // by URI and local name; anonymous ones as "Owner-member"
    std::map<qualified_key, known_type> element_types; // types of top-level elements, by the element
    std::map<std::pair<std::string, std::string>, std::size_t> ids; // index of a row by kind and name
    std::map<int, place> id_places;
    std::set<std::size_t> used_ids;
    std::map<std::string, place> class_places; // by C++ name
};

// --- namespaces and type ids ---

void model_builder::collect_prefixes()
{
    model.table = contract.namespaces;
    for (const namespace_declaration &row : contract.namespaces)
        prefixes.emplace(row.uri, row.prefix);
}

const std::string &model_builder::prefix_of(const std::string &uri, const place &at) const
{
    const auto found = prefixes.find(uri);
    if (found == prefixes.end())
        throw contract_error(at, "namespace " + uri + " has no prefix in namespaces.txt");
    return found->second;
}

void model_builder::add_type_id(const type_id_declaration &row)
{
    static const std::map<std::string, id_kind> kinds = {
        {"primitive", id_kind::primitive}, {"text", id_kind::text},         {"binary", id_kind::binary},
        {"class", id_kind::object},        {"enum", id_kind::code},         {"vector", id_kind::vector},
        {"envelope", id_kind::envelope},   {"response", id_kind::response}, {"request", id_kind::request},
        {"pointer", id_kind::pointer}};
    if (row.id < 1 || row.id > TYPE_ID_MAX)
        throw contract_error(row.at, "type id " + std::to_string(row.id) + " is out of 1 to " +
                                         std::to_string(TYPE_ID_MAX));
    if (const auto [first, added] = id_places.emplace(row.id, row.at); !added)
        throw contract_error(row.at, "type id " + std::to_string(row.id) + " is in line " +
                                         std::to_string(first->second.line) + " too");
    const auto kind = kinds.find(row.kind);
    if (kind == kinds.end())
        throw contract_error(row.at, "unknown kind \"" + row.kind + "\"");
    if (row.id > DISPATCH_ID_MAX && kind->second < id_kind::envelope)
        throw contract_error(row.at, "type id " + std::to_string(row.id) +
                                         " is for a request or a response: a " + row.kind +
                                         " is read and written by ids up to " +
                                         std::to_string(DISPATCH_ID_MAX) + "; " + free_id() + " is free");
    if (!ids.emplace(std::pair(row.kind, row.name), model.types.size()).second)
        throw contract_error(row.at, row.kind + " " + row.name + " has two type ids");

    identified_type type;
    type.id = row.id;
    type.kind = kind->second;
    type.name = type_name(row.name);
    type.xml_name = row.name;
    type.constant = "SOAP_TYPE_" + type.name;
    model.types.push_back(std::move(type));
}

// An id for a new type.
std::string model_builder::free_id() const
{
    const auto taken = [&](int id) {
        return std::any_of(contract.type_ids.begin(), contract.type_ids.end(),
                           [&](const type_id_declaration &row) { return row.id == id; });
    };
    int id = FIRST_NEW_ID;
    while (taken(id))
        ++id;
    return std::to_string(id);
}

void model_builder::collect_type_ids()
{
    std::vector<type_id_declaration> rows = contract.type_ids;
    std::stable_sort(rows.begin(), rows.end(), [](const auto &a, const auto &b) { return a.id < b.id; });
    for (const type_id_declaration &row : rows)
        add_type_id(row);
    for (identified_type &type : model.types) {
        // The form of a text that is a plain pointer to characters.
        if (type.kind == id_kind::primitive && ids.contains({"text", type.xml_name}))
            type.constant = "SOAP_TYPE_chars_" + type.name;
        if (type.kind == id_kind::pointer)
            type.constant = "SOAP_TYPE_pointer_to_" + type.name;
    }
}

const std::string &model_builder::type_id_of(const place &at, const std::string &kind,
                                             const std::string &name, const std::string &what)
{
    const auto found = ids.find({kind, name});
    if (found == ids.end())
        throw contract_error(at, "no type id for " + what + ": type_ids.txt has no row \"" + kind + " " +
                                     name + "\"; " + free_id() + " is free");
    used_ids.insert(found->second);
    return model.types[found->second].constant;
}

void model_builder::refuse_unused_type_ids() const
{
    for (std::size_t i = 0; i < model.types.size(); ++i) {
        const identified_type &type = model.types[i];
        const bool free_standing = type.kind == id_kind::primitive || type.kind == id_kind::envelope ||
                                   type.xml_name.starts_with("xsd:");
        if (!free_standing && !used_ids.contains(i))
            throw contract_error(id_places.at(type.id),
                                 "the contract has nothing of the name " + type.xml_name);
    }
}

// --- types by name ---

void model_builder::add_type(const std::string &uri, const std::string &local, known_type type)
{
    const place at = type.at;
    const std::string name = type.name;
    if (const auto [first, added] = class_places.emplace(name, at); !added)
        throw contract_error(at, "name " + name + " is taken by " + first->second.file + ":" +
                                     std::to_string(first->second.line));
    types.emplace(qualified_key(uri, local), std::move(type));
}

// The types of XSD itself that a member can have, by the rows of the type ids.
void model_builder::collect_built_in_types()
{
    static const std::map<std::string, std::pair<held, const char *>> numbers = {
        {"xsd:boolean", {held::boolean, "bool"}},
        {"xsd:int", {held::int32, "int"}},
        {"xsd:double", {held::float64, "double"}}};
    for (const identified_type &type : model.types) {
        if (!type.xml_name.starts_with("xsd:"))
            continue;
        const std::string local = type.xml_name.substr(4);
        const auto number = numbers.find(type.xml_name);
        known_type known{{}, held::text, type.xml_name, "std::string", "xsd", type.constant};
        if (type.kind == id_kind::binary) {
            known.form = held::binary;
            known.name = type.name;
        } else if (type.kind == id_kind::primitive && number != numbers.end()) {
            known.form = number->second.first;
            known.name = number->second.second;
        } else if (type.kind != id_kind::text) {
            continue;
        }
        types.emplace(qualified_key(XSD_URI, local), known);
    }
}

void model_builder::collect_simple(const std::string &uri, const std::string &local,
                                   const simple_declaration &type)
{
    const std::string &prefix = prefix_of(uri, type.at);
    known_type known{type.at, held::text, prefix + ":" + local, type_name(prefix, local), prefix, {}, &type};
    const bool text = type.literals.empty();
    known.form = text ? held::text : held::code;
    known.type_id =
        type_id_of(type.at, text ? "text" : "enum", known.xml_type, "simple type " + known.xml_type);
    if (spelled(local).empty())
        throw contract_error(type.at, "\"" + local + "\" can't be a name of C++");
    add_type(uri, local, std::move(known));
}

void model_builder::collect_class(const std::string &uri, const std::string &local,
                                  const complex_declaration &type, bool top_level)
{
    const std::string &prefix = prefix_of(uri, type.at);
    if (spelled(local).empty())
        throw contract_error(type.at, "\"" + local + "\" can't be a name of C++");
    known_type known{type.at, held::object, prefix + ":" + local, type_name(prefix, local), prefix, {}};
    if (top_level)
        known.name.insert(known.name.begin(), '_');
    known.simple_content = type.simple_content;
    known.type_id = type_id_of(type.at, "class", known.name, "class " + known.name);
    const bool element = top_level && local.find('-') == std::string::npos;
    if (element) {
        if (!class_places.emplace(known.name, type.at).second)
            throw contract_error(type.at, "element \"" + local + "\" is declared twice");
        element_types.emplace(qualified_key(uri, local), std::move(known));
    } else {
        add_type(uri, local, std::move(known));
    }
    for (const element_declaration &member : type.elements) {
        if (!member.complex && !member.simple)
            continue;
        if (top_level)
            throw contract_error(member.at,
                                 "a type of its own within a type without a name can't be translated");
        if (member.complex)
            collect_class(uri, local + "-" + member.name, *member.complex, true);
        else
            collect_simple(uri, local + "-" + member.name, *member.simple);
    }
}

void model_builder::collect_types(const schema_declaration &schema)
{
    for (const simple_declaration &type : schema.simple_types)
        collect_simple(schema.uri, type.name, type);
    for (const complex_declaration &type : schema.complex_types)
        collect_class(schema.uri, type.name, type, false);
    for (const element_declaration &element : schema.elements) {
        if (element.simple)
            throw contract_error(element.at,
                                 "a top-level element with a simple type of its own can't be translated");
        if (element.complex)
            collect_class(schema.uri, element.name, *element.complex, true);
    }
}

const known_type &model_builder::find_type(const qualified_name &name) const
{
    const auto found = types.find({name.uri, name.local});
    if (found == types.end() || name.local.find('-') != std::string::npos)
        throw contract_error(name.at, "unknown type " + spoken(name));
    return found->second;
}

// --- members ---

namespace {

[[noreturn]] void refuse_value(const place &at, const std::string &text, const std::string &xml_type)
{
    throw contract_error(at, "\"" + text + "\" isn't a value of " + xml_type);
}

} // namespace

// The C++ expression of an initial value; texts have none, and are initially empty.
std::string model_builder::initial_of(const place &at, const known_type &type,
                                      const std::optional<std::string> &text)
{
    const auto refuse = [&] { refuse_value(at, *text, type.xml_type); };
    if (type.form == held::boolean) {
        if (!text || *text == "false" || *text == "0")
            return "false";
        if (*text != "true" && *text != "1")
            refuse();
        return "true";
    }
    if (type.form == held::int32 || type.form == held::float64) {
        const std::string value = text.value_or("0");
        char *end = nullptr;
        const double number = std::strtod(value.c_str(), &end);
        const bool whole = value.find_first_not_of("-0123456789") == std::string::npos;
        if (value.empty() || *end != '\0' ||
            value.find_first_not_of("-+.eE0123456789") != std::string::npos ||
            (type.form == held::int32 && (!whole || number < -2147483647 || number > 2147483647)))
            refuse();
        return value + (type.form == held::float64 && whole ? ".0" : "");
    }
    if (type.form == held::code) {
        for (const literal_declaration &literal : type.simple->literals) {
            if (!text || literal.value == *text)
                return type.name + "::" + identifier(literal.value);
        }
        refuse();
    }
    if (type.form != held::text || text)
        throw contract_error(at, "a default for " + type.xml_type + " can't be translated");
    return {};
}

const known_type &model_builder::member_type(const std::string &uri, const std::string &owner,
                                             const element_declaration &declared) const
{
    if (declared.type)
        return find_type(*declared.type);
    return types.at({uri, owner + "-" + declared.name});
}

// How the member is held follows from how often it may occur, its default, and the mark in appinfo.
void model_builder::give_form(const element_declaration &declared, const known_type &type,
                              class_member &member)
{
    member.form = type.form;
    member.type = type.form == held::text ? "std::string" : type.name;
    member.type_prefix = type.prefix;
    member.item_id = type.type_id;
    const bool by_value = declared.by_value || declared.initial;
    if (declared.unbounded) {
        if (by_value)
            throw contract_error(declared.at, "a repeated element can't be held by value");
        if (type.form != held::text && type.form != held::code && type.form != held::object)
            throw contract_error(declared.at,
                                 "a repeated element of " + type.xml_type + " can't be translated");
        member.how = occurs::many;
        member.minimum = declared.minimum;
        member.vector_id = type_id_of(declared.at, "vector", type.xml_type, "the vector of " + type.xml_type);
        return;
    }
    if (!by_value) {
        member.how = declared.minimum ? occurs::required : occurs::optional;
        return;
    }
    if (type.form == held::object || type.form == held::binary)
        throw contract_error(declared.at, "an object can't be held by value");
    if (declared.by_value && declared.minimum == 0)
        throw contract_error(declared.at, "an element marked as a value must occur once");
    member.how = declared.by_value ? occurs::value : occurs::always;
    member.initial = initial_of(declared.at, type, declared.initial);
}

// A reference has the name and type of a top-level element, which may be another namespace's.
void model_builder::resolve_reference(const element_declaration &declared, class_member &member,
                                      const element_declaration *&typed, std::string &uri) const
{
    for (const schema_declaration &schema : contract.schemas) {
        if (schema.uri != declared.reference->uri)
            continue;
        for (const element_declaration &element : schema.elements) {
            if (element.name != declared.reference->local)
                continue;
            if (!element.type)
                throw contract_error(declared.at,
                                     "a reference to an element with a type of its own can't be translated");
            typed = &element;
            uri = schema.uri;
            if (member.documentation.empty())
                member.documentation = element.documentation;
            return;
        }
    }
    throw contract_error(declared.at, "unknown element " + spoken(*declared.reference));
}

class_member model_builder::build_member(const std::string &owner_uri, const std::string &owner,
                                         const element_declaration &declared)
{
    class_member member;
    member.documentation = declared.documentation;
    const element_declaration *typed = &declared;
    std::string uri = owner_uri;
    if (declared.reference)
        resolve_reference(declared, member, typed, uri);
    member.tag = prefix_of(uri, declared.at) + ":" + typed->name;
    member.name = identifier(typed->name);
    if (member.name.empty())
        throw contract_error(declared.at, "\"" + typed->name + "\" can't be a name of C++");
    give_form(declared, member_type(uri, owner, *typed), member);
    return member;
}

class_attribute model_builder::build_attribute(const attribute_declaration &declared) const
{
    const known_type &type = find_type(declared.type);
    if (type.form != held::code)
        throw contract_error(declared.at,
                             "an attribute of " + type.xml_type + " can't be translated: only enumerations");
    class_attribute attribute{declared.name, identifier(declared.name), type.name,
                              type.prefix,   declared.required,         declared.documentation};
    if (attribute.name.empty())
        throw contract_error(declared.at, "\"" + declared.name + "\" can't be a name of C++");
    return attribute;
}

// --- classes and enumerations ---

data_class model_builder::build_class(const std::string &uri, const known_type &known,
                                      const complex_declaration &declared)
{
    data_class type;
    type.at = known.at;
    type.prefix = known.prefix;
    type.xml_type = known.xml_type;
    type.name = known.name;
    type.type_id = known.type_id;
    type.top_level = known.name[0] == '_';
    type.simple_content = declared.simple_content;
    type.documentation = declared.documentation;
    if (declared.base) {
        const known_type &base = find_type(*declared.base);
        if (type.simple_content && base.xml_type != "xsd:string")
            throw contract_error(declared.base->at,
                                 "simple content of " + base.xml_type + " can't be translated");
        if (!type.simple_content && (base.form != held::object || base.simple_content))
            throw contract_error(declared.base->at, "extension of " + base.xml_type + " can't be translated");
        if (!type.simple_content) {
            type.base = base.name;
            type.base_prefix = base.prefix;
        }
    }
    for (const attribute_declaration &attribute : declared.attributes)
        type.attributes.push_back(build_attribute(attribute));
    for (const element_declaration &element : declared.elements)
        type.members.push_back(build_member(uri, declared.name, element));
    return type;
}

enumeration model_builder::build_enumeration(const known_type &type)
{
    enumeration made{type.xml_type, type.name, type.type_id, type.simple->documentation, {}};
    std::set<std::string> names;
    for (const literal_declaration &declared : type.simple->literals) {
        const std::string name = identifier(declared.value);
        if (name.empty())
            throw contract_error(declared.at, "\"" + declared.value + "\" can't be a name of C++");
        if (!names.insert(name).second)
            throw contract_error(declared.at, "enumerator " + name + " is declared twice");
        made.literals.push_back({declared.value, name, declared.documentation});
    }
    return made;
}

// The anonymous types of a class's elements.
void model_builder::add_anonymous(service_namespace &service, const std::string &uri,
                                  const complex_declaration &type)
{
    for (const element_declaration &member : type.elements) {
        if (member.simple) {
            const known_type &known = types.at({uri, type.name + "-" + member.name});
            if (known.form == held::code)
                service.enumerations.push_back(build_enumeration(known));
        }
        if (member.complex)
            service.classes.push_back(
                build_class(uri, types.at({uri, type.name + "-" + member.name}), *member.complex));
    }
}

void model_builder::build_services()
{
    for (const namespace_declaration &row : contract.namespaces) {
        const schema_declaration *schema = nullptr;
        for (const schema_declaration &candidate : contract.schemas) {
            if (candidate.uri != row.uri)
                continue;
            if (schema)
                throw contract_error(candidate.at,
                                     "namespace " + row.uri + " has a schema already: " + schema->file);
            schema = &candidate;
        }
        if (!schema)
            continue;
        service_namespace service{row.prefix, schema->file, schema->documentation, {}, {}};
        for (const simple_declaration &type : schema->simple_types) {
            if (!type.literals.empty())
                service.enumerations.push_back(build_enumeration(types.at({schema->uri, type.name})));
        }
        for (const complex_declaration &type : schema->complex_types) {
            service.classes.push_back(build_class(schema->uri, types.at({schema->uri, type.name}), type));
            add_anonymous(service, schema->uri, type);
        }
        for (const element_declaration &element : schema->elements) {
            if (!element.complex)
                continue;
            data_class type =
                build_class(schema->uri, element_types.at({schema->uri, element.name}), *element.complex);
            if (type.documentation.empty())
                type.documentation = element.documentation;
            service.classes.push_back(std::move(type));
        }
        if (!service.classes.empty() || !service.enumerations.empty())
            model.services.push_back(std::move(service));
    }
}

const data_class *model_builder::find_class(const std::string &name) const
{
    for (const service_namespace &service : model.services) {
        for (const data_class &type : service.classes) {
            if (type.name == name)
                return &type;
        }
    }
    return nullptr;
}

void model_builder::check_own_members(const data_class &type)
{
    std::map<std::string, std::string> names; // what each member's name means
    for (const std::string_view name : RESERVED)
        names.emplace(name, "the class's own use");
    if (type.simple_content)
        names.emplace("value", "the class's text");
    const auto take = [&](const std::string &name, const std::string &meaning) {
        const auto [first, added] = names.emplace(name, meaning);
        if (!added)
            throw contract_error(type.at, type.name + ": " + meaning + " needs the name " + name + " of " +
                                              first->second);
    };
    std::set<std::string> tags;
    for (const class_attribute &attribute : type.attributes)
        take(attribute.name, "attribute " + attribute.xml_name);
    for (const class_member &member : type.members) {
        if (!tags.insert(member.tag).second)
            throw contract_error(type.at, type.name + ": two elements " + member.tag);
        take(member.name, "element " + member.tag);
    }
}

// A derived class shares the names of its bases, on the wire and in C++.
void model_builder::check_members(const data_class &type) const
{
    check_own_members(type);
    std::set<std::string> seen = {type.name};
    for (std::string name = type.base; !name.empty();) {
        if (!seen.insert(name).second)
            throw contract_error(type.at, type.name + " is a base of itself");
        const data_class &base = *find_class(name);
        for (const class_member &inherited : base.members) {
            for (const class_member &member : type.members) {
                if (member.name == inherited.name)
                    throw contract_error(type.at, type.name + ": element " + member.tag + " needs the name " +
                                                      member.name + " of " + inherited.tag + " of " +
                                                      base.name);
            }
        }
        name = base.base;
    }
}

void model_builder::sort_by_bases(std::vector<data_class> &classes)
{
    std::vector<data_class> sorted;
    std::set<std::string> waiting;
    for (const data_class &type : classes)
        waiting.insert(type.name);
    while (!waiting.empty()) {
        for (const data_class &type : classes) {
            if (waiting.contains(type.name) && !waiting.contains(type.base)) {
                sorted.push_back(type);
                waiting.erase(type.name);
            }
        }
    }
    classes = std::move(sorted);
}

// --- ports ---

message_record model_builder::build_record(const port &owner, const operation_declaration &declared,
                                           const qualified_name &element, const std::string &kind,
                                           const std::string &suffix)
{
    message_record record;
    record.name = "__" + type_name(owner.prefix, declared.name) + suffix;
    record.type_id = type_id_of(declared.at, kind, record.name, "the record " + record.name);
    record.element = prefix_of(element.uri, declared.at) + ":" + element.local;
    const known_type *type = nullptr;
    if (const auto own = element_types.find({element.uri, element.local}); own != element_types.end())
        type = &own->second;
    for (const schema_declaration &schema : contract.schemas) {
        for (const element_declaration &candidate : schema.elements) {
            if (schema.uri == element.uri && candidate.name == element.local && candidate.type)
                type = &find_type(*candidate.type);
        }
    }
    if (!type)
        throw contract_error(element.at, "unknown element " + spoken(element));
    if (type->form != held::object)
        throw contract_error(element.at, "element " + record.element + " isn't of a class");
    type_id_of(declared.at, "pointer", type->name, "the pointer to " + type->name);
    record.object = type->name;
    record.object_prefix = type->prefix;

    identified_type &row = model.types[ids.at({kind, record.name})];
    row.xml_name = "-" + owner.prefix + ":" + declared.name + suffix;
    row.item = type->type_id;
    row.item_name = type->name;
    row.element = record.element;
    return record;
}

operation model_builder::build_operation(const port &owner, const operation_declaration &declared)
{
    operation made;
    made.name = identifier(declared.name);
    if (made.name.empty())
        throw contract_error(declared.at, "\"" + declared.name + "\" can't be a name of C++");
    made.documentation = declared.documentation;
    made.request = build_record(owner, declared, declared.request, "request", "");
    made.response = build_record(owner, declared, declared.response, "response", "Response");
    return made;
}

void model_builder::build_ports()
{
    for (const port_declaration &declared : contract.ports) {
        port made;
        made.name = identifier(declared.name);
        made.binding = identifier(declared.binding);
        made.prefix = prefix_of(declared.uri, declared.at);
        made.file = declared.file;
        made.documentation = declared.documentation;
        made.address = declared.address;
        made.proxy = std::find(std::begin(PORTS_WITHOUT_PROXY), std::end(PORTS_WITHOUT_PROXY),
                               declared.name) == std::end(PORTS_WITHOUT_PROXY);
        if (made.name.empty() || made.binding.empty())
            throw contract_error(declared.at, "port or binding can't be a name of C++");
        for (const operation_declaration &operation : declared.operations)
            made.operations.push_back(build_operation(made, operation));
        model.ports.push_back(std::move(made));
    }
}

// --- the table of types ---

void model_builder::describe_types()
{
    std::map<std::string, const known_type *> by_xml_type;
    std::map<std::string, const known_type *> by_name;
    for (const auto *table : {&types, &element_types}) {
        for (const auto &[key, type] : *table) {
            by_xml_type.emplace(type.xml_type, &type);
            by_name.emplace(type.name, &type);
        }
    }
    for (identified_type &type : model.types) {
        if (type.kind == id_kind::vector) {
            const auto item = by_xml_type.find(type.xml_name);
            if (item == by_xml_type.end())
                throw contract_error(id_places.at(type.id), "unknown type " + type.xml_name);
            type.item = item->second->type_id;
            type.item_name = item->second->form == held::text ? "std::string" : item->second->name;
            type.item_form = item->second->form;
            type.constant = "SOAP_TYPE_vector_of_" + type_name(type.xml_name);
            if (item->second->name[0] == '_')
                type.constant = "SOAP_TYPE_vector_of_" + item->second->name;
        } else if ((type.kind == id_kind::object || type.kind == id_kind::pointer) &&
                   by_name.contains(type.name)) {
            const known_type &known = *by_name.at(type.name);
            type.xml_name = known.xml_type;
            if (type.kind == id_kind::pointer) {
                type.item = known.type_id;
                type.item_name = known.name;
            }
        } else if (type.kind == id_kind::envelope) {
            type.xml_name = "SOAP-ENV:" + type.xml_name.substr(type.xml_name.rfind('_') + 1);
        }
    }
}

contract_model model_builder::build()
{
    collect_prefixes();
    collect_type_ids();
    collect_built_in_types();
    for (const schema_declaration &schema : contract.schemas)
        collect_types(schema);
    describe_types();
    build_services();
    for (service_namespace &service : model.services) {
        for (const data_class &type : service.classes)
            check_members(type);
    }
    for (service_namespace &service : model.services)
        sort_by_bases(service.classes);
    build_ports();
    refuse_unused_type_ids();
    return std::move(model);
}

} // namespace

contract_model build_model(const contract_declarations &contract)
{
    return model_builder(contract).build();
}
