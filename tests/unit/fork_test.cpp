// fork_test.cpp - a host that forks: the child's calls and ends leave the parent's connections alone.
#include <sys/wait.h>
#include <unistd.h>

#include <zuv_client_pro/soap_report.h>

#include "support/scripted_client.h"
#include "support/socket_calls.h"

namespace {

using namespace scripted;
using loopback::context;

constexpr int CHILD_LIMIT_S = 30;
constexpr int NOTHING_SAID = 77; // exit status of a child whose calls all brought their own answers

struct child_row {
    const char *rule;
    std::function<bool(std::unique_ptr<client> &)> act; // in the child; false: not as it should be
    int connections;                                    // that the child makes
};

const child_row CHILDREN[] = {
    {"calls twice on the inherited proxy",
     [](std::unique_ptr<client> &own) { return own->call() == 0 && own->call() == 0; }, 1},
    {"lets go of it", [](std::unique_ptr<client> &own) { return own.reset(), true; }, 0},
    {"closes it and calls",
     [](std::unique_ptr<client> &own) {
         own->proxy.keep_alive = 0;
         return own->proxy.soap_close_socket() == 0 && own->proxy.socket == -1 && own->call() == 0;
     },
     1},
    {"closes it by force and calls",
     [](std::unique_ptr<client> &own) {
         return own->proxy.soap_force_close_socket() == 0 && own->call() == 0;
     },
     1},
    {"can't cancel until it is armed itself",
     [](std::unique_ptr<client> &own) {
         const bool armed = soap_call_report(&own->proxy) == nullptr || soap_cancel(&own->proxy);
         return !armed && soap_cancel_arm(&own->proxy) == SOAP_OK && own->call() == 0;
     },
     1},
    {"calls on a copy", [](std::unique_ptr<client> &own) { return client(*own).call() == 0; }, 1},
};

// In the child: does the work, and ends.
[[noreturn]] void be_child(const std::function<bool()> &work)
{
    alarm(CHILD_LIMIT_S);
    _exit(work() ? NOTHING_SAID : 1);
}

void expect_right(pid_t child)
{
    int status = 0;
    EXPECT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, NOTHING_SAID << 8);
}

class forked : public tls_peers::tls_test {};

TEST_F(forked, a_child_leaves_the_connections_of_its_parent_alone)
{
    for (const bool tls : {false, true})
        for (const child_row &row : CHILDREN) {
            SCOPED_TRACE(std::string(row.rule) + (tls ? ", TLS" : ", plain"));
            const crowd_server server(tls);
            auto own = std::make_unique<client>(server);
            ASSERT_EQ(soap_cancel_arm(&own->proxy), SOAP_OK);
            ASSERT_EQ(own->call(), 0);
            const int socket = own->proxy.socket;
            const pid_t child = fork();
            if (child == 0)
                be_child([&] {
                    const bool right = row.act(own);
                    own.reset();
                    return right;
                });
            expect_right(child);
            EXPECT_EQ(own->call(), 0);
            EXPECT_EQ(own->proxy.socket, socket);
            EXPECT_EQ(own->connections, 1) << "the parent's connection goes on";
            EXPECT_EQ(server.connections(), 1 + row.connections);
        }
}

// A host that cancels, and forks before the call has ended.
TEST_F(forked, a_child_made_in_a_cancelled_call_makes_calls_of_its_own)
{
    static pid_t child;
    const crowd_server server(false);
    auto own = std::make_unique<client>(server);
    ASSERT_EQ(soap_cancel_arm(&own->proxy), SOAP_OK);
    own->proxy.call_timeout = CHILD_LIMIT_S; // so that each wait asks whether it may go on
    own->proxy.on_connect = [](soap *ctx, const char *, const char *, int) -> int {
        soap_cancel(ctx);
        child = fork();
        return child == 0 ? SOAP_USER_ERROR : SOAP_OK;
    };
    const int error = own->call();
    if (child == 0)
        be_child([&] {
            own->proxy.on_connect = nullptr;
            const bool right = error != 0 && own->call() == 0;
            own.reset();
            return right;
        });
    EXPECT_NE(error, 0);
    EXPECT_EQ(soap_call_report(&own->proxy)->ended_by, ENDED_BY_CANCEL);
    expect_right(child);
}

// The pattern of servers that fork for each client.
TEST_F(forked, a_child_serves_the_client_that_its_parent_accepted)
{
    context serving;
    ASSERT_GE(soap_bind(serving.get(), "127.0.0.1", 0, 1), 0);
    context caller;
    ASSERT_GE(
        tcp_connect(caller.get(), "http://peer/", "127.0.0.1", loopback::port_of(serving->master_socket)), 0);
    ASSERT_GE(soap_accept(serving.get()), 0);
    const pid_t child = fork();
    if (child == 0)
        be_child(
            [&] { return tcp_send(serving.get(), "hello", 5) == 0 && tcp_disconnect(serving.get()) == 0; });
    EXPECT_EQ(soap_force_close(serving.get()), 0);
    EXPECT_EQ(loopback::read_bytes(caller->socket, 100), "hello");
    expect_right(child);
}

} // namespace
