// new_command.cpp - see new_command.h.
//
// Always: the document is valid. Required members are elements, the others are in comments,
// ready to be uncommented.
#include "new_command.h"

#include <cstdio>
#include <set>
#include <sstream>

#include <zuv_client_pro/soap_registry.h>

#include "documents.h"
#include "failure.h"
#include "operations.h"
#include "simple_types.h"
#include "text_files.h"

namespace cli {

namespace {

constexpr std::size_t COLUMNS = 110;

// A comment of one or more lines; "--" is not allowed in one.
std::string comment(const std::string &indent, const std::string &text)
{
    std::istringstream words(text);
    std::string lines, line = indent + "<!--";
    for (std::string word; words >> word;) {
        for (std::size_t at; (at = word.find("--")) != std::string::npos;)
            word.replace(at, 2, "- -");
        if (line.size() + 1 + word.size() > COLUMNS - 4) {
            lines += line + "\n";
            line = indent + "    ";
        }
        line += " " + word;
    }
    return lines + line + " -->\n";
}

std::string type_words(std::string_view type)
{
    return contract::find_class(type) != nullptr ? "a " + std::string(type) : value_words(type);
}

std::string occurrence_words(const contract::member &member)
{
    if (!member.many)
        return member.minimum != 0       ? "required"
               : *member.initial != '\0' ? "usually " + std::string(member.initial)
                                         : "optional";
    return member.minimum != 0 ? "at least " + std::to_string(member.minimum) : "any number";
}

// An initial element; one of a class is empty.
std::string first_element(const contract::member &member)
{
    const std::string tag = member.tag;
    if (contract::find_class(member.type) == nullptr)
        return "<" + tag + ">" + sample_value(member.type) + "</" + tag + ">";
    return "<" + tag + (member.minimum != 0 ? " xsi:nil=\"true\"/>" : "/>");
}

std::string member_text(const contract::member &member)
{
    std::string text =
        comment("  ", std::string(contract::local_name(member.tag)) + ", " + occurrence_words(member) + ", " +
                          type_words(member.type) + ". " + member.documentation);
    for (unsigned i = 0; i < member.minimum; ++i)
        text += "  " + first_element(member) + "\n";
    if (member.minimum == 0)
        text += "  <!-- " + first_element(member) + " -->\n";
    return text;
}

// The prefixes of the members, and their namespaces.
std::string declarations(const contract::data_class &of)
{
    std::set<std::string> prefixes = {"xsi"};
    const auto add = [&](std::string_view name) { prefixes.emplace(name.substr(0, name.find(':'))); };
    add(of.name);
    for (const contract::data_class *one : contract::lineage(of))
        for (const contract::member &member : one->members)
            add(member.tag);
    return namespace_declarations("\n    ", prefixes);
}

std::string attribute_texts(const contract::data_class &of)
{
    std::string text;
    for (const contract::data_class *one : contract::lineage(of))
        for (const contract::attribute &attribute : one->attributes)
            text += comment("", "Attribute " + std::string(attribute.name) +
                                    (attribute.required ? ", required, " : ", optional, ") +
                                    type_words(attribute.type) + ". " + attribute.documentation);
    return text;
}

std::string required_attributes(const contract::data_class &of)
{
    std::string text;
    for (const contract::data_class *one : contract::lineage(of))
        for (const contract::attribute &attribute : one->attributes)
            if (attribute.required)
                text += "\n    " + std::string(attribute.name) + "=\"" + sample_value(attribute.type) + "\"";
    return text;
}

// The operations whose request is of the class.
std::string use_words(const contract::data_class &of)
{
    std::string text;
    for (const operation &op : all_operations())
        if (std::string_view(soap_type_name(op.request_type)) == of.name)
            text += (text.empty() ? " Request of " : ", ") + std::string(op.port) + " " + op.name;
    return text.empty() ? "" : text + ".";
}

std::string derived_words(const contract::data_class &of)
{
    std::string text;
    for (const contract::data_class &one : contract::classes)
        if (&one != &of && contract::descends(one, of))
            text += (text.empty() ? " Classes derived from it, named by xsi:type: " : ", ") +
                    std::string(one.name);
    return text.empty() ? "" : text + ".";
}

} // namespace

const contract::data_class &class_named(const std::string &name)
{
    const std::vector<const contract::data_class *> meant = contract::classes_meant(name);
    if (meant.size() == 1)
        return *meant.front();
    std::string text = meant.empty()
                           ? "no class has the name \"" + printable(name) + "\"; zuv new --list lists them"
                           : printable(name) + " is the name of several classes:";
    for (const contract::data_class *one : meant)
        text += " " + std::string(one->name);
    throw failure(EXIT_USAGE, text);
}

exit_code print_new_document(const std::string &class_name)
{
    const contract::data_class &of = class_named(class_name);
    std::string text = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n";
    text += comment("", std::string(of.name) + ": " + of.documentation + use_words(of) + derived_words(of));
    text += attribute_texts(of) + "<" + of.name + declarations(of) + required_attributes(of) + ">";
    if (!contract::holds_text(of))
        text += "\n";
    for (const contract::data_class *one : contract::lineage(of))
        for (const contract::member &member : one->members)
            text += member_text(member);
    write_file("-", text + "</" + of.name + ">\n");
    return EXIT_DONE;
}

exit_code print_classes()
{
    std::string text;
    for (const contract::data_class &one : contract::classes)
        text += std::string(one.name) + "\t" + one.documentation + "\n";
    write_file("-", text);
    return EXIT_DONE;
}

} // namespace cli
