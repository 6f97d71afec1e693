// tcp_socket.h - private: the state of ctx->socket, and the small steps that connecting and accepting share.
//
// Elsewhere: what hosts may call (soap_tcp.h), TLS on a socket (tls_connection.h).
//
// Always: whoever makes a descriptor closes it on failure, once, and leaves ctx->socket -1.
#pragma once

#include <initializer_list>
#include <memory>
#include <netdb.h>
#include <sys/socket.h>

#include <zuv_client_pro/soap.h>

// True if ctx->socket may be used. Every reader of ctx->socket asks this and not for -1: the number of a
// socket that soap_force_close has closed is still there and may name another file by now.
inline bool soap_socket_open(const soap *ctx)
{
    return ctx->socket != -1 && !ctx->socket_abandoned;
}

// The number of this process among those that a host forks from one another; never 0.
std::uint16_t tcp_process();

// True if a parent of this process connected ctx->socket. The connection is the parent's: nothing may be sent
// on it here, not even its end, which would also end the parent's.
bool tcp_inherited(const soap *ctx);

// Datagrams or a stream: the output mode decides for both directions.
inline bool tcp_is_udp(const soap *ctx)
{
    return (ctx->output_mode & MODE_UDP) != 0;
}

// Addresses of a name, in the resolver's order; never an empty list.
struct tcp_address_delete {
    void operator()(addrinfo *list) const { freeaddrinfo(list); }
};
using tcp_address_list = std::unique_ptr<addrinfo, tcp_address_delete>;

// Resolves; `flags` AI_... . Null with a fault, whose detail is `failure`.
tcp_address_list tcp_resolve(soap *ctx, const char *host, int port, int flags, const char *failure);

// Keeps a peer's address in ctx->peer, cut to its size.
void tcp_keep_peer(soap *ctx, const addrinfo *address);

// Keeps a fresh socket; what was true of the one before is forgotten.
void tcp_store_socket(soap *ctx, int socket);

// Closes ctx->socket through on_close_socket if it is open, takes TLS off it, and leaves -1.
void tcp_drop_socket(soap *ctx);

// soap_socket_release within a call, whose time goes on.
int tcp_release(soap *ctx);

// Closes a descriptor that is not, or no longer, in ctx->socket; -1 is ignored.
void tcp_close_through_hook(soap *ctx, int socket);

// Sets or clears O_NONBLOCK; costs a second system call only if that changes anything.
void tcp_set_blocking(int socket, bool blocking);

// Final mode of a connected or accepted socket: blocking unless a transfer has a time limit. The library's
// own transfers don't depend on it: under a limit each is asked not to block.
void tcp_settle_blocking(const soap *ctx, int socket);

// errno_value takes errno.
void tcp_save_errno(soap *ctx);

// The caller's fault with the text of the socket error (or `text` in place of it) and SOAP_TCP_ERROR; closes
// `socket` first. Returns -1.
int tcp_fail(soap *ctx, int socket, const char *detail, const char *text = nullptr);

// Closes a socket that can't be waited for: SOAP_FD_EXCEEDED. True if it did.
bool tcp_refuse_large(soap *ctx, int socket);

// A socket option to set, if it is wanted.
struct tcp_option {
    bool wanted;
    int level, name;
    const void *value;
    socklen_t size;      // bytes at `value`
    const char *failure; // detail of the fault
};

// Sets the options in order; null, or the failure text of the first that is refused, with errno.
const char *tcp_set_options(int socket, std::initializer_list<tcp_option> options);

// Asks the proxy on ctx->socket for a connection to host and port. 0, or non-zero with ctx->error: the
// failure, or the status of the proxy's refusal. The socket stays open then.
int tcp_open_tunnel(soap *ctx, const char *endpoint, const char *host, int port);
