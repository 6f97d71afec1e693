// tls_test.cpp - TLS connections of a context to OpenSSL servers: handshake, sessions, bytes, the end. Elsewhere:
// who the peer is (tls_identity_test.cpp), set-up and the library's server side (tls_setup_test.cpp).
#include <future>
#include <optional>

#include "net/tcp_socket.h"
#include "net/tls_connection.h"
#include "support/scripted_server.h"
#include "support/socket_calls.h"

namespace {

using namespace tls_peers;

class tls : public tls_test {};

struct connected : context {
    explicit connected(int port, int transfer_limit = 0)
    {
        get()->send_timeout = get()->recv_timeout = transfer_limit;
        EXPECT_EQ(set_up_client(*this), 0);
        EXPECT_GE(open_to(*this, port), 0) << fault_text();
    }
};

TEST_F(tls, a_plain_connection_after_a_failed_tls_one_is_plain)
{
    peer ending([](int client) {
        shutdown(client, SHUT_WR);
        loopback::read_bytes(client, 100000);
    });
    peer plain([](int client) { loopback::write_text(client, loopback::read_bytes(client, 5)); });
    context ctx;
    ASSERT_EQ(set_up_client(ctx), 0);
    EXPECT_EQ(open_to(ctx, ending.port()), -1);
    EXPECT_TRUE(ctx.fault_text().starts_with("SSL_ERROR_SYSCALL\nEOF was observed")) << ctx.fault_text();
    peer silent([](int client) { loopback::read_bytes(client, 100000); });
    socket_calls::fail_recv = {1, ECONNRESET};
    EXPECT_EQ(open_to(ctx, silent.port()), -1);
    EXPECT_EQ(ctx.fault_text(),
              "SSL_ERROR_SYSCALL\nError observed by underlying BIO: Connection reset by peer");
    ASSERT_GE(tcp_connect(ctx.get(), "http://peer/", "peer.test", plain.port()), 0);
    EXPECT_EQ((ctx->input_mode | ctx->output_mode) & MODE_TLS, 0u);
    EXPECT_EQ(exchange(ctx, "plain"), "plain");
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

TEST_F(tls, a_tunnel_through_a_proxy_leads_to_the_host_after_it)
{
    std::string head;
    const server_context beyond = server_for({"far.example", ""});
    peer proxy([&](int client) {
        head = loopback::read_head(client);
        loopback::write_text(client, "HTTP/1.0 200 Connection established\r\nContent-Type: text/x\r\n\r\n");
        serve_over_tls(beyond.get(), client, echo);
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
    ctx->proxy_user = ctx->proxy_password = "p";
    ctx->mode = ctx->output_mode = MODE_STORE | MODE_KEEP_ALIVE | MODE_INDENT;
    ctx->mode |= MODE_DIME;
    ctx->message_count = 42;
    char content[] = "attached";
    ASSERT_EQ(soap_dime_attach(ctx.get(), content, sizeof content, "text/plain", "cid:id1", 0, nullptr), 0);
    soap_mime_start(ctx.get(), "boundary", nullptr);
    ctx->mime.first = ctx->mime.last = ctx->dime.first;
    const auto settings = [&] {
        return std::tuple(ctx->dime.first, ctx->mime.first, ctx->mime.boundary, ctx->status, ctx->keep_alive,
                          std::string(ctx->action), std::string(ctx->auth_user), ctx->http_content, ctx->mode,
                          ctx->output_mode & ~MODE_TLS, ctx->message_count);
    };
    const auto before = settings();
    ASSERT_GE(tcp_connect(ctx.get(), "https://far.example/service", "far.example", 443), 0)
        << ctx.fault_text();
    EXPECT_EQ(settings(), before);
    EXPECT_TRUE(head.starts_with("CONNECT far.example:443 HTTP/1.1\r\n")) << head;
    EXPECT_NE(ctx->output_mode & MODE_TLS, 0u);
    EXPECT_STREQ(ctx->endpoint, "https://far.example/service");
    EXPECT_EQ(exchange(ctx, "hello"), "hello");
    EXPECT_THAT(head, HasSubstr("\r\nProxy-Authorization: Basic cDpw\r\n"));
    std::string within; // the head that the host after the proxy reads
    ctx->user = &within;
    ctx->on_header_line = [](soap *line_ctx, const char *key, const char *) {
        static_cast<std::string *>(line_ctx->user)->append(key == nullptr ? "" : key).append("\n");
        return 0;
    };
    EXPECT_EQ(http_write_request(ctx.get(), ctx->endpoint, ctx->host, 443, "/service", "", 1), 0);
    EXPECT_THAT(within, HasSubstr("\nHost\n"));
    EXPECT_THAT(within, Not(HasSubstr("Proxy-Authorization")));
    ctx->action = ctx->auth_user = nullptr;
}

TEST_F(tls, a_session_is_resumed_by_its_own_host_and_port_only)
{
    for (const int version : {TLS1_2_VERSION, TLS1_3_VERSION}) {
        std::vector<int> reused;
        {
            server_context made = server_for({"*.test", ""}, version);
            SSL_CTX_up_ref(made.get());
            tls_peer one(server_context(made.get()), noting(reused), 6),
                other(std::move(made), noting(reused));
            const std::pair<const char *, int> calls[] = {{"a.test", one.port()}, {"a.test", one.port()},
                                                          {"b.test", one.port()}, {"a.test", one.port()},
                                                          {"a.test", one.port()}, {"a.test", other.port()},
                                                          {"a.test", one.port()}};
            context ctx;
            ASSERT_EQ(set_up_client(ctx), 0);
            for (const auto &[host, port] : calls) {
                ASSERT_GE(open_to(ctx, port, host), 0) << ctx.fault_text();
                EXPECT_EQ(ctx->tls_session, nullptr) << "used once";
                EXPECT_EQ(exchange(ctx, "x"), "x");
                // The next endpoint may be parsed before this connection is closed.
                std::snprintf(ctx->host, sizeof ctx->host, "next.test");
                EXPECT_EQ(tcp_disconnect(ctx.get()), 0);
                EXPECT_NE(ctx->tls_session, nullptr);
                EXPECT_STREQ(ctx->session_host, host);
                EXPECT_EQ(ctx->session_port, port);
                EXPECT_EQ(ctx->tls_connection, nullptr);
            }
        }
        EXPECT_EQ(reused, (std::vector<int>{0, 1, 0, 0, 1, 0, 0})) << version;
    }
}

TEST_F(tls, a_call_on_a_kept_connection_costs_three_system_calls_and_two_more_with_limits)
{
    for (const int version : {TLS1_2_VERSION, TLS1_3_VERSION}) {
        for (const int limit : {0, 10}) {
            tls_peer server(server_for(BY_NAME, version), echo);
            connected ctx(server.port(), limit);
            EXPECT_EQ(exchange(ctx, "a"), "a"); // brings the session tickets too
            socket_calls::counts = {};
            EXPECT_EQ(tcp_peek(ctx.get()), 0);
            EXPECT_EQ(exchange(ctx, "b"), "b");
            EXPECT_EQ(socket_calls::counts.send, 1);
            EXPECT_EQ(socket_calls::counts.recv, 1);
            EXPECT_EQ(socket_calls::counts.all(), limit == 0 ? 3 : 5);
            EXPECT_EQ(socket_calls::counts.clock == 0, limit == 0);
        }
    }
}

TEST_F(tls, messages_of_the_protocol_alone_are_read_no_longer_than_the_call_may_last)
{
    std::promise<void> sent, over;
    tls_peer server(server_for(BY_NAME, TLS1_3_VERSION), [&](SSL *connection) {
        for (int i = 0; i < 400; ++i) { // 100 KB, which is many receives
            SSL_new_session_ticket(connection);
            SSL_do_handshake(connection);
        }
        sent.set_value();
        over.get_future().wait();
    });
    context ctx;
    ASSERT_EQ(set_up_client(ctx), 0);
    ctx->call_timeout = 1000;
    const std::string endpoint = "https://peer.test:" + std::to_string(server.port()) + "/";
    ASSERT_EQ(soap_server_connect(ctx.get(), endpoint.c_str(), ""), 0);
    sent.get_future().wait();
    socket_calls::call_takes_us = 400000000;
    socket_calls::counts = {};
    char byte;
    EXPECT_EQ(tcp_recv(ctx.get(), &byte, 1), 0U);
    over.set_value();
    socket_calls::reset();
    EXPECT_LE(socket_calls::counts.recv, 2);
    EXPECT_STREQ(soap_eof_text(ctx.get()), "Operation interrupted or timed out (1000 s call limit)");
}

// As OpenSSL sees the socket: result, errno, and which transfer is to be tried again.
TEST_F(tls, its_bio_says_why_a_transfer_fails_and_whether_another_try_helps)
{
    using outcome = std::tuple<int, int, bool, bool>; // the flags: of reading, of writing
    int ends[2];
    ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, ends), 0);
    context ctx;
    ctx->socket = ends[0];
    const std::unique_ptr<BIO, certificates::freed_by<BIO_free>> bio(tls_bio_new(ctx.get()));
    tls_bio_set_nonblocking(bio.get(), true);
    const auto transfer = [&](bool writes) {
        char bytes[4096] = {};
        errno = 0;
        const int count = writes ? BIO_write(bio.get(), bytes, sizeof bytes) : BIO_read(bio.get(), bytes, 9);
        return outcome(count, count < 0 ? errno : 0, BIO_should_read(bio.get()), BIO_should_write(bio.get()));
    };
    int descriptor = -1;
    EXPECT_EQ(BIO_get_fd(bio.get(), &descriptor), ends[0]);
    EXPECT_EQ(descriptor, ends[0]);
    EXPECT_EQ(transfer(false), outcome(-1, EAGAIN, true, false)) << "nothing has come";
    EXPECT_EQ(transfer(true), outcome(4096, 0, false, false));
    for (const int error : {EINTR, ECONNRESET}) {
        socket_calls::fail_recv = {1, error};
        EXPECT_EQ(transfer(false), outcome(-1, error, error == EINTR, false));
    }
    ctx->call_deadline = 1; // long ago
    socket_calls::counts = {};
    EXPECT_EQ(transfer(false), outcome(-1, EAGAIN, true, false)) << "time is up";
    EXPECT_EQ(transfer(true), outcome(-1, EAGAIN, false, true)) << "time is up";
    EXPECT_EQ(socket_calls::counts.all(), 0);
    ctx->call_deadline = 0;
    while (std::get<0>(transfer(true)) > 0) {
    }
    EXPECT_EQ(transfer(true), outcome(-1, EAGAIN, false, true)) << "the peer reads nothing";
    loopback::write_text(ends[1], "x");
    EXPECT_EQ(transfer(false), outcome(1, 0, false, false));
    close(ends[1]);
    EXPECT_EQ(transfer(true), outcome(-1, EPIPE, false, false)) << "the peer is gone";
    ctx->socket_abandoned = true;
    for (const bool writes : {false, true})
        EXPECT_EQ(transfer(writes), outcome(-1, EBADF, false, false));
    ctx->socket_abandoned = false;
}

TEST_F(tls, a_ticket_is_no_reason_to_end_a_kept_connection_but_an_unannounced_end_is)
{
    for (const bool ticket : {true, false}) {
        std::promise<void> over;
        tls_peer server(server_for(BY_NAME, TLS1_3_VERSION), [&](SSL *connection) {
            char byte;
            SSL_read(connection, &byte, 1);
            SSL_write(connection, &byte, 1);
            SSL_read(connection, &byte, 1); // from here on the client listens
            if (ticket) {
                SSL_new_session_ticket(connection);
                SSL_do_handshake(connection);
            } else {
                shutdown(SSL_get_fd(connection), SHUT_WR);
            }
            over.get_future().wait();
        });
        connected ctx(server.port());
        EXPECT_EQ(exchange(ctx, "a"), "a");
        EXPECT_EQ(tcp_send(ctx.get(), "x", 1), 0);
        ASSERT_EQ(tcp_wait(ctx.get(), ctx->socket, WAIT_RECV, 10), WAIT_RECV);
        EXPECT_EQ(tcp_peek(ctx.get()), ticket ? 0 : -1);
        over.set_value();
    }
}

TEST_F(tls, neither_the_question_nor_the_end_waits_for_a_peer_that_reads_nothing)
{
    for (const std::uint32_t legacy : {0U, LEGACY_CLOSE_WAIT}) {
        tls_peer server(server_for(BY_NAME, TLS1_2_VERSION), [](SSL *connection) {
            SSL_write(connection, "unasked", 7);
            char byte;
            while (recv(SSL_get_fd(connection), &byte, 1, 0) >
                   0) { // no TLS, so no answer to the closing alert
            }
        });
        connected ctx(server.port());
        ctx->legacy = legacy;
        if (!tls_has_pending(ctx.get())) { // else it came with the end of the handshake
            ASSERT_EQ(tcp_wait(ctx.get(), ctx->socket, WAIT_RECV, 10), WAIT_RECV);
        }
        EXPECT_EQ(tcp_peek(ctx.get()), -1);
        socket_calls::counts = {};
        socket_calls::interrupt_select = {100, 1000000}; // each second a signal
        EXPECT_EQ(tcp_disconnect(ctx.get()), 0);
        socket_calls::reset();
        EXPECT_EQ(ctx->socket, -1);
        EXPECT_GE(socket_calls::counts.send, 1) << "the closing alert";
        EXPECT_EQ(socket_calls::counts.waiting, 0);
        EXPECT_EQ(socket_calls::counts.select, legacy == 0 ? 0 : 5) << "seconds";
    }
}

using scripted::line;
using scripted::server;

int open_to(context &ctx, const server &to, bool secure, int transfer_limit = 0)
{
    ctx->send_timeout = ctx->recv_timeout = transfer_limit;
    if (secure) {
        EXPECT_EQ(set_up_client(ctx), 0);
    }
    return tcp_connect(ctx.get(), to.endpoint().c_str(), "peer.test", to.port());
}

TEST_F(tls, and_tcp_bring_a_large_message_whole_with_limits_and_without)
{
    const std::string message(3 << 20, 'm');
    for (const bool secure : {false, true})
        for (const int limit : {0, 5}) {
            std::string arrived;
            {
                const server one(
                    [&](line &end) {
                        arrived = end.bytes(message.size());
                        end.send("done");
                    },
                    secure);
                context ctx;
                ASSERT_GE(open_to(ctx, one, secure, limit), 0) << secure;
                EXPECT_EQ(tcp_send(ctx.get(), message.data(), message.size()), 0);
                char answer[8];
                EXPECT_EQ(tcp_recv(ctx.get(), answer, sizeof answer), 4u);
                EXPECT_EQ(tcp_recv(ctx.get(), answer, sizeof answer), 0u);
                EXPECT_EQ(ctx->errno_value, 0) << "the peer's end is no failure";
            }
            EXPECT_TRUE(arrived == message) << secure << limit;
        }
}

TEST_F(tls, and_tcp_give_an_error_and_no_signal_when_the_peer_is_gone)
{
    for (const bool secure : {false, true}) {
        const server one([](line &end) { end.bytes(1), end.reset(); }, secure);
        context ctx;
        ASSERT_GE(open_to(ctx, one, secure), 0) << secure;
        signal(SIGPIPE, SIG_DFL);
        EXPECT_EQ(exchange(ctx, "x"), "");
        EXPECT_EQ(ctx->errno_value, ECONNRESET) << secure;
        while (tcp_send(ctx.get(), "x", 1) == 0) {
        }
        EXPECT_EQ(ctx->errno_value, EPIPE) << secure;
        tcp_disconnect(ctx.get());
        signal(SIGPIPE, SIG_IGN);
        EXPECT_EQ(ctx->socket, -1);
    }
}

TEST_F(tls, and_tcp_neither_use_nor_close_an_abandoned_socket)
{
    for (const bool secure : {false, true}) {
        SCOPED_TRACE(secure);
        // A thread that accepts has the lowest free number reserved, and that would be the one given up here: the first
        // server holds its connection until the number is taken, and the second starts after that.
        std::promise<void> taken;
        const server one([&](line &) { taken.get_future().wait_for(std::chrono::seconds(60)); }, secure);
        const auto echoing = [](line &end) { end.send(end.bytes(1)), end.await_end(); };
        std::optional<server> next;
        context ctx;
        EXPECT_EQ(soap_force_close(ctx.get()), 0);
        const int number = open_to(ctx, one, secure);
        ASSERT_GE(number, 0);
        int ends[2];
        ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, ends), 0);
        ctx->keep_alive = 1;
        EXPECT_EQ(soap_force_close(ctx.get()), 0);
        EXPECT_EQ(ctx->socket, number);
        EXPECT_EQ(ctx->keep_alive, 0);
        EXPECT_FALSE(soap_socket_open(ctx.get()));
        const int duplicate = dup2(ends[0], number);
        taken.set_value();
        ASSERT_EQ(duplicate, number) << "the number now belongs to another part of the program";
        next.emplace(echoing, secure);
        EXPECT_EQ(soap_force_close(ctx.get()), 0);
        EXPECT_EQ(tcp_send(ctx.get(), "x", 1), -1);
        EXPECT_EQ(ctx->errno_value, EBADF);
        loopback::write_text(ends[1], "y");
        char byte;
        EXPECT_EQ(tcp_recv(ctx.get(), &byte, 1), 0u);
        EXPECT_EQ(tcp_peek(ctx.get()), 0);
        EXPECT_EQ(soap_socket_release(ctx.get()), 0);
        EXPECT_EQ(ctx->socket, -1);
        EXPECT_EQ(recv(ends[1], &byte, 1, MSG_DONTWAIT), -1) << "not a byte went to the number's new owner";
        EXPECT_GE(open_to(ctx, *next, secure), 0);
        EXPECT_TRUE(soap_socket_open(ctx.get()));
        EXPECT_EQ(exchange(ctx, "x"), "x");
        EXPECT_EQ(loopback::read_bytes(number, 1), "y");
        for (const int descriptor : {number, ends[0], ends[1]})
            EXPECT_EQ(close(descriptor), 0);
    }
}

} // namespace
