// check.cpp - see check.h.
#include "check.h"

#include <algorithm>
#include <cstring>
#include <map>

#include <pugixml.hpp>
#include <zuv_client_pro/soap_registry.h>

#include "namespace_scope.h"
#include "operations.h"
#include "simple_types.h"
#include "text_files.h"

namespace cli {

namespace {

constexpr int DEPTH_MAX = 1000; // open elements; protects the stack
constexpr std::string_view XSI = "xsi:", ENVELOPE = "SOAP-ENV:Envelope";

class checker {
public:
    checker(std::string_view xml, checked_document &result) : xml_(xml), result_(result) {}

    void run(const contract::data_class *expected)
    {
        pugi::xml_document document;
        const pugi::xml_parse_result parsed = document.load_buffer(
            xml_.data(), xml_.size(), pugi::parse_default | pugi::parse_ws_pcdata, pugi::encoding_utf8);
        if (!parsed) {
            note(parsed.offset, std::string("not well-formed XML: ") + parsed.description());
            return;
        }
        const pugi::xml_node root = document.document_element();
        scope_.enter(root);
        result_.root = scope_.name_of(root.name());
        result_.type = expected != nullptr ? expected : type_of_root(result_.root);
        if (result_.root == ENVELOPE && expected == nullptr)
            check_message(root);
        else if (result_.type == nullptr)
            note(root, "<" + std::string(root.name()) +
                           "> is neither a class of the contract nor the request or answer of an operation" +
                           missing_namespace(root));
        else
            check_class_content(root, *result_.type, 1);
        scope_.leave();
    }

private:
    static const contract::data_class *type_of_root(const std::string &name)
    {
        if (const contract::data_class *const type = contract::find_class(name))
            return type;
        if (name == "protocol:header")
            return contract::find_class("protocol:Header");
        bool is_request = false;
        const operation *const found = operation_of_element(name.c_str(), is_request);
        return found == nullptr ? nullptr
                                : contract::find_class(soap_type_name(is_request ? found->request_type
                                                                                 : found->response_type));
    }

    // For a root element that lacks nothing but its namespace: what it might be.
    static std::string missing_namespace(const pugi::xml_node &root)
    {
        if (std::strchr(root.name(), ':') != nullptr || root.attribute("xmlns"))
            return "";
        std::string names;
        for (const contract::data_class *type : contract::classes_meant(root.name()))
            names += (names.empty() ? "" : " or ") + std::string(type->name);
        return names.empty() ? "" : ": it has no namespace (xmlns), " + names + " has";
    }

    void note(std::ptrdiff_t offset, const std::string &text)
    {
        if (result_.findings.size() >= FINDINGS_MAX)
            return;
        const std::string_view before = xml_.substr(0, offset < 0 ? 0 : static_cast<std::size_t>(offset));
        const std::size_t line_start = before.rfind('\n') + 1; // npos + 1 is 0
        const auto is_character = [](char c) { return (static_cast<unsigned char>(c) & 0xC0U) != 0x80; };
        const auto characters = std::count_if(before.begin() + static_cast<std::ptrdiff_t>(line_start),
                                              before.end(), is_character);
        result_.findings.push_back(
            {static_cast<std::size_t>(std::count(before.begin(), before.end(), '\n')) + 1,
             static_cast<std::size_t>(characters) + 1, printable(text)});
    }
    void note(const pugi::xml_node &node, const std::string &text)
    {
        note(node.offset_debug() - (node.type() == pugi::node_element ? 1 : 0), text);
    }

    void check_message(const pugi::xml_node &envelope)
    {
        for (const pugi::xml_node &part : envelope.children()) {
            if (part.type() != pugi::node_element)
                continue;
            scope_.enter(part);
            for (const pugi::xml_node &entry : part.children())
                if (entry.type() == pugi::node_element)
                    check_entry(entry);
            scope_.leave();
        }
    }

    void check_entry(const pugi::xml_node &entry)
    {
        scope_.enter(entry);
        const std::string name = scope_.name_of(entry.name());
        if (const contract::data_class *const type = type_of_root(name))
            check_class_content(entry, *type, 3);
        else if (name != "SOAP-ENV:Fault")
            note(entry, "<" + std::string(entry.name()) + "> is not known to the contract");
        scope_.leave();
    }

    void check_element(const pugi::xml_node &element, const contract::member &member, int depth)
    {
        scope_.enter(element);
        if (const contract::data_class *const type = contract::find_class(member.type))
            check_class_content(element, *type, depth);
        else
            check_simple(element, member.type);
        scope_.leave();
    }

    bool is_nil(const pugi::xml_node &element)
    {
        return std::any_of(
            element.attributes_begin(), element.attributes_end(), [&](const pugi::xml_attribute &a) {
                return scope_.name_of(a.name(), true) == "xsi:nil" &&
                       (std::strcmp(a.value(), "true") == 0 || std::strcmp(a.value(), "1") == 0);
            });
    }

