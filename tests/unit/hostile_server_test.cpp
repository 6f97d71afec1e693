// hostile_server_test.cpp - calls to a server that does what no healthy server does.
//
// Each call ends within its time limits, with its own answer or an error, and never with another's answer.
// The table of what was found is printed.
#include <atomic>
#include <chrono>
#include <future>

#include "support/scripted_client.h"
#include "support/socket_calls.h"

namespace {

using namespace scripted;

constexpr int BRIEF_US = -200000; // as a time limit: microseconds
constexpr int SLACK_MS = 5000;    // for a machine that is busy

class hostile_server : public tls_peers::tls_test {};

// --- scripts of the first connection ---

std::function<void(line &)> answering(std::function<std::string(const std::string &name)> make)
{
    return [make = std::move(make)](line &end) {
        end.send(make(name_in(end.request())));
        end.await_end();
    };
}

std::function<void(line &)> flooding(std::string first, std::string rest)
{
    return [first = std::move(first), rest = std::move(rest)](line &end) {
        const std::string name = name_in(end.request());
        const std::size_t own = first.find('@'); // stands for an answer's chunks without the last empty line
        const std::string chunks = in_chunks(answer_body(name));
        end.send(own == first.npos ? first : chunks.substr(0, chunks.size() - 2));
        while (end.send_while_it_lasts(rest)) {
        }
    };
}

void byte_by_byte(line &end)
{
    for (std::string request; !(request = end.request()).empty();)
        for (const char byte : answer_to(request))
            end.send(std::string(1, byte));
}

std::string with_false_length(const std::string &name, long off)
{
    const std::string body = answer_body(name);
    return head("Content-Length: " + std::to_string(static_cast<long>(body.size()) + off) + "\r\n") + body;
}

std::string with_changed_chunk(const std::string &name, const std::string &size)
{
    std::string text = in_chunks(answer_body(name));
    const std::size_t at = text.find("\r\n64\r\n", text.find("\r\n\r\n"));
    return text.replace(at + 2, 2, size);
}

std::atomic<bool> first_call_is_over; // of the client, for the server's thread

constexpr std::size_t FIRST_LINE = 17; // bytes of an answer's first line

constexpr unsigned MEETS_LIMIT = 1; // the first call ends by a time limit of BRIEF_US
constexpr unsigned SPEAKS_UP = 2; // something arrives between the first two calls, which the second must see
constexpr unsigned STAYS = 4;     // one connection serves all calls

struct hostility {
    std::string name;
    std::vector<int> codes;            // of the calls, in turn
    std::function<void(line &)> first; // the first connection; all others are well
    unsigned traits = 0;
};

void end_after_an_answer(line &end)
{
    end.send(answer_to(end.request()));
}

std::vector<hostility> scripts()
{
    return {{"well", {0, 0, 0}, serve_well, STAYS},
            {"well, one byte at a time", {0, 0, 0}, byte_by_byte, STAYS},
            {"ends between two calls", {0, 0, 0}, end_after_an_answer, SPEAKS_UP},
            {"reset between two calls",
             {0, 0, 0},
             [](line &end) { end_after_an_answer(end), end.reset(); },
             SPEAKS_UP},
            {"ends at the second request",
             {0, SOAP_EOF, 0},
             [](line &end) { end_after_an_answer(end), end.request(); }},
            {"ends without an answer", {SOAP_EOF, 0, 0}, [](line &end) { end.request(); }},
            {"ends before the request", {SOAP_EOF, 0, 0}, [](line &end) { end.end(); }},
            {"silent", {SOAP_EOF, 0, 0}, [](line &end) { end.await_end(); }, MEETS_LIMIT},
            {"HTTP/1.0, ends the body by ending",
             {0, 0, 0},
             [](line &end) { end.send(head("", "HTTP/1.0 200 OK") + answer_body(name_in(end.request()))); }},
            {"a second answer, later",
             {0, 0, 0},
             [](line &end) {
                 end_after_an_answer(end);
                 first_call_is_over.wait(false);
                 end.send(with_length(answer_body("stray")));
                 end.await_end();
             },
             SPEAKS_UP},
            {"length 10 too large, and ends",
             {0, 0, 0},
             [](line &end) { end.send(with_false_length(name_in(end.request()), 10)); }},
            {"endless depth", {SOAP_LENGTH, 0, 0}, [](line &end) {
                 end.request();
                 const std::string body = answer_body("x");
                 end.send(head("") + body.substr(0, body.find("<c:identity>")));
                 while (end.send_while_it_lasts("<p:profile><p:profile><p:profile><p:profile>")) {
                 }
             }}};
}

// One answer each.
const struct {
    const char *name;
    int code;
    std::string (*make)(const std::string &name);
    unsigned traits = 0;
} ANSWERS[] = {
    {"half an answer, then silent", SOAP_EOF,
     [](const std::string &n) { return with_length(answer_body(n)).substr(0, 300); }, MEETS_LIMIT},
    {"says close and stays", 0,
     [](const std::string &n) {
         return with_length(answer_body(n)).insert(FIRST_LINE, "Connection: close\r\n");
     }},
    {"no HTTP at all", 0, answer_body},
    {"a wrong second answer at once", 0,
     [](const std::string &n) { return with_length(answer_body(n)) + with_length(answer_body("stray")); }},
    {"a wrong second answer, in chunks", 0,
     [](const std::string &n) { return in_chunks(answer_body(n)) + in_chunks(answer_body("stray")); }},
    {"surplus bytes", 0, [](const std::string &n) { return with_length(answer_body(n)) + "surplus"; }},
    {"length 10 too small", 0, [](const std::string &n) { return with_false_length(n, -10); }},
    {"length 10 too large", 0, [](const std::string &n) { return with_false_length(n, 10); }, MEETS_LIMIT},
    {"two lengths, the second right", 0,
     [](const std::string &n) {
         return with_length(answer_body(n)).insert(FIRST_LINE, "Content-Length: 7\r\n");
     }},
    {"a length beside chunks", 0,
     [](const std::string &n) {
         return in_chunks(answer_body(n)).insert(FIRST_LINE, "Content-Length: 7\r\n");
     }},
    {"chunk size too small", SOAP_TAG_MISMATCH,
     [](const std::string &n) { return with_changed_chunk(n, "60"); }},
    {"chunk size too large", SOAP_EOF, [](const std::string &n) { return with_changed_chunk(n, "6A"); },
     MEETS_LIMIT},
    {"chunk size endless", SOAP_TAG_MISMATCH,
     [](const std::string &n) { return with_changed_chunk(n, "FFFFFFFFFFFFFFFFFF"); }},
    {"chunk size negative", 200, [](const std::string &n) { return with_changed_chunk(n, "-1"); }},
    {"no last chunk", 0,
     [](const std::string &n) {
         const std::string text = in_chunks(answer_body(n));
         return text.substr(0, text.size() - 5);
     },
     MEETS_LIMIT},
    {"body broken off inside", SOAP_EOF,
     [](const std::string &n) {
         const std::string body = answer_body(n);
         return with_length(body.substr(0, body.find("</c:name>")));
     }},
    {"body malformed", SOAP_SYNTAX_ERROR,
     [](const std::string &n) {
         std::string body = answer_body(n);
         return with_length(body.replace(body.find("<c:name>"), 8, "<c:name =\"\">"));
     }},
};

// An answer's body behind header lines.
const struct {
    const char *name;
    int code;
    const char *lines;
} HEADS[] = {
    {"HTTP/1.1 without a length", 0, ""},
    {"length beyond 64 bits", 0, "Content-Length: 99999999999999999999999\r\n"},
    {"length negative", 0, "Content-Length: -1\r\n"},
    {"length no number", 0, "Content-Length: many\r\n"},
    {"gzip promised, none sent", SOAP_ZLIB_ERROR, "Content-Encoding: gzip\r\n"},
};

const struct {
    const char *name;
    int code;
    std::string body;
} BODIES[] = {
    {"body without an envelope", 200, "<a><b></a>"},
    {"body of another kind", 200, "\x89PNG\r\n\x1A\n"},
    {"body of zeros", SOAP_EOF, std::string(1000, '\0')},
    {"body empty", SOAP_NO_DATA, ""},
};

const std::string X_LINE = "X: " + std::string(1000, 'x') + "\r\n";

const struct {
    const char *name;
    int code;
    std::string first, rest; // the rest without end
} FLOODS[] = {
    {"header lines", SOAP_HEADER_LINE, "HTTP/1.1 200 OK\r\n", X_LINE},
    {"header line", SOAP_HEADER_LINE, "HTTP/1.1 200 OK\r\nX: ", std::string(1000, 'x')},
    {"folded line", SOAP_HEADER_LINE, "HTTP/1.1 200 OK\r\nX: y\r\n", " z\r\n"},
    {"first line", 414, "HTTP/1.1 200 ", std::string(1000, 'x')},
    {"heads of 100", SOAP_HEADER_LINE, "", "HTTP/1.1 100 Continue\r\n\r\n"},
    {"error body", 503, head("Content-Length: 9999999999\r\n", "HTTP/1.1 503 Busy"), std::string(10000, 'e')},
    {"trailers", 0, "@", X_LINE},
};

std::vector<hostility> all_peers()
{
    std::vector<hostility> all = scripts();
    for (const auto &row : ANSWERS)
        all.push_back({row.name, {row.code, 0, 0}, answering(row.make), row.traits});
    for (const auto &row : HEADS)
        all.push_back({row.name, {row.code, 0, 0}, answering([&row](const std::string &n) {
                           return head(row.lines) + answer_body(n);
                       })});
    for (const auto &row : BODIES)
        all.push_back({row.name, {row.code, 0, 0}, answering([&row](const std::string &) {
                           return with_length(row.body);
                       })});
    for (const auto &row : FLOODS)
        all.push_back({std::string("endless ") + row.name, {row.code, 0, 0}, flooding(row.first, row.rest)});
    return all;
}

void call_all(const hostility &peer, bool tls)
{
    const server one(peer.first, tls);
    client caller(one);
    const bool meets_limit = (peer.traits & MEETS_LIMIT) != 0;
    if (meets_limit)
        caller.proxy.recv_timeout = BRIEF_US;
    std::vector<int> codes;
    int longest = 0;
    first_call_is_over = false;
    for (std::size_t i = 0; i < peer.codes.size(); ++i) {
        if (i == 1 && (peer.traits & SPEAKS_UP) != 0) {
            EXPECT_GT(tcp_wait(&caller.proxy, caller.proxy.socket, WAIT_RECV, GUARD_S), 0) << peer.name;
        }
        codes.push_back(caller.call());
        longest = std::max(longest, caller.milliseconds);
        if (i == 0) {
            first_call_is_over = true;
            first_call_is_over.notify_all();
            if (meets_limit) {
                EXPECT_GE(caller.milliseconds, -BRIEF_US / 1000) << peer.name;
            }
        }
    }
    std::printf("%-35s %-4s %-12s %d connections %5d ms\n", peer.name.c_str(), tls ? "TLS" : "TCP",
                testing::PrintToString(codes).c_str(), caller.connections, longest);
    EXPECT_EQ(codes, peer.codes) << peer.name << (tls ? ", TLS" : "");
    EXPECT_EQ(caller.connections, (peer.traits & STAYS) != 0 ? 1 : 2) << peer.name;
    EXPECT_LT(longest, SLACK_MS) << peer.name;
}

TEST_F(hostile_server, costs_the_call_and_nothing_more)
{
    for (const bool tls : {false, true})
        for (const hostility &peer : all_peers())
            call_all(peer, tls);
}

TEST_F(hostile_server, cuts_an_answer_at_every_byte)
{
    std::string (*const framings[])(const std::string &body) = {
        with_length, [](const std::string &body) { return in_chunks(body); }};
    for (const bool tls : {false, true}) {
        for (const auto framing : framings) {
            const std::string whole = framing(answer_body(A_NAME));
            // From here on the answer is there; what lacks is white space and the end of the framing.
            const std::size_t sufficient = whole.rfind('>') + 1;
            int early = 0, answered = 0;
            for (std::size_t cut = 0; cut < whole.size(); cut += tls ? 5 : 1) {
                const server one(
                    [&](line &end) { end.send(framing(answer_body(name_in(end.request()))).substr(0, cut)); },
                    tls);
                client caller(one);
                const int code = caller.call();
                early += code != 0;
                answered += code == 0;
                ASSERT_EQ(code == 0, cut >= sufficient) << code << " at " << cut << " of " << whole.size();
                ASSERT_NE(code, OTHERS_ANSWER);
                ASSERT_EQ(caller.call(), 0) << cut;
                ASSERT_EQ(caller.connections, 2) << "a cut answer ends the connection";
            }
            std::printf("%s, %s: %d cuts are errors, %d after the envelope aren't\n", tls ? "TLS" : "TCP",
                        framing == framings[0] ? "a length" : "chunks", early, answered);
        }
    }
}

using end_of_call = std::shared_future<void>;

// What a client meets ahead of a first answer, by the raw socket of the peer.
struct obstacle {
    const char *name;
    void (*meet)(int socket, const end_of_call &over);
    bool tls;
    std::size_t padding; // bytes of text in the request
    int code;
    const char *detail; // of the fault
    int least_ms;       // of the limits below
};

void stall(int, const end_of_call &over)
{
    over.wait();
}

const obstacle OBSTACLES[] = {
    {"reads nothing of a large request", stall, false, 50000000, SOAP_EOF, nullptr, 200},
    {"silent in the handshake", stall, true, 0, SOAP_TCP_ERROR, "SSL_connect failed in tcp_connect()", 1000},
    {"a bit of a handshake, then silent",
     [](int socket, const end_of_call &over) {
         loopback::write_text(socket, std::string("\x16\x03\x03\x01\x00\x02", 6));
         stall(socket, over);
     },
     true, 0, SOAP_TCP_ERROR, "SSL_connect failed in tcp_connect()", 1000},
    {"plain text for a handshake",
     [](int socket, const end_of_call &) {
         loopback::write_text(socket, "HTTP/1.1 400 Bad Request\r\n\r\n");
     },
     true, 0, SOAP_TLS_ERROR, "SSL_connect error in tcp_connect()", 0},
    {"an alert for a handshake",
     [](int socket, const end_of_call &) {
         loopback::write_text(socket, std::string("\x15\x03\x03\x00\x02\x02\x28", 7));
     },
     true, 0, SOAP_TLS_ERROR, "SSL_connect error in tcp_connect()", 0},
    {"ends in the handshake", [](int, const end_of_call &) {}, true, 0, SOAP_TLS_ERROR,
     "SSL_connect error in tcp_connect()", 0},
    {"ends while a large request is sent",
     [](int socket, const end_of_call &) { loopback::read_bytes(socket, 100000); }, false, 50000000, SOAP_EOF,
     nullptr, 0},
};

TEST_F(hostile_server, meets_a_call_before_its_answer)
{
    for (const obstacle &o : OBSTACLES) {
        std::promise<void> over;
        const loopback::peer peer([&, end = over.get_future().share()](int socket) { o.meet(socket, end); });
        const server well(serve_well, o.tls);
        client caller(well);
        const std::string endpoint =
            (o.tls ? "https://peer.test:" : "http://peer.test:") + std::to_string(peer.port()) + "/";
        const std::string good = std::exchange(caller.endpoint, endpoint);
        caller.proxy.connect_timeout = 1;
        caller.proxy.send_timeout = BRIEF_US;
        const int code = caller.call(o.padding);
        over.set_value();
        const int milliseconds = caller.milliseconds;
        const char *const detail = soap_fault_detail_value(&caller.proxy);
        std::printf("%-35s code %2d %5d ms %s\n", o.name, code, milliseconds, detail ? detail : "");
        EXPECT_EQ(code, o.code) << o.name;
        if (o.detail) {
            EXPECT_STREQ(detail, o.detail) << o.name;
        }
        EXPECT_GE(milliseconds, o.least_ms) << o.name;
        EXPECT_LT(milliseconds, o.least_ms + SLACK_MS) << o.name;
        caller.endpoint = good;
        EXPECT_EQ(caller.call(), 0) << o.name;
    }
}

// A call whose peer's bytes come one by one, each taking seconds by the clock.
struct drip_case {
    const char *rule;
    const char *scheme; // of the endpoint
    bool kept;          // drips only on a kept connection
    bool proxy;         // between
    int call_limit;     // seconds; no limit of a single step is met by drops
    int code;
    const char *text; // of the fault; null: none
};

constexpr const char *CALL_OVER =
    "End of file or no input: Operation interrupted or timed out (5 s call limit)";
constexpr const char *CONNECT_OVER = "Operation interrupted or timed out (5 s call limit)";

const drip_case DRIPS[] = {
    {"answer, no limit", "http", true, false, 0, 0, nullptr},
    {"answer", "http", true, false, 5, SOAP_EOF, CALL_OVER},
    {"answer, TLS, no limit", "https", true, false, 0, 0, nullptr},
    {"answer, TLS", "https", true, false, 5, SOAP_EOF, CALL_OVER},
    {"handshake", "https", false, false, 0, SOAP_TCP_ERROR, "Timeout"},
    {"handshake within a call", "https", false, false, 5, SOAP_TCP_ERROR, CONNECT_OVER},
    {"CONNECT", "https", false, true, 0, SOAP_TCP_ERROR, "Timeout"},
    {"CONNECT within a call", "https", false, true, 5, SOAP_TCP_ERROR, CONNECT_OVER},
};

TEST_F(hostile_server, is_left_in_time_though_it_drips)
{
    for (const drip_case &c : DRIPS) {
        const loopback::peer proxy([](int socket) {
            loopback::read_head(socket);
            loopback::write_text(socket, "HTTP/1.1 200 OK\r\nX: " + std::string(500, 'x') + "\r\n\r\n");
            loopback::read_head(socket);
        });
        const server one(serve_well, c.scheme == std::string("https"));
        client caller(one);
        caller.proxy.call_timeout = c.call_limit;
        if (c.proxy) {
            caller.proxy.proxy_host = "127.0.0.1";
            caller.proxy.proxy_port = proxy.port();
        }
        if (c.kept) {
            EXPECT_EQ(caller.call(), 0) << c.rule;
        }
        EXPECT_EQ(caller.proxy.call_deadline, 0) << "the time between calls is nobody's";
        socket_calls::drips = true;
        socket_calls::call_takes_us = 1000000;
        EXPECT_EQ(caller.call(), c.code) << c.rule;
        socket_calls::reset();
        soap_fault_text_fill(&caller.proxy);
        EXPECT_STREQ(c.text ? caller.proxy.soap_fault_string() : nullptr, c.text) << c.rule;
        std::printf("%-25s code %2d, %3d s\n", c.rule, caller.proxy.error, caller.milliseconds / 1000);
        caller.proxy.proxy_host = nullptr;
        EXPECT_EQ(caller.call(), 0) << c.rule;
    }
}

TEST_F(hostile_server, is_called_again_after_a_forced_close)
{
    for (const bool tls : {false, true}) {
        const server one(serve_well, tls);
        client caller(one);
        EXPECT_EQ(caller.call(), 0);
        const int number = caller.proxy.socket;
        EXPECT_EQ(caller.proxy.soap_force_close_socket(), 0);
        EXPECT_EQ(caller.proxy.socket, number) << "the number stays";
        EXPECT_EQ(caller.proxy.soap_force_close_socket(), 0) << "and is not closed again";
        EXPECT_EQ(caller.call(), 0);
        EXPECT_EQ(caller.connections, 2);
    }
}

TEST_F(hostile_server, is_none_to_the_copies_of_a_connected_proxy)
{
    for (const bool tls : {false, true}) {
        const std::string where = "tls " + std::to_string(tls);
        const crowd_server one(tls);
        client caller(one);
        ASSERT_EQ(caller.call(), 0) << where;
        const int socket = caller.proxy.socket;
        {
            const ProfileSoapBindingProxy idle(caller.proxy);
        }
        std::vector<ProfileSoapBindingProxy> copies;
        copies.emplace_back(static_cast<const soap &>(caller.proxy));
        EXPECT_EQ(caller.call_through(copies.front()), 0) << where;
        copies.emplace_back(caller.proxy); // grows: the first one moves and ends its connection
        for (ProfileSoapBindingProxy &copy : copies)
            EXPECT_EQ(caller.call_through(copy), 0) << where;
        EXPECT_EQ(caller.call(), 0) << where;
        EXPECT_EQ(caller.proxy.socket, socket) << where;
        EXPECT_EQ(caller.connections, 4) << where;
    }
}

} // namespace
