// tls_context.cpp - builds the SSL_CTX of a context: trust, own key, protocol options, verification mode.
//
// Elsewhere: its use (tls_handshake.cpp), the verify callbacks (tls_verify.cpp).
#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <unistd.h>

#include <openssl/err.h>
#include <openssl/evp.h>
#include <openssl/pem.h>
#include <openssl/rand.h>
#include <openssl/ssl.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_tls.h>

#include "core/failure.h"
#include "net/tls_connection.h"

namespace {

constexpr int VERIFY_DEPTH = 9;   // longest chain of certificates
constexpr long DH_BITS_MIN = 511; // a number up to this is the name of a file

std::atomic<bool> openssl_started{false};

struct bio_delete {
    void operator()(BIO *bio) const { BIO_free(bio); }
};
struct key_delete {
    void operator()(EVP_PKEY *key) const { EVP_PKEY_free(key); }
};
struct key_context_delete {
    void operator()(EVP_PKEY_CTX *context) const { EVP_PKEY_CTX_free(context); }
};
struct tls_context_delete {
    void operator()(SSL_CTX *context) const { SSL_CTX_free(context); }
};
using key = std::unique_ptr<EVP_PKEY, key_delete>;
using key_context = std::unique_ptr<EVP_PKEY_CTX, key_context_delete>;
using tls_context_owner = std::unique_ptr<SSL_CTX, tls_context_delete>;

bool has_flag(const soap *ctx, std::uint16_t flag)
{
    return (ctx->tls_flags & flag) != 0;
}

// Each step returns null, or what failed: constant or managed.

// What failed with a file, and why if the system knows.
const char *with_file(soap *ctx, const char *what, const char *file)
{
    char text[2 * SOAP_TEXT_SIZE], own[SOAP_TEXT_SIZE];
    const bool readable = access(file, R_OK) == 0;
    std::snprintf(text, sizeof text, "%s: %.900s%s%s", what, file, readable ? "" : ": ",
                  readable ? "" : strerror_r(errno, own, sizeof own));
    const char *const detail = soap_string_dup(ctx, text);
    return detail != nullptr ? detail : what;
}

const char *load_randomness(soap *ctx)
{
    return ctx->tls_random_file != nullptr && RAND_load_file(ctx->tls_random_file, -1) <= 0
               ? with_file(ctx, "Can't load randomness", ctx->tls_random_file)
               : nullptr;
}

const char *load_trust(soap *ctx, SSL_CTX *context)
{
    if (ctx->tls_ca_file != nullptr || ctx->tls_ca_path != nullptr) {
        if (SSL_CTX_load_verify_locations(context, ctx->tls_ca_file, ctx->tls_ca_path) == 0)
            return with_file(ctx, "Can't read CA file",
                             ctx->tls_ca_file != nullptr ? ctx->tls_ca_file : ctx->tls_ca_path);
        if (ctx->tls_ca_file != nullptr && has_flag(ctx, TLS_REQUIRE_CLIENT_CERT))
            SSL_CTX_set_client_CA_list(context, SSL_load_client_CA_file(ctx->tls_ca_file));
    }
    if (!has_flag(ctx, TLS_NO_DEFAULT_CA) && SSL_CTX_set_default_verify_paths(context) == 0)
        return "Can't read default CA file and/or directory";
    return nullptr;
}

const char *load_revocations(soap *ctx, SSL_CTX *context)
{
    if (ctx->tls_crl == nullptr)
        return nullptr;
    X509_STORE *store = SSL_CTX_get_cert_store(context);
    X509_LOOKUP *lookup = X509_STORE_add_lookup(store, X509_LOOKUP_file());
    if (lookup == nullptr || X509_load_crl_file(lookup, ctx->tls_crl, X509_FILETYPE_PEM) <= 0 ||
        X509_STORE_set_flags(store, X509_V_FLAG_CRL_CHECK) == 0)
        return with_file(ctx, "Can't read CRL file", ctx->tls_crl);
    return nullptr;
}

const char *load_key(soap *ctx, SSL_CTX *context)
{
    if (ctx->tls_key_file == nullptr)
        return nullptr;
    if (SSL_CTX_use_certificate_chain_file(context, ctx->tls_key_file) == 0)
        return with_file(ctx, "Can't read certificate key file", ctx->tls_key_file);
    // Also without a password: OpenSSL's own way would ask for one at the host's terminal.
    SSL_CTX_set_default_passwd_cb_userdata(context, const_cast<char *>(ctx->tls_password));
    SSL_CTX_set_default_passwd_cb(context, tls_password_callback);
    if (SSL_CTX_use_PrivateKey_file(context, ctx->tls_key_file, SSL_FILETYPE_PEM) == 0)
        return with_file(ctx, "Can't read key file", ctx->tls_key_file);
    return nullptr;
}

// The smallest of the well-known safe-prime groups with at least so many bits; null if there is none.
key known_dh_group(long bits)
{
    static constexpr struct {
        long bits;
        char name[10];
    } groups[] = {{2048, "ffdhe2048"},
                  {3072, "ffdhe3072"},
                  {4096, "ffdhe4096"},
                  {6144, "ffdhe6144"},
                  {8192, "ffdhe8192"}};
    for (const auto &group : groups) {
        if (group.bits < bits)
            continue;
        EVP_PKEY *parameters = nullptr;
        const key_context context(EVP_PKEY_CTX_new_from_name(nullptr, "DH", nullptr));
        if (context && EVP_PKEY_paramgen_init(context.get()) == 1 &&
            EVP_PKEY_CTX_set_group_name(context.get(), group.name) == 1)
            EVP_PKEY_paramgen(context.get(), &parameters);
        return key(parameters);
    }
    return nullptr;
}

key read_dh_parameters(BIO *file)
{
    key parameters(PEM_read_bio_Parameters_ex(file, nullptr, nullptr, nullptr));
    if (!parameters || !(EVP_PKEY_is_a(parameters.get(), "DH") || EVP_PKEY_is_a(parameters.get(), "DHX")))
        return nullptr;
    const key_context check(EVP_PKEY_CTX_new_from_pkey(nullptr, parameters.get(), nullptr));
    return check && EVP_PKEY_param_check(check.get()) == 1 ? std::move(parameters) : nullptr;
}

const char *set_dh_parameters(soap *ctx, SSL_CTX *context)
{
    char *end = nullptr;
    const long bits = std::strtol(ctx->tls_dh_file, &end, 10);
    key parameters;
    if (bits > DH_BITS_MIN && *end == '\0') {
        parameters = known_dh_group(bits);
    } else {
        const std::unique_ptr<BIO, bio_delete> file(BIO_new_file(ctx->tls_dh_file, "r"));
        if (!file)
            return with_file(ctx, "Can't read DH file", ctx->tls_dh_file);
        parameters = read_dh_parameters(file.get());
    }
    if (!parameters || SSL_CTX_set0_tmp_dh_pkey(context, parameters.get()) != 1)
        return "Can't set DH parameters";
    static_cast<void>(parameters.release()); // the SSL_CTX has it now
    return nullptr;
}

const char *set_key_exchange(soap *ctx, SSL_CTX *context)
{
    if (has_flag(ctx,
                 TLS_RSA_EPHEMERAL)) // RSA keys for one connection are gone from TLS: OpenSSL picks DH groups
        return SSL_CTX_set_dh_auto(context, 1) == 1 ? nullptr : "Can't set RSA key";
    return ctx->tls_dh_file != nullptr ? set_dh_parameters(ctx, context) : nullptr;
}

void set_protocol_options(const soap *ctx, SSL_CTX *context)
{
    SSL_CTX_set_options(context, SSL_OP_ALL | SSL_OP_NO_TICKET | SSL_OP_NO_SSLv2);
    if (has_flag(ctx, TLS_NO_SSLV3))
        SSL_CTX_set_options(context, SSL_OP_NO_SSLv3);
    if (has_flag(ctx, TLS_NO_TLSV1))
        SSL_CTX_set_options(context, SSL_OP_NO_TLSv1);
    // Whatever OpenSSL's security level and configuration would allow. A stricter one of theirs stays.
    if (SSL_CTX_get_min_proto_version(context) < TLS1_2_VERSION)
        SSL_CTX_set_min_proto_version(context, TLS1_2_VERSION);
}

void set_verification(const soap *ctx, SSL_CTX *context)
{
    int mode = has_flag(ctx, TLS_VERIFY_PEER) ? SSL_VERIFY_PEER : SSL_VERIFY_NONE;
    if (has_flag(ctx, TLS_REQUIRE_CLIENT_CERT))
        mode = SSL_VERIFY_PEER | SSL_VERIFY_FAIL_IF_NO_PEER_CERT;
    SSL_CTX_set_verify(context, mode, ctx->tls_verify);
    SSL_CTX_set_verify_depth(context, VERIFY_DEPTH);
}

const char *set_up(soap *ctx, SSL_CTX *context)
{
    if (const char *failure = load_randomness(ctx))
        return failure;
    if (const char *failure = load_trust(ctx, context))
        return failure;
    if (const char *failure = load_revocations(ctx, context))
        return failure;
    if (const char *failure = load_key(ctx, context))
        return failure;
    if (const char *failure = set_key_exchange(ctx, context))
        return failure;
    set_protocol_options(ctx, context);
    set_verification(ctx, context);
    return nullptr;
}

int fail_setup(soap *ctx, const char *detail)
{
    return fail_as_receiver(ctx, "SSL/TLS error", detail, SOAP_TLS_ERROR);
}

// New rules are in force from here on: nothing that was made or accepted under the old ones may bypass them,
// and a set-up that fails doesn't leave them in force.
void forget_former_rules(soap *ctx)
{
    if (tls_active(ctx)) {
        const int error = ctx->error;
        ctx->error = SOAP_OK;
        ctx->keep_alive = 0;
        soap_socket_release(ctx);
        ctx->error = error;
    } else {
        tls_discard(ctx);
    }
    tls_session_drop(ctx); // also the one that the connection has left
    SSL_CTX_free(ctx->tls_context);
    ctx->tls_context = nullptr;
}

void store_files(soap *ctx, const char *key_file, const char *password, const char *ca_file,
                 const char *ca_path, const char *dh_file, const char *random_file)
{
    ctx->tls_key_file = key_file;
    ctx->tls_password = password;
    ctx->tls_ca_file = ca_file;
    ctx->tls_ca_path = ca_path;
    ctx->tls_dh_file = dh_file;
    ctx->tls_random_file = random_file;
}

int set_up_by_flags(soap *ctx, unsigned flags)
{
    forget_former_rules(ctx);
    ctx->tls_flags = static_cast<std::uint16_t>(flags);
    ctx->tls_verify = has_flag(ctx, TLS_ALLOW_EXPIRED) ? tls_verify_ignore_expiry : tls_verify_plain;
    return ctx->tls_setup != nullptr ? ctx->tls_setup(ctx) : 0;
}

} // namespace

