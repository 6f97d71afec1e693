// tls_test.cpp - TLS of a context against OpenSSL servers on the loopback, and against its own server side.
#include <atomic>
#include <cerrno>
#include <condition_variable>
#include <future>
#include <mutex>
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <openssl/ssl.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_tls.h>

#include "support/certificates.h"
#include "support/loopback.h"
#include "support/socket_calls.h"
#include "transport/tcp_socket.h"
#include "transport/tls_connection.h"

namespace {

using certificates::authority;
using certificates::DAY;
using certificates::subject;
using loopback::context;
using loopback::peer;

constexpr std::uint16_t VERIFIED = TLS_VERIFY_PEER | TLS_NO_DEFAULT_CA;

authority &ca()
{
    static authority made;
    return made;
}

EVP_PKEY *server_key()
{
    static const certificates::key made = certificates::make_key();
    return made.get();
}

using server_context = std::unique_ptr<SSL_CTX, certificates::freed_by<SSL_CTX_free>>;
using server_connection = std::unique_ptr<SSL, certificates::freed_by<SSL_free>>;

server_context make_server_context(X509 *certificate, int version = 0)
{
    server_context made(SSL_CTX_new(TLS_server_method()));
    SSL_CTX_use_certificate(made.get(), certificate);
    SSL_CTX_use_PrivateKey(made.get(), server_key());
    SSL_CTX_set_session_id_context(made.get(), reinterpret_cast<const unsigned char *>("test"), 4);
    SSL_CTX_set_options(made.get(), SSL_OP_IGNORE_UNEXPECTED_EOF);
    if (version != 0) {
        SSL_CTX_set_min_proto_version(made.get(), version);
        SSL_CTX_set_max_proto_version(made.get(), version);
    }
    return made;
}

// A TLS server. Each client that comes through the handshake is served; the others are dropped.
class tls_peer {
public:
    using service = std::function<void(SSL *)>;

