// ports_test.cpp - every operation of every port: its request byte for byte, its answer, no answer.
//
// One row for each operation of the generated list. The golden files are composed by hand from the contract,
// never recorded; a request is read from its file and must go out as it is there. Elsewhere: that the list
// is whole (tests/cli/calls_test.py), all members of all classes (tests/foreign), the cycle itself
// (call_cycle_test.cpp), faults (fault_detail_test.cpp).
#include "operation_list.h"
#include "support/call_wire.h"
#include "support/golden.h"
#include "support/memory_wire.h"
#include "support/testing.h"

namespace {

constexpr char OTHER_PLACE[] = "http://other.example/place";

struct outcome {
    int error;
    bool answered; // the response record was filled
};

struct operation {
    std::string port, name;
    int request_id, response_id;
    std::unique_ptr<call_wire> wire = std::make_unique<call_wire>(); // outlives the context
    std::shared_ptr<soap> ctx = {};
    // A call with the row's request; by the full form if there is an action, with no response record if asked.
    std::function<outcome(const operation &own, const char *action, bool reads)> call = {};
    std::string answer_content = {};
    std::function<void()> expect_answer = {}; // the response holds what answer_content says

    std::string tag() const { return "protocol" + port + ":" + name; }
    golden::message golden() const { return golden::read(port, name); }