    void check_simple(const pugi::xml_node &element, std::string_view type)
    {
        std::string value;
        for (const pugi::xml_node &child : element.children()) {
            if (child.type() == pugi::node_element) {
                note(child,
                     "<" + std::string(element.name()) + "> holds " + value_words(type) + ", not elements");
                return;
            }
            value += child.value();
        }
        if (is_nil(element) || !element.attribute("href").empty())
            return;
        const std::string problem = value_problem(type, value);
        if (!problem.empty())
            note(element, "<" + std::string(element.name()) + "> should be " + problem + ", not \"" +
                              value.substr(0, 60) + "\"");
    }

    void check_attributes(const pugi::xml_node &element, const contract::data_class &type)
    {
        for (const pugi::xml_attribute &attribute : element.attributes()) {
            const std::string name = scope_.name_of(attribute.name(), true);
            if (std::string_view(attribute.name()).starts_with("xmlns") || name.starts_with(XSI) ||
                name.starts_with("SOAP-") || name.starts_with("xml:") || name == "id" || name == "href")
                continue;
            const contract::attribute *const known = contract::find_attribute(type, name);
            if (known == nullptr) {
                note(element,
                     "<" + std::string(element.name()) + "> has no attribute \"" + attribute.name() + "\"");
                continue;
            }
            const std::string problem = value_problem(known->type, attribute.value());
            if (!problem.empty())
                note(element, std::string("attribute \"")
                                  .append(name)
                                  .append("\" should be ")
                                  .append(problem)
                                  .append(", not \"")
                                  .append(attribute.value())
                                  .append("\""));
        }
        for (const contract::data_class *one : contract::lineage(type))
            for (const contract::attribute &attribute : one->attributes)
                if (attribute.required && element.attribute(attribute.name).empty())
                    note(element, "<" + std::string(element.name()) + "> lacks its attribute \"" +
                                      attribute.name + "\"");
    }

    // The class that xsi:type names, or the one expected.
    const contract::data_class &actual_type(const pugi::xml_node &element,
                                            const contract::data_class &expected)
    {
        for (const pugi::xml_attribute &attribute : element.attributes()) {
            if (scope_.name_of(attribute.name(), true) != "xsi:type")
                continue;
            const std::string name = scope_.name_of(attribute.value());
            const contract::data_class *const named = contract::find_class(name);
            if (named != nullptr && contract::descends(*named, expected))
                return *named;
            note(element, "xsi:type=\"" + std::string(attribute.value()) + "\" is no class derived from " +
                              expected.name);
        }
        return expected;
    }

    void check_class_content(const pugi::xml_node &element, const contract::data_class &expected, int depth)
    {
        if (depth > DEPTH_MAX) {
            note(element, "more than " + std::to_string(DEPTH_MAX) + " elements within each other");
            return;
        }
        const contract::data_class &type = actual_type(element, expected);
        check_attributes(element, type);
        if (is_nil(element) || !element.attribute("href").empty())
            return;
        if (contract::holds_text(type))
            return check_simple(element, "xsd:string");
        std::map<const contract::member *, std::size_t> counts;
        for (const pugi::xml_node &child : element.children())
            check_child(child, type, counts, depth);
        for (const contract::data_class *one : contract::lineage(type))
            for (const contract::member &member : one->members)
                if (member.minimum > counts[&member])
                    note(element,
                         "<" + std::string(element.name()) + "> lacks " +
                             (member.minimum > 1 ? "at least " + std::to_string(member.minimum) + " of "
                                                 : "") +
                             "<" + member.tag + ">");
    }

    void check_child(const pugi::xml_node &child, const contract::data_class &type,
                     std::map<const contract::member *, std::size_t> &counts, int depth)
    {
        if (child.type() != pugi::node_element) {
            if (std::strspn(child.value(), " \t\r\n") != std::strlen(child.value()))
                note(child, "text where " + std::string(type.name) + " has members");
            return;
        }
        scope_.enter(child);
        const std::string name = scope_.name_of(child.name());
        scope_.leave();
        const contract::member *const member = contract::find_member(type, name);
        if (member == nullptr) {
            note(child,
                 "<" + std::string(child.name()) + "> is no member of " + type.name + suggestion(type, name));
            return;
        }
        if (++counts[member] == 2 && !member->many)
            note(child, "<" + std::string(child.name()) + "> is here a second time");
        check_element(child, *member, depth + 1);
    }

    // The member that may have been meant: one with the same local name.
    static std::string suggestion(const contract::data_class &type, std::string_view name)
    {
        for (const contract::data_class *one : contract::lineage(type))
            for (const contract::member &member : one->members)
                if (contract::local_name(member.tag) == contract::local_name(name))
                    return "; its namespace should be that of " + std::string(member.tag);
        return "";
    }

    std::string_view xml_;
    checked_document &result_;
    namespace_scope scope_;
};

} // namespace

checked_document check_document(std::string_view xml, const contract::data_class *expected)
{
    checked_document result;
    checker(xml, result).run(expected);
    return result;
}

std::string finding_lines(const std::string &file, const std::vector<finding> &findings)
{
    std::string lines;
    for (const finding &one : findings)
        lines +=
            file + ":" + std::to_string(one.line) + ":" + std::to_string(one.column) + ": " + one.text + "\n";
    return lines;
}

} // namespace cli
