// context_state.h - the question that every release operation asks first.
#pragma once

#include <zuv_client_pro/soap.h>

// True between the start of a context and its end. Null is allowed.
inline bool context_is_alive(const soap *ctx)
{
    return ctx != nullptr && (ctx->state == 1 || ctx->state == 2);
}

// True if `socket` is the listening socket of the context that this is a copy of, as with datagrams: it is
// used, and never closed here.
inline bool context_shares_socket(const soap *ctx)
{
    return ctx->master_shared && ctx->socket == ctx->master_socket;
}
