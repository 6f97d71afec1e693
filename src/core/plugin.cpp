// plugin.cpp - the registry of plug-ins of a context.
//
// Elsewhere: their copies (context_copy.cpp) and their end (context.cpp).
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_plugin.h>

#include "core/failure.h"

int soap_register_plugin_arg(soap *ctx, int (*create)(soap *ctx, soap_plugin_record *record, void *argument),
                             void *argument)
{
    auto *record = static_cast<soap_plugin_record *>(SOAP_MALLOC(ctx, sizeof(soap_plugin_record)));
    if (record == nullptr)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    *record = {};
    const int result = create(ctx, record, argument);
    if (result != SOAP_OK || record->delete_hook == nullptr) {
        SOAP_FREE(ctx, record);
        return result;
    }
    record->next = ctx->plugin_list;
    ctx->plugin_list = record;
    return SOAP_OK;
}

namespace {

bool same_id(const char *a, const char *b)
{
    return a == b || (a != nullptr && b != nullptr && std::strcmp(a, b) == 0);
}

} // namespace

void *soap_plugin_find(soap *ctx, const char *id)
{
    for (const soap_plugin_record *record = ctx->plugin_list; record != nullptr; record = record->next) {
        if (same_id(record->id, id))
            return record->data;
    }
    return nullptr;
}

void *soap_plugin_lookup(soap *ctx, const char *id)
{
    return ctx->on_find_plugin == nullptr ? nullptr : ctx->on_find_plugin(ctx, id);
}
