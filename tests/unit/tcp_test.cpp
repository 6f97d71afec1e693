// tcp_test.cpp - stream sockets of a context against peers on the loopback. Elsewhere: datagrams, proxies and
// the accepting side (tcp_service_test.cpp).
#include <netinet/tcp.h>
#include <optional>

#include <openssl/bio.h>
#include <zuv_client_pro/soap_report.h>

#include "net/tcp_socket.h"
#include "support/tcp_client.h"

namespace {

using namespace tcp_clients;
using loopback::bound_socket;
using loopback::peer;
using loopback::write_text;

class tcp : public socket_test {
protected:
    static void SetUpTestSuite() { tls_random_word(); } // OpenSSL keeps descriptors of its own from then on
};

struct connected : context {
    explicit connected(int port) { EXPECT_GE(open_to(*this, port), 0); }
};

// A pipe in the place of a socket.
struct pipe_ends {
    explicit pipe_ends(context &ctx)
    {
        EXPECT_EQ(pipe(ends), 0);
        ctx->send_fd = ends[1];
        ctx->recv_fd = ends[0];
    }
    ~pipe_ends()
    {
        for (const int end : ends)
            close(end);
    }
    int ends[2];
};

TEST_F(tcp, options_are_set_on_a_connected_socket)
{
    const peer server(wait_for_end);
    context ctx;
    ctx->keep_alive = 1;
    ctx->connect_flags = SO_LINGER;
    ctx->linger_seconds = 7;
    ctx->tcp_keep_idle = 11;
    ctx->tcp_keep_interval = 12;
    ctx->tcp_keep_count = 13;
    const int socket = open_to(ctx, server.port());
    ASSERT_GE(socket, 0);
    EXPECT_EQ(ctx->socket, socket);
    linger lingering{};
    socklen_t size = sizeof lingering;
    getsockopt(socket, SOL_SOCKET, SO_LINGER, &lingering, &size);
    EXPECT_EQ(lingering.l_onoff, 1);
    EXPECT_EQ(lingering.l_linger, 7);
    static const std::tuple<int, int, int> options[] = {
        {SOL_SOCKET, SO_KEEPALIVE, 1},      {IPPROTO_TCP, TCP_NODELAY, 1},
        {SOL_SOCKET, SO_SNDBUF, 2 * 65536}, // the system reports twice what was set
        {SOL_SOCKET, SO_RCVBUF, 2 * 65536}, {IPPROTO_TCP, TCP_KEEPIDLE, 11},
        {IPPROTO_TCP, TCP_KEEPINTVL, 12},   {IPPROTO_TCP, TCP_KEEPCNT, 13}};
    for (const auto &[level, name, value] : options)
        EXPECT_EQ(option_of(socket, level, name), value) << name;
    EXPECT_NE(fcntl(socket, F_GETFD) & FD_CLOEXEC, 0);
}

TEST_F(tcp, sockets_block_unless_a_transfer_has_a_limit)
{
    static const std::tuple<int, int, int, bool> cases[] = {
        {0, 0, 0, true}, {5, 0, 0, true}, {0, 5, 0, false}, {0, 0, -5, false}, {5, 5, 5, false}};
    for (const auto &[connect, send, recv, blocking] : cases) {
        const peer server(wait_for_end);
        context ctx;
        ctx->connect_timeout = connect;
        ctx->send_timeout = send;
        ctx->recv_timeout = recv;
        ASSERT_GE(open_to(ctx, server.port()), 0);
        EXPECT_EQ((fcntl(ctx->socket, F_GETFL) & O_NONBLOCK) == 0, blocking) << connect << send << recv;
    }
}

TEST_F(tcp, a_failed_attempt_names_its_step_and_leaves_no_socket)
{
    const peer server(wait_for_end);
    const int closed_port = bound_socket().port();
    const char *const lookup = "getaddrinfo failed in tcp_connect()";
    context ctx;
    EXPECT_EQ(open_to(ctx, 80, "a..b"), -1);
    expect_failure(ctx, 28, gai_strerror(EAI_NONAME), lookup);
    EXPECT_EQ(open_to(ctx, 65536 + server.port()), -1);
    expect_failure(ctx, 28, gai_strerror(EAI_SERVICE), lookup);
    for (const int limit : {0, 5}) {
        ctx->connect_timeout = limit;
        EXPECT_EQ(open_to(ctx, closed_port), -1);
        EXPECT_EQ(ctx->errno_value, ECONNREFUSED);
        expect_failure(ctx, 28, "Connection refused", "connect failed in tcp_connect()");
    }
    ctx->connect_flags = 9999;
    EXPECT_EQ(open_to(ctx, server.port()), -1);
    expect_failure(ctx, 28, "Protocol not available", "setsockopt failed in tcp_connect()");
    ctx->connect_flags = 0;
    ctx->tcp_keep_idle = 1000000;
    EXPECT_EQ(open_to(ctx, server.port()), -1);
    expect_failure(ctx, 28, "Invalid argument", "setsockopt TCP_KEEPIDLE failed in tcp_connect()");
    ctx->tcp_keep_idle = 0;
    EXPECT_GE(open_to(ctx, server.port()), 0) << "the context serves on after failures";
}

TEST_F(tcp, an_address_in_use_is_tried_again_a_bounded_number_of_times)
{
    const peer server(wait_for_end);
    context ctx;
    socket_calls::fail_connect = {3, EADDRINUSE};
    EXPECT_GE(open_to(ctx, server.port()), 0);
    socket_calls::fail_connect = {1000000, EADDRINUSE};
    socket_calls::counts = {};
    EXPECT_EQ(open_to(ctx, server.port()), -1);
    EXPECT_EQ(socket_calls::counts.connect, 16);
    expect_failure(ctx, 28, "Address already in use", "connect failed in tcp_connect()");
}

// A listener whose queue of clients is full: further ones are neither taken nor refused.
class full_listener {
public:
    explicit full_listener(const char *host = "127.0.0.1", int port = 0)
        : listener_(SOCK_STREAM, 0, host, port)
    {
        sockaddr_in address{};
        socklen_t size = sizeof address;
        getsockname(listener_.socket(), reinterpret_cast<sockaddr *>(&address), &size);
        for (int &client : clients_) {
            client = ::socket(AF_INET, SOCK_STREAM | SOCK_NONBLOCK, 0);
            connect(client, reinterpret_cast<sockaddr *>(&address), sizeof address);
        }
    }
    ~full_listener()
    {
        for (const int client : clients_)
            close(client);
    }
    full_listener(const full_listener &) = delete;
    full_listener &operator=(const full_listener &) = delete;
    int port() const { return listener_.port(); }

private:
    bound_socket listener_;
    int clients_[4];
};

TEST_F(tcp, each_address_of_a_host_is_tried_in_turn_within_the_limit_for_each)
{
    constexpr int BRIEF_US = -50000; // as a time limit: microseconds
    static const struct {
        const char *rule, *hosts; // of the endpoints
        bool silent;              // 127.0.0.9; else it refuses
        int connect, call;
        std::uint32_t legacy;
        const char *text; // of the fault; null: connected
        int tried;        // addresses
        soap_ending ended_by = ENDED_BY_NOTHING;
    } cases[] = {
        {"refused, no limit", "two.test", false, 0, 0, 0, nullptr, 2},
        {"refused, no limit, the older rule", "two.test", false, 0, 0, LEGACY_FIRST_ADDRESS, nullptr, 2},
        {"refused", "two.test", false, 5, 0, 0, nullptr, 2},
        {"refused late, the older rule", "two.test", false, 5, 0, LEGACY_FIRST_ADDRESS, "Connection refused",
         1},
        {"silent", "two.test", true, BRIEF_US, 0, 0, nullptr, 2},
        {"silent, the older rule", "two.test", true, BRIEF_US, 0, LEGACY_FIRST_ADDRESS, "Timeout", 1,
         ENDED_BY_CONNECT_LIMIT},
        {"silent, until the call is over", "two.test", true, 5, BRIEF_US, 0,
         "Operation interrupted or timed out (50000us call limit)", 1, ENDED_BY_CALL_LIMIT},
        {"silent, then another endpoint", "two.test peer.test", true, BRIEF_US, 0, LEGACY_FIRST_ADDRESS,
         nullptr, 2},
        {"IPv6 refused", "six.test", false, 5, 0, 0, nullptr, 2},
        {"as this machine has it", "localhost", false, 5, 0, 0, nullptr, 0},
    };
    const peer server(wait_for_end, std::size(cases));
    for (const auto &c : cases) {
        SCOPED_TRACE(c.rule);
        std::optional<full_listener> first;
        if (c.silent)
            first.emplace("127.0.0.9", server.port());
        context ctx;
        ctx->connect_timeout = c.connect;
        ctx->call_timeout = c.call;
        ctx->legacy = c.legacy;
        const std::string port = ":" + std::to_string(server.port());
        std::string endpoints;
        for (const std::string &host : words(c.hosts))
            endpoints += "http://" + host + port + "/ ";
        soap_server_connect(ctx.get(), endpoints.c_str(), "");
        EXPECT_EQ(ctx->socket >= 0, c.text == nullptr);
        if (c.text)
            expect_failure(ctx, 28, c.text, "connect failed in tcp_connect()");
        soap_socket_release(ctx.get());
        const soap_report &report = *soap_call_report(ctx.get());
        EXPECT_EQ(report.ended_by, c.ended_by);
        EXPECT_TRUE(report.addresses_tried == c.tried || c.tried == 0) << report.addresses_tried;
        EXPECT_EQ(report.connect_time >= report.lookup_time, c.text == nullptr);
        EXPECT_EQ(report.peer, (c.text != nullptr ? "127.0.0.9" : "127.0.0.1") + port);
    }
}

TEST_F(tcp, a_cancelled_exchange_tries_no_further_address_and_the_next_one_is_not_cancelled)
{
    const peer server(wait_for_end);
    const full_listener first("127.0.0.9", server.port());
    const std::string endpoint = "http://two.test:" + std::to_string(server.port()) + "/";
    context ctx;
    EXPECT_FALSE(soap_cancel(ctx.get()));
    ASSERT_EQ(soap_cancel_arm(ctx.get()), SOAP_OK);
    EXPECT_FALSE(soap_cancel(ctx.get())) << "nothing runs";
    {
        const std::jthread other([&] {
            while (!soap_cancel(ctx.get()))
                std::this_thread::yield();
        });
        EXPECT_EQ(soap_server_connect(ctx.get(), (endpoint + " " + endpoint).c_str(), ""), SOAP_TCP_ERROR);
    }
    EXPECT_EQ(ctx.fault_text(), "The call was cancelled");
    soap_socket_release(ctx.get());
    EXPECT_FALSE(soap_cancel(ctx.get()));
    EXPECT_EQ(soap_call_report(ctx.get())->ended_by, ENDED_BY_CANCEL);
    EXPECT_LE(soap_call_report(ctx.get())->addresses_tried, 1);
    ctx->connect_timeout = -50000;
    EXPECT_EQ(soap_server_connect(ctx.get(), endpoint.c_str(), ""), SOAP_OK);
    EXPECT_EQ(soap_call_report(ctx.get())->addresses_tried, 2);
}

TEST_F(tcp, a_new_connection_closes_the_old_one_through_the_hook)
{
    static int closed;
    const peer server(wait_for_end, 2);
    context ctx;
    ctx->on_close_socket = [](soap *, int socket) { return ++closed, close(socket); };
    for (const int before : {0, 1}) {
        closed = 0;
        ASSERT_GE(open_to(ctx, server.port()), 0);
        EXPECT_EQ(closed, before);
    }
    for (int time = 0; time < 2; ++time) {
        EXPECT_EQ(tcp_disconnect(ctx.get()), 0);
        EXPECT_EQ(closed, 2) << "once for each connection";
        EXPECT_EQ(ctx->socket, -1);
    }
}

TEST_F(tcp, wait_reports_what_is_ready_and_refuses_large_descriptors)
{
    for (const int with_poll : {0, 1}) {
        SCOPED_TRACE(with_poll ? "poll" : "select");
        int ends[2];
        ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, ends), 0);
        context ctx;
        ctx->wait_with_poll = with_poll;
        EXPECT_EQ(tcp_wait(ctx.get(), ends[0], WAIT_ALL, 0), WAIT_SEND);
        EXPECT_EQ(tcp_wait(ctx.get(), ends[0], WAIT_RECV | WAIT_ERROR, -1000), 0);
        EXPECT_EQ(ctx->errno_value, 0);
        write_text(ends[1], "x");
        EXPECT_EQ(tcp_wait(ctx.get(), ends[0], WAIT_ALL, 5), WAIT_SEND | WAIT_RECV);
        EXPECT_EQ(tcp_wait(ctx.get(), ends[0], WAIT_RECV, 5), WAIT_RECV);
        EXPECT_LT(tcp_wait(ctx.get(), -1, WAIT_ALL, 0), 0);
        EXPECT_EQ(ctx->errno_value, EBADF);
        close(ends[1]);
        EXPECT_EQ(tcp_wait(ctx.get(), ends[0], WAIT_RECV | WAIT_SEND | WAIT_ERROR, 5), WAIT_SEND | WAIT_RECV);
        close(ends[0]);
        EXPECT_EQ(ctx->error, 0);
        ctx->send_timeout = 1;
        ctx->socket = 1024;
        EXPECT_EQ(tcp_send(ctx.get(), "x", 1), with_poll ? -1 : SOAP_FD_EXCEEDED);
        EXPECT_EQ(tcp_peek(ctx.get()), SOAP_TCP_ERROR);
        EXPECT_EQ(ctx.fault_detail(), "select failed in soap_poll()");
        ctx->socket = -1;
        for (const int large : {1024, 100000}) {
            ctx->error = 0;
            EXPECT_EQ(tcp_wait(ctx.get(), large, WAIT_ALL, 0), -1);
            EXPECT_EQ(ctx->error, with_poll ? SOAP_OK : SOAP_FD_EXCEEDED);
            EXPECT_EQ(ctx->errno_value, with_poll ? EBADF : 0);
        }
    }
}

