// limits_test.cpp - what a request may cost the service, and that its memory comes back.
#include <chrono>
#include <fstream>
#include <string>

#include <gtest/gtest.h>

#include "service/raw_client.h"
#include "service/service_process.h"
#include "support/deflated.h"

using namespace service_test;

namespace {

constexpr std::size_t MB = 1U << 20;

std::string repeated(const std::string &text, std::size_t times)
{
    std::string all;
    for (std::size_t i = 0; i < times; ++i)
        all += text;
    return all;
}

// A number of /proc/PID/status, in bytes: VmRSS is in use now, VmHWM was at most.
std::size_t memory_of(const service_process &service, const std::string &name)
{
    std::ifstream status("/proc/" + std::to_string(service.pid()) + "/status");
    for (std::string word; status >> word;) {
        std::size_t kilobytes = 0;
        if (word == name + ":" && status >> kilobytes)
            return kilobytes * 1024;
    }
    return 0;
}

std::string create_profile(const std::string &content)
{
    return soap11("<protocolProfile:createRequest>" + content + "</protocolProfile:createRequest>");
}

std::string compressed_post(const std::string &body)
{
    return post("Profile", gzipped(body), "Content-Encoding: gzip\r\n");
}

} // namespace

TEST(Limits, BoundTheMemoryOfARequestAndGiveItBack)
{
    service_process service;
    ASSERT_EQ(exchange(service.port(), post("Profile", create_profile(""))).status, 200);
    const std::size_t before = memory_of(service, "VmRSS");
    const std::string text =
        "<protocolProfile:thisURI id=\"u\">" + std::string(MB, 'u') + "</protocolProfile:thisURI>";
    const struct {
        const char *rule;
        std::string content, told;
    } rows[] = {
        {"60 MB of empty elements", repeated("<protocolProfile:profile/>", 2300000),
         "max_memory: more than " + std::to_string(256 * MB) + " bytes"},
        {"a text copied 3000 times", text + repeated("<protocolProfile:thisURI href=\"#u\"/>", 3000),
         "copies by references and QNames: more than"},
    };
    for (const auto &row : rows) {
        const raw_answer answer = exchange(service.port(), compressed_post(create_profile(row.content)));
        EXPECT_EQ(answer.status, 413) << row.rule;
        EXPECT_NE(answer.body.find(row.told), std::string::npos) << row.rule << '\n' << answer.body;
        EXPECT_TRUE(answer.has("Connection: close")) << row.rule;
    }
    const std::size_t most = memory_of(service, "VmHWM");
    using clock = std::chrono::steady_clock;
    const auto patience = clock::now() + std::chrono::seconds(20);
    const auto given_back = [&] { return memory_of(service, "VmRSS") < before + 32 * MB; };
    while (!given_back() && clock::now() < patience)
        ASSERT_EQ(exchange(service.port(), post("Profile", create_profile(""))).status, 200);
    std::printf("%zu MB before, %zu at most, %zu afterwards\n", before / MB, most / MB,
                memory_of(service, "VmRSS") / MB);
    if (MEMORY_IS_MEASURED) {
        EXPECT_LT(most, before + 400 * MB);
        EXPECT_TRUE(given_back());
    }
    EXPECT_EQ(service.stop(), 0);
}
