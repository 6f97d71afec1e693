// tcp_transfer.cpp - bytes out and in: socket, TLS, datagrams, and the streams and descriptors in place of a
// socket.
//
// Elsewhere: the single TLS transfer (tls_transfer.cpp), buffering (the engine).
//
// Always: without time limits one transfer is one system call. A wait is made ahead of it only under a time
// limit, or after the system said that it isn't ready.
#include <cerrno>
#include <climits>
#include <cstring>
#include <istream>
#include <ostream>
#include <unistd.h>

#include <openssl/bio.h>

#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_tls.h>

#include "transport/tcp_socket.h"
#include "transport/tls_connection.h"

namespace {

constexpr int RECV_ROUNDS = 101;     // attempts of one receive before it gives up
constexpr int RECV_WAIT_S = 5;       // wait between two of them without a recv_timeout, seconds
constexpr int SEND_WAIT_US = -10000; // the same for sending, microseconds
constexpr unsigned UDP_PAUSE_MIN_MS = 50, UDP_PAUSE_SPREAD = 201, UDP_PAUSE_MAX_MS = 500;

bool passing(int error)
{
    return error == EINTR || error == EAGAIN;
}

// --- streams and descriptors: a host's stream may throw, which must not pass through the engine ---

int send_to_stream(soap *ctx, const char *data, std::size_t length)
{
    try {
        ctx->output_stream->write(data, static_cast<std::streamsize>(length));
        if (ctx->output_stream->good())
            return 0;
    } catch (...) {
    }
    ctx->errno_value = 0;
    return -1;
}

std::size_t recv_from_stream(soap *ctx, char *buffer, std::size_t length)
{
    try {
        if (!ctx->input_stream->good())
            return 0;
        ctx->input_stream->read(buffer, static_cast<std::streamsize>(length));
    } catch (...) {
    }
    return static_cast<std::size_t>(ctx->input_stream->gcount());
}

int send_to_descriptor(soap *ctx, const char *data, std::size_t length)
{
    while (length > 0) {
        errno = 0;
        const ssize_t written = write(ctx->send_fd, data, length);
        if (written > 0) {
            data += written;
            length -= static_cast<std::size_t>(written);
        } else if (errno == EAGAIN) {
            tcp_wait(ctx, ctx->send_fd, WAIT_SEND, SEND_WAIT_US);
        } else if (errno != 0 && errno != EINTR) {
            tcp_save_errno(ctx);
            return -1;
        }
    }
    return 0;
}

std::size_t recv_from_descriptor(soap *ctx, char *buffer, std::size_t length)
{
    const ssize_t received = read(ctx->recv_fd, buffer, length);
    if (received >= 0)
        return static_cast<std::size_t>(received);
    tcp_save_errno(ctx);
    return 0;
}

// --- sending ---

// Waits until the socket takes bytes. 0, or what tcp_send returns.
int await_sending(soap *ctx)
{
    const int flags = WAIT_SEND | WAIT_ERROR | (tls_active(ctx) ? WAIT_RECV : 0);
    for (;;) {
        const int ready = tcp_wait(ctx, ctx->socket, flags, ctx->send_timeout);
        if (ready > 0)
            return 0;
        if (ready == 0)
            return -1;
        if (ctx->errno_value == 0)
            return ctx->error; // the descriptor can't be waited for
        if (!passing(ctx->errno_value))
            return -1;
    }
}

ssize_t send_datagram(soap *ctx, const char *data, std::size_t length)
{
    const int flags = ctx->socket_flags | MSG_NOSIGNAL;
    if (ctx->peer_length == 0)
        return send(ctx->socket, data, length, flags);
    return sendto(ctx->socket, data, length, flags, reinterpret_cast<const sockaddr *>(ctx->peer),
                  static_cast<socklen_t>(ctx->peer_length));
}

// A datagram that the system refused is tried again after a random pause, which grows.
ssize_t send_datagram_with_retries(soap *ctx, const char *data, std::size_t length)
{
    ssize_t sent = send_datagram(ctx, data, length);
    if (sent >= 0)
        return sent;
    unsigned pause = tls_random_word() % UDP_PAUSE_SPREAD + UDP_PAUSE_MIN_MS;
    for (int retries = (ctx->connect_flags & SO_BROADCAST) != 0 ? 2 : 1; retries > 0 && sent < 0; --retries) {
        tcp_wait(ctx, ctx->socket, WAIT_ERROR, static_cast<int>(pause) * -1000);
        sent = send_datagram(ctx, data, length);
        pause = pause * 2 < UDP_PAUSE_MAX_MS ? pause * 2 : UDP_PAUSE_MAX_MS;
    }
    return sent;
}

// One transfer. *wait_for: the flag to wait for when it took nothing for now; 0: nothing helps.
ssize_t send_once(soap *ctx, const char *data, std::size_t length, int *wait_for)
{
    if (tls_active(ctx))
        return tls_write(ctx, data, length, wait_for);
    *wait_for = WAIT_SEND;
    errno = 0;
    if (ctx->tls_bio)
        return BIO_write(ctx->tls_bio, data, length < INT_MAX ? static_cast<int>(length) : INT_MAX);
    if (tcp_is_udp(ctx))
        return send_datagram_with_retries(ctx, data, length);
    return send(ctx->socket, data, length, ctx->socket_flags | MSG_NOSIGNAL);
}

// After a transfer that took nothing: 0 if it may be repeated now, -1 if the sending has failed.
int settle_refused_send(soap *ctx, int wait_for)
{
    tcp_save_errno(ctx);
    const int error = ctx->errno_value;
    if (wait_for == 0)
        return -1;
    if (error == EINTR || (error == 0 && !tls_active(ctx)))
        return 0;
    if (error != EAGAIN && !tls_active(ctx))
        return -1;
    const int limit = ctx->send_timeout != 0 ? ctx->send_timeout : SEND_WAIT_US;
    const int ready = tcp_wait(ctx, ctx->socket, wait_for, limit);
    if (ready < 0 && ctx->errno_value != EINTR)
        return -1;
    return ready == 0 && ctx->send_timeout != 0 ? -1 : 0;
}

// --- receiving ---

ssize_t recv_datagram(soap *ctx, char *buffer, std::size_t length)
{
    std::memset(ctx->peer, 0, sizeof ctx->peer);
    socklen_t size = sizeof ctx->peer;
    const ssize_t received = recvfrom(ctx->socket, buffer, length, ctx->socket_flags,
                                      reinterpret_cast<sockaddr *>(ctx->peer), &size);
    ctx->peer_length = size;
    return received;
}

// Waits ahead of a transfer under a time limit. False: time is up or the wait failed.
bool await_receiving(soap *ctx)
{
    for (;;) {
        const int ready = tcp_wait(ctx, ctx->socket, WAIT_RECV | WAIT_ERROR, ctx->recv_timeout);
        if (ready > 0)
            return true;
        if (ready == 0 || !passing(ctx->errno_value))
            return false;
    }
}

// One transfer. Negative: nothing for now, *wait_for tells what to wait for; 0: the end, or a failure in
// errno_value.
ssize_t recv_once(soap *ctx, char *buffer, std::size_t length, int *wait_for)
{
    *wait_for = WAIT_RECV;
    if (tls_active(ctx)) {
        const int received = tls_read(ctx, buffer, length, wait_for);
        if (received > 0 || *wait_for != 0)
            return received > 0 ? received : -1;
        tcp_save_errno(ctx);
        return 0;
    }
    if (ctx->tls_bio) {
        const int received =
            BIO_read(ctx->tls_bio, buffer, length < INT_MAX ? static_cast<int>(length) : INT_MAX);
        return received > 0 ? received : 0;
    }
    const ssize_t received = tcp_is_udp(ctx) ? recv_datagram(ctx, buffer, length)
                                             : recv(ctx->socket, buffer, length, ctx->socket_flags);
    if (received >= 0 || passing(errno))
        return received;
    tcp_save_errno(ctx);
    return 0;
}

// Waits after a transfer that brought nothing. False: time is up or the wait failed.
bool await_more(soap *ctx, int wait_for)
{
    const int limit = ctx->recv_timeout != 0 ? ctx->recv_timeout : RECV_WAIT_S;
    const int ready = tcp_wait(ctx, ctx->socket, wait_for | WAIT_ERROR, limit);
    if (ready == 0)
        return ctx->recv_timeout == 0;
    return ready > 0 || passing(ctx->errno_value);
}

} // namespace

