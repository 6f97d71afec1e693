// soak_test.cpp - one proxy, very many calls: it stays as small and as fast as it was at the beginning, and
// so does the reference service. Elsewhere: calls in memory, by their allocations (call_allocation_test.cpp).
// ZUV_SOAK_CALLS in the environment: how many calls each test makes.

#include "support/scripted_client.h"
#include "support/socket_calls.h"

namespace {

constexpr int CALLS = 60000;
constexpr int STRETCHES = 20; // after the first of them nothing is made for the first time any more
constexpr int ANEW = 100;     // one call in so many goes over a new connection
constexpr std::ptrdiff_t BLOCK_LIMIT =
    20; // by which the blocks held may differ: of a session, of a random state
// Of processor time per call. 1.53 was measured with another program on the same cores, with flat memory; a
// cost that grows with the calls made grows to a multiple in so many.
constexpr double SLOWDOWN_LIMIT = 2.5;

int calls()
{
    const char *wanted = std::getenv("ZUV_SOAK_CALLS");
    return std::max(STRETCHES * ANEW, wanted == nullptr ? CALLS : std::atoi(wanted));
}

// What must not grow of a process.
struct footprint {
    long kilobytes = 0;
    std::ptrdiff_t descriptors = 0;
};

// By how much it may: a single block lost in each call comes to 2000 KB. The service may have one more
// connection open, and threads with memory of their own, when the last one's end is still under way.
constexpr footprint OUR_SLACK{200, 0}, SERVICE_SLACK{1000, 4};

footprint footprint_of(pid_t process)
{
    const std::string place = "/proc/" + std::to_string(process);
    std::ifstream file(place + "/statm");
    long pages = 0, resident_pages = 0;
    file >> pages >> resident_pages;
    EXPECT_GT(resident_pages, 0) << place;
    return {resident_pages * sysconf(_SC_PAGESIZE) / 1024,
            std::distance(std::filesystem::directory_iterator(place + "/fd"), {})};
}

// A zuv-service on a free port, with a folder of its own; both are gone at the end.
class service_process {
public:
    service_process()
        : folder_(std::filesystem::temp_directory_path() / "zuv-soak-XXXXXX"), made_(mkdtemp(folder_.data())),
          output_(popen(
              ("echo $$; exec " ZUV_SERVICE_PROGRAM " --port 0 --database " + folder_ + "/d.db").c_str(),
              "r"))
    {
        EXPECT_EQ(std::fscanf(output_, "%d listening on http://%*[^:]:%d", &pid_, &port_), 2);
    }
    ~service_process()
    {
        if (output_ != nullptr)
            end(SIGKILL);
        std::filesystem::remove_all(folder_);
    }
    service_process(const service_process &) = delete;
    service_process &operator=(const service_process &) = delete;