TEST_F(tcp, a_descriptor_that_select_cannot_serve_is_no_connection)
{
    const peer server(wait_for_end);
    context ctx;
    std::vector<int> low; // so many open that the next one is large
    while (low.empty() || low.back() < 1023)
        if (low.emplace_back(open("/dev/null", O_RDONLY)) < 0)
            break;
    if (low.back() == 1023) {
        EXPECT_EQ(open_to(ctx, server.port()), -1);
        EXPECT_EQ(ctx->error, SOAP_FD_EXCEEDED);
        EXPECT_EQ(ctx->socket, -1);
    }
    for (const int descriptor : low)
        close(descriptor);
}

TEST_F(tcp, a_receive_gives_up_after_so_many_false_alarms_but_not_for_signals)
{
    const peer server([](int client) {
        write_text(client, "x");
        wait_for_end(client);
    });
    connected ctx(server.port());
    socket_calls::counts = {};
    socket_calls::fail_recv = {1000000, EAGAIN};
    EXPECT_EQ(receive(ctx), "");
    EXPECT_EQ(socket_calls::counts.recv, 101);
    socket_calls::fail_recv = {150, EINTR};
    EXPECT_EQ(receive(ctx), "x");
}

constexpr int LIMIT_S = 1;
constexpr socket_calls::interruption SIGNALS{100, 200000}; // each a fifth of the limit after the last

