// tls_transfer.cpp - single transfers through TLS, and what their failures mean.
//
// Elsewhere: repeating and waiting (tcp_transfer.cpp), the handshake (tls_handshake.cpp).
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <iterator>

#include <openssl/err.h>
#include <openssl/ssl.h>

#include <zuv_client_pro/soap_tcp.h>

#include "net/tls_connection.h"

namespace {

constexpr const char *ERROR_NAMES[] = {
    "SSL_ERROR_SSL",     "SSL_ERROR_WANT_READ",   "SSL_ERROR_WANT_WRITE",  "SSL_ERROR_WANT_X509_LOOKUP",
    "SSL_ERROR_SYSCALL", "SSL_ERROR_ZERO_RETURN", "SSL_ERROR_WANT_CONNECT"};
static_assert(SSL_ERROR_SSL == 1 && SSL_ERROR_WANT_CONNECT == std::size(ERROR_NAMES));

const char *error_name(int code, char *space, std::size_t size)
{
    if (code >= SSL_ERROR_SSL && code <= SSL_ERROR_WANT_CONNECT)
        return ERROR_NAMES[code - SSL_ERROR_SSL];
    ERR_error_string_n(static_cast<unsigned long>(code), space, size);
    return space;
}

// A text that grows in a fixed buffer and is cut at its end.
class bounded_text {
public:
    bounded_text(char *text, std::size_t size) : text_(text), size_(size) { text_[0] = '\0'; }
    void add(const char *part)
    {
        const int written = std::snprintf(text_ + used_, size_ - used_, "%s", part);
        used_ += static_cast<std::size_t>(written);
        if (used_ >= size_)
            used_ = size_ - 1;
    }

private:
    char *text_;
    std::size_t size_;
    std::size_t used_ = 0;
};

} // namespace

bool tls_active(const soap *ctx)
{
    return ctx->tls_connection != nullptr && SSL_get_rbio(ctx->tls_connection) != nullptr;
}

bool tls_established(const soap *ctx)
{
    return tls_active(ctx) && (SSL_is_init_finished(ctx->tls_connection) != 0);
}

bool tls_has_own_rules(const soap *ctx)
{
    return ctx->tls_connection != nullptr && SSL_get_SSL_CTX(ctx->tls_connection) == ctx->tls_context;
}

int tls_wait_flag(const SSL *ssl, int result)
{
    switch (SSL_get_error(ssl, result)) {
    case SSL_ERROR_WANT_READ:
        return WAIT_RECV;
    case SSL_ERROR_WANT_WRITE:
        return WAIT_SEND;
    default:
        return 0;
    }
}

int tls_write(soap *ctx, const char *data, std::size_t length, bool limited, int *wait_for)
{
    ERR_clear_error();
    tls_bio_set_nonblocking(SSL_get_wbio(ctx->tls_connection), limited);
    errno = 0;
    const int result = SSL_write(ctx->tls_connection, data, tls_length(length));
    *wait_for = result > 0 ? 0 : tls_wait_flag(ctx->tls_connection, result);
    return result;
}

int tls_read(soap *ctx, char *buffer, std::size_t length, bool limited, int *wait_for)
{
    ERR_clear_error();
    tls_bio_set_nonblocking(SSL_get_rbio(ctx->tls_connection), limited);
    errno = 0;
    const int result = SSL_read(ctx->tls_connection, buffer, tls_length(length));
    *wait_for = result > 0 ? 0 : tls_wait_flag(ctx->tls_connection, result);
    return result;
}

std::uint64_t tls_bytes_in(const soap *ctx)
{
    return tls_active(ctx) ? BIO_number_read(SSL_get_rbio(ctx->tls_connection)) : 0;
}

std::uint64_t tls_bytes_out(const soap *ctx)
{
    return tls_active(ctx) ? BIO_number_written(SSL_get_wbio(ctx->tls_connection)) : 0;
}

bool tls_has_pending(const soap *ctx)
{
    return SSL_has_pending(ctx->tls_connection) != 0;
}

int tls_peek(soap *ctx)
{
    SSL *ssl = ctx->tls_connection;
    char byte;
    ERR_clear_error();
    tls_bio_set_nonblocking(SSL_get_rbio(ssl), true);
    const int result = SSL_peek(ssl, &byte, 1);
    return result <= 0 && tls_wait_flag(ssl, result) == WAIT_RECV && !SSL_has_pending(ssl) ? 0 : -1;
}

const char *tls_error_text(soap *ctx, int result)
{
    char part[256]; // the size that OpenSSL asks for one error
    const int code = SSL_get_error(ctx->tls_connection, result);
    bounded_text text(ctx->message_text, sizeof ctx->message_text);
    text.add(error_name(code, part, sizeof part));
    if (ERR_peek_error() != 0) {
        while (const unsigned long error = ERR_get_error()) {
            ERR_error_string_n(error, part, sizeof part);
            text.add("\n");
            text.add(part);
        }
    } else if (result == -1 && ctx->errno_value != 0) {
        text.add("\nError observed by underlying BIO: ");
        text.add(strerror_r(ctx->errno_value, part, sizeof part));
    } else if (result <= 0) {
        text.add("\nEOF was observed that violates the protocol. The client probably provided invalid "
                 "authentication information.");
    }
    return ctx->message_text;
}
