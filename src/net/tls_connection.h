// tls_connection.h - private: TLS on ctx->socket, as the socket files and the TLS files see each other.
//
// Elsewhere: what hosts may call (soap_tls.h).
//
// Always: TLS is in force on the socket exactly while ctx->tls_connection has a BIO. tls_connection itself
// may outlive a failed attempt, to be cleared and used by the next. The BIO never closes the socket.
#pragma once

#include <algorithm>
#include <climits>
#include <cstddef>
#include <cstdint>

#include <openssl/types.h>

#include <zuv_client_pro/soap.h>

// True if bytes on ctx->socket go through TLS. The mode flags don't decide: a host may change them between
// calls.
bool tls_active(const soap *ctx);

// True if a handshake on ctx->socket has come to its end, and TLS is still in force there.
bool tls_established(const soap *ctx);

// True if there is a tls_connection, and tls_context is the one that it was made from.
bool tls_has_own_rules(const soap *ctx);

// --- tls_handshake.cpp ---
// Client side on ctx->socket: handshake and check of the peer. 0, or -1 with SOAP_TCP_ERROR or SOAP_TLS_ERROR and, save for a
// lack of memory, a fault; the socket stays open then.
int tls_connect(soap *ctx, const char *host, int port);

// --- tls_session.cpp ---
// Closes TLS in good order, if it is in force, and frees tls_connection. 0 or 30. May close the socket.
int tls_close(soap *ctx);
// Takes TLS off the socket without a word to the peer; tls_connection stays.
void tls_detach(soap *ctx);
// Frees tls_connection without a word to the peer.
void tls_discard(soap *ctx);
// Forgets the kept session.
void tls_session_drop(soap *ctx);
// Offers the kept session if it came from this host and port under the present rules, and forgets it. Notes
// host and port for the session that this connection will leave.
void tls_session_offer(soap *ctx, const char *host, int port);

// --- tls_bio.cpp ---
// A BIO on ctx->socket, for its whole life, by send and recv with socket_flags and without SIGPIPE. Null if
// memory runs out. It follows ctx->socket: with no open socket each transfer fails with EBADF.
BIO *tls_bio_new(soap *ctx);
// Never block from now on (or again as the socket's mode says). Each transfer says anew what it wants.
void tls_bio_set_nonblocking(BIO *bio, bool nonblocking);

// A length as OpenSSL's calls take it: a longer transfer is made in part.
inline int tls_length(std::size_t length)
{
    return static_cast<int>(std::min<std::size_t>(length, INT_MAX));
}

// --- tls_transfer.cpp ---
// What to wait for after a call of OpenSSL that returned `result`; 0: it has failed or ended. Leaves errno alone.
int tls_wait_flag(const SSL *ssl, int result);
// One SSL_write or SSL_read, which doesn't block if it is limited in time. Above 0: bytes. Otherwise
// *wait_for is the WAIT_ flag to wait for before a retry, or 0 if no retry helps; errno has the system's
// reason, 0 for none.
int tls_write(soap *ctx, const char *data, std::size_t length, bool limited, int *wait_for);
int tls_read(soap *ctx, char *buffer, std::size_t length, bool limited, int *wait_for);
// Bytes that the TLS connection has received and sent on the socket so far, also of records that aren't
// complete; 0 without TLS.
std::uint64_t tls_bytes_in(const soap *ctx);
std::uint64_t tls_bytes_out(const soap *ctx);
// True if received bytes wait inside OpenSSL, where select doesn't see them.
bool tls_has_pending(const soap *ctx);
// Looks at what has arrived, without blocking: 0 if no byte of data and no end is there, else -1.
int tls_peek(soap *ctx);
// Text of the failure of an SSL call that has returned `result`, in message_text. Empties OpenSSL's error
// queue.
const char *tls_error_text(soap *ctx, int result);

// --- tls_verify.cpp ---
// Is the peer verified and the host asked for? By tls_flags. 0, or 30 with a fault.
int tls_check_peer(soap *ctx, const char *host);

// Writes a name of a certificate, its subject or issuer, as by RFC 2253, cut to `size` bytes. What could be
// markup or control an output becomes "?".
void tls_write_name(const X509_NAME *name, char *text, std::size_t size);

// Why the chain of certificates was refused, as far as OpenSSL asked the verify callback.
struct tls_verdict {
    soap *ctx = nullptr;
    int error = 0;          // X509_V_ERR_...; 0: it wasn't
    int depth = 0;          // of the certificate; 0 is the peer's
    char subject[256] = ""; // of it, truncated; empty: not known
};
// From here on `verdict` takes what the handshakes of tls_connection find, and the report of the call the
// certificate that was refused; null: nothing does. It must live as long.
void tls_watch_verdict(soap *ctx, tls_verdict *verdict);
// `text`, and the reason if there is one, as a fault's detail: managed, or `text` itself. The report of the
// call takes the reason.
const char *tls_with_reason(soap *ctx, const char *text, const tls_verdict &verdict);
// The address that `host` writes down, if it does, an IPv6 zone left out. Its length, bytes; 0: `host` is a
// name.
std::size_t tls_address_of(const char *host, unsigned char (&address)[16]);
