// tag_compare.cpp - comparison of a name that was read with one that is asked for, by namespace row.
//
// Elsewhere: the stack of declarations itself (namespace_prefix.cpp), pattern compare (soap_tag_match).
//
// Always: prefixes of the sender count only through the row that their namespace was bound to.
#include <cstring>

#include <zuv_client_pro/soap_error.h>

#include "core/failure.h"
#include "xml/namespace.h"
#include "xml/namespace_scope.h"
#include "xml/tag_view.h"
#include "xml/xml_scan.h"

namespace {

constexpr std::size_t CACHE_SIZE = sizeof(soap::prefix_cache) / sizeof(soap_prefix_cache);
static_assert((CACHE_SIZE & (CACHE_SIZE - 1)) == 0 && CACHE_SIZE <= 8);
static_assert(CACHE_SIZE == sizeof(soap_namespace_scope::prefix_changes) / sizeof(std::uint64_t));

bool is_xml_prefix(const char *text, std::size_t length)
{
    return length == 3 && std::memcmp(text, "xml", 3) == 0;
}

int search_stack(const soap *ctx, const char *prefix, std::size_t length)
{
    const soap_prefix *record = xml_prefix_find(ctx, {prefix, length});
    if (record != nullptr)
        return record->index >= 0 ? record->index : TAG_ROW_UNBOUND;
    if (length == 0)
        return TAG_ROW_NO_PREFIX;
    return is_xml_prefix(prefix, length) ? TAG_ROW_UNBOUND : TAG_ROW_UNDECLARED;
}

const soap_namespace *table_row(const soap *ctx, int row)
{
    const soap_namespace *table = ctx->local_namespaces != nullptr ? ctx->local_namespaces : ctx->namespaces;
    return table != nullptr ? table + row : nullptr;
}

// What is remembered is of the stack as it is now.
void cache_follow(soap *ctx)
{
    if (ctx->prefix_cache_list == ctx->prefix_list)
        return;
    ctx->prefix_cache_list = ctx->prefix_list;
    ctx->prefix_cache_valid = 0;
}

// Prefixes that come in turn should have places of their own: "protocol" and those of each port do.
std::size_t cache_place(const char *prefix, std::size_t length)
{
    return length == 0 ? 0 : (static_cast<unsigned char>(prefix[length - 1]) ^ length) & (CACHE_SIZE - 1);
}

// Neighbouring tags mostly have one prefix: that of the tag resolved last is tried first. True: it is the
// tag's.
bool resolve_by_last_prefix(soap *ctx)
{
    if (ctx->namespace_scope == nullptr || ctx->prefix_cache_list != ctx->prefix_list)
        return false;
    const unsigned place = ctx->namespace_scope->tag_prefix;
    const soap_prefix_cache &last = ctx->prefix_cache[place];
    if ((ctx->prefix_cache_valid & 1u << place) == 0 || last.length >= ctx->tag_length ||
        ctx->tag[last.length] != ':' || !same_name(ctx->tag, last.text, last.length))
        return false;
    ctx->tag_local = static_cast<std::uint16_t>(last.length + 1u);
    ctx->tag_row = last.row;
    ctx->tag_resolved = true;
    return true;
}

tag_view view_of_tag(const soap *ctx)
{
    return {ctx->tag + ctx->tag_local, static_cast<std::uint32_t>(ctx->tag_length - ctx->tag_local),
            ctx->tag_row};
}

// Out of line, so that the short way of soap_held_tag saves no registers for it.
[[gnu::noinline]] tag_view resolve_tag(soap *ctx)
{
    const void *colon = std::memchr(ctx->tag, ':', ctx->tag_length);
    const std::size_t prefix_length =
        colon != nullptr ? static_cast<std::size_t>(static_cast<const char *>(colon) - ctx->tag) : 0;
    ctx->tag_local = static_cast<std::uint16_t>(colon != nullptr ? prefix_length + 1 : 0);
    ctx->tag_row = static_cast<std::int16_t>(xml_prefix_row(ctx, ctx->tag, prefix_length));
    ctx->tag_resolved = true;
    if (ctx->namespace_scope != nullptr)
        ctx->namespace_scope->tag_prefix = static_cast<std::uint8_t>(cache_place(ctx->tag, prefix_length));
    return view_of_tag(ctx);
}

// The parts of a name; of the held tag they are known.
struct name_parts {
    const char *local;
    std::size_t prefix_length;
};

name_parts split_held(const soap *ctx, const tag_view &held)
{
    return {held.local, ctx->tag_local != 0 ? ctx->tag_local - 1u : 0u};
}

name_parts split_name(const char *name)
{
    const char *colon = std::strchr(name, ':');
    if (colon == nullptr)
        return {name, 0};
    return {colon + 1, static_cast<std::size_t>(colon - name)};
}

// soap_prefix_compare of a prefix whose row is known.
int compare_row(soap *ctx, int row, const char *read, const char *asked, std::size_t read_length,
                std::size_t asked_length)
{
    if ((ctx->mode & MODE_IGNORE_NAMESPACES) != 0)
        return SOAP_OK;
    if (is_xml_prefix(read, read_length) && is_xml_prefix(asked, asked_length) && row == TAG_ROW_UNBOUND)
        return SOAP_OK;
    if (row == TAG_ROW_UNDECLARED)
        return fail(ctx, SOAP_SYNTAX_ERROR);
    if (row < 0)
        return SOAP_NAMESPACE_ERROR;
    return namespace_row_has_prefix(ctx, row, asked, asked_length) ? 0 : SOAP_NAMESPACE_ERROR;
}

// The held tag is spelled as the one asked for, and its prefix stands for the row of that name.
bool is_spelled_so(const soap *ctx, const tag_view &held, const char *asked)
{
    return held.row >= 0 && ctx->tag_local > 1 && std::strcmp(ctx->tag, asked) == 0 &&
           namespace_row_has_prefix(ctx, held.row, asked, ctx->tag_local - 1U);
}

} // namespace

