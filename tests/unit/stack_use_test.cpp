// stack_use_test.cpp - what one nesting level of a document costs of the stack, when reading and when
// writing.
//
// Meaningful in an optimised build only: others are skipped.
#include <gtest/gtest.h>

#include <sys/mman.h>

#include <algorithm>
#include <cstdio>
#include <deque>
#include <functional>
#include <string>

#include <pthread.h>

#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/protocol.h>

#include "support/call_wire.h"

namespace {

constexpr std::size_t STACK_SIZE = 16U << 20;
constexpr std::size_t LEVEL_LIMIT = 1024; // bytes of stack
constexpr unsigned char PAINT = 0xA5;

// Runs `work` on a thread with a painted stack; the bytes of it that were used.
std::size_t stack_used_by(std::function<void()> work)
{
    void *memory =
        mmap(nullptr, STACK_SIZE, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS | MAP_STACK, -1, 0);
    EXPECT_NE(MAP_FAILED, memory);
    auto *const stack = static_cast<unsigned char *>(memory);
    std::fill_n(stack, STACK_SIZE, PAINT);
    pthread_attr_t attributes;
    pthread_attr_init(&attributes);
    EXPECT_EQ(0, pthread_attr_setstack(&attributes, stack, STACK_SIZE));
    pthread_t thread;
    const auto run = [](void *given) -> void * {
        (*static_cast<std::function<void()> *>(given))();
        return nullptr;
    };
    EXPECT_EQ(0, pthread_create(&thread, &attributes, run, &work));
    EXPECT_EQ(0, pthread_join(thread, nullptr));
    pthread_attr_destroy(&attributes);
    const unsigned char *deepest =
        std::find_if(stack, stack + STACK_SIZE, [](unsigned char byte) { return byte != PAINT; });
    const auto used = static_cast<std::size_t>(stack + STACK_SIZE - deepest);
    munmap(memory, STACK_SIZE);
    return used;
}

std::string repeated(const std::string &text, std::size_t times)
{
    std::string all;
    for (std::size_t i = 0; i < times; ++i)
        all += text;
    return all;
}

std::string answer(const std::string &content)
{
    return http_answer("<E:Envelope xmlns:E=\"http://schemas.xmlsoap.org/soap/envelope/\""
                       " xmlns:p=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0/Profile\""
                       " xmlns:c=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0\"><E:Body><p:setResponse>" +
                       content + "</p:setResponse></E:Body></E:Envelope>");
}

// Sends the request, which is answered by `content`.
int set(protocolProfile__ProfileContent &request, const std::string &content)
{
    call_wire wire;
    ProfileSoapBindingProxy proxy;
    wire.carry(proxy);
    wire.answers.push_back(answer(content));
    __protocolProfile__setResponse response{};
    return proxy.set(&request, response);
}

std::size_t bytes_per_level(const std::function<void(std::size_t)> &with_levels)
{
    constexpr std::size_t FEW = 500, MANY = 1000;
    const std::size_t few = stack_used_by([&] { with_levels(FEW); });
    const std::size_t many = stack_used_by([&] { with_levels(MANY); });
    return (std::max(many, few) - few) / (MANY - FEW);
}

class StackUse : public testing::Test {
protected:
    void SetUp() override
    {
#if defined(ZUV_SANITIZED) || !defined(__OPTIMIZE__)
        GTEST_SKIP() << "frames are larger in this build";
#endif
    }
};

TEST_F(StackUse, of_reading_one_level)
{
    static const struct {
        const char *rule, *begin, *end, *around_begin, *around_end;
    } cases[] = {
        {"objects of a list", "<p:profile>", "</p:profile>", "", ""},
        {"objects of a pointer", "<c:address>", "</c:address>", "<c:contact>", "</c:contact>"},
        {"elements that nobody knows", "<p:unknown>", "</p:unknown>", "", ""},
    };
    for (const auto &c : cases) {
        protocolProfile__ProfileContent request;
        const std::size_t bytes = bytes_per_level([&](std::size_t levels) {
            EXPECT_EQ(0, set(request, c.around_begin + repeated(c.begin, levels) + repeated(c.end, levels) +
                                          c.around_end))
                << c.rule;
        });
        EXPECT_LE(bytes, LEVEL_LIMIT) << c.rule;
        std::printf("%s: %zu bytes of stack a level\n", c.rule, bytes);
    }
}

TEST_F(StackUse, of_writing_one_level)
{
    const std::size_t list = bytes_per_level([](std::size_t levels) {
        std::deque<protocolProfile__ProfileContent> profiles(levels);
        for (std::size_t i = 1; i < levels; ++i)
            profiles[i - 1].profile = {&profiles[i]};
        EXPECT_EQ(0, set(profiles[0], ""));
    });
    EXPECT_LE(list, LEVEL_LIMIT);
    const std::size_t pointer = bytes_per_level([](std::size_t levels) {
        std::deque<protocol__Address> addresses(levels);
        for (std::size_t i = 1; i < levels; ++i)
            addresses[i - 1].address = &addresses[i];
        protocol__Contact contact;
        contact.address = {&addresses[0]};
        protocolProfile__ProfileContent request;
        request.contact = {&contact};
        EXPECT_EQ(0, set(request, ""));
    });
    EXPECT_LE(pointer, LEVEL_LIMIT);
    std::printf("a list: %zu, a pointer: %zu bytes of stack a level\n", list, pointer);
}

} // namespace
