// ports_test.cpp - every operation of every port: its request byte for byte, its answer, its faults, no
// answer.
//
// One row for each operation; the port descriptions tell which there must be. The golden files are composed
// by hand from the contract, never recorded. The rules of the cycle itself: call_cycle_test.cpp.
#include <gtest/gtest.h>

#include <deque>
#include <filesystem>
#include <functional>
#include <memory>
#include <regex>
#include <set>

#include <zuv_client_pro/InventoryReportSoapBindingProxy.h>
#include <zuv_client_pro/ProblemReportSoapBinding.h>
#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/StatusReportSoapBindingProxy.h>
#include <zuv_client_pro/UpdateOrderSoapBindingProxy.h>
#include <zuv_client_pro/protocolUpdateOrderFilter.h>
#include <zuv_client_pro/soap_binary.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_xml.h>
#include <zuv_client_pro/type_ids.h>

#include "support/call_wire.h"
#include "support/golden.h"

namespace {

constexpr char OTHER_PLACE[] = "http://other.example/place";

// --- one operation ---

struct outcome {
    int error;
    bool answered; // the response record was filled
};

struct operation {
    std::string port, name;
    int request_id, response_id;
    std::unique_ptr<call_wire> wire = std::make_unique<call_wire>(); // outlives the context
    std::shared_ptr<soap> ctx = {};
    // A call with the row's request; by the full form if there is an action, with no response record if
    // asked.
    std::function<outcome(const char *action, bool reads)> call = {};
    std::string answer_content = {};
    std::function<void()> expect_answer = {}; // the response holds what answer_content says

    std::string golden_name() const
    {
        std::string low = port;
        std::transform(low.begin(), low.end(), low.begin(), [](char c) { return c < 'a' ? c + 32 : c; });
        return low + "_" + name + ".txt";
    }

