// update_order_port_test.cpp - update orders, authentication and queries, beside the walk through all
// operations, which tests/interop takes.
#include <string>

#include <gtest/gtest.h>

#include <zuv_client_pro/UpdateOrderSoapBindingProxy.h>
#include <zuv_client_pro/protocolUpdateOrderFilter.h>
#include <zuv_client_pro/soap_error.h>

#include "service/port_client.h"
#include "service/raw_client.h"

using namespace service_test;

namespace {

using state = protocolUpdateOrder__UpdateOrderState;
using order = protocolUpdateOrder__UpdateOrderContent;
using port = UpdateOrderSoapBindingProxy;

class UpdateOrder : public testing::Test {
protected:
    const order *submit(order &o) { return client.call(&port::submit, o); }

    service_process service{{"--account", "ada:sesame", "--account", "bob:x"}};
    port_client<port> client{service, "UpdateOrder"};
};

} // namespace

TEST_F(UpdateOrder, StateSaysHowFarTheOrderCame)
{
    order named, nothing, unknown, bare;
    named.updateId = {"FW-100"};
    named.includeData = named.includeUpdateIdExpansionDetail = false;
    const order *answered = submit(named);
    ASSERT_NE(answered, nullptr);
    EXPECT_EQ(*answered->state, state::complete_x002eavailable);
    EXPECT_TRUE(answered->updateIdExpansionDetail.empty());
    EXPECT_TRUE(answered->attachment.empty());
    const std::string uri = answered->thisURI.at(0);
    _protocolUpdateOrder__cancelRequest cancel;
    EXPECT_EQ(*client.call(&port::cancel, cancel, uri)->state, state::cancelled);
    _protocolUpdateOrder__closeRequest close;
    EXPECT_EQ(client.call(&port::close, close, uri), nullptr) << "what is cancelled stays so";
    nothing.updateScope = {"tape"};
    EXPECT_EQ(*submit(nothing)->state, state::complete_x002enoUpdates);
    unknown.updateId = {"X"};
    answered = submit(unknown);
    EXPECT_EQ(*answered->state, state::complete_x002enoUpdates);
    EXPECT_EQ(answered->updateIdExpansionDetail.size(), 1u);
    EXPECT_EQ(submit(bare), nullptr);
    EXPECT_NE(client.detail().Client_x002eInsufficientInformation, nullptr);
}

TEST_F(UpdateOrder, TellsWhatItCannotDeliver)
{
    protocol__Medium physical = protocol__Medium::physical;
    protocol__DataPortPreference ftp;
    ftp.transport = {protocol__Transport::FTP};
    protocolUpdateOrder__DeliveryPreference by_post, by_ftp, by_any;
    by_post.medium = &physical;
    by_ftp.dataPortPreference = &ftp;
    order o;
    o.updateId = {"FW-100"};
    o.deliveryPreference = {&by_post};
    const order *answered = submit(o);
    ASSERT_NE(answered, nullptr);
    EXPECT_EQ(*answered->state, state::preprocessed_x002eidentified);
    const auto *const delivery =
        dynamic_cast<protocol__Client_x002eDeliveryIncompatibility *>(answered->error.at(0));
    ASSERT_NE(delivery, nullptr);
    EXPECT_EQ(*delivery->deliverySupported.at(0)->medium, protocol__Medium::electronic);
    o.deliveryPreference = {&by_ftp};
    answered = submit(o);
    EXPECT_NE(dynamic_cast<protocol__Client_x002eDataPortIncompatibility *>(answered->error.at(0)), nullptr);
    o.deliveryPreference = {&by_ftp, &by_any};
    EXPECT_EQ(*submit(o)->state, state::complete_x002eavailable) << "one way that works is enough";
}

