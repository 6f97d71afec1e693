// call_wire.h - a proxy whose connection is memory: what calls send is kept, the answers are given in turn.
// No socket is opened and no trace is written. An answer ends where the peer would wait for the next request;
// an empty list means that the peer closes.
#pragma once

#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/protocolProfile.h>
#include <zuv_client_pro/type_ids.h>

#include "support/library.h"

constexpr int CALL_WIRE_SOCKET = 900; // never opened, never closed

struct call_wire {
    std::string sent;
    std::deque<std::string> answers;
    std::size_t piece = SOAP_BUFFER_SIZE; // bytes that one receive gives at most
    int opened = 0, closed = 0;
    std::string opened_at; // endpoint of the last connection

    // Takes the place of the proxy's connection; the wire must outlive it.
    void carry(soap &ctx)
    {
        ctx.user = this;
        ctx.on_open = [](soap *c, const char *endpoint, const char *, int) {
            of(c).opened_at = endpoint;
            ++of(c).opened;
            return CALL_WIRE_SOCKET;
        };
        ctx.on_close = [](soap *c) {
            of(c).closed += c->socket != -1;
            c->socket = -1;
            return 0;
        };
        ctx.on_poll = [](soap *) { return 0; };
        ctx.on_send = [](soap *c, const char *data, std::size_t length) {
            of(c).sent.append(data, length);
            return 0;
        };
        ctx.on_recv = [](soap *c, char *buffer, std::size_t length) { return of(c).give(buffer, length); };
        soap_log_set_received(&ctx, nullptr);
        soap_log_set_sent(&ctx, nullptr);
    }

private:
    static call_wire &of(soap *ctx) { return *static_cast<call_wire *>(ctx->user); }

    std::size_t give(char *buffer, std::size_t length)
    {
        if (answers.empty())
            return 0;
        std::string &answer = answers.front();
        const std::size_t part = std::min({length, piece, answer.size()});
        std::memcpy(buffer, answer.data(), part);
        answer.erase(0, part);
        if (answer.empty())
            answers.pop_front();
        return part;
    }
};

// An HTTP answer with a Content-Length.
inline std::string http_answer(const std::string &body, const std::string &status = "200 OK",
                               const std::string &more = "Connection: keep-alive\r\n")
{
    return "HTTP/1.1 " + status +
           "\r\nContent-Type: text/xml; charset=utf-8\r\nContent-Length: " + std::to_string(body.size()) +
           "\r\n" + more + "\r\n" + body;
}

constexpr char ENVELOPE_11[] = "http://schemas.xmlsoap.org/soap/envelope/";
constexpr char ENVELOPE_12[] = "http://www.w3.org/2003/05/soap-envelope";

// An envelope around header and body; "E" is its prefix, "p" the port's and "c" that of what ports share.
inline std::string answer_envelope(const std::string &content, const std::string &uri = ENVELOPE_11,
                                   const std::string &port = "Profile")
{
    return "<E:Envelope xmlns:E=\"" + uri +
           "\" xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\""
           " xmlns:c=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0\""
           " xmlns:p=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0/" +
           port + "\">" + content + "</E:Envelope>";
}

struct profile_call {
    explicit profile_call(std::uint32_t mode = MODE_KEEP_ALIVE) : proxy(static_cast<int>(mode))
    {
        wire.carry(proxy);
    }
    int get() { return proxy.get(&request, got); }
    int get(const std::string &answer)
    {
        wire.answers.push_back(answer);
        return get();
    }

    call_wire wire;
    ProfileSoapBindingProxy proxy;
    _protocolProfile__getRequest request;
    __protocolProfile__getResponse got{};
    __protocolProfile__setResponse held{}; // what set gives
};
