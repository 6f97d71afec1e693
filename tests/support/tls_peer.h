// tls_peer.h - TLS servers on the loopback with certificates of the test's own authority, and clients that
// trust it.
#pragma once

#include <csignal>
#include <netinet/tcp.h>
#include <openssl/ssl.h>

#include "support/certificates.h"
#include "support/loopback.h"

namespace tls_peers {

using certificates::authority;
using certificates::DAY;
using certificates::subject;
using loopback::context;
using loopback::peer;

const subject BY_NAME{"peer.test", ""};
constexpr std::uint16_t VERIFIED = TLS_VERIFY_PEER | TLS_NO_DEFAULT_CA;

inline authority &ca()
{
    static authority made;
    return made;
}

inline EVP_PKEY *server_key()
{
    static const certificates::key made = certificates::make_key();
    return made.get();
}

using server_context = std::unique_ptr<SSL_CTX, certificates::freed_by<SSL_CTX_free>>;
using server_connection = std::unique_ptr<SSL, certificates::freed_by<SSL_free>>;

inline server_context make_server_context(X509 *certificate, int version = 0)
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

inline void serve_over_tls(SSL_CTX *context, int client, const std::function<void(SSL *)> &serve)
{
    const server_connection connection(SSL_new(context));
    SSL_set_fd(connection.get(), client);
    if (SSL_accept(connection.get()) == 1)
        serve(connection.get());
}

// A TLS server. Each client that comes through the handshake is served; the others are dropped.
class tls_peer {
public:
    using service = std::function<void(SSL *)>;

    tls_peer(server_context made, service serve, int clients = 1)
        : context_(std::move(made)), peer_(
                                         [this, serve = std::move(serve)](int client) {
                                             const int on = 1;
                                             setsockopt(client, IPPROTO_TCP, TCP_NODELAY, &on, sizeof on);
                                             serve_over_tls(context_.get(), client, serve);
                                         },
                                         clients)
    {}
    int port() const { return peer_.port(); }

private:
    server_context context_;
    peer peer_;
};

// Gives each byte back until the client ends, then ends as well.
inline void echo(SSL *connection)
{
    char byte;
    while (SSL_read(connection, &byte, 1) == 1)
        SSL_write(connection, &byte, 1);
    SSL_shutdown(connection);
}

// Serves, and notes of each connection whether its session was resumed.
inline tls_peer::service noting(std::vector<int> &resumed, tls_peer::service serve = echo)
{
    return [&resumed, serve = std::move(serve)](SSL *connection) {
        resumed.push_back(SSL_session_reused(connection));
        serve(connection);
    };
}

class tls_test : public loopback::descriptor_test {
protected:
    static void SetUpTestSuite()
    {
        signal(SIGPIPE, SIG_IGN); // for the servers of the tests; the library's own test takes it back
        ca();
        const context first; // OpenSSL opens descriptors of its own at its first use
        tls_random_word();
    }
};

inline int set_up_client(context &ctx, unsigned flags = VERIFIED)
{
    static const std::string ca_file = ca().ca_file();
    return soap_ssl_client_context(ctx.get(), static_cast<std::uint16_t>(flags), nullptr, nullptr,
                                   ca_file.c_str(), nullptr, nullptr);
}

inline int open_to(context &ctx, int port, const char *host = "peer.test")
{
    return tcp_connect(ctx.get(), "https://peer/", host, port);
}

inline std::string exchange(context &ctx, const std::string &text)
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

inline server_context server_for(const subject &who, int version = 0)
{
    return make_server_context(ca().issue(who, server_key()).get(), version);
}
} // namespace tls_peers
