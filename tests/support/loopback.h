// loopback.h - what tests of the transport share: peers on the loopback, a context, a count of open descriptors.
#pragma once

#include <arpa/inet.h>
#include <list>
#include <netinet/in.h>
#include <sys/socket.h>
#include <thread>
#include <unistd.h>

#include "support/testing.h"

namespace loopback {

// A context of the test's own, without a trace file; ended with all it holds.
class context {
public:
    explicit context(std::uint32_t mode = 0) : ctx_(std::make_unique<soap>(mode))
    {
        soap_log_set_received(ctx_.get(), nullptr);
        soap_log_set_sent(ctx_.get(), nullptr);
    }
    soap *get() { return ctx_.get(); }
    soap *operator->() { return ctx_.get(); }
    std::string fault_text() { return text_of(*soap_fault_string_field(ctx_.get())); }
    std::string fault_detail() { return text_of(soap_fault_detail_value(ctx_.get())); }

private:
    std::unique_ptr<soap> ctx_;
};

inline int port_of(int socket)
{
    sockaddr_in address{};
    socklen_t size = sizeof address;
    getsockname(socket, reinterpret_cast<sockaddr *>(&address), &size);
    return ntohs(address.sin_port);
}

// A socket bound to 127.0.0.1 or another address of the loopback; port 0: a free one.
class bound_socket {
public:
    explicit bound_socket(int type = SOCK_STREAM, int backlog = 16, const char *host = "127.0.0.1",
                          int port = 0)
        : socket_(::socket(AF_INET, type | SOCK_CLOEXEC, 0))
    {
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = inet_addr(host);
        address.sin_port = htons(static_cast<std::uint16_t>(port));
        EXPECT_EQ(bind(socket_, reinterpret_cast<sockaddr *>(&address), sizeof address), 0);
        if (type == SOCK_STREAM) {
            EXPECT_EQ(listen(socket_, backlog), 0);
        }
    }
    ~bound_socket() { close(socket_); }
    bound_socket(const bound_socket &) = delete;
    bound_socket &operator=(const bound_socket &) = delete;

    int socket() const { return socket_; }
    int port() const { return port_of(socket_); }

private:
    int socket_;
};

// A server thread: `serve` gets each client's socket in turn, which is closed after it. Declare it before
// the context that talks to it. Its end waits for the client that is being served.
class peer {
public:
    explicit peer(std::function<void(int)> serve, int clients = 1)
        : thread_([this, serve = std::move(serve), clients] {
              for (int i = 0; i < clients; ++i) {
                  const int client = accept(listener_.socket(), nullptr, nullptr);
                  if (client < 0)
                      return;
                  serve(client);
                  close(client);
              }
          })
    {}
    ~peer()
    {
        shutdown(listener_.socket(), SHUT_RDWR); // wakes a thread to which no client has come
        thread_.join();
    }
    int port() const { return listener_.port(); }

private:
    bound_socket listener_;
    std::thread thread_;
};

// A peer that serves all its clients at the same time, each on a thread. Its end waits for those being served.
class crowd {
public:
    crowd(std::function<void(int)> serve, int clients)
        : peer_(
              [this, serve = std::move(serve)](int client) {
                  served_.emplace_back([serve, own = dup(client)] {
                      serve(own);
                      close(own);
                  });
              },
              clients)
    {}
    int port() const { return peer_.port(); }

private:
    std::list<std::jthread> served_;
    peer peer_;
};

// Reads until the peer ends, or `length` bytes.
inline std::string read_bytes(int socket, std::size_t length)
{
    std::string bytes(length, '\0');
    std::size_t have = 0;
    while (have < length) {
        const ssize_t count = read(socket, bytes.data() + have, length - have);
        if (count <= 0)
            break;
        have += static_cast<std::size_t>(count);
    }
    bytes.resize(have);
    return bytes;
}

inline void write_text(int socket, const std::string &text)
{
    EXPECT_EQ(send(socket, text.data(), text.size(), MSG_NOSIGNAL), static_cast<ssize_t>(text.size()));
}

inline std::string read_head(int socket)
{
    std::string head;
    char byte;
    while (!head.ends_with("\r\n\r\n") && read(socket, &byte, 1) == 1)
        head += byte;
    return head;
}

inline std::ptrdiff_t open_descriptors()
{
    return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
}

// Each test ends with as many open descriptors as it began with.
class descriptor_test : public testing::Test {
protected:
    void SetUp() override { before_ = open_descriptors(); }
    void TearDown() override { EXPECT_EQ(open_descriptors(), before_); }

private:
    std::ptrdiff_t before_ = 0;
};

} // namespace loopback
