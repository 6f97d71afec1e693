// main.cpp - call_steps: repeats one step of a call, for a tool that counts instructions (script/bench
// instructions), and tells its size and what it takes from malloc.
//
// The instructions of one repetition are the difference of two runs with different counts: start and warm-up
// are the same in both.
#include <cstdio>
#include <cstdlib>
#include <functional>
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
#include "traits_protocolProfile.h"

namespace {

constexpr char ELEMENT[] = "protocolProfile:createResponse";
constexpr int WARM_UP = 20; // repetitions after which nothing is made for the first time
constexpr std::size_t ANSWER_BYTES = 2160;

void expect(bool holds, const char *what)
{
    if (!holds)
        throw std::runtime_error(what);
}

const binding::class_ops &profile_ops()
{
    return binding::traits<protocolProfile__ProfileContent>::ops;
}

// A profile with the names and numbers of a small company, in a context's memory.
struct sample_profile {
    sample_profile()
    {
        identity.type = &kind;
        identity.name = &company;
        address.city = &city;
        address.country = &country;
        address.postalCode = &code;
        for (protocol__Contact &one : contacts) {
            one.name = &person;
            one.organization = &department;
            one.email = {mail};
            profile.contact.push_back(&one);
        }
        contacts[0].address = {&address};
        profile.thisURI = {"urn:zuv:profile:9b2d9d5e-6b0c-4d0f-9e62-0c4f5a1c7d11"};
        profile.state = &state;
        profile.identity = &identity;
    }
    sample_profile(const sample_profile &) = delete;
    sample_profile &operator=(const sample_profile &) = delete;

    std::string company = "Zo\xC3\xAB & company", city = "Graz", country = "Austria", code = "8010",
                person = "Contact", department = "Workshop", mail = "one@workshop.example";
    protocol__IdentityType kind = protocol__IdentityType::organization;
    protocolProfile__ProfileState state = protocolProfile__ProfileState::active;
    protocol__Identity identity;
    protocol__Address address;
    protocol__Contact contacts[2];
    protocolProfile__ProfileContent profile;
};

// The profile as a service of this library writes it, whose Envelope declares the whole namespace table, and
// one namespace more that the table doesn't hold. The company's name is stretched to the size wanted.
std::string answer(sample_profile &sample)
{
    const std::string more = " xmlns:wsdl=\"http://schemas.xmlsoap.org/wsdl/\"";
    engine_run engine(profile_ops(), ELEMENT);
    const std::size_t size = engine.written(&sample.profile).size() + more.size();
    expect(size <= ANSWER_BYTES, ("the sample has " + std::to_string(size) + " bytes").c_str());
    sample.company.append(ANSWER_BYTES - size, 'x');
    std::string bytes = engine.written(&sample.profile);
    return bytes.insert(bytes.find(" xmlns:xsd="), more);
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

void run_read(int count)
{
    sample_profile sample;
    const std::string bytes = answer(sample);
    engine_run engine(profile_ops(), ELEMENT);
    run("read", bytes.size(), count, [&] {
        const auto *got = static_cast<const protocolProfile__ProfileContent *>(engine.read(bytes));
        expect(got && got->contact.size() == sample.profile.contact.size(), "the answer wasn't read");
        engine.release();
    });
}

void run_write(int count)
{
    sample_profile sample;
    answer(sample);
    engine_run engine(profile_ops(), ELEMENT);
    const std::size_t size = engine.written(&sample.profile).size();
    run("write", size, count,
        [&] { expect(engine.write(&sample.profile) == size, "the profile wasn't written"); });
}

std::size_t counted_bytes; // sent by the proxy below

void run_call(int count)
{
    sample_profile sample;
    const std::string body = answer(sample);
    const std::string head = "HTTP/1.1 200 OK\r\nServer: bench\r\nContent-Type: text/xml; charset=utf-8\r\n"
                             "Content-Length: " +
                             std::to_string(body.size()) + "\r\nConnection: keep-alive\r\n\r\n";
    const call_bench::server peer(head + body, -1, "");
    const std::string url = "http://127.0.0.1:" + std::to_string(peer.port()) + "/profile";
    std::string name = "Zo\xC3\xAB & company";
    protocol__Identity identity;
    identity.type = &sample.kind;
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

} // namespace

int main(int argc, char **argv)
{
    const std::string step = argc == 3 ? argv[1] : "";
    const int count = argc == 3 ? std::atoi(argv[2]) : 0;
    if (count <= 0 || (step != "read" && step != "write" && step != "call")) {
        std::fputs("usage: call_steps read|write|call COUNT\n"
                   "prints the step's name, the bytes it moves and the blocks it takes from malloc\n",
                   stderr);
        return 2;
    }
    try {
        step == "read" ? run_read(count) : step == "write" ? run_write(count) : run_call(count);
    } catch (const std::exception &failed) {
        std::fprintf(stderr, "call_steps: %s: %s\n", step.c_str(), failed.what());
        return 1;
    }
}
