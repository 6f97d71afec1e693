// tls_bio.cpp - OpenSSL's way to the socket of a context.
//
// OpenSSL's own socket BIO writes in a way that raises SIGPIPE when the peer is gone, which would end the
// host. This one sends with MSG_NOSIGNAL. It follows ctx->socket and so can't touch a descriptor that the
// context has given up.
//
// Left out on purpose: BIO_CTRL_EOF. A peer that ends without a closing alert is then an end of input, as
// HTTP over TLS servers in use need it; lengths and chunks show whether the message is whole.
#include <cerrno>

#include <openssl/bio.h>
#include <openssl/crypto.h>

#include "net/call_record.h"
#include "net/tcp_socket.h"
#include "net/tcp_wait.h"
#include "net/tls_connection.h"

namespace {

struct bio_state {
    soap *ctx;
    bool nonblocking; // whatever the socket's mode
};

bio_state *state_of(BIO *bio)
{
    return static_cast<bio_state *>(BIO_get_data(bio));
}

int transfer_flags(const bio_state *state)
{
    return state->ctx->socket_flags | MSG_NOSIGNAL | (state->nonblocking ? MSG_DONTWAIT : 0);
}

// Gives control back once the call's time is up: a peer that sends messages of the protocol itself without
// end would keep OpenSSL from ever returning.
bool is_held_up(const bio_state *state)
{
    if (!tcp_call_is_over(state->ctx))
        return false;
    errno = EAGAIN;
    return true;
}

bool retry_helps(ssize_t count)
{
    return count < 0 && (errno == EAGAIN || errno == EINTR);
}

int bio_write(BIO *bio, const char *data, int length)
{
    const bio_state *state = state_of(bio);
    BIO_clear_retry_flags(bio);
    if (!soap_socket_open(state->ctx)) {
        errno = EBADF;
        return -1;
    }
    const ssize_t sent = is_held_up(state) ? -1
                                           : send(state->ctx->socket, data, static_cast<std::size_t>(length),
                                                  transfer_flags(state));
    call_note_sent(state->ctx, sent);
    if (retry_helps(sent))
        BIO_set_retry_write(bio);
    return static_cast<int>(sent);
}

int bio_read(BIO *bio, char *buffer, int length)
{
    const bio_state *state = state_of(bio);
    BIO_clear_retry_flags(bio);
    if (!soap_socket_open(state->ctx)) {
        errno = EBADF;
        return -1;
    }
    const ssize_t received =
        is_held_up(state)
            ? -1
            : recv(state->ctx->socket, buffer, static_cast<std::size_t>(length), transfer_flags(state));
    call_note_received(state->ctx, received);
    if (retry_helps(received))
        BIO_set_retry_read(bio);
    return static_cast<int>(received);
}

long bio_control(BIO *bio, int command, long number, void *out)
{
    switch (command) {
    case BIO_CTRL_FLUSH: // nothing is held back
        return 1;
    case BIO_C_SET_NBIO:
        state_of(bio)->nonblocking = number != 0;
        return 1;
    case BIO_C_GET_FD:
        if (out != nullptr)
            *static_cast<int *>(out) = state_of(bio)->ctx->socket;
        return state_of(bio)->ctx->socket;
    default:
        return 0;
    }
}

int bio_create(BIO *bio)
{
    auto *state = static_cast<bio_state *>(OPENSSL_zalloc(sizeof(bio_state)));
    BIO_set_data(bio, state);
    BIO_set_init(bio, 1);
    return static_cast<int>(state != nullptr);
}

int bio_destroy(BIO *bio)
{
    OPENSSL_free(BIO_get_data(bio));
    BIO_set_data(bio, nullptr);
    return 1;
}

BIO_METHOD *make_method()
{
    BIO_METHOD *method =
        BIO_meth_new(BIO_get_new_index() | BIO_TYPE_SOURCE_SINK | BIO_TYPE_DESCRIPTOR, "soap socket");
    if (method == nullptr)
        return nullptr;
    BIO_meth_set_write(method, bio_write);
    BIO_meth_set_read(method, bio_read);
    BIO_meth_set_ctrl(method, bio_control);
    BIO_meth_set_create(method, bio_create);
    BIO_meth_set_destroy(method, bio_destroy);
    return method;
}

} // namespace

BIO *tls_bio_new(soap *ctx)
{
    // Never freed: a context that the host destroys at the very end of the process still closes through it.
    static const BIO_METHOD *const method = make_method();
    BIO *bio = method != nullptr ? BIO_new(method) : nullptr;
    if (bio != nullptr)
        state_of(bio)->ctx = ctx;
    return bio;
}

void tls_bio_set_nonblocking(BIO *bio, bool nonblocking)
{
    BIO_ctrl(bio, BIO_C_SET_NBIO, static_cast<long>(nonblocking), nullptr);
}
