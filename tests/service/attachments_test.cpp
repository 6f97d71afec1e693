// attachments_test.cpp - data that travels beside the messages: kept as files, given back, forgotten.
#include <algorithm>
#include <filesystem>
#include <fstream>
#include <string>

#include <gtest/gtest.h>
#include <openssl/evp.h>

#include <zuv_client_pro/StatusReportSoapBindingProxy.h>
#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_error.h>

#include "service/port_client.h"
#include "service/raw_client.h"
#include "support/host_streams.h"

using namespace service_test;

namespace {

std::string some_bytes(std::size_t size)
{
    std::string bytes(size, '\0');
    for (std::size_t i = 0; i < size; ++i)
        bytes[i] = "\r\n-=x\0\xFFy"[i * 2654435761U >> 13 & 7];
    return bytes;
}

constexpr std::uint32_t FORMS[] = {
    MODE_DIME,
    MODE_MIME,
    MODE_MIME | MODE_MTOM,
    MODE_DIME | MODE_CHUNKED,
    MODE_MIME | MODE_CHUNKED,
    MODE_MIME | MODE_MTOM | MODE_CHUNKED,
};

// A host that sends streams beside its status reports and takes what comes back.
class stream_client : public port_client<StatusReportSoapBindingProxy> {
public:
    stream_client(const service_process &service, std::uint32_t form_mode)
        : port_client(service, "StatusReport", form_mode), form_(form_mode)
    {
        host.serve(proxy);
    }

    void enclose(host_stream &stream, const char *id)
    {
        char *const handle = reinterpret_cast<char *>(&stream);
        const std::size_t size = (form_ & MODE_CHUNKED) == MODE_CHUNKED ? 0 : stream.data.size();
        if ((form_ & MODE_MIME) != 0)
            ASSERT_EQ(soap_mime_attach(&proxy, handle, size, MIME_BINARY, "a/b", id, nullptr, nullptr), 0);
        else
            ASSERT_EQ(soap_dime_attach(&proxy, handle, size, "a/b", id, 0, nullptr), 0);
    }

    // What came with the last answer under a reference; null if nothing did.
    const host_stream *received(const std::string *reference)
    {
        if (reference == nullptr)
            return nullptr;
        for (const soap_attachment *list : {proxy.dime.list, proxy.mime.list})
            for (; list != nullptr; list = list->next)
                if (list->id != nullptr && soap_cid_compare(&proxy, reference->c_str(), list->id) == 0)
                    return host.find(list->content);
        return nullptr;
    }

