// default_head.cpp - see default_head.h.
#include "xml/default_head.h"

#include <cstring>

#include "xml/namespace.h"
#include "xml/namespace_scope.h"
#include "xml/tag_view.h"
#include "xml/xml_input.h"

namespace {

constexpr std::size_t DEFAULT_HEAD_MIN = sizeof " xmlns=\"\">" - 1;

// Where the head is if it is remembered. Those of different namespaces mostly differ in length or in the last letter
// before the quote, or both.
default_head &place_of(soap_namespace_scope *scope, const char *bytes, std::size_t length)
{
    return scope->default_heads[(length ^ static_cast<unsigned char>(bytes[length - 3])) % DEFAULT_HEADS];
}

// What a declaration is bound to by the row's own URI: it has received no other, and one of its own changes nothing.
bool is_bound(const soap *ctx, std::int16_t row)
{
    return namespace_row_lengths(ctx, static_cast<std::size_t>(row)) != nullptr &&
           ctx->local_namespaces[row].received == nullptr;
}

} // namespace

bool default_head_resume(soap *ctx, const char *name, const char *stop)
{
    soap_namespace_scope *const scope = ctx->namespace_scope;
    if (scope == nullptr || ctx->local_namespaces == nullptr)
        return false;
    const auto left = static_cast<std::size_t>(input_end(ctx) - stop);
    const void *const end = std::memchr(stop, '>', left < DEFAULT_HEAD_SIZE ? left : DEFAULT_HEAD_SIZE);
    if (end == nullptr)
        return false;
    const auto length = static_cast<std::size_t>(static_cast<const char *>(end) - stop) + 1;
    if (length < DEFAULT_HEAD_MIN)
        return false;
    const default_head &head = place_of(scope, stop, length);
    if (head.length != length || !same_name(stop, head.bytes, length) ||
        std::memchr(name, ':', static_cast<std::size_t>(stop - name)) != nullptr ||
        !is_bound(ctx, head.row) || !xml_default_redeclare(ctx, head.row))
        return false;
    ctx->has_body = static_cast<std::int16_t>(!head.empty_tag);
    input_consume(ctx, stop + length);
    return true;
}

void default_head_learn(soap *ctx, const char *start)
{
    const soap_prefix *const record = ctx->prefix_list;
    const auto length = static_cast<std::size_t>(input_here(ctx) - start);
    if (ctx->bare_declarations != 1 || record->prefix_length != 0 || length > DEFAULT_HEAD_SIZE ||
        length < DEFAULT_HEAD_MIN || !xml_row_is_sure(ctx, record->index) || !is_bound(ctx, record->index))
        return;
    default_head &head = place_of(ctx->namespace_scope, start, length);
    head.length = static_cast<std::uint8_t>(length);
    head.row = record->index;
    head.empty_tag = ctx->has_body == 0;
    std::memcpy(head.bytes, start, length);
}
