// threads_test.cpp - proxies on threads of their own: no call takes another's answer, and nothing that they
// share is written without order. In an ordinary build this looks at the answers; the preset "tsan" looks at
// the memory as well.

#include "support/scripted_client.h"
#include "support/socket_calls.h"

namespace {

using namespace scripted;

constexpr int THREADS = 8;
constexpr int CALLS = 40; // of each thread
constexpr int ANEW = 10;  // one call in so many goes over a new connection

const char COUNTER[] = "receive-counter";

struct counter {
    std::atomic<long> received = 0;
    std::atomic<int> contexts = 0; // that are to let go of it
    std::size_t (*receive)(soap *, char *, std::size_t) = nullptr;
};

std::size_t count_received(soap *ctx, char *buffer, std::size_t length)
{
    counter &own = *static_cast<counter *>(soap_plugin_lookup(ctx, COUNTER));
    const std::size_t size = own.receive(ctx, buffer, length);
    own.received += static_cast<long>(size);
    return size;
}

void let_go(soap *, soap_plugin_record *record)
{
    --static_cast<counter *>(record->data)->contexts;
}

// All copies count in one record of the host's.
int share(soap *ctx, soap_plugin_record *record, void *argument)
{
    counter &own = *static_cast<counter *>(argument);
    record->id = COUNTER;
    record->data = &own;
    record->delete_hook = let_go;
    own.receive = ctx->on_recv;
    own.contexts = 1;
    ctx->on_recv = count_received;
    return SOAP_OK;
}

// The same, and each copy says that there is one more.
int share_and_note(soap *ctx, soap_plugin_record *record, void *argument)
{
    record->copy_hook = [](soap *, soap_plugin_record *target, soap_plugin_record *) {
        ++static_cast<counter *>(target->data)->contexts;
        return 0;
    };
    return share(ctx, record, argument);
}

void on_threads(const std::function<void()> &work)
{
    std::atomic<int> missing = THREADS; // outlives the threads, which its end would not wait for
    std::vector<std::jthread> threads;
    threads.reserve(THREADS);
    for (int i = 0; i < THREADS; ++i)
        threads.emplace_back([&] {
            --missing;
            while (missing > 0)
                std::this_thread::yield();
            work();
        });
}

// Calls of one client, some on its kept connection and some on new ones.
void call_all(client &own)
{
    for (int i = 0; i < CALLS; ++i) {
        if (i % ANEW == 0) {
            EXPECT_EQ(own.proxy.soap_force_close_socket(), 0);
        }
        EXPECT_EQ(own.call(100), 0) << own.proxy.soap_fault_string();
    }
    EXPECT_EQ(own.connections, CALLS / ANEW);
}

class proxy_threads : public tls_peers::tls_test, public testing::WithParamInterface<bool> {};

TEST_P(proxy_threads, call_by_proxies_of_their_own)
{
    const crowd_server server(GetParam());
    on_threads([&] {
        client own(server);
        call_all(own);
    });
    EXPECT_EQ(server.connections(), THREADS * (CALLS / ANEW));
}

TEST_P(proxy_threads, call_by_copies_of_one_context_and_share_its_plug_in)
{
    const crowd_server server(GetParam());
    for (const auto create : {share, share_and_note}) {
        counter counted;
        {
            client settings(server);
            ASSERT_EQ(soap_register_plugin_arg(&settings.proxy, create, &counted), 0);
            on_threads([&] {
                client own(settings);
                call_all(own);
            });
            EXPECT_EQ(settings.connections, 0);
        }
        EXPECT_GT(counted.received, THREADS * CALLS * 100L);
        EXPECT_EQ(counted.contexts, 0);
    }
}

INSTANTIATE_TEST_SUITE_P(, proxy_threads, testing::Bool(),
                         [](const auto &row) { return std::string(row.param ? "TLS" : "plain"); });

} // namespace
