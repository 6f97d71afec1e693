// xml_write_canonical.cpp - what canonical output adds: namespaces declared where they are used, attributes
// in order.
//
// Elsewhere: which prefixes wait to be declared (namespace_prefix.cpp), writing the tags (xml_write.cpp).
//
// Always: an element's declarations come first, ordered by prefix; then attributes without a namespace, by
// name; then the others, by URI and local name. A prefix is declared again only where the output above gave
// it no meaning or another one.
#include <cstring>

#include <zuv_client_pro/soap_error.h>

#include "core/failure.h"
#include "xml/namespace.h"
#include "xml/xml_write.h"

namespace {

constexpr std::size_t PREFIX_DECLARATION_SIZE = 1024; // bytes of "xmlns:" and a prefix, terminator included

bool is_declaration(std::string_view name)
{
    return name == "xmlns" || name.starts_with("xmlns:");
}

// A generated declaration in the table serves prefixes that the stack doesn't know.
const char *declared_in_table(const soap *ctx, std::string_view prefix)
{
    for (const soap_attribute *record = ctx->attribute_list; record != nullptr; record = record->next) {
        const std::string_view name(record->name);
        if (record->visible == 2 && name.starts_with("xmlns:") && name.substr(6) == prefix)
            return record->value;
    }
    return nullptr;
}

// URI by which an attribute is ordered; null without a namespace. A declaration goes by its own value.
const char *uri_of(const soap *ctx, const soap_attribute *record)
{
    const std::string_view prefix = xml_prefix_of(record->name);
    if (is_declaration(record->name))
        return record->value;
    if (prefix.empty())
        return nullptr;
    if (prefix == "xml")
        return XML_NAMESPACE_URI;
    const soap_prefix *known = xml_prefix_find(ctx, prefix);
    return known != nullptr && known->uri != nullptr ? known->uri : declared_in_table(ctx, prefix);
}

int group_of(const soap_attribute *record)
{
    if (is_declaration(record->name))
        return 0;
    return record->uri != nullptr ? 2 : 1;
}

bool comes_before(const soap_attribute *one, const soap_attribute *other)
{
    const int group = group_of(one);
    if (group != group_of(other))
        return group < group_of(other);
    if (group < 2)
        return std::strcmp(one->name, other->name) < 0;
    const int by_uri = std::strcmp(one->uri, other->uri);
    return by_uri != 0 ? by_uri < 0 : xml_local_part(one->name) < xml_local_part(other->name);
}

// Takes the visible records out of the table, in canonical order.
soap_attribute *take_sorted(soap *ctx)
{
    soap_attribute *sorted = nullptr;
    for (soap_attribute **link = &ctx->attribute_list; *link != nullptr;) {
        soap_attribute *record = *link;
        if (record->visible == 0) {
            link = &record->next;
            continue;
        }
        *link = record->next;
        soap_attribute **place = &sorted;
        while (*place != nullptr && comes_before(*place, record))
            place = &(*place)->next;
        record->next = *place;
        *place = record;
    }
    return sorted;
}

void find_uris(soap *ctx)
{
    for (soap_attribute *record = ctx->attribute_list; record != nullptr; record = record->next)
        record->uri = record->visible ? uri_of(ctx, record) : nullptr;
}

void sort_attributes(soap *ctx)
{
    find_uris(ctx);
    soap_attribute *sorted = take_sorted(ctx);
    soap_attribute **end = &sorted;
    while (*end != nullptr)
        end = &(*end)->next;
    *end = ctx->attribute_list;
    ctx->attribute_list = sorted;
}

// Unprefixed attributes are in no namespace; declarations and "xml" need none.
int use_attribute_prefixes(soap *ctx)
{
    for (const soap_attribute *record = ctx->attribute_list; record != nullptr; record = record->next) {
        const std::string_view prefix = xml_prefix_of(record->name);
        if (record->visible && !prefix.empty() && declared_in_table(ctx, prefix) == nullptr &&
            soap_prefix_use(ctx, record->name))
            return ctx->error;
    }
    return SOAP_OK;
}

// Writes the name of the attribute that declares a prefix. False if the prefix is too long for it.
bool compose_declaration(const soap_prefix *record, char (&name)[PREFIX_DECLARATION_SIZE])
{
    if (record->prefix_length + sizeof("xmlns:") > sizeof name)
        return false;
    std::memcpy(name, "xmlns:", sizeof("xmlns:"));
    std::memcpy(name + (record->prefix_length == 0 ? 5 : 6), record->prefix, record->prefix_length + 1U);
    return true;
}

int declare(soap *ctx, soap_prefix *record)
{
    char name[PREFIX_DECLARATION_SIZE];
    if (!compose_declaration(record, name))
        return fail(ctx, SOAP_LENGTH);
    xml_prefix_declared(ctx, record);
    return soap_attr_set(ctx, name, record->uri, 1);
}

int declare_waiting(soap *ctx)
{
    for (soap_prefix *record = ctx->prefix_list; (record != nullptr) && xml_prefixes_waiting(ctx) > 0;
         record = record->next) {
        if (record->index == 1 && record->uri != nullptr && declare(ctx, record))
            return ctx->error;
    }
    return SOAP_OK;
}

bool includes(const soap *ctx, std::string_view prefix)
{
    return ctx->canonical_include != nullptr && xml_list_names(ctx->canonical_include, prefix);
}

} // namespace

int xml_canonical_root(soap *ctx, std::size_t rows)
{
    for (std::size_t i = 0; i < rows && ctx->local_namespaces[i].prefix != nullptr; ++i) {
        const soap_namespace &row = ctx->local_namespaces[i];
        const char *uri = xml_row_uri(row);
        if (*row.prefix == '\0' || uri == nullptr)
            continue;
        if (soap_prefix_push_out(ctx, row.prefix, uri, includes(ctx, row.prefix) ? 1 : 0))
            return ctx->error;
    }
    return SOAP_OK;
}

int xml_canonical_attributes(soap *ctx)
{
    if (use_attribute_prefixes(ctx) || declare_waiting(ctx))
        return ctx->error;
    if (ctx->attributes_set > 0)
        sort_attributes(ctx);
    return SOAP_OK;
}
