// connect.cpp - a request begins: one endpoint of a list is reached, and the head is written.
//
// Elsewhere: the connection itself (net/endpoint.cpp), what the head says (net/http_write.cpp, called through
// on_post).
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_tcp.h>

#include "core/failure.h"
#include "net/endpoint.h"
#include "net/tcp_wait.h"

namespace {

// The head goes out as it is, neither chunked nor compressed; a stored message gets its head when its size is
// known.
int write_head(soap *ctx, const char *endpoint, const char *action, std::uint64_t count)
{
    const std::uint32_t mode = ctx->mode;
    const std::uint32_t framing = mode & MODE_IO_MASK;
    if (framing == MODE_STORE || (mode & MODE_BARE_XML) != 0 || endpoint == nullptr ||
        ctx->on_post == nullptr)
        return SOAP_OK;
    ctx->mode &= ~(MODE_IO_MASK | MODE_DEFLATE);
    if (framing != MODE_DIRECT)
        ctx->mode |= MODE_BUFFERED;
    ctx->error = ctx->on_post(ctx, endpoint, ctx->host, ctx->port, ctx->path, action, count);
    if (ctx->error != SOAP_OK)
        return ctx->error;
    if (framing == MODE_CHUNKED && soap_send_flush(ctx) != SOAP_OK)
        return ctx->error;
    ctx->mode = mode;
    return SOAP_OK;
}

// soap_connect_one within the time of a call that has begun.
int connect_one(soap *ctx, int status, const char *endpoint, const char *action)
{
    ctx->error = SOAP_OK;
    ctx->fault = nullptr; // what an earlier attempt left must not explain a later failure
    ctx->status = status;
    soap_parse_endpoint(ctx, endpoint);
    if (ctx->on_connect != nullptr) {
        ctx->error = ctx->on_connect(ctx, endpoint, ctx->host, ctx->port);
        if (ctx->error != SOAP_OK)
            return ctx->error;
    } else {
        ctx->action = soap_string_dup(ctx, action);
        if (action != nullptr && ctx->action == nullptr)
            return ctx->error;
    }
    if (connection_provide(ctx, endpoint) != SOAP_OK)
        return ctx->error;
    const std::uint64_t count = soap_message_length(ctx);
    if (soap_send_begin(ctx) != SOAP_OK)
        return ctx->error;
    if (status == STATUS_GET)
        ctx->mode = (ctx->mode & ~MODE_IO_MASK) | MODE_BUFFERED;
    if (write_head(ctx, endpoint, action, count) != SOAP_OK)
        return ctx->error;
    return status == STATUS_GET ? soap_send_finish(ctx) : SOAP_OK;
}

} // namespace

int soap_connect_one(soap *ctx, int status, const char *endpoint, const char *action)
{
    tcp_call_begin(ctx);
    return connect_one(ctx, status, endpoint, action);
}

int soap_server_connect(soap *ctx, const char *endpoints, const char *action)
{
    tcp_call_begin(ctx);
    if (endpoints == nullptr || std::strchr(endpoints, ' ') == nullptr)
        return connect_one(ctx, STATUS_POST, endpoints, action), ctx->error;
    const std::size_t bytes = std::strlen(endpoints) + 1;
    char *const list = static_cast<char *>(SOAP_MALLOC(ctx, bytes));
    if (list == nullptr)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    std::memcpy(list, endpoints, bytes);
    char *item = list + std::strspn(list, " ");
    for (;;) {
        char *end = item + std::strcspn(item, " ");
        char *next = end + std::strspn(end, " ");
        *end = '\0';
        if (connect_one(ctx, STATUS_POST, item, action) != SOAP_TCP_ERROR || *next == '\0' ||
            ctx->call_expired)
            break;
        item = next;
    }
    SOAP_FREE(ctx, list);
    return ctx->error;
}
