// tls_verify.cpp - is the peer the host asked for, and does a certificate's verdict stand?
//
// Two rules for the name. The usual one takes a DNS alternative name that equals the host, or a common name
// that matches it as a pattern, or any common name if the host has no letters. The strict one is that of RFC
// 6125, by OpenSSL, and is taken only if TLS_STRICT_HOST_CHECK asks for it.
#include <arpa/inet.h>
#include <cstdio>
#include <cstring>
#include <memory>
#include <netinet/in.h>

#include <openssl/ssl.h>
#include <openssl/x509v3.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_tls.h>
#include <zuv_client_pro/soap_xml.h>

#include "transport/tls_connection.h"

namespace {

struct certificate_delete {
    void operator()(X509 *certificate) const { X509_free(certificate); }
};
struct names_delete {
    void operator()(GENERAL_NAMES *names) const { GENERAL_NAMES_free(names); }
};
struct openssl_text_delete {
    void operator()(unsigned char *text) const { OPENSSL_free(text); }
};

bool same_text(const ASN1_STRING *name, const char *text)
{
    const std::size_t length = std::strlen(text);
    return static_cast<std::size_t>(ASN1_STRING_length(name)) == length &&
           std::memcmp(ASN1_STRING_get0_data(name), text, length) == 0;
}

bool lists_host(const GENERAL_NAMES *names, const char *host)
{
    for (int i = 0; i < sk_GENERAL_NAME_num(names); ++i) {
        const GENERAL_NAME *name = sk_GENERAL_NAME_value(names, i);
        if (name->type == GEN_DNS && same_text(name->d.dNSName, host))
            return true;
    }
    return false;
}

bool alternative_name_is(const X509 *certificate, const char *host)
{
    for (int place = -1;;) {
        const std::unique_ptr<GENERAL_NAMES, names_delete> names(static_cast<GENERAL_NAMES *>(
            X509_get_ext_d2i(certificate, NID_subject_alt_name, nullptr, &place)));
        if (!names)
            return false; // no further one, or one that can't be read, which ends the search
        if (lists_host(names.get(), host))
            return true;
    }
}

// The comparison works on terminated texts: a name that goes on behind a NUL is not the name it shows.
bool is_plain_text(const ASN1_STRING *name)
{
    const auto length = static_cast<std::size_t>(ASN1_STRING_length(name));
    return !std::memchr(ASN1_STRING_get0_data(name), '\0', length);
}

// A "*" at the start stands for one label, the one ahead of the host's first dot. Anywhere else it is a
// pattern's.
bool pattern_names(const char *host, const char *pattern)
{
    if (pattern[0] != '*')
        return soap_tag_match(host, pattern) == 0;
    const char *domain = std::strchr(host, '.');
    return domain && soap_tag_match(domain, pattern + 1) == 0;
}

bool common_name_is(const ASN1_STRING *name, const char *host)
{
    if (!name || !ASN1_STRING_get0_data(name))
        return false;
    const auto *raw = reinterpret_cast<const char *>(ASN1_STRING_get0_data(name));
    const bool narrow =
        ASN1_STRING_type(name) != V_ASN1_BMPSTRING && ASN1_STRING_type(name) != V_ASN1_UNIVERSALSTRING;
    if (narrow && is_plain_text(name) && pattern_names(host, raw))
        return true;
    unsigned char *text = nullptr;
    const int length = ASN1_STRING_to_UTF8(&text, name);
    const std::unique_ptr<unsigned char, openssl_text_delete> owner(length >= 0 ? text : nullptr);
    if (!owner || std::memchr(text, '\0', static_cast<std::size_t>(length)))
        return false;
    return IsIPAddr(host) || pattern_names(host, reinterpret_cast<const char *>(text));
}

bool any_common_name_is(const X509 *certificate, const char *host)
{
    const X509_NAME *subject = X509_get_subject_name(certificate);
    for (int place = -1; (place = X509_NAME_get_index_by_NID(subject, NID_commonName, place)) >= 0;)
        if (common_name_is(X509_NAME_ENTRY_get_data(X509_NAME_get_entry(subject, place)), host))
            return true;
    return false;
}

bool names_host_strictly(X509 *certificate, const char *host)
{
    unsigned char address[sizeof(in6_addr)];
    if (inet_pton(AF_INET, host, address) == 1)
        return X509_check_ip(certificate, address, sizeof(in_addr), 0) == 1;
    if (inet_pton(AF_INET6, host, address) == 1)
        return X509_check_ip(certificate, address, sizeof(in6_addr), 0) == 1;
    return *host != '\0' && X509_check_host(certificate, host, 0, 0, nullptr) == 1;
}

bool names_host(X509 *certificate, const char *host, bool strictly)
{
    if (strictly)
        return names_host_strictly(certificate, host);
    return alternative_name_is(certificate, host) || any_common_name_is(certificate, host);
}

} // namespace

int tls_check_peer(soap *ctx, const char *host)
{
    const long verdict = SSL_get_verify_result(ctx->tls_connection);
    if (verdict != X509_V_OK)
        return soap_fault_sender(ctx, X509_verify_cert_error_string(verdict),
                                 "SSL/TLS certificate presented by peer cannot be verified in tcp_connect()",
                                 SOAP_TLS_ERROR);
    if ((ctx->tls_flags & TLS_SKIP_HOST_CHECK) != 0)
        return 0;
    const std::unique_ptr<X509, certificate_delete> certificate(
        SSL_get1_peer_certificate(ctx->tls_connection));
    if (!certificate)
        return soap_fault_sender(ctx, "SSL/TLS error",
                                 "No SSL/TLS certificate was presented by the peer in tcp_connect()",
                                 SOAP_TLS_ERROR);
    if (names_host(certificate.get(), host, (ctx->tls_flags & TLS_STRICT_HOST_CHECK) != 0))
        return 0;
    return soap_fault_sender(ctx, "SSL/TLS error", "SSL/TLS certificate host name mismatch in tcp_connect()",
                             SOAP_TLS_ERROR);
}

int tls_verify_plain(int result, x509_store_ctx_st *)
{
    return result;
}

int tls_verify_ignore_expiry(int result, x509_store_ctx_st *store)
{
    if (result != 0 || X509_STORE_CTX_get_error(store) != X509_V_ERR_CERT_HAS_EXPIRED)
        return result;
    std::fputs("ignoring certificate expiration\n", stderr);
    X509_STORE_CTX_set_error(store, X509_V_OK);
    return 1;
}

bool IsIPAddr(const char *host)
{
    if (!host)
        return false;
    for (; *host; ++host)
        if ((*host >= 'A' && *host <= 'Z') || (*host >= 'a' && *host <= 'z'))
            return false;
    return true;
}
