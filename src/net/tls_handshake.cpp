// tls_handshake.cpp - TLS comes up on a connected or accepted socket.
//
// Elsewhere: what the SSL_CTX allows (tls_context.cpp), who the peer is (tls_verify.cpp).
//
// Always: a handshake as a whole has a time limit, and the socket's mode doesn't matter to it.
#include <cerrno>

#include <openssl/err.h>
#include <openssl/ssl.h>
#include <openssl/x509_vfy.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_tls.h>

#include "core/failure.h"
#include "net/call_record.h"
#include "net/tcp_socket.h"
#include "net/tcp_wait.h"
#include "net/tls_connection.h"

namespace {

constexpr int HANDSHAKE_S = 10; // time limit where the host sets none, seconds

enum class handshake { done, refused, wait_failed, out_of_time };

// Runs SSL_connect or SSL_accept to its end. *result is what it returned last.
handshake take_steps(soap *ctx, int (*step)(SSL *), int timeout, int *result)
{
    const tcp_deadline deadline = tcp_deadline_of(ctx, timeout != 0 ? timeout : HANDSHAKE_S);
    tls_bio_set_nonblocking(SSL_get_rbio(ctx->tls_connection), true);
    for (;;) {
        ERR_clear_error();
        errno = 0;
        *result = step(ctx->tls_connection);
        if (*result > 0 && SSL_is_init_finished(ctx->tls_connection))
            return handshake::done;
        tcp_save_errno(ctx);
        const int flag = tls_wait_flag(ctx->tls_connection, *result);
        if (flag == 0)
            return handshake::refused;
        const int ready = tcp_wait_until(ctx, ctx->socket, flag | WAIT_ERROR, deadline);
        if (ready < 0)
            return handshake::wait_failed;
        if (ready == 0 || tcp_is_over(ctx, deadline))
            return handshake::out_of_time;
    }
}

// The same; `verdict` takes what becomes of the peer's certificates.
handshake run_handshake(soap *ctx, int (*step)(SSL *), int timeout, int *result, tls_verdict *verdict)
{
    tls_watch_verdict(ctx, verdict);
    const handshake outcome = take_steps(ctx, step, timeout, result);
    tls_watch_verdict(ctx, nullptr);
    return outcome;
}

// An SSL without contents of its own, new or from an earlier connection. 0, or -1 if there is none to be had.
int renew_connection(soap *ctx)
{
    tls_detach(ctx);
    if (tls_has_own_rules(ctx) && SSL_clear(ctx->tls_connection) == 1 &&
        SSL_set_session(ctx->tls_connection, nullptr) == 1)
        return SOAP_OK;
    SSL_free(ctx->tls_connection);
    ctx->tls_connection = ctx->tls_context != nullptr ? SSL_new(ctx->tls_context) : nullptr;
    return ctx->tls_connection != nullptr ? 0 : -1;
}

// Puts TLS on ctx->socket. 0, or -1 if memory runs out.
int attach(soap *ctx)
{
    BIO *bio = tls_bio_new(ctx);
    if (bio == nullptr)
        return -1;
    SSL_set_bio(ctx->tls_connection, bio, bio);
    SSL_set_read_ahead(ctx->tls_connection, 1); // a record's head and body by one system call
    ctx->tls_bio = bio;
    return SOAP_OK;
}

void mark_tls(soap *ctx)
{
    ctx->input_mode |= MODE_TLS;
    ctx->output_mode |= MODE_TLS;
}

int ensure_context(soap *ctx)
{
    return ctx->tls_context != nullptr || ctx->tls_setup == nullptr ? 0 : ctx->tls_setup(ctx);
}

// Servers of many names choose their certificate by it. Addresses are no names.
int name_server(SSL *ssl, const char *host)
{
    unsigned char address[16];
    const bool named = *host != '\0' && tls_address_of(host, address) == 0;
    return static_cast<int>(SSL_set_tlsext_host_name(ssl, const_cast<char *>(named ? host : nullptr)));
}

// What came was no TLS at all.
bool is_plain_answer()
{
    const unsigned long error = ERR_peek_error();
    return ERR_GET_LIB(error) == ERR_LIB_SSL && ERR_GET_REASON(error) == SSL_R_WRONG_VERSION_NUMBER;
}

bool is_end_of_input()
{
    const unsigned long error = ERR_peek_error();
    return error == 0 ||
           (ERR_GET_LIB(error) == ERR_LIB_SSL && ERR_GET_REASON(error) == SSL_R_UNEXPECTED_EOF_WHILE_READING);
}

int fail_connect(soap *ctx, handshake outcome, int result, const tls_verdict &verdict)
{
    if (outcome == handshake::out_of_time)
        call_note_ending(ctx, ENDED_BY_CONNECT_LIMIT);
    else if (is_end_of_input())
        call_note_ending(ctx, ENDED_BY_PEER);
    const char *const detail = is_plain_answer()
                                   ? "SSL_connect error in tcp_connect(): the peer doesn't speak TLS on this "
                                     "port, which may be one for http"
                                   : "SSL_connect error in tcp_connect()";
    if (outcome == handshake::refused)
        fail_as_sender(ctx, tls_error_text(ctx, result), tls_with_reason(ctx, detail, verdict),
                       SOAP_TLS_ERROR);
    else
        fail_as_sender(
            ctx, outcome == handshake::out_of_time ? tcp_timeout_text(ctx) : tls_error_text(ctx, result),
            "SSL_connect failed in tcp_connect()", SOAP_TCP_ERROR);
    return -1;
}

int lack_of_memory(soap *ctx)
{
    fail(ctx, SOAP_TLS_ERROR);
    return -1;
}

int fail_accept(soap *ctx, const char *detail, const char *text)
{
    const int error = fail_as_sender(ctx, text, detail, SOAP_TLS_ERROR);
    tcp_drop_socket(ctx);
    return error;
}

// Of a client that had to show a certificate. 0 or 30.
int check_client(soap *ctx)
{
    const long verdict = SSL_get_verify_result(ctx->tls_connection);
    if (verdict != X509_V_OK)
        return fail_accept(ctx, "SSL certificate presented by peer cannot be verified in soap_ssl_accept()",
                           X509_verify_cert_error_string(verdict));
    if (SSL_get0_peer_certificate(ctx->tls_connection) == nullptr)
        return fail_accept(ctx, "No SSL certificate was presented by the peer in soap_ssl_accept()",
                           "SSL/TLS error");
    return SOAP_OK;
}

} // namespace

