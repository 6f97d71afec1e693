// tcp_server.cpp - the accepting side: a listening socket, and the next client on it.
//
// Elsewhere: the TLS handshake with a client (tls_handshake.cpp).
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <netinet/in.h>
#include <netinet/tcp.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_tcp.h>

#include "net/tcp_socket.h"
#include "net/tcp_wait.h"
#include "net/tls_connection.h"

namespace {

bool asks_keep_alive(const soap *ctx)
{
    return ((ctx->input_mode | ctx->output_mode) & MODE_KEEP_ALIVE) != 0;
}

void close_master(soap *ctx)
{
    const int master = ctx->master_shared ? -1 : ctx->master_socket;
    if (ctx->master_socket != -1 && ctx->master_socket == ctx->socket)
        ctx->socket = -1;
    ctx->master_socket = -1;
    ctx->master_shared = false;
    tcp_close_through_hook(ctx, master);
}

const char *prepare_listener(const soap *ctx, int socket, const addrinfo *address, int backlog)
{
    const int on = 1;
    const int buffer = SOAP_BUFFER_SIZE;
    const bool udp = tcp_is_udp(ctx);
    if (const char *failure =
            tcp_set_options(socket, {{ctx->bind_flags != 0, SOL_SOCKET, ctx->bind_flags, &on, sizeof on,
                                      "setsockopt failed in soap_bind()"},
                                     {asks_keep_alive(ctx), SOL_SOCKET, SO_KEEPALIVE, &on, sizeof on,
                                      "setsockopt SO_KEEPALIVE failed in soap_bind()"},
                                     {true, SOL_SOCKET, SO_SNDBUF, &buffer, sizeof buffer,
                                      "setsockopt SO_SNDBUF failed in soap_bind()"},
                                     {true, SOL_SOCKET, SO_RCVBUF, &buffer, sizeof buffer,
                                      "setsockopt SO_RCVBUF failed in soap_bind()"},
                                     {!udp, IPPROTO_TCP, TCP_NODELAY, &on, sizeof on,
                                      "setsockopt TCP_NODELAY failed in soap_bind()"}}))
        return failure;
    if (bind(socket, address->ai_addr, address->ai_addrlen) != 0)
        return "bind failed in soap_bind()";
    if (!udp && listen(socket, backlog) != 0)
        return "listen failed in soap_bind()";
    return nullptr;
}

// The connection is a client's who came here: a copy of the context may serve it.
void store_accepted(soap *ctx, int socket)
{
    tcp_store_socket(ctx, socket);
    ctx->socket_accepted = true;
}

int fail_accept(soap *ctx, const char *text = nullptr)
{
    return tcp_fail(ctx, -1, "accept failed in soap_accept()", text);
}

// Waits for a client if any time limit is set. 0, or -1 with a fault.
int await_client(soap *ctx, tcp_deadline deadline)
{
    if (ctx->accept_timeout == 0 && ctx->recv_timeout == 0 && ctx->send_timeout == 0)
        return 0;
    const int ready = tcp_wait_until(ctx, ctx->master_socket, WAIT_ALL, deadline);
    if (ready == 0)
        return fail_accept(ctx, "Timeout");
    return ready < 0 ? fail_accept(ctx) : 0;
}

// host, port and peer_address take the client's.
void note_client(soap *ctx)
{
    char service[16];
    ctx->host[0] = '\0';
    ctx->port = 0;
    ctx->peer_address = 0;
    if (getnameinfo(reinterpret_cast<const sockaddr *>(ctx->peer), static_cast<socklen_t>(ctx->peer_length),
                    ctx->host, sizeof ctx->host, service, sizeof service,
                    NI_NUMERICHOST | NI_NUMERICSERV) != 0)
        return;
    ctx->port = static_cast<int>(std::strtol(service, nullptr, 10));
    unsigned parts[4];
    if (std::sscanf(ctx->host, "%u.%u.%u.%u", &parts[0], &parts[1], &parts[2], &parts[3]) == 4)
        for (const unsigned part : parts)
            ctx->peer_address = ctx->peer_address << 8 | part;
}

const char *set_client_options(const soap *ctx, int socket)
{
    const int on = 1;
    const int buffer = SOAP_BUFFER_SIZE;
    const linger lingering{1, ctx->linger_seconds};
    const bool linger_asked = ctx->accept_flags == SO_LINGER;
    return tcp_set_options(socket, {{linger_asked, SOL_SOCKET, SO_LINGER, &lingering, sizeof lingering,
                                     "setsockopt SO_LINGER failed in soap_accept()"},
                                    {!linger_asked && ctx->accept_flags != 0, SOL_SOCKET, ctx->accept_flags,
                                     &on, sizeof on, "setsockopt failed in soap_accept()"},
                                    {asks_keep_alive(ctx), SOL_SOCKET, SO_KEEPALIVE, &on, sizeof on,
                                     "setsockopt SO_KEEPALIVE failed in soap_accept()"},
                                    {true, SOL_SOCKET, SO_SNDBUF, &buffer, sizeof buffer,
                                     "setsockopt SO_SNDBUF failed in soap_accept()"},
                                    {true, SOL_SOCKET, SO_RCVBUF, &buffer, sizeof buffer,
                                     "setsockopt SO_RCVBUF failed in soap_accept()"},
                                    {true, IPPROTO_TCP, TCP_NODELAY, &on, sizeof on,
                                     "setsockopt TCP_NODELAY failed in soap_accept()"}});
}

// The next client's socket, or -1 with a fault.
int accept_client(soap *ctx)
{
    const tcp_deadline deadline = tcp_deadline_of(ctx, ctx->accept_timeout);
    for (;;) {
        if (await_client(ctx, deadline) != 0)
            return -1;
        int length = sizeof ctx->peer;
        errno = ctx->on_accept != nullptr ? 0 : ENOSYS;
        const int client =
            ctx->on_accept != nullptr ? ctx->on_accept(ctx, ctx->master_socket, ctx->peer, &length) : -1;
        if (client >= 0) {
            ctx->peer_length = static_cast<std::size_t>(length) < sizeof ctx->peer
                                   ? static_cast<std::size_t>(length)
                                   : sizeof ctx->peer;
            return client;
        }
        tcp_save_errno(ctx);
        if (ctx->errno_value != EINTR && ctx->errno_value != EAGAIN)
            return fail_accept(ctx);
        if (tcp_is_over(ctx, deadline)) // clients that come and go
            return fail_accept(ctx, "Timeout");
    }
}

} // namespace