    int port() const { return port_; } // 0: it did not start
    pid_t pid() const { return pid_; }
    // Its exit status as waitpid gives it.
    int end(int signal)
    {
        kill(pid_, signal);
        return pclose(std::exchange(output_, nullptr));
    }

private:
    std::string folder_;
    const char *made_;
    std::FILE *output_;
    int pid_ = 0, port_ = 0;
};

// A process that is looked at after each stretch.
class watched {
public:
    watched(const char *name, pid_t process, footprint slack) : name_(name), process_(process), slack_(slack)
    {}
    void settle() { settled_ = largest_ = footprint_of(process_); }
    void look()
    {
        const footprint now = footprint_of(process_);
        largest_.kilobytes = std::max(largest_.kilobytes, now.kilobytes);
        largest_.descriptors = std::max(largest_.descriptors, now.descriptors);
    }
    void print() const { std::printf(", %s %ld KB", name_, footprint_of(process_).kilobytes); }
    void expect_flat() const
    {
        std::printf("%s: %ld KB and %td descriptors, at most %ld KB and %td\n", name_, settled_.kilobytes,
                    settled_.descriptors, largest_.kilobytes, largest_.descriptors);
        EXPECT_LE(largest_.kilobytes, settled_.kilobytes + slack_.kilobytes) << name_;
        EXPECT_LE(largest_.descriptors, settled_.descriptors + slack_.descriptors) << name_;
    }

private:
    const char *name_;
    pid_t process_;
    footprint slack_, settled_, largest_;
};

// Makes all calls; looks at memory, descriptors and the pace after each stretch. The pace is that of this
// process's processor time, in which other programs' load hardly shows; of several stretches the fastest counts.
template <class Call> void soak(Call call, pid_t service = 0)
{
    std::vector<watched> processes{{"this process", getpid(), OUR_SLACK}};
    if (service != 0)
        processes.emplace_back("the service", service, SERVICE_SLACK);
    const int all = calls(), stretch = all / STRETCHES;
    std::vector<double> paces; // seconds per call
    std::ptrdiff_t blocks = 0;
    const auto began = std::chrono::steady_clock::now();
    for (int number = 0; number < STRETCHES; ++number) {
        const std::clock_t start = std::clock();
        for (int i = number * stretch; i < (number + 1) * stretch; ++i)
            ASSERT_TRUE(call(i)) << "call " << i;
        paces.push_back(static_cast<double>(std::clock() - start) / CLOCKS_PER_SEC / stretch);
        for (watched &process : processes)
            number == 0 ? process.settle() : process.look();
        blocks = number == 0 ? failing_malloc::held() : blocks;
        const int done = (number + 1) * stretch;
        if (done % (all / 4) < stretch) {
            const std::chrono::duration<double> elapsed = std::chrono::steady_clock::now() - began;
            std::printf("  %d of %d calls, %.0f a second", done, all, done / elapsed.count());
            for (const watched &process : processes)
                process.print();
            std::puts("");
            std::fflush(stdout);
        }
    }
    const double first = *std::min_element(paces.begin(), paces.begin() + STRETCHES / 4);
    const double last = *std::min_element(paces.end() - STRETCHES / 4, paces.end());
    std::printf("processor time of a call: %.1f us, at the end %.1f us\n", first * 1e6, last * 1e6);
    EXPECT_LT(last, first * SLOWDOWN_LIMIT);
    EXPECT_LE(failing_malloc::held(), blocks + BLOCK_LIMIT);
    for (const watched &process : processes)
        process.expect_flat();
}

// A document with something of everything that a call allocates.
struct rich_document {
    rich_document()
    {
        identity.name = contact.name = &name;
        contact.email = {"a@workshop.example", "b@workshop.example"};
        profile.identity = &identity;
        profile.contact = {&contact, &contact, &contact};
        profile.profileAuthority = &text;
    }
    std::string name = "a workshop whose name does not fit in place", text = std::string(2000, 'x');
    protocol__Identity identity;
    protocol__Contact contact;
    protocolProfile__ProfileContent profile;
};

TEST(long_run, with_the_service)
{
    rich_document document;
    service_process service;
    ASSERT_NE(service.port(), 0);
    const std::string url =
        "http://127.0.0.1:" + std::to_string(service.port()) + "/zuv/v1.0/services/Profile";
    ProfileSoapBindingProxy proxy(url.c_str(), static_cast<int>(MODE_KEEP_ALIVE)),
        other(url.c_str(), static_cast<int>(MODE_KEEP_ALIVE));
    for (soap *one : {static_cast<soap *>(&proxy), static_cast<soap *>(&other)}) {
        soap_log_set_received(one, nullptr);
        soap_log_set_sent(one, nullptr);
    }
    __protocolProfile__createResponse created{};
    ASSERT_EQ(0, proxy.create(&document.profile, created));
    std::string uri = created.result->thisURI.at(0), unknown = "urn:none";
    protocol__Header header;
    _protocolProfile__getRequest request;
    __protocolProfile__getResponse got{};
    // One in ten asks for a document that there isn't.
    const auto get = [&](int i, ProfileSoapBindingProxy &caller) {
        if (i % ANEW == 0)
            caller.soap_force_close_socket();
        const bool held = i % 10 != 0;
        header.targetURI = held ? &uri : &unknown;
        caller.soap_header(&header);
        const int error = caller.get(&request, got);
        const bool right =
            held ? error == 0 && *got.result->profileAuthority == document.text : error == SOAP_CLIENT_FAULT;
        caller.destroy();
        return right;
    };
    // Two connections at once, as later when the end of the last one is still under way: the memory of the
    // second thread is there before any is measured.
    ASSERT_TRUE(get(1, other));
    other.soap_force_close_socket();
    soak([&](int i) { return get(i, proxy); }, service.pid());
    EXPECT_EQ(0, service.end(SIGTERM));
}

// The server is a thread of this process and is watched with it.
TEST(long_run, over_tls)
{
    const scripted::server server(scripted::serve_well, true);
    scripted::client caller(server);
    soak([&](int i) {
        if (i % ANEW == 0) {
            caller.proxy.keep_alive = 0; // closes in order, so that its session is resumed
            caller.proxy.soap_close_socket();
        }
        return caller.call(2000) == 0;
    });
    EXPECT_EQ(caller.connections, calls() / ANEW);
}

} // namespace
