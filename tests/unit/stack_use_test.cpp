// stack_use_test.cpp - what one nesting level of a document costs of the stack, when reading and when
// writing. Meaningful in an optimised build only: others are skipped.
#include <pthread.h>
#include <sys/mman.h>

#include "support/call_wire.h"
#include "support/testing.h"

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
    auto *const stack = static_cast<unsigned char *>(memory), *const end = stack + STACK_SIZE;
    std::fill(stack, end, PAINT);
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
    const auto deepest = std::find_if(stack, end, [](unsigned char byte) { return byte != PAINT; });
    munmap(memory, STACK_SIZE);
    return static_cast<std::size_t>(end - deepest);
}

int set(protocolProfile__ProfileContent &request, const std::string &content)
{
    profile_call call(0);
    call.wire.answers = {
        http_answer(answer_envelope("<E:Body><p:setResponse>" + content + "</p:setResponse></E:Body>"))};
    return call.proxy.set(&request, call.held);
}

void expect_bounded(const char *rule, const std::function<void(std::size_t)> &with_levels)
{
#if defined(ZUV_SANITIZED) || !defined(__OPTIMIZE__)
    GTEST_SKIP() << "frames are larger in this build";
#endif
    constexpr std::size_t FEW = 500, MANY = 1000;
    const std::size_t few = stack_used_by([&] { with_levels(FEW); });
    const std::size_t many = stack_used_by([&] { with_levels(MANY); });
    const std::size_t bytes = (std::max(many, few) - few) / (MANY - FEW);
    EXPECT_LE(bytes, LEVEL_LIMIT) << rule;
    std::printf("%s: %zu bytes of stack a level\n", rule, bytes);
}

TEST(stack_use, of_reading_one_level)
{
    static const struct {
        const char *rule, *begin, *end, *around_begin, *around_end;
    } cases[] = {
        {"objects of a list", "<p:profile>", "</p:profile>", "", ""},
        {"objects of a pointer", "<c:address>", "</c:address>", "<c:contact>", "</c:contact>"},
        {"elements that nobody knows", "<p:unknown>", "</p:unknown>", "", ""},
    };
    for (const auto &c : cases)
        expect_bounded(c.rule, [&c](std::size_t levels) {
            protocolProfile__ProfileContent request;
            EXPECT_EQ(0, set(request, c.around_begin + repeat_text(c.begin, levels) +
                                          repeat_text(c.end, levels) + c.around_end))
                << c.rule;
        });
}

TEST(stack_use, of_writing_one_level)
{
    expect_bounded("a list", [](std::size_t levels) {
        std::deque<protocolProfile__ProfileContent> profiles(levels);
        for (std::size_t i = 1; i < levels; ++i)
            profiles[i - 1].profile = {&profiles[i]};
        EXPECT_EQ(0, set(profiles[0], ""));
    });
    expect_bounded("a pointer", [](std::size_t levels) {
        std::deque<protocol__Address> addresses(levels);
        for (std::size_t i = 1; i < levels; ++i)
            addresses[i - 1].address = &addresses[i];
        protocol__Contact contact;
        contact.address = {&addresses[0]};
        protocolProfile__ProfileContent request;
        request.contact = {&contact};
        EXPECT_EQ(0, set(request, ""));
    });
}

TEST(stack_use, of_a_call_besides_its_proxy_object)
{
    const auto call = std::make_unique<profile_call>();
    protocol__Contact contact;
    protocolProfile__ProfileContent request;
    request.contact = {&contact};
    call->wire.answers = {http_answer(answer_envelope("<E:Body><p:setResponse/></E:Body>"))};
    const std::size_t bytes = stack_used_by([&] { EXPECT_EQ(0, call->proxy.set(&request, call->held)); });
#if defined(ZUV_SANITIZED) || !defined(__OPTIMIZE__)
    GTEST_SKIP() << "frames are larger in this build";
#endif
    EXPECT_LE(bytes, SOAP_CALL_STACK_BYTES);
    std::printf("a call: %zu bytes of stack, a proxy object: %zu bytes\n", bytes, sizeof call->proxy);
}

} // namespace
