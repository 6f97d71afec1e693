// tcp_socket.cpp - one socket: set its options and mode, close it.
//
// Elsewhere: waiting for it (tcp_wait.cpp), how it comes to be (tcp_connect.cpp, tcp_server.cpp), its bytes
// (tcp_transfer.cpp), texts of its errors (tcp_error.cpp), the end of a connection and of a transaction
// (tcp_close.cpp).
#include "net/tcp_socket.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <unistd.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_tcp.h>

#include "core/context_state.h"
#include "core/failure.h"
#include "net/tcp_wait.h"
#include "net/tls_connection.h"

namespace {

constexpr int PORT_MAX = 65535;

} // namespace

tcp_address_list tcp_resolve(soap *ctx, const char *host, int port, int flags, const char *failure)
{
    addrinfo hints{};
    hints.ai_socktype = tcp_is_udp(ctx) ? SOCK_DGRAM : SOCK_STREAM;
    hints.ai_flags = flags;
    char service[16];
    std::snprintf(service, sizeof service, "%d", port);
    ctx->errno_value = 0;
    ctx->call_expired = false;
    ctx->error_mode = 2;
    addrinfo *list = nullptr;
    // The resolver itself would take a larger number modulo 65536.
    const bool possible = port >= 0 && port <= PORT_MAX;
    const int result = possible ? getaddrinfo(host, service, &hints, &list) : EAI_SERVICE;
    if (result == 0)
        return tcp_address_list(list);
    ctx->errno_value = result;
    tcp_fail(ctx, -1, failure, gai_strerror(result));
    return nullptr;
}

void tcp_keep_peer(soap *ctx, const addrinfo *address)
{
    ctx->peer_length = address->ai_addrlen < sizeof ctx->peer ? address->ai_addrlen : sizeof ctx->peer;
    std::memcpy(ctx->peer, address->ai_addr, ctx->peer_length);
}

void tcp_store_socket(soap *ctx, int socket)
{
    ctx->socket = socket;
    ctx->socket_abandoned = false;
    ctx->opened_by = 0;
    ctx->socket_accepted = false;
    ctx->response_unfinished = false;
    ctx->route.known = false;
}

void tcp_drop_socket(soap *ctx)
{
    const bool is_own = soap_socket_open(ctx) && !context_shares_socket(ctx);
    const int open_socket = is_own ? ctx->socket : -1;
    if (open_socket == ctx->master_socket) // a UDP service has one socket in both fields
        ctx->master_socket = -1;
    tls_detach(ctx);
    tcp_store_socket(ctx, -1);
    tcp_close_through_hook(ctx, open_socket);
}

void tcp_close_through_hook(soap *ctx, int socket)
{
    if (socket != -1 && ctx->on_close_socket != nullptr)
        ctx->on_close_socket(ctx, socket);
}

void tcp_set_blocking(int socket, bool blocking)
{
    const int flags = fcntl(socket, F_GETFL);
    const int wanted = blocking ? flags & ~O_NONBLOCK : flags | O_NONBLOCK;
    if (flags != -1 && flags != wanted)
        fcntl(socket, F_SETFL, wanted);
}

void tcp_settle_blocking(const soap *ctx, int socket)
{
    tcp_set_blocking(socket, ctx->recv_timeout == 0 && ctx->send_timeout == 0 && ctx->call_timeout == 0);
}

void tcp_save_errno(soap *ctx)
{
    ctx->errno_value = errno;
}

int tcp_fail(soap *ctx, int socket, const char *detail, const char *text)
{
    tcp_close_through_hook(ctx, socket);
    fail_as_sender(ctx, text != nullptr ? text : tcp_error_text(ctx), detail, SOAP_TCP_ERROR);
    return -1;
}

bool tcp_refuse_large(soap *ctx, int socket)
{
    if (!tcp_too_large_to_wait(ctx, socket))
        return false;
    tcp_close_through_hook(ctx, socket);
    fail(ctx, SOAP_FD_EXCEEDED);
    return true;
}

const char *tcp_set_options(int socket, std::initializer_list<tcp_option> options)
{
    for (const tcp_option &option : options)
        if (option.wanted && setsockopt(socket, option.level, option.name, option.value, option.size) != 0)
            return option.failure;
    return nullptr;
}

int tcp_close_socket(soap *, int socket)
{
    return close(socket);
}

int tcp_shutdown_socket(soap *, int socket, int how)
{
    return shutdown(socket, how);
}

int tcp_accept_socket(soap *, int socket, void *address, int *length)
{
    socklen_t size = static_cast<socklen_t>(*length);
    const int client = accept4(socket, static_cast<sockaddr *>(address), &size, SOCK_CLOEXEC);
    *length = static_cast<int>(size);
    return client;
}
