// tcp_connect.cpp - opens the connection of an exchange: resolve, walk the addresses, set options, connect in
// time. The resolver alone keeps to its own time limits: nothing here can end it.
//
// Elsewhere: the tunnel through a proxy (tcp_tunnel.cpp), TLS (tls_handshake.cpp).
#include <cerrno>
#include <cstddef>
#include <cstdio>
#include <cstring>
#include <netinet/in.h>
#include <netinet/tcp.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/failure.h"
#include "net/call_record.h"
#include "net/tcp_socket.h"
#include "net/tcp_wait.h"
#include "net/tls_connection.h"

namespace {

constexpr int ADDRESS_IN_USE_TRIES = 16; // new sockets for one address after EADDRINUSE

// The name to resolve: a proxy may be given as an IPv6 address in brackets, which are cut off into `space`.
const char *target_host(const soap *ctx, const char *host, char (&space)[SOAP_TEXT_SIZE])
{
    if (ctx->proxy_host == nullptr)
        return host;
    const char *end = ctx->proxy_host[0] == '[' ? std::strchr(ctx->proxy_host, ']') : nullptr;
    if (end == nullptr || end - ctx->proxy_host > static_cast<std::ptrdiff_t>(SOAP_TEXT_SIZE))
        return ctx->proxy_host;
    const auto length = static_cast<std::size_t>(end - ctx->proxy_host - 1);
    std::memcpy(space, ctx->proxy_host + 1, length);
    space[length] = '\0';
    return space;
}

tcp_address_list resolve_target(soap *ctx, const char *host, int port)
{
    if (tcp_call_is_over(ctx)) {
        ctx->errno_value = 0;
        tcp_fail(ctx, -1, "getaddrinfo failed in tcp_connect()", tcp_timeout_text(ctx));
        return nullptr;
    }
    char space[SOAP_TEXT_SIZE];
    return tcp_resolve(ctx, target_host(ctx, host, space),
                       ctx->proxy_host != nullptr ? ctx->proxy_port : port, 0,
                       "getaddrinfo failed in tcp_connect()");
}

const char *set_stream_options(const soap *ctx, int socket)
{
    const int on = 1;
    const int buffer = SOAP_BUFFER_SIZE;
    const linger lingering{1, ctx->linger_seconds};
    const bool linger_asked = ctx->connect_flags == SO_LINGER;
    return tcp_set_options(
        socket, {{linger_asked, SOL_SOCKET, SO_LINGER, &lingering, sizeof lingering,
                  "setsockopt SO_LINGER failed in tcp_connect()"},
                 {!linger_asked && ctx->connect_flags != 0, SOL_SOCKET, ctx->connect_flags, &on, sizeof on,
                  "setsockopt failed in tcp_connect()"},
                 {ctx->keep_alive != 0 || ctx->tcp_keep_alive != 0, SOL_SOCKET, SO_KEEPALIVE, &on, sizeof on,
                  "setsockopt SO_KEEPALIVE failed in tcp_connect()"},
                 {true, SOL_SOCKET, SO_SNDBUF, &buffer, sizeof buffer,
                  "setsockopt SO_SNDBUF failed in tcp_connect()"},
                 {true, SOL_SOCKET, SO_RCVBUF, &buffer, sizeof buffer,
                  "setsockopt SO_RCVBUF failed in tcp_connect()"},
                 {ctx->tcp_keep_idle != 0, IPPROTO_TCP, TCP_KEEPIDLE, &ctx->tcp_keep_idle,
                  sizeof ctx->tcp_keep_idle, "setsockopt TCP_KEEPIDLE failed in tcp_connect()"},
                 {ctx->tcp_keep_interval != 0, IPPROTO_TCP, TCP_KEEPINTVL, &ctx->tcp_keep_interval,
                  sizeof ctx->tcp_keep_interval, "setsockopt TCP_KEEPINTVL failed in tcp_connect()"},
                 {ctx->tcp_keep_count != 0, IPPROTO_TCP, TCP_KEEPCNT, &ctx->tcp_keep_count,
                  sizeof ctx->tcp_keep_count, "setsockopt TCP_KEEPCNT failed in tcp_connect()"},
                 {!tcp_is_udp(ctx), IPPROTO_TCP, TCP_NODELAY, &on, sizeof on,
                  "setsockopt TCP_NODELAY failed in tcp_connect()"}});
}

const char *set_multicast_options(const soap *ctx, int socket, addrinfo *address)
{
    if (ctx->ipv6_multicast_scope != 0 && address->ai_family == AF_INET6)
        reinterpret_cast<sockaddr_in6 *>(address->ai_addr)->sin6_scope_id = ctx->ipv6_multicast_scope;
    return tcp_set_options(
        socket, {{ctx->ipv4_multicast_ttl != 0, IPPROTO_IP, IP_MULTICAST_TTL, &ctx->ipv4_multicast_ttl,
                  sizeof ctx->ipv4_multicast_ttl, "setsockopt IP_MULTICAST_TTL failed in tcp_connect()"},
                 {(ctx->ipv4_multicast_interface != nullptr) && ctx->ipv6_multicast_scope == 0, IPPROTO_IP,
                  IP_MULTICAST_IF, ctx->ipv4_multicast_interface, sizeof(in_addr),
                  "setsockopt IP_MULTICAST_IF failed in tcp_connect()"}});
}

// Connecting has a time limit, of its own or that of the call.
bool is_limited(const soap *ctx)
{
    return ctx->connect_timeout != 0 || ctx->call_deadline != 0;
}

// A socket for the address with all options set, or -1 with a fault; *made says whether there was a socket
// at all.
int open_socket(soap *ctx, addrinfo *address, bool *made)
{
    const int mode = SOCK_CLOEXEC | (!tcp_is_udp(ctx) && is_limited(ctx) ? SOCK_NONBLOCK : 0);
    const int fresh = socket(address->ai_family, address->ai_socktype | mode, address->ai_protocol);
    ctx->error_mode = 0;
    *made = fresh >= 0;
    if (fresh < 0) {
        tcp_save_errno(ctx);
        return -1;
    }
    if (tcp_refuse_large(ctx, fresh))
        return -1;
    const char *failure = set_stream_options(ctx, fresh);
    if (failure == nullptr && tcp_is_udp(ctx))
        failure = set_multicast_options(ctx, fresh, address);
    if (failure == nullptr)
        return fresh;
    tcp_save_errno(ctx);
    return tcp_fail(ctx, fresh, failure);
}

enum class attempt { connected, address_in_use, refused, refused_late, out_of_time };

// Waits for a connection under way.
attempt await_connection(soap *ctx, int socket)
{
    const int ready = tcp_wait_until(ctx, socket, WAIT_SEND, tcp_deadline_of(ctx, ctx->connect_timeout));
    if (ready <= 0)
        return ready == 0 ? attempt::out_of_time : attempt::refused_late;
    socklen_t size = sizeof ctx->errno_value;
    if (getsockopt(socket, SOL_SOCKET, SO_ERROR, &ctx->errno_value, &size) == 0 && ctx->errno_value == 0)
        return attempt::connected;
    if (ctx->errno_value == 0)
        tcp_save_errno(ctx);
    return attempt::refused_late;
}

attempt try_connect(soap *ctx, int socket, const addrinfo *address)
{
    int result;
    do {
        errno = 0;
        result = connect(socket, address->ai_addr, address->ai_addrlen);
    } while (result != 0 && (errno == 0 || errno == EINTR)); // goes on with the attempt under way
    tcp_save_errno(ctx);
    if (result == 0)
        return attempt::connected;
    if (is_limited(ctx) && (errno == EINPROGRESS || errno == EAGAIN))
        return await_connection(ctx, socket);
    return errno == EADDRINUSE ? attempt::address_in_use : attempt::refused;
}

// The next address won't be tried.
bool is_final(soap *ctx, attempt outcome)
{
    const bool late = outcome == attempt::refused_late || outcome == attempt::out_of_time;
    return tcp_call_is_over(ctx) || (late && (ctx->legacy & LEGACY_FIRST_ADDRESS) != 0);
}

// Connects to the first address of the list that answers. The socket, or -1 with the fault of the last one
// tried.
int connect_to_list(soap *ctx, addrinfo *address)
{
    int reuse_tries = ADDRESS_IN_USE_TRIES;
    for (;;) {
        bool made;
        const int socket = open_socket(ctx, address, &made);
        if (made && socket < 0)
            return -1;
        call_note_address(ctx, address->ai_addr, address->ai_addrlen);
        const attempt outcome = made ? try_connect(ctx, socket, address) : attempt::refused;
        if (outcome == attempt::connected)
            return socket;
        if (outcome == attempt::out_of_time)
            call_note_ending(ctx, ENDED_BY_CONNECT_LIMIT);
        if (outcome == attempt::address_in_use && --reuse_tries > 0) {
            tcp_close_through_hook(ctx, socket);
            continue;
        }
        if (address->ai_next == nullptr || is_final(ctx, outcome))
            return tcp_fail(ctx, socket,
                            made ? "connect failed in tcp_connect()" : "socket failed in tcp_connect()",
                            outcome == attempt::out_of_time ? tcp_timeout_text(ctx) : nullptr);
        tcp_close_through_hook(ctx, socket);
        address = address->ai_next;
        reuse_tries = ADDRESS_IN_USE_TRIES;
    }
}

// Answers come from the address asked; from any if the datagram goes to many.
bool asks_one_host(const soap *ctx, const addrinfo *address)
{
    if (address->ai_family == AF_INET6)
        return !IN6_IS_ADDR_MULTICAST(&reinterpret_cast<const sockaddr_in6 *>(address->ai_addr)->sin6_addr);
    const in_addr_t host = ntohl(reinterpret_cast<const sockaddr_in *>(address->ai_addr)->sin_addr.s_addr);
    return !IN_MULTICAST(host) && ctx->connect_flags != SO_BROADCAST;
}

int open_datagram_socket(soap *ctx, addrinfo *address)
{
    for (; address != nullptr; address = address->ai_next) {
        bool made;
        const int socket = open_socket(ctx, address, &made);
        if (made && socket < 0)
            return -1;
        if (made) {
            tcp_keep_peer(ctx, address);
            ctx->peer_fixed = asks_one_host(ctx, address);
            return socket;
        }
    }
    return tcp_fail(ctx, -1, "socket failed in tcp_connect()");
}

// The proxy has connect_timeout to answer, as a whole and counted anew. 0, or -1 with ctx->error.
int open_tunnel(soap *ctx, const char *endpoint, const char *host, int port)
{
    const tcp_deadline call = ctx->call_deadline;
    ctx->call_deadline = tcp_deadline_of(ctx, ctx->connect_timeout);
    const int error = tcp_open_tunnel(ctx, endpoint, host, port);
    const bool late = error == SOAP_EOF && ctx->call_expired;
    ctx->call_deadline = call;
    const bool call_is_over = tcp_call_is_over(ctx); // if so, the fault says that
    if (late && !call_is_over)
        call_note_ending(ctx, ENDED_BY_CONNECT_LIMIT);
    if (late)
        return tcp_fail(ctx, -1, "CONNECT failed in tcp_connect()", tcp_timeout_text(ctx));
    return error == 0 ? 0 : -1;
}

// What was refused is the HTTP proxy's doing, not the host's.
void blame_proxy(soap *ctx)
{
    if (ctx->proxy_host == nullptr || ctx->error != SOAP_TCP_ERROR || ctx->call_expired)
        return;
    const fault_texts fault = ctx->upcalls->read_fault(ctx);
    char text[2 * SOAP_TEXT_SIZE];
    std::snprintf(text, sizeof text, "The HTTP proxy %.800s:%d can't be reached: %.800s", ctx->proxy_host,
                  ctx->proxy_port, fault.text != nullptr ? fault.text : "");
    if (const char *const own = soap_string_dup(ctx, text))
        fail_as_sender(ctx, own, fault.detail, SOAP_TCP_ERROR);
}

// A connected socket, or one for datagrams; -1 with a fault.
int reach(soap *ctx, const char *host, int port)
{
    const tcp_address_list addresses = resolve_target(ctx, host, port);
    if (!addresses)
        return -1;
    call_note_time(ctx, &soap_report::lookup_time);
    if (tcp_is_udp(ctx))
        return open_datagram_socket(ctx, addresses.get());
    return connect_to_list(ctx, addresses.get());
}

} // namespace

int tcp_connect(soap *ctx, const char *endpoint, const char *host, int port)
{
    tcp_drop_socket(ctx);
    const bool udp = tcp_is_udp(ctx);
    const int socket = reach(ctx, host, port);
    if (socket < 0) {
        blame_proxy(ctx);
        return -1;
    }
    call_note_connected(ctx, socket);
    tcp_store_socket(ctx, socket);
    if (udp)
        return socket;
    ctx->peer_length = 0;
    ctx->input_mode &= ~MODE_TLS;
    ctx->output_mode &= ~MODE_TLS;
    if (endpoint == nullptr || soap_tag_match(endpoint, "https:*") != 0) {
        tls_discard(ctx);
    } else if ((ctx->proxy_host != nullptr && open_tunnel(ctx, endpoint, host, port) != 0) ||
               tls_connect(ctx, host, port) != 0) {
        tcp_drop_socket(ctx);
        return -1;
    }
    tcp_settle_blocking(ctx, ctx->socket);
    return ctx->socket;
}
