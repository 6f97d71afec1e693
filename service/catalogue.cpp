// catalogue.cpp - see catalogue.h.
#include "catalogue.h"

#include <algorithm>
#include <cstdlib>
#include <utility>

namespace service {

namespace {

constexpr std::uint64_t BYTES_MAX = 1 << 20;
constexpr std::uint32_t DEPTH_MAX = 64;
constexpr std::string_view REPLACEMENT =
    "conditionalReplacement"; // attribute that names what replaces an update

constexpr collection_row COLLECTIONS[] = {
    {"all", "All products", ""},         {"hardware", "Hardware", "all"},
    {"storage", "Storage", "hardware"},  {"disk", "Disk storage", "storage"},
    {"tape", "Tape storage", "storage"}, {"servers", "Servers", "hardware"},
    {"software", "Software", "all"},     {"database", "Databases", "software"},
    {"tools", "Tools", "software"},
};

const collection_row *find_collection(std::string_view id)
{
    const auto found = std::find_if(std::begin(COLLECTIONS), std::end(COLLECTIONS),
                                    [&](const collection_row &row) { return row.id == id; });
    return found == std::end(COLLECTIONS) ? nullptr : found;
}

std::string_view uri_of(std::string_view prefix)
{
    for (const soap_namespace *row = soap_program_namespaces; row->prefix != nullptr; ++row)
        if (prefix == row->prefix)
            return row->uri;
    return {};
}

std::string catalogue_document()
{
    std::string xml = "<u:UpdateMetaData";
    constexpr std::pair<std::string_view, std::string_view> PREFIXES[] = {
        {"u", "protocolUpdateOrder"}, {"p", "protocol"}, {"r", "protocolProblemReport"}, {"xsi", "xsi"}};
    for (const auto &[own, contract] : PREFIXES)
        xml.append(" xmlns:").append(own).append("=\"").append(uri_of(contract)).append("\"");
    return xml.append(">").append(catalogue_text()).append("</u:UpdateMetaData>");
}

template <class Reference> bool names(const Reference *reference, const update_record &update)
{
    return reference != nullptr && text_of(reference->updateId) == text_of(update.updateId) &&
           text_of(reference->updateIdQualifier) == text_of(update.updateIdQualifier);
}

// Adds an update unless it is there already.
void add(updates &list, const update_record *update)
{
    if (update != nullptr && std::find(list.begin(), list.end(), update) == list.end())
        list.push_back(update);
}

} // namespace

catalogue::catalogue() : codec_(BYTES_MAX, DEPTH_MAX)
{
    const auto *const root = codec_.read<update_record>(catalogue_document());
    all_.assign(root->updateMetaData.begin(), root->updateMetaData.end());
}

const update_record *catalogue::find(std::string_view id, std::string_view qualifier) const
{
    for (const update_record *update : all_)
        if (text_of(update->updateId) == id &&
            (qualifier.empty() || text_of(update->updateIdQualifier) == qualifier))
            return update;
    return nullptr;
}

template <class Reference> updates catalogue::follow(const std::vector<Reference *> &references) const
{
    updates found;
    for (const Reference *reference : references)
        add(found, find(text_of(reference->updateId), text_of(reference->updateIdQualifier)));
    return found;
}

// Each relation may be stated at either end.
updates catalogue::superseding(const update_record &update) const
{
    updates found = follow(update.superseding);
    for (const update_record *other : all_)
        for (const auto *reference : other->superseded)
            if (names(reference, update))
                add(found, other);
    return found;
}

updates catalogue::superseded(const update_record &update) const
{
    updates found = follow(update.superseded);
    for (const update_record *other : all_)
        for (const auto *reference : other->superseding)
            if (names(reference, update))
                add(found, other);
    return found;
}

updates catalogue::required(const update_record &update) const
{
    return follow(update.requisite);
}

updates catalogue::patches(const update_record &update) const
{
    updates found;
    for (const update_record *other : all_)
        for (const auto *reference : other->patched)
            if (names(reference, update))
                add(found, other);
    return found;
}

updates catalogue::contained(const update_record &update) const
{
    return follow(update.contained);
}

updates catalogue::replacements(const update_record &update) const
{
    updates found;
    for (const auto *attribute : update.attribute)
        if (text_of(attribute->name) == REPLACEMENT)
            add(found, find(text_of(attribute->value)));
    return found;
}

const catalogue &the_catalogue()
{
    static const catalogue only;
    return only;
}

std::span<const collection_row> collections()
{
    return COLLECTIONS;
}

std::string_view collection_parent(std::string_view id)
{
    const collection_row *const row = find_collection(id);
    return row == nullptr ? std::string_view() : row->parent;
}

bool collection_is_within(std::string_view id, std::string_view ancestor)
{
    for (; !id.empty(); id = collection_parent(id))
        if (id == ancestor)
            return true;
    return false;
}

std::string update_data(const update_record &update)
{
    const std::size_t size = std::strtoul(text_of(update.size).c_str(), nullptr, 10);
    const std::string line = "Data of update " + text_of(update.updateId) + "\n";
    std::string data;
    while (data.size() < size)
        data.append(line, 0, size - data.size());
    return data;
}

} // namespace service
