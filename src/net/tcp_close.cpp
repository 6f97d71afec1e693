// tcp_close.cpp - the end of a connection and of a transaction, and whether a kept connection still serves.
//
// Elsewhere: closing TLS (tls_session.cpp).
#include <cerrno>
#include <cstdint>
#include <pthread.h>
#include <unistd.h>

#include <zlib.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_tcp.h>

#include "core/context_state.h"
#include "core/failure.h"
#include "net/call_record.h"
#include "net/tcp_socket.h"
#include "net/tls_connection.h"

namespace {

// The records are managed memory; only the lists end here.
void forget_attachments(soap *ctx)
{
    ctx->dime.list = ctx->dime.first = ctx->dime.last = nullptr;
    ctx->mime.list = ctx->mime.first = ctx->mime.last = nullptr;
}

// The host still reads parts of the answer.
bool reads_on(const soap *ctx)
{
    constexpr std::uint32_t lazy = MODE_MIME | MODE_MIME_AFTER;
    return ctx->error == 0 && (ctx->mode & lazy) == lazy;
}

bool must_close(const soap *ctx)
{
    return ctx->keep_alive == 0 || (ctx->response_unfinished && !reads_on(ctx)) || ctx->error == SOAP_EOF ||
           ctx->error == SOAP_TCP_ERROR || ctx->error == SOAP_TLS_ERROR;
}

void end_compression(soap *ctx)
{
    if (reads_on(ctx))
        return;
    if (ctx->zlib_state == 1)
        deflateEnd(ctx->zlib_stream);
    else if (ctx->zlib_state == 2)
        inflateEnd(ctx->zlib_stream);
    ctx->zlib_state = 0;
}

int fail_peek(soap *ctx)
{
    return fail_as_sender(ctx, tcp_error_text(ctx), "select failed in soap_poll()", SOAP_TCP_ERROR);
}

int peek_master(soap *ctx)
{
    if (ctx->master_socket == -1)
        return 0;
    const int ready = tcp_wait(ctx, ctx->master_socket, WAIT_SEND, 0);
    return ready < 0 && ctx->errno_value != EINTR ? fail_peek(ctx) : -1;
}

std::uint16_t process = 1;

void note_fork()
{
    process = process == UINT16_MAX ? 1 : static_cast<std::uint16_t>(process + 1);
}

} // namespace

// Counted by forks and not asked of the system, which would be a call for each use of a kept connection.
// Forks before the first connection don't matter, so they go uncounted.
std::uint16_t tcp_process()
{
    static const int counting = pthread_atfork(nullptr, nullptr, note_fork);
    static_cast<void>(counting); // with no memory for the hook a fork goes unnoticed, as it would without it
    return process;
}

bool tcp_inherited(const soap *ctx)
{
    return ctx->opened_by != 0 && ctx->opened_by != process;
}

int tcp_disconnect(soap *ctx)
{
    if (tcp_inherited(ctx)) {
        tls_discard(ctx);
        tcp_drop_socket(ctx);
        return SOAP_OK;
    }
    const int tls_result = tls_close(ctx);
    if ((tcp_is_udp(ctx) || context_shares_socket(ctx)) && soap_socket_open(ctx))
        return tls_result;
    if (tls_result == 0 && soap_socket_open(ctx) && ctx->on_shutdown_socket != nullptr)
        ctx->on_shutdown_socket(ctx, ctx->socket, SHUT_RDWR);
    tcp_drop_socket(ctx);
    return tls_result;
}

int tcp_peek(soap *ctx)
{
    if (!soap_socket_open(ctx))
        return peek_master(ctx);
    if (tcp_inherited(ctx))
        return -1;
    if (tls_active(ctx) && tls_has_pending(ctx) && tls_peek(ctx) != 0)
        return -1;
    const int ready = tcp_wait(ctx, ctx->socket, WAIT_ALL, 0);
    if (ready < 0 || (ready & WAIT_ERROR) != 0)
        return ctx->errno_value == EINTR ? -1 : fail_peek(ctx);
    if ((ready & WAIT_SEND) == 0)
        return -1;
    if ((ready & WAIT_RECV) == 0)
        return 0;
    // Readable before a request: the peer has closed, or sent what no request of ours asked for, which must
    // not be taken for the answer to the next. Under TLS it may also be a message of the protocol itself.
    return tls_active(ctx) ? tls_peek(ctx) : -1;
}

int tcp_release(soap *ctx)
{
    const int error = ctx->error;
    if (error != 0)
        forget_attachments(ctx);
    if (ctx->on_disconnect != nullptr)
        if (const int refused = ctx->on_disconnect(ctx))
            return ctx->error = refused;
    int closed = 0;
    if (must_close(ctx)) {
        closed = ctx->on_close != nullptr ? ctx->on_close(ctx) : 0;
        ctx->keep_alive = 0;
        ctx->response_unfinished = false;
        ctx->route.known = false;
    }
    end_compression(ctx);
    return ctx->error = closed != 0 ? closed : error;
}

int soap_socket_release(soap *ctx)
{
    const int result = tcp_release(ctx);
    if (!reads_on(ctx)) {
        ctx->call_deadline = 0;
        call_record_end(ctx);
    }
    return result;
}

int soap_force_close(soap *ctx)
{
    ctx->keep_alive = 0;
    if (!soap_socket_open(ctx))
        return SOAP_OK;
    ctx->socket_abandoned = true;
    if (context_shares_socket(ctx))
        return SOAP_OK;
    if (ctx->master_socket == ctx->socket) // a UDP service has one socket in both fields
        ctx->master_socket = -1;
    return close(ctx->socket);
}
