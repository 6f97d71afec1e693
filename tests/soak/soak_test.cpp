// soak_test.cpp - one proxy, very many calls: it stays as small and as fast as it was at the beginning.
//
// ZUV_SOAK_FACTOR in the environment multiplies the numbers of calls.
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <fstream>
#include <string>

#include <gtest/gtest.h>
#include <unistd.h>

#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/soap_error.h>

#include "service/service_process.h"
#include "support/call_wire.h"

namespace {

constexpr int SETTLED = 100; // calls after which nothing is made for the first time any more
constexpr double GROWTH_LIMIT = 1.01;
constexpr double SLOWDOWN_LIMIT = 2; // of processor time per call

int calls(int usual)
{
    const char *factor = std::getenv("ZUV_SOAK_FACTOR");
    return usual * std::max(1, factor == nullptr ? 1 : std::atoi(factor));
}

// Bytes of this process in memory.
double resident()
{
    std::ifstream file("/proc/self/statm");
    long pages = 0, resident_pages = 0;
    file >> pages >> resident_pages;
    EXPECT_GT(resident_pages, 0);
    return static_cast<double>(resident_pages) * static_cast<double>(sysconf(_SC_PAGESIZE));
}

// What a call takes, in seconds.
struct pace {
    double elapsed = 0;
    double processor = 0; // of this process: other programs' load hardly shows in it
};

template <class Call> pace pace_of(int first, int end, Call call)
{
    const auto start = std::chrono::steady_clock::now();
    const std::clock_t processor_start = std::clock();
    for (int i = first; i < end; ++i)
        if (!call(i)) {
            ADD_FAILURE() << "call " << i;
            break;
        }
    const double made = end - first;
    return {std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count() / made,
            static_cast<double>(std::clock() - processor_start) / CLOCKS_PER_SEC / made};
}

// Memory is looked at after each stretch of calls, and the pace of the first is compared with the last's.
template <class Call> void soak(int count, int stretch, Call call)
{
    pace_of(0, SETTLED, call);
    const double settled = resident();
    double largest = settled;
    pace first, last;
    for (int done = 0; done < count && !testing::Test::HasFailure(); done += stretch) {
        last = pace_of(done, done + stretch, call);
        first = done == 0 ? last : first;
        largest = std::max(largest, resident());
    }
    std::printf("%d calls: %.0f a second, at the end %.0f (processor time per call %.1f and %.1f us); "
                "%.0f KB, at most %.0f KB\n",
                count, 1 / first.elapsed, 1 / last.elapsed, first.processor * 1e6, last.processor * 1e6,
                settled / 1024, largest / 1024);
    EXPECT_LE(largest, settled * GROWTH_LIMIT);
    EXPECT_LT(last.processor, first.processor * SLOWDOWN_LIMIT);
}

// A document with something of everything that a call allocates.
class Soak : public testing::Test {
protected:
    Soak()
    {
        identity.name = &name;
        contact.name = &name;
        contact.email = {"a@workshop.example", "b@workshop.example"};
        document.identity = &identity;
        document.contact = {&contact, &contact, &contact};
        document.profileAuthority = &text;
    }

    std::string name = "a workshop whose name does not fit in place", text = std::string(2000, 'x');
    protocol__Identity identity;
    protocol__Contact contact;
    protocolProfile__ProfileContent document;
};

TEST_F(Soak, on_a_kept_connection)
{
    service_test::service_process service;
    ASSERT_TRUE(service.running());
    const std::string url = service.url("Profile");
    ProfileSoapBindingProxy proxy(url.c_str(), static_cast<int>(MODE_KEEP_ALIVE));
    soap_log_set_received(&proxy, nullptr);
    soap_log_set_sent(&proxy, nullptr);
    __protocolProfile__createResponse created{};
    ASSERT_EQ(0, proxy.create(&document, created));
    std::string uri = created.result->thisURI.at(0), unknown = "urn:none";
    const int socket = proxy.socket;
    protocol__Header header;
    _protocolProfile__getRequest request;
    __protocolProfile__getResponse got{};
    // One in ten asks for a document that there isn't.
    soak(calls(10000), 1000, [&](int i) {
        const bool held = i % 10 != 0;
        header.targetURI = held ? &uri : &unknown;
        proxy.soap_header(&header);
        const int error = proxy.get(&request, got);
        const bool right =
            held ? error == 0 && *got.result->profileAuthority == text : error == SOAP_CLIENT_FAULT;
        proxy.destroy();
        return right && proxy.socket == socket;
    });
    EXPECT_EQ(0, service.stop());
}

TEST_F(Soak, in_memory)
{
    call_wire wire;
    ProfileSoapBindingProxy proxy(static_cast<int>(MODE_KEEP_ALIVE));
    wire.carry(proxy);
    const std::string answer = http_answer(
        "<E:Envelope xmlns:E=\"http://schemas.xmlsoap.org/soap/envelope/\""
        " xmlns:p=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0/Profile\""
        " xmlns:c=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0\"><E:Header><c:header><c:transactionId>t"
        "</c:transactionId></c:header></E:Header><E:Body><p:setResponse><p:thisURI id=\"u\">urn:1</p:thisURI>"
        "<p:thisURI href=\"#u\"/><c:contact href=\"#c\"/><c:contact id=\"c\"><c:name>n</c:name></c:contact>"
        "<c:credentials><c:certificate>AAEC/w==</c:certificate></c:credentials></p:setResponse></E:Body>"
        "</E:Envelope>");
    __protocolProfile__setResponse response{};
    soak(calls(200000), 20000, [&](int) {
        wire.sent.clear();
        wire.answers.push_back(answer);
        const bool right = proxy.set(&document, response) == 0 && response.result->contact.size() == 2 &&
                           response.result->contact[0] == response.result->contact[1];
        proxy.soap_noheader(); // the one received
        proxy.destroy();
        return right;
    });
    EXPECT_EQ(1, wire.opened);
}

} // namespace
