// tcp_transfer.cpp - bytes out and in: socket, TLS, datagrams, and the streams and descriptors in place of a
// socket.
//
// Elsewhere: the single TLS transfer (tls_transfer.cpp), buffering (core).
//
// Always: without time limits one transfer is one system call. A wait is made before it only under a time
// limit, or after the system said that it isn't ready; under a limit no transfer blocks, whatever the
// socket's mode. send_timeout and recv_timeout are limits of silence: they begin anew when bytes have moved
// on the socket, also those of a TLS record that isn't complete.
#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstring>
#include <istream>
#include <netinet/in.h>
#include <ostream>
#include <unistd.h>

#include <openssl/bio.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_tls.h>

#include "net/call_record.h"
#include "net/tcp_socket.h"
#include "net/tcp_wait.h"
#include "net/tls_connection.h"

namespace {

constexpr int RECV_ROUNDS = 101;     // vain attempts of one receive before it gives up
constexpr int RECV_WAIT_S = 5;       // wait between two of them without a recv_timeout, seconds
constexpr int SEND_WAIT_US = -10000; // the same for sending, microseconds
constexpr unsigned UDP_PAUSE_MIN_MS = 50, UDP_PAUSE_SPREAD = 201, UDP_PAUSE_MAX_MS = 500;

// --- streams and descriptors: a host's stream may throw, which must not pass through the engine ---

int send_to_stream(soap *ctx, const char *data, std::size_t length)
{
    try {
        ctx->output_stream->write(data, static_cast<std::streamsize>(length));
        if (ctx->output_stream->good())
            return SOAP_OK;
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

// Waits until a socket or descriptor takes bytes. 0, or what tcp_send returns.
int await_sending(soap *ctx, int descriptor, int flags, tcp_deadline deadline)
{
    const int ready = tcp_wait_until(ctx, descriptor, flags, deadline);
    if (ready > 0)
        return 0;
    const bool unfit = ready < 0 && ctx->errno_value == 0; // it can't be waited for
    return unfit ? ctx->error : -1;
}

// A blocking descriptor that is ready takes this much without blocking.
int send_to_descriptor(soap *ctx, const char *data, std::size_t length)
{
    tcp_deadline deadline = tcp_deadline_of(ctx, ctx->send_timeout);
    while (length > 0) {
        if (deadline != 0)
            if (const int failed = await_sending(ctx, ctx->send_fd, WAIT_SEND, deadline))
                return failed;
        errno = 0;
        const ssize_t written =
            write(ctx->send_fd, data, deadline != 0 ? std::min<std::size_t>(length, PIPE_BUF) : length);
        if (written > 0) {
            data += written;
            length -= static_cast<std::size_t>(written);
            deadline = tcp_deadline_of(ctx, ctx->send_timeout);
        } else if (errno == EAGAIN) {
            tcp_wait(ctx, ctx->send_fd, WAIT_SEND, SEND_WAIT_US);
        } else if (errno != 0 && errno != EINTR) {
            tcp_save_errno(ctx);
            return -1;
        }
    }
    return SOAP_OK;
}

std::size_t recv_from_descriptor(soap *ctx, char *buffer, std::size_t length)
{
    const tcp_deadline deadline = tcp_deadline_of(ctx, ctx->recv_timeout);
    if (deadline != 0 && tcp_wait_until(ctx, ctx->recv_fd, WAIT_RECV, deadline) <= 0)
        return 0;
    ssize_t received;
    do
        received = read(ctx->recv_fd, buffer, length);
    while (received < 0 && errno == EINTR);
    if (received >= 0)
        return static_cast<std::size_t>(received);
    tcp_save_errno(ctx);
    return 0;
}

// --- sending ---

int send_flags(const soap *ctx, bool limited)
{
    return ctx->socket_flags | MSG_NOSIGNAL | (limited ? MSG_DONTWAIT : 0);
}

ssize_t send_datagram(soap *ctx, const char *data, std::size_t length, bool limited)
{
    const int flags = send_flags(ctx, limited);
    if (ctx->peer_length == 0)
        return send(ctx->socket, data, length, flags);
    return sendto(ctx->socket, data, length, flags, reinterpret_cast<const sockaddr *>(ctx->peer),
                  static_cast<socklen_t>(ctx->peer_length));
}

// A datagram that the system refused is tried again after a random pause, which grows.
ssize_t send_datagram_with_retries(soap *ctx, const char *data, std::size_t length, bool limited)
{
    ssize_t sent = send_datagram(ctx, data, length, limited);
    if (sent >= 0)
        return sent;
    unsigned pause = tls_random_word() % UDP_PAUSE_SPREAD + UDP_PAUSE_MIN_MS;
    for (int retries = (ctx->connect_flags & SO_BROADCAST) != 0 ? 2 : 1; retries > 0 && sent < 0; --retries) {
        const int refusal = errno;
        tcp_wait_until(ctx, ctx->socket, WAIT_ERROR, tcp_deadline_of(ctx, static_cast<int>(pause) * -1000));
        errno = refusal;
        if (ctx->call_expired)
            break;
        sent = send_datagram(ctx, data, length, limited);
        pause = pause * 2 < UDP_PAUSE_MAX_MS ? pause * 2 : UDP_PAUSE_MAX_MS;
    }
    return sent;
}

// One transfer. *wait_for: the flag to wait for when it took nothing for now; 0: nothing helps.
ssize_t send_once(soap *ctx, const char *data, std::size_t length, bool limited, int *wait_for)
{
    if (tls_active(ctx))
        return tls_write(ctx, data, length, limited, wait_for);
    *wait_for = WAIT_SEND;
    errno = 0;
    if (ctx->tls_bio != nullptr)
        return BIO_write(ctx->tls_bio, data, tls_length(length));
    const ssize_t sent = tcp_is_udp(ctx) ? send_datagram_with_retries(ctx, data, length, limited)
                                         : send(ctx->socket, data, length, send_flags(ctx, limited));
    call_note_sent(ctx, sent);
    return sent;
}

// After a transfer that took nothing: 0 if it may be repeated now, -1 if the sending has failed.
int settle_refused_send(soap *ctx, int wait_for, tcp_deadline deadline)
{
    tcp_save_errno(ctx);
    const int error = ctx->errno_value;
    if (wait_for == 0)
        return -1;
    if (error == EINTR || (error == 0 && !tls_active(ctx))) {
        ctx->errno_value = 0;
        return tcp_is_over(ctx, deadline) ? -1 : 0;
    }
    if (error != EAGAIN && !tls_active(ctx))
        return -1;
    if (deadline == 0) {
        const int ready = tcp_wait(ctx, ctx->socket, wait_for, SEND_WAIT_US);
        return ready < 0 && ctx->errno_value != EINTR ? -1 : 0;
    }
    return tcp_wait_until(ctx, ctx->socket, wait_for, deadline) > 0 ? 0 : -1;
}

void note_failed_sending(soap *ctx, bool tls_failed)
{
    call_note_ending(ctx, tls_failed || ctx->errno_value != 0 ? ENDED_BY_PEER : ENDED_BY_SEND_LIMIT);
}

// --- receiving ---

constexpr int STRAY = EINTR; // in errno, for a datagram from another sender: receive again

bool same_address(const sockaddr *one, const sockaddr *other)
{
    if (one->sa_family != other->sa_family)
        return false;
    if (one->sa_family == AF_INET6) {
        const auto *a = reinterpret_cast<const sockaddr_in6 *>(one);
        const auto *b = reinterpret_cast<const sockaddr_in6 *>(other);
        return a->sin6_port == b->sin6_port &&
               std::memcmp(&a->sin6_addr, &b->sin6_addr, sizeof a->sin6_addr) == 0;
    }
    const auto *a = reinterpret_cast<const sockaddr_in *>(one);
    const auto *b = reinterpret_cast<const sockaddr_in *>(other);
    return a->sin_port == b->sin_port && a->sin_addr.s_addr == b->sin_addr.s_addr;
}

ssize_t recv_datagram(soap *ctx, char *buffer, std::size_t length, int flags)
{
    alignas(8) char sender[sizeof ctx->peer]{};
    socklen_t size = sizeof sender;
    auto *const address = reinterpret_cast<sockaddr *>(sender);
    const ssize_t received = recvfrom(ctx->socket, buffer, length, flags, address, &size);
    if (received < 0)
        return -1;
    if (ctx->peer_fixed && !same_address(address, reinterpret_cast<const sockaddr *>(ctx->peer))) {
        errno = STRAY;
        return -1;
    }
    if (!ctx->peer_fixed) {
        std::memcpy(ctx->peer, sender, sizeof sender);
        ctx->peer_length = size;
    }
    return received;
}

// One transfer. Negative: nothing for now, *wait_for says what to wait for, and errno why; 0: the end, or a
// failure in errno_value.
ssize_t recv_once(soap *ctx, char *buffer, std::size_t length, bool limited, int *wait_for)
{
    *wait_for = WAIT_RECV;
    if (tls_active(ctx)) {
        const int received = tls_read(ctx, buffer, length, limited, wait_for);
        if (received > 0 || *wait_for != 0)
            return received > 0 ? received : -1;
        tcp_save_errno(ctx);
        return 0;
    }
    if (ctx->tls_bio != nullptr) {
        const int received = BIO_read(ctx->tls_bio, buffer, tls_length(length));
        return received > 0 ? received : 0;
    }
    const int flags = ctx->socket_flags | (limited ? MSG_DONTWAIT : 0);
    const ssize_t received = tcp_is_udp(ctx) ? recv_datagram(ctx, buffer, length, flags)
                                             : recv(ctx->socket, buffer, length, flags);
    call_note_received(ctx, received);
    if (received >= 0 || errno == EINTR || errno == EAGAIN)
        return received;
    tcp_save_errno(ctx);
    return 0;
}

// Waits after a transfer that brought nothing. False: time is up or the wait failed.
bool await_more(soap *ctx, int wait_for, tcp_deadline deadline)
{
    const int flags = wait_for | WAIT_ERROR;
    if (deadline != 0)
        return tcp_wait_until(ctx, ctx->socket, flags, deadline) > 0;
    return tcp_wait_until(ctx, ctx->socket, flags, tcp_deadline_of(ctx, RECV_WAIT_S)) >= 0;
}

// A failed wait ends the receiving.
std::size_t give_up_receiving(soap *ctx)
{
    call_note_ending(ctx, ctx->errno_value == 0 ? ENDED_BY_RECV_LIMIT : ENDED_BY_PEER);
    return 0;
}

// What is to be read may lie in OpenSSL already, where select doesn't see it.
bool must_wait_first(const soap *ctx, tcp_deadline deadline)
{
    return deadline != 0 && !(tls_active(ctx) && tls_has_pending(ctx));
}

std::size_t recv_from_socket(soap *ctx, char *buffer, std::size_t length)
{
    tcp_deadline deadline = tcp_deadline_of(ctx, ctx->recv_timeout);
    if (must_wait_first(ctx, deadline) && !await_more(ctx, WAIT_RECV, deadline))
        return give_up_receiving(ctx);
    for (int rounds = RECV_ROUNDS;;) {
        int wait_for;
        const std::uint64_t before = tls_bytes_in(ctx);
        const ssize_t received = recv_once(ctx, buffer, length, deadline != 0, &wait_for);
        if (received == 0)
            call_note_ending(ctx, ENDED_BY_PEER);
        if (received >= 0)
            return static_cast<std::size_t>(received);
        if (errno == EINTR) {
            if (tcp_is_over(ctx, deadline))
                return give_up_receiving(ctx);
            continue;
        }
        if (tls_bytes_in(ctx) != before)
            deadline = tcp_deadline_of(ctx, ctx->recv_timeout);
        else if (--rounds == 0)
            return give_up_receiving(ctx);
        if (!await_more(ctx, wait_for, deadline))
            return give_up_receiving(ctx);
    }
}

int send_to_socket(soap *ctx, const char *data, std::size_t length)
{
    const int flags = WAIT_SEND | WAIT_ERROR | (tls_active(ctx) ? WAIT_RECV : 0);
    tcp_deadline deadline = tcp_deadline_of(ctx, ctx->send_timeout);
    while (length > 0) {
        if (deadline != 0)
            if (const int failed = await_sending(ctx, ctx->socket, flags, deadline)) {
                note_failed_sending(ctx, false);
                return failed;
            }
        int wait_for;
        const std::uint64_t before = tls_bytes_out(ctx);
        const ssize_t sent = send_once(ctx, data, length, deadline != 0, &wait_for);
        const int reason = errno;
        if (sent > 0) {
            data += sent;
            length -= static_cast<std::size_t>(sent);
        }
        if (length > 0 && (sent > 0 || tls_bytes_out(ctx) != before))
            deadline = tcp_deadline_of(ctx, ctx->send_timeout);
        errno = reason;
        if (sent <= 0 && settle_refused_send(ctx, wait_for, deadline) != 0) {
            note_failed_sending(ctx, wait_for == 0);
            return -1;
        }
    }
    return SOAP_OK;
}

} // namespace

int tcp_send(soap *ctx, const char *data, std::size_t length)
{
    if (tcp_call_is_over(ctx)) {
        ctx->errno_value = 0;
        return -1;
    }
    if (ctx->output_stream != nullptr)
        return send_to_stream(ctx, data, length);
    if (ctx->socket == -1)
        return send_to_descriptor(ctx, data, length);
    if (soap_socket_open(ctx))
        return send_to_socket(ctx, data, length);
    ctx->errno_value = EBADF;
    return -1;
}

std::size_t tcp_recv(soap *ctx, char *buffer, std::size_t length)
{
    ctx->errno_value = 0;
    if (tcp_call_is_over(ctx))
        return 0;
    if (ctx->input_stream != nullptr)
        return recv_from_stream(ctx, buffer, length);
    if (ctx->socket == -1)
        return recv_from_descriptor(ctx, buffer, length);
    if (!soap_socket_open(ctx)) {
        ctx->errno_value = EBADF;
        return 0;
    }
    const std::size_t received = recv_from_socket(ctx, buffer, length);
    if (received != 0)
        call_note_response(ctx);
    return received;
}