    stream_host host;

private:
    std::uint32_t form_;
};

std::string base64(const std::string &bytes)
{
    std::string text((bytes.size() + 2) / 3 * 4, '\0');
    EVP_EncodeBlock(reinterpret_cast<unsigned char *>(text.data()),
                    reinterpret_cast<const unsigned char *>(bytes.data()), static_cast<int>(bytes.size()));
    return text;
}

std::size_t files_in(const std::string &directory)
{
    const std::filesystem::directory_iterator all(directory);
    return static_cast<std::size_t>(std::distance(begin(all), end(all)));
}

// What nobody wanted is gone only after the answer.
std::size_t kept_in(const std::string &directory)
{
    const std::filesystem::directory_iterator all(directory);
    return static_cast<std::size_t>(std::count_if(begin(all), end(all), [](const auto &entry) {
        return !entry.path().filename().string().starts_with("arriving-");
    }));
}

std::string contents(const std::filesystem::path &path)
{
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

// A part of a MIME message, after its delimiter: "CONTENT-ID|CONTENT", or "CONTENT-ID;ENCODING|CONTENT".
std::string mime_part(const std::string &part)
{
    const std::string head = part.substr(0, part.find('|'));
    std::string fields = "Content-ID: <" + head.substr(0, head.find(';')) + ">\r\n";
    if (head.find(';') != head.npos)
        fields += "Content-Transfer-Encoding: " + head.substr(head.find(';') + 1) + "\r\n";
    return "\r\n--edge\r\n" + fields + "\r\n" + part.substr(part.find('|') + 1);
}

// A message of MIME parts as other toolkits write them. `ahead` stands in front of the message itself.
std::string mime_post(const char *port, const std::string &message, const std::vector<std::string> &parts,
                      const std::string &ahead = "")
{
    std::string body = ahead.empty() ? "" : mime_part(ahead);
    body += "\r\n--edge\r\nContent-Type: text/xml\r\nContent-ID: <root>\r\n\r\n" + message;
    for (const std::string &part : parts)
        body += mime_part(part);
    std::string request = post(port, body + "\r\n--edge--\r\n");
    return request.replace(request.find("text/xml"), 8,
                           "multipart/related; boundary=edge; type=\"text/xml\"; start=\"<root>\"");
}

// A problem report, and a request to add to one; each with an attachment that refers to data, or with
// several.
std::string report_with(const std::string &reference, int count = 1)
{
    std::string report = "<protocolProblemReport:submitRequest>";
    for (int i = 0; i < count; ++i)
        report += "<protocol:attachment><protocol:dataHandler>" + reference +
                  (count > 1 && reference.back() == '-' ? std::to_string(i) : "") +
                  "</protocol:dataHandler></protocol:attachment>";
    return report + "</protocolProblemReport:submitRequest>";
}

std::string addition_of(const std::string &reference)
{
    return "<protocolProblemReport:attachRequest><protocolProblemReport:attachment><protocol:dataHandler>" +
           reference +
           "</protocol:dataHandler></protocolProblemReport:attachment>"
           "</protocolProblemReport:attachRequest>";
}

} // namespace

TEST(Attachments, ComeBackAsTheyWereInEveryForm)
{
    scratch_directory place;
    service_process service({"--database", place.file("documents.db")});
    const std::string directory = place.file("documents.db-data");
    for (const std::uint32_t form : FORMS) {
        SCOPED_TRACE(form);
        stream_client client(service, form);
        host_stream large{some_bytes(300001)}, small{"in memory"};
        std::string large_reference = "cid:la%72ge", small_reference = "cid:small";
        protocol__Attachment first, second;
        first.dataHandler = &large_reference;
        second.dataHandler = &small_reference;
        first.attachment = {&second}; // attachments may hold attachments
        protocolStatusReport__StatusReportContent report;
        report.attachment = {&first};
        client.enclose(large, "large");
        client.enclose(small, "small");
        const auto *created = client.call(&StatusReportSoapBindingProxy::create, report);
        ASSERT_NE(created, nullptr) << client.error;
        EXPECT_EQ(*created->attachment.at(0)->size, "300001");
        EXPECT_EQ(*created->attachment.at(0)->state, protocol__AttachmentState::complete);
        EXPECT_EQ(client.received(created->attachment.at(0)->dataHandler), nullptr) << "the client has it";
        const std::string target = created->thisURI.at(0);
        const std::string port = *created->attachment.at(0)->dataPort.at(0)->dataURI;
        EXPECT_EQ(files_in(directory), 2u);
        EXPECT_EQ(contents(directory + port.substr(port.rfind('/'))), large.data);

        // Whole messages one after the other on one connection, so nothing of an attachment is left over.
        _protocolStatusReport__getRequest get;
        for (int round = 0; round < 2; ++round) {
            const auto *got = client.call(&StatusReportSoapBindingProxy::get, get, target);
            ASSERT_NE(got, nullptr) << client.error;
            const protocol__Attachment &outer = *got->attachment.at(0);
            const host_stream *stream = client.received(outer.dataHandler);
            ASSERT_NE(stream, nullptr);
            EXPECT_TRUE(stream->data == large.data);
            stream = client.received(outer.attachment.at(0)->dataHandler);
            ASSERT_NE(stream, nullptr);
            EXPECT_EQ(stream->data, small.data);
        }
        EXPECT_EQ(
            exchange(service.port(), "GET " + port.substr(port.find("/zuv")) + " HTTP/1.1\r\n\r\n").body,
            large.data)
            << "those who don't ask in a form with attachments have the data port";

        // What a new version of the report no longer refers to is forgotten, what it refers to stays.
        const auto *got = client.call(&StatusReportSoapBindingProxy::get, get, target);
        ASSERT_NE(got, nullptr);
        protocolStatusReport__StatusReportContent next;
        next.attachment = {got->attachment.at(0)->attachment.at(0)};
        ASSERT_NE(client.call(&StatusReportSoapBindingProxy::submit, next, target), nullptr) << client.error;
        EXPECT_EQ(files_in(directory), 1u);
        ASSERT_NE(client.call(&StatusReportSoapBindingProxy::remove, next, target), nullptr);
        EXPECT_EQ(files_in(directory), 0u);
    }
}

TEST(Attachments, GoWithProblemReportsToo)
{
    service_process service;
    raw_answer answer =
        exchange(service.port(),
                 mime_post("ProblemReport", soap11(report_with("cid:dump@machine")),
                           {"unwanted|nobody refers to it", "dump@machine|first line\r\n-- edge\r\n--edg"}));
    ASSERT_EQ(answer.status, 200) << answer.body;
    const std::string target =
        "<protocol:targetURI>" + element_text(answer.body, "thisURI") + "</protocol:targetURI>";
    answer = exchange(service.port(),
                      mime_post("ProblemReport", soap11("<protocolProblemReport:getRequest/>", target), {}));
    EXPECT_TRUE(answer.has("multipart/related")) << answer.head;
    const std::string name = element_text(answer.body, "dataHandler").substr(4);
    EXPECT_NE(answer.body.find("Content-ID: <" + name + ">\r\n\r\nfirst line\r\n-- edge\r\n--edg\r\n--"),
              std::string::npos)
        << answer.body;
    EXPECT_EQ(answer.body.find("nobody refers to it"), std::string::npos);

    answer = exchange(service.port(),
                      mime_post("ProblemReport", soap11(addition_of("cid:log"), target), {"log|more"}));
    ASSERT_EQ(answer.status, 200) << answer.body;
    const std::string uri = answer.body.substr(answer.body.rfind("urn:zuv:attachment:"), 55);
    answer = exchange(
        service.port(),
        mime_post("ProblemReport",
                  soap11("<protocolProblemReport:attachStatusRequest><protocol:attachmentURI>" + uri +
                             "</protocol:attachmentURI><protocol:intention>retry</protocol:intention>"
                             "</protocolProblemReport:attachStatusRequest>",
                         target),
                  {}));
    EXPECT_NE(answer.body.find("\r\n\r\nmore\r\n--"), std::string::npos) << "sent once more: " << answer.body;
    EXPECT_EQ(answer.body.find("first line"), std::string::npos) << "the other one isn't";
    answer = exchange(service.port(),
                      mime_post("ProblemReport", soap11(addition_of("cid:none"), target), {"none|"}));
    answer = exchange(service.port(),
                      mime_post("ProblemReport", soap11("<protocolProblemReport:getRequest/>", target), {}));
    EXPECT_NE(answer.body.find(">\r\n\r\n\r\n--"), std::string::npos) << "an empty one: " << answer.body;
    answer = exchange(service.port(),
                      post("ProblemReport", soap11("<protocolProblemReport:getRequest/>", target)));
    EXPECT_TRUE(answer.has("text/xml") && !answer.has("multipart")) << answer.head;
    EXPECT_TRUE(element_text(answer.body, "dataHandler").empty()) << "a reference to nothing";
}

TEST(Attachments, LeaveNothingWhenTheRequestIsRefused)
{
    scratch_directory place;
    service_process service(
        {"--database", place.file("documents.db"), "--max-attachments", "100000", "--max-body", "20000"});
    const std::string directory = place.file("documents.db-data");
    const std::string message = soap11(report_with("cid:data"));
    const std::string whole = mime_post("ProblemReport", message, {"data|" + some_bytes(50000)});
    std::vector<std::string> crowd;
    for (int i = 0; i < 1001; ++i)
        crowd.push_back(std::to_string(i) + "|x");
    const struct {
        const char *what;
        std::string request;
        int status;
    } cases[] = {
        {"nothing has the id", mime_post("ProblemReport", message, {"other|" + some_bytes(50000)}), 500},
        {"too long", mime_post("ProblemReport", message, {"data|" + some_bytes(100001)}), 413},
        {"too long together",
         mime_post("ProblemReport", message, {"data|" + some_bytes(60000), "x|" + some_bytes(60000)}), 413},
        {"too many", mime_post("ProblemReport", message, crowd), 413},
        {"two of one id", mime_post("ProblemReport", message, {"data|1", "data|2"}), 400},
        {"nothing has the second id",
         mime_post("ProblemReport", soap11(report_with("cid:data-", 2)), {"data-0|" + some_bytes(50000)}),
         500},
        {"a document that is too long",
         mime_post("ProblemReport",
                   soap11("<protocolProblemReport:submitRequest><protocolProblemReport:title>" +
                          std::string(100000, 'x') +
                          "</protocolProblemReport:title></protocolProblemReport:submitRequest>"),
                   {"data|1"}),
         413},
    };
    for (const auto &c : cases) {
        EXPECT_EQ(exchange(service.port(), c.request).status, c.status) << c.what;
        EXPECT_EQ(files_in(directory), 0u) << c.what;
    }
    for (const std::size_t cut : {whole.size() - 4, whole.size() / 2}) {
        raw_client client(service.port());
        client.send(whole.substr(0, cut));
        client.end_sending();
        EXPECT_EQ(client.receive().status, 400);
        EXPECT_TRUE(client.ended());
        EXPECT_EQ(files_in(directory), 0u) << "cut at " << cut;
    }
    EXPECT_EQ(exchange(service.port(), whole).status, 200) << "the limits are those of refused ones";
    EXPECT_EQ(files_in(directory), 1u);
}

// Wherever the library leaves them: in files, in memory ahead of the message, and as values of the message.
TEST(Attachments, ComeOutOfTheirTransferEncoding)
{
    scratch_directory place;
    service_process service({"--database", place.file("documents.db"), "--max-body", "200000"});
    const std::string directory = place.file("documents.db-data");
    const std::string bytes = some_bytes(70000);
    std::string long_base64 = base64(bytes), escaped;
    for (std::size_t at = 76; at < long_base64.size(); at += 78)
        long_base64.insert(at, "\r\n");
    for (const char c : bytes) {
        char digits[4];
        std::snprintf(digits, sizeof digits, "=%02X", static_cast<unsigned char>(c));
        escaped += digits + std::string(escaped.size() % 73 > 69 ? "=\r\n" : "");
    }
    const struct {
        std::string part, data;
        bool refused = false;
    } cases[] = {
        {"|as it is=20", "as it is=20"},
        {";binary|as it is=20", "as it is=20"},
        {";uuencode|as it is=20", "as it is=20"},
        {";base64|cGl4ZWxz", "pixels"},
        {";BASE64|\r\ncGl4\r\n ZWw=\t\r\n\r\n", "pixel"},
        {";Base64|", ""},
        {";base64|" + long_base64, bytes},
        {";quoted-printable|caf=C3=a9 =\r\nau lait \t\r\n=20end= ", "caf\xC3\xA9 au lait\r\n end"},
        {";Quoted-Printable|a\rb =0D\n c \r", "a\rb \r\n c\r"},
        {";quoted-printable|" + escaped, bytes},
        {";base64|cGl4ZWxz!", "", true},
        {";base64|cGl4ZWx", "", true},
        {";base64|cGl4ZWw=cGl4", "", true},
        {";base64|cGl4-ZWxz", "", true},
        {";base64|" + std::string(4096, ' ') + "cGw=" + std::string(5000, '\n') + "cGl4", "", true},
        {";quoted-printable|100 = 1", "", true},
        {";quoted-printable|=4", "", true},
        {";quoted-printable|=4x", "", true},
        {";quoted-printable|=\rx", "", true},
        {";quoted-printable|" + std::string(999, ' '), "", true},
    };
    for (const auto &c : cases)
        for (const char *way : {"file", "ahead", "value"}) {
            SCOPED_TRACE(way + c.part.substr(0, 60));
            const bool ahead = way == std::string("ahead"), value = way == std::string("value");
            const std::string message =
                soap11(value ? "<protocolProblemReport:submitRequest><protocol:attachment><protocol:dataPort>"
                               "<protocol:hash href=\"cid:data\"/></protocol:dataPort></protocol:attachment>"
                               "</protocolProblemReport:submitRequest>"
                             : report_with("cid:data"));
            const std::string part = "data" + c.part;
            const raw_answer answer =
                exchange(service.port(), mime_post("ProblemReport", message,
                                                   ahead ? std::vector<std::string>() : std::vector{part},
                                                   ahead ? part : ""));
            ASSERT_EQ(answer.status, c.refused ? 400 : 200) << answer.body;
            if (c.refused) {
                EXPECT_NE(
                    element_text(answer.body, "faultstring").find(c.part.substr(1, c.part.find('|') - 1)),
                    std::string::npos)
                    << answer.body;
                EXPECT_NE(answer.body.find("Client.MalformedRequest"), std::string::npos) << answer.body;
            } else if (value) {
                EXPECT_TRUE(element_text(answer.body, "hash") == base64(c.data)) << answer.body;
            } else {
                EXPECT_EQ(element_text(answer.body, "size"), std::to_string(c.data.size()));
                const std::string uri = element_text(answer.body, "dataURI");
                EXPECT_TRUE(contents(directory + uri.substr(uri.rfind('/'))) == c.data);
            }
            std::filesystem::remove_all(directory);
            std::filesystem::create_directory(directory);
        }
    // Bytes that stay in memory are bounded as the message is, however they are encoded.
    EXPECT_EQ(exchange(service.port(), mime_post("ProblemReport", soap11(report_with("cid:data")), {},
                                                 "data;base64|" + base64(some_bytes(250000))))
                  .status,
              413);
}

// Many references to one thing are no many things, and many things are no many open files.
TEST(Attachments, AreKeptAndSentOnce)
{
    scratch_directory place;
    service_process service({"--database", place.file("documents.db")});
    const std::string directory = place.file("documents.db-data");
    std::vector<std::string> parts;
    for (int i = 0; i < 120; ++i)
        parts.push_back("part-" + std::to_string(i) + "|x");
    const struct {
        const char *what, *reference;
        int count, status;
        std::size_t kept, sent; // files, and parts of the answer to get
    } rows[] = {
        {"one part, again and again", "cid:part-7", 120, 200, 1, 1},
        {"as many parts as an answer may hold, and more", "cid:part-", 120, 200, 120, 100},
        {"too many references", "cid:part-7", 1001, 500, 0, 0},
    };
    for (const auto &r : rows) {
        const std::size_t before = kept_in(directory);
        raw_answer answer = exchange(
            service.port(), mime_post("ProblemReport", soap11(report_with(r.reference, r.count)), parts));
        ASSERT_EQ(answer.status, r.status) << r.what << answer.body;
        EXPECT_EQ(kept_in(directory) - before, r.kept) << r.what;
        const std::string uri = element_text(answer.body, "thisURI");
        answer =
            exchange(service.port(), mime_post("ProblemReport",
                                               soap11("<protocolProblemReport:getRequest/>",
                                                      "<protocol:targetURI>" + uri + "</protocol:targetURI>"),
                                               {}));
        std::size_t sent = 0;
        for (std::size_t at = 0; (at = answer.body.find("\r\n\r\nx\r\n--", at)) != std::string::npos; ++at)
            ++sent;
        EXPECT_EQ(sent, r.sent) << r.what;
    }
}

TEST(Attachments, OutliveTheProcessThatKeptThem)
{
    scratch_directory place;
    const std::string directory = place.file("documents.db-data");
    std::string target;
    {
        service_process service({"--database", place.file("documents.db")});
        const raw_answer answer = exchange(
            service.port(), mime_post("ProblemReport", soap11(report_with("cid:data")), {"data|kept"}));
        target = "<protocol:targetURI>" + element_text(answer.body, "thisURI") + "</protocol:targetURI>";
        service.kill();
    }
    std::ofstream(directory + "/arriving-ABCDEF") << "half of it";
    std::ofstream(directory + "/00000000-0000-4000-8000-000000000000") << "nobody's";
    service_process service({"--database", place.file("documents.db")});
    EXPECT_EQ(files_in(directory), 1u) << "what an earlier end left over is swept away";
    const raw_answer answer =
        exchange(service.port(),
                 mime_post("ProblemReport", soap11("<protocolProblemReport:getRequest/>", target), {}));
    EXPECT_NE(answer.body.find("\r\n\r\nkept\r\n--"), std::string::npos) << answer.body;
}
