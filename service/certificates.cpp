// certificates.cpp - see certificates.h.
#include "certificates.h"

#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <stdexcept>
#include <system_error>

#include <fcntl.h>
#include <openssl/evp.h>
#include <openssl/pem.h>
#include <openssl/rand.h>
#include <openssl/ssl.h>
#include <openssl/x509v3.h>
#include <unistd.h>

#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_tls.h>

namespace service {

namespace {

constexpr long HOUR = 3600, LIFETIME = 30L * 24 * HOUR; // seconds
constexpr char SERVER_NAMES[] = "DNS:localhost,IP:127.0.0.1,IP:::1";

template <auto Free> struct freed_by {
    template <class T> void operator()(T *object) const { Free(object); }
};
using key = std::unique_ptr<EVP_PKEY, freed_by<EVP_PKEY_free>>;
using certificate = std::unique_ptr<X509, freed_by<X509_free>>;
using extension = std::unique_ptr<X509_EXTENSION, freed_by<X509_EXTENSION_free>>;
using number = std::unique_ptr<BIGNUM, freed_by<BN_free>>;

void demand(bool done)
{
    if (!done)
        throw std::runtime_error("OpenSSL could not make a certificate");
}

struct identity {
    key own;
    certificate shown;
};

void extend(X509 *target, X509 *issuer, int id, const char *value)
{
    X509V3_CTX context;
    X509V3_set_ctx(&context, issuer, target, nullptr, nullptr, 0);
    const extension made(X509V3_EXT_conf_nid(nullptr, &context, id, value));
    demand(made != nullptr && X509_add_ext(target, made.get(), -1) == 1);
}

void set_serial(X509 *target)
{
    const number random(BN_new());
    demand(random != nullptr && BN_rand(random.get(), 120, BN_RAND_TOP_ANY, BN_RAND_BOTTOM_ANY) == 1 &&
           BN_to_ASN1_INTEGER(random.get(), X509_get_serialNumber(target)) != nullptr);
}

// A key and its certificate, signed by `issuer`; by itself without one.
identity make_identity(const char *name, const identity *issuer)
{
    identity made{key(EVP_EC_gen("P-256")), certificate(X509_new())};
    X509 *const x509 = made.shown.get();
    demand(made.own != nullptr && x509 != nullptr && X509_set_version(x509, X509_VERSION_3) == 1);
    set_serial(x509);
    X509_NAME *const subject = X509_get_subject_name(x509);
    const auto *const text = reinterpret_cast<const unsigned char *>(name);
    X509 *const signer = issuer == nullptr ? x509 : issuer->shown.get();
    demand(X509_gmtime_adj(X509_getm_notBefore(x509), -HOUR) != nullptr && // for clocks that are slow
           X509_gmtime_adj(X509_getm_notAfter(x509), LIFETIME) != nullptr &&
           X509_set_pubkey(x509, made.own.get()) == 1 &&
           X509_NAME_add_entry_by_txt(subject, "CN", MBSTRING_UTF8, text, -1, -1, 0) == 1 &&
           X509_set_issuer_name(x509, X509_get_subject_name(signer)) == 1);
    extend(x509, signer, NID_basic_constraints, issuer == nullptr ? "critical,CA:TRUE" : "critical,CA:FALSE");
    extend(x509, signer, NID_subject_key_identifier, "hash");
    extend(x509, signer, NID_key_usage,
           issuer == nullptr ? "critical,keyCertSign,cRLSign" : "critical,digitalSignature");
    return made;
}

void sign(const identity &made, const identity &issuer)
{
    demand(X509_sign(made.shown.get(), issuer.own.get(), EVP_sha256()) != 0);
}

identity make_signed(const char *name, const identity &authority, int id, const char *extended)
{
    identity made = make_identity(name, &authority);
    X509 *const x509 = made.shown.get();
    extend(x509, authority.shown.get(), NID_authority_key_identifier, "keyid");
    extend(x509, authority.shown.get(), id, extended);
    return made;
}

// A file appears whole or not at all.
void write_pem(const std::filesystem::path &path, const identity &made, bool with_key)
{
    const std::string unfinished = path.string() + ".new";
    unlink(unfinished.c_str());
    const int file =
        open(unfinished.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, with_key ? 0600 : 0644);
    std::FILE *const stream = file < 0 ? nullptr : fdopen(file, "w");
    if (stream == nullptr)
        throw std::system_error(errno, std::generic_category(), unfinished);
    bool written = PEM_write_X509(stream, made.shown.get()) == 1;
    if (with_key)
        written = PEM_write_PrivateKey(stream, made.own.get(), nullptr, nullptr, 0, nullptr, nullptr) == 1 &&
                  written;
    written = std::fclose(stream) == 0 && written;
    if (!written || std::rename(unfinished.c_str(), path.c_str()) != 0)
        throw std::system_error(errno, std::generic_category(), path.string());
}

const char *path_or_null(const std::string &path)
{
    return path.empty() ? nullptr : path.c_str();
}

} // namespace

void make_authority(const std::string &directory)
{
    const std::filesystem::path folder = directory;
    if (std::filesystem::exists(folder / "server.pem"))
        return;
    std::filesystem::create_directories(folder);
    const identity authority = make_identity("zuv-service test authority", nullptr);
    sign(authority, authority);
    const identity server = make_signed("localhost", authority, NID_subject_alt_name, SERVER_NAMES);
    extend(server.shown.get(), authority.shown.get(), NID_ext_key_usage, "serverAuth");
    sign(server, authority);
    const identity client =
        make_signed("zuv-service test client", authority, NID_ext_key_usage, "clientAuth");
    sign(client, authority);
    write_pem(folder / "ca.pem", authority, false);
    write_pem(folder / "client.pem", client, true);
    write_pem(folder / "server.pem", server, true);
}

void set_up_tls(soap *ctx, const settings &config)
{
    const bool asks_client = !config.client_ca.empty();
    const auto flags =
        static_cast<std::uint16_t>(TLS_NO_DEFAULT_CA | (asks_client ? TLS_REQUIRE_CLIENT_CERT : 0));
    const bool one_file = config.key.empty();
    if (soap_ssl_server_context(ctx, flags, one_file ? config.certificate.c_str() : nullptr, nullptr,
                                path_or_null(config.client_ca), nullptr, nullptr, nullptr, nullptr) != 0) {
        const char *const why = soap_fault_detail_value(ctx);
        throw std::runtime_error("TLS: " + config.certificate + ": " +
                                 (why == nullptr ? "can't be used" : why));
    }
    if (one_file)
        return;
    if (SSL_CTX_use_certificate_chain_file(ctx->tls_context, config.certificate.c_str()) != 1)
        throw std::runtime_error("TLS: no certificate can be read from " + config.certificate);
    if (SSL_CTX_use_PrivateKey_file(ctx->tls_context, config.key.c_str(), SSL_FILETYPE_PEM) != 1)
        throw std::runtime_error("TLS: " + config.key + " holds no key that fits " + config.certificate);
}

} // namespace service
