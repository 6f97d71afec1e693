// tls_verify.cpp - is the peer the host asked for, and does the verdict on a certificate hold? And the reasons of
// a refusal, for the host's eyes.
//
// Three rules for the name of a host:
//   the usual one    as names: a DNS alternative name that equals the host whatever the case, or has "*" for
//                    its first label; where there is none, a common name likewise
//   the strict one   that of RFC 6125, by OpenSSL, if TLS_STRICT_HOST_CHECK asks for it
//   the older one    a DNS alternative name that equals the host, or a common name that matches it as a
//   pattern,
//                    or any common name if the host has no letters; if LEGACY_HOST_CHECK asks for it
// An address must be listed as one by the first two; the first also takes a common name that writes it, where
// there is no alternative name.
#include <algorithm>
#include <arpa/inet.h>
#include <cstdio>
#include <cstring>
#include <memory>
#include <netinet/in.h>
#include <string>
#include <string_view>

#include <openssl/ssl.h>
#include <openssl/x509v3.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_tls.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/failure.h"
#include "net/call_record.h"
#include "net/tls_connection.h"

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
struct bio_delete {
    void operator()(BIO *bio) const { BIO_free(bio); }
};

// ---------------------------------------------------------------------------------------------
// Names of a certificate. None of them is trusted to be terminated or free of zero bytes.

std::string_view text_of(const ASN1_STRING *name)
{
    return {reinterpret_cast<const char *>(ASN1_STRING_get0_data(name)),
            static_cast<std::size_t>(ASN1_STRING_length(name))};
}

// Calls `visit` with each alternative name until it returns true. True if one did.
template <class Visit> bool any_alternative_name(const X509 *certificate, Visit visit)
{
    for (int place = -1;;) {
        const std::unique_ptr<GENERAL_NAMES, names_delete> names(static_cast<GENERAL_NAMES *>(
            X509_get_ext_d2i(certificate, NID_subject_alt_name, nullptr, &place)));
        if (!names)
            return false; // no further one, or one that can't be read, which ends the search
        for (int i = 0; i < sk_GENERAL_NAME_num(names.get()); ++i)
            if (visit(sk_GENERAL_NAME_value(names.get(), i)))
                return true;
    }
}

// The same with each common name.
template <class Visit> bool any_common_name(const X509 *certificate, Visit visit)
{
    const X509_NAME *subject = X509_get_subject_name(certificate);
    for (int place = -1; (place = X509_NAME_get_index_by_NID(subject, NID_commonName, place)) >= 0;) {
        const ASN1_STRING *name = X509_NAME_ENTRY_get_data(X509_NAME_get_entry(subject, place));
        if (name && ASN1_STRING_get0_data(name) && visit(name))
            return true;
    }
    return false;
}

// Calls `visit` with the name in UTF-8. False if it has none.
template <class Visit> bool in_utf8(const ASN1_STRING *name, Visit visit)
{
    unsigned char *text = nullptr;
    const int length = ASN1_STRING_to_UTF8(&text, name);
    const std::unique_ptr<unsigned char, openssl_text_delete> owner(length >= 0 ? text : nullptr);
    return owner && visit(std::string_view(reinterpret_cast<char *>(text), static_cast<std::size_t>(length)));
}

// ---------------------------------------------------------------------------------------------
// The usual rule.

