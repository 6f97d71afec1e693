// soap_tcp.h - sockets: connect, send, receive, wait, close, and the accepting side.
//
// Elsewhere: TLS (soap_tls.h), HTTP (soap_http.h).
//
// Always: time limits are 0 none, positive seconds, negative microseconds. They run on the monotonic clock,
// from the beginning of the step that they limit, and no signal begins them anew. call_timeout limits all
// steps together, from soap_server_connect or soap_connect_one (soap_http.h) to soap_socket_release: whatever
// waits then ends with it, errno_value 0, and error texts name it. The one thing that no limit ends is the
// look-up of a name, which has those of the system's resolver. Only select is used, so descriptors of 1024
// and over are refused with error 46. Sockets that the library makes are closed on exec, and writing to one
// whose peer is gone raises no SIGPIPE. A failure that names error 28 has filled the fault record: its text
// is that of tcp_error_text, "Timeout" or the resolver's, its detail says what failed. Descriptors are closed
// through on_close_socket, exactly once.
#pragma once

#include <zuv_client_pro/soap.h>

constexpr int WAIT_RECV = 1;  // wait until readable
constexpr int WAIT_SEND = 2;  // wait until writable
constexpr int WAIT_ERROR = 4; // report an exceptional condition
constexpr int WAIT_ALL = 7;

// Waits until `socket` is ready in one of the ways in `flags` (WAIT_...).
//   timeout   seconds if positive, microseconds if negative, 0: only asks
//   > 0       the flags found
//   0         time is up; errno_value is 0
//   < 0       failure; errno_value holds the system's reason, EINTR among them. A descriptor of 1024 or
//             over is refused with ctx->error 46 and errno_value 0
ZUV_API int tcp_wait(soap *ctx, int socket, int flags, int timeout);

// Opens a connection (default of on_open): closes a socket that is still open, resolves the name, walks the
// address list, tunnels through proxy_host and does the TLS handshake if `endpoint` is an https URL.
//   endpoint  URL; only its scheme counts, and the proxy is told of it
//   host      name or address, an IPv6 address without brackets; port 0 to 65535
// Each address of the name is tried until one answers. Limits: connect_timeout, counted anew for each
// address, for the proxy's answer to CONNECT and for the handshake, each as a whole; a handshake has 10 s
// where connect_timeout is 0. LEGACY_FIRST_ADDRESS: with a limit, only an address that refuses at once is
// followed by the next one. Returns the socket, which also stands in ctx->socket and belongs to the context;
// or -1, with ctx->socket -1 and ctx->error 28 (network), 30 (TLS), 46 (too many descriptors), or for a
// CONNECT that did not lead to a tunnel its HTTP status (200 with a body among them), 29 (the answer is not
// HTTP) or -1 (none), with a fault that says so; an answer to CONNECT leaves nothing else behind. With
// MODE_UDP in output_mode nothing is connected: the address is kept in ctx->peer. Datagrams from another
// address or port are then dropped, unless the address is a multicast one or connect_flags is SO_BROADCAST:
// then they come from anywhere, and ctx->peer takes the sender's address.
ZUV_API int tcp_connect(soap *ctx, const char *endpoint, const char *host, int port);

// Sends all bytes (default of on_send): to output_stream if set, else to the socket, else to send_fd.
// Limit: send_timeout, of silence: it begins anew with each stretch that the system takes. UDP sends one
// datagram, and once or twice more if the system refuses it. Returns 0; -1 with errno_value (0: time is up);
// 46 for a descriptor that can't be waited for.
ZUV_API int tcp_send(soap *ctx, const char *data, std::size_t length);

// Receives what is there, at most `length` bytes (default of on_recv), from input_stream, the socket or
// recv_fd. Limit: recv_timeout, of silence: under TLS it begins anew with each piece of an encrypted record.
// Returns the number of bytes; 0 for the end or a failure: errno_value is 0 at the end and when time is up,
// else the system's reason.
ZUV_API std::size_t tcp_recv(soap *ctx, char *buffer, std::size_t length);

// Closes the TLS layer, whose session is kept for the next connection to the same host and port, and the
// socket (default of on_close). The peer is told (close_notify) and not waited for; LEGACY_CLOSE_WAIT: for
// its own end, at most 5 s. A UDP socket stays open. Returns 0, or 30 if TLS did not close properly.
ZUV_API int tcp_disconnect(soap *ctx);

// Asks whether a kept connection may carry another call (default of on_poll): 0 if it may. Otherwise -1, or
// 28 with a fault if it can't be asked. Bytes that nobody asked for make a connection unusable, and so does a
// fork since it was opened for a call: it stays the parent's, and the child's tcp_disconnect closes the
// child's descriptor alone, without a word to the peer. Never blocks.
ZUV_API int tcp_peek(soap *ctx);

// Ends a transaction: closes the connection (on_close) after an end of input, a network or TLS failure, a
// response that was not read to its end, or with keep_alive 0; keeps it otherwise. Ends compression under
// way, and the time of the call unless parts of its response are still to be read. Returns ctx->error, which
// stays as it was unless on_disconnect or on_close fails.
ZUV_API int soap_socket_release(soap *ctx);

// Sets keep_alive to 0 and closes the socket, whose number stays in ctx->socket but is neither used nor
// closed again. Returns the result of close; 0 with no open socket.
ZUV_API int soap_force_close(soap *ctx);

// Text of the current socket error by error_mode and errno_value: constant, or in message_text until its next
// use.
ZUV_API const char *tcp_error_text(soap *ctx);

// Defaults of on_close_socket, on_shutdown_socket (`how` as of shutdown) and on_accept (`length`: in the room
// at `address`, out its use; bytes). Results are those of the system calls, with errno.
ZUV_API int tcp_close_socket(soap *ctx, int socket);
ZUV_API int tcp_shutdown_socket(soap *ctx, int socket, int how);
ZUV_API int tcp_accept_socket(soap *ctx, int socket, void *address, int *length);

// Makes the listening socket, kept in master_socket; one that is open is closed first. With MODE_UDP it is
// also ctx->socket, and doesn't listen.
//   host      address to listen on; null: all
//   port      0: the system picks one
//   backlog   clients that may wait
// Returns the socket; or -1 with a fault, error 28 or 46, and master_socket -1.
ZUV_API int soap_bind(soap *ctx, const char *host, int port, int backlog);

// Waits for a client, at most accept_timeout. Its socket is kept in ctx->socket (which is not closed before:
// it may serve a copy of the context by now, see soap_context_copy); host, port and peer_address take the
// client's. With MODE_UDP: the master socket. Returns the socket; or -1 with a fault, error 28 or 46, and
// ctx->socket -1.
ZUV_API int soap_accept(soap *ctx);
