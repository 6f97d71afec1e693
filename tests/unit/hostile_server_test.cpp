// hostile_server_test.cpp - calls to a server that does what no healthy server does. Each call ends within
// its time limits, with its own answer or an error, and never with another's answer. The table of what was
// found is printed. Elsewhere: what a client meets before an answer (client_test.cpp).

#include "support/scripted_client.h"
#include "support/socket_calls.h"

namespace {

using namespace scripted;

constexpr int BRIEF_US = -800000; // as a time limit: microseconds, and enough for a peer on a busy machine
constexpr int SLACK_MS = 60000;   // for a machine that is busy: what has no limit takes for ever

class hostile_server : public tls_peers::tls_test {};

using script = std::function<void(line &)>;
using text = const std::string &;

script answering(std::function<std::string(text name)> make)
{
    return [make = std::move(make)](line &end) {
        end.send(make(name_in(end.request())));
        end.await_end();
    };
}

// A good body after such header lines, and a good head before such a body.
script with_lines(text lines)
{
    return answering([own = head(lines)](text name) { return own + answer_body(name); });
}

script with_body(text body)
{
    return answering([own = with_length(body)](text) { return own; });
}

// A good answer with another line in its head.
script with_line(text line, bool chunked = false)
{
    return answering([=](text name) {
        const std::size_t first_line = 17; // bytes
        return (chunked ? in_chunks(answer_body(name)) : with_length(answer_body(name)))
            .insert(first_line, line);
    });
}

script with_false_length(long off, bool ends = false)
{
    return [=](line &end) {
        const std::string body = answer_body(name_in(end.request()));
        end.send(head("Content-Length: " + std::to_string(static_cast<long>(body.size()) + off) + "\r\n") +
                 body);
        if (!ends)
            end.await_end();
    };
}

script with_chunk_size(text size)
{
    return answering([=](text name) {
        std::string whole = in_chunks(answer_body(name));
        const std::size_t at = whole.find("\r\n64\r\n", whole.find("\r\n\r\n"));
        return whole.replace(at + 2, 2, size);
    });
}

void byte_by_byte(line &end)
{
    for (std::string request; !(request = end.request()).empty();)
        for (const char byte : answer_to(request))
            end.send(std::string(1, byte));
}

void end_after_an_answer(line &end)
{
    end.send(answer_to(end.request()));
}

std::atomic<bool> first_call_is_over; // of the client, for the server's thread

void send_another_answer_later(line &end)
{
    end_after_an_answer(end);
    first_call_is_over.wait(false);
    end.send(with_length(answer_body("stray")));
    end.await_end();
}

void flood(line &end, text start, text rest)
{
    end.send(start);
    while (end.send(rest)) {
    }
}

constexpr unsigned MEETS_LIMIT = 1; // the first call ends by a time limit of BRIEF_US
constexpr unsigned SPEAKS_UP = 2; // something arrives between the first two calls, which the second must see
constexpr unsigned STAYS = 4;     // one connection serves all calls
constexpr unsigned FAILS_SECOND = 8; // the second call fails, not the first

struct hostility {
    const char *name;
    int code; // of the first call, or of the second; the others succeed
    unsigned traits;
    script first; // the first connection; all others are well
};

std::vector<hostility> all_peers()
{
    const auto good = [](text name) { return with_length(answer_body(name)); };
    const auto chunks = [](text name) { return in_chunks(answer_body(name)); };
    const auto to = [](const char *place) {
        return answer_body("x").substr(0, answer_body("x").find(place));
    };
    return {
        {"well", 0, STAYS, serve_well},
        {"well, one byte at a time", 0, STAYS, byte_by_byte},
        {"ends between two calls", 0, SPEAKS_UP, end_after_an_answer},
        {"reset between two calls", 0, SPEAKS_UP, [](line &end) { end_after_an_answer(end), end.reset(); }},
        {"ends at the second request", SOAP_EOF, FAILS_SECOND,
         [](line &end) { end_after_an_answer(end), end.request(); }},
        {"ends without an answer", SOAP_EOF, 0, [](line &end) { end.request(); }},
        {"ends before the request", SOAP_EOF, 0, [](line &end) { end.end(); }},
        {"silent", SOAP_EOF, MEETS_LIMIT, [](line &end) { end.await_end(); }},
        {"HTTP/1.0, ends the body by ending", 0, 0,
         [](line &end) { end.send(head("", "HTTP/1.0 200 OK") + answer_body(name_in(end.request()))); }},
        {"a second answer, later", 0, SPEAKS_UP, send_another_answer_later},
        {"a wrong second answer at once", 0, 0, answering([=](text n) { return good(n) + good("stray"); })},
        {"a wrong second answer, in chunks", 0, 0,
         answering([=](text n) { return chunks(n) + chunks("stray"); })},
        {"surplus bytes", 0, 0, answering([=](text n) { return good(n) + "surplus"; })},
        {"half an answer, then silent", SOAP_EOF, MEETS_LIMIT,
         answering([=](text n) { return good(n).substr(0, 300); })},
        {"says close and stays", 0, 0, with_line("Connection: close\r\n")},
        {"no HTTP at all", 0, 0, answering(answer_body)},
        {"length 10 too small", 0, 0, with_false_length(-10)},
        {"length 10 too large", 0, MEETS_LIMIT, with_false_length(10)},
        {"length 10 too large, and ends", 0, 0, with_false_length(10, true)},
        {"two lengths, the second right", 0, 0, with_line("Content-Length: 7\r\n")},
        {"a length with chunks", 0, 0, with_line("Content-Length: 7\r\n", true)},
        {"HTTP/1.1 without a length", 0, 0, with_lines("")},
        {"length beyond 64 bits", 0, 0, with_lines("Content-Length: 99999999999999999999999\r\n")},
        {"length negative", 0, 0, with_lines("Content-Length: -1\r\n")},
        {"length no number", 0, 0, with_lines("Content-Length: many\r\n")},
        {"gzip promised, none sent", SOAP_ZLIB_ERROR, 0, with_lines("Content-Encoding: gzip\r\n")},
        {"chunk size too small", SOAP_TAG_MISMATCH, 0, with_chunk_size("60")},
        {"chunk size too large", SOAP_EOF, MEETS_LIMIT, with_chunk_size("6A")},
        {"chunk size endless", SOAP_TAG_MISMATCH, 0, with_chunk_size("FFFFFFFFFFFFFFFFFF")},
        {"chunk size negative", 200, 0, with_chunk_size("-1")},
        {"no last chunk", 0, MEETS_LIMIT,
         answering([=](text n) { return chunks(n).substr(0, chunks(n).size() - 5); })},
        {"body broken off inside", SOAP_EOF, 0, with_body(to("</c:name>"))},
        {"body malformed", SOAP_SYNTAX_ERROR, 0, with_body(to("<c:name>") + "<c:name =\"\">")},
        {"body without an envelope", 200, 0, with_body("<a><b></a>")},
        {"body of another kind", 200, 0, with_body("\x89PNG\r\n\x1A\n")},
        {"body of zeros", SOAP_EOF, 0, with_body(std::string(1000, '\0'))},
        {"body empty", SOAP_NO_DATA, 0, with_body("")},
        {"endless depth", SOAP_LENGTH, 0,
         [=](line &end) {
             end.request(), flood(end, head("") + to("<c:identity>"), repeat_text("<p:profile>", 4));
         }},
        {"endless trailers", 0, 0,
         [=](line &end) {
             const std::string whole = chunks(name_in(end.request()));
             flood(end, whole.substr(0, whole.size() - 2), "X: " + std::string(1000, 'x') + "\r\n");
         }},
    };
}

void call_all(const hostility &peer, bool tls)
{
    SCOPED_TRACE(peer.name + std::string(tls ? ", TLS" : ", TCP"));
    const server one(peer.first, tls);
    client caller(one);
    const bool meets_limit = (peer.traits & MEETS_LIMIT) != 0;
    if (meets_limit)
        caller.proxy.recv_timeout = BRIEF_US;
    std::vector<int> codes, expected(3, 0);
    expected[(peer.traits & FAILS_SECOND) != 0 ? 1 : 0] = peer.code;
    int longest = 0;
    first_call_is_over = false;
    for (std::size_t i = 0; i < expected.size(); ++i) {
        if (i == 1 && (peer.traits & SPEAKS_UP) != 0) {
            EXPECT_GT(tcp_wait(&caller.proxy, caller.proxy.socket, WAIT_RECV, GUARD_S), 0);
        }
        codes.push_back(caller.call());
        longest = std::max(longest, caller.milliseconds);
        if (i == 0) {
            first_call_is_over = true;
            first_call_is_over.notify_all();
            if (meets_limit) {
                EXPECT_GE(caller.milliseconds, -BRIEF_US / 1000);
            }
        }
    }
    std::printf("%-35s %-4s %-12s %d connections %5d ms\n", peer.name, tls ? "TLS" : "TCP",
                testing::PrintToString(codes).c_str(), caller.connections, longest);
    EXPECT_EQ(codes, expected);
    EXPECT_EQ(caller.connections, (peer.traits & STAYS) != 0 ? 1 : 2);
    EXPECT_LT(longest, SLACK_MS);
}

TEST_F(hostile_server, costs_the_call_and_nothing_more)
{
    for (const bool tls : {false, true})
        for (const hostility &peer : all_peers())
            call_all(peer, tls);
}

constexpr const char *CALL_OVER =
    "End of file or no input: Operation interrupted or timed out (5 s call limit)";
constexpr const char *CONNECT_OVER = "Operation interrupted or timed out (5 s call limit)";

// Calls whose peer's bytes come one by one, each taking seconds by the clock.
const std::tuple<const char *, const char *, bool, bool, int, int, const char *> DRIPS[] = {
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
    // It drips on a kept connection only, or with a proxy between; seconds of a call, as drops meet no limit of a
    // single step; the text of the fault, or null.
    for (const auto &[rule, scheme, kept, through_proxy, call_limit, code, text_of_fault] : DRIPS) {
        const loopback::peer proxy([](int socket) {
            loopback::read_head(socket);
            loopback::write_text(socket, "HTTP/1.1 200 OK\r\nX: " + std::string(500, 'x') + "\r\n\r\n");
            loopback::read_head(socket);
        });
        const server one(serve_well, scheme == std::string("https"));
        client caller(one);
        caller.proxy.call_timeout = call_limit;
        if (through_proxy) {
            caller.proxy.proxy_host = "127.0.0.1";
            caller.proxy.proxy_port = proxy.port();
        }
        if (kept) {
            EXPECT_EQ(caller.call(), 0) << rule;
        }
        EXPECT_EQ(caller.proxy.call_deadline, 0) << "the time between calls is no call's";
        socket_calls::drips = true;
        socket_calls::call_takes_us = 1000000;
        EXPECT_EQ(caller.call(), code) << rule;
        socket_calls::reset();
        soap_fault_text_fill(&caller.proxy);
        EXPECT_STREQ(text_of_fault ? caller.proxy.soap_fault_string() : nullptr, text_of_fault) << rule;
        std::printf("%-25s code %2d, %3d s\n", rule, caller.proxy.error, caller.milliseconds / 1000);
        caller.proxy.proxy_host = nullptr;
        EXPECT_EQ(caller.call(), 0) << rule;
    }
}

} // namespace
