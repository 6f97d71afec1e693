// main.cpp - call_steps: repeats one step of a call, for a tool that counts instructions (script/bench
// instructions), and prints its size and what it takes from malloc.
//
// The instructions of one repetition are the difference of two runs with different counts: start and warm-up
// are the same in both.
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <iterator>
#include <stdexcept>
#include <string>

#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_tcp.h>

#include "allocation_count.h"
#include "call/server.h"
#include "engine_run.h"
#include "sample_profile.h"

namespace {

constexpr int WARM_UP = 20; // repetitions after which nothing is made for the first time

void expect(bool holds, const char *what)
{
    if (!holds)
        throw std::runtime_error(what);
}

// Repeats the step for the caller's profiler, then once more for its allocations.
void run(const char *name, std::size_t bytes, int count, const std::function<void()> &step)
{
    for (int i = 0; i < WARM_UP + count; ++i)
        step();
    allocation_count_begin();
    step();
    const allocation_count taken = allocation_count_end();
    std::printf("%s %zu %zu\n", name, bytes, taken.blocks);
}

void run_read(const char *name, const sample_profile &sample, const std::string &bytes, int count)
{
    engine_run engine(profile_ops(), PROFILE_ELEMENT);
    run(name, bytes.size(), count, [&] {
        const auto *got = static_cast<const protocolProfile__ProfileContent *>(engine.read(bytes));
        expect(got && got->contact.size() == sample.profile.contact.size(), "the answer wasn't read");
        engine.release();
    });
}

void run_read(int count)
{
    sample_profile sample;
    run_read("read", sample, profile_answer(sample), count);
}

void run_foreign(int count)
{
    sample_profile sample;
    run_read("foreign", sample, in_default_namespaces(profile_answer(sample)), count);
}

void run_write(int count)
{
    sample_profile sample;
    profile_answer(sample);
    engine_run engine(profile_ops(), PROFILE_ELEMENT);
    const std::size_t size = engine.written(&sample.profile).size();
    run("write", size, count,
        [&] { expect(engine.write(&sample.profile) == size, "the profile wasn't written"); });
}

std::size_t counted_bytes; // sent by the proxy below

void run_call(int count)
{
    sample_profile sample;
    const std::string body = profile_answer(sample);
    const std::string head = "HTTP/1.1 200 OK\r\nServer: bench\r\nContent-Type: text/xml; charset=utf-8\r\n"
                             "Content-Length: " +
                             std::to_string(body.size()) + "\r\nConnection: keep-alive\r\n\r\n";
    const call_bench::server peer(head + body, -1, "");
    const std::string url = "http://127.0.0.1:" + std::to_string(peer.port()) + "/profile";
    std::string name = "Zo\xC3\xAB & company";
    protocol__IdentityType kind = protocol__IdentityType::organization;
    protocol__Identity identity;
    identity.type = &kind;
    identity.name = &name;
    protocolProfile__ProfileContent request;
    request.identity = &identity;
    ProfileSoapBindingProxy proxy;
    soap_log_set_received(&proxy, nullptr);
    soap_log_set_sent(&proxy, nullptr);
    proxy.endpoint = url.c_str();
    proxy.input_mode = proxy.output_mode = MODE_UTF_STRINGS | MODE_KEEP_ALIVE;
    const auto call = [&] {
        __protocolProfile__createResponse response{};
        expect(proxy.create(&request, response) == 0 && response.result &&
                   response.result->contact.size() == sample.profile.contact.size(),
               "the call failed");
        proxy.destroy();
    };
    const auto real_send = proxy.on_send;
    proxy.on_send = [](soap *ctx, const char *data, std::size_t length) {
        counted_bytes += length;
        return tcp_send(ctx, data, length);
    };
    call();
    proxy.on_send = real_send;
    run("call", counted_bytes + head.size() + body.size(), count, call);
}

constexpr struct {
    const char *name;
    void (*run)(int count);
} STEPS[] = {{"read", run_read}, {"foreign", run_foreign}, {"write", run_write}, {"call", run_call}};

} // namespace

int main(int argc, char **argv)
{
    const std::string step = argc == 3 ? argv[1] : "";
    const int count = argc == 3 ? std::atoi(argv[2]) : 0;
    const auto chosen =
        std::find_if(std::begin(STEPS), std::end(STEPS), [&](const auto &one) { return step == one.name; });
    if (count <= 0 || chosen == std::end(STEPS)) {
        std::fputs("usage: call_steps read|foreign|write|call COUNT\n"
                   "prints the step's name, the bytes it moves and the blocks it takes from malloc\n",
                   stderr);
        return 2;
    }
    try {
        chosen->run(count);
    } catch (const std::exception &failed) {
        std::fprintf(stderr, "call_steps: %s: %s\n", step.c_str(), failed.what());
        return 1;
    }
}
