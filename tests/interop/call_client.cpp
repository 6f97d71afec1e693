// call_client.cpp - a host that calls Profile's create and says what came of each call, for the tests of
// servers, proxies and networks. Usage: call_client ENDPOINT [options]; see declare. A line for each call;
// the program ends with 1 if an answer isn't the one to its request, or if a descriptor is left open.
#include <cstdio>
#include <filesystem>
#include <iostream>
#include <vector>

#include <CLI/CLI.hpp>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_tls.h>

#include "support/create_call.h"

namespace {

constexpr std::size_t FAULT_LIMIT = 200; // bytes of a fault that are printed

// The engine's time limits: seconds, or microseconds if negative.
struct options {
    std::string endpoint, ca, key, password, proxy, proxy_user, user;
    bool keep_alive = false, chunked = false, gzip = false, steps = false;
    int calls = 1, connect = 0, send = 0, recv = 0, whole = 0;
    int proxy_port = 0;
    std::size_t size = 0;
    std::uint16_t tls_flags = TLS_VERIFY_PEER | TLS_NO_DEFAULT_CA;

    void declare(CLI::App &app)
    {
        app.add_option("ENDPOINT", endpoint)->required();
        app.add_option("--calls", calls, "How many calls");
        app.add_option("--size", size, "Bytes of text in each request, which come back in the answer");
        app.add_flag("--keep-alive", keep_alive, "Keep the connection");
        app.add_flag("--chunked", chunked, "Send requests in chunks");
        app.add_flag("--gzip", gzip, "Compress requests");
        app.add_flag("--steps", steps, "Wait for a line of input before each call but the first");
        app.add_option("--connect", connect, "Time limit of connecting");
        app.add_option("--send", send, "Time limit of sending");
        app.add_option("--recv", recv, "Time limit of receiving");
        app.add_option("--whole", whole, "Time limit of a whole call");
        app.add_option("--ca", ca, "Certificates to trust");
        app.add_option("--key", key, "Own certificate and key");
        app.add_option("--password", password, "Of the key");
        app.add_option("--tls-flags", tls_flags, "Flags of the TLS set-up");
        app.add_option("--proxy", proxy, "Host of a proxy");
        app.add_option("--proxy-port", proxy_port, "Its port");
        app.add_option("--proxy-user", proxy_user, "USER:PASSWORD for it");
        app.add_option("--user", user, "USER:PASSWORD for the service");
    }
    std::uint32_t mode() const
    {
        return MODE_UTF_STRINGS | (chunked ? MODE_CHUNKED : MODE_BUFFERED) |
               (keep_alive ? MODE_KEEP_ALIVE : 0) | (gzip ? MODE_DEFLATE : 0);
    }
};

const char *or_null(const std::string &text)
{
    return text.empty() ? nullptr : text.c_str();
}

// "user:password", split for the engine, which borrows both.
struct credentials {
    explicit credentials(const std::string &both)
        : user(both.substr(0, both.find(':'))), password(both.substr(both.find(':') + 1))
    {}
    std::string user, password;
};

std::ptrdiff_t open_descriptors()
{
    return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
}

class client {
public:
    explicit client(const options &o) : options_(o), user_(o.user), proxy_user_(o.proxy_user)
    {
        soap_log_set_received(&proxy_, nullptr);
        soap_log_set_sent(&proxy_, nullptr);
        proxy_.endpoint = options_.endpoint.c_str();
        proxy_.input_mode = proxy_.output_mode = options_.mode();
        proxy_.connect_timeout = options_.connect;
        proxy_.send_timeout = options_.send;
        proxy_.recv_timeout = options_.recv;
        proxy_.call_timeout = options_.whole;
        if (!options_.proxy.empty()) {
            proxy_.proxy_host = options_.proxy.c_str();
            proxy_.proxy_port = options_.proxy_port;
        }
        if (!options_.proxy_user.empty()) {
            proxy_.proxy_user = proxy_user_.user.c_str();
            proxy_.proxy_password = proxy_user_.password.c_str();
        }
        proxy_.user = this;
        open_ = proxy_.on_open;
        proxy_.on_open = [](soap *ctx, const char *endpoint, const char *host, int port) {
            client &self = *static_cast<client *>(ctx->user);
            ++self.connections_;
            return self.open_(ctx, endpoint, host, port);
        };
    }
    client(const client &) = delete;
    client &operator=(const client &) = delete;

    int run()
    {
        if (!options_.ca.empty() || !options_.key.empty())
            if (soap_ssl_client_context(&proxy_, options_.tls_flags, or_null(options_.key),
                                        or_null(options_.password), or_null(options_.ca), nullptr,
                                        nullptr) != 0)
                return proxy_.soap_print_fault(stderr), 1;
        std::string line;
        for (int i = 1; i <= options_.calls; ++i) {
            if (i > 1 && options_.steps && !std::getline(std::cin, line))
                break;
            call(i);
            if (options_.steps)
                report();
        }
        report();
        return others_answers_ == 0 ? 0 : 1;
    }

private:
    struct outcome {
        created came;
        int connection;
        std::string fault;
    };

    void call(int number)
    {
        proxy_.destroy();
        if (!options_.user.empty()) { // a received head takes them away
            proxy_.auth_user = user_.user.c_str();
            proxy_.auth_password = user_.password.c_str();
        }
        const created came =
            call_create(proxy_, "call-" + std::to_string(number), std::string(options_.size, 'x'));
        if (came.code == 0 && !(options_.size == 0 ? came.own : came.whole))
            ++others_answers_;
        outcomes_.push_back({came, connections_, came.code == 0 ? "" : fault()});
    }

    std::string fault()
    {
        const char *texts[] = {proxy_.soap_fault_string(), proxy_.soap_fault_detail()};
        std::string both;
        for (const char *text : texts)
            for (; text != nullptr && *text != '\0'; ++text)
                both += static_cast<unsigned char>(*text) < ' ' ? ' ' : *text;
        return both.substr(0, FAULT_LIMIT);
    }

    void report()
    {
        for (const outcome &o : outcomes_)
            std::printf("code=%d ms=%d connection=%d fault=%s\n", o.came.code, o.came.milliseconds,
                        o.connection, o.fault.c_str());
        std::fflush(stdout);
        outcomes_.clear();
    }

    options options_;
    credentials user_, proxy_user_;
    ProfileSoapBindingProxy proxy_;
    int (*open_)(soap *, const char *, const char *, int) = nullptr;
    int connections_ = 0, others_answers_ = 0;
    std::vector<outcome> outcomes_;
};

} // namespace

int main(int argc, char **argv)
{
    CLI::App app("Calls create of a Profile service and says what came of it");
    options o;
    o.declare(app);
    CLI11_PARSE(app, argc, argv);
    tls_random_word(); // OpenSSL keeps descriptors of its own from its first use on
    const std::ptrdiff_t before = open_descriptors();
    const int status = client(o).run();
    const std::ptrdiff_t left = open_descriptors() - before;
    std::printf("descriptors left: %td\n", left);
    return status != 0 || left != 0 ? 1 : 0;
}
