// message_store.cpp - see message_store.h.
#include "core/message_store.h"

#include <algorithm>
#include <cstring>

#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>

void message_store_begin(soap *ctx)
{
    if (ctx->max_memory != 0 && ctx->max_memory < SOAP_STORE_SIZE)
        return;
    if (ctx->store == nullptr)
        ctx->store = static_cast<char *>(SOAP_MALLOC(ctx, SOAP_STORE_SIZE));
    ctx->store_end = ctx->store;
    ctx->store_space = ctx->store != nullptr ? SOAP_STORE_SIZE : 0;
}

std::size_t message_store_close(soap *ctx)
{
    const auto stored = static_cast<std::size_t>(ctx->store_end - ctx->store);
    ctx->store_space = 0;
    return stored == ctx->message_count ? stored : 0;
}

int message_store_send(soap *ctx, std::size_t length)
{
    return soap_send_bytes(ctx, ctx->store, length);
}

void message_store_wipe(soap *ctx)
{
    ctx->store_space = 0;
    // In pieces, as clearing memory with string instructions, which 2 KB and more get, takes long to start.
    constexpr std::ptrdiff_t PIECE = 1984;
    for (char *place = ctx->store; place != ctx->store_end;) {
        const std::ptrdiff_t length = std::min(PIECE, ctx->store_end - place);
        explicit_bzero(place, static_cast<std::size_t>(length));
        place += length;
    }
    ctx->store_end = ctx->store;
}

void message_store_free(soap *ctx)
{
    message_store_wipe(ctx);
    SOAP_FREE(ctx, ctx->store);
    ctx->store = ctx->store_end = nullptr;
}
