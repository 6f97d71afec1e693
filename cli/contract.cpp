// contract.cpp - see contract.h.
#include "contract.h"

#include <algorithm>
#include <cctype>
#include <string>
#include <unordered_map>

namespace contract {

namespace {

template <class T> const T *find_in(std::span<const T> all, std::string_view name)
{
    static const auto index = [all] {
        std::unordered_map<std::string_view, const T *> by_name;
        for (const T &one : all)
            by_name.emplace(one.name, &one);
        return by_name;
    }();
    const auto found = index.find(name);
    return found == index.end() ? nullptr : found->second;
}

bool same_but_for_case(std::string_view a, std::string_view b)
{
    return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                      [](unsigned char x, unsigned char y) { return std::tolower(x) == std::tolower(y); });
}

// "protocol:Client.ObjectNotFound" of "protocol__Client_x002eObjectNotFound".
std::string xml_spelling(std::string_view name)
{
    std::string text(name.starts_with('_') ? name.substr(1) : name);
    if (const std::size_t at = text.find("__"); at != std::string::npos)
        text.replace(at, 2, ":");
    for (std::size_t at; (at = text.find("_x002e")) != std::string::npos;)
        text.replace(at, 6, ".");
    return text;
}

} // namespace

const data_class *find_class(std::string_view xml_name)
{
    return find_in(classes, xml_name);
}

const enumeration *find_enumeration(std::string_view xml_name)
{
    return find_in(enumerations, xml_name);
}

std::vector<const data_class *> classes_meant(std::string_view name)
{
    const std::string spelled = xml_spelling(name);
    if (const data_class *exact = find_class(spelled))
        return {exact};
    std::vector<const data_class *> meant;
    const bool prefixed = spelled.find(':') != std::string::npos;
    for (const data_class &one : classes)
        if (same_but_for_case(prefixed ? std::string_view(one.name) : local_name(one.name), spelled))
            meant.push_back(&one);
    return meant;
}

std::vector<const data_class *> lineage(const data_class &of)
{
    std::vector<const data_class *> line;
    for (const data_class *one = &of; one != nullptr; one = find_class(one->base))
        line.insert(line.begin(), one);
    return line;
}

bool descends(const data_class &derived, const data_class &base)
{
    const data_class *one = &derived;
    while (one != nullptr && one != &base)
        one = find_class(one->base);
    return one != nullptr;
}

const member *find_member(const data_class &of, std::string_view tag)
{
    for (const data_class *one = &of; one != nullptr; one = find_class(one->base))
        for (const member &m : one->members)
            if (m.tag == tag)
                return &m;
    return nullptr;
}

const attribute *find_attribute(const data_class &of, std::string_view name)
{
    for (const data_class *one = &of; one != nullptr; one = find_class(one->base))
        for (const attribute &a : one->attributes)
            if (a.name == name)
                return &a;
    return nullptr;
}

bool holds_text(const data_class &of)
{
    const std::vector<const data_class *> line = lineage(of);
    return std::any_of(line.begin(), line.end(), [](const data_class *one) { return one->text; });
}

std::string_view local_name(std::string_view name)
{
    return name.substr(name.find(':') + 1);
}

} // namespace contract
