// tcp_client.h - what the tests of sockets say often: connect, receive, look at an option or a failure.
#pragma once

#include "support/loopback.h"
#include "support/socket_calls.h"

namespace tcp_clients {

using loopback::context;

class socket_test : public loopback::descriptor_test {
protected:
    void TearDown() override
    {
        socket_calls::reset();
        descriptor_test::TearDown();
    }
};

inline int open_to(context &ctx, int port, const char *host = "127.0.0.1")
{
    return tcp_connect(ctx.get(), "http://peer/", host, port);
}

inline std::string receive(context &ctx)
{
    char buffer[256];
    return std::string(buffer, tcp_recv(ctx.get(), buffer, sizeof buffer));
}

inline void wait_for_end(int socket)
{
    char byte;
    while (read(socket, &byte, 1) > 0) {
    }
}

inline int option_of(int socket, int level, int name)
{
    int value = -1;
    socklen_t size = sizeof value;
    getsockopt(socket, level, name, &value, &size);
    return value;
}

inline void expect_failure(context &ctx, int error, const char *text, const char *detail)
{
    EXPECT_EQ(ctx->error, error);
    EXPECT_EQ(ctx->socket, -1);
    EXPECT_EQ(ctx.fault_text(), text);
    EXPECT_EQ(ctx.fault_detail(), detail);
}

} // namespace tcp_clients