    void connect(std::string answer)
    {
        wire->carry(*ctx);
        wire->sent.clear();
        if (golden().head.find("Connection: keep-alive") != std::string::npos) {
            ctx->input_mode = ctx->output_mode = MODE_KEEP_ALIVE;
            ctx->auth_user = "ada";
            ctx->auth_password = "secret";
        }
        wire->answers = {std::move(answer)};
    }
};

// The request of a row, read from its golden form, with its header. What the reader misses is missed in what
// is sent.
template <class R> R *request_of(const operation &row, soap *ctx)
{
    std::deque<std::string> answers = {row.golden().body};
    answers.swap(row.wire->answers);
    soap_reset_call(ctx);
    R *request = nullptr;
    if (soap_receive_begin(ctx) == 0 && soap_envelope_in_begin(ctx) == 0 && soap_header_get(ctx) == 0 &&
        soap_body_in_begin(ctx) == 0) {
        request = static_cast<R *>(soap_instantiate(ctx, R().soap_type(), nullptr, nullptr, nullptr));
        if (request != nullptr)
            request->soap_get(ctx, (row.tag() + "Request").c_str(), nullptr);
    }
    EXPECT_TRUE(request && soap_body_in_end(ctx) == 0 && soap_envelope_in_end(ctx) == 0 &&
                soap_receive_finish(ctx) == 0)
        << ctx->error;
    answers.swap(row.wire->answers);
    return request;
}

// Answers, by class of the response; "p" is the port's prefix, "c" the common one.
template <class R> std::string content_of(const R *)
{
    return "<p:thisURI>urn:1</p:thisURI><p:state>closed</p:state><c:contact><c:name>Ada</c:name></c:contact>"
           "<p:thisURI>urn:2</p:thisURI>";
}
std::string content_of(const protocolUpdateOrder__AuthenticateResponse *)
{
    return "<c:error xsi:type=\"c:Client.Authentication\"><c:description>who?</c:description></c:error>"
           "<p:success>true</p:success><p:credentials><c:token>t</c:token></p:credentials>";
}

template <class R> void expect_content(const R &result, const soap &ctx)
{
    EXPECT_EQ((std::vector<std::string>{"urn:1", "urn:2"}), result.thisURI);
    ASSERT_NE(nullptr, result.state);
    EXPECT_EQ(std::remove_pointer_t<decltype(result.state)>::closed, *result.state);
    ASSERT_EQ(1U, result.contact.size());
    EXPECT_EQ("Ada", *result.contact[0]->name);
    EXPECT_EQ(&ctx, result.soap);
}
void expect_content(const protocolUpdateOrder__AuthenticateResponse &result, const soap &)
{
    EXPECT_TRUE(result.success);
    EXPECT_EQ("t", *result.credentials->token);
    ASSERT_EQ(1U, result.error.size());
    EXPECT_EQ(SOAP_TYPE_protocol__Client_x002eAuthentication, result.error[0]->soap_type());
    EXPECT_EQ("who?", *result.error[0]->description);
}

template <class S> void set_answer(operation &row, const std::shared_ptr<S> &response)
{
    row.answer_content = content_of(response->result);
    row.expect_answer = [response, ctx = row.ctx.get()] { expect_content(*response->result, *ctx); };
}

// The short form without a response: the null reference is the test's, which no sanitizer is to look at.
template <class P, class R, class S>
__attribute__((no_sanitize("undefined"))) int call_one_way(P &proxy, int (P::*short_form)(R *, S &),
                                                           R *request)
{
    auto *nowhere = reinterpret_cast<S *>(static_cast<std::uintptr_t>(0));
    return (proxy.*short_form)(request, *nowhere);
}

template <class P, class R, class S>
operation proxy_row(operation row, int (P::*short_form)(R *, S &),
                    int (P::*full_form)(const char *, const char *, R *, S &))
{
    const auto proxy = std::make_shared<P>();
    const auto response = std::make_shared<S>();
    row.ctx = proxy;
    row.call = [=, p = proxy.get()](const operation &own, const char *action, bool reads) {
        R *const request = request_of<R>(own, p);
        response->result = nullptr;
        const int error = action  ? (p->*full_form)(OTHER_PLACE, action, request, *response)
                          : reads ? (p->*short_form)(request, *response)
                                  : call_one_way(*p, short_form, request);
        return outcome{error, response->result != nullptr};
    };
    set_answer(row, response);
    return row;
}

template <class W, class S> operation host_row(operation row)
{
    using response_class = std::remove_pointer_t<decltype(S::result)>;
    const auto response = std::make_shared<S>();
    row.ctx = std::make_shared<soap>();
    row.call = [response](const operation &own, const char *action, bool reads) {
        soap *const ctx = own.ctx.get();
        const char *endpoint = action ? OTHER_PLACE : "http://127.0.0.1:9080/zuv/v1.0/services/ProblemReport";
        void *made = &made; // a failure leaves null there
        const int error = soap_call(ctx, endpoint, action, {own.request_id, own.response_id},
                                    request_of<std::remove_pointer_t<decltype(W::request)>>(own, ctx),
                                    reads ? &made : nullptr);
        response->result = reads ? static_cast<response_class *>(made) : nullptr;
        return outcome{error, response->result != nullptr};
    };
    set_answer(row, response);
    return row;
}

std::vector<operation> all_rows()
{
    std::vector<operation> rows;
#define IDS(Port, op) SOAP_TYPE___protocol##Port##__##op, SOAP_TYPE___protocol##Port##__##op##Response
#define ROW(Port, op, ...)                                                                                   \
    rows.push_back(proxy_row({#Port, #op, IDS(Port, op)}, &Port##SoapBindingProxy::op,                       \
                             &Port##SoapBindingProxy::_##op));
#define HOST_ROW(Port, op, ...)                                                                              \
    rows.push_back(host_row<__protocol##Port##__##op, __protocol##Port##__##op##Response>(                   \
        {#Port, #op, IDS(Port, op)}));
    OPERATIONS_WITH_PROXY(ROW)
    OPERATIONS_WITHOUT_PROXY(HOST_ROW)
    return rows;
}

std::string answer(const operation &row)
{
    const std::string tag = "p:" + row.name + "Response";
    const std::string body = "<" + tag + ">" + row.answer_content + "</" + tag + ">";
    return http_answer(answer_envelope("<E:Body>" + body + "</E:Body>", ENVELOPE_11, row.port));
}

TEST(ports, send_the_golden_request_and_read_the_answer_into_its_class)
{
    for (operation &row : all_rows()) {
        SCOPED_TRACE(row.tag());
        EXPECT_EQ("-" + row.tag(), soap_type_name(row.request_id));
        EXPECT_EQ("-" + row.tag() + "Response", soap_type_name(row.response_id));
        const golden::message request = row.golden();
        row.connect(answer(row));
        const outcome got = row.call(row, nullptr, true);
        EXPECT_EQ(request.whole(), row.wire->sent);
        EXPECT_EQ(0, got.error);
        ASSERT_TRUE(got.answered);
        row.expect_answer();
        EXPECT_EQ((row.ctx->output_mode & MODE_KEEP_ALIVE) ? 0 : 1, row.wire->closed);
        row.connect("never read");
        EXPECT_EQ(0, row.call(row, nullptr, false).error) << "without a response record";
        EXPECT_EQ(request.whole(), row.wire->sent);
        EXPECT_EQ("never read", row.wire->answers.at(0));
        // Full forms take an endpoint and an action, and change nothing else.
        row.connect(answer(row));
        EXPECT_EQ(0, row.call(row, "urn:act", true).error);
        EXPECT_EQ(OTHER_PLACE, row.wire->opened_at);
        const std::size_t end = row.wire->sent.find("\r\n\r\n");
        EXPECT_EQ(0U, row.wire->sent.find("POST /place HTTP/1.1\r\nHost: other.example\r\n"));
        EXPECT_LT(row.wire->sent.find("\r\nSOAPAction: \"urn:act\"\r\n"), end);
        EXPECT_EQ(request.body, row.wire->sent.substr(end + 4));
    }
}

TEST(ports, ids_that_are_no_operation_end_the_call_before_anything_is_sent)
{
    const int request = SOAP_TYPE___protocolProfile__set, response = SOAP_TYPE___protocolProfile__setResponse;
    for (const soap_operation &wrong :
         {soap_operation{response, request}, {request, request}, {0, response}, {request, 1 << 20}}) {
        memory_wire wire;
        void *made = &wire;
        EXPECT_EQ(SOAP_NO_METHOD, soap_call(&wire, "http://127.0.0.1:9/", nullptr, wrong, nullptr, &made));
        EXPECT_EQ(nullptr, made);
        EXPECT_EQ("", wire.sent());
    }
}

} // namespace
