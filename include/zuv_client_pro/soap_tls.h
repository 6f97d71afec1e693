// soap_tls.h - TLS on OpenSSL: set-up of a context, and who the peer must be.
//
// Elsewhere: the handshake as part of connecting (soap_tcp.h).
//
// Always: a failed set-up has filled the fault record: text "SSL/TLS error", the detail says what failed,
// error 30. All texts are borrowed: they must outlive the context.
#pragma once

#include <zuv_client_pro/soap.h>

constexpr std::uint16_t TLS_VERIFY_PEER = 1;         // a verified server certificate is required; default
constexpr std::uint16_t TLS_REQUIRE_CLIENT_CERT = 2; // server side: ask for a client certificate
constexpr std::uint16_t TLS_SKIP_HOST_CHECK = 4;     // don't compare the host; goes before the strict check
constexpr std::uint16_t TLS_ALLOW_EXPIRED = 8;       // take an expired certificate
constexpr std::uint16_t TLS_NO_DEFAULT_CA = 16;      // don't load the system's default CA paths
constexpr std::uint16_t TLS_RSA_EPHEMERAL = 32;      // server side: no Diffie-Hellman parameters given
constexpr std::uint16_t TLS_NO_TLSV1 = 64;           // TLS 1.0 off, also where the host has lowered the least
constexpr std::uint16_t TLS_NO_SSLV3 = 128;          // SSL 3.0 off, likewise
constexpr std::uint16_t TLS_CLIENT_SIDE = 256;       // set by the client set-up and by a TLS connect
constexpr std::uint16_t TLS_STRICT_HOST_CHECK = 512; // the certificate must name the host by RFC 6125

// Who the server must be, with TLS_VERIFY_PEER and without TLS_SKIP_HOST_CHECK. A host's name must be a DNS
// alternative name of the certificate, whatever the case; "*" as the whole first label stands for one label.
// A common name counts likewise, but only if there is no DNS alternative name. A host given as an address
// must be an IP alternative name; without any alternative names a common name that writes the address will
// do, which TLS_STRICT_HOST_CHECK refuses. That flag also refuses "*" just before a top label ("*.example").
// LEGACY_HOST_CHECK without it: alternative names by case and without "*", common names as patterns of
// soap_tag_match, and any common name for a host without letters. A refusal's fault says in its detail why,
// in printable ASCII without markup: what OpenSSL found, at which depth of the chain and for which subject;
// or which host was asked for and what the certificate is for.

// Stores its arguments and builds a new TLS context (tls_setup) in the place of the one there was. Without a
// call of it the first https connection builds one from the fields' defaults. New rules are in force at once:
// a TLS connection that is open is closed (so don't call it within an exchange), and no session made before
// is resumed. What a host did to the former tls_context itself is to be done again. Copies made before keep
// the rules that they were made with. After a failure no former rules are left: each https connection tries
// to build the TLS context from the fields, and fails alike until that succeeds.
// The least version is TLS 1.2 (or what OpenSSL's configuration asks for above it), whatever the flags. For a
// peer that knows none of these a host lowers it after each set-up:
// SSL_CTX_set_min_proto_version(ctx->tls_context, ...), and OpenSSL's security level with it. The server's
// form is the same.
//   flags        TLS_...
//   key_file     PEM: certificate chain and private key of this side; null: none
//   password     of the private key; null: none (nobody is prompted)
//   ca_file      PEM: certificates to trust; null: none
//   ca_path      directory of such, by hash; null: none
//   random_file  more seed for OpenSSL; null: none
// Certificate revocation lists (PEM) are loaded too if ctx->tls_crl names a file.
// Returns 0, or error 30.
extern "C" ZUV_API int soap_ssl_client_context(soap *ctx, std::uint16_t flags, const char *key_file,
                                               const char *password, const char *ca_file, const char *ca_path,
                                               const char *random_file);

// The server's form.
//   dh_file      PEM file of Diffie-Hellman parameters, or a decimal number over 511: bits of a group to pick
//   (8192
//                at most); null: OpenSSL chooses
//   session_id   names the session cache, at most 32 bytes; null: sessions are not kept
ZUV_API int soap_ssl_server_context(soap *ctx, std::uint16_t flags, const char *key_file,
                                    const char *password, const char *ca_file, const char *ca_path,
                                    const char *dh_file, const char *random_file, const char *session_id);

// Server side handshake on ctx->socket, which soap_accept has stored. Limit: accept_timeout, or 10 s, for the
// handshake as a whole. Returns 0; or error 30 with a fault, and the socket closed.
ZUV_API int soap_ssl_accept(soap *ctx);

// Builds tls_context from the fields, with the same effect on former rules; the default of tls_setup. A
// set-up of the host's own puts an SSL_CTX there with a reference that the context frees. Returns 0, or error
// 30 with tls_context null.
ZUV_API int tls_context_setup(soap *ctx);

// Verify callbacks for OpenSSL. The first passes on OpenSSL's own verdict; the second takes an expired
// certificate too, and says so on standard error.
ZUV_API int tls_verify_plain(int result, x509_store_ctx_st *store);
ZUV_API int tls_verify_ignore_expiry(int result, x509_store_ctx_st *store);

// Hands the text `password` (null: none) to OpenSSL. `size`: room in `buffer`, bytes. Returns the length; 0
// if there is no password or no room for it and a terminator.
ZUV_API int tls_password_callback(char *buffer, int size, int flag, void *password);

// 32 random bits from OpenSSL.
ZUV_API std::uint32_t tls_random_word();

// Starts OpenSSL, once in a process; later calls return at once.
ZUV_API void tls_global_init();

// True unless `host` is null or holds a letter A to Z, a to z. So the empty text is an address, and fe80::1
// is not.
extern "C" ZUV_API bool IsIPAddr(const char *host);
