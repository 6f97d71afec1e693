// call_cycle_test.cpp - a call from its endpoint to its release: where it goes, how it ends, what stays of it.
#include "support/call_wire.h"
#include "support/testing.h"

namespace {

std::string envelope(const std::string &body, const std::string &uri = ENVELOPE_11,
                     const std::string &header = "")
{
    return "<?xml version=\"1.0\"?>" + answer_envelope(header + "<E:Body>" + body + "</E:Body>", uri);
}

const std::string OK = "<p:getResponse><p:thisURI>urn:1</p:thisURI></p:getResponse>";

std::string fault_11(const std::string &code, const std::string &detail = "")
{
    return "<E:Fault><faultcode>" + code + "</faultcode><faultstring>no such thing</faultstring>" + detail +
           "</E:Fault>";
}

std::string fault_12(const std::string &code)
{
    return "<E:Fault><E:Code><E:Value>" + code +
           "</E:Value></E:Code><E:Reason><E:Text xml:lang=\"en\">no such thing"
           "</E:Text></E:Reason><E:Detail><c:Client.ObjectNotFound><c:uri>urn:7</c:uri></"
           "c:Client.ObjectNotFound>"
           "</E:Detail></E:Fault>";
}

class call_cycle : public testing::Test, public profile_call {
protected:
    call_cycle() : profile_call(0) {}

    int get(const std::string &body, const std::string &uri = ENVELOPE_11)
    {
        return profile_call::get(http_answer(envelope(body, uri)));
    }

