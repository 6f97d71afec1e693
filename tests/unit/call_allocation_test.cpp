// call_allocation_test.cpp - every allocation of a call refused once: a code comes back, and the next call
// works.
#include <gtest/gtest.h>

#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/protocolProfile.h>
#include <zuv_client_pro/soap_error.h>

#include "support/call_wire.h"
#include "support/failing_malloc.h"

namespace {

const std::string ENVELOPE = "<E:Envelope xmlns:E=\"http://schemas.xmlsoap.org/soap/envelope/\""
                             " xmlns:p=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0/Profile\""
                             " xmlns:c=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0\""
                             " xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\">";
const std::string END = "</E:Body></E:Envelope>";
const std::string RICH =
    ENVELOPE +
    "<E:Header><c:header><c:targetURI>urn:1</c:targetURI></c:header></E:Header><E:Body><p:getResponse>"
    "<p:thisURI id=\"u\">urn:zuv:profile:with-a-name-that-needs-an-allocation</p:thisURI>"
    "<p:thisURI href=\"#u\"/><p:state>active</p:state><c:identity xsi:type=\"c:RecognizedSubject\">"
    "<c:name>caf&#xE9; with a long name that does not fit in place</c:name><c:authorized>true"
    "</c:authorized></c:identity><c:contact href=\"#c\"/><c:contact id=\"c\"><c:name>n</c:name>"
    "</c:contact><c:credentials><c:certificate>AAEC/w==</c:certificate></c:credentials>"
    "</p:getResponse>" +
    END;
const std::string FAULT =
    ENVELOPE +
    "<E:Body><E:Fault><faultcode>E:Client</faultcode><faultstring>s</faultstring><detail>"
    "<c:Client.ObjectNotFound><c:uri>urn:1</c:uri></c:Client.ObjectNotFound><x>raw</x></detail>"
    "</E:Fault>" +
    END;

// A get with a header, which is answered by `body`. A proxy of its own, so that nothing is left over from
// another run.
struct trial {
    explicit trial(const std::string &body)
    {
        wire.carry(proxy);
        wire.sent.reserve(SOAP_BUFFER_SIZE); // the peer's memory is not what is tested
        wire.opened_at.reserve(SOAP_TEXT_SIZE);
        wire.answers.push_back(http_answer(body));
        header.targetURI = &uri;
        proxy.soap_header(&header);
    }
    call_wire wire;
    ProfileSoapBindingProxy proxy;
    std::string uri = "urn:1";
    protocol__Header header;
    _protocolProfile__getRequest request;
    __protocolProfile__getResponse response{};
};

void refuse_each(const std::string &body, int usual)
{
    for (std::size_t nth = 1; nth < 2000; ++nth) {
        trial t(body);
        int error;
        std::size_t refused;
        {
            failing_malloc::scope armed(nth);
            error = t.proxy.get(&t.request, t.response);
            refused = armed.refused();
        }
        if (refused == 0) {
            EXPECT_EQ(usual, error);
            EXPECT_GT(nth, 10U) << "the call allocates more than this";
            return;
        }
        // Some allocations only save work: without them the call goes on the long way.
        EXPECT_TRUE(error != 0 || usual == 0) << "allocation " << nth;
        EXPECT_TRUE(error != 0 || t.response.result != nullptr) << "allocation " << nth;
        t.proxy.destroy();
        t.wire.answers.clear();
        t.wire.answers.push_back(http_answer(body));
        EXPECT_EQ(usual, t.proxy.get(&t.request, t.response)) << "after allocation " << nth << " had failed";
    }
    FAIL() << "the call never ran out of allocations";
}

TEST(AllocationFailure, of_a_call_with_a_rich_answer_gives_a_code)
{
    testing::internal::CaptureStderr();
    refuse_each(RICH, 0);
    EXPECT_EQ("", testing::internal::GetCapturedStderr()) << "no leak is named";
}

TEST(AllocationFailure, of_a_call_that_ends_in_a_fault_gives_a_code)
{
    testing::internal::CaptureStderr();
    refuse_each(FAULT, SOAP_CLIENT_FAULT);
    EXPECT_EQ("", testing::internal::GetCapturedStderr()) << "no leak is named";
}

// Memory in use stays where it was, whatever the number of calls.
TEST(ManyCalls, leave_a_proxy_as_small_as_it_was)
{
    call_wire wire;
    ProfileSoapBindingProxy proxy(static_cast<int>(MODE_KEEP_ALIVE));
    wire.carry(proxy);
    _protocolProfile__getRequest request;
    __protocolProfile__getResponse response;
    std::size_t before = 0, per_call = 0;
    for (int i = 0; i < 20000; ++i) {
        wire.sent.clear();
        wire.answers.push_back(http_answer(RICH));
        const std::size_t start = failing_malloc::allocations();
        ASSERT_EQ(0, proxy.get(&request, response));
        proxy.destroy();
        per_call = failing_malloc::allocations() - start;
        if (i == 100)
            before = per_call;
    }
    EXPECT_EQ(before, per_call) << "allocations of the last call and of the hundredth";
    EXPECT_EQ(1, wire.opened);
}

} // namespace
