// scripted_client.h - a client of the scripted servers: whether a call brought its own answer, and by how
// many connections.
#pragma once

#include <sys/wait.h>

#include "support/create_call.h"
#include "support/scripted_server.h"

namespace scripted {

constexpr int GUARD_S = 10;         // time limit of transfers where none should be met
constexpr int OTHERS_ANSWER = 9999; // in place of a code

class client {
public:
    template <class Server> explicit client(const Server &to) : endpoint(to.endpoint())
    {
        proxy.input_mode = proxy.output_mode = MODE_KEEP_ALIVE;
        proxy.connect_timeout = proxy.send_timeout = proxy.recv_timeout = GUARD_S;
        open_ = proxy.on_open;
        proxy.on_open = count_and_open;
        be_own();
        if (endpoint.starts_with("https")) {
            const std::string &trusted = ca_file();
            EXPECT_EQ(soap_ssl_client_context(&proxy, tls_peers::VERIFIED, nullptr, nullptr, trusted.c_str(),
                                              nullptr, nullptr),
                      0);
        }
    }
    // A client of its own with the settings of another, as a host's threads have them.
    explicit client(const client &settings)
        : endpoint(settings.endpoint), proxy(static_cast<const soap &>(settings.proxy)), open_(settings.open_)
    {
        be_own();
    }
    client &operator=(const client &) = delete;

    // The code of one call, of this client or through a copy of its proxy. `padding`: bytes of text added.
    int call(std::size_t padding = 0) { return call_through(proxy, padding); }
    int call_through(ProfileSoapBindingProxy &any, std::size_t padding = 0)
    {
        any.destroy();
        any.endpoint = endpoint.c_str();
        const created came = call_create(any, "call-" + std::to_string(++names_), std::string(padding, 'p'));
        milliseconds = came.milliseconds;
        return came.code == 0 && !came.own ? OTHERS_ANSWER : came.code;
    }

    std::string endpoint;
    ProfileSoapBindingProxy proxy;
    int connections = 0, milliseconds = 0;

private:
    void be_own()
    {
        soap_log_set_received(&proxy, nullptr);
        soap_log_set_sent(&proxy, nullptr);
        proxy.user = this;
    }
    static int count_and_open(soap *ctx, const char *url, const char *host, int port)
    {
        client &self = *static_cast<client *>(ctx->user);
        ++self.connections;
        return self.open_(ctx, url, host, port);
    }
    static const std::string &ca_file()
    {
        static const std::string path = tls_peers::ca().ca_file();
        return path;
    }
    int (*open_)(soap *, const char *, const char *, int) = nullptr;
    inline static std::atomic<int> names_ = 1000000; // no two clients say the same, and none says more
};

inline void expect_exit(pid_t child, int status)
{
    int ended = 0;
    EXPECT_EQ(waitpid(child, &ended, 0), child);
    EXPECT_EQ(ended, status << 8);
}

} // namespace scripted