void begin_signals()
{
    socket_calls::counts = {};
    socket_calls::interrupt_select = SIGNALS;
}

// Something that is waited for in vain, on a connection to a peer that neither reads nor writes.
struct wait_case {
    const char *rule;
    int soap::*limit;
    bool (*waits)(context &ctx, int port); // false: it found what it waited for
    int length = LIMIT_S;                  // seconds, or microseconds below 0
};

bool connects_in_vain(context &ctx, int port)
{
    begin_signals();
    return tcp_connect(ctx.get(), "http://x/", "127.0.0.1", port) == -1;
}

bool handshake_is_in_vain(context &ctx, int port)
{
    ctx->tls_setup = [](soap *c) { return begin_signals(), tls_context_setup(c); };
    return tcp_connect(ctx.get(), "https://x/", "127.0.0.1", port) == -1;
}

bool proxy_answers_nothing(context &ctx, int port)
{
    ctx->proxy_host = "127.0.0.1";
    ctx->proxy_port = port;
    ctx->on_read_head = [](soap *c) { return begin_signals(), http_read_head(c); };
    return tcp_connect(ctx.get(), "https://x/", "x", 443) == -1;
}

bool sends_in_vain(context &ctx, int port)
{
    open_to(ctx, port);
    const std::string message(1 << 24, 'm');
    begin_signals();
    ctx->error = tcp_send(ctx.get(), message.data(), message.size());
    return ctx->error == SOAP_EOF;
}