int soap_ssl_client_context(soap *ctx, std::uint16_t flags, const char *key_file, const char *password,
                            const char *ca_file, const char *ca_path, const char *random_file)
{
    store_files(ctx, key_file, password, ca_file, ca_path, nullptr, random_file);
    return set_up_by_flags(ctx, flags | TLS_CLIENT_SIDE);
}

int soap_ssl_server_context(soap *ctx, std::uint16_t flags, const char *key_file, const char *password,
                            const char *ca_file, const char *ca_path, const char *dh_file,
                            const char *random_file, const char *session_id)
{
    store_files(ctx, key_file, password, ca_file, ca_path, dh_file, random_file);
    if (const int error = set_up_by_flags(ctx, flags | (dh_file != nullptr ? 0u : TLS_RSA_EPHEMERAL)))
        return error;
    if (ctx->tls_context == nullptr) // the host's own set-up keeps it elsewhere
        return SOAP_OK;
    if (session_id == nullptr) {
        SSL_CTX_set_session_cache_mode(ctx->tls_context, SSL_SESS_CACHE_OFF);
        SSL_CTX_set_num_tickets(ctx->tls_context, 0); // nothing could redeem them
        return SOAP_OK;
    }
    if (SSL_CTX_set_session_id_context(ctx->tls_context, reinterpret_cast<const unsigned char *>(session_id),
                                       static_cast<unsigned>(std::strlen(session_id))) == 1)
        return SOAP_OK;
    forget_former_rules(ctx);
    return fail_setup(ctx, "Can't set session id");
}

