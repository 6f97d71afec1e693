// call_allocation_test.cpp - every allocation of a call refused once: a code comes back, and the next call
// works.
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

TEST(allocation_failure, of_a_call_gives_a_code_and_leaves_nothing_behind)
{
    const call_case cases[] = {
        {"get", &trial::get, rich_answer("get"), 0, 0},
        {"set", &trial::set, rich_answer("set"), 0, 0},
        {"set, a graph", &trial::set, rich_answer("set"), SOAP_XML_GRAPH | MODE_NIL, 0},
        {"set, stored", &trial::set, rich_answer("set"), MODE_STORE, 0},
        {"set, compressed chunks", &trial::set, rich_answer("set"), MODE_CHUNKED | MODE_DEFLATE, 0},
        {"set, canonical", &trial::set, rich_answer("set"), MODE_CANONICAL, 0},
        {"set, default namespaces", &trial::set, rich_answer("set"), MODE_DEFAULT_NAMESPACE, 0},
        {"fault", &trial::get, FAULT_11, 0, SOAP_CLIENT_FAULT},
        {"fault of SOAP 1.2", &trial::get, FAULT_12, 0, SOAP_CLIENT_FAULT},
    };
    rich_document();
    testing::internal::CaptureStderr();
    refuse(cases[0], 1, failing_malloc::refuse::one); // what a process makes but once is made now
    for (const call_case &c : cases) {
        for (const auto how : {failing_malloc::refuse::one, failing_malloc::refuse::all_from}) {
            std::size_t nth = 1;
            for (std::ptrdiff_t before = failing_malloc::held(); refuse(c, nth, how);
                 ++nth, before = failing_malloc::held()) {
                EXPECT_EQ(before, failing_malloc::held()) << c.rule << ", allocation " << nth;
                ASSERT_LT(nth, 2000U) << "the call never runs out of allocations";
            }
            EXPECT_GT(nth, 10U) << c.rule << " allocates more than this";
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

TEST(allocation_failure, of_the_hosts_own_allocator_is_told_wherever_it_is_met)
{
    const call_case cases[] = {
        {"get", &trial::get, rich_answer("get"), 0, 0},
        {"set", &trial::set, rich_answer("set"), 0, 0},
        {"fault", &trial::get, FAULT_11, 0, SOAP_CLIENT_FAULT},
        {"fault of SOAP 1.2", &trial::get, FAULT_12, 0, SOAP_CLIENT_FAULT},
        {"MIME", &trial::set, rich_answer("set"), MODE_MIME, 0},
        {"DIME, which the answer is not", &trial::set, rich_answer("set"), MODE_DIME, SOAP_DIME_VERSION},
    };
    rich_document();
    for (const call_case &c : cases) {
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

// Memory in use stays where it was, whatever the number of calls.
TEST(many_calls, leave_a_proxy_as_small_as_it_was)
{
    profile_call calls;
    const std::string answer = http_answer(rich_answer("get"));
    std::size_t before = 0, per_call = 0;
    for (int i = 0; i < 20000; ++i) {
        calls.wire.sent.clear();
        calls.wire.answers.push_back(answer);
        const std::size_t start = failing_malloc::allocations();
        ASSERT_EQ(0, calls.get());
        calls.proxy.destroy();
        per_call = failing_malloc::allocations() - start;
        if (i == 100)
            before = per_call;
    }
    EXPECT_EQ(before, per_call) << "allocations of the last call and of the hundredth";
    EXPECT_EQ(1, calls.wire.opened);
}

} // namespace