int tls_connect(soap *ctx, const char *host, int port)
{
    ctx->tls_flags |= TLS_CLIENT_SIDE;
    if (const int error = ensure_context(ctx)) {
        ctx->error = error;
        return -1;
    }
    if (renew_connection(ctx) != 0)
        return lack_of_memory(ctx);
    tls_session_offer(ctx, host, port);
    mark_tls(ctx);
    if (name_server(ctx->tls_connection, host) != 1 || attach(ctx) != 0)
        return lack_of_memory(ctx);
    SSL_set_connect_state(ctx->tls_connection);
    int result;
    tls_verdict verdict;
    const handshake outcome = run_handshake(ctx, SSL_connect, ctx->connect_timeout, &result, &verdict);
    if (outcome != handshake::done)
        return fail_connect(ctx, outcome, result, verdict);
    call_note_tls(ctx);
    if ((ctx->tls_flags & TLS_VERIFY_PEER) != 0 && tls_check_peer(ctx, host) != 0)
        return -1;
    call_note_time(ctx, &soap_report::tls_time);
    return SOAP_OK;
}

int soap_ssl_accept(soap *ctx)
{
    if (!soap_socket_open(ctx))
        return fail_as_receiver(ctx, "SSL/TLS error", "No socket in soap_ssl_accept()", SOAP_TLS_ERROR);
    ctx->tls_flags = static_cast<std::uint16_t>(ctx->tls_flags & ~TLS_CLIENT_SIDE);
    if (const int error = ensure_context(ctx)) {
        tcp_drop_socket(ctx);
        return fail(ctx, error);
    }
    if (renew_connection(ctx) != 0 || attach(ctx) != 0) {
        tcp_drop_socket(ctx);
        return fail_as_receiver(ctx, "SSL/TLS error", "SSL_new() failed in soap_ssl_accept()",
                                SOAP_TLS_ERROR);
    }
    SSL_set_accept_state(ctx->tls_connection);
    int result;
    tls_verdict verdict;
    const handshake outcome = run_handshake(ctx, SSL_accept, ctx->accept_timeout, &result, &verdict);
    if (outcome != handshake::done)
        return fail_accept(ctx, tls_with_reason(ctx, "SSL_accept() failed in soap_ssl_accept()", verdict),
                           outcome == handshake::out_of_time ? "Timeout" : tls_error_text(ctx, result));
    if ((ctx->tls_flags & TLS_REQUIRE_CLIENT_CERT) != 0)
        if (const int error = check_client(ctx))
            return error;
    tcp_settle_blocking(ctx, ctx->socket);
    mark_tls(ctx);
    return SOAP_OK;
}
