// host_conditions_test.cpp - what a host does to its own process doesn't reach a call. Elsewhere: a host that
// forks (fork_test.cpp), its locale and its floating point mode (number_test.cpp).
#include <pthread.h>
#include <sys/resource.h>

#include <zuv_client_pro/soap_report.h>

#include "support/scripted_client.h"
#include "support/socket_calls.h"

namespace {

using namespace scripted;

constexpr int CHILD_LIMIT_S = 120;    // qemu is slow
constexpr std::size_t LARGE = 300000; // bytes of text in a request, and in the name that comes back
constexpr int SILENCE_US = 200000;

bool calls_well(client &own)
{
    return own.call() == 0 && own.call(LARGE) == 0 && own.connections == 1;
}

bool on_thread(std::size_t stack_bytes, std::function<bool()> work)
{
    pthread_attr_t attributes;
    pthread_attr_init(&attributes);
    pthread_attr_setstacksize(&attributes, stack_bytes);
    pthread_t thread;
    const auto run = [](void *given) -> void * {
        return (*static_cast<std::function<bool()> *>(given))() ? given : nullptr;
    };
    void *right = nullptr;
    return pthread_create(&thread, &attributes, run, &work) == 0 && pthread_join(thread, &right) == 0 &&
           right != nullptr;
}

bool limit_files(rlim_t count)
{
    rlimit limit{};
    getrlimit(RLIMIT_NOFILE, &limit);
    limit.rlim_cur = count;
    limit.rlim_max = std::max(limit.rlim_max, count);
    return setrlimit(RLIMIT_NOFILE, &limit) == 0;
}

bool open_many_files()
{
    int last = 0;
    while (limit_files(2000) && last >= 0 && last < 1100)
        last = open("/dev/null", O_RDONLY | O_CLOEXEC);
    return last >= 1100;
}

// In each call from here on the clock goes back before the request is sent.
void set_clock_back(client &own)
{
    own.proxy.on_send = [](soap *ctx, const char *data, std::size_t length) {
        socket_calls::set_back_s = 3600;
        return tcp_send(ctx, data, length);
    };
}

struct host_row {
    const char *rule;
    bool (*call)(client &own); // in a process of its own; false: not as it should be
};

const host_row HOSTS[] = {
    {"without standard streams",
     [](client &own) { return close(0) == 0 && close(1) == 0 && close(2) == 0 && calls_well(own); }},
    {"on a thread with a small stack",
     [](client &own) { return on_thread(std::size_t{256} << 10, [&] { return calls_well(own); }); }},
    {"with 64 files at most",
     [](client &own) {
         bool right = limit_files(64) && calls_well(own);
         for (int i = 0; right && i < 100; ++i) // each opens what it needs anew
             right = own.proxy.soap_force_close_socket() == 0 && own.call() == 0;
         return right;
     }},
    {"with its traces on a full disk",
     [](client &own) {
         soap_log_set_sent(&own.proxy, "/dev/full");
         soap_log_set_received(&own.proxy, "/dev/full");
         return calls_well(own);
     }},
    {"in a folder that is gone",
     [](client &own) {
         char folder[] = "/tmp/host_conditions_XXXXXX";
         const bool gone = mkdtemp(folder) != nullptr && chdir(folder) == 0 && rmdir(folder) == 0;
         soap_log_set_sent(&own.proxy, "trace.log");
         return gone && calls_well(own);
     }},
    {"whose clock goes back",
     [](client &own) { return set_clock_back(own), own.proxy.call_timeout = GUARD_S, calls_well(own); }},
    {"with an alarm a millisecond",
     [](client &own) {
         struct sigaction action {};
         action.sa_handler = [](int) {};
         const itimerval often{{0, 1000}, {0, 1000}};
         bool right =
             sigaction(SIGALRM, &action, nullptr) == 0 && setitimer(ITIMER_REAL, &often, nullptr) == 0;
         for (const int limit : {GUARD_S, 0}) {
             own.proxy.send_timeout = own.proxy.recv_timeout = limit;
             right = right && calls_well(own);
         }
         return right;
     }},
    {"that dies of SIGPIPE, whose peer went away",
     [](client &own) {
         signal(SIGPIPE, SIG_DFL);
         if (own.call() != 0)
             return false;
         shutdown(own.proxy.socket, SHUT_WR); // what is sent now is what a peer that went away leaves
         own.proxy.on_poll = [](soap *) { return 0; };
         return own.call(LARGE) == SOAP_EOF && own.call() == 0;
     }},
    {"with 1,100 open files, waiting with select",
     [](client &own) {
         return open_many_files() && own.call() == SOAP_FD_EXCEEDED && own.proxy.socket == -1 &&
                soap_cancel_arm(&own.proxy) == SOAP_FD_EXCEEDED;
     }},
    {"with 1,100 open files, waiting with poll",
     [](client &own) {
         own.proxy.wait_with_poll = 1;
         return open_many_files() && soap_cancel_arm(&own.proxy) == SOAP_OK && calls_well(own) &&
                own.proxy.socket > 1100;
     }},
    {"that took poll back with a large socket open",
     [](client &own) {
         own.proxy.wait_with_poll = 1;
         const bool before = open_many_files() && soap_cancel_arm(&own.proxy) == SOAP_OK && own.call() == 0;
         own.proxy.wait_with_poll = 0;
         return before && own.call() == SOAP_FD_EXCEEDED;
     }},
};

// The same where the answer doesn't come: a limit, or another thread, ends the call.
bool ends(client &own, soap_ending by, int least_ms = SILENCE_US / 2000)
{
    const int code = own.call();
    return (code == SOAP_EOF || (code == SOAP_TCP_ERROR && by == ENDED_BY_CANCEL)) &&
           own.milliseconds >= least_ms && own.milliseconds < GUARD_S * 500 &&
           soap_call_report(&own.proxy)->ended_by == by;
}

const host_row SILENT[] = {
    {"whose clock goes back, until recv_timeout",
     [](client &own) {
         return set_clock_back(own), own.proxy.recv_timeout = -SILENCE_US, ends(own, ENDED_BY_RECV_LIMIT);
     }},
    {"whose clock goes back, until call_timeout",
     [](client &own) {
         return set_clock_back(own), own.proxy.call_timeout = -SILENCE_US, ends(own, ENDED_BY_CALL_LIMIT);
     }},
    {"with 1,100 open files, until recv_timeout",
     [](client &own) {
         own.proxy.wait_with_poll = 1;
         own.proxy.recv_timeout = -SILENCE_US;
         return open_many_files() && ends(own, ENDED_BY_RECV_LIMIT);
     }},
    {"with 1,100 open files, until it is cancelled",
     [](client &own) {
         own.proxy.wait_with_poll = 1;
         if (!open_many_files() || soap_cancel_arm(&own.proxy) != SOAP_OK)
             return false;
         const std::jthread other([&own] {
             while (!soap_cancel(&own.proxy))
                 std::this_thread::yield();
         });
         return ends(own, ENDED_BY_CANCEL, 0);
     }},
};

class host_conditions : public tls_peers::tls_test {};

template <class Server> void expect_right(const host_row &row, const Server &server)
{
    SCOPED_TRACE(row.rule);
    const pid_t child = fork();
    if (child == 0) {
        if (std::string_view(row.rule).find("alarm") == std::string_view::npos)
            alarm(CHILD_LIMIT_S);
        auto own = std::make_unique<client>(server);
        const bool right = row.call(*own);
        if (!right)
            std::fprintf(stderr, "error %d: %s\n", own->proxy.error, own->proxy.soap_fault_string());
        own.reset();
        _exit(right ? 0 : 1);
    }
    expect_exit(child, 0);
}

TEST_F(host_conditions, do_not_reach_a_call)
{
    for (const bool tls : {false, true}) {
        SCOPED_TRACE(tls ? "TLS" : "plain");
        const crowd_server server(tls);
        for (const host_row &row : HOSTS)
            expect_right(row, server);
    }
}

TEST_F(host_conditions, do_not_reach_its_end)
{
    for (const bool tls : {false, true})
        for (const host_row &row : SILENT) {
            SCOPED_TRACE(tls ? "TLS" : "plain");
            expect_right(row, server([](line &peer) { peer.await_end(); }, tls));
        }
}

#ifdef ZUV_PLUGIN
long resident_kb()
{
    long pages = 0, resident = 0;
    std::ifstream("/proc/self/statm") >> pages >> resident;
    return resident * (sysconf(_SC_PAGESIZE) / 1024);
}

// Each unloading takes a hook of fork, callbacks of OpenSSL and thread storage of the library's with it. So many that
// what is used up by the way, such as OpenSSL's 128 kinds of BIO, runs out.
TEST_F(host_conditions, a_plug_in_with_a_library_of_its_own_comes_and_goes)
{
    constexpr int TIMES = 300, SETTLED = 50;
    const server server(serve_well, true); // a thread for all connections
    const std::string ca_file = tls_peers::ca().ca_file();
    const std::string endpoint = "https://127.0.0.1:" + std::to_string(server.port()) + "/";
    long settled_kb = 0;
    for (int i = 0; i < TIMES; ++i) {
        void *const plugin = dlopen(ZUV_PLUGIN, RTLD_NOW | RTLD_LOCAL);
        ASSERT_NE(plugin, nullptr) << dlerror();
        const auto call = reinterpret_cast<int (*)(const char *, const char *, const void **)>(
            dlsym(plugin, "plugin_call"));
        const void *init = nullptr;
        ASSERT_EQ(call(endpoint.c_str(), ca_file.c_str(), &init), 0) << i;
        EXPECT_NE(init, reinterpret_cast<const void *>(&soap_context_init)) << "not the host's library";
        ASSERT_EQ(dlclose(plugin), 0);
        ASSERT_EQ(dlopen(ZUV_PLUGIN, RTLD_NOW | RTLD_NOLOAD), nullptr) << "it is gone";
        if (i == SETTLED)
            settled_kb = resident_kb();
    }
    EXPECT_LE(resident_kb() - settled_kb, 1024);
    EXPECT_EQ(client(server).call(), 0) << "the host's own copy goes on";
    const pid_t child = fork(); // with the hooks of libraries that are gone
    if (child == 0)
        _exit(0);
    expect_exit(child, 0);
}
#endif

} // namespace
