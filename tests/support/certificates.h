// certificates.h - keys and certificates made by the test itself, and the files that a TLS set-up wants them in.
#pragma once

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <stdexcept>
#include <string>

#include <openssl/evp.h>
#include <openssl/pem.h>
#include <openssl/x509.h>
#include <openssl/x509v3.h>

namespace certificates {

template <auto Free> struct freed_by {
    template <class T> void operator()(T *object) const { Free(object); }
};
using key = std::unique_ptr<EVP_PKEY, freed_by<EVP_PKEY_free>>;
using certificate = std::unique_ptr<X509, freed_by<X509_free>>;
using revocations = std::unique_ptr<X509_CRL, freed_by<X509_CRL_free>>;

constexpr long DAY = 24 * 60 * 60; // seconds

struct subject {
    std::string common_name; // empty: the subject has none
    std::string names; // subjectAltName as OpenSSL's configuration writes it, e.g. "DNS:a.test,IP:127.0.0.1"
    long not_before = -DAY; // seconds from now
    long not_after = DAY;
};

inline key make_key()
{
    return key(EVP_EC_gen("P-256"));
}

inline void add_extension(X509 *target, X509 *issuer, int id, const std::string &value)
{
    X509V3_CTX context;
    X509V3_set_ctx(&context, issuer, target, nullptr, nullptr, 0);
    X509_EXTENSION *extension = X509V3_EXT_conf_nid(nullptr, &context, id, value.c_str());
    if (!extension)
        throw std::runtime_error("no such extension: " + value);
    X509_add_ext(target, extension, -1);
    X509_EXTENSION_free(extension);
}

// A certificate for `subject_key`, signed by `issuer` (null: by itself) with the issuer's key.
inline certificate make(const subject &who, EVP_PKEY *subject_key, X509 *issuer, EVP_PKEY *issuer_key,
                        long serial, bool authority = false)
{
    certificate made(X509_new());
    X509_set_version(made.get(), X509_VERSION_3);
    ASN1_INTEGER_set(X509_get_serialNumber(made.get()), serial);
    X509_gmtime_adj(X509_getm_notBefore(made.get()), who.not_before);
    X509_gmtime_adj(X509_getm_notAfter(made.get()), who.not_after);
    X509_set_pubkey(made.get(), subject_key);
    X509_NAME *name = X509_get_subject_name(made.get());
    const auto add = [name](const char *field, const std::string &text) {
        X509_NAME_add_entry_by_txt(name, field, MBSTRING_UTF8,
                                   reinterpret_cast<const unsigned char *>(text.data()),
                                   static_cast<int>(text.size()), -1, 0);
    };
    add("O", "Test");
    if (!who.common_name.empty())
        add("CN", who.common_name);
    X509_set_issuer_name(made.get(), issuer ? X509_get_subject_name(issuer) : name);
    X509 *signer = issuer ? issuer : made.get();
    add_extension(made.get(), signer, NID_basic_constraints, authority ? "critical,CA:TRUE" : "CA:FALSE");
    if (!who.names.empty())
        add_extension(made.get(), signer, NID_subject_alt_name, who.names);
    X509_sign(made.get(), issuer_key, EVP_sha256());
    return made;
}

// An authority, and a directory for its files that goes when it goes.
class authority {
public:
    authority()
        : key_(make_key()),
          certificate_(make({"Test authority", ""}, key_.get(), nullptr, key_.get(), 1, true))
    {
        std::string pattern = (std::filesystem::temp_directory_path() / "certificates-XXXXXX").string();
        if (!mkdtemp(pattern.data()))
            throw std::runtime_error("no directory for certificates");
        directory_ = pattern;
        write("ca.pem", [this](std::FILE *file) { PEM_write_X509(file, certificate_.get()); });
    }
    ~authority() { std::filesystem::remove_all(directory_); }
    authority(const authority &) = delete;
    authority &operator=(const authority &) = delete;

    certificate issue(const subject &who, EVP_PKEY *subject_key)
    {
        return make(who, subject_key, certificate_.get(), key_.get(), ++serial_);
    }

    std::string ca_file() const { return path("ca.pem"); }
    std::string path(const std::string &name) const { return directory_ / name; }

    // Writes a file of the directory; gives its path.
    template <class Write> std::string write(const std::string &name, Write write_into)
    {
        std::FILE *file = std::fopen(path(name).c_str(), "w");
        if (!file)
            throw std::runtime_error("can't write " + path(name));
        write_into(file);
        std::fclose(file);
        return path(name);
    }
    // Certificate and private key in one file; with a password the key is encrypted.
    std::string write_pair(const std::string &name, X509 *own_certificate, EVP_PKEY *own_key,
                           const char *password = nullptr)
    {
        return write(name, [=](std::FILE *file) {
            PEM_write_X509(file, own_certificate);
            PEM_write_PrivateKey(file, own_key, password ? EVP_aes_128_cbc() : nullptr, nullptr, 0, nullptr,
                                 const_cast<char *>(password));
        });
    }
    // A list that revokes one certificate, or none.
    std::string write_revocations(const std::string &name, X509 *revoked)
    {
        revocations list(X509_CRL_new());
        X509_CRL_set_version(list.get(), X509_CRL_VERSION_2);
        X509_CRL_set_issuer_name(list.get(), X509_get_subject_name(certificate_.get()));
        std::unique_ptr<ASN1_TIME, freed_by<ASN1_TIME_free>> time(X509_gmtime_adj(nullptr, -DAY));
        X509_CRL_set1_lastUpdate(list.get(), time.get());
        if (revoked) {
            X509_REVOKED *entry = X509_REVOKED_new();
            X509_REVOKED_set_serialNumber(entry, X509_get_serialNumber(revoked));
            X509_REVOKED_set_revocationDate(entry, time.get());
            X509_CRL_add0_revoked(list.get(), entry);
        }
        X509_gmtime_adj(time.get(), DAY);
        X509_CRL_set1_nextUpdate(list.get(), time.get());
        X509_CRL_sign(list.get(), key_.get(), EVP_sha256());
        return write(name, [&](std::FILE *file) { PEM_write_X509_CRL(file, list.get()); });
    }

private:
    key key_;
    certificate certificate_;
    std::filesystem::path directory_;
    long serial_ = 1;
};

} // namespace certificates
