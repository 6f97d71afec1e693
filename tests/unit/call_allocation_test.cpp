// call_allocation_test.cpp - every allocation of a call refused once: a code comes back, and the next call works.
#include "core/tracking.h"
#include "support/call_wire.h"
#include "support/testing.h"

namespace {

std::string rich_answer(const std::string &operation)
{
    return answer_envelope(
        "<E:Header><c:header><c:targetURI>urn:1</c:targetURI></c:header></E:Header><E:Body><p:" + operation +
        "Response><p:thisURI id=\"u\">urn:zuv:profile:with-a-name-that-needs-an-allocation</p:thisURI>"
        "<p:thisURI href=\"#u\"/><p:state>active</p:state><c:identity xsi:type=\"c:RecognizedSubject\">"
        "<c:name>caf&#xE9; with a long name that does not fit in place</c:name><c:authorized>true"
        "</c:authorized></c:identity><c:contact href=\"#c\"/><c:contact id=\"c\"><c:name>n</c:name>"
        "</c:contact><c:credentials><c:certificate>AAEC/w==</c:certificate></c:credentials>"
        "<p:profile href=\"#p\"/><p:profile id=\"p\"><c:contact href=\"#c\"/></p:profile></p:" +
        operation + "Response></E:Body>");
}

const std::string TYPED_FAULT = "<c:Client.ObjectNotFound><c:uri>urn:1</c:uri></c:Client.ObjectNotFound>"
                                "<c:Contact><c:name>n</c:name></c:Contact><x>raw</x>";
const std::string FAULT_11 =
    answer_envelope("<E:Body><E:Fault><faultcode>E:Client</faultcode><faultstring>s</faultstring><detail>" +
                    TYPED_FAULT + "</detail></E:Fault></E:Body>");
const std::string FAULT_12 = answer_envelope(
    "<E:Body><E:Fault><E:Code><E:Value>E:Sender</E:Value><E:Subcode><E:Value>c:x</E:Value></E:Subcode>"
    "</E:Code><E:Reason><E:Text xml:lang=\"en\">s</E:Text></E:Reason><E:Detail>" +
        TYPED_FAULT + "</E:Detail></E:Fault></E:Body>",
    ENVELOPE_12);

// A document that has something of everything, and parts of it twice.
const protocolProfile__ProfileContent *rich_document()
{
    static profile_call call(0);
    if (call.got.result == nullptr) {
        EXPECT_EQ(0, call.get(http_answer(rich_answer("get"))));
    }
    return call.got.result;
}

// Two calls, which are answered by `body`, with a proxy of their own, so that nothing is left over from
// another run.
struct trial : profile_call {
    trial(const std::string &body, std::uint32_t mode)
        : profile_call(mode | MODE_KEEP_ALIVE), answer(http_answer(body))
    {
        wire.sent.reserve(SOAP_BUFFER_SIZE); // the peer's memory is not what is tested
        wire.opened_at.reserve(SOAP_TEXT_SIZE);
        header.targetURI = &name;
        prepare();
    }
    void prepare()
    {
        wire.answers = {answer};
        proxy.soap_header(&header);
        got.result = nullptr;
        held.result = nullptr;
    }
    int get() { return profile_call::get(); }
    int set() { return proxy.set(const_cast<protocolProfile__ProfileContent *>(rich_document()), held); }
    const protocolProfile__ProfileContent *result() const { return got.result ? got.result : held.result; }
    // The text with an id and the reference to it are both there.
    bool is_whole() const
    {
        return result() && result()->thisURI.size() == 2 && result()->thisURI[0] == result()->thisURI[1] &&
               !result()->thisURI[0].empty();
    }

