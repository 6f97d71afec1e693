// endurance_test.cpp - what the service outlives: garbage, cut requests, its own violent end, many clients at
// once.
#include <atomic>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include <zuv_client_pro/ProfileSoapBindingProxy.h>

#include "service/port_client.h"
#include "service/raw_client.h"

using namespace service_test;

namespace {

std::string create_request(const std::string &name)
{
    return post("Profile", soap11("<protocolProfile:createRequest><protocol:identity><protocol:name>" + name +
                                  "</protocol:name></protocol:identity></protocolProfile:createRequest>"));
}

std::string get_request(const std::string &uri)
{
    return post("Profile", soap11("<protocolProfile:getRequest/>",
                                  "<protocol:targetURI>" + uri + "</protocol:targetURI>"));
}

void expect_useful(service_process &service)
{
    ASSERT_TRUE(service.running());
    EXPECT_EQ(exchange(service.port(), create_request("x")).status, 200);
}

// Sends the bytes, then the end; reads whatever comes.
raw_answer send_and_end(int port, std::string_view bytes)
{
    raw_client client(port);
    client.send(bytes);
    client.end_sending();
    return client.receive();
}

} // namespace

TEST(Endurance, GarbageEndsNothing)
{
    service_process service;
    std::mt19937 random(20240501); // the same garbage each time
    const std::string good = create_request("Ada");
    for (int i = 0; i < 300; ++i) {
        std::string bytes;
        if (i % 3 == 0) { // nothing but noise
            bytes.resize(random() % 2000);
            for (char &c : bytes)
                c = static_cast<char>(random());
        } else { // a request with some bytes changed, in the head too or only in the message
            bytes = good;
            const std::size_t first = i % 3 == 1 ? 0 : good.find("\r\n\r\n") + 4;
            for (int n = 0; n < 5; ++n)
                bytes[first + random() % (bytes.size() - first)] = static_cast<char>(random());
        }
        send_and_end(service.port(), bytes);
    }
    expect_useful(service);
    EXPECT_EQ(service.stop(), 0);
}

TEST(Endurance, CutRequestsEndNothingAndChangeNothing)
{
    service_process service;
    const std::string good = create_request("Ada");
    const std::size_t head = good.find("\r\n\r\n") + 4;
    for (std::size_t length = 0; length < good.size(); length += length < head ? 1 : 7) {
        const raw_answer answer = send_and_end(service.port(), std::string_view(good).substr(0, length));
        EXPECT_NE(answer.status, 200) << "cut at " << length;
        if (length >= head) {
            EXPECT_EQ(answer.status, 400) << "cut at " << length;
        }
    }
    expect_useful(service);
    EXPECT_EQ(service.stop(), 0);
}

TEST(Endurance, HostileMessagesEndNothing)
{
    service_process service;
    std::string deep, references;
    for (int i = 0; i < 100000; ++i)
        deep += "<protocolProfile:profile>";
    for (int i = 0; i < 40; ++i) // each object twice in the one before: 2^40 elements if written as a tree
        references += "<protocolProfile:profile id=\"p" + std::to_string(i) +
                      "\"><protocolProfile:profile href=\"#p" + std::to_string(i + 1) +
                      "\"/><protocolProfile:profile href=\"#p" + std::to_string(i + 1) +
                      "\"/></protocolProfile:profile>";
    references += "<protocolProfile:profile id=\"p40\"/>";
    const std::string cycle =
        "<protocolProfile:createRequest><protocolProfile:profile id=\"a\"><protocolProfile:profile "
        "href=\"#a\"/></protocolProfile:profile></protocolProfile:createRequest>";
    const std::string requests[] = {
        soap11("<protocolProfile:createRequest>" + deep),
        soap11("<protocolProfile:createRequest>" + references + "</protocolProfile:createRequest>"),
        soap11(cycle),
        soap11("<protocolProfile:createRequest id=\"a\"><protocolProfile:profile href=\"#a\"/>"
               "</protocolProfile:createRequest>"),
        soap11("<protocolProfile:createRequest xsi:type=\"protocol:Identity\"/>"),
        soap11("<protocolProfile:createRequest xsi:nil=\"true\"/>"),
        soap11("<protocolProfile:addRequest><protocol:credentials "
               "xsi:nil=\"true\"/></protocolProfile:addRequest>",
               "<protocol:credentials xsi:nil=\"true\"/><protocol:targetURI>u</protocol:targetURI>"),
        "<!DOCTYPE a [<!ENTITY b \"" + std::string(1000, 'b') + "\">]>" + soap11("&b;&b;"),
    };
    for (const std::string &request : requests) {
        const raw_answer answer = exchange(service.port(), post("Profile", request));
        EXPECT_NE(answer.status, 0) << request.substr(0, 1500);
    }
    expect_useful(service);
    EXPECT_EQ(service.stop(), 0);
}

