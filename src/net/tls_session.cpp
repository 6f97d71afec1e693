// tls_session.cpp - what connects one TLS connection with the next: sessions, and the orderly end.
//
// Always: the kept session belongs to session_host and session_port, which are noted when its connection is
// made: at its end the context may already hold another host. A session is offered once, to its own host
// only, and under the rules that it was made under: a peer that is resumed is not verified again.
#include <cerrno>
#include <cstdio>
#include <cstring>

#include <openssl/err.h>
#include <openssl/ssl.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_tcp.h>

#include "net/tcp_socket.h"
#include "net/tcp_wait.h"
#include "net/tls_connection.h"

namespace {

constexpr int CLOSE_WAIT_S = 5; // wait for the peer's end after ours under LEGACY_CLOSE_WAIT, seconds

void keep_session(soap *ctx)
{
    tls_session_drop(ctx);
    if (SSL_is_server(ctx->tls_connection) || ctx->session_host[0] == '\0')
        return;
    SSL_SESSION *session = SSL_get1_session(ctx->tls_connection);
    if (session == nullptr || !SSL_SESSION_is_resumable(session)) {
        SSL_SESSION_free(session);
        return;
    }
    ctx->tls_session = session;
    ctx->session_rules = SSL_get_SSL_CTX(ctx->tls_connection);
    SSL_CTX_up_ref(ctx->session_rules);
}

// Our closing alert is out, the peer's hasn't been seen: looks for it among what has arrived. Data that
// no one has read or will read is no failure of the closing. 1 finished, 0 not yet.
int look_for_peer_alert(SSL *ssl)
{
    if (!SSL_want_read(ssl) && !SSL_has_pending(ssl))
        return 0;
    char none;
    errno = 0;
    if (SSL_read(ssl, &none, 0) <= 0 && errno == EAGAIN)
        return 0;
    const int finished = SSL_shutdown(ssl);
    ERR_clear_error();
    return finished == 1 ? 1 : 0;
}

// Ends the sending side so that the peer knows that nothing more comes, and waits for it to end as well.
void half_close(soap *ctx)
{
    if (ctx->on_shutdown_socket == nullptr || ctx->on_shutdown_socket(ctx, ctx->socket, SHUT_WR) != 0)
        return;
    const tcp_deadline deadline = tcp_deadline_of(ctx, CLOSE_WAIT_S);
    if (tcp_wait_until(ctx, ctx->socket, WAIT_RECV | WAIT_ERROR, deadline) < 0) {
        ctx->errno_value = 0;
        tcp_drop_socket(ctx);
    }
}

} // namespace

void tls_session_drop(soap *ctx)
{
    SSL_SESSION_free(ctx->tls_session);
    ctx->tls_session = nullptr;
    SSL_CTX_free(ctx->session_rules);
    ctx->session_rules = nullptr;
}

void tls_session_offer(soap *ctx, const char *host, int port)
{
    if (ctx->tls_session != nullptr && ctx->session_rules == ctx->tls_context && ctx->session_port == port &&
        std::strcmp(ctx->session_host, host) == 0)
        SSL_set_session(ctx->tls_connection, ctx->tls_session);
    tls_session_drop(ctx);
    std::snprintf(ctx->session_host, sizeof ctx->session_host, "%s", host);
    ctx->session_port = port;
}

int tls_close(soap *ctx)
{
    if (!tls_active(ctx) || !soap_socket_open(ctx)) {
        tls_discard(ctx);
        return SOAP_OK;
    }
    SSL *ssl = ctx->tls_connection;
    keep_session(ctx);
    tls_bio_set_nonblocking(SSL_get_rbio(ssl), true); // a silent peer can't hold up the end
    ERR_clear_error();
    int finished = SSL_shutdown(ssl);
    if (finished == 0)
        finished = look_for_peer_alert(ssl);
    if (finished == 0 && (ctx->legacy & LEGACY_CLOSE_WAIT) != 0)
        half_close(ctx);
    const bool failed = finished != 1 && ERR_peek_error() != 0;
    ERR_clear_error();
    tls_discard(ctx);
    return failed ? SOAP_TLS_ERROR : 0;
}

void tls_detach(soap *ctx)
{
    if (!tls_active(ctx))
        return;
    SSL_set_bio(ctx->tls_connection, nullptr, nullptr);
    ctx->tls_bio = nullptr;
}

void tls_discard(soap *ctx)
{
    tls_detach(ctx);
    SSL_free(ctx->tls_connection);
    ctx->tls_connection = nullptr;
}