int tls_context_setup(soap *ctx)
{
    tls_global_init();
    forget_former_rules(ctx);
    ERR_clear_error();
    tls_context_owner fresh(SSL_CTX_new(TLS_method()));
    if (!fresh)
        return fail_setup(ctx, "Can't setup context");
    if (const char *failure = set_up(ctx, fresh.get()))
        return fail_setup(ctx, failure);
    ctx->tls_context = fresh.release();
    return SOAP_OK;
}

int tls_password_callback(char *buffer, int size, int, void *password)
{
    const std::size_t length = password != nullptr ? std::strlen(static_cast<const char *>(password)) : 0;
    if (length == 0 || size <= 0 || length >= static_cast<std::size_t>(size))
        return 0;
    std::memcpy(buffer, password, length + 1);
    return static_cast<int>(length);
}

std::uint32_t tls_random_word()
{
    tls_global_init();
    std::uint32_t word = 0;
    if (RAND_bytes(reinterpret_cast<unsigned char *>(&word), sizeof word) != 1 &&
        getentropy(&word, sizeof word) != 0)
        return 0;
    return word;
}

void tls_global_init()
{
    // OpenSSL seeds its random source from the system by itself.
    if (!openssl_started.exchange(true))
        OPENSSL_init_ssl(OPENSSL_INIT_LOAD_SSL_STRINGS | OPENSSL_INIT_LOAD_CRYPTO_STRINGS, nullptr);
}