// What references, filters and lists stand for is bounded by what arrived, not by what they could come to.
TEST(Endurance, SmallRequestsMakeNoLargeWork)
{
    constexpr long MEMORY_MAX = 100000; // kilobytes
    const auto times = [](int count, const std::string &text) {
        std::string all;
        for (int i = 0; i < count; ++i)
            all += text;
        return all;
    };
    // Objects that hold the next one twice, 2^depth in all.
    const auto doubled = [](const std::string &tag, int depth, const std::string &content) {
        std::string all = "<" + tag + " id=\"n0\">" + content + "</" + tag + ">";
        for (int i = 1; i < depth; ++i) {
            const std::string next = "<" + tag + " href=\"#n" + std::to_string(i - 1) + "\"/>";
            all +=
                "<" + tag + " id=\"n" + std::to_string(i) + "\">" + next + next + content + "</" + tag + ">";
        }
        return all;
    };
    const auto request = [](const std::string &name, const std::string &content) {
        return "<" + name + ">" + content + "</" + name + ">";
    };
    const auto order = [&](const std::string &content) {
        return request("protocolUpdateOrder:submitRequest", content);
    };
    const auto queries = [&](int count, const std::string &type, const std::string &content) {
        const std::string one =
            "<protocol:queryRequest xsi:type=\"" + type + "\">" + content + "</protocol:queryRequest>";
        return request("protocol:QueryRequests", times(count, one));
    };
    const auto report = [&](const std::string &text) {
        return request("protocolProblemReport:submitRequest",
                       request("protocolProblemReport:problemDescription", text));
    };
    const std::string
        attachment = "protocol:attachment",
        reports = "protocolProblemReport:QueryReportsRequest",
        nothing = "<protocolProblemReport:inclusionFilter><protocolPRFilter:expression "
                  "xsi:type=\"protocolPRFilter:ReportTextComparison\" compareOp=\"containsPhrase\">"
                  "<protocolPRFilter:text>nothing</protocolPRFilter:text></protocolPRFilter:expression>"
                  "</protocolProblemReport:inclusionFilter>",
        filter = "protocolUpdateOrder:inclusionFilter",
        never =
            "<protocolUpdateOrderFilter:expression compareOp=\"equal\" "
            "xsi:type=\"protocolUpdateOrderFilter:CategoryComparison\"><protocolUpdateOrderFilter:category>"
            "x</protocolUpdateOrderFilter:category></protocolUpdateOrderFilter:expression>",
        user = "<protocolUpdateOrder:credentials id=\"c\"><protocol:username>" + std::string(100000, 'u') +
               "</protocol:username></protocolUpdateOrder:credentials>";
    const struct {
        const char *what, *port;
        std::string content;
        const char *answered;
    } rows[] = {
        {"an attachment within itself", "StatusReport",
         request("protocolStatusReport:createRequest",
                 "<protocol:attachment id=\"a\"><protocol:attachment href=\"#a\"/></protocol:attachment>"),
         "Client.InvalidInformation"},
        {"attachments doubled", "StatusReport",
         request("protocolStatusReport:createRequest", doubled(attachment, 40, "")), "Server.DataTooLarge"},
        {"profiles doubled", "Profile",
         request("protocolProfile:createRequest", doubled("protocolProfile:profile", 15, "")),
         "Server.DataTooLarge"},
        {"authentications doubled", "UpdateOrder",
         request("protocolUpdateOrder:authenticateRequest",
                 user + doubled("protocolUpdateOrder:authenticateRequest", 8,
                                "<protocolUpdateOrder:credentials href=\"#c\"/>")),
         "Client.InvalidRequest"},
        {"updates that nobody knows", "UpdateOrder",
         order(times(10001, "<protocolUpdateOrder:updateId>x</protocolUpdateOrder:updateId>")),
         "Client.InvalidRequest"},
        {"deliveries that nobody makes", "UpdateOrder",
         order("<protocolUpdateOrder:updateId>FW-100</protocolUpdateOrder:updateId>" +
               times(101, "<protocolUpdateOrder:deliveryPreference/>")),
         "Client.InvalidRequest"},
        {"one filter again and again", "UpdateOrder",
         order("<" + filter + " id=\"f\">" +
               times(10000, "<protocolUpdateOrderFilter:scope>requisite</protocolUpdateOrderFilter:scope>") +
               never + "</" + filter + ">" + times(10000, "<" + filter + " href=\"#f\"/>")),
         "FilterExpressionTooComplex"},
        {"product collections that nobody knows", "Query",
         queries(1, "protocolUpdateOrder:QueryRecognizedProductCollectionsRequest",
                 times(1001, "<protocolUpdateOrder:productCollectionHierarchyRoot/>")),
         "Client.InvalidRequest"},
        {"a report of many words", "ProblemReport", report(times(2000000, "a b ")), "submitResponse"},
        {"queries that look through it again and again", "Query", queries(20, reports, nothing),
         "FilterExpressionTooComplex"},
        {"queries for a report that is too large", "Query", queries(3, reports, ""),
         "too large for one answer"},
        {"a small report", "ProblemReport", report("nothing to report"), "submitResponse"},
        {"a query that is wanted", "Query", queries(1, reports, nothing), "nothing to report"},
    };
    service_process service;
    for (const auto &r : rows) {
        const raw_answer answer = exchange(service.port(), post(r.port, soap11(r.content)));
        EXPECT_NE(answer.body.find(r.answered), std::string::npos)
            << r.what << ": " << answer.body.substr(0, 3000);
    }
    if (MEMORY_IS_MEASURED) {
        EXPECT_LT(service.peak_memory(), MEMORY_MAX);
    }
    EXPECT_EQ(service.stop(), 0);
}