TEST_F(UpdateOrder, RefusesFiltersThatItCannotJudge)
{
    std::string category = "critical";
    protocolUpdateOrderFilter__CategoryComparison leaf;
    leaf.category = &category;
    protocolUpdateOrderFilter__Or wide;
    wide.operand.assign(200, &leaf);
    protocolUpdateOrderFilter__Filter filter;
    filter.expression = &wide;
    order o;
    o.inclusionFilter = {&filter};
    EXPECT_EQ(submit(o)->updateIdExpansion, (std::vector<std::string>{"FW-120", "DB-10-P1"}));
    std::vector<protocolUpdateOrderFilter__Not> deep(150);
    for (std::size_t i = 0; i < deep.size(); ++i)
        deep[i].operand =
            i + 1 < deep.size() ? static_cast<protocolUpdateOrderFilter__FilterNode *>(&deep[i + 1]) : &leaf;
    filter.expression = &deep[0];
    EXPECT_EQ(submit(o), nullptr);
    EXPECT_EQ(client.error, SOAP_SERVER_FAULT);
    EXPECT_NE(client.detail().Server_x002eUnsupportedRequest_x002eFilterExpressionTooComplex, nullptr);
    protocolUpdateOrderFilter__FilterNode nothing;
    filter.expression = &nothing;
    EXPECT_EQ(submit(o), nullptr);
    EXPECT_NE(client.detail().Client_x002eMalformedRequest, nullptr);
}

TEST_F(UpdateOrder, AuthenticatesNestedRequests)
{
    std::string ada = "ada", sesame = "sesame", wrong = "sesamf", eve = "eve";
    protocol__Credentials good, stranger, lacking;
    good.username = lacking.username = &ada;
    good.password = &sesame;
    stranger.password = &wrong;
    stranger.username = &eve;
    protocolUpdateOrder__AuthenticateRequest top, second, third;
    top.credentials = &good;
    second.credentials = &stranger;
    third.credentials = &lacking;
    top.authenticateRequest = {&second};
    second.authenticateRequest = {&third};
    const auto *const answered = client.call(&port::authenticate, top);
    ASSERT_NE(answered, nullptr);
    EXPECT_TRUE(answered->success && answered->error.empty());
    EXPECT_EQ(*answered->credentials->username, ada);
    EXPECT_EQ(answered->credentials->password, nullptr) << "secrets are not sent back";
    const auto &inner = *answered->authenticateResponse.at(0);
    EXPECT_FALSE(inner.success);
    EXPECT_NE(dynamic_cast<protocol__Client_x002eAuthentication_x002eNotRecognized *>(inner.error.at(0)),
              nullptr);
    EXPECT_NE(dynamic_cast<protocol__Client_x002eInsufficientInformation *>(
                  inner.authenticateResponse.at(0)->error.at(0)),
              nullptr);
}

// A request that refers to itself nests without end.
TEST_F(UpdateOrder, RefusesRequestsWithoutEnd)
{
    const std::string content =
        "<protocolUpdateOrder:authenticateRequest><protocolUpdateOrder:authenticateRequest id=\"a\">"
        "<protocolUpdateOrder:authenticateRequest href=\"#a\"/>"
        "</protocolUpdateOrder:authenticateRequest></protocolUpdateOrder:authenticateRequest>";
    const raw_answer answer = exchange(service.port(), post("UpdateOrder", soap11(content)));
    EXPECT_EQ(answer.status, 500);
    EXPECT_NE(answer.body.find("Client.InvalidRequest"), std::string::npos) << answer.body;
    EXPECT_TRUE(service.running());
}