int soap_bind(soap *ctx, const char *host, int port, int backlog)
{
    close_master(ctx);
    const tcp_address_list addresses =
        tcp_resolve(ctx, host, port, AI_PASSIVE, "getaddrinfo failed in soap_bind()");
    if (!addresses)
        return -1;
    const addrinfo *address = addresses.get();
    tcp_keep_peer(ctx, address);
    ctx->error_mode = 0;
    const int master = socket(address->ai_family, address->ai_socktype | SOCK_CLOEXEC, address->ai_protocol);
    const char *failure = "socket failed in soap_bind()";
    if (master >= 0) {
        if (tcp_refuse_large(ctx, master))
            return -1;
        failure = prepare_listener(ctx, master, address, backlog);
    }
    if (failure != nullptr) {
        tcp_save_errno(ctx);
        return tcp_fail(ctx, master, failure);
    }
    ctx->master_socket = master;
    ctx->peer_fixed = false;
    if (tcp_is_udp(ctx))
        store_accepted(ctx, master);
    return master;
}

int soap_accept(soap *ctx)
{
    ctx->error_mode = 0;
    ctx->errno_value = 0;
    tls_detach(ctx); // a former client's; its socket may serve a copy of this context by now
    ctx->socket = -1;
    ctx->call_deadline = 0; // of a call that this context made
    ctx->call_expired = false;
    if (ctx->master_socket == -1)
        return tcp_fail(ctx, -1, "no master socket in soap_accept()");
    if (tcp_is_udp(ctx)) {
        store_accepted(ctx, ctx->master_socket);
        return ctx->socket;
    }
    tcp_set_blocking(ctx->master_socket, ctx->accept_timeout == 0);
    const int client = accept_client(ctx);
    if (client < 0 || tcp_refuse_large(ctx, client))
        return -1;
    note_client(ctx);
    if (const char *failure = set_client_options(ctx, client)) {
        tcp_save_errno(ctx);
        return tcp_fail(ctx, client, failure);
    }
    ctx->keep_alive = asks_keep_alive(ctx) ? 1 : 0;
    tcp_settle_blocking(ctx, client);
    store_accepted(ctx, client);
    return client;
}