    tls_peer(server_context made, service serve, int clients = 1)
        : context_(std::move(made)),
          peer_([this, serve = std::move(serve)](int client) { shake_hands(client, serve); }, clients)
    {}
    int port() const { return peer_.port(); }
    SSL_CTX *context() { return context_.get(); }

private:
    void shake_hands(int client, const service &serve)
    {
        const server_connection connection(SSL_new(context_.get()));
        SSL_set_fd(connection.get(), client);
        if (SSL_accept(connection.get()) == 1)
            serve(connection.get());
    }
    server_context context_;
    peer peer_;
};

// Gives each byte back until the client ends, then ends as well.
void echo(SSL *connection)
{
    char byte;
    while (SSL_read(connection, &byte, 1) == 1)
        SSL_write(connection, &byte, 1);
    SSL_shutdown(connection);
}

class tls : public loopback::descriptor_test {
protected:
    static void SetUpTestSuite()
    {
        signal(SIGPIPE, SIG_IGN); // for the servers of the tests; the library's own test takes it back
        ca();
        context(); // OpenSSL opens descriptors of its own at its first use
        tls_random_word();
    }
};

int set_up_client(context &ctx, unsigned flags = VERIFIED)
{
    static const std::string ca_file = ca().ca_file();
    return soap_ssl_client_context(ctx.get(), static_cast<std::uint16_t>(flags), nullptr, nullptr,
                                   ca_file.c_str(), nullptr, nullptr);
}

int open_to(context &ctx, int port, const char *host = "peer.test")
{
    return tcp_connect(ctx.get(), "https://peer/", host, port);
}

std::string exchange(context &ctx, const std::string &text)
{
    std::string answer;
    char buffer[64];
    if (tcp_send(ctx.get(), text.data(), text.size()) != 0)
        return "(not sent)";
    while (answer.size() < text.size()) {
        const std::size_t count = tcp_recv(ctx.get(), buffer, sizeof buffer);
        if (count == 0)
            break;
        answer.append(buffer, count);
    }
    return answer;
}

server_context server_for(const subject &who, int version = 0)
{
    return make_server_context(ca().issue(who, server_key()).get(), version);
}

// --- who the peer is ---

constexpr const char *MISMATCH = "SSL/TLS certificate host name mismatch in tcp_connect()";
constexpr const char *REFUSED = "SSL_connect error in tcp_connect()";

struct identity_case {
    const char *rule;
    subject server;
    bool self_signed;
    const char *host;
    unsigned flags;      // beside VERIFIED
    const char *failure; // detail of the fault; null: connects
};

class tls_identity : public tls, public testing::WithParamInterface<identity_case> {};

TEST_P(tls_identity, decides_whether_a_certificate_is_accepted)
{
    const identity_case &c = GetParam();
    for (const int version : {TLS1_2_VERSION, TLS1_3_VERSION}) {
        const certificates::certificate shown =
            c.self_signed ? certificates::make(c.server, server_key(), nullptr, server_key(), 7)
                          : ca().issue(c.server, server_key());
        tls_peer server(make_server_context(shown.get(), version), echo);
        context ctx;
        ASSERT_EQ(set_up_client(ctx, VERIFIED | c.flags), 0);
        testing::internal::CaptureStderr();
        const int socket = open_to(ctx, server.port(), c.host);
        const std::string printed = testing::internal::GetCapturedStderr();
        if (!c.failure) {
            EXPECT_GE(socket, 0) << ctx.fault_text() << ": " << ctx.fault_detail();
            EXPECT_EQ(ctx->input_mode & ctx->output_mode & MODE_TLS, MODE_TLS);
            EXPECT_EQ(exchange(ctx, "hello"), "hello");
            const bool expired = c.server.not_after < 0;
            EXPECT_EQ(printed, expired ? "ignoring certificate expiration\n" : "");
        } else {
            EXPECT_EQ(socket, -1);
            EXPECT_EQ(ctx->socket, -1);
            EXPECT_EQ(ctx->error, SOAP_TLS_ERROR);
            EXPECT_EQ(ctx.fault_detail(), c.failure);
        }
        EXPECT_EQ(tcp_disconnect(ctx.get()), 0);
    }
}

const subject BY_NAME{"peer.test", ""};
const subject EXPIRED{"peer.test", "", -2 * DAY, -DAY};

const identity_case IDENTITY_CASES[] = {
    {"common_name", BY_NAME, false, "peer.test", 0, nullptr},
    {"case_of_common_name", {"PEER.Test", ""}, false, "peer.test", 0, nullptr},
    {"wrong_name", {"other.test", ""}, false, "peer.test", 0, MISMATCH},
    {"wrong_name_skipped", {"other.test", ""}, false, "peer.test", TLS_SKIP_HOST_CHECK, nullptr},
    {"wrong_name_skipped_though_strict",
     {"other.test", ""},
     false,
     "peer.test",
     TLS_SKIP_HOST_CHECK | TLS_STRICT_HOST_CHECK,
     nullptr},
    {"wrong_name_strict", {"other.test", ""}, false, "peer.test", TLS_STRICT_HOST_CHECK, MISMATCH},
    {"alternative_name", {"other.test", "DNS:peer.test"}, false, "peer.test", 0, nullptr},
    {"second_alternative_name", {"", "DNS:other.test,DNS:peer.test"}, false, "peer.test", 0, nullptr},
    {"case_of_alternative_name", {"other.test", "DNS:Peer.test"}, false, "peer.test", 0, MISMATCH},
    {"case_of_alternative_name_strict",
     {"other.test", "DNS:Peer.test"},
     false,
     "peer.test",
     TLS_STRICT_HOST_CHECK,
     nullptr},
    {"common_name_beside_alternative_name", {"peer.test", "DNS:other.test"}, false, "peer.test", 0, nullptr},
    {"common_name_beside_alternative_name_strict",
     {"peer.test", "DNS:other.test"},
     false,
     "peer.test",
     TLS_STRICT_HOST_CHECK,
     MISMATCH},
    {"wildcard_common_name", {"*.net.test", ""}, false, "a.net.test", 0, nullptr},
    {"wildcard_two_labels", {"*.net.test", ""}, false, "a.b.net.test", 0, MISMATCH},
    {"wildcard_no_label", {"*.net.test", ""}, false, "net.test", 0, MISMATCH},
    {"pattern_common_name", {"node*.net.test", ""}, false, "node12.net.test", 0, nullptr},
    {"wildcard_alternative_name", {"other.test", "DNS:*.net.test"}, false, "a.net.test", 0, MISMATCH},
    {"wildcard_alternative_name_strict",
     {"other.test", "DNS:*.net.test"},
     false,
     "a.net.test",
     TLS_STRICT_HOST_CHECK,
     nullptr},
    {"wildcard_two_labels_strict",
     {"*.net.test", ""},
     false,
     "a.b.net.test",
     TLS_STRICT_HOST_CHECK,
     MISMATCH},
    {"no_common_name", {"", "DNS:other.test"}, false, "peer.test", 0, MISMATCH},
    {"address_with_any_common_name", {"wrong.example", ""}, false, "127.0.0.1", 0, nullptr},
    {"address_without_common_name", {"", "DNS:wrong.example"}, false, "127.0.0.1", 0, MISMATCH},
    {"address_strict", {"wrong.example", ""}, false, "127.0.0.1", TLS_STRICT_HOST_CHECK, MISMATCH},
    {"address_listed_strict",
     {"wrong.example", "IP:127.0.0.1"},
     false,
     "127.0.0.1",
     TLS_STRICT_HOST_CHECK,
     nullptr},
    {"other_address_listed_strict",
     {"127.0.0.1", "IP:127.0.0.2"},
     false,
     "127.0.0.1",
     TLS_STRICT_HOST_CHECK,
     MISMATCH},
    {"expired", EXPIRED, false, "peer.test", 0, REFUSED},
    {"expired_skip_host", EXPIRED, false, "peer.test", TLS_SKIP_HOST_CHECK, REFUSED},
    {"expired_allowed", EXPIRED, false, "peer.test", TLS_ALLOW_EXPIRED, nullptr},
    {"expired_allowed_strict", EXPIRED, false, "peer.test", TLS_ALLOW_EXPIRED | TLS_STRICT_HOST_CHECK,
     nullptr},
    {"expired_allowed_wrong_name", EXPIRED, false, "other.test", TLS_ALLOW_EXPIRED, MISMATCH},
    {"not_yet_valid", {"peer.test", "", DAY, 2 * DAY}, false, "peer.test", TLS_ALLOW_EXPIRED, REFUSED},
    {"self_signed", BY_NAME, true, "peer.test", 0, REFUSED},
    {"self_signed_skip_host", BY_NAME, true, "peer.test", TLS_SKIP_HOST_CHECK, REFUSED},
    {"self_signed_allow_expired", BY_NAME, true, "peer.test", TLS_ALLOW_EXPIRED, REFUSED},
};

INSTANTIATE_TEST_SUITE_P(certificates, tls_identity, testing::ValuesIn(IDENTITY_CASES),
                         [](const auto &row) { return std::string(row.param.rule); });

TEST_F(tls, without_verification_any_certificate_serves)
{
    const certificates::certificate shown =
        certificates::make(EXPIRED, server_key(), nullptr, server_key(), 7);
    tls_peer server(make_server_context(shown.get()), echo);
    context ctx;
    ASSERT_EQ(set_up_client(ctx, TLS_NO_DEFAULT_CA), 0);
    ASSERT_GE(open_to(ctx, server.port(), "another.test"), 0);
    EXPECT_EQ(exchange(ctx, "hello"), "hello");
}

TEST_F(tls, a_peer_without_a_certificate_is_refused)
{
    server_context anonymous(SSL_CTX_new(TLS_server_method()));
    SSL_CTX_set_max_proto_version(anonymous.get(), TLS1_2_VERSION);
    SSL_CTX_set_cipher_list(anonymous.get(), "aNULL:@SECLEVEL=0");
    SSL_CTX_set_dh_auto(anonymous.get(), 1);
    tls_peer server(std::move(anonymous), echo);
    context ctx;
    ASSERT_EQ(set_up_client(ctx), 0);
    SSL_CTX_set_cipher_list(ctx->tls_context, "aNULL:@SECLEVEL=0");
    EXPECT_EQ(open_to(ctx, server.port()), -1);
    EXPECT_EQ(ctx->error, SOAP_TLS_ERROR);
    EXPECT_EQ(ctx.fault_detail(), "No SSL/TLS certificate was presented by the peer in tcp_connect()");
}

TEST_F(tls, a_name_that_goes_on_behind_a_nul_is_not_the_name_it_shows)
{
    const subject shortened{std::string("peer.test\0.evil.test", 20), ""};
    tls_peer server(server_for(shortened), echo);
    context ctx;
    ASSERT_EQ(set_up_client(ctx), 0);
    EXPECT_EQ(open_to(ctx, server.port()), -1);
    EXPECT_EQ(ctx.fault_detail(), MISMATCH);
}

TEST_F(tls, revoked_certificates_are_refused)
{
    const certificates::certificate shown = ca().issue(BY_NAME, server_key());
    const std::string none = ca().write_revocations("none.pem", nullptr);
    const std::string one = ca().write_revocations("one.pem", shown.get());
    tls_peer server(make_server_context(shown.get()), echo, 2);
    for (const std::string &list : {none, one}) {
        context ctx;
        ctx->tls_crl = list.c_str();
        ASSERT_EQ(set_up_client(ctx), 0);
        EXPECT_EQ(open_to(ctx, server.port()) >= 0, list == none) << ctx.fault_text();
    }
}

TEST_F(tls, a_host_without_letters_is_an_address)
{
    for (const char *address : {"10.0.0.1", "::1", "123", "_-.", ""})
        EXPECT_TRUE(IsIPAddr(address)) << address;
    for (const char *name : {"a", "Z", "fe80::1", "2001:db8::1"})
        EXPECT_FALSE(IsIPAddr(name)) << name;
    EXPECT_FALSE(IsIPAddr(nullptr));
}

// --- new rules after a failure ---

TEST_F(tls, a_failed_context_serves_again_under_new_rules)
{
    for (const bool released : {true, false}) {
        tls_peer server(server_for(EXPIRED), echo, 2);
        context ctx;
        ASSERT_EQ(set_up_client(ctx), 0);
        EXPECT_EQ(open_to(ctx, server.port()), -1);
        EXPECT_NE(ctx.fault_text().find("certificate verify failed"), std::string::npos) << ctx.fault_text();
        EXPECT_EQ(ctx.fault_text().substr(0, 14), "SSL_ERROR_SSL\n");
        EXPECT_FALSE(tls_active(ctx.get()));
        if (released) {
            EXPECT_EQ(soap_socket_release(ctx.get()), SOAP_TLS_ERROR);
        }
        ASSERT_EQ(set_up_client(ctx, VERIFIED | TLS_ALLOW_EXPIRED), 0);
        EXPECT_GE(open_to(ctx, server.port()), 0);
        EXPECT_EQ(exchange(ctx, "hello"), "hello");
    }
}

TEST_F(tls, a_plain_connection_after_a_failed_tls_one_is_plain)
{
    peer silent([](int client) { loopback::write_text(client, "no TLS here, sorry"); });
    peer plain([](int client) { loopback::write_text(client, loopback::read_bytes(client, 5)); });
    context ctx;
    ASSERT_EQ(set_up_client(ctx), 0);
    EXPECT_EQ(open_to(ctx, silent.port()), -1);
    EXPECT_EQ(ctx.fault_detail(), REFUSED);
    ASSERT_GE(tcp_connect(ctx.get(), "http://peer/", "peer.test", plain.port()), 0);
    EXPECT_EQ((ctx->input_mode | ctx->output_mode) & MODE_TLS, 0u);
    EXPECT_EQ(exchange(ctx, "plain"), "plain");
}

// --- handshake ---

TEST_F(tls, a_peer_that_ends_in_the_handshake_is_an_error)
{
    peer server([](int client) { loopback::read_bytes(client, 1); });
    context ctx;
    ASSERT_EQ(set_up_client(ctx), 0);
    EXPECT_EQ(open_to(ctx, server.port()), -1);
    EXPECT_EQ(ctx->error, SOAP_TLS_ERROR);
    EXPECT_EQ(ctx.fault_detail(), REFUSED);
    EXPECT_EQ(ctx.fault_text().substr(0, 18), "SSL_ERROR_SYSCALL\n");
}

TEST_F(tls, a_peer_that_is_silent_in_the_handshake_times_out)
{
    loopback::bound_socket silent;
    context ctx;
    ctx->connect_timeout = 1;
    ASSERT_EQ(set_up_client(ctx), 0);
    EXPECT_EQ(open_to(ctx, silent.port()), -1);
    EXPECT_EQ(ctx->error, SOAP_TCP_ERROR);
    EXPECT_EQ(ctx.fault_text(), "Timeout");
    EXPECT_EQ(ctx.fault_detail(), "SSL_connect failed in tcp_connect()");
}

TEST_F(tls, the_first_https_connection_sets_up_by_default)
{
    tls_peer server(server_for(BY_NAME), echo);
    context ctx;
    ctx->connect_timeout = 5;
    EXPECT_EQ(open_to(ctx, server.port()), -1) << "the authority is not among the system's";
    EXPECT_NE(ctx->tls_context, nullptr);
    EXPECT_EQ(ctx->tls_flags, TLS_VERIFY_PEER | TLS_CLIENT_SIDE);
    EXPECT_EQ(ctx->error, SOAP_TLS_ERROR);
}

TEST_F(tls, a_tunnel_through_a_proxy_leads_to_the_host_behind_it)
{
    std::string head;
    const server_context behind = server_for({"far.example", ""});
    peer proxy([&](int client) {
        head = loopback::read_head(client);
        loopback::write_text(client, "HTTP/1.0 200 Connection established\r\nContent-Type: text/x\r\n\r\n");
        const server_connection connection(SSL_new(behind.get()));
        SSL_set_fd(connection.get(), client);
        if (SSL_accept(connection.get()) == 1)
            echo(connection.get());
    });
    context ctx;
    ASSERT_EQ(set_up_client(ctx), 0);
    ctx->proxy_host = "127.0.0.1";
    ctx->proxy_port = proxy.port();
    ctx->port = 443;
    std::snprintf(ctx->host, sizeof ctx->host, "far.example");
    ctx->status = STATUS_POST;
    ctx->keep_alive = 1;
    ctx->action = "urn:action";
    ctx->auth_user = "user";
    ctx->mode = ctx->output_mode = MODE_STORE | MODE_KEEP_ALIVE | MODE_INDENT;
    ctx->message_count = 42;
    ASSERT_GE(tcp_connect(ctx.get(), "https://far.example/service", "far.example", 443), 0)
        << ctx.fault_text();
    EXPECT_TRUE(head.starts_with("CONNECT far.example:443 HTTP/1.1\r\n")) << head;
    EXPECT_EQ(ctx->status, STATUS_POST);
    EXPECT_EQ(ctx->keep_alive, 1);
    EXPECT_STREQ(ctx->action, "urn:action");
    EXPECT_STREQ(ctx->auth_user, "user");
    EXPECT_EQ(ctx->http_content, nullptr);
    EXPECT_EQ(ctx->mode, MODE_STORE | MODE_KEEP_ALIVE | MODE_INDENT);
    EXPECT_EQ(ctx->output_mode, ctx->mode | MODE_TLS);
    EXPECT_EQ(ctx->message_count, 42u);
    EXPECT_STREQ(ctx->endpoint, "https://far.example/service");
    EXPECT_EQ(exchange(ctx, "hello"), "hello");
    ctx->action = ctx->auth_user = nullptr;
}

// --- sessions ---

TEST_F(tls, a_session_is_resumed_by_its_own_host_only)
{
    for (const int version : {TLS1_2_VERSION, TLS1_3_VERSION}) {
        std::vector<int> reused;
        {
            tls_peer server(
                server_for({"*.test", ""}, version),
                [&](SSL *connection) {
                    reused.push_back(SSL_session_reused(connection));
                    echo(connection);
                },
                5);
            context ctx;
            ASSERT_EQ(set_up_client(ctx), 0);
            for (const char *host : {"a.test", "a.test", "b.test", "a.test", "a.test"}) {
                ASSERT_GE(open_to(ctx, server.port(), host), 0) << ctx.fault_text();
                EXPECT_EQ(ctx->tls_session, nullptr) << "used once";
                EXPECT_EQ(exchange(ctx, "x"), "x");
                // The next endpoint may be parsed before this connection is closed.
                std::snprintf(ctx->host, sizeof ctx->host, "next.test");
                EXPECT_EQ(tcp_disconnect(ctx.get()), 0);
                EXPECT_NE(ctx->tls_session, nullptr);
                EXPECT_STREQ(ctx->session_host, host);
                EXPECT_EQ(ctx->session_port, server.port());
                EXPECT_EQ(ctx->tls_connection, nullptr);
            }
        }
        EXPECT_EQ(reused, (std::vector<int>{0, 1, 0, 0, 1})) << version;
    }
}

TEST_F(tls, a_session_accepted_under_former_rules_is_not_resumed)
{
    std::vector<int> reused;
    {
        tls_peer server(
            server_for(EXPIRED),
            [&](SSL *connection) {
                reused.push_back(SSL_session_reused(connection));
                echo(connection);
            },
            2);
        context ctx;
        ASSERT_EQ(set_up_client(ctx, VERIFIED | TLS_ALLOW_EXPIRED), 0);
        ASSERT_GE(open_to(ctx, server.port()), 0);
        EXPECT_EQ(exchange(ctx, "x"), "x");
        EXPECT_EQ(tcp_disconnect(ctx.get()), 0);
        ASSERT_EQ(set_up_client(ctx), 0);
        EXPECT_EQ(open_to(ctx, server.port()), -1);
    }
    EXPECT_EQ(reused, std::vector<int>{0});
}

// --- transfers ---

TEST_F(tls, a_call_on_a_kept_connection_costs_three_system_calls)
{
    for (const int version : {TLS1_2_VERSION, TLS1_3_VERSION}) {
        tls_peer server(server_for(BY_NAME, version), echo);
        context ctx;
        ASSERT_EQ(set_up_client(ctx), 0);
        ASSERT_GE(open_to(ctx, server.port()), 0);
        EXPECT_EQ(exchange(ctx, "a"), "a"); // brings the session tickets too
        socket_calls::counts = {};
        EXPECT_EQ(tcp_peek(ctx.get()), 0);
        EXPECT_EQ(exchange(ctx, "b"), "b");
        EXPECT_EQ(socket_calls::counts.send, 1);
        EXPECT_EQ(socket_calls::counts.recv, 1);
        EXPECT_EQ(socket_calls::counts.all(), 3);
    }
}

TEST_F(tls, a_large_message_arrives_whole_in_both_modes)
{
    const std::string message(1 << 20, 'm');
    for (const int limit : {0, 5}) {
        std::string arrived;
        {
            tls_peer server(server_for(BY_NAME), [&](SSL *connection) {
                std::vector<char> buffer(16384);
                int count;
                while (arrived.size() < message.size() &&
                       (count = SSL_read(connection, buffer.data(), static_cast<int>(buffer.size()))) > 0)
                    arrived.append(buffer.data(), static_cast<std::size_t>(count));
                SSL_write(connection, "done", 4);
            });
            context ctx;
            ctx->send_timeout = ctx->recv_timeout = limit;
            ASSERT_EQ(set_up_client(ctx), 0);
            ASSERT_GE(open_to(ctx, server.port()), 0);
            EXPECT_EQ(tcp_send(ctx.get(), message.data(), message.size()), 0);
            char answer[8];
            EXPECT_EQ(tcp_recv(ctx.get(), answer, sizeof answer), 4u);
            EXPECT_EQ(tcp_recv(ctx.get(), answer, sizeof answer), 0u);
            EXPECT_EQ(ctx->errno_value, 0);
        }
        EXPECT_TRUE(arrived == message);
    }
}

TEST_F(tls, transfers_end_when_time_is_up)
{
    std::promise<void> over;
    tls_peer server(server_for(BY_NAME), [&](SSL *) { over.get_future().wait(); });
    context ctx;
    ctx->send_timeout = ctx->recv_timeout = -20000;
    ASSERT_EQ(set_up_client(ctx), 0);
    ASSERT_GE(open_to(ctx, server.port()), 0);
    char byte;
    EXPECT_EQ(tcp_recv(ctx.get(), &byte, 1), 0u);
    EXPECT_EQ(ctx->errno_value, 0);
    const std::string message(1 << 24, 'm');
    EXPECT_EQ(tcp_send(ctx.get(), message.data(), message.size()), -1);
    EXPECT_EQ(ctx->errno_value, 0);
    over.set_value();
}

TEST_F(tls, a_peer_that_is_gone_gives_an_error_and_no_signal)
{
    tls_peer server(server_for(BY_NAME), [](SSL *connection) {
        const linger reset{1, 0};
        char byte;
        SSL_read(connection, &byte, 1);
        setsockopt(SSL_get_fd(connection), SOL_SOCKET, SO_LINGER, &reset, sizeof reset);
    });
    context ctx;
    ASSERT_EQ(set_up_client(ctx), 0);
    ASSERT_GE(open_to(ctx, server.port()), 0);
    signal(SIGPIPE, SIG_DFL);
    EXPECT_EQ(exchange(ctx, "x"), "");
    while (tcp_send(ctx.get(), "x", 1) == 0) {
    }
    tcp_disconnect(ctx.get());
    signal(SIGPIPE, SIG_IGN);
    EXPECT_EQ(ctx->socket, -1);
}

// --- liveness and the end ---

enum class event { data, ends, ends_unannounced, ticket };

TEST_F(tls, a_kept_connection_serves_only_while_it_is_quiet)
{
    for (const event what : {event::data, event::ends, event::ends_unannounced, event::ticket}) {
        std::promise<void> over;
        tls_peer server(server_for(BY_NAME, TLS1_3_VERSION), [&](SSL *connection) {
            char byte;
            SSL_read(connection, &byte, 1);
            SSL_write(connection, &byte, 1);
            SSL_read(connection, &byte, 1); // from here on the client listens
            if (what == event::data) {
                SSL_write(connection, "unasked", 7);
            } else if (what == event::ends) {
                SSL_shutdown(connection);
            } else if (what == event::ends_unannounced) {
                shutdown(SSL_get_fd(connection), SHUT_WR);
            } else {
                SSL_new_session_ticket(connection);
                SSL_do_handshake(connection);
            }
            over.get_future().wait();
        });
        context ctx;
        ASSERT_EQ(set_up_client(ctx), 0);
        ASSERT_GE(open_to(ctx, server.port()), 0);
        EXPECT_EQ(exchange(ctx, "a"), "a");
        EXPECT_EQ(tcp_peek(ctx.get()), 0);
        EXPECT_EQ(tcp_send(ctx.get(), "x", 1), 0);
        ASSERT_EQ(tcp_wait(ctx.get(), ctx->socket, WAIT_RECV, 10), WAIT_RECV);
        EXPECT_EQ(tcp_peek(ctx.get()), what == event::ticket ? 0 : -1) << static_cast<int>(what);
        over.set_value();
    }
}

TEST_F(tls, the_end_of_a_connection_is_announced_and_frees_it)
{
    std::atomic<int> announced{0};
    {
        tls_peer server(server_for(BY_NAME), [&](SSL *connection) {
            char byte;
            SSL_read(connection, &byte, 1);
            announced = SSL_get_shutdown(connection) & SSL_RECEIVED_SHUTDOWN;
        });
        context ctx;
        ASSERT_EQ(set_up_client(ctx), 0);
        ASSERT_GE(open_to(ctx, server.port()), 0);
        EXPECT_EQ(tcp_disconnect(ctx.get()), 0);
        EXPECT_EQ(ctx->socket, -1);
        EXPECT_EQ(ctx->tls_connection, nullptr);
        EXPECT_EQ(ctx->tls_bio, nullptr);
    }
    EXPECT_NE(announced.load(), 0);
}

TEST_F(tls, neither_the_question_nor_the_end_waits_for_a_peer_that_reads_nothing)
{
    tls_peer server(server_for(BY_NAME, TLS1_2_VERSION), [](SSL *connection) {
        SSL_write(connection, "unasked", 7);
        char byte;
        while (recv(SSL_get_fd(connection), &byte, 1, 0) > 0) { // no TLS, so no answer to the closing alert
        }
    });
    context ctx;
    ASSERT_EQ(set_up_client(ctx), 0);
    ASSERT_GE(open_to(ctx, server.port()), 0);
    ASSERT_EQ(tcp_wait(ctx.get(), ctx->socket, WAIT_RECV, 10), WAIT_RECV);
    socket_calls::counts = {};
    EXPECT_EQ(tcp_peek(ctx.get()), -1);
    EXPECT_EQ(tcp_disconnect(ctx.get()), 0);
    EXPECT_EQ(ctx->socket, -1);
    EXPECT_GE(socket_calls::counts.send, 1) << "the closing alert";
    EXPECT_EQ(socket_calls::counts.waiting, 0);
}

TEST_F(tls, an_abandoned_socket_is_left_alone)
{
    // One server for each connection: a thread that waits in accept has a number reserved already.
    tls_peer server(server_for(BY_NAME), echo), next_server(server_for(BY_NAME), echo);
    context ctx;
    ASSERT_EQ(set_up_client(ctx), 0);
    const int number = open_to(ctx, server.port());
    ASSERT_GE(number, 0);
    int ends[2];
    ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, ends), 0);
    EXPECT_EQ(soap_force_close(ctx.get()), 0);
    ASSERT_EQ(dup2(ends[0], number), number) << "the number now belongs to somebody else";
    EXPECT_EQ(tcp_send(ctx.get(), "x", 1), -1);
    EXPECT_EQ(soap_socket_release(ctx.get()), 0);
    EXPECT_EQ(recv(ends[1], ends, 1, MSG_DONTWAIT), -1) << "not a byte went to the new owner of the number";
    EXPECT_GE(open_to(ctx, next_server.port()), 0);
    EXPECT_EQ(exchange(ctx, "x"), "x");
    for (const int descriptor : {number, ends[0], ends[1]})
        EXPECT_EQ(close(descriptor), 0);
}

