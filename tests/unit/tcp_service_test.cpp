// tcp_service_test.cpp - datagrams, the way through a proxy, and the accepting side.

#include "support/tcp_client.h"

namespace {

using namespace tcp_clients;
using loopback::bound_socket;
using loopback::peer;
using loopback::write_text;

class tcp_service : public socket_test {};

TEST_F(tcp_service, datagrams_go_to_the_address_and_come_from_the_peer)
{
    const bound_socket service(SOCK_DGRAM);
    context ctx(MODE_UDP);
    ctx->ipv4_multicast_ttl = 3;
    const unsigned char loopback_interface[] = {127, 0, 0, 1};
    ctx->ipv4_multicast_interface = reinterpret_cast<const char *>(loopback_interface);
    const int socket = tcp_connect(ctx.get(), "soap.udp://x/", "127.0.0.1", service.port());
    ASSERT_GE(socket, 0);
    EXPECT_EQ(option_of(socket, IPPROTO_IP, IP_MULTICAST_TTL), 3);
    EXPECT_EQ(ctx->peer_length, sizeof(sockaddr_in));
    EXPECT_EQ(tcp_send(ctx.get(), "ping", 4), 0);
    sockaddr_in from{};
    socklen_t size = sizeof from;
    char buffer[16];
    EXPECT_EQ(
        recvfrom(service.socket(), buffer, sizeof buffer, 0, reinterpret_cast<sockaddr *>(&from), &size), 4);
    sendto(service.socket(), "pong", 4, 0, reinterpret_cast<sockaddr *>(&from), size);
    EXPECT_EQ(receive(ctx), "pong");
    EXPECT_EQ(reinterpret_cast<sockaddr_in *>(ctx->peer)->sin_port,
              htons(static_cast<std::uint16_t>(service.port())));
    EXPECT_EQ(tcp_disconnect(ctx.get()), 0);
    EXPECT_EQ(ctx->socket, socket) << "a datagram socket outlives the exchange";
}

TEST_F(tcp_service, a_stray_datagram_is_no_answer_unless_many_were_asked)
{
    static const struct {
        const char *rule, *asked;
        int flags;
        const char *received[2];
        bool keeps_peer;
    } cases[] = {{"one host", "127.0.0.1", 0, {"answer", ""}, true},
                 {"a group", "239.255.0.1", 0, {"stray", "answer"}, false},
                 {"all hosts", "127.255.255.255", SO_BROADCAST, {"stray", "answer"}, false}};
    for (const auto &c : cases) {
        const bound_socket service(SOCK_DGRAM), another_port(SOCK_DGRAM);
        const bound_socket another_host(SOCK_DGRAM, 0, "127.0.0.2", service.port());
        context ctx(MODE_UDP);
        ctx->connect_flags = c.flags;
        ctx->recv_timeout = -20000;
        ASSERT_GE(tcp_connect(ctx.get(), "soap.udp://x/", c.asked, service.port()), 0);
        sockaddr_in own{};
        own.sin_family = AF_INET;
        own.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        ASSERT_EQ(bind(ctx->socket, reinterpret_cast<sockaddr *>(&own), sizeof own), 0);
        own.sin_port = htons(static_cast<std::uint16_t>(loopback::port_of(ctx->socket)));
        const std::string asked(ctx->peer, ctx->peer_length);
        const auto *const to = reinterpret_cast<sockaddr *>(&own);
        for (int i = 0; i < (c.keeps_peer ? 110 : 1); ++i) // also more than a receive's attempts
            EXPECT_EQ(
                sendto((i % 2 == 0 ? another_port : another_host).socket(), "stray", 5, 0, to, sizeof own),
                5);
        EXPECT_EQ(sendto(service.socket(), "answer", 6, 0, to, sizeof own), 6);
        for (const char *received : c.received)
            EXPECT_EQ(receive(ctx), received) << c.rule;
        EXPECT_EQ(ctx->errno_value, 0) << c.rule;
        EXPECT_EQ(std::string(ctx->peer, ctx->peer_length) == asked, c.keeps_peer) << c.rule;
    }
}

TEST_F(tcp_service, a_refused_datagram_is_sent_once_or_twice_more)
{
    static const std::tuple<int, int, int, int> cases[] = {
        {0, 1, 0, 2}, {0, 9, -1, 2}, {SO_BROADCAST, 2, 0, 3}, {SO_BROADCAST, 9, -1, 3}};
    const bound_socket service(SOCK_DGRAM);
    for (const auto &[flags, failures, result, sends] : cases) {
        context ctx(MODE_UDP);
        ctx->connect_flags = flags;
        ASSERT_GE(tcp_connect(ctx.get(), "soap.udp://x/", "127.0.0.1", service.port()), 0);
        socket_calls::counts = {};
        socket_calls::fail_sendto = {failures, ENOBUFS};
        EXPECT_EQ(tcp_send(ctx.get(), "ping", 4), result) << flags << ' ' << failures;
        EXPECT_EQ(socket_calls::counts.sendto, sends) << flags << ' ' << failures;
        EXPECT_EQ(ctx->errno_value, result == 0 ? 0 : ENOBUFS);
    }
}

TEST_F(tcp_service, a_proxy_that_refuses_a_tunnel_is_an_error_that_says_so_and_changes_nothing)
{
    const std::string more = "Accept-Encoding: gzip\r\nProxy-Authenticate: Basic realm=\"other\"\r\n"
                             "Location: http://elsewhere/\r\nAuthorization: Basic QTpC\r\n";
    static const std::tuple<const char *, int, const char *> cases[] = {
        {"HTTP/1.1 407 Who are you\r\n@Content-Length: 2\r\n\r\nno", 407, "no"},
        {"HTTP/1.1 407 Who are you\r\n@\r\n", 407, nullptr},
        {"HTTP/1.1 401 No\r\n@Content-Encoding: deflate\r\nContent-Length: 1\r\n\r\nx", 401, nullptr},
        {"HTTP/1.1 302 Found\r\n@Transfer-Encoding: chunked\r\n\r\n2\r\nno\r\n0\r\n\r\n", 302, "no"},
        {"HTTP/1.1 400 Bad\r\n@Content-Length: 2\r\n\r\nno", 400, "no"},
        {"HTTP/1.1 500 Oops\r\n@Content-Type: text/html\r\nContent-Length: 2\r\n\r\nno", 500, "no"},
        {"HTTP/1.1 500 Oops\r\n@\r\n", 500, nullptr},
        {"HTTP/1.1 200 OK\r\n@Content-Length: 2\r\n\r\nno", 200, "no"},
        {"HTTP/1.1 200 OK\r\n@Transfer-Encoding: chunked\r\n\r\n2\r\nno\r\n0\r\n\r\n", 200, "no"},
        {"HTTP/1.1 202 Later\r\n@Content-Length: 2\r\n\r\nno", 202, "no"},
        {"HTTP/1.1 204 None\r\n@\r\n", 204, nullptr},
        {"POST / HTTP/1.1\r\n@\r\n", SOAP_HTTP_ERROR, nullptr},
        {"GET / HTTP/1.1\r\n@\r\n", SOAP_HTTP_ERROR, nullptr},
        {"\x16\x03 no HTTP at all\r\n@\r\n", SOAP_HTTP_ERROR, nullptr},
        {"HTTP/1.1 99 Low\r\n@\r\n", SOAP_HTTP_ERROR, nullptr},
        {"HTTP/1.1 1000 High\r\n@\r\n", SOAP_HTTP_ERROR, nullptr},
        {"HTTP/1.1 999 Most\r\n@\r\n", 999, nullptr},
        {"HTTP/1.1 407 Cut\r\n", 407, nullptr},
        {"", SOAP_EOF, nullptr},
    };
    for (const auto &[format, error, detail] : cases) {
        std::string head, answer = format;
        if (const std::size_t place = answer.find('@'); place != std::string::npos)
            answer.replace(place, 1, more);
        {
            const peer proxy([&](int client) {
                head = loopback::read_head(client);
                write_text(client, answer);
                shutdown(client, SHUT_WR);
                wait_for_end(client);
            });
            context ctx(MODE_KEEP_ALIVE);
            ctx->proxy_host = "[127.0.0.1]";
            ctx->proxy_port = proxy.port();
            ctx->proxy_user = "user";
            ctx->proxy_password = "secret";
            ctx->auth_user = "service";
            ctx->auth_password = "secret";
            ctx->auth_realm = "realm";
            ctx->http_content = "text/plain";
            ctx->legacy = error == 407 ? LEGACY_TUNNEL_CREDENTIALS : 0;
            const auto state = [&] {
                return std::tuple(ctx->input_mode, ctx->output_mode, ctx->zlib_in, ctx->zlib_out,
                                  ctx->keep_alive, std::string(ctx->auth_user),
                                  std::string(ctx->auth_password), std::string(ctx->auth_realm),
                                  std::string(ctx->http_content), std::string(ctx->endpoint),
                                  text_of(ctx->action), ctx->status, ctx->mode, ctx->message_count,
                                  text_of(ctx->forwarded_for));
            };
            ctx->mode = MODE_STORE | MODE_KEEP_ALIVE;
            ctx->message_count = 42;
            ctx->forwarded_for = "10.0.0.1";
            soap_parse_endpoint(ctx.get(), "https://far.example/x");
            const auto before = state();
            EXPECT_EQ(tcp_connect(ctx.get(), ctx->endpoint, "far.example", 443), -1) << answer;
            EXPECT_EQ(ctx->error, error) << answer;
            EXPECT_EQ(ctx->socket, -1) << answer;
            EXPECT_EQ(ctx.fault_text(),
                      "The HTTP proxy refused CONNECT far.example:443" +
                          (error == SOAP_EOF ? ": no answer (Operation interrupted or timed out)"
                                             : ": " + answer.substr(0, answer.find("\r\n"))));
            EXPECT_EQ(ctx.fault_detail(), detail ? detail : "CONNECT failed in tcp_connect()") << answer;
            EXPECT_EQ(state(), before) << answer;
            ctx->auth_user = ctx->auth_password = ctx->auth_realm = nullptr;
        }
        EXPECT_TRUE(head.starts_with("CONNECT far.example:443 HTTP/1.1\r\n")) << head;
        EXPECT_THAT(head, HasSubstr("Proxy-Authorization: Basic dXNlcjpzZWNyZXQ=\r\n"));
        EXPECT_EQ(head.find("\r\nAuthorization: ") != std::string::npos, error == 407) << head;
    }
}

TEST_F(tcp_service, what_a_hook_says_of_a_tunnel_is_the_end_of_it)
{
    const peer proxy(wait_for_end, 2);
    for (const bool post : {true, false}) {
        context ctx(MODE_KEEP_ALIVE);
        ctx->proxy_host = "127.0.0.1";
        ctx->proxy_port = proxy.port();
        ctx->status = STATUS_POST;
        if (post)
            ctx->on_post = [](soap *, const char *, const char *, int, const char *, const char *,
                              std::uint64_t) { return 77; };
        else
            ctx->on_read_head = [](soap *c) { return c->error = SOAP_OUT_OF_MEMORY; };
        EXPECT_EQ(tcp_connect(ctx.get(), "https://far.example/", "far.example", 443), -1);
        EXPECT_EQ(ctx->error, post ? 77 : SOAP_OUT_OF_MEMORY);
        EXPECT_EQ(ctx->status, STATUS_POST);
        EXPECT_EQ(ctx->keep_alive, 0);
        EXPECT_EQ(ctx->socket, -1);
    }
}

TEST_F(tcp_service, a_client_is_accepted_and_named)
{
    context service(MODE_KEEP_ALIVE), client;
    service->bind_flags = SO_REUSEADDR;
    ASSERT_GE(soap_bind(service.get(), "127.0.0.1", 0, 5), 0);
    ASSERT_GE(open_to(client, loopback::port_of(service->master_socket)), 0);
    for (const int limit : {0, 5}) {
        service->accept_timeout = limit;
        if (limit != 0) {
            ASSERT_GE(open_to(client, loopback::port_of(service->master_socket)), 0);
        }
        ASSERT_GE(soap_accept(service.get()), 0);
        EXPECT_STREQ(service->host, "127.0.0.1");
        EXPECT_EQ(service->peer_address, 0x7F000001u);
        EXPECT_EQ(service->port, loopback::port_of(client->socket));
        EXPECT_EQ(service->keep_alive, 1);
        EXPECT_EQ(option_of(service->socket, SOL_SOCKET, SO_KEEPALIVE), 1);
        EXPECT_EQ(fcntl(service->socket, F_GETFL) & O_NONBLOCK, 0);
        EXPECT_EQ(tcp_send(client.get(), "hello", 5), 0);
        EXPECT_EQ(receive(service), "hello");
        EXPECT_EQ(tcp_disconnect(service.get()), 0);
    }
}

TEST_F(tcp_service, hosts_of_ipv6_are_served_named_and_answered)
{
    for (const std::uint32_t mode : {0U, MODE_UDP}) {
        const bool udp = mode != 0;
        const char *const endpoint = udp ? "soap.udp://x/" : "http://x/";
        context service(mode), client(mode), stray(mode), group(mode);
        if (soap_bind(service.get(), "::1", 0, 5) < 0)
            GTEST_SKIP() << "no IPv6";
        const int port = loopback::port_of(service->master_socket);
        ASSERT_GE(tcp_connect(client.get(), endpoint, "::1", port), 0) << client.fault_text();
        EXPECT_EQ(tcp_send(client.get(), "ping", 4), 0);
        ASSERT_GE(soap_accept(service.get()), 0);
        EXPECT_EQ(receive(service), "ping");
        EXPECT_STREQ(service->host, udp ? "" : "::1");
        if (udp) {
            ASSERT_GE(tcp_connect(stray.get(), endpoint, "::1", loopback::port_of(client->socket)), 0);
            EXPECT_EQ(tcp_send(stray.get(), "stray", 5), 0);
            group->ipv6_multicast_scope = 1;
            EXPECT_GE(tcp_connect(group.get(), endpoint, "ff01::1", port), 0);
            EXPECT_EQ(reinterpret_cast<sockaddr_in6 *>(group->peer)->sin6_scope_id, 1U);
            EXPECT_TRUE(client->peer_fixed && !group->peer_fixed) << "anyone may answer for a group";
        }
        EXPECT_EQ(tcp_send(service.get(), "pong", 4), 0);
        EXPECT_EQ(receive(client), "pong");
    }
}

TEST_F(tcp_service, listening_and_accepting_name_what_failed)
{
    context ctx, other;
    EXPECT_EQ(soap_accept(ctx.get()), -1);
    EXPECT_EQ(ctx.fault_detail(), "no master socket in soap_accept()");
    ctx->accept_timeout = -20000;
    ASSERT_GE(soap_bind(ctx.get(), "127.0.0.1", 0, 1), 0);
    EXPECT_EQ(soap_accept(ctx.get()), -1);
    expect_failure(ctx, 28, "Timeout", "accept failed in soap_accept()");
    {
        context client; // that seems to have gone each time
        ASSERT_GE(open_to(client, loopback::port_of(ctx->master_socket)), 0);
        ctx->on_accept = [](soap *, int, void *, int *) { return errno = EAGAIN, -1; };
        EXPECT_EQ(soap_accept(ctx.get()), -1);
        expect_failure(ctx, 28, "Timeout", "accept failed in soap_accept()");
        ctx->on_accept = nullptr;
        EXPECT_EQ(soap_accept(ctx.get()), -1);
        expect_failure(ctx, 28, "Function not implemented", "accept failed in soap_accept()");
    }
    EXPECT_EQ(soap_bind(other.get(), "127.0.0.1", loopback::port_of(ctx->master_socket), 1), -1);
    EXPECT_EQ(other->master_socket, -1);
    expect_failure(other, 28, "Address already in use", "bind failed in soap_bind()");
    other->bind_flags = 9999;
    EXPECT_EQ(soap_bind(other.get(), "127.0.0.1", 0, 1), -1);
    expect_failure(other, 28, "Protocol not available", "setsockopt failed in soap_bind()");
    EXPECT_EQ(soap_bind(other.get(), "a..b", 0, 1), -1);
    expect_failure(other, 28, gai_strerror(EAI_NONAME), "getaddrinfo failed in soap_bind()");
}

TEST_F(tcp_service, a_datagram_service_has_one_socket_that_is_closed_once)
{
    static int closed;
    context client(MODE_UDP);
    closed = 0;
    {
        context service(MODE_UDP);
        service->on_close_socket = [](soap *, int socket) {
            ++closed;
            return close(socket);
        };
        const int master = soap_bind(service.get(), "127.0.0.1", 0, 0);
        ASSERT_GE(master, 0);
        EXPECT_EQ(service->socket, master);
        EXPECT_EQ(soap_accept(service.get()), master);
        ASSERT_GE(tcp_connect(client.get(), "soap.udp://x/", "127.0.0.1", loopback::port_of(master)), 0);
        EXPECT_EQ(tcp_send(client.get(), "ping", 4), 0);
        EXPECT_EQ(receive(service), "ping");
    }
    EXPECT_EQ(closed, 1);
}

} // namespace
