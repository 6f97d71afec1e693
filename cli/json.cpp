// json.cpp - see json.h.
#include "json.h"

#include <charconv>
#include <cmath>

#include <nlohmann/json.hpp>
#include <pugixml.hpp>

#include "failure.h"
#include "simple_types.h"

namespace cli {

namespace {

using json = nlohmann::ordered_json;

constexpr int INDENT = 2;
constexpr int DEPTH_MAX =
    500; // elements within each other; protects the stack, and the size of an indented text
constexpr std::string_view TYPE_ATTRIBUTE = "xsi:type", NIL_ATTRIBUTE = "xsi:nil";

json simple_value(const pugi::xml_node &element, std::string_view type)
{
    if (element.attribute("xsi:nil").as_bool())
        return nullptr;
    if (const pugi::xml_attribute reference = element.attribute("href"))
        return {{"@href", reference.value()}};
    const std::string_view text = element.text().get();
    if (type == "xsd:boolean")
        return text == "true" || text == "1";
    double number = 0;
    if (is_number(type) &&
        std::from_chars(text.data(), text.data() + text.size(), number).ec == std::errc() &&
        std::isfinite(number)) {
        if (type == "xsd:int")
            return static_cast<std::int32_t>(number);
        return number;
    }
    return std::string(text);
}

json value_of(const pugi::xml_node &element, std::string_view type, int depth);

void add_member(json &object, const pugi::xml_node &child, const contract::data_class &type, int depth)
{
    const contract::member *const member = contract::find_member(type, child.name());
    const std::string name(contract::local_name(child.name()));
    json value = value_of(child, member == nullptr ? "xsd:string" : member->type, depth + 1);
    const bool repeats = member != nullptr ? member->many : object.contains(name);
    if (!repeats)
        object[name] = std::move(value);
    else if (!object.contains(name) || !object[name].is_array())
        object[name] = object.contains(name) ? json::array({object[name], value}) : json::array({value});
    else
        object[name].push_back(std::move(value));
}

json class_value(const pugi::xml_node &element, const contract::data_class &expected, int depth)
{
    if (depth > DEPTH_MAX)
        throw failure(EXIT_ANSWER, "the answer is too deep for JSON; without --json it is printed as XML");
    if (element.attribute("xsi:nil").as_bool())
        return nullptr;
    const contract::data_class *const named = contract::find_class(element.attribute("xsi:type").value());
    const contract::data_class &type = named == nullptr ? expected : *named;
    json object = json::object();
    for (const pugi::xml_attribute &attribute : element.attributes()) {
        const std::string_view name = attribute.name();
        if (!name.starts_with("xmlns") && name != NIL_ATTRIBUTE)
            object[name == TYPE_ATTRIBUTE ? "@type" : "@" + std::string(name)] = attribute.value();
    }
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

} // namespace cli