// Whatever the locale says of letters.
char lower(char c)
{
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

bool same_name(std::string_view one, std::string_view other)
{
    return std::equal(one.begin(), one.end(), other.begin(), other.end(),
                      [](char a, char b) { return lower(a) == lower(b); });
}

// "*" stands for the whole first label, which has some letters.
bool covers_host(std::string_view name, std::string_view host)
{
    if (!name.starts_with("*."))
        return same_name(name, host);
    const std::size_t dot = host.find('.');
    return dot != std::string_view::npos && dot != 0 && same_name(name.substr(1), host.substr(dot));
}

bool names_host_usually(const X509 *certificate, const char *host)
{
    bool has_names = false;
    const bool listed = any_alternative_name(certificate, [&](const GENERAL_NAME *name) {
        has_names = has_names || name->type == GEN_DNS;
        return name->type == GEN_DNS && covers_host(text_of(name->d.dNSName), host);
    });
    return listed || (!has_names && any_common_name(certificate, [host](const ASN1_STRING *name) {
               return in_utf8(name, [host](std::string_view t) { return covers_host(t, host); });
           }));
}

bool lists_address(X509 *certificate, const unsigned char *address, std::size_t length)
{
    return X509_check_ip(certificate, address, length, 0) == 1;
}

bool names_address_usually(X509 *certificate, const char *host, const unsigned char *address,
                           std::size_t length)
{
    if (lists_address(certificate, address, length))
        return true;
    return X509_get_ext_by_NID(certificate, NID_subject_alt_name, -1) < 0 &&
           any_common_name(certificate, [host](const ASN1_STRING *name) {
               return in_utf8(name, [host](std::string_view text) { return same_name(text, host); });
           });
}

// ---------------------------------------------------------------------------------------------
// The older rule.

// A "*" at the start stands for one label, the one before the host's first dot. Anywhere else it is a
// pattern's.
bool pattern_names(const char *host, const char *pattern)
{
    if (pattern[0] != '*')
        return soap_tag_match(host, pattern) == 0;
    const char *domain = std::strchr(host, '.');
    return domain != nullptr && soap_tag_match(domain, pattern + 1) == 0;
}

// The comparison works on terminated texts: a name that continues after a NUL is not the name it shows.
bool is_plain_text(std::string_view name)
{
    return name.find('\0') == std::string_view::npos;
}

bool common_name_matches(const ASN1_STRING *name, const char *host)
{
    const bool narrow =
        ASN1_STRING_type(name) != V_ASN1_BMPSTRING && ASN1_STRING_type(name) != V_ASN1_UNIVERSALSTRING;
    if (narrow && is_plain_text(text_of(name)) && pattern_names(host, text_of(name).data()))
        return true;
    return in_utf8(name, [host](std::string_view text) {
        return is_plain_text(text) && (IsIPAddr(host) || pattern_names(host, text.data()));
    });
}

bool names_host_as_before(const X509 *certificate, const char *host)
{
    return any_alternative_name(certificate,
                                [host](const GENERAL_NAME *name) {
                                    return name->type == GEN_DNS && text_of(name->d.dNSName) == host;
                                }) ||
           any_common_name(certificate,
                           [host](const ASN1_STRING *name) { return common_name_matches(name, host); });
}

bool names_host(const soap *ctx, X509 *certificate, const char *host)
{
    const bool strictly = (ctx->tls_flags & TLS_STRICT_HOST_CHECK) != 0;
    if (!strictly && (ctx->legacy & LEGACY_HOST_CHECK) != 0)
        return names_host_as_before(certificate, host);
    unsigned char address[16];
    if (const std::size_t length = tls_address_of(host, address))
        return strictly ? lists_address(certificate, address, length)
                        : names_address_usually(certificate, host, address, length);
    if (*host == '\0')
        return false;
    return strictly
               ? X509_check_host(certificate, host, 0, X509_CHECK_FLAG_NO_PARTIAL_WILDCARDS, nullptr) == 1
               : names_host_usually(certificate, host);
}

// ---------------------------------------------------------------------------------------------
// Reasons. A fault's detail is raw XML, and names are the peer's text: what could be markup or control an
// output becomes "?".

bool is_harmless(char c)
{
    return c >= ' ' && c <= '~' && std::strchr("<>&", c) == nullptr;
}

class reason_text {
public:
    void add(std::string_view part)
    {
        for (const char c : part)
            if (length_ + 1 < sizeof text_)
                text_[length_++] = is_harmless(c) ? c : '?';
    }
    // An item of a list. False once the text is full.
    bool add_item(std::string_view item)
    {
        constexpr std::size_t CAPACITY = sizeof text_ - 64;
        add(items_++ == 0 ? "" : ", ");
        const bool fits = length_ < CAPACITY && item.size() < CAPACITY - length_;
        add(fits ? item : "...");
        return fits;
    }
    bool has_items() const { return items_ != 0; }
    const char *text() const { return text_; }

private:
    char text_[480] = "";
    std::size_t length_ = 0;
    unsigned items_ = 0;
};

// True ends the list of names.
bool add_alternative_name(reason_text &reason, const GENERAL_NAME *name)
{
    if (name->type == GEN_DNS)
        return !reason.add_item(text_of(name->d.dNSName));
    char text[INET6_ADDRSTRLEN];
    if (name->type != GEN_IPADD)
        return false;
    const std::string_view bytes = text_of(name->d.iPAddress);
    const int family = bytes.size() == sizeof(in_addr) ? AF_INET : AF_INET6;
    if (bytes.size() != sizeof(in_addr) && bytes.size() != sizeof(in6_addr))
        return false;
    return !reason.add_item(inet_ntop(family, bytes.data(), text, sizeof text));
}

int fail_host(soap *ctx, const X509 *certificate, const char *host)
{
    constexpr std::string_view MISMATCH = "SSL/TLS certificate host name mismatch in tcp_connect(): ";
    reason_text reason;
    reason.add(MISMATCH);
    reason.add(std::string_view(host).substr(0, 128));
    reason.add(" was asked for, the certificate is for ");
    any_alternative_name(certificate,
                         [&](const GENERAL_NAME *name) { return add_alternative_name(reason, name); });
    if (!reason.has_items())
        any_common_name(certificate, [&](const ASN1_STRING *name) {
            return in_utf8(name, [&](std::string_view text) { return !reason.add_item(text); });
        });
    if (!reason.has_items())
        reason.add("no host");
    call_note_refusal(ctx, reason.text() + MISMATCH.size());
    const char *detail = soap_string_dup(ctx, reason.text());
    return fail_as_sender(ctx, "SSL/TLS error",
                          detail != nullptr ? detail
                                            : "SSL/TLS certificate host name mismatch in tcp_connect()",
                          SOAP_TLS_ERROR);
}

// Where an SSL keeps the address of its tls_verdict.
int verdict_index()
{
    static const int index = SSL_get_ex_new_index(0, nullptr, nullptr, nullptr, nullptr);
    return index;
}

void note_verdict(tls_verdict *verdict, X509_STORE_CTX *store)
{
    verdict->error = X509_STORE_CTX_get_error(store);
    verdict->depth = X509_STORE_CTX_get_error_depth(store);
    verdict->subject[0] = '\0';
    if (const X509 *const certificate = X509_STORE_CTX_get_current_cert(store))
        tls_write_name(X509_get_subject_name(certificate), verdict->subject, sizeof verdict->subject);
    call_note_certificate(verdict->ctx, X509_STORE_CTX_get0_cert(store));
}

// The callback that the set-up or the host has given decides; this one listens.
int listen_to_verdict(int result, X509_STORE_CTX *store)
{
    auto *const ssl =
        static_cast<SSL *>(X509_STORE_CTX_get_ex_data(store, SSL_get_ex_data_X509_STORE_CTX_idx()));
    const SSL_verify_cb decide = SSL_CTX_get_verify_callback(SSL_get_SSL_CTX(ssl));
    if (decide != nullptr)
        result = decide(result, store);
    auto *const verdict = static_cast<tls_verdict *>(SSL_get_ex_data(ssl, verdict_index()));
    if (result == 0 && verdict != nullptr && SSL_get_verify_mode(ssl) != SSL_VERIFY_NONE)
        note_verdict(verdict, store);
    return result;
}

} // namespace