    __protocolProfile__getResponse &response = got;
};

TEST_F(call_cycle, goes_to_the_default_endpoint_until_one_is_given_and_then_stays_there)
{
    EXPECT_EQ(0, get(OK));
    EXPECT_EQ("http://127.0.0.1:9080/zuv/v1.0/services/Profile", wire.opened_at);
    wire.answers.push_back(http_answer(envelope(OK)));
    EXPECT_EQ(0, proxy._get("http://one.example/x", nullptr, &request, response));
    wire.answers.push_back(http_answer(envelope(OK)));
    EXPECT_EQ(0, proxy.get(nullptr, response));
    EXPECT_NE(std::string::npos, wire.sent.find("<SOAP-ENV:Body></SOAP-ENV:Body>")) << "a null request";
    EXPECT_EQ("http://one.example/x", wire.opened_at);
    proxy.destroy();
    EXPECT_STREQ("http://one.example/x", proxy.endpoint);
}

TEST_F(call_cycle, refuses_an_endpoint_that_leads_nowhere_before_anything_is_sent)
{
    // The last two have no scheme: plain XML without HTTP.
    std::vector<std::string> taken = words(
        "http://h/ HTTPS://h httpg://h:1/x soap.udp://h:9/ http://h:65535/a:b@c?d#e http://[::1]:8080/a "
        "http://[fe80::1%eth0]/ http://h_x-1.example http://h:00000000000000000080/ h:80/x h/x//y");
    taken.push_back(" http://h/  http://i/ ");
    std::vector<std::string> refused = words(
        "http: http:h/x https:443/ http:// http:///x https://:443/ http://[]/ http://[::1 http://[::1]x/ "
        "http://h:/ http://h:0/ http://h:65536/ http://h:4294967376/ http://h:-1/ http://h:+80/ http://h:8x/ "
        "http://h::80/ http://[::1]x80/ http://h:80?q http://h?q=http://i/ http://h#f http://h\\i/ "
        "http://h[/ "
        "http://h]/ htps://h/ ftp://h/ HTTPG://h/ soap.tcp://h/ httpsoap.udp.long://h/ h/x?q=http://i/");
    refused.insert(refused.end(), {"", " "});
    const std::string endless = "http://" + std::string(2000, '?');
    const std::tuple<const char *, const char *, std::string> quoted_otherwise[] = {
        {"the one of several", "http://h/ htps://i/ http://j/", "htps://i/"},
        {"no controls", "http://h/a\tb\x7F", "http://h/a?b?"},
        {"no line breaks", "http://h\r\nX: y/", "http://h??X:"},
        {"no password", "http://u:pw@h/", "http://...@h/"},
        {"none with an @", "https://u:p@w@h:443/x@y", "https://...@h:443/x@y"},
        {"none without a scheme", "u:pw@h/", "...@h/"},
        {"so much of it", endless.c_str(), endless.substr(0, 881)}};
    const auto call_at = [this](const char *endpoint) {
        wire.opened = 0;
        wire.sent.clear();
        wire.answers = {http_answer(envelope(OK))};
        return proxy._get(endpoint, nullptr, &request, response);
    };
    const auto refuses = [&](const char *endpoint, const std::string &quoted) {
        for (const char *const time : {"first", "again"}) { // what is known of it then
            SCOPED_TRACE(std::string(endpoint) + " " + time);
            EXPECT_EQ(SOAP_TCP_ERROR, call_at(endpoint));
            EXPECT_EQ(0u, text_of(proxy.soap_fault_string()).find("No call can go to \"" + quoted + "\": "))
                << proxy.soap_fault_string();
            EXPECT_EQ(0, wire.opened);
            EXPECT_EQ("", wire.sent);
        }
    };
    for (const std::string &endpoint : taken)
        for (const char *const time : {"first", "again"})
            EXPECT_EQ(0, call_at(endpoint.c_str())) << endpoint << " " << time;
    for (const std::string &endpoint : refused)
        refuses(endpoint.c_str(), endpoint);
    for (const auto &[rule, endpoint, quoted] : quoted_otherwise)
        refuses(endpoint, quoted);
    proxy.legacy = LEGACY_ANY_ENDPOINT;
    EXPECT_EQ(0, call_at("htps://h:99999/"));
    EXPECT_EQ(0, call_at("")) << "by descriptor, or the hooks in its place";
}

TEST_F(call_cycle, a_failure_never_shows_the_fault_of_an_earlier_call)
{
    static const std::tuple<const char *, void (*)(soap &), const char *> cases[] = {
        {"no answer", [](soap &) {}, "End of file or no input: Operation interrupted or timed out"},
        {"not sent", [](soap &ctx) { ctx.on_send = [](soap *, const char *, std::size_t) { return -1; }; },
         "End of file or no input: Operation interrupted or timed out"},
        {"refused by a hook",
         [](soap &ctx) { ctx.on_connect = [](soap *, const char *, const char *, int) { return 99; }; },
         "Error 99"},
        {"not counted",
         [](soap &ctx) { ctx.on_send_prepare_begin = [](soap *c) { return c->error = SOAP_USER_ERROR; }; },
         "User data error"},
    };
    for (const auto &[rule, fail, text] : cases) {
        SCOPED_TRACE(rule);
        ASSERT_EQ(SOAP_CLIENT_FAULT, get(fault_11("E:Client", "<detail><x/></detail>")));
        fail(proxy);
        EXPECT_NE(0, proxy.get(&request, response));
        std::ostringstream printed;
        proxy.soap_stream_fault(printed);
        EXPECT_EQ("SOAP-ENV:Client [no subcode]\n\"" + std::string(text) + "\"\nDetail: [no detail]\n",
                  printed.str().substr(printed.str().find("SOAP-ENV")));
        proxy.on_connect = nullptr;
        proxy.on_send_prepare_begin = nullptr;
        wire.carry(proxy);
    }
}

TEST_F(call_cycle, an_answer_cut_anywhere_is_an_error_until_its_envelope_is_whole_and_ends_the_connection)
{
    proxy.input_mode = proxy.output_mode = MODE_KEEP_ALIVE;
    const std::string body = envelope(OK), chunked = "HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n";
    for (const std::string &whole : {http_answer(body), chunked + in_chunks_of(100, body)})
        for (std::size_t cut = 0; cut < whole.size(); ++cut) {
            wire.answers = {whole.substr(0, cut)};
            EXPECT_EQ(cut > whole.rfind('>'), proxy.get(&request, response) == 0) << cut << " of " << whole;
            EXPECT_EQ(-1, proxy.socket) << cut << " of " << whole;
            wire.answers.clear();
        }
}

TEST_F(call_cycle, maps_fault_codes_in_both_versions)
{
    static const std::tuple<const char *, const char *, int> cases[] = {
        {ENVELOPE_11, "E:Client", SOAP_CLIENT_FAULT},
        {ENVELOPE_11, "E:Server", SOAP_SERVER_FAULT},
        {ENVELOPE_11, "E:MustUnderstand", SOAP_MUST_UNDERSTAND},
        {ENVELOPE_11, "E:VersionMismatch", SOAP_VERSION_MISMATCH},
        {ENVELOPE_11, "E:Other", SOAP_FAULT},
        {ENVELOPE_11, "E:Client.Authentication", SOAP_CLIENT_FAULT}, // what a dot adds is detail
        {ENVELOPE_11, "E:Server.Processing.", SOAP_SERVER_FAULT},
        {ENVELOPE_11, "E:Clients.Authentication", SOAP_FAULT},
        {ENVELOPE_11, "c:Client.Authentication", SOAP_FAULT}, // of another namespace
        {ENVELOPE_12, "E:Sender", SOAP_CLIENT_FAULT},
        {ENVELOPE_12, "E:Receiver", SOAP_SERVER_FAULT},
    };
    for (const auto &[version, code, error] : cases) {
        const bool v12 = std::string(version) == ENVELOPE_12;
        EXPECT_EQ(error, get(v12 ? fault_12(code) : fault_11(code), version)) << code;
        EXPECT_EQ(error, proxy.error);
        EXPECT_EQ(nullptr, response.result);
        ASSERT_NE(nullptr, proxy.soap_fault());
        EXPECT_STREQ("no such thing", proxy.soap_fault_string());
    }
}

// What could be read of a detail, as one text.
std::string read_of(const SOAP_ENV__Detail *detail)
{
    if (!detail)
        return "none";
    std::string all;
    if (const auto *port = detail->Client_x002eDataPortIncompatibility)
        all += "port " + (port->description ? *port->description : "") + " " +
               std::to_string(port->transport.size()) + ";";
    if (const auto *lost = detail->Client_x002eObjectNotFound)
        all += "lost " + (lost->uri.empty() ? "" : lost->uri[0]) + ";";
    if (detail->fault || detail->__type)
        all += detail->fault ? "object;" : "a type of nothing;";
    return all + (detail->__any ? "raw" : "");
}

// Typed members come first, then an object, then raw text. None of it ends the connection: the next call goes through it.
TEST_F(call_cycle, a_bad_value_does_not_hide_the_fault)
{
    const std::string port = "<c:Client.DataPortIncompatibility><c:description>d</c:description>",
                      port_end = "<c:transport>HTTP</c:transport></c:Client.DataPortIncompatibility>",
                      bad = "<c:direction>sideways</c:direction>", lost = "<c:Client.ObjectNotFound>",
                      found = "<c:uri>u</c:uri></c:Client.ObjectNotFound>",
                      other = "<c:Attachment><c:state>odd</c:state></c:Attachment>";
    const struct {
        const char *rule;
        std::string detail, read;
        std::uint32_t mode = 0;
        const char *header = "";
    } cases[] = {
        {"nothing", lost + found + "<c:Contact><c:name>Ada</c:name></c:Contact><x><y>z</y></x>",
         "lost u;object;raw"},
        {"an enumeration", port + bad + port_end + lost + found, "port d 1;lost u;"},
        {"several", port + bad + "<c:authentication/>" + bad + port_end, "port d 1;"},
        {"deep within", lost + "<c:detail><c:fault>" + other + "</c:fault></c:detail>" + found, "lost u;"},
        {"of an object of another class", other + lost + found, "lost u;"},
        {"an object of another class and raw XML", other + "<x><y/></x>", "raw"},
        {"unknown elements in strict mode", lost + "<c:x><y>1</y></c:x>" + found + "<x/><y/><z/>",
         "lost u;raw", MODE_STRICT},
        {"another type", port + "<c:direction xsi:type=\"c:Transport\">in<z/></c:direction>" + port_end,
         "port d 1;"},
        {"what must be understood", "<x/><y E:mustUnderstand=\"1\"><z/></y>" + lost + found, "lost u;raw"},
        {"one id twice", "<x/>" + lost + "<c:detail id=\"i\"/><c:detail id=\"i\"><a>b</a></c:detail>" + found,
         "lost u;raw"},
        {"in the header", lost + found, "lost u;", 0,
         "<E:Header><c:header><c:credentials><c:state>odd</c:state><c:x/></c:credentials></c:header></"
         "E:Header>"},
    };
    proxy.output_mode = MODE_KEEP_ALIVE;
    for (const char *version : {ENVELOPE_11, ENVELOPE_12})
        for (const auto &c : cases) {
            SCOPED_TRACE(c.rule);
            const bool v12 = version == ENVELOPE_12;
            proxy.input_mode = MODE_KEEP_ALIVE | c.mode;
            std::string fault = v12 ? fault_12("E:Receiver") : fault_11("E:Server", "<detail></detail>");
            const std::size_t start = fault.find(v12 ? "<E:Detail>" : "<detail>") + (v12 ? 10 : 8);
            fault.replace(start, fault.find(v12 ? "</E:Detail>" : "</detail>") - start, c.detail);
            wire.answers.push_back(http_answer(envelope(fault, version, c.header)));
            EXPECT_EQ(SOAP_SERVER_FAULT, proxy.get(&request, response));
            EXPECT_STREQ("no such thing", proxy.soap_fault_string());
            ASSERT_NE(nullptr, proxy.soap_fault());
            EXPECT_EQ(c.read, read_of(v12 ? proxy.soap_fault()->Detail : proxy.soap_fault()->detail));
            EXPECT_EQ(0, get(OK, version));
            EXPECT_EQ(1, wire.opened);
        }
    wire.answers.push_back(http_answer(envelope(OK, ENVELOPE_11, cases[std::size(cases) - 1].header)));
    EXPECT_EQ(SOAP_TYPE_MISMATCH, proxy.get(&request, response)) << "without a fault it is the error";
    EXPECT_EQ(SOAP_TAG_MISMATCH, get("<E:Fault><faultcode>E:Server</faultcode><detail></x"))
        << "broken XML is no fault";
}

TEST_F(call_cycle, the_references_of_a_fault_are_followed)
{
    const std::string detail = "<c:Client.ObjectNotFound><c:uri>u</c:uri></c:Client.ObjectNotFound>",
                      code = "<faultcode>E:Server</faultcode>", text = "<faultstring>t</faultstring>",
                      encoding = " xmlns:s=\"http://www.w3.org/2003/05/soap-encoding\"";
    const auto fault = [](const std::string &parts) { return "<E:Fault>" + parts + "</E:Fault>"; };
    const auto found = [&](const std::string &id) { return "<m id=\"" + id + "\">" + detail + "</m>"; };
    const struct {
        const char *rule, *version;
        std::string body;
        const char *read = "lost u;";
    } cases[] = {
        {"the detail", ENVELOPE_11, fault(code + text + "<detail href=\"#d\"/>") + found("d")},
        {"the detail, with an end tag, and bad values after the fault", ENVELOPE_11,
         fault(code + "<detail href=\"#d\"></detail>" + text) +
             "<c:Attachment><c:state>odd</c:state></c:Attachment><x/><m id=\"d\"><c:Attachment>"
             "<c:state>odd</c:state></c:Attachment>" +
             detail + "</m>"},
        {"all parts", ENVELOPE_11,
         fault("<faultcode href=\"#c\"/><faultstring href=\"#t\"/><detail href=\"#d\"/>") + found("d") +
             "<m id=\"t\">t</m><m id=\"c\">E:Server</m>"},
        {"what the detail holds", ENVELOPE_11,
         fault(code + text + "<detail><c:Client.ObjectNotFound href=\"#o\"/></detail>") +
             "<m id=\"o\"><c:uri>u</c:uri></m>"},
        {"to nothing, with others", ENVELOPE_11,
         fault(code + "<faultstring href=\"#t\"/><faultactor href=\"#a\"/><detail href=\"#d\"/>") +
             found("d") + "<m id=\"t\">t</m>"},
        {"nil, not a reference", ENVELOPE_11, fault(code + text + "<detail xsi:nil=\"true\"/>"), "none"},
        {"in SOAP 1.2", ENVELOPE_12,
         "<E:Fault" + encoding +
             "><E:Code><E:Value>E:Receiver</E:Value></E:Code><E:Reason s:ref=\"r\"/><E:Detail "
             "s:ref=\"d\"/></E:Fault><m" +
             encoding + " id=\"d\">" + detail + "</m><m" + encoding + " id=\"r\"><E:Text>t</E:Text></m>"},
    };
    proxy.input_mode = proxy.output_mode = MODE_KEEP_ALIVE;
    for (const auto &c : cases) {
        SCOPED_TRACE(c.rule);
        EXPECT_EQ(SOAP_SERVER_FAULT, get(c.body, c.version));
        const SOAP_ENV__Fault *const fault_read = proxy.soap_fault();
        ASSERT_NE(nullptr, fault_read);
        EXPECT_EQ("t", text_of(proxy.soap_fault_string()));
        EXPECT_EQ(c.read, read_of(fault_read->Code ? fault_read->Detail : fault_read->detail));
        EXPECT_TRUE(!fault_read->faultactor || !*fault_read->faultactor);
        EXPECT_EQ(0, get(OK, c.version));
        EXPECT_EQ(1, wire.opened);
    }
}

TEST_F(call_cycle, takes_the_first_response_and_nothing_else)
{
    const auto references = [](const std::string &to) {
        return "<p:getResponse><p:thisURI href=\"" + to +
               "\"/><p:thisURI id=\"t\">urn:1</p:thisURI></p:getResponse><p:thisURI href=\"" + to +
               "\"/><p:state href=\"" + to + "\"/>";
    };
    const std::string unknown = OK + "<p:unknown><deep>x</deep></p:unknown>";
    const struct {
        const char *rule;
        std::string body;
        int error;
        const char *version = ENVELOPE_11;
    } cases[] = {
        {"empty body", "", SOAP_NO_TAG},
        {"another element", "<p:other/>", SOAP_TAG_MISMATCH},
        {"response of another operation", "<p:setResponse/>", SOAP_TAG_MISMATCH},
        {"what follows it is skipped", unknown, 0},
        {"in both versions", unknown, 0, ENVELOPE_12},
        {"references after it leave no place waiting on the stack", references("#t"), 0},
        {"nor do those to nothing", references("#nothing"), SOAP_MISSING_ID},
    };
    for (const auto &c : cases) {
        SCOPED_TRACE(c.rule);
        ASSERT_EQ(c.error, get(c.body, c.version));
        if (c.error == 0) {
            ASSERT_NE(nullptr, response.result);
            EXPECT_EQ("urn:1", response.result->thisURI.at(0));
        } else if (c.error != SOAP_MISSING_ID) { // found out when the response is there
            EXPECT_EQ(nullptr, response.result);
            EXPECT_STREQ("SOAP-ENV:Client", proxy.soap_fault()->faultcode);
        }
    }
}

TEST_F(call_cycle, sends_a_received_header_back_unless_it_is_taken_away)
{
    const auto next_request = [this] {
        wire.sent.clear();
        EXPECT_EQ(0, get(OK));
        return wire.sent.substr(wire.sent.find("<SOAP-ENV:Envelope"));
    };
    wire.answers.push_back(http_answer(
        envelope(OK, ENVELOPE_11,
                 "<E:Header><c:header><c:transactionId>t-9</c:transactionId></c:header></E:Header>")));
    ASSERT_EQ(0, proxy.get(&request, response));
    ASSERT_NE(nullptr, proxy.soap_header());
    EXPECT_EQ("t-9", *proxy.soap_header()->header->transactionId);
    EXPECT_NE(std::string::npos,
              next_request().find("<SOAP-ENV:Header><protocol:header SOAP-ENV:mustUnderstand=\"1\">"
                                  "<protocol:transactionId>t-9</protocol:transactionId></protocol:header>"));
    EXPECT_EQ(nullptr, proxy.soap_header());
    proxy.soap_header(nullptr);
    EXPECT_NE(std::string::npos, next_request().find("<SOAP-ENV:Header></SOAP-ENV:Header><SOAP-ENV:Body>"));
    proxy.soap_header(nullptr);
    proxy.soap_noheader();
    EXPECT_EQ(std::string::npos, next_request().find("SOAP-ENV:Header"));
}

TEST_F(call_cycle, answers_outlive_later_calls_until_destroy)
{
    ASSERT_EQ(0, get(OK));
    const protocolProfile__ProfileContent *first = response.result;
    ASSERT_EQ(0, get("<p:getResponse><p:thisURI>urn:2</p:thisURI></p:getResponse>"));
    EXPECT_EQ("urn:1", first->thisURI.at(0));
    EXPECT_EQ("urn:2", response.result->thisURI.at(0));
}

TEST_F(call_cycle, what_cannot_be_written_is_refused_before_anything_is_sent)
{
    protocolProfile__ProfileContent cyclic, unspeakable;
    cyclic.profile = {&cyclic};
    unspeakable.thisURI = {"urn:\x01"};
    for (const std::uint32_t mode : {MODE_DIRECT, MODE_BUFFERED, MODE_STORE, MODE_CHUNKED}) {
        proxy.output_mode = mode;
        EXPECT_EQ(SOAP_LENGTH, proxy.set(&cyclic, held));
        EXPECT_EQ(mode == MODE_CHUNKED, wire.sent.size() > SOAP_BUFFER_SIZE);
        wire.sent.clear();
        EXPECT_EQ(SOAP_UTF_ERROR, proxy.set(&unspeakable, held));
        EXPECT_NE(std::string::npos, std::string(proxy.soap_fault_string()).find("U+0001"));
        EXPECT_EQ(mode < MODE_STORE ? 0 : wire.closed, wire.opened);
        // In chunks the head is gone by then, and the body stays without an end.
        EXPECT_EQ(mode == MODE_CHUNKED ? "\r\n\r\n" : "",
                  wire.sent.substr(std::max<std::size_t>(wire.sent.size(), 4) - 4));
        EXPECT_EQ(std::string::npos, wire.sent.find("Envelope"));
    }
}

TEST_F(call_cycle, attachments_that_are_refused_are_gone_for_the_next_call)
{
    proxy.output_mode = MODE_DIME;
    for (int i = 0; i < 2; ++i)
        ASSERT_EQ(0, soap_dime_attach(&proxy, const_cast<char *>("x"), 1, "a/b", "one", 0, nullptr));
    EXPECT_EQ(SOAP_DIME_ERROR, proxy.get(&request, response));
    EXPECT_STREQ("Two attachments have the id \"one\"", proxy.soap_fault_string());
    EXPECT_EQ(0, wire.opened);
    EXPECT_EQ(0, get(OK));
    EXPECT_EQ(std::string::npos, wire.sent.find("one"));
}

TEST(proxy, takes_endpoint_and_modes_and_is_a_copy_of_an_engine)
{
    const ProfileSoapBindingProxy two(MODE_STRICT, MODE_CHUNKED), at_mode("http://h/", MODE_STORE),
        copy(static_cast<const soap &>(two));
    for (const ProfileSoapBindingProxy *const one : {&two, &copy}) {
        EXPECT_EQ(nullptr, one->endpoint);
        EXPECT_EQ(MODE_STRICT, one->input_mode);
        EXPECT_EQ(MODE_CHUNKED, one->output_mode);
    }
    EXPECT_STREQ("http://h/", at_mode.endpoint);
    EXPECT_EQ(2 * MODE_STORE, at_mode.input_mode + at_mode.output_mode);
    EXPECT_EQ(two.namespaces, copy.namespaces);
    EXPECT_EQ(2, copy.state);
}

} // namespace
