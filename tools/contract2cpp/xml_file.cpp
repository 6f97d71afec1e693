// xml_file.cpp - see xml_file.h.
#include "xml_file.h"

#include <algorithm>
#include <fstream>
#include <sstream>

#include "names.h"
#include "reader.h"

namespace {

std::vector<std::size_t> line_ends_of(const std::string &bytes)
{
    std::vector<std::size_t> ends;
    for (std::size_t at = bytes.find('\n'); at != std::string::npos; at = bytes.find('\n', at + 1))
        ends.push_back(at);
    return ends;
}

} // namespace

std::string read_bytes(const std::filesystem::path &path, const std::string &name)
{
    std::ifstream file(path, std::ios::binary);
    std::ostringstream bytes;
    bytes << file.rdbuf();
    if (!file)
        throw contract_error({name, 0}, "can't be read");
    return bytes.str();
}

xml_file::xml_file(const std::filesystem::path &path, const std::string &file_name) : name(file_name)
{
    const std::string bytes = read_bytes(path, file_name);
    line_ends = line_ends_of(bytes);
    const pugi::xml_parse_result result =
        document.load_buffer(bytes.data(), bytes.size(), pugi::parse_default, pugi::encoding_utf8);
    if (!result)
        throw contract_error({name, line_at(result.offset)},
                             std::string("not well-formed: ") + result.description());
}

// Offsets that the parser doesn't know count as the file's start.
std::size_t xml_file::line_at(std::ptrdiff_t offset) const
{
    const auto at = static_cast<std::size_t>(std::max<std::ptrdiff_t>(offset, 0));
    return 1 + static_cast<std::size_t>(std::lower_bound(line_ends.begin(), line_ends.end(), at) -
                                        line_ends.begin());
}

place xml_file::at(pugi::xml_node node) const
{
    return {name, line_at(node.offset_debug())};
}

std::string xml_file::uri_of(pugi::xml_node node, std::string_view prefix) const
{
    const std::string attribute = prefix.empty() ? "xmlns" : "xmlns:" + std::string(prefix);
    for (pugi::xml_node scope = node; scope; scope = scope.parent()) {
        if (const pugi::xml_attribute found = scope.attribute(attribute.c_str()))
            return found.value();
    }
    if (!prefix.empty())
        refuse(node, "prefix \"" + std::string(prefix) + "\" isn't declared");
    return {};
}

qualified_name xml_file::name_of(pugi::xml_node element) const
{
    const auto [prefix, local] = split_name(element.name());
    return {uri_of(element, prefix), std::string(local), at(element)};
}

bool xml_file::is(pugi::xml_node element, std::string_view uri, std::string_view local) const
{
    const qualified_name found = name_of(element);
    return found.uri == uri && found.local == local;
}

qualified_name xml_file::qualified(pugi::xml_node node, const char *attribute) const
{
    const std::string text = required(node, attribute);
    const auto [prefix, local] = split_name(text);
    return {uri_of(node, prefix), std::string(local), at(node)};
}

std::string xml_file::required(pugi::xml_node node, const char *attribute) const
{
    const pugi::xml_attribute found = node.attribute(attribute);
    if (!found || *found.value() == '\0')
        refuse(node, std::string(node.name()) + " has no " + attribute);
    return found.value();
}

void xml_file::allow_attributes(pugi::xml_node node, std::initializer_list<std::string_view> names) const
{
    for (const pugi::xml_attribute attribute : node.attributes()) {
        const std::string_view found = attribute.name();
        if (found == "xmlns" || found.starts_with("xmlns:"))
            continue;
        if (std::find(names.begin(), names.end(), found) == names.end())
            refuse(node, "attribute " + std::string(found) + " of " + node.name() + " can't be translated");
    }
}

void xml_file::refuse(pugi::xml_node node, const std::string &reason) const
{
    throw contract_error(at(node), reason);
}

std::string plain_text(std::string_view text)
{
    std::istringstream words{std::string(text)};
    std::string plain;
    for (std::string word; words >> word;)
        plain += plain.empty() ? word : " " + word;
    return plain;
}