bool receives_in_vain(context &ctx, int port)
{
    open_to(ctx, port);
    begin_signals();
    ctx->error = SOAP_EOF;
    return receive(ctx).empty();
}

bool no_descriptor_serves(context &ctx, int)
{
    const pipe_ends ends(ctx);
    begin_signals();
    ctx->error = SOAP_EOF;
    return ctx->send_timeout != 0 ? tcp_send(ctx.get(), "x", 1) == SOAP_EOF : receive(ctx).empty();
}

bool accepts_in_vain(context &ctx, int)
{
    EXPECT_GE(soap_bind(ctx.get(), "127.0.0.1", 0, 1), 0);
    begin_signals();
    return soap_accept(ctx.get()) == -1;
}

bool client_does_not_shake_hands(context &ctx, int port)
{
    open_to(ctx, port);
    begin_signals();
    return soap_ssl_accept(ctx.get()) == SOAP_TLS_ERROR;
}

const wait_case WAITS[] = {
    {"connect", &soap::connect_timeout, connects_in_vain},
    {"handshake", &soap::connect_timeout, handshake_is_in_vain},
    {"handshake, in microseconds", &soap::connect_timeout, handshake_is_in_vain, -1000000 * LIMIT_S},
    {"CONNECT", &soap::connect_timeout, proxy_answers_nothing},
    {"send", &soap::send_timeout, sends_in_vain},
    {"receive", &soap::recv_timeout, receives_in_vain},
    {"send to a descriptor", &soap::send_timeout, no_descriptor_serves},
    {"receive from a descriptor", &soap::recv_timeout, no_descriptor_serves},
    {"accept", &soap::accept_timeout, accepts_in_vain},
    {"handshake of a client", &soap::accept_timeout, client_does_not_shake_hands},
};

