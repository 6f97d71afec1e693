// soap_tls.h - TLS on OpenSSL: set-up of a context, and who the peer must be.
//
// Elsewhere: the handshake as part of connecting (soap_tcp.h).
//
// Always: SOAP_TLS_ERROR of a set-up comes with a fault record: text "SSL/TLS error", the detail says what
// failed. Text arguments are borrowed: they must outlive the context.
#pragma once

#include <zuv_client_pro/soap.h>

// --- flags of a TLS context ---
//
// Bits of soap::tls_flags.

constexpr std::uint16_t TLS_VERIFY_PEER = 1;         // a verified server certificate is required; default
constexpr std::uint16_t TLS_REQUIRE_CLIENT_CERT = 2; // server side: ask for a client certificate
constexpr std::uint16_t TLS_SKIP_HOST_CHECK = 4;     // don't compare the host; overrules the strict check
constexpr std::uint16_t TLS_ALLOW_EXPIRED = 8;       // accept an expired certificate
constexpr std::uint16_t TLS_NO_DEFAULT_CA = 16;      // don't load the system's default CA paths
constexpr std::uint16_t TLS_RSA_EPHEMERAL = 32;      // server side: no Diffie-Hellman parameters given
constexpr std::uint16_t TLS_NO_TLSV1 = 64; // TLS 1.0 off, also where the host program has lowered the minimum
constexpr std::uint16_t TLS_NO_SSLV3 = 128;          // SSL 3.0 off, likewise
constexpr std::uint16_t TLS_CLIENT_SIDE = 256;       // set by the client set-up and by a TLS connect
constexpr std::uint16_t TLS_STRICT_HOST_CHECK = 512; // the certificate must name the host by RFC 6125

// --- who the server must be ---
//
// With TLS_VERIFY_PEER and without TLS_SKIP_HOST_CHECK: a host's name must be a DNS alternative name of the
// certificate, whatever the case; "*" as the whole first label stands for one label. A common name counts
// likewise, but only if there is no DNS alternative name. A host given as an address must be an IP
// alternative name; without any alternative names a common name that is the address is accepted too, unless
// TLS_STRICT_HOST_CHECK is set. That flag also refuses "*" just before a top label ("*.example").
// LEGACY_HOST_CHECK without it: alternative names by case and without "*", common names as patterns of
// soap_tag_match, and any common name for a host without letters. The fault of a refusal says in its detail
// why, in printable ASCII without markup: what OpenSSL found, at which depth of the chain and for which
// subject; or which host was asked for and which names the certificate has.

// --- set-up ---

// Store their arguments and build a new TLS context (soap::tls_setup), which replaces the old one. Without a
// call of soap_ssl_client_context the first https connection builds one from the fields' defaults. Called
// between exchanges: a TLS connection that is open is closed, and no session made before is resumed. Changes
// that a host program has made to the former tls_context itself must be made again. Copies of the context
// made before keep the rules that they were made with. After a failure no former rules are left: each https
// connection tries to build the TLS context from the fields, and fails in the same way until that succeeds.
//
// The minimum version is TLS 1.2 (or what OpenSSL's configuration asks for above it), whatever the flags. For
// a peer that supports none of these a host program lowers it after each set-up:
// SSL_CTX_set_min_proto_version(ctx->tls_context, ...), and OpenSSL's security level with it.
//   flags        TLS_...
//   key_file     PEM: certificate chain and private key of this side; null: none
//   password     of the private key; null: none (there is no prompt)
//   ca_file      PEM: certificates to trust; null: none
//   ca_path      directory of such, by hash; null: none
//   dh_file      PEM file of Diffie-Hellman parameters, or a decimal number over 511: bits of a group to
//                pick, at most 8192; null: OpenSSL chooses
//   random_file  more seed for OpenSSL; null: none
//   session_id   names the session cache, at most 32 bytes; null: sessions are not kept
// Certificate revocation lists (PEM) are loaded too if soap::tls_crl names a file.
//   SOAP_OK
//   SOAP_TLS_ERROR  a file, the parameters or the session id can't be used, or memory ran out
extern "C" ZUV_API int soap_ssl_client_context(soap *ctx, std::uint16_t flags, const char *key_file,
                                               const char *password, const char *ca_file, const char *ca_path,
                                               const char *random_file);
ZUV_API int soap_ssl_server_context(soap *ctx, std::uint16_t flags, const char *key_file,
                                    const char *password, const char *ca_file, const char *ca_path,
                                    const char *dh_file, const char *random_file, const char *session_id);

// Server side handshake on soap::socket, which soap_accept has stored. Limit: accept_timeout, or 10 s, for
// the handshake as a whole.
//   SOAP_OK
//   SOAP_TLS_ERROR  it failed or time is up; there is a fault record, and the socket is closed
ZUV_API int soap_ssl_accept(soap *ctx);

// Builds soap::tls_context from the fields, with the same effect on former rules; the default of
// soap::tls_setup. A set-up of the host program's own stores an SSL_CTX there with a reference that the
// context frees.
//   SOAP_OK
//   SOAP_TLS_ERROR  as for soap_ssl_client_context; tls_context is null
ZUV_API int tls_context_setup(soap *ctx);

// --- for OpenSSL ---

// Verify callbacks, values of soap::tls_verify. The first returns OpenSSL's own verdict; the second accepts
// an expired certificate too, and reports it on standard error.
//   result   OpenSSL's verdict: 1 accepted, 0 refused
//   store    the certificate and its error
//   returns  1 accepted, 0 refused
ZUV_API int tls_verify_plain(int result, x509_store_ctx_st *store);
ZUV_API int tls_verify_ignore_expiry(int result, x509_store_ctx_st *store);

// Password callback.
//   buffer    takes the password, terminated
//   size      bytes in `buffer`
//   flag      not used
//   password  a text; null: none
//   returns   its length
//   0         there is no password, or it doesn't fit
ZUV_API int tls_password_callback(char *buffer, int size, int flag, void *password);

// Random bits, from OpenSSL or else from the system.
//   returns  32 bits; 0 if there is no randomness
ZUV_API std::uint32_t tls_random_word();

// Starts OpenSSL, once in a process; later calls return at once.
ZUV_API void tls_global_init();

// Whether a host is written as an address: it holds no letter A to Z or a to z. So the empty text is an
// address, and fe80::1 is not.
//   host   null gives false
//   true   no letter
//   false  a letter, or null
extern "C" ZUV_API bool IsIPAddr(const char *host);
