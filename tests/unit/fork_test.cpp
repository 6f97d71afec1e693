// fork_test.cpp - a host that forks: the child's calls and ends leave the parent's connections alone.

#include <zuv_client_pro/soap_report.h>

#include "support/scripted_client.h"
#include "support/socket_calls.h"

namespace {

using namespace scripted;
using loopback::context;

constexpr int CHILD_LIMIT_S = 30;
constexpr int NOTHING_SAID = 77; // exit status of a child whose calls all brought their own answers

// The connections that a child makes, and what it does; false: something isn't as it should be.
const std::tuple<const char *, int, std::function<bool(std::unique_ptr<client> &)>> CHILDREN[] = {
    {"calls twice on the inherited proxy", 1,
     [](std::unique_ptr<client> &own) { return own->call() == 0 && own->call() == 0; }},
    {"lets go of it", 0, [](std::unique_ptr<client> &own) { return own.reset(), true; }},
    {"closes it and calls", 1,
     [](std::unique_ptr<client> &own) {
         own->proxy.keep_alive = 0;
         return own->proxy.soap_close_socket() == 0 && own->proxy.socket == -1 && own->call() == 0;
     }},
    {"closes it by force and calls", 1,
     [](std::unique_ptr<client> &own) {
         return own->proxy.soap_force_close_socket() == 0 && own->call() == 0;
     }},
    {"can't cancel until it is armed itself", 1,
     [](std::unique_ptr<client> &own) {
         const bool armed = soap_call_report(&own->proxy) == nullptr || soap_cancel(&own->proxy);
         return !armed && soap_cancel_arm(&own->proxy) == SOAP_OK && own->call() == 0;
     }},
    {"calls on a copy", 1, [](std::unique_ptr<client> &own) { return client(*own).call() == 0; }},
};

[[noreturn]] void be_child(const std::function<bool()> &work)
{
    alarm(CHILD_LIMIT_S);
    _exit(work() ? NOTHING_SAID : 1);
}

class forked : public tls_peers::tls_test {};

TEST_F(forked, a_child_leaves_the_connections_of_its_parent_alone)
{
    for (const bool tls : {false, true})
        for (const auto &[rule, connections, act] : CHILDREN) {
            SCOPED_TRACE(std::string(rule) + (tls ? ", TLS" : ", plain"));
            const crowd_server server(tls);
            auto own = std::make_unique<client>(server);
            ASSERT_EQ(soap_cancel_arm(&own->proxy), SOAP_OK);
            ASSERT_EQ(own->call(), 0);
            const int socket = own->proxy.socket;
            const pid_t child = fork();
            if (child == 0)
                be_child([&, act = act] {
                    const bool right = act(own);
                    own.reset();
                    return right;
                });
            expect_exit(child, NOTHING_SAID);
            EXPECT_EQ(own->call(), 0);
            EXPECT_EQ(own->proxy.socket, socket);
            EXPECT_EQ(own->connections, 1) << "the parent's connection goes on";
            EXPECT_EQ(server.connections(), 1 + connections);
        }
}

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
    expect_exit(child, NOTHING_SAID);
}

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
    expect_exit(child, NOTHING_SAID);
}

} // namespace