TEST_F(tcp, limits_hold_whatever_signals_arrive)
{
    const full_listener silent;
    for (const wait_case &c : WAITS) {
        SCOPED_TRACE(c.rule);
        const bound_socket idle; // takes clients, and leaves them alone
        context ctx;
        ctx.get()->*c.limit = c.length;
        EXPECT_TRUE(c.waits(ctx, c.waits == connects_in_vain ? silent.port() : idle.port()));
        EXPECT_EQ(socket_calls::counts.select, 5);
        soap_fault_text_fill(ctx.get());
        const char *const step = ctx->send_timeout != 0 ? "send" : ctx->recv_timeout != 0 ? "receive" : "";
        const std::string of_transfer = "End of file or no input: Operation interrupted or timed out (1 s ";
        EXPECT_EQ(ctx.fault_text(), *step != '\0' ? of_transfer + step + " delay)" : "Timeout");
        socket_calls::reset();
    }
}

TEST_F(tcp, streams_and_descriptors_take_the_place_of_a_socket)
{
    context ctx;
    const pipe_ends ends(ctx);
    EXPECT_EQ(tcp_send(ctx.get(), "through a pipe", 14), 0);
    EXPECT_EQ(receive(ctx), "through a pipe");
    ctx->send_fd = ctx->recv_fd = -1;
    EXPECT_EQ(tcp_send(ctx.get(), "x", 1), -1);
    EXPECT_EQ(ctx->errno_value, EBADF);
    EXPECT_EQ(receive(ctx), "");
    EXPECT_EQ(ctx->errno_value, EBADF);

    std::ostringstream out;
    std::istringstream in("from a stream");
    ctx->output_stream = &out;
    ctx->input_stream = &in;
    EXPECT_EQ(tcp_send(ctx.get(), "to a stream", 11), 0);
    EXPECT_EQ(out.str(), "to a stream");
    EXPECT_EQ(receive(ctx), "from a stream");
    EXPECT_EQ(receive(ctx), "");

    context of_host;
    const std::unique_ptr<BIO, decltype(&BIO_free)> bio(BIO_new(BIO_s_mem()), BIO_free);
    of_host->tls_bio = bio.get();
    of_host->socket = 900; // never used
    EXPECT_EQ(tcp_send(of_host.get(), "through a BIO", 13), 0);
    EXPECT_EQ(receive(of_host), "through a BIO");
    EXPECT_EQ(receive(of_host), "");
    of_host->tls_bio = nullptr;
    of_host->socket = -1;
}

