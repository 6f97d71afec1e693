// soap_tcp.h - sockets: connect, send, receive, wait, close, and the accepting side.
//
// Elsewhere: TLS (soap_tls.h), HTTP (soap_http.h).
//
// Always: a time limit runs from the beginning of the step that it limits, and no signal restarts it.
// call_timeout limits all steps together, from soap_server_connect or soap_connect_one (soap_http.h) to
// soap_socket_release: whatever waits then ends with it, with errno_value 0, and error texts name it. No
// limit ends the look-up of a name, which has those of the system's resolver. What ended an exchange is
// reported by soap_call_report, and soap_cancel ends one from outside (soap_report.h). Waits use select, so
// descriptors of 1024 and over are refused with SOAP_FD_EXCEEDED, unless soap::wait_with_poll is set. Sockets
// that the library makes are closed on exec, and writing to one whose peer is gone raises no SIGPIPE.
// SOAP_TCP_ERROR comes with a fault record: its text is that of tcp_error_text, "Timeout" or the resolver's,
// its detail says what failed. Descriptors are closed through on_close_socket, exactly once.
#pragma once

#include <zuv_client_pro/soap.h>

constexpr int WAIT_RECV = 1;  // wait until readable
constexpr int WAIT_SEND = 2;  // wait until writable
constexpr int WAIT_ERROR = 4; // report an exceptional condition
constexpr int WAIT_ALL = 7;   // all of them

// Waits until a socket is ready.
//   socket   descriptor
//   flags    ways of being ready: WAIT_...
//   timeout  seconds if positive, microseconds if negative, 0: does not wait
//   > 0      the flags found
//   0        time is up; errno_value is 0
//   < 0      failure; errno_value holds the system's reason, EINTR included. A descriptor of 1024 or over
//            without wait_with_poll: SOAP_FD_EXCEEDED in ctx->error, errno_value 0
ZUV_API int tcp_wait(soap *ctx, int socket, int flags, int timeout);

// Opens a connection (default of on_open): closes a socket that is still open, resolves the name, tries its
// addresses, tunnels through soap::proxy_host, and does the TLS handshake if `endpoint` is an https URL.
//
// Each address of the name is tried until one answers. Limits: connect_timeout, counted anew for each
// address, for the proxy's answer to CONNECT and for the handshake, each as a whole; a handshake has 10 s
// where connect_timeout is 0. LEGACY_FIRST_ADDRESS: with a limit, only an address that refuses at once is
// followed by the next one.
//
// With MODE_UDP in output_mode nothing is connected: the address is kept in soap::peer. Datagrams from
// another address or port are then dropped, unless the address is a multicast one or connect_flags is
// SO_BROADCAST: then they are accepted from anywhere, and soap::peer takes the sender's address.
//   endpoint  URL; only its scheme counts, and the proxy is sent it
//   host      name or address, an IPv6 address without brackets
//   port      0 to 65535
//   returns   the socket, which is also in soap::socket and belongs to the context
//   -1        soap::socket is -1, and ctx->error one of SOAP_TCP_ERROR (network), SOAP_TLS_ERROR (TLS),
//             SOAP_FD_EXCEEDED, and for a CONNECT that did not lead to a tunnel its HTTP status (200 with a
//             body included), SOAP_HTTP_ERROR (the answer is not HTTP) or SOAP_EOF (no answer), with a fault
//             that says so; an answer to CONNECT leaves nothing else
ZUV_API int tcp_connect(soap *ctx, const char *endpoint, const char *host, int port);

// Sends all bytes (default of on_send): to soap::output_stream if set, else to the socket, else to
// soap::send_fd. Limit: send_timeout, of silence: it begins anew with each stretch that the system accepts.
// UDP sends one datagram, and once or twice more if the system refuses it.
//   data              `length` bytes
//   length            bytes
//   SOAP_OK
//   SOAP_FD_EXCEEDED  a descriptor that can't be waited for
//   SOAP_EOF          failure; errno_value holds the system's reason, 0 if time is up
ZUV_API int tcp_send(soap *ctx, const char *data, std::size_t length);