// --- set-up ---

struct setup_case {
    const char *key, *ca, *dh, *random, *detail;
};

TEST_F(tls, a_set_up_that_fails_says_why_and_leaves_no_context)
{
    const std::string junk = ca().write("junk.pem", [](std::FILE *file) { std::fputs("junk\n", file); });
    const std::string lone = ca().ca_file(); // a certificate without a key
    const setup_case cases[] = {
        {nullptr, "/nonexistent", nullptr, nullptr, "Can't read CA file"},
        {nullptr, junk.c_str(), nullptr, nullptr, "Can't read CA file"},
        {"/nonexistent", nullptr, nullptr, nullptr, "Can't read certificate key file"},
        {lone.c_str(), nullptr, nullptr, nullptr, "Can't read key file"},
        {nullptr, nullptr, nullptr, "/nonexistent", "Can't load randomness"},
        {nullptr, nullptr, "/nonexistent", nullptr, "Can't read DH file"},
        {nullptr, nullptr, "511", nullptr, "Can't read DH file"},
        {nullptr, nullptr, junk.c_str(), nullptr, "Can't set DH parameters"},
        {nullptr, nullptr, "8193", nullptr, "Can't set DH parameters"},
    };
    for (const setup_case &c : cases) {
        context ctx;
        EXPECT_EQ(soap_ssl_server_context(ctx.get(), TLS_NO_DEFAULT_CA, c.key, nullptr, c.ca, nullptr, c.dh,
                                          c.random, nullptr),
                  SOAP_TLS_ERROR);
        EXPECT_EQ(ctx.fault_text(), "SSL/TLS error");
        EXPECT_EQ(ctx.fault_detail(), c.detail);
        EXPECT_EQ(ctx->tls_context, nullptr);
    }
    context ctx;
    ctx->tls_crl = "/nonexistent";
    EXPECT_EQ(set_up_client(ctx), SOAP_TLS_ERROR);
    EXPECT_EQ(ctx.fault_detail(), "Can't read CRL file");
}