    // The connection from now on, with one answer.
    void connect(std::string answer)
    {
        wire->carry(*ctx);
        wire->sent.clear();
        wire->answers = {std::move(answer)};
    }
};

template <class V> V *kept(V value) // for the whole run
{
    static std::deque<V> all;
    return &all.emplace_back(std::move(value));
}

std::string *text(const char *value)
{
    return kept(std::string(value));
}

template <class T, class Fill> T *made(Fill fill)
{
    T *object = kept(T());
    fill(*object);
    return object;
}

template <class C, class M> C *with(M C::*member, M value)
{
    return made<C>([&](C &object) { object.*member = value; });
}

// --- answers, by class of the response; "p" is the port's prefix, "c" the common one ---

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

// An operation of a proxy.
template <class P, class R, class S>
operation proxy_row(operation row, int (P::*short_form)(R *, S &),
                    int (P::*full_form)(const char *, const char *, R *, S &),
                    void (*fill)(std::type_identity_t<R> &, soap &))
{
    const auto proxy = std::make_shared<P>();
    const auto response = std::make_shared<S>();
    row.ctx = proxy;
    row.call = [=, p = proxy.get()](const char *action, bool reads) {
        R request;
        fill(request, *p);
        response->result = nullptr;
        auto *nowhere = reinterpret_cast<S *>(static_cast<std::uintptr_t>(0));
        S &target = reads ? *response : *nowhere;
        const int error = action ? (p->*full_form)(OTHER_PLACE, action, &request, target)
                                 : (p->*short_form)(&request, target);
        return outcome{error, response->result != nullptr};
    };
    set_answer(row, response);
    return row;
}

// An operation of the port without a proxy: the cycle as a host would write it.
template <class W, class S>
operation host_row(operation row, void (*fill)(std::remove_pointer_t<decltype(W::request)> &, soap &))
{
    using response_class = std::remove_pointer_t<decltype(S::result)>;
    const auto response = std::make_shared<S>();
    row.ctx = std::make_shared<soap>();
    const std::string tag = "protocol" + row.port + ":" + row.name + "Response";
    row.call = [=, id = row.request_id, ctx = row.ctx.get()](const char *action, bool reads) {
        std::remove_pointer_t<decltype(W::request)> request;
        fill(request, *ctx);
        W wrapper{&request};
        const auto write = [&] {
            return soap_envelope_out_begin(ctx) || soap_header_put(ctx) || soap_body_out_begin(ctx) ||
                   soap_write_element(ctx, &wrapper, nullptr, 0, id) || soap_body_out_end(ctx) ||
                   soap_envelope_out_end(ctx);
        };
        response->result = nullptr;
        ctx->encoding_style = nullptr; // a literal message
        soap_reset_call(ctx);
        soap_mark_header(ctx);
        soap_mark_object(ctx, &wrapper, id);
        const char *endpoint = action ? OTHER_PLACE : "http://127.0.0.1:9080/zuv/v1.0/services/ProblemReport";
        if (soap_count_begin(ctx) || ((ctx->mode & MODE_COUNTING) && write()) || soap_count_end(ctx) ||
            soap_server_connect(ctx, endpoint, action ? action : "") || write() || soap_send_finish(ctx) ||
            !reads || soap_receive_begin(ctx) || soap_envelope_in_begin(ctx) || soap_header_get(ctx) ||
            soap_body_in_begin(ctx))
            return outcome{soap_socket_release(ctx), false};
        auto *result = static_cast<response_class *>(
            soap_instantiate(ctx, response_class().soap_type(), nullptr, nullptr, nullptr));
        if (!result->soap_get(ctx, tag.c_str(), nullptr))
            return outcome{soap_fault_receive(ctx, 0), false};
        response->result = result;
        if (soap_body_in_end(ctx) == 0 && soap_envelope_in_end(ctx) == 0)
            soap_receive_finish(ctx);
        return outcome{soap_socket_release(ctx), true};
    };
    set_answer(row, response);
    return row;
}

// --- the rows ---

void target(soap &ctx, const char *uri)
{
    soap_header_record(&ctx);
    ctx.header->header = with(&protocol__Header::targetURI, text(uri));
}

protocol__Attachment *attachment(const char *description)
{
    return with(&protocol__Attachment::description, text(description));
}

protocolUpdateOrderFilter__ProductComparison *product(protocolUpdateOrderFilter__StringCompareOp by,
                                                      const char *value)
{
    auto *comparison = with(&protocolUpdateOrderFilter__ProductComparison::product, text(value));
    comparison->compareOp = by;
    return comparison;
}

#define IDS(Port, op) SOAP_TYPE___protocol##Port##__##op, SOAP_TYPE___protocol##Port##__##op##Response
#define ROW(Port, op, ...)                                                                                   \
    rows.push_back(proxy_row({#Port, #op, IDS(Port, op)}, &Port##SoapBindingProxy::op,                       \
                             &Port##SoapBindingProxy::_##op,                                                 \
                             []([[maybe_unused]] auto &r, [[maybe_unused]] soap &ctx) { __VA_ARGS__ }))
#define HOST_ROW(Port, op, ...)                                                                              \
    rows.push_back(host_row<__protocol##Port##__##op, __protocol##Port##__##op##Response>(                   \
        {#Port, #op, IDS(Port, op)},                                                                         \
        []([[maybe_unused]] auto &r, [[maybe_unused]] soap &ctx) { __VA_ARGS__ }))

void add_profile_rows(std::vector<operation> &rows)
{
    ROW(Profile, create, {
        r.state = kept(protocolProfile__ProfileState::active);
        r.profileAuthority = text("registry & co");
        r.identity = with(&protocol__Identity::name, text("Ada's <workshop>"));
        r.identity->type = kept(protocol__IdentityType::organization);
        r.identity->customerNumber = {"1001", "1002"};
        protocol__Address *address = with(&protocol__Address::city, text("Graz"));
        address->addressType = kept(protocol__AddressType::billing);
        r.contact = {kept(protocol__Contact())};
        r.contact[0]->address = {address};
        r.contact[0]->email = {"ada@workshop.example"};
        r.contact[0]->contactPreference = {protocol__ContactPreference::email,
                                           protocol__ContactPreference::voice};
    });
    ROW(Profile, get, target(ctx, "urn:zuv:profile:1"););
    ROW(Profile, set, {
        static unsigned char bytes[] = {0, 1, 2, 255};
        target(ctx, "urn:zuv:profile:1");
        r.thisURI = {"urn:zuv:profile:1"};
        protocol__Credentials *credentials = with(&protocol__Credentials::username, text("ada"));
        credentials->certificate = kept(xsd__base64Binary());
        credentials->certificate->content = bytes;
        credentials->certificate->size = sizeof bytes;
        credentials->key = kept(xsd__base64Binary());
        credentials->key->content = bytes;
        r.credentials = {credentials};
    });
    ROW(Profile, add, {
        target(ctx, "urn:zuv:profile:1");
        auto *relationship = kept(protocolProfile__AssociationRelationship());
        relationship->type = text("parent");
        r.association = {with(&protocolProfile__Association::id, text("17"))};
        r.association[0]->relationship = relationship;
        auto *subject = kept(protocol__RecognizedSubject());
        subject->name = text("nested");
        subject->authorized = kept(true);
        r.profile = {kept(protocolProfile__ProfileContent())};
        r.profile[0]->identity = subject;
    });
    ROW(Profile, refreshCredentials, {
        target(ctx, "urn:zuv:profile:1");
        r.credentials = with(&protocol__Credentials::token, text("t-1"));
        r.credentials->state = kept(protocol__CredentialsState::expired);
        r.credentials->expiration = text("2026-11-21T00:00:00Z");
    });
    ROW(Profile, remove, {
        target(ctx, "urn:zuv:profile:1");
        ctx.input_mode = ctx.output_mode = MODE_KEEP_ALIVE;
        ctx.auth_user = "ada";
        ctx.auth_password = "secret";
    });
}

void add_inventory_report_rows(std::vector<operation> &rows)
{
    ROW(InventoryReport, get, target(ctx, "urn:zuv:inventoryreport:1"););
    ROW(InventoryReport, submit, {
        r.thisURI = {"urn:1", "urn:2"};
        r.state = kept(protocolInventoryReport__InventoryReportState::open);
        r.clientURI = text("urn:client");
        r.test = kept(false);
        r.contentInterpretation = kept(protocol__ContentInterpretation::partial);
        r.subject = with(&protocol__Identity::serialNumber, text("S-77"));
        r.subject->type = kept(protocol__IdentityType::hardware);
        r.subjectLocation = with(&protocol__Address::city, text("Linz"));
        r.dateTime = text("2026-11-21T08:00:00Z");
        r.reportingPeriod = text("P1D");
        r.acl = {with(&protocol__Acl::id, text("ada"))};
        r.acl[0]->right = {protocol__Right::readDocument, protocol__Right::alterDocument};
        r.inventoryReport = {
            with(&protocolInventoryReport__InventoryReportContent::clientURI, text("urn:nested"))};
        r.attachment = {attachment("parts list")};
        r.attachment[0]->data = with(&protocol__Data::value, std::string("1 < 2"));
        r.attachment[0]->data->encoding = kept(protocol__Encoding::UTF_8);
    });
    ROW(InventoryReport, close, target(ctx, "urn:zuv:inventoryreport:1"););
    ROW(InventoryReport, cancel, target(ctx, "urn:zuv:inventoryreport:1"););
    ROW(InventoryReport, remove, r.thisURI = {"urn:1"};);
}

void add_status_report_rows(std::vector<operation> &rows)
{
    ROW(StatusReport, create, {
        r.state = kept(protocolStatusReport__StatusReportState::open);
        r.subjectEnvironment = {with(&protocol__Identity::name, text("rack 1")),
                                with(&protocol__Identity::name, text("rack 2"))};
        auto *fall = kept(protocolStatusReport__Reason_x002eEvent_x002eProblem_x002eOccurred());
        fall->description = text("it fell");
        fall->notes = {"twice"};
        r.reason = {fall, with(&protocolStatusReport__Reason::description, text("as such"))};
    });
    ROW(StatusReport, get, target(ctx, "urn:zuv:statusreport:1"););
    ROW(StatusReport, submit, {
        r.test = kept(true);
        r.dateTime = text("2026-11-21T08:00:00Z");
        r.submitter = with(&protocol__Identity::hostName, text("host.example"));
        r.processTime = text("PT2S");
        r.statusReport = {with(&protocolStatusReport__StatusReportContent::state,
                               kept(protocolStatusReport__StatusReportState::complete))};
        auto *gone = kept(protocol__Client_x002eObjectNotFound());
        gone->description = text("gone");
        gone->uri = {"urn:7"};
        r.error = {gone};
    });
    ROW(StatusReport, close, target(ctx, "urn:zuv:statusreport:1"););
    ROW(StatusReport, cancel, target(ctx, "urn:zuv:statusreport:1"););
    ROW(StatusReport, attach, {
        target(ctx, "urn:zuv:statusreport:1");
        r.attachment = with(&protocol__Attachment::state, kept(protocol__AttachmentState::pending));
        r.attachment->size = text("1024");
        r.dataPortPreference = kept(protocol__DataPortPreference());
        r.dataPortPreference->direction = {protocol__Direction::in};
        r.dataPortPreference->transport = {protocol__Transport::HTTPS, protocol__Transport::inBandEmbedded};
    });
    ROW(StatusReport, attachStatus, {
        target(ctx, "urn:zuv:statusreport:1");
        r.attachmentURI = text("urn:a");
        r.problemEncountered = kept(false);
        r.percentComplete = kept(62.5);
        r.sizeTransferred = text("640");
        r.elapsedTime = text("PT9S");
        r.intention = kept(protocol__AttachStatusIntention::proceed);
    });
    ROW(StatusReport, remove, target(ctx, "urn:zuv:statusreport:1"););
}

void add_update_order_rows(std::vector<operation> &rows)
{
    ROW(UpdateOrder, get, target(ctx, "urn:zuv:updateorder:1"););
    ROW(UpdateOrder, submit, {
        r.updateScope = {"all"};
        r.updateId = {"U1", "U2"};
        r.updateIdQualified = {with(&protocolUpdateOrder__UpdateIdQualified::updateId, text("U3"))};
        r.updateIdQualified[0]->updateIdQualifier = text("q");
        r.includeData = false;
        r.includeMetaData = r.includeRequisites = true;
        r.selectRequisites = kept(protocolUpdateOrder__SelectRequisites::lastSupersedingOnly);
        r.includePatches = kept(true);
        using compare = protocolUpdateOrderFilter__StringCompareOp;
        auto *negation = kept(protocolUpdateOrderFilter__Not());
        negation->operand = product(compare::startsWithSubstring, "Q");
        auto *both = kept(protocolUpdateOrderFilter__And());
        both->operand = {product(compare::equal, "P"), negation};
        r.inclusionFilter = {kept(protocolUpdateOrderFilter__Filter())};
        r.inclusionFilter[0]->expression = both;
        auto *port = kept(protocol__DataPortPreference());
        port->transport = {protocol__Transport::FTP};
        r.deliveryPreference = {with(&protocolUpdateOrder__DeliveryPreference::form, text("zip"))};
        r.deliveryPreference[0]->dataPortPreference = port;
        r.languagePreference = {with(&protocol__Language::value, std::string("de-AT"))};
        r.customerReferenceId = text("C-1");
    });
    ROW(UpdateOrder, close, target(ctx, "urn:zuv:updateorder:1"););
    ROW(UpdateOrder, cancel, target(ctx, "urn:zuv:updateorder:1"););
    ROW(UpdateOrder, remove, );
    ROW(UpdateOrder, authenticate, {
        r.credentials = with(&protocol__Credentials::username, text("ada"));
        r.credentials->password = text("<secret>");
        r.submitter = with(&protocol__Identity::name, text("Ada"));
        r.authenticateRequest = {with(&protocolUpdateOrder__AuthenticateRequest::credentials,
                                      with(&protocol__Credentials::token, text("t-2")))};
    });
}

void add_problem_report_rows(std::vector<operation> &rows)
{
    HOST_ROW(ProblemReport, get, target(ctx, "urn:zuv:problemreport:1"););
    HOST_ROW(ProblemReport, submit, {
        r.state = kept(protocolProblemReport__ProblemReportState::submitted);
        r.subject = with(&protocol__Identity::product, text("P"));
        r.subjectLocationId = text("L4");
        r.problemType = {protocolProblemReport__ProblemType::performance,
                         protocolProblemReport__ProblemType::intermittent};
        r.title = text("slow");
        r.problemDescription = text("line one\nline two");
        r.occurrenceDateTime = text("2026-11-21T08:00:00Z");
        r.severity = text("2");
        r.impact = {protocolProblemReport__Impact::systemImpaired};
        r.actionTaken = {kept(protocolProblemReport__Action_x002eNothing())};
        r.actionTaken[0]->description = text("waited");
        r.moreDataExpected = kept(true);
        r.notes = {"n1"};
        r.contact = {with(&protocol__Contact::name, text("Ada"))};
        r.serviceProviderReport = {with(&protocolProblemReport__ServiceProviderReport::id, text("R-1"))};
    });
    HOST_ROW(ProblemReport, attach, {
        target(ctx, "urn:zuv:problemreport:1");
        r.attachment = attachment("trace");
        r.attachment->sequenceNumber = text("1");
    });
    HOST_ROW(ProblemReport, attachStatus, {
        target(ctx, "urn:zuv:problemreport:1");
        r.description = text("broken off");
        r.richNotes = {with(&protocol__RichNotes::category, text("c"))};
        r.richNotes[0]->author = with(&protocol__Identity::name, text("Ada"));
        r.problemEncountered = kept(true);
        r.intention = kept(protocol__AttachStatusIntention::retry);
        r.recommendedAttachmentState = kept(protocol__AttachmentState::error);
    });
    HOST_ROW(ProblemReport, remove, target(ctx, "urn:zuv:problemreport:1"););
}

std::vector<operation> all_rows()
{
    std::vector<operation> rows;
    add_profile_rows(rows);
    add_inventory_report_rows(rows);
    add_status_report_rows(rows);
    add_update_order_rows(rows);
    add_problem_report_rows(rows);
    return rows;
}

// --- messages ---

std::string message(const operation &row, const std::string &body, bool version_12 = false)
{
    return http_answer(
        std::string("<E:Envelope xmlns:E=\"http://") +
        (version_12 ? "www.w3.org/2003/05/soap-envelope" : "schemas.xmlsoap.org/soap/envelope/") +
        "\" xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\""
        " xmlns:c=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0\""
        " xmlns:p=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0/" +
        row.port + "\"><E:Body>" + body + "</E:Body></E:Envelope>");
}

std::string answer(const operation &row)
{
    const std::string tag = "p:" + row.name + "Response";
    return message(row, "<" + tag + ">" + row.answer_content + "</" + tag + ">");
}

TEST(Ports, have_a_row_for_every_operation_that_their_descriptions_name)
{
    std::set<std::string> named, rows;
    for (const auto &file : std::filesystem::recursive_directory_iterator(ZUV_SCHEMA_DIR)) {
        if (file.path().extension() != ".wsdl")
            continue;
        std::ostringstream whole;
        whole << std::ifstream(file.path()).rdbuf();
        const std::string text = whole.str(), start = "<wsdl:portType ";
        const std::size_t from = text.find(start), to = text.find("</wsdl:portType>");
        ASSERT_TRUE(from < to && to != std::string::npos && text.find(start, to) == std::string::npos)
            << file;
        const std::string port = text.substr(from, to - from);
        static const std::regex operation("<wsdl:operation name=\"([^\"]+)\"");
        for (std::sregex_iterator it(port.begin(), port.end(), operation), end; it != end; ++it)
            named.insert(file.path().stem().string() + "." + it->str(1));
    }
    for (const auto &row : all_rows()) {
        EXPECT_TRUE(rows.insert(row.port + "." + row.name).second) << row.golden_name();
        const std::string wrapper = "-protocol" + row.port + ":" + row.name;
        EXPECT_STREQ(wrapper.c_str(), soap_type_name(row.request_id));
        EXPECT_STREQ((wrapper + "Response").c_str(), soap_type_name(row.response_id));
    }
    EXPECT_EQ(named, rows);
}

TEST(Ports, send_the_golden_request_and_read_the_answer_into_its_class)
{
    for (operation &row : all_rows()) {
        SCOPED_TRACE(row.golden_name());
        const golden::message request = golden::read(row.golden_name());
        row.connect(answer(row));
        const outcome got = row.call(nullptr, true);
        EXPECT_EQ(request.whole(), row.wire->sent);
        EXPECT_EQ(0, got.error);
        ASSERT_TRUE(got.answered);
        row.expect_answer();
        EXPECT_EQ((row.ctx->output_mode & MODE_KEEP_ALIVE) ? 0 : 1, row.wire->closed);
#ifndef ZUV_SANITIZED // the sanitizers don't let a null reference through
        row.connect("never read");
        EXPECT_EQ(0, row.call(nullptr, false).error) << "without a response record";
        EXPECT_EQ(request.whole(), row.wire->sent);
        EXPECT_EQ("never read", row.wire->answers.at(0));
#endif
        // Full forms take an endpoint and an action, and change nothing else.
        row.connect(answer(row));
        EXPECT_EQ(0, row.call("urn:act", true).error);
        EXPECT_EQ(OTHER_PLACE, row.wire->opened_at);
        const std::size_t end = row.wire->sent.find("\r\n\r\n");
        EXPECT_EQ(0U, row.wire->sent.find("POST /place HTTP/1.1\r\nHost: other.example\r\n"));
        EXPECT_LT(row.wire->sent.find("\r\nSOAPAction: \"urn:act\"\r\n"), end);
        EXPECT_EQ(request.body, row.wire->sent.substr(end + 4));
    }
}

// Rows and faults go around together, so that each fault of the contract is met in both versions.
TEST(Ports, read_every_fault_into_its_member_of_the_detail)
{
    static const char *const spelled[] = {
#define NAME(fault) #fault,
        SOAP_DETAIL_FAULTS(NAME)
#undef NAME
    };
    ASSERT_EQ(29U, std::size(spelled));
    auto rows = all_rows();
    for (std::size_t i = 0; i < 2 * std::size(spelled); ++i) {
        operation &row = rows[i % rows.size()];
        const bool version_12 = i >= std::size(spelled);
        const std::string name =
            std::regex_replace(spelled[i % std::size(spelled)], std::regex("_x002e"), ".");
        SCOPED_TRACE(row.golden_name() + " " + name);
        const bool client = name.rfind("Client", 0) == 0;
        const std::string detail = "<c:" + name + "><c:subcode>s</c:subcode><c:description>why " + name +
                                   "</c:description></c:" + name + ">";
        const std::string fault =
            version_12 ? std::string("<E:Code><E:Value>E:") + (client ? "Sender" : "Receiver") +
                             "</E:Value></E:Code><E:Reason><E:Text>so</E:Text></E:Reason><E:Detail>" +
                             detail + "</E:Detail>"
                       : std::string("<faultcode>E:") + (client ? "Client" : "Server") +
                             "</faultcode><faultstring>so</faultstring><detail>" + detail + "</detail>";
        row.connect(message(row, "<E:Fault>" + fault + "</E:Fault>", version_12));
        const outcome got = row.call(nullptr, true);
        EXPECT_EQ(client ? SOAP_CLIENT_FAULT : SOAP_SERVER_FAULT, got.error);
        EXPECT_FALSE(got.answered);
        ASSERT_NE(nullptr, row.ctx->fault);
        EXPECT_STREQ("so", *soap_fault_string_field(row.ctx.get()));
        const SOAP_ENV__Fault &read = *row.ctx->fault;
        const SOAP_ENV__Detail *place = version_12 ? read.Detail : read.detail;
        ASSERT_NE(nullptr, place);
        std::vector<const protocol__Fault *> found;
#define FOUND(fault)                                                                                         \
    if (place->fault)                                                                                        \
        found.push_back(place->fault);
        SOAP_DETAIL_FAULTS(FOUND)
#undef FOUND
        ASSERT_EQ(1U, found.size());
        EXPECT_EQ("protocol:" + name, soap_type_name(found[0]->soap_type()));
        EXPECT_EQ("why " + name, *found[0]->description);
        EXPECT_EQ(nullptr, place->__any);
        EXPECT_EQ(nullptr, place->fault);
    }
}

} // namespace
