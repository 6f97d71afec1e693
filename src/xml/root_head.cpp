// root_head.cpp - see root_head.h.
#include "xml/root_head.h"

#include <cstring>

#include "xml/namespace.h"
#include "xml/namespace_scope.h"
#include "xml/xml_input.h"

namespace {

// Notes the URIs that rows have received. False if they don't fit.
bool note_received(const soap *ctx, remembered_root &root, std::size_t used)
{
    root.received_count = 0;
    for (std::size_t i = 0; ctx->local_namespaces[i].prefix != nullptr; ++i) {
        const char *uri = ctx->local_namespaces[i].received;
        if (uri == nullptr)
            continue;
        const std::size_t size = std::strlen(uri) + 1;
        if (root.received_count == ROOT_RECEIVED_MAX || size > ROOT_BYTES_MAX - used)
            return false;
        root.received[root.received_count++] = {
            static_cast<std::int16_t>(i),
            static_cast<const char *>(std::memcpy(root.bytes + used, uri, size))};
        used += size;
    }
    return true;
}

} // namespace

bool root_head_stands_alone(const soap *ctx)
{
    if (ctx->prefix_list != nullptr || ctx->nesting_level != 0 || ctx->local_namespaces == nullptr ||
        ctx->namespace_scope == nullptr)
        return false;
    if (namespace_copy_is_clean(ctx))
        return true;
    for (const soap_namespace *row = ctx->local_namespaces; row->prefix != nullptr; ++row) {
        if (row->received != nullptr)
            return false;
    }
    return true;
}

bool root_head_resume(soap *ctx)
{
    soap_namespace_scope *scope = ctx->namespace_scope;
    const remembered_root &root = scope->root;
    const char *here = input_here(ctx);
    if (root.length == 0 || ctx->look_ahead != 0 ||
        static_cast<std::size_t>(input_end(ctx) - here) < root.length ||
        std::memcmp(here, root.bytes, root.length) != 0)
        return false;
    const int error = ctx->error;
    for (std::size_t i = 0; i < root.received_count; ++i) {
        if (xml_received_set(ctx, ctx->local_namespaces[root.received[i].row], root.received[i].uri) == 0)
            continue;
        while (i > 0)
            xml_received_drop(ctx, ctx->local_namespaces[root.received[--i].row]);
        ctx->error = error;
        return false;
    }
    ctx->prefix_list = root.first;
    scope->in_scope = root.count;
    ctx->bare_declarations = root.count;
    ctx->has_body = static_cast<std::int16_t>(!root.empty_tag);
    input_consume(ctx, here + root.length);
    return true;
}

void root_head_learn(soap *ctx, const char *start)
{
    remembered_root &root = ctx->namespace_scope->root;
    const auto length = static_cast<std::size_t>(input_here(ctx) - start);
    root.length = 0;
    if (length > ROOT_BYTES_MAX)
        return;
    if (!note_received(ctx, root, length))
        return;
    std::memcpy(root.bytes, start, length);
    root.length = length;
    root.empty_tag = ctx->has_body == 0;
    root.first = ctx->prefix_list;
    root.count = ctx->namespace_scope->in_scope;
}