TEST_F(tls, options_follow_the_flags_and_a_second_set_up_adds_to_the_context)
{
    context ctx;
    ASSERT_EQ(set_up_client(ctx, VERIFIED), 0);
    SSL_CTX *const first = ctx->tls_context;
    EXPECT_NE(SSL_CTX_get_options(first) & SSL_OP_NO_TICKET, 0u);
    EXPECT_EQ(SSL_CTX_get_options(first) & SSL_OP_NO_TLSv1, 0u);
    EXPECT_EQ(SSL_CTX_get_verify_mode(first), SSL_VERIFY_PEER);
    EXPECT_EQ(SSL_CTX_get_verify_depth(first), 9);
    EXPECT_EQ(ctx->tls_verify, tls_verify_plain);
    ASSERT_EQ(set_up_client(ctx, TLS_NO_TLSV1 | TLS_NO_SSLV3 | TLS_NO_DEFAULT_CA | TLS_ALLOW_EXPIRED), 0);
    EXPECT_EQ(ctx->tls_context, first);
    EXPECT_NE(SSL_CTX_get_options(first) & SSL_OP_NO_TLSv1, 0u);
    EXPECT_NE(SSL_CTX_get_options(first) & SSL_OP_NO_SSLv3, 0u);
    EXPECT_EQ(SSL_CTX_get_verify_mode(first), SSL_VERIFY_NONE);
    EXPECT_EQ(ctx->tls_verify, tls_verify_ignore_expiry);
    EXPECT_EQ(ctx->tls_flags & TLS_CLIENT_SIDE, TLS_CLIENT_SIDE);
}