int tcp_send(soap *ctx, const char *data, std::size_t length)
{
    if (ctx->output_stream)
        return send_to_stream(ctx, data, length);
    if (ctx->socket == -1)
        return send_to_descriptor(ctx, data, length);
    if (!soap_socket_open(ctx)) {
        ctx->errno_value = EBADF;
        return -1;
    }
    while (length > 0) {
        if (ctx->send_timeout != 0)
            if (const int failed = await_sending(ctx))
                return failed;
        int wait_for;
        const ssize_t sent = send_once(ctx, data, length, &wait_for);
        if (sent > 0) {
            data += sent;
            length -= static_cast<std::size_t>(sent);
        } else if (settle_refused_send(ctx, wait_for) != 0) {
            return -1;
        }
    }
    return 0;
}

std::size_t tcp_recv(soap *ctx, char *buffer, std::size_t length)
{
    ctx->errno_value = 0;
    if (ctx->input_stream)
        return recv_from_stream(ctx, buffer, length);
    if (ctx->socket == -1)
        return recv_from_descriptor(ctx, buffer, length);
    if (!soap_socket_open(ctx)) {
        ctx->errno_value = EBADF;
        return 0;
    }
    for (int round = 0; round < RECV_ROUNDS; ++round) {
        if (ctx->recv_timeout != 0 && !tls_active(ctx) && !await_receiving(ctx))
            return 0;
        int wait_for;
        const ssize_t received = recv_once(ctx, buffer, length, &wait_for);
        if (received >= 0)
            return static_cast<std::size_t>(received);
        if (!await_more(ctx, wait_for))
            return 0;
    }
    return 0;
}