void tls_write_name(const X509_NAME *name, char *text, std::size_t size)
{
    const std::unique_ptr<BIO, bio_delete> out(BIO_new(BIO_s_mem()));
    if (out)
        X509_NAME_print_ex(out.get(), name, 0, XN_FLAG_RFC2253);
    const int length = out ? BIO_read(out.get(), text, static_cast<int>(size - 1)) : 0;
    text[length > 0 ? length : 0] = '\0';
    std::replace_if(
        text, text + std::strlen(text), [](char c) { return !is_harmless(c); }, '?');
}

void tls_watch_verdict(soap *ctx, tls_verdict *verdict)
{
    SSL *const ssl = ctx->tls_connection;
    if (verdict != nullptr)
        verdict->ctx = ctx;
    SSL_set_ex_data(ssl, verdict_index(), verdict);
    SSL_set_verify(ssl, SSL_get_verify_mode(ssl), listen_to_verdict);
}

const char *tls_with_reason(soap *ctx, const char *text, const tls_verdict &verdict)
{
    if (verdict.error == 0)
        return text;
    reason_text reason;
    for (const char *part : {text, ": ", X509_verify_cert_error_string(verdict.error)})
        reason.add(part);
    if (verdict.subject[0] != '\0') {
        const std::string depth = std::to_string(verdict.depth);
        for (const char *part : {" (at depth ", depth.c_str(), ": ", verdict.subject, ")"})
            reason.add(part);
    }
    call_note_refusal(ctx, reason.text() + std::strlen(text) + 2);
    const char *detail = soap_string_dup(ctx, reason.text());
    return detail != nullptr ? detail : text;
}

std::size_t tls_address_of(const char *host, unsigned char (&address)[16])
{
    const std::size_t length = std::strcspn(host, "%");
    char text[INET6_ADDRSTRLEN];
    if (length >= sizeof text)
        return 0;
    std::memcpy(text, host, length);
    text[length] = '\0';
    if (inet_pton(AF_INET6, text, address) == 1)
        return sizeof(in6_addr);
    return inet_pton(AF_INET, host, address) == 1 ? sizeof(in_addr) : 0;
}

int tls_check_peer(soap *ctx, const char *host)
{
    const long verdict = SSL_get_verify_result(ctx->tls_connection);
    if (verdict != X509_V_OK)
        return fail_as_sender(
            ctx, X509_verify_cert_error_string(verdict),
            tls_with_reason(ctx, "SSL/TLS certificate presented by peer cannot be verified in tcp_connect()",
                            {ctx, static_cast<int>(verdict)}),
            SOAP_TLS_ERROR);
    if ((ctx->tls_flags & TLS_SKIP_HOST_CHECK) != 0)
        return SOAP_OK;
    const std::unique_ptr<X509, certificate_delete> certificate(
        SSL_get1_peer_certificate(ctx->tls_connection));
    if (!certificate) {
        call_note_refusal(ctx, "none was presented");
        return fail_as_sender(ctx, "SSL/TLS error",
                              "No SSL/TLS certificate was presented by the peer in tcp_connect()",
                              SOAP_TLS_ERROR);
    }
    return names_host(ctx, certificate.get(), host) ? 0 : fail_host(ctx, certificate.get(), host);
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
    if (host == nullptr)
        return false;
    for (; *host; ++host)
        if ((*host >= 'A' && *host <= 'Z') || (*host >= 'a' && *host <= 'z'))
            return false;
    return true;
}