TEST_F(tls, the_password_callback_needs_room_for_the_terminator)
{
    char buffer[5];
    char password[] = "four";
    EXPECT_EQ(tls_password_callback(buffer, 4, 0, password), 0);
    EXPECT_EQ(tls_password_callback(buffer, 5, 0, password), 4);
    EXPECT_STREQ(buffer, "four");
    EXPECT_EQ(tls_password_callback(buffer, 5, 0, nullptr), 0);
}

// --- the server side of the library ---

struct accept_outcome {
    int result;
    std::string text, detail;
    bool closed;
};

// Runs the library's server for one client, which echoes one byte if the handshake succeeds.
std::future<accept_outcome> serve_one(context &service)
{
    return std::async(std::launch::async, [&service] {
        char byte;
        const bool came = soap_accept(service.get()) >= 0;
        const int result = came ? soap_ssl_accept(service.get()) : -1;
        const accept_outcome outcome{result, service.fault_text(), service.fault_detail(),
                                     service->socket == -1};
        if (result == 0 && tcp_recv(service.get(), &byte, 1) == 1)
            tcp_send(service.get(), &byte, 1);
        tcp_disconnect(service.get());
        return outcome;
    });
}

std::string server_pair()
{
    return ca().write_pair("server.pem", ca().issue(BY_NAME, server_key()).get(), server_key());
}