    std::string answer, name = "a name that does not fit in place \xE9 <&>";
    protocol__Header header;
};

struct call_case {
    const char *rule;
    int (trial::*call)();
    std::string body;
    std::uint32_t mode;
    int usual; // what the call ends with when nothing is refused
};

const call_case CALLS[] = {
    {"get", &trial::get, rich_answer("get"), 0, 0},
    {"set", &trial::set, rich_answer("set"), 0, 0},
    {"set, a graph", &trial::set, rich_answer("set"), SOAP_XML_GRAPH | MODE_NIL, 0},
    {"set, stored", &trial::set, rich_answer("set"), MODE_STORE, 0},
    {"set, compressed chunks", &trial::set, rich_answer("set"), MODE_CHUNKED | MODE_DEFLATE, 0},
    {"set, canonical", &trial::set, rich_answer("set"), MODE_CANONICAL, 0},
    {"set, default namespaces", &trial::set, rich_answer("set"), MODE_DEFAULT_NAMESPACE, 0},
    {"MIME", &trial::set, rich_answer("set"), MODE_MIME, 0},
    {"DIME, which the answer is not", &trial::set, rich_answer("set"), MODE_DIME, SOAP_DIME_VERSION},
    {"fault", &trial::get, FAULT_11, 0, SOAP_CLIENT_FAULT},
    {"fault of SOAP 1.2", &trial::get, FAULT_12, 0, SOAP_CLIENT_FAULT},
};

// Says whether an allocation was refused.
bool refuse(const call_case &c, std::size_t nth, failing_malloc::refuse how)
{
    SCOPED_TRACE(std::string(c.rule) + ", allocation " + std::to_string(nth));
    trial t(c.body, c.mode);
    int error;
    std::size_t refused;
    {
        failing_malloc::scope armed(nth, how);
        error = (t.*c.call)();
        refused = armed.refused();
    }
    // Some allocations only save work: without them the call goes on the long way.
    EXPECT_TRUE(error == c.usual || (refused != 0 && error != 0)) << error;
    EXPECT_TRUE(error != 0 || t.is_whole());
    t.proxy.destroy();
    t.prepare();
    EXPECT_EQ(c.usual, (t.*c.call)()) << "the next call";
    EXPECT_EQ(c.usual == 0, t.result() != nullptr) << "the next call";
    return refused != 0;
}

TEST(allocation_failure, of_a_call_gives_a_code_and_leaks_nothing)
{
    rich_document();
    testing::internal::CaptureStderr();
    refuse(CALLS[0], 1, failing_malloc::refuse::one); // what a process makes but once is made now
    for (const call_case &c : CALLS) {
        for (const auto how : {failing_malloc::refuse::one, failing_malloc::refuse::all_from}) {
            std::size_t nth = 1;
            for (std::ptrdiff_t before = failing_malloc::held(); refuse(c, nth, how);
                 ++nth, before = failing_malloc::held()) {
                EXPECT_EQ(before, failing_malloc::held()) << c.rule << ", allocation " << nth;
                ASSERT_LT(nth, 2000U) << "the call never runs out of allocations";
            }
            EXPECT_GT(nth, 7U) << c.rule << " allocates more than this";
        }
    }
    EXPECT_EQ("", testing::internal::GetCapturedStderr()) << "no leak is named";
}

// Managed memory of the host's own, of which one request is refused.
struct host_memory {
    std::vector<void *> blocks;
    std::size_t refuse = 0; // counted from 1; 0 none
    ~host_memory()
    {
        for (void *block : blocks)
            std::free(block);
    }
    static host_memory *current;
    static void *give(soap *, std::size_t size)
    {
        current->blocks.push_back(current->blocks.size() + 1 == current->refuse ? nullptr
                                                                                : std::malloc(size));
        return current->blocks.back();
    }
};
host_memory *host_memory::current = nullptr;

TEST(allocation_failure, of_the_hosts_own_allocator_is_reported_wherever_it_is_met)
{
    rich_document();
    for (const call_case &c : CALLS) {
        std::size_t refuse = 1, needed;
        do {
            SCOPED_TRACE(std::string(c.rule) + ", block " + std::to_string(refuse));
            host_memory memory;
            host_memory::current = &memory;
            trial t(c.body, c.mode);
            t.proxy.send_fd = t.proxy.recv_fd = -1;
            t.proxy.on_malloc = host_memory::give;
            memory.refuse = refuse;
            const int error = (t.*c.call)();
            needed = memory.blocks.size();
            EXPECT_EQ(error, refuse <= needed ? static_cast<int>(SOAP_OUT_OF_MEMORY) : c.usual);
            EXPECT_TRUE(t.wire.sent.empty() || t.wire.opened == 1);
            t.proxy.destroy();
        } while (refuse++ <= needed);
        EXPECT_GT(refuse, 3U) << c.rule;
    }
}

// Calls whose released objects wait for the next one, whatever the build's default.
struct steady_calls : profile_call {
    explicit steady_calls(std::uint64_t pool_limit = SOAP_POOL_LIMIT) { proxy.pool_limit = pool_limit; }