TEST(Endurance, AcknowledgedDocumentsOutliveAKilledService)
{
    scratch_directory directory;
    const std::vector<std::string> options = {"--database", directory.file("documents.db")};
    std::vector<std::string> uris;
    {
        service_process service(options);
        std::atomic<bool> busy = false;
        std::thread writer([&] { // one client keeps writing until the service dies
            raw_client client(service.port());
            for (;;) {
                client.send(create_request("Ada " + std::to_string(uris.size())));
                const raw_answer answer = client.receive();
                if (answer.status != 200 || element_text(answer.body, "thisURI").empty())
                    return;
                uris.push_back(element_text(answer.body, "thisURI"));
                busy = busy || uris.size() >= 20;
                busy.notify_all();
            }
        });
        busy.wait(false);
        service.kill();
        writer.join();
    }
    ASSERT_GE(uris.size(), 20u);
    service_process again(options);
    for (std::size_t i = 0; i < uris.size(); ++i) {
        const raw_answer answer = exchange(again.port(), get_request(uris[i]));
        ASSERT_EQ(answer.status, 200) << i;
        EXPECT_EQ(element_text(answer.body, "name"), "Ada " + std::to_string(i));
    }
    EXPECT_EQ(again.stop(), 0);
}

TEST(Endurance, ManyClientsWorkSideBySide)
{
    constexpr int CLIENTS = 8, CALLS = 25;
    using port = ProfileSoapBindingProxy;
    service_process service({"--connections", "6"}); // fewer than there are clients: some wait
    const std::string uri = element_text(exchange(service.port(), create_request("x")).body, "thisURI");
    std::vector<std::thread> clients;
    std::atomic<int> failures = 0;
    for (int n = 0; n < CLIENTS; ++n)
        clients.emplace_back([&] {
            port_client<port> client(service, "Profile");
            protocol__Contact contact;
            protocolProfile__ProfileContent more;
            more.contact.push_back(&contact);
            for (int i = 0; i < CALLS; ++i) { // all of them change one document
                failures += client.call(&port::add, more, uri) == nullptr;
                client.proxy.destroy();
            }
        });
    for (std::thread &client : clients)
        client.join();
    EXPECT_EQ(failures, 0);
    {
        port_client<port> client(service, "Profile");
        _protocolProfile__getRequest get;
        const auto *const got = client.call(&port::get, get, uri);
        ASSERT_NE(got, nullptr);
        EXPECT_EQ(got->contact.size(), static_cast<std::size_t>(CLIENTS * CALLS)) << "no change was lost";
    }
    EXPECT_EQ(service.stop(), 0);
}