TEST_F(tls, a_client_certificate_is_asked_for_and_verified)
{
    const certificates::key client_key = certificates::make_key();
    const subject somebody{"somebody", ""};
    const std::string server = server_pair(), trusted = ca().ca_file();
    const std::string good = ca().write_pair("client.pem", ca().issue(somebody, client_key.get()).get(),
                                             client_key.get(), "secret");
    const certificates::certificate own =
        certificates::make(somebody, client_key.get(), nullptr, client_key.get(), 7);
    const std::string unknown = ca().write_pair("unknown.pem", own.get(), client_key.get());
    const struct {
        const char *pair, *password;
        bool accepted;
    } cases[] = {
        {good.c_str(), "secret", true}, {unknown.c_str(), nullptr, false}, {nullptr, nullptr, false}};
    for (const auto &c : cases) {
        context service, client;
        service->accept_timeout = 10;
        ASSERT_EQ(soap_ssl_server_context(service.get(), TLS_REQUIRE_CLIENT_CERT | TLS_NO_DEFAULT_CA,
                                          server.c_str(), nullptr, trusted.c_str(), nullptr, nullptr, nullptr,
                                          "service"),
                  0);
        ASSERT_GE(soap_bind(service.get(), "127.0.0.1", 0, 5), 0);
        std::future<accept_outcome> outcome = serve_one(service);
        ASSERT_EQ(soap_ssl_client_context(client.get(), VERIFIED, c.pair, c.password, trusted.c_str(),
                                          nullptr, nullptr),
                  0);
        client->recv_timeout = 10;
        ASSERT_GE(open_to(client, loopback::port_of(service->master_socket)), 0) << client.fault_text();
        EXPECT_EQ(exchange(client, "x"), c.accepted ? "x" : "");
        tcp_disconnect(client.get());
        const accept_outcome end = outcome.get();
        EXPECT_EQ(end.result, c.accepted ? 0 : SOAP_TLS_ERROR) << end.text;
        EXPECT_EQ(end.closed, !c.accepted);
        if (!c.accepted) {
            EXPECT_EQ(end.detail, "SSL_accept() failed in soap_ssl_accept()");
        }
    }
    context wrong;
    EXPECT_EQ(
        soap_ssl_client_context(wrong.get(), VERIFIED, good.c_str(), "wrong", nullptr, nullptr, nullptr),
        SOAP_TLS_ERROR);
    EXPECT_EQ(wrong.fault_detail(), "Can't read key file");
    EXPECT_EQ(
        soap_ssl_client_context(wrong.get(), VERIFIED, good.c_str(), nullptr, nullptr, nullptr, nullptr),
        SOAP_TLS_ERROR)
        << "and nobody is asked at the terminal";
}

