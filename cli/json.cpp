// json.cpp - see json.h.
#include "json.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstring>
#include <functional>
#include <set>
#include <vector>

#include <nlohmann/json.hpp>
#include <pugixml.hpp>
#include <zuv_client_pro/soap.h>

#include "check.h"
#include "documents.h"
#include "failure.h"
#include "nearest.h"
#include "simple_types.h"
#include "text_files.h"

namespace cli {

namespace {

using json = nlohmann::ordered_json;

constexpr int INDENT = 2;
constexpr int DEPTH_MAX =
    500; // elements within each other; protects the stack, and the size of an indented text
constexpr std::size_t SHOWN_MAX = 60; // bytes of a wrong value
constexpr char NAME_CHARACTERS[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789_.-";
constexpr std::string_view TYPE_ATTRIBUTE = "xsi:type", NIL_ATTRIBUTE = "xsi:nil";

// The key of a member: its local name, unless the class has two members of that name.
std::string key_of(const contract::member &member, const contract::data_class &type)
{
    const std::string_view name = contract::local_name(member.tag);
    for (const contract::data_class *one : contract::lineage(type))
        for (const contract::member &other : one->members)
            if (&other != &member && contract::local_name(other.tag) == name)
                return member.tag;
    return std::string(name);
}

// --- from XML ---

bool is_nil(const pugi::xml_node &element)
{
    return element.attribute(NIL_ATTRIBUTE.data()).as_bool();
}

// Attributes other than xsi:nil and namespace declarations.
json attributes_of(const pugi::xml_node &element)
{
    json object = json::object();
    for (const pugi::xml_attribute &attribute : element.attributes()) {
        const std::string_view name = attribute.name();
        if (!name.starts_with("xmlns") && name != NIL_ATTRIBUTE)
            object[name == TYPE_ATTRIBUTE ? "@type" : "@" + std::string(name)] = attribute.value();
    }
    return object;
}

json text_value(std::string_view text, std::string_view type)
{
    if (type == "xsd:boolean")
        return text == "true" || text == "1";
    double number = 0;
    const char *const end = text.data() + text.size();
    const auto converted = std::from_chars(text.data(), end, number);
    if (!is_number(type) || converted.ec != std::errc() || converted.ptr != end || !std::isfinite(number))
        return std::string(text);
    if (type == "xsd:int")
        return static_cast<std::int32_t>(number);
    return number;
}

json simple_value(const pugi::xml_node &element, std::string_view type)
{
    json value = is_nil(element) ? json() : text_value(element.text().get(), type);
    json object = attributes_of(element);
    if (object.empty())
        return value;
    if (!object.contains("@href"))
        object["text"] = std::move(value);
    return object;
}

json value_of(const pugi::xml_node &element, std::string_view type, int depth);

void add_member(json &object, const pugi::xml_node &child, const contract::data_class &type, int depth)
{
    const contract::member *const member = contract::find_member(type, child.name());
    const std::string key =
        member == nullptr ? std::string(contract::local_name(child.name())) : key_of(*member, type);
    json value = value_of(child, member == nullptr ? "xsd:string" : member->type, depth + 1);
    const bool repeats = member != nullptr ? member->many : object.contains(key);
    if (!repeats)
        object[key] = std::move(value);
    else if (!object.contains(key) || !object[key].is_array())
        object[key] = object.contains(key) ? json::array({object[key], value}) : json::array({value});
    else
        object[key].push_back(std::move(value));
}

json class_value(const pugi::xml_node &element, const contract::data_class &expected, int depth)
{
    if (depth > DEPTH_MAX)
        throw failure(EXIT_ANSWER, "the answer is too deep for JSON; without --json it is printed as XML");
    json object = attributes_of(element);
    if (is_nil(element)) {
        if (object.empty())
            return nullptr;
        object["@nil"] = true;
        return object;
    }
    const contract::data_class *const named =
        contract::find_class(element.attribute(TYPE_ATTRIBUTE.data()).value());
    const contract::data_class &type = named == nullptr ? expected : *named;
    if (contract::holds_text(type))
        object["text"] = element.text().get();
    else
        for (const pugi::xml_node &child : element.children())
            if (child.type() == pugi::node_element)
                add_member(object, child, type, depth);
    return object;
}

json value_of(const pugi::xml_node &element, std::string_view type, int depth)
{
    const contract::data_class *const described = contract::find_class(type);
    return described == nullptr ? simple_value(element, type) : class_value(element, *described, depth);
}

// --- to XML ---

class xml_writer {
public:
    std::string document(const json &value, const contract::data_class &type)
    {
        add_class(value, type.name, type, "", 1);
        // The root's declarations go where its name ends.
        out_.insert(1 + std::strlen(type.name), namespace_declarations(" ", prefixes_));
        return std::move(out_);
    }
    const std::vector<std::string> &findings() const { return findings_; }

private:
    void note(const std::string &path, const std::string &text)
    {
        if (findings_.size() < FINDINGS_MAX)
            findings_.push_back(printable((path.empty() ? "/" : path) + ": " + text));
    }

    void note_unknown(const std::string &path, const std::string &key, const std::string &owner,
                      const std::vector<std::string> &known)
    {
        const std::string meant = nearest(key, known);
        note(path, "\"" + key + "\" is no member of " + owner +
                       (meant.empty() ? "" : "; did you mean \"" + meant + "\"?"));
    }

    // A name in the XML, whose prefix has to be declared.
    std::string_view name(std::string_view qname)
    {
        if (const std::size_t colon = qname.find(':'); colon != std::string_view::npos)
            prefixes_.emplace(qname.substr(0, colon));
        return qname;
    }

    void add_escaped(const std::string &text, const std::string &path)
    {
        for (const char c : text) {
            if (static_cast<unsigned char>(c) < ' ' && c != '\n' && c != '\t' && c != '\r')
                note(path, "a control character, which XML doesn't allow");
            else if (c == '<' || c == '&' || c == '"' || c == '>' || static_cast<unsigned char>(c) < ' ')
                out_ += "&#" + std::to_string(static_cast<int>(c)) + ";";
            else
                out_ += c;
        }
    }

    void add_attribute(std::string_view attribute, const std::string &value, const std::string &path)
    {
        out_.append(" ").append(name(attribute)).append("=\"");
        add_escaped(value, path);
        out_ += '"';
    }

    // Attributes that any element may have: those of references, and those of a namespace.
    bool add_common_attribute(const std::string &key, const json &value, const std::string &path)
    {
        const std::string attribute = key.substr(1);
        const bool common = attribute == "id" || attribute == "href" || namespace_of(attribute) != nullptr;
        if (!key.starts_with('@') || !common || !value.is_string())
            return false;
        add_attribute(attribute, value.get_ref<const std::string &>(), path);
        return true;
    }

    static const soap_namespace *namespace_of(std::string_view attribute)
    {
        const std::size_t colon = attribute.find(':');
        if (colon == std::string_view::npos)
            return nullptr;
        for (const soap_namespace *row = soap_program_namespaces; row->prefix != nullptr; ++row)
            if (attribute.substr(0, colon) == row->prefix &&
                attribute.find_first_not_of(NAME_CHARACTERS, colon + 1) == std::string_view::npos)
                return row;
        return nullptr;
    }

    // The text of a value; a finding if it is no value of the type.
    std::string text_of(const json &value, std::string_view type, const std::string &path)
    {
        const bool whole = value.is_number_integer() && is_whole_number(type);
        const bool fits = value.is_string() || whole || (value.is_number() && type == "xsd:double") ||
                          (value.is_boolean() && type == "xsd:boolean");
        std::string text = value.is_string() ? value.get<std::string>() : value.dump();
        std::string problem = fits ? value_problem(type, text) : value_words(type);
        if (value.is_number() && !fits)
            problem += is_whole_number(type) ? ", with quotes if it is long" : ", in quotes";
        if (!problem.empty())
            note(path, "should be " + problem + ", not " + value.dump().substr(0, SHOWN_MAX));
        return text;
    }

    void add_simple(const json &value, const std::string &tag, std::string_view type, const std::string &path)
    {
        const json *content = &value;
        out_.append("<").append(name(tag));
        if (value.is_object()) {
            static const json none = "";
            content = value.contains("text") ? &value["text"] : &none;
            for (const auto &[key, one] : value.items())
                if (key != "text" && !add_common_attribute(key, one, path))
                    note_unknown(path, key, tag, {"text", "@href", "@id"});
        }
        if (content->is_null())
            out_.append(" ").append(name(NIL_ATTRIBUTE)).append("=\"true\"");
        out_ += '>';
        if (!content->is_null() && !(value.is_object() && value.contains("@href")))
            add_escaped(text_of(*content, type, path), path);
        out_ += "</" + tag + ">";
    }

    const contract::data_class &type_of(const json &object, const contract::data_class &expected,
                                        const std::string &path)
    {
        if (!object.contains("@type"))
            return expected;
        const json &given = object["@type"];
        const contract::data_class *const named =
            given.is_string() ? contract::find_class(given.get_ref<const std::string &>()) : nullptr;
        if (named != nullptr && contract::descends(*named, expected))
            return *named;
        std::vector<std::string> known;
        for (const contract::data_class &one : contract::classes)
            if (contract::descends(one, expected))
                known.emplace_back(one.name);
        const std::string meant = given.is_string() ? nearest(given.get<std::string>(), known) : "";
        note(path + "/@type", "should name " + std::string(expected.name) + " or a class derived from it" +
                                  (meant.empty() ? "" : "; did you mean \"" + meant + "\"?"));
        return expected;
    }

    void add_attributes(const json &object, const contract::data_class &type, const std::string &path)
    {
        for (const auto &[key, value] : object.items()) {
            if (key == "@nil" && !value.is_boolean())
                note(path + "/@nil", "should be true or false");
            if (!key.starts_with('@') || key == "@nil" || add_class_attribute(key, value, type, path))
                continue;
            std::vector<std::string> known = {"@type"};
            for (const contract::data_class *one : contract::lineage(type))
                for (const contract::attribute &attribute : one->attributes)
                    known.push_back("@" + std::string(attribute.name));
            note_unknown(path, key, type.name, known);
        }
        for (const contract::data_class *one : contract::lineage(type))
            for (const contract::attribute &attribute : one->attributes)
                if (attribute.required && !object.contains("@" + std::string(attribute.name)))
                    note(path, "lacks \"@" + std::string(attribute.name) + "\"");
    }

    bool add_class_attribute(const std::string &key, const json &value, const contract::data_class &type,
                             const std::string &path)
    {
        if (key == "@type") {
            if (value.is_string() && contract::find_class(value.get_ref<const std::string &>()) != nullptr)
                add_attribute(TYPE_ATTRIBUTE, std::string(name(value.get_ref<const std::string &>())), path);
            return true;
        }
        const contract::attribute *const known = contract::find_attribute(type, key.substr(1));
        if (known == nullptr)
            return add_common_attribute(key, value, path);
        add_attribute(known->name, text_of(value, known->type, path + "/" + key), path + "/" + key);
        return true;
    }

    void add_class(const json &value, const std::string &tag, const contract::data_class &expected,
                   const std::string &path, int depth)
    {
        if (depth > DEPTH_MAX)
            return note(path, "more than " + std::to_string(DEPTH_MAX) + " objects within each other");
        out_.append("<").append(name(tag));
        const bool nil =
            value.is_null() || (value.is_object() && value.contains("@nil") && value["@nil"] == true);
        if (value.is_object()) {
            const contract::data_class &type = type_of(value, expected, path);
            add_attributes(value, type, path);
            out_.append(nil ? " " : "")
                .append(nil ? name(NIL_ATTRIBUTE) : "")
                .append(nil ? "=\"true\">" : ">");
            if (!nil && !value.contains("@href"))
                add_content(value, type, path, depth);
        } else if (nil)
            out_.append(" ").append(name(NIL_ATTRIBUTE)).append("=\"true\">");
        else
            note(path, "should be an object, as it is a " + std::string(expected.name));
        out_ += "</" + tag + ">";
    }

    void add_content(const json &object, const contract::data_class &type, const std::string &path, int depth)
    {
        if (contract::holds_text(type)) {
            for (const auto &[key, value] : object.items())
                if (!key.starts_with('@') && key != "text")
                    note_unknown(path, key, type.name, {"text"});
            if (object.contains("text"))
                add_escaped(text_of(object["text"], "xsd:string", path), path);
            return;
        }
        std::vector<std::string> known;
        for (const contract::data_class *one : contract::lineage(type))
            for (const contract::member &member : one->members) {
                known.push_back(key_of(member, type));
                add_items(object, known.back(), member, path, depth);
            }
        for (const auto &[key, value] : object.items())
            if (!key.starts_with('@') && std::find(known.begin(), known.end(), key) == known.end())
                note_unknown(path, key, type.name, known);
    }

    // All elements of a member.
    void add_items(const json &object, const std::string &key, const contract::member &member,
                   const std::string &path, int depth)
    {
        const auto found = object.find(key);
        const bool is_array = found != object.end() && found->is_array();
        const std::size_t count = found == object.end() ? 0 : is_array ? found->size() : 1;
        if (count < member.minimum)
            note(path, "lacks \"" + key + "\"" +
                           (member.minimum > 1 ? ", at least " + std::to_string(member.minimum) : ""));
        if (is_array && !member.many)
            return note(path + "/" + key, "should be one value, not an array");
        for (std::size_t i = 0; i < count; ++i) {
            std::string place = path;
            place.append("/").append(key);
            if (is_array)
                place.append("/").append(std::to_string(i));
            const json &value = is_array ? (*found)[i] : *found;
            if (const contract::data_class *const type = contract::find_class(member.type))
                add_class(value, member.tag, *type, place, depth + 1);
            else
                add_simple(value, member.tag, member.type, place);
        }
    }

    std::string out_;
    std::set<std::string> prefixes_ = {"xsi"};
    std::vector<std::string> findings_;
};

// Refuses keys that an object has twice: JSON's readers take one and lose the other.
class key_watch {
public:
    bool operator()(int, json::parse_event_t event, const json &parsed)
    {
        if (event == json::parse_event_t::object_start)
            keys_.emplace_back();
        else if (event == json::parse_event_t::object_end)
            keys_.pop_back();
        else if (event == json::parse_event_t::key &&
                 !keys_.back().insert(parsed.get<std::string>()).second && twice_.empty())
            twice_ = parsed.get<std::string>();
        return true;
    }
    const std::string &twice() const { return twice_; }

private:
    std::vector<std::set<std::string>> keys_;
    std::string twice_;
};

json parsed_json(std::string_view document, const std::string &file)
{
    key_watch watch;
    json value;
    try {
        value = json::parse(document.begin(), document.end(), std::ref(watch));
    } catch (const json::exception &problem) {
        const std::string words =
            problem.what(); // "[json.exception.parse_error.101] parse error at line 3, ..."
        throw failure(EXIT_DOCUMENT, file + ": not JSON: " + printable(words.substr(words.find("] ") + 2)));
    }
    if (!watch.twice().empty())
        throw failure(EXIT_DOCUMENT, file + ": \"" + printable(watch.twice()) + "\" is twice in one object");
    return value;
}

} // namespace

std::string json_of(const std::string &xml, const contract::data_class &type)
{
    pugi::xml_document document;
    if (!document.load_buffer(xml.data(), xml.size(), pugi::parse_default | pugi::parse_ws_pcdata_single,
                              pugi::encoding_utf8))
        throw failure(EXIT_ANSWER,
                      "the answer can't be turned into JSON: it holds characters that XML doesn't allow");
    return class_value(document.document_element(), type, 1)
               .dump(INDENT, ' ', false, json::error_handler_t::replace) +
           "\n";
}

bool is_json(std::string_view document)
{
    const std::size_t first = document.find_first_not_of(" \t\r\n");
    return first != std::string_view::npos && document[first] == '{';
}

std::string xml_of(std::string_view document, const contract::data_class &type, const std::string &file)
{
    xml_writer writer;
    std::string xml = writer.document(parsed_json(document, file), type);
    std::string lines;
    for (const std::string &one : writer.findings())
        lines.append(lines.empty() ? "" : "\n").append(file).append(": ").append(one);
    if (!lines.empty())
        throw failure(EXIT_DOCUMENT, "not a " + std::string(type.name) + ":\n" + lines);
    return xml;
}

} // namespace cli
