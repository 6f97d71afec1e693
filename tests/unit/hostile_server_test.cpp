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

constexpr int BRIEF_US = -800000; // as a time limit: microseconds, and enough for a peer on a busy machine
constexpr int SLACK_MS = 60000;   // for a machine that is busy: what has no limit takes for ever

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

using script = std::function<void(line &)>;

std::vector<hostility> all_peers()
{
    std::vector<hostility> all;
    const auto add = [&all](const std::string &name, const std::vector<int> &codes, const script &first,
                            unsigned traits = 0) {
        all.push_back({name, codes, first, traits});
    };
    add("well", {0, 0, 0}, serve_well, STAYS);
    add("well, one byte at a time", {0, 0, 0}, byte_by_byte, STAYS);
    add("ends between two calls", {0, 0, 0}, end_after_an_answer, SPEAKS_UP);
    add(
        "reset between two calls", {0, 0, 0}, [](line &end) { end_after_an_answer(end), end.reset(); },
        SPEAKS_UP);
    add("ends at the second request", {0, SOAP_EOF, 0},
        [](line &end) { end_after_an_answer(end), end.request(); });
    add("ends without an answer", {SOAP_EOF, 0, 0}, [](line &end) { end.request(); });
    add("ends before the request", {SOAP_EOF, 0, 0}, [](line &end) { end.end(); });
    add(
        "silent", {SOAP_EOF, 0, 0}, [](line &end) { end.await_end(); }, MEETS_LIMIT);
    add("HTTP/1.0, ends the body by ending", {0, 0, 0},
        [](line &end) { end.send(head("", "HTTP/1.0 200 OK") + answer_body(name_in(end.request()))); });
    add(
        "a second answer, later", {0, 0, 0},
        [](line &end) {
            end_after_an_answer(end);
            first_call_is_over.wait(false);
            end.send(with_length(answer_body("stray")));
            end.await_end();
        },
        SPEAKS_UP);
    add("length 10 too large, and ends", {0, 0, 0},
        [](line &end) { end.send(with_false_length(name_in(end.request()), 10)); });
    add("endless depth", {SOAP_LENGTH, 0, 0}, [](line &end) {
        end.request();
        const std::string body = answer_body("x");
        end.send(head("") + body.substr(0, body.find("<c:identity>")));
        while (end.send_while_it_lasts("<p:profile><p:profile><p:profile><p:profile>")) {
        }
    });

    // One answer each: changes of a good one.
    const auto answer = [&add](const char *name, int code, std::function<std::string(std::string)> make,
                               unsigned traits = 0) {
        add(name, {code, 0, 0}, answering(std::move(make)), traits);
    };
    using text = const std::string &;
    const auto inserted = [](std::string whole, const char *line) { return whole.insert(FIRST_LINE, line); };
    const auto good = [](text name) { return with_length(answer_body(name)); };
    const auto chunks = [](text name) { return in_chunks(answer_body(name)); };
    answer(
        "half an answer, then silent", SOAP_EOF, [=](text n) { return good(n).substr(0, 300); }, MEETS_LIMIT);
    answer("says close and stays", 0, [=](text n) { return inserted(good(n), "Connection: close\r\n"); });
    answer("no HTTP at all", 0, answer_body);
    answer("a wrong second answer at once", 0, [=](text n) { return good(n) + good("stray"); });
    answer("a wrong second answer, in chunks", 0, [=](text n) { return chunks(n) + chunks("stray"); });
    answer("surplus bytes", 0, [=](text n) { return good(n) + "surplus"; });
    answer("length 10 too small", 0, [](text n) { return with_false_length(n, -10); });
    answer(
        "length 10 too large", 0, [](text n) { return with_false_length(n, 10); }, MEETS_LIMIT);
    answer("two lengths, the second right", 0,
           [=](text n) { return inserted(good(n), "Content-Length: 7\r\n"); });
    answer("a length with chunks", 0, [=](text n) { return inserted(chunks(n), "Content-Length: 7\r\n"); });
    answer("chunk size too small", SOAP_TAG_MISMATCH, [](text n) { return with_changed_chunk(n, "60"); });
    answer(
        "chunk size too large", SOAP_EOF, [](text n) { return with_changed_chunk(n, "6A"); }, MEETS_LIMIT);
    answer("chunk size endless", SOAP_TAG_MISMATCH,
           [](text n) { return with_changed_chunk(n, "FFFFFFFFFFFFFFFFFF"); });
    answer("chunk size negative", 200, [](text n) { return with_changed_chunk(n, "-1"); });
    answer(
        "no last chunk", 0, [=](text n) { return chunks(n).substr(0, chunks(n).size() - 5); }, MEETS_LIMIT);
    answer("body broken off inside", SOAP_EOF, [](text n) {
        const std::string body = answer_body(n);
        return with_length(body.substr(0, body.find("</c:name>")));
    });
    answer("body malformed", SOAP_SYNTAX_ERROR, [](text n) {
        std::string body = answer_body(n);
        return with_length(body.replace(body.find("<c:name>"), 8, "<c:name =\"\">"));
    });

    // A good body after such header lines, a good head before such a body, a flood without end.
    for (const auto &[name, code, lines] : std::vector<std::tuple<const char *, int, const char *>>{
             {"HTTP/1.1 without a length", 0, ""},
             {"length beyond 64 bits", 0, "Content-Length: 99999999999999999999999\r\n"},
             {"length negative", 0, "Content-Length: -1\r\n"},
             {"length no number", 0, "Content-Length: many\r\n"},
             {"gzip promised, none sent", SOAP_ZLIB_ERROR, "Content-Encoding: gzip\r\n"}})
        answer(name, code, [own = head(lines)](text n) { return own + answer_body(n); });
    for (const auto &[name, code, body] : std::vector<std::tuple<const char *, int, std::string>>{
             {"body without an envelope", 200, "<a><b></a>"},
             {"body of another kind", 200, "\x89PNG\r\n\x1A\n"},
             {"body of zeros", SOAP_EOF, std::string(1000, '\0')},
             {"body empty", SOAP_NO_DATA, ""}})
        answer(name, code, [own = with_length(body)](text) { return own; });
    const std::string ok = "HTTP/1.1 200 OK\r\n", x(1000, 'x');
    for (const auto &[name, code, first, rest] :
         std::vector<std::tuple<std::string, int, std::string, std::string>>{
             {"header lines", SOAP_HEADER_LINE, ok, "X: " + x + "\r\n"},
             {"first line", 414, "HTTP/1.1 200 ", x},
             {"error body", 503, head("Content-Length: 9999999999\r\n", "HTTP/1.1 503 Busy"),
              std::string(10000, 'e')},
             {"trailers", 0, "@", "X: " + x + "\r\n"}})
        add("endless " + name, {code, 0, 0}, flooding(first, rest));
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

using end_of_call = std::shared_future<void>;

// What a client meets before a first answer, by the raw socket of the peer.
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
    {"reads nothing of a large request", stall, false, 50000000, SOAP_EOF, nullptr, -BRIEF_US / 1000},
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
     true, 0, SOAP_TLS_ERROR,
     "SSL_connect error in tcp_connect(): the peer doesn't speak TLS on this port, which may be one for http",
     0},
    {"an alert for a handshake",
     [](int socket, const end_of_call &) {
         loopback::write_text(socket, std::string("\x15\x03\x03\x00\x02\x02\x28", 7));
     },
     true, 0, SOAP_TLS_ERROR, "SSL_connect error in tcp_connect()", 0},
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
        caller.proxy.connect_timeout = caller.proxy.send_timeout = 0; // they were for the obstacle
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

} // namespace