TEST_F(tls, a_server_takes_its_diffie_hellman_group_from_file_or_size)
{
    const certificates::key key(EVP_RSA_gen(2048)); // no DHE suite goes with an elliptic curve
    const std::string server = ca().write_pair("rsa.pem", ca().issue(BY_NAME, key.get()).get(), key.get());
    const std::string file = ca().write("dh.pem", [](std::FILE *out) {
        EVP_PKEY_CTX *generator = EVP_PKEY_CTX_new_from_name(nullptr, "DH", nullptr);
        EVP_PKEY *parameters = nullptr;
        EVP_PKEY_paramgen_init(generator);
        EVP_PKEY_CTX_set_group_name(generator, "ffdhe3072");
        EVP_PKEY_paramgen(generator, &parameters);
        BIO *bio = BIO_new_fp(out, BIO_NOCLOSE);
        PEM_write_bio_Parameters(bio, parameters);
        BIO_free(bio);
        EVP_PKEY_free(parameters);
        EVP_PKEY_CTX_free(generator);
    });
    const struct {
        const char *dh;
        int bits;
    } cases[] = {{"512", 2048}, {"2049", 3072}, {file.c_str(), 3072}, {nullptr, 0}};
    for (const auto &c : cases) {
        context service, client;
        service->accept_timeout = client->connect_timeout = 10;
        ASSERT_EQ(soap_ssl_server_context(service.get(), TLS_NO_DEFAULT_CA, server.c_str(), nullptr, nullptr,
                                          nullptr, c.dh, nullptr, nullptr),
                  0);
        ASSERT_GE(soap_bind(service.get(), "127.0.0.1", 0, 5), 0);
        std::future<accept_outcome> outcome = serve_one(service);
        ASSERT_EQ(set_up_client(client), 0);
        SSL_CTX_set_max_proto_version(client->tls_context, TLS1_2_VERSION);
        SSL_CTX_set_cipher_list(client->tls_context, "DHE");
        ASSERT_GE(open_to(client, loopback::port_of(service->master_socket)), 0) << client.fault_text();
        EVP_PKEY *temporary = nullptr;
        ASSERT_EQ(SSL_get_peer_tmp_key(client->tls_connection, &temporary), 1);
        if (c.bits != 0) {
            EXPECT_EQ(EVP_PKEY_get_bits(temporary), c.bits) << c.dh;
        }
        EVP_PKEY_free(temporary);
        EXPECT_EQ(exchange(client, "x"), "x");
        tcp_disconnect(client.get());
        EXPECT_EQ(outcome.get().result, 0);
    }
}

