// tls_identity_test.cpp - which certificates are accepted: a table of certificates by flags, under TLS 1.2
// and 1.3. The outcome of a connection is one letter.
#include <string>

#include <gtest/gtest.h>
#include <openssl/ssl.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_tls.h>

#include "support/socket_calls.h"
#include "support/tls_peer.h"
#include "transport/tls_connection.h"

namespace {

using namespace tls_peers;

class tls_identity : public tls_test {};

constexpr const char *MISMATCH = "SSL/TLS certificate host name mismatch in tcp_connect()";
constexpr const char *REFUSED = "SSL_connect error in tcp_connect()";
constexpr const char *NO_CERTIFICATE = "No SSL/TLS certificate was presented by the peer in tcp_connect()";

// The columns: flags of the set-up, besides TLS_NO_DEFAULT_CA.
constexpr unsigned COLUMNS[] = {
    0,
    TLS_VERIFY_PEER,
    TLS_VERIFY_PEER | TLS_SKIP_HOST_CHECK,
    TLS_VERIFY_PEER | TLS_ALLOW_EXPIRED,
    TLS_VERIFY_PEER | TLS_STRICT_HOST_CHECK,
    TLS_VERIFY_PEER | TLS_STRICT_HOST_CHECK | TLS_SKIP_HOST_CHECK,
    TLS_VERIFY_PEER | TLS_STRICT_HOST_CHECK | TLS_ALLOW_EXPIRED,
    TLS_VERIFY_PEER | TLS_NO_TLSV1 | TLS_NO_SSLV3,
    TLS_VERIFY_PEER | TLS_REQUIRE_CLIENT_CERT | TLS_RSA_EPHEMERAL, // those of a server besides
    TLS_REQUIRE_CLIENT_CERT,                                       // those of a server alone
};

enum class kind { issued, self_signed, revoked, none };

struct row {
    const char *rule;
    subject server;
    const char *host;
    const char *outcomes; // a letter for each column; see letter_of
    kind made = kind::issued;
};

constexpr long EXPIRED = -DAY;

const row ROWS[] = {
    {"common name", {"peer.test", ""}, "peer.test", ".........."},
    {"its case", {"PEER.Test", ""}, "peer.test", ".........."},
    {"wrong name", {"other.test", ""}, "peer.test", ".M.MM.MMM."},
    {"alternative name", {"other.test", "DNS:peer.test"}, "peer.test", ".........."},
    {"second alternative name", {"", "DNS:other.test,DNS:peer.test"}, "peer.test", ".........."},
    {"case of alternative name", {"other.test", "DNS:Peer.test"}, "peer.test", ".M.M...MM."},
    {"common beside alternative", {"peer.test", "DNS:other.test"}, "peer.test", "....M.M..."},
    {"neither", {"", "DNS:other.test"}, "peer.test", ".M.MM.MMM."},
    {"wildcard", {"*.net.test", ""}, "a.net.test", ".........."},
    {"wildcard, two labels", {"*.net.test", ""}, "a.b.net.test", ".M.MM.MMM."},
    {"wildcard, no label", {"*.net.test", ""}, "net.test", ".M.MM.MMM."},
    {"pattern", {"node*.net.test", ""}, "node12.net.test", ".........."},
    {"wildcard alternative", {"other.test", "DNS:*.net.test"}, "a.net.test", ".M.M...MM."},
    {"wildcard alt., two labels", {"", "DNS:*.net.test"}, "a.b.net.test", ".M.MM.MMM."},
    {"goes on behind a NUL", {std::string("peer.test\0.evil.test", 20), ""}, "peer.test", ".M.MM.MMM."},
    {"address, any common name", {"wrong.example", ""}, "127.0.0.1", "....M.M..."},
    {"address, no common name", {"", "DNS:wrong.example"}, "127.0.0.1", ".M.MM.MMM."},
    {"address listed", {"wrong.example", "IP:127.0.0.1"}, "127.0.0.1", ".........."},
    {"address listed alone", {"", "IP:127.0.0.1"}, "127.0.0.1", ".M.M...MM."},
    {"another address listed", {"127.0.0.1", "IP:127.0.0.2"}, "127.0.0.1", "....M.M..."},
    {"expired", {"peer.test", "", 2 * EXPIRED, EXPIRED}, "peer.test", ".RR.RR.RRR"},
    {"expired, wrong name", {"other.test", "", 2 * EXPIRED, EXPIRED}, "peer.test", ".RRMRRMRRR"},
    {"not yet valid", {"peer.test", "", DAY, 2 * DAY}, "peer.test", ".RRRRRRRRR"},
    {"self-signed", {"peer.test", ""}, "peer.test", ".RRRRRRRRR", kind::self_signed},
    {"revoked", {"peer.test", ""}, "peer.test", ".RRRRRRRRR", kind::revoked},
    {"revoked, expired", {"peer.test", "", 2 * EXPIRED, EXPIRED}, "peer.test", ".RRRRRRRRR", kind::revoked},
    {"no certificate", {}, "peer.test", ".N.NN.NNN.", kind::none},
};

// Without certificates only the anonymous suites are left, which TLS 1.3 doesn't have.
constexpr const char *ANONYMOUS = "aNULL:@SECLEVEL=0";

server_context anonymous_context()
{
    server_context made(SSL_CTX_new(TLS_server_method()));
    SSL_CTX_set_max_proto_version(made.get(), TLS1_2_VERSION);
    SSL_CTX_set_cipher_list(made.get(), ANONYMOUS);
    SSL_CTX_set_dh_auto(made.get(), 1);
    return made;
}

char letter_of(context &ctx, int socket)
{
    if (socket >= 0)
        return exchange(ctx, "hello") == "hello" && tls_active(ctx.get()) ? '.' : '?';
    EXPECT_EQ(ctx->socket, -1);
    EXPECT_EQ(ctx->error, SOAP_TLS_ERROR);
    const std::string detail = ctx.fault_detail();
    return detail == MISMATCH ? 'M' : detail == REFUSED ? 'R' : detail == NO_CERTIFICATE ? 'N' : '?';
}

// What a client finds under the flags; it says so on standard error when it takes an expired certificate.
char connect_under(unsigned flags, const row &r, int port, const char *revocations)
{
    context ctx;
    ctx->tls_crl = revocations;
    ctx->connect_timeout = 10;
    EXPECT_EQ(set_up_client(ctx, flags | TLS_NO_DEFAULT_CA), 0);
    if (r.made == kind::none)
        SSL_CTX_set_cipher_list(ctx->tls_context, ANONYMOUS);
    testing::internal::CaptureStderr();
    const char letter = letter_of(ctx, open_to(ctx, port, r.host));
    const bool said = testing::internal::GetCapturedStderr() == "ignoring certificate expiration\n";
    const bool forgives = r.made != kind::revoked && (flags & TLS_ALLOW_EXPIRED) != 0;
    EXPECT_EQ(said, r.server.not_after < 0 && forgives) << r.rule;
    EXPECT_EQ(tcp_disconnect(ctx.get()), 0);
    return letter;
}

std::string outcomes_of(const row &r, int version)
{
    const certificates::certificate shown =
        r.made == kind::self_signed ? certificates::make(r.server, server_key(), nullptr, server_key(), 7)
                                    : ca().issue(r.server, server_key());
    const certificates::certificate another = ca().issue({"another.test", ""}, server_key());
    const std::string revocations =
        ca().write_revocations("list.pem", r.made == kind::revoked ? shown.get() : another.get());
    tls_peer server(r.made == kind::none ? anonymous_context() : make_server_context(shown.get(), version),
                    echo, std::size(COLUMNS));
    std::string found;
    for (const unsigned flags : COLUMNS)
        found += connect_under(flags, r, server.port(), revocations.c_str());
    return found;
}

TEST_F(tls_identity, is_decided_by_certificate_and_flags)
{
    for (const int version : {TLS1_2_VERSION, TLS1_3_VERSION})
        for (const row &r : ROWS)
            if (r.made != kind::none || version == TLS1_2_VERSION) {
                EXPECT_EQ(outcomes_of(r, version), r.outcomes) << r.rule << ", version " << version;
            }
}

TEST_F(tls_identity, a_host_without_letters_is_an_address)
{
    for (const char *address : {"10.0.0.1", "::1", "123", "_-.", ""})
        EXPECT_TRUE(IsIPAddr(address)) << address;
    for (const char *name : {"a", "Z", "fe80::1", "2001:db8::1"})
        EXPECT_FALSE(IsIPAddr(name)) << name;
    EXPECT_FALSE(IsIPAddr(nullptr));
}

} // namespace
