// names.cpp - see names.h.
#include "names.h"

#include <algorithm>
#include <cctype>
#include <iterator>

namespace {

constexpr std::string_view KEYWORDS[] = {
    "alignas",     "alignof",  "and",        "and_eq",    "asm",       "auto",         "bitand",
    "bitor",       "bool",     "break",      "case",      "catch",     "char",         "char16_t",
    "char32_t",    "char8_t",  "class",      "co_await",  "co_return", "co_yield",     "compl",
    "concept",     "const",    "const_cast", "consteval", "constexpr", "constinit",    "continue",
    "decltype",    "default",  "delete",     "do",        "double",    "dynamic_cast", "else",
    "enum",        "explicit", "export",     "extern",    "false",     "float",        "for",
    "friend",      "goto",     "if",         "inline",    "int",       "long",         "mutable",
    "namespace",   "new",      "noexcept",   "not",       "not_eq",    "nullptr",      "operator",
    "or",          "or_eq",    "private",    "protected", "public",    "register",     "reinterpret_cast",
    "requires",    "return",   "short",      "signed",    "sizeof",    "static",       "static_assert",
    "static_cast", "struct",   "switch",     "template",  "this",      "thread_local", "throw",
    "true",        "try",      "typedef",    "typeid",    "typename",  "union",        "unsigned",
    "using",       "virtual",  "void",       "volatile",  "wchar_t",   "while",        "xor",
    "xor_eq"};

} // namespace

std::pair<std::string_view, std::string_view> split_name(std::string_view name)
{
    const auto colon = name.find(':');
    if (colon == std::string_view::npos)
        return {{}, name};
    return {name.substr(0, colon), name.substr(colon + 1)};
}

std::string spelled(std::string_view local)
{
    std::string name;
    for (const char c : local) {
        if (c == '.')
            name += "_x002e";
        else if (c == '-')
            name += '_';
        else if (std::isalnum(static_cast<unsigned char>(c)) || c == '_')
            name += c;
        else
            return {};
    }
    return name;
}

std::string identifier(std::string_view local)
{
    std::string name = spelled(local);
    if (!name.empty() && std::isdigit(static_cast<unsigned char>(name[0])))
        name.insert(name.begin(), '_');
    if (std::find(std::begin(KEYWORDS), std::end(KEYWORDS), name) != std::end(KEYWORDS))
        name += '_';
    return name;
}

std::string type_name(std::string_view prefix, std::string_view local)
{
    return std::string(prefix) + "__" + spelled(local);
}

std::string type_name(std::string_view xml_type)
{
    const auto [prefix, local] = split_name(xml_type);
    return prefix.empty() ? spelled(local) : type_name(spelled(prefix), local);
}