    // Makes a call that is answered by a profile with so many contacts, and releases it. The allocations.
    std::size_t call(std::size_t contacts)
    {
        std::string content = "<p:thisURI>urn:zuv:profile:with-a-name-that-needs-an-allocation</p:thisURI>"
                              "<p:state>active</p:state><c:identity><c:type>organization</c:type>"
                              "<c:name>a name that is too long for its place</c:name></c:identity>";
        for (std::size_t i = 0; i < contacts; ++i)
            content += "<c:contact><c:name>a name that is too long for its place</c:name><c:email>someone"
                       "@workshop.example</c:email></c:contact>";
        return call(answer_envelope("<E:Body><p:getResponse>" + content + "</p:getResponse></E:Body>"));
    }
    // Or one that also sends `document`.
    std::size_t call(const std::string &body, const protocolProfile__ProfileContent *document = nullptr)
    {
        const std::string answer = http_answer(body);
        wire.sent.clear();
        wire.answers.push_back(answer);
        const std::size_t start = failing_malloc::allocations();
        EXPECT_EQ(0, document ? proxy.set(const_cast<protocolProfile__ProfileContent *>(document), held)
                              : get());
        proxy.destroy();
        return failing_malloc::allocations() - start;
    }
};

TEST(many_calls, leave_a_proxy_as_small_as_it_was_and_allocate_nothing)
{
    steady_calls calls;
    for (const auto *document :
         {static_cast<const protocolProfile__ProfileContent *>(nullptr), rich_document()}) {
        const std::string answer = rich_answer(document ? "set" : "get");
        std::size_t before = 0, per_call = 0;
        std::ptrdiff_t blocks = 0;
        for (int i = 0; i < 20000; ++i) {
            per_call = calls.call(answer, document);
            if (i == 100)
                before = per_call;
            if (i == 10000)
                blocks = failing_malloc::held(); // released ones wait, and go slowly
        }
        EXPECT_EQ(before, per_call) << "allocations of the last call and of the hundredth";
        EXPECT_LE(failing_malloc::held(), blocks + 100);
    }
    EXPECT_EQ(1, calls.wire.opened);
    calls.call(3);
    for (int i = 0; i < 500; ++i)
        ASSERT_EQ(0U, calls.call(3)) << i;
}

TEST(released_objects, of_a_large_message_leave_the_pool_as_it_was)
{
#if defined(ZUV_SANITIZED)
    GTEST_SKIP() << "AddressSanitizer's operator new isn't counted";
#endif
    steady_calls calls(64 << 10);
    calls.call(1000); // makes the book-keeping as large as it gets
    for (int i = 0; i < 3; ++i)
        calls.call(5);
    const std::ptrdiff_t small = failing_malloc::held();
    for (int i = 0; i < 20; ++i) {
        EXPECT_GT(calls.call(1000), 1000U);
        EXPECT_LT(std::abs(failing_malloc::held() - small), 150);
        EXPECT_LT(calls.call(5), 10U) << "what the large one took it gave back";
    }
    calls.proxy.pool_limit = 0;
    calls.call(5);
    EXPECT_LT(failing_malloc::held(), small) << "lowered, the limit holds from the next release on";
    EXPECT_GT(calls.call(5), 20U);
}

// Members that are texts are released in another order than texts in vectors, so that they change places.
TEST(released_objects, stay_as_large_as_what_they_hold)
{
    steady_calls calls;
    std::size_t first = 0;
    for (std::size_t i = 0; i < 100; ++i) {
        const std::string contact = "<c:contact><c:name>" + std::string(500, 'n') + "</c:name><c:email>" +
                                    std::string(20 + i % 40, 'e') + "</c:email></c:contact>";
        std::string contacts;
        for (int n = 0; n < 20; ++n)
            contacts += contact;
        calls.call(answer_envelope("<E:Body><p:getResponse>" + contacts + "</p:getResponse></E:Body>"));
        ASSERT_NE(calls.proxy.pools, nullptr);
        first = first != 0 ? first : calls.proxy.pools->idle.bytes;
    }
    EXPECT_LT(calls.proxy.pools->idle.bytes, first * 5 / 4);
}

TEST(released_objects, that_are_no_longer_needed_go_slowly)
{
#if defined(ZUV_SANITIZED)
    GTEST_SKIP() << "AddressSanitizer's operator new isn't counted";
#endif
    steady_calls calls;
    calls.call(1);
    calls.call(1);
    const std::ptrdiff_t usual = failing_malloc::held();
    calls.call(200);
    const std::ptrdiff_t most = failing_malloc::held();
    EXPECT_GT(most, usual + 500);
    for (int i = 0; i < 50; ++i)
        calls.call(1);
    EXPECT_EQ(failing_malloc::held(), most) << "slowly";
    for (int i = 0; i < 1000; ++i)
        calls.call(1);
    EXPECT_LT(failing_malloc::held() - usual, (most - usual) / 20);
    EXPECT_EQ(0U, calls.call(1));
}

// The host may take objects out and delete them, and give objects in with a hook of its own.
TEST(released_objects, are_blocks_of_their_own_and_a_hosts_hook_has_its_way)
{
    steady_calls calls;
    static int deleted;
    deleted = 0;
    for (int i = 0; i < 3; ++i) {
        calls.wire.answers = {http_answer(rich_answer("get"))};
        ASSERT_EQ(0, calls.get());
        std::unique_ptr<protocolProfile__ProfileContent> profile(calls.got.result);
        std::unique_ptr<std::string> name(profile->identity->name);
        EXPECT_EQ(0, soap_block_unlink(&calls.proxy, profile.get()));
        EXPECT_EQ(0, soap_block_unlink(&calls.proxy, name.get()));
        soap_instance_register(&calls.proxy, new std::string(100, 'h'), SOAP_TYPE_xsd__string, -1,
                               [](soap_instance *instance) {
                                   delete static_cast<std::string *>(instance->object);
                                   ++deleted;
                                   return 0;
                               });
        calls.proxy.destroy();
        EXPECT_EQ(i + 1, deleted);
        EXPECT_EQ(-1, soap_block_unlink(&calls.proxy, name.get()));
        EXPECT_EQ("urn:zuv:profile:with-a-name-that-needs-an-allocation", profile->thisURI[0]);
    }
}

// What waits in the pool holds nothing of the message, and none of it goes to a copy of the context.
TEST(released_objects, are_wiped_and_stay_in_their_context)
{
    steady_calls calls;
    using answer = protocolProfile__ProfileContent;
    const std::string secret = "a password that is too long for its place";
    const std::tuple<std::string, std::string, std::string, const char *(*)(const answer &)> rows[] = {
        {"<p:association><p:password>", secret, "</p:password></p:association>",
         [](const answer &got) -> const char * { return got.association[0]->password->data(); }},
        {"<p:thisURI>", secret, "</p:thisURI>",
         [](const answer &got) -> const char * { return got.thisURI[0].data(); }},
        {"<p:thisURI>", "in its place", "</p:thisURI>",
         [](const answer &got) -> const char * { return got.thisURI[0].data(); }},
        {"<c:credentials><c:certificate>", "QSBrZXkgb2YgaXRzIG93bg==", "</c:certificate></c:credentials>",
         [](const answer &got) -> const char * {
             return reinterpret_cast<const char *>(got.credentials[0]->certificate->content);
         }},
    };
    for (const auto &[before, sent, after, place] : rows) {
        calls.wire.answers = {http_answer(answer_envelope("<E:Body><p:getResponse>" + before + sent + after +
                                                          "</p:getResponse></E:Body>"))};
        ASSERT_EQ(0, calls.get());
        const char *const bytes = place(*calls.got.result);
        const std::string held = sent.back() == '=' ? "A key of its own" : sent;
        ASSERT_EQ(held, std::string(bytes, held.size()));
        calls.proxy.destroy();
        EXPECT_EQ(std::string(held.size(), '\0'), std::string(bytes, held.size())) << before;
    }
    soap copy(calls.proxy);
    EXPECT_EQ(copy.pool_limit, SOAP_POOL_LIMIT);
    EXPECT_TRUE(copy.pools == nullptr || copy.pools->idle.bytes == 0);
    const soap moved(std::move(copy));
    EXPECT_EQ(moved.pool_limit, SOAP_POOL_LIMIT);
}

} // namespace
