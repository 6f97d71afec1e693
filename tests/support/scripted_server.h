// scripted_server.h - a server that answers calls of Profile's create as a test has it, over TCP or TLS. An
// answer shows whose it is: the name in the request comes back in it.
#pragma once

#include <atomic>

#include "support/tls_peer.h"

namespace scripted {

constexpr const char *REQUEST_END = "</SOAP-ENV:Envelope>";

// The server's end of one connection.
class line {
public:
    line(int socket, SSL *tls) : socket_(socket), tls_(tls)
    {
        const int on = 1;
        setsockopt(socket_, IPPROTO_TCP, TCP_NODELAY, &on, sizeof on);
    }

    // A request to its end; empty when the client has ended.
    std::string request()
    {
        std::string text;
        char bytes[4096];
        for (int count; text.find(REQUEST_END) == text.npos;
             text.append(bytes, static_cast<std::size_t>(count)))
            if ((count = read(bytes, sizeof bytes)) <= 0)
                return {};
        return text;
    }
    // So many bytes, or fewer when the client has ended.
    std::string bytes(std::size_t length)
    {
        std::string all(length, '\0');
        std::size_t have = 0;
        for (int count = 1; have < length && count > 0; have += static_cast<std::size_t>(std::max(count, 0)))
            count = read(all.data() + have, static_cast<int>(length - have));
        return all.substr(0, have);
    }
    bool send(const std::string &bytes) // false: the client has ended
    {
        return (tls_ && !bytes.empty()
                    ? SSL_write(tls_, bytes.data(), static_cast<int>(bytes.size()))
                    : static_cast<int>(::send(socket_, bytes.data(), bytes.size(), MSG_NOSIGNAL))) > 0;
    }
    void await_end()
    {
        char bytes[4096];
        while (read(bytes, sizeof bytes) > 0) {
        }
    }
    void end() { shutdown(socket_, SHUT_WR); }
    void reset()
    {
        const linger at_once{1, 0};
        setsockopt(socket_, SOL_SOCKET, SO_LINGER, &at_once, sizeof at_once);
    }

private:
    int read(char *bytes, int size)
    {
        return tls_ ? SSL_read(tls_, bytes, size)
                    : static_cast<int>(::read(socket_, bytes, static_cast<std::size_t>(size)));
    }
    int socket_;
    SSL *tls_;
};

// The name that a request gives, such as "call-7".
inline std::string name_in(const std::string &request)
{
    const std::size_t at = request.find(">call-");
    return at == request.npos ? "" : request.substr(at + 1, request.find('<', at) - at - 1);
}

inline std::string answer_body(const std::string &name)
{
    return "<?xml version=\"1.0\"?>\n<E:Envelope xmlns:E=\"http://schemas.xmlsoap.org/soap/envelope/\""
           " xmlns:p=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0/Profile\""
           " xmlns:c=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0\"><E:Body><p:createResponse>"
           "<c:identity><c:name>" +
           name + "</c:name></c:identity></p:createResponse></E:Body></E:Envelope>\n";
}

inline std::string head(const std::string &more, const std::string &status = "HTTP/1.1 200 OK")
{
    return status + "\r\nContent-Type: text/xml; charset=utf-8\r\n" + more + "\r\n";
}

inline std::string with_length(const std::string &body)
{
    return head("Content-Length: " + std::to_string(body.size()) + "\r\n") + body;
}

inline std::string in_chunks(const std::string &body)
{
    return head("Transfer-Encoding: chunked\r\n") + in_chunks_of(100, body);
}

// The whole answer to a request, as a healthy server gives it.
inline std::string answer_to(const std::string &request)
{
    return with_length(answer_body(name_in(request)));
}

inline void serve_well(line &client)
{
    for (std::string request; !(request = client.request()).empty();)
        client.send(answer_to(request));
}

// The first connection goes as `first` has it, all later ones well. Acceptor: a peer, which serves one client
// after the other, or a crowd.
template <class Acceptor> class basic_server {
public:
    explicit basic_server(std::function<void(line &)> first, bool tls = false)
        : context_(tls ? tls_peers::server_for(tls_peers::BY_NAME) : nullptr),
          peer_([this, first = std::move(first)](int client) { serve(client, first); }, 1000000)
    {}
    int port() const { return peer_.port(); }
    std::string endpoint() const
    {
        return (context_ ? "https://peer.test:" : "http://peer.test:") + std::to_string(port()) + "/";
    }
    int connections() const { return connections_; }

private:
    void serve(int client, const std::function<void(line &)> &first)
    {
        const auto serve = [&, script = connections_++ == 0 ? first : WELL](SSL *tls) {
            line end(client, tls);
            script(end);
            if (tls && SSL_get_shutdown(tls) != 0)
                SSL_shutdown(tls);
        };
        context_ ? tls_peers::serve_over_tls(context_.get(), client, serve) : serve(nullptr);
    }
    inline static const std::function<void(line &)> WELL = serve_well;
    std::atomic<int> connections_ = 0;
    tls_peers::server_context context_;
    Acceptor peer_;
};
using server = basic_server<loopback::peer>;

class crowd_server : public basic_server<loopback::crowd> {
public:
    explicit crowd_server(bool tls) : basic_server(serve_well, tls) {}
};

} // namespace scripted