TEST_F(tcp, a_stream_that_fails_is_an_error_even_if_it_throws)
{
    class refusing : public std::streambuf {
    } nowhere;
    for (const bool throws : {false, true}) {
        std::ostream out(&nowhere);
        if (throws)
            out.exceptions(std::ios::badbit | std::ios::failbit);
        context ctx;
        ctx->errno_value = 5;
        ctx->output_stream = &out;
        EXPECT_EQ(tcp_send(ctx.get(), "x", 1), -1);
        EXPECT_EQ(ctx->errno_value, 0);
        std::istringstream in("y");
        char byte;
        ctx->errno_value = 5;
        ctx->input_stream = &in;
        EXPECT_EQ(tcp_recv(ctx.get(), &byte, 1), 1U);
        EXPECT_EQ(ctx->errno_value, 0);
    }
}

TEST_F(tcp, no_connection_is_as_good_as_a_quiet_one_and_a_listening_context_has_none_to_serve)
{
    context ctx;
    EXPECT_EQ(tcp_peek(ctx.get()), 0);
    ASSERT_GE(soap_bind(ctx.get(), "127.0.0.1", 0, 1), 0);
    EXPECT_EQ(tcp_peek(ctx.get()), -1);
}

TEST_F(tcp, release_keeps_or_closes_by_the_keep_alive_rule)
{
    static const std::tuple<int, std::int16_t, bool, bool> cases[] = {
        {0, 1, false, true},   {0, -1, false, true},  {0, 0, false, false},  {0, 1, true, false},
        {-1, 1, false, false}, {28, 1, false, false}, {30, 1, false, false}, {12, 1, false, true},
        {3, 1, false, true},   {3, 1, true, false}};
    for (const auto &[error, keep_alive, unfinished, stays] : cases) {
        SCOPED_TRACE(testing::PrintToString(std::tuple(error, keep_alive, unfinished)));
        const peer server(wait_for_end);
        connected ctx(server.port());
        ctx->error = error;
        ctx->keep_alive = keep_alive;
        ctx->response_unfinished = unfinished;
        soap_attachment *const part =
            soap_attachment_add(ctx.get(), &ctx->dime.list, &ctx->dime.last, nullptr, 0);
        ctx->mime.list = ctx->mime.last = part;
        EXPECT_EQ(soap_socket_release(ctx.get()), error);
        for (const soap_attachment *kept : {ctx->dime.list, ctx->dime.last, ctx->mime.list, ctx->mime.last})
            EXPECT_EQ(kept, error == 0 ? part : nullptr);
        EXPECT_EQ(ctx->error, error);
        EXPECT_EQ(ctx->socket != -1, stays);
        EXPECT_EQ(ctx->keep_alive, stays ? keep_alive : 0);
        EXPECT_FALSE(ctx->response_unfinished);
    }
}

TEST_F(tcp, hooks_may_refuse_the_release)
{
    const peer server(wait_for_end);
    connected ctx(server.port());
    ctx->on_disconnect = [](soap *) { return 77; };
    EXPECT_EQ(soap_socket_release(ctx.get()), 77);
    EXPECT_NE(ctx->socket, -1);
    ctx->on_disconnect = nullptr;
    ctx->error = 0;
    ctx->on_close = [](soap *c) { return tcp_disconnect(c) == 0 ? 78 : 0; };
    EXPECT_EQ(soap_socket_release(ctx.get()), 78);
    EXPECT_EQ(ctx->error, 78);
    ctx->on_close = tcp_disconnect;
}

TEST_F(tcp, socket_errors_have_texts_by_their_mode)
{
    static const std::tuple<int, int, int, int, const char *> cases[] = {
        {1, 0, 0, 0, "WSAStartup failed"},
        {2, 1, 0, 0, "Host not found"},
        {2, 4, 0, 0, "No Data"},
        {2, 5, 0, 0, "TCP/UDP IP error 5"},
        {2, 0, 0, 0, "TCP/UDP IP error 0"},
        {0, ECONNREFUSED, 9, 9, "Connection refused"},
        {0, 0, 0, 0, "Operation interrupted or timed out"},
        {0, 0, 3, -7, "Operation interrupted or timed out (3 s receive delay) (7us send delay)"},
        {0, 0, 0, INT_MIN, "Operation interrupted or timed out (2147483648us send delay)"},
    };
    context ctx;
    for (const auto &[mode, value, recv, send, text] : cases) {
        ctx->error_mode = mode;
        ctx->errno_value = value;
        ctx->recv_timeout = recv;
        ctx->send_timeout = send;
        EXPECT_STREQ(tcp_error_text(ctx.get()), text);
    }
}

} // namespace
