// tls_identity_test.cpp - which certificates are accepted: a table of certificates by flags, under TLS 1.2
// and 1.3. The outcome of a connection is one letter.
#include <regex>

#include "net/tls_connection.h"
#include "support/socket_calls.h"
#include "support/tls_peer.h"

namespace {

using namespace tls_peers;

class tls_identity : public tls_test {};

constexpr const char *MISMATCH = "SSL/TLS certificate host name mismatch in tcp_connect(): ";
constexpr const char *REFUSED = "SSL_connect error in tcp_connect(): ";
constexpr const char *NO_CERTIFICATE = "No SSL/TLS certificate was presented by the peer in tcp_connect()";

// The columns: flags of the set-up in addition to TLS_NO_DEFAULT_CA, and older behaviour.
constexpr struct {
    unsigned flags;
    std::uint32_t legacy = 0;
} COLUMNS[] = {
    {0},
    {TLS_VERIFY_PEER},
    {TLS_VERIFY_PEER | TLS_SKIP_HOST_CHECK},
    {TLS_VERIFY_PEER | TLS_ALLOW_EXPIRED},
    {TLS_VERIFY_PEER | TLS_STRICT_HOST_CHECK},
    {TLS_VERIFY_PEER | TLS_STRICT_HOST_CHECK | TLS_SKIP_HOST_CHECK},
    {TLS_VERIFY_PEER | TLS_STRICT_HOST_CHECK | TLS_ALLOW_EXPIRED},
    {TLS_VERIFY_PEER | TLS_NO_TLSV1 | TLS_NO_SSLV3},
    {TLS_VERIFY_PEER | TLS_REQUIRE_CLIENT_CERT | TLS_RSA_EPHEMERAL}, // with those of a server
    {TLS_REQUIRE_CLIENT_CERT},                                       // those of a server alone
    {TLS_VERIFY_PEER, LEGACY_HOST_CHECK},
    {TLS_VERIFY_PEER | TLS_STRICT_HOST_CHECK, LEGACY_HOST_CHECK},
};

enum class kind { issued, self_signed, revoked, none };

struct row {
    const char *rule;
    subject server;
    const char *host;
    const char *outcomes;    // a letter for each column; see letter_of
    const char *reason = ""; // of a refusal
    kind made = kind::issued;
};

constexpr long PAST = -DAY;

const row ROWS[] = {
    {"common name", {"peer.test", ""}, "peer.test", "............"},
    {"its case", {"PEER.Test", ""}, "peer.test", "............"},
    {"wrong name", {"other.test", ""}, "peer.test", ".M.MM.MMM.MM"},
    {"alternative name", {"other.test", "DNS:peer.test"}, "peer.test", "............"},
    {"second alternative name", {"", "DNS:other.test,DNS:peer.test"}, "peer.test", "............"},
    {"case of alternative name", {"other.test", "DNS:Peer.test"}, "peer.test", "..........M."},
    {"common with alternative", {"peer.test", "DNS:other.test"}, "peer.test", ".M.MM.MMM..M"},
    {"neither", {"", "DNS:other.test,DNS:*.net.test"}, "peer.test", ".M.MM.MMM.MM"},
    {"no name of a host", {"", "URI:peer.test,email:peer.test,IP:127.0.0.1"}, "peer.test", ".M.MM.MMM.MM"},
    {"common with no name of a host", {"peer.test", "URI:other.test"}, "peer.test", "............"},
    {"wildcard", {"*.net.test", ""}, "a.net.test", "............"},
    {"wildcard, two labels", {"*.net.test", ""}, "a.b.net.test", ".M.MM.MMM.MM"},
    {"wildcard, no label", {"*.net.test", ""}, "net.test", ".M.MM.MMM.MM"},
    {"wildcard of a top label", {"*.test", ""}, "peer.test", "....M.M....M"},
    {"wildcard for all", {"*", ""}, "peer.test", ".M.MM.MMM.MM"},
    {"part of a label", {"node*.net.test", ""}, "node12.net.test", ".M.MM.MMM..M"},
    {"star within", {"pe*r.test", ""}, "peer.test", ".M.MM.MMM..M"},
    {"dash for any letter", {"p-er.test", ""}, "peer.test", ".M.MM.MMM..M"},
    {"wildcard alternative", {"other.test", "DNS:*.net.test"}, "a.net.test", "..........M."},
    {"wildcard alt., two labels", {"", "DNS:*.net.test"}, "a.b.net.test", ".M.MM.MMM.MM"},
    {"goes on after a NUL", {std::string("peer.test\0.evil.test", 20), ""}, "peer.test", ".M.MM.MMM.MM"},
    {"address, any common name", {"wrong.example", ""}, "127.0.0.1", ".M.MM.MMM..M"},
    {"address, no common name", {"", "DNS:wrong.example"}, "127.0.0.1", ".M.MM.MMM.MM"},
    {"address listed", {"wrong.example", "IP:127.0.0.1"}, "127.0.0.1", "............"},
    {"address listed alone", {"", "IP:127.0.0.1"}, "127.0.0.1", "..........M."},
    {"another address listed", {"127.0.0.1", "IP:127.0.0.2,IP:2001:db8::1"}, "127.0.0.1", ".M.MM.MMM..M"},
    {"address in the common name", {"127.0.0.1", ""}, "127.0.0.1", "....M.M....M"},
    {"address as a name", {"", "DNS:127.0.0.1"}, "127.0.0.1", ".M.MM.MMM..M"},
    {"wildcard for an address", {"*.0.0.1", ""}, "127.0.0.1", ".M.MM.MMM..M"},
    {"expired", {"peer.test", "", 2 * PAST, PAST}, "peer.test", ".RR.RR.RRRRR", "certificate has expired"},
    {"expired, wrong name", {"other.test", "", 2 * PAST, PAST}, "peer.test", ".RRMRRMRRRRR"},
    {"not yet valid", {"x", "", DAY, 2 * DAY}, "peer.test", ".RRRRRRRRRRR", "certificate is not yet valid"},
    {"self-signed", {"x", ""}, "peer.test", ".RRRRRRRRRRR", "self-signed certificate", kind::self_signed},
    {"revoked", {"x", ""}, "peer.test", ".RRRRRRRRRRR", "certificate revoked", kind::revoked},
    {"revoked, expired", {"x", "", 2 * PAST, PAST}, "peer.test", ".RRRRRRRRRRR", "", kind::revoked},
    {"no certificate", {}, "peer.test", ".N.NN.NNN.NN", "", kind::none},
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

std::string detail_of(const row &r, char outcome)
{
    if (outcome == 'R')
        return std::string(REFUSED) + r.reason;
    std::string names = r.server.names.empty() ? r.server.common_name : r.server.names;
    names = std::regex_replace(names, std::regex("(URI|email):[^,]*,?|(DNS|IP):"), "");
    names = std::regex_replace(names, std::regex(","), ", ");
    std::replace(names.begin(), names.end(), '\0', '?');
    return std::string(MISMATCH) + r.host + " was asked for, the certificate is for " + names;
}

char letter_of(context &ctx, int socket, const row &r)
{
    if (socket >= 0)
        return exchange(ctx, "hello") == "hello" && tls_active(ctx.get()) ? '.' : '?';
    EXPECT_EQ(ctx->socket, -1);
    EXPECT_EQ(ctx->error, SOAP_TLS_ERROR);
    EXPECT_FALSE(tls_active(ctx.get()));
    const std::string detail = ctx.fault_detail();
    if (detail == NO_CERTIFICATE)
        return 'N';
    const char letter = detail.starts_with(MISMATCH) ? 'M' : 'R';
    EXPECT_TRUE(detail.starts_with(detail_of(r, letter))) << r.rule << ": " << detail;
    if (letter == 'R') {
        EXPECT_TRUE(ctx.fault_text().starts_with("SSL_ERROR_SSL\n")) << ctx.fault_text();
        EXPECT_TRUE(detail.ends_with(" (at depth 0: CN=" + r.server.common_name + ",O=Test)")) << detail;
    }
    return letter;
}

// What a client finds under the flags; it says so on standard error when it takes an expired certificate.
char connect_under(unsigned flags, std::uint32_t legacy, const row &r, int port, const char *revocations)
{
    context ctx;
    ctx->tls_crl = revocations;
    ctx->connect_timeout = 10;
    ctx->legacy = legacy;
    EXPECT_EQ(set_up_client(ctx, flags | TLS_NO_DEFAULT_CA), 0);
    if (r.made == kind::none)
        SSL_CTX_set_cipher_list(ctx->tls_context, ANONYMOUS);
    testing::internal::CaptureStderr();
    const char letter = letter_of(ctx, open_to(ctx, port, r.host), r);
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
    for (const auto &column : COLUMNS)
        found += connect_under(column.flags, column.legacy, r, server.port(), revocations.c_str());
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

TEST_F(tls_identity, the_reason_of_a_refusal_is_short_and_harmless_text)
{
    const std::string label(60, 'x'), evil = "<a>&\r\n\x01\xC3\xA4'\"";
    const std::string names = "DNS:" + label + repeat_text(",DNS:" + label, 100);
    for (const subject &who : {subject{evil, ""}, subject{evil, names}, subject{evil, "", -2 * DAY, -DAY}}) {
        tls_peer server(server_for(who), echo);
        context ctx;
        ASSERT_EQ(set_up_client(ctx), 0);
        EXPECT_EQ(open_to(ctx, server.port()), -1);
        const std::string detail = ctx.fault_detail();
        EXPECT_LT(detail.size(), 512U);
        EXPECT_EQ(detail.find_first_of("<>&"), detail.npos) << detail;
        EXPECT_TRUE(std::all_of(detail.begin(), detail.end(), [](char c) { return c >= ' ' && c <= '~'; }))
            << detail;
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