int xml_prefix_row(soap *ctx, const char *prefix, std::size_t length)
{
    cache_follow(ctx);
    const std::size_t place = cache_place(prefix, length);
    soap_prefix_cache &entry = ctx->prefix_cache[place];
    const auto bit = static_cast<std::uint8_t>(1u << place);
    if ((ctx->prefix_cache_valid & bit) != 0 && entry.length == length &&
        same_name(entry.text, prefix, length))
        return entry.row;
    const int row = search_stack(ctx, prefix, length);
    if (length <= sizeof entry.text) {
        const bool other = entry.length != length || !same_name(entry.text, prefix, length);
        if (other && ctx->namespace_scope != nullptr)
            ++ctx->namespace_scope->prefix_changes[place];
        std::memcpy(entry.text, prefix, length);
        entry.length = static_cast<std::uint8_t>(length);
        entry.row = static_cast<std::int16_t>(row);
        ctx->prefix_cache_valid |= bit;
    }
    return row;
}

void xml_tag_has_default(soap *ctx, std::int16_t row)
{
    const std::size_t place = cache_place(nullptr, 0);
    soap_prefix_cache &entry = ctx->prefix_cache[place];
    cache_follow(ctx);
    if (entry.length != 0)
        ++ctx->namespace_scope->prefix_changes[place];
    entry.length = 0;
    entry.row = row;
    ctx->prefix_cache_valid |= static_cast<std::uint8_t>(1U << place);
    ctx->tag_local = 0;
    ctx->tag_row = row;
    ctx->tag_resolved = true;
    ctx->namespace_scope->tag_prefix = static_cast<std::uint8_t>(place);
}

bool xml_row_has_prefix(const soap *ctx, int row, const char *prefix, std::size_t length)
{
    const soap_namespace *entry = table_row(ctx, row);
    if (entry == nullptr || entry->prefix == nullptr)
        return true;
    if (std::strncmp(entry->prefix, prefix, length) != 0)
        return false;
    return entry->prefix[length] == '\0' || entry->prefix[length] == '_';
}

tag_view soap_held_tag(soap *ctx)
{
    const bool known = ctx->tag_resolved && ctx->prefix_cache_list == ctx->prefix_list;
    return known || resolve_by_last_prefix(ctx) ? view_of_tag(ctx) : resolve_tag(ctx);
}

int soap_prefix_compare(soap *ctx, const char *read, const char *asked, std::size_t read_length,
                        std::size_t asked_length)
{
    const int row = xml_prefix_row(ctx, read, read_length);
    return compare_row(ctx, row, read, asked, read_length, asked_length);
}

int soap_tag_compare(soap *ctx, const char *read, const char *asked)
{
    if (asked == nullptr || *asked == '\0')
        return SOAP_OK;
    if (read == nullptr)
        return SOAP_TAG_MISMATCH;
    const bool is_held = read == ctx->tag;
    const tag_view held = is_held ? soap_held_tag(ctx) : tag_view{};
    if (is_held && is_spelled_so(ctx, held, asked))
        return SOAP_OK;
    const name_parts name = is_held ? split_held(ctx, held) : split_name(read);
    const char *asked_colon = std::strchr(asked, ':');
    if (asked_colon == nullptr)
        return std::strcmp(name.local, asked) == 0 ? 0 : SOAP_TAG_MISMATCH;
    const bool any_local = name.local != read && asked_colon[1] == '\0';
    if (!any_local && std::strcmp(name.local, asked_colon + 1) != 0)
        return SOAP_TAG_MISMATCH;
    if (asked_colon == asked)
        return SOAP_OK;
    const int row = is_held ? held.row : xml_prefix_row(ctx, read, name.prefix_length);
    const int error =
        compare_row(ctx, row, read, asked, name.prefix_length, static_cast<std::size_t>(asked_colon - asked));
    return error == SOAP_NAMESPACE_ERROR ? SOAP_TAG_MISMATCH : error;
}