TEST_F(tls, a_server_handshake_without_a_socket_or_a_client_fails)
{
    const std::string server = server_pair();
    context service, client;
    EXPECT_EQ(soap_ssl_accept(service.get()), SOAP_TLS_ERROR);
    EXPECT_EQ(service.fault_detail(), "No socket in soap_ssl_accept()");
    ASSERT_EQ(soap_ssl_server_context(service.get(), TLS_NO_DEFAULT_CA, server.c_str(), nullptr, nullptr,
                                      nullptr, nullptr, nullptr, nullptr),
              0);
    ASSERT_GE(soap_bind(service.get(), "127.0.0.1", 0, 5), 0);
    ASSERT_GE(tcp_connect(client.get(), "http://x/", "127.0.0.1", loopback::port_of(service->master_socket)),
              0);
    ASSERT_EQ(tcp_send(client.get(), "GET / HTTP/1.0\r\n\r\n", 18), 0);
    ASSERT_GE(soap_accept(service.get()), 0);
    EXPECT_EQ(soap_ssl_accept(service.get()), SOAP_TLS_ERROR);
    EXPECT_EQ(service->socket, -1);
    EXPECT_EQ(service.fault_detail(), "SSL_accept() failed in soap_ssl_accept()");
    EXPECT_NE(service.fault_text().find("http request"), std::string::npos) << service.fault_text();
}

} // namespace