TEST(Query, AnswersEachOfABatch)
{
    service_process service;
    const std::string report = "<protocolProblemReport:submitRequest><protocolProblemReport:title>Smoke"
                               "</protocolProblemReport:title></protocolProblemReport:submitRequest>";
    ASSERT_EQ(exchange(service.port(), post("ProblemReport", soap11(report))).status, 200);
    const auto query = [&](const std::string &type, const std::string &content = {}) {
        const std::string request = "<protocol:QueryRequests><protocol:queryRequest xsi:type=\"" + type +
                                    "\">" + content + "</protocol:queryRequest></protocol:QueryRequests>";
        return exchange(service.port(), post("Query", soap11(request))).body;
    };
    struct row {
        const char *type;
        std::string content;
        const char *present, *absent;
    };
    const std::string hierarchy = "<protocolUpdateOrder:formProductCollectionHierarchy>true"
                                  "</protocolUpdateOrder:formProductCollectionHierarchy>";
    const std::string tape_root = "<protocolUpdateOrder:productCollectionHierarchyRoot>storage"
                                  "</protocolUpdateOrder:productCollectionHierarchyRoot>";
    const std::string prune = "<protocolUpdateOrder:recursivelyPruneEmptyProductCollectionLeaves>true"
                              "</protocolUpdateOrder:recursivelyPruneEmptyProductCollectionLeaves>";
    const std::string german =
        "<protocol:inclusionFilter xsi:type=\"protocolUpdateOrderFilter:Filter\">"
        "<protocolUpdateOrderFilter:expression xsi:type=\"protocolUpdateOrderFilter:"
        "LanguageNameComparison\" compareOp=\"equal\"><protocolUpdateOrderFilter:languageName>Deutsch"
        "</protocolUpdateOrderFilter:languageName></protocolUpdateOrderFilter:expression>"
        "</protocol:inclusionFilter>";
    const row rows[] = {
        {"protocolProblemReport:QueryReportsRequest", "", "Smoke", "protocol:error"},
        {"protocolProblemReport:QueryPatternReportsRequest", "", "Index is corrupt after restart", "Smoke"},
        {"protocol:QueryRecognizedSubjectsRequest", "", "ZX100 disk array", "ZX200"},
        {"protocol:QueryRecognizedSubjectsRequest",
         "<protocol:includeSubjectProperty>product</"
         "protocol:includeSubjectProperty><protocol:includeSubjectProperty>"
         "operatingPlatform_name</protocol:includeSubjectProperty>",
         "<protocol:product>ZX100</protocol:product><protocol:operatingPlatform><protocol:name>zxos</"
         "protocol:name>"
         "</protocol:operatingPlatform>",
         "ZX100 disk array"},
        {"protocol:QueryRecognizedLanguagesRequest", "",
         "Fran\xC3\xA7"
         "ais",
         "protocol:error"},
        {"protocol:QueryRecognizedLanguagesRequest", german, "Deutsch", "English"},
        {"protocol:QueryRecognizedCountriesRequest", "", "Austria", "protocol:error"},
        {"protocolUpdateOrder:QueryRecognizedProductCollectionsRequest", "", "Servers", "recognizedSubject"},
        {"protocolUpdateOrder:QueryRecognizedProductCollectionsRequest",
         "<protocolUpdateOrder:includeSubjects>true</protocolUpdateOrder:includeSubjects>" + prune,
         "<protocol:product>ZDB</protocol:product>", "Servers"},
        {"protocolUpdateOrder:QueryRecognizedProductCollectionsRequest", hierarchy + tape_root + prune,
         "<protocolUpdateOrder:productCollection>disk<", "tape"},
        {"protocolUpdateOrder:QueryRecognizedCategoriesRequest", "", "A group of updates", "protocol:error"},
        {"protocolUpdateOrder:QueryRecognizedAttributesRequest", "", "reboot", "protocol:error"},
        {"protocol:QueryRequest", "", "Server.UnsupportedRequest", "recognized"},
        {"protocol:QueryRecognizedLanguagesRequest", "<protocol:inclusionFilter/>", "Client.MalformedRequest",
         "English"},
    };
    for (const auto &r : rows) {
        const std::string body = query(r.type, r.content);
        EXPECT_NE(body.find(r.present), std::string::npos) << r.type << '\n' << body;
        EXPECT_EQ(body.find(r.absent), std::string::npos) << r.type << '\n' << body;
    }
    const raw_answer typed =
        exchange(service.port(), post("Query", soap12("<any xsi:type=\"protocol:PingRequest\"/>")));
    EXPECT_NE(typed.body.find("protocol:PingResponse"), std::string::npos) << typed.body;
}