// Receives what is there (default of on_recv), from soap::input_stream, the socket or soap::recv_fd. Limit:
// recv_timeout, of silence: under TLS it begins anew with each piece of an encrypted record.
//   buffer   takes the bytes
//   length   most bytes
//   returns  the number of bytes
//   0        the end or a failure: errno_value is 0 at the end and when time is up, else the system's reason
ZUV_API std::size_t tcp_recv(soap *ctx, char *buffer, std::size_t length);

// Closes the TLS layer, whose session is kept for the next connection to the same host and port, and the
// socket (default of on_close). The peer is notified (close_notify) and not waited for; LEGACY_CLOSE_WAIT: its
// answer is waited for, at most 5 s. A UDP socket stays open.
//   SOAP_OK
//   SOAP_TLS_ERROR  TLS did not close properly
ZUV_API int tcp_disconnect(soap *ctx);

// Whether a kept connection may carry another call (default of on_poll). Bytes that weren't asked for make a
// connection unusable, and so does a fork after it was opened for a call: it stays the parent's, and the
// child's tcp_disconnect closes the child's descriptor alone, without a message to the peer. Never blocks.
//   SOAP_OK         it may
//   SOAP_EOF        it may not
//   SOAP_TCP_ERROR  the system doesn't know; with a fault record
ZUV_API int tcp_peek(soap *ctx);

// Ends an exchange: closes the connection (on_close) after an end of input, a network or TLS failure, a
// response that was not read to its end, or with keep_alive 0; keeps it otherwise. Ends compression in
// progress, and the time of the call unless parts of its response are still to be read.
//   returns  ctx->error, which stays as it was unless on_disconnect or on_close fails
ZUV_API int soap_socket_release(soap *ctx);

// Sets keep_alive to 0 and closes the socket, whose number stays in soap::socket but is neither used nor
// closed again.
//   0   closed, or no socket was open
//   -1  the system's failure, with errno
ZUV_API int soap_force_close(soap *ctx);

// Text of the current socket error, by error_mode and errno_value.
//   returns  the text, constant or in message_text until its next use
ZUV_API const char *tcp_error_text(soap *ctx);

// Defaults of on_close_socket, on_shutdown_socket and on_accept. They call the system.
//   socket   descriptor
//   how      as of shutdown
//   address  takes the client's socket address
//   length   in: bytes at `address`; out: bytes used
//   returns  the system call's result: 0 or, of tcp_accept_socket, the client's descriptor; -1 with errno
ZUV_API int tcp_close_socket(soap *ctx, int socket);
ZUV_API int tcp_shutdown_socket(soap *ctx, int socket, int how);
ZUV_API int tcp_accept_socket(soap *ctx, int socket, void *address, int *length);

// Makes the listening socket, kept in soap::master_socket; one that is open is closed first. With MODE_UDP it
// is also soap::socket, and doesn't listen.
//   host     address to listen on; null: all
//   port     0: the system picks one
//   backlog  clients that may wait
//   returns  the socket
//   -1       SOAP_TCP_ERROR or SOAP_FD_EXCEEDED in ctx->error, with a fault record; master_socket is -1
ZUV_API int soap_bind(soap *ctx, const char *host, int port, int backlog);

// Waits for a client, at most accept_timeout. Its socket is kept in soap::socket (which is not closed before:
// it may serve a copy of the context by now, see soap_context_copy); host, port and peer_address take the
// client's. With MODE_UDP: the master socket.
//   returns  the socket
//   -1       SOAP_TCP_ERROR or SOAP_FD_EXCEEDED in ctx->error, with a fault record; soap::socket is -1
ZUV_API int soap_accept(soap *ctx);
