// fault_report.cpp - see fault_report.h.
#include "fault_report.h"

#include <cstring>
#include <sstream>
#include <vector>

#include <pugixml.hpp>
#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_registry.h>
#include <zuv_client_pro/soap_report.h>

#include "contract.h"
#include "documents.h"
#include "fault_advice.h"
#include "text_files.h"

namespace cli {

namespace {

constexpr std::size_t RAW_DETAIL_MAX = 500; // bytes of an unknown detail
constexpr int DETAIL_DEPTH_MAX = 20;
constexpr int HTTP_OK = 200, HTTP_FIRST = 201, HTTP_LAST = 599;

// --- the typed detail ---

struct typed_fault {
    std::string name; // "Client.ObjectNotFound"
    const void *object;
    int type;
};

std::vector<typed_fault> typed_faults(const SOAP_ENV__Detail *detail)
{
    std::vector<typed_fault> faults;
    if (detail == nullptr)
        return faults;
#define TAKE_FAULT(member)                                                                                   \
    if (detail->member != nullptr)                                                                           \
        faults.push_back({"", detail->member, detail->member->soap_type()});
    SOAP_DETAIL_FAULTS(TAKE_FAULT)
#undef TAKE_FAULT
    if (detail->fault != nullptr && detail->__type != 0)
        faults.push_back({"", detail->fault, detail->__type});
    for (typed_fault &fault : faults) {
        const char *const name = soap_type_name(fault.type);
        fault.name = contract::local_name(name == nullptr ? "" : name);
    }
    return faults;
}

// Leaves of a document as "path: text" lines.
void add_leaves(const pugi::xml_node &element, const std::string &path, int depth,
                std::vector<std::string> &lines)
{
    bool leaf = true;
    for (const pugi::xml_node &child : element.children()) {
        if (child.type() != pugi::node_element || depth >= DETAIL_DEPTH_MAX)
            continue;
        leaf = false;
        add_leaves(child,
                   (path.empty() ? "" : path + " / ") + std::string(contract::local_name(child.name())),
                   depth + 1, lines);
    }
    if (leaf && !path.empty() && *element.text().get() != '\0')
        lines.push_back(path + ": " + printable(element.text().get()));
}

std::vector<std::string> detail_lines(const typed_fault &fault)
{
    const std::string xml = document_text(
        [&](soap *ctx) {
            return soap_write_element(ctx, const_cast<void *>(fault.object), nullptr, -1, fault.type);
        },
        false);
    pugi::xml_document document;
    std::vector<std::string> lines;
    if (document.load_buffer(xml.data(), xml.size(), pugi::parse_default, pugi::encoding_utf8))
        add_leaves(document.document_element(), "", 0, lines);
    return lines;
}

// --- the report ---

class report {
public:
    void add(const char *label, const std::string &text)
    {
        if (!text.empty())
            lines_ << "  " << label << std::string(10 - std::strlen(label), ' ') << text << "\n";
    }
    void add_all(const char *label, const std::vector<std::string> &texts)
    {
        for (const std::string &text : texts) {
            add(label, text);
            label = "";
        }
    }
    std::string text() const { return lines_.str(); }

private:
    std::ostringstream lines_;
};

std::string text_of(const char *text)
{
    return text == nullptr ? "" : printable(std::string_view(text).substr(0, RAW_DETAIL_MAX));
}

// The first element of a local name below another, or an empty node.
pugi::xml_node descendant(const pugi::xml_node &of, std::string_view name)
{
    return of.find_node(
        [name](const pugi::xml_node &node) { return contract::local_name(node.name()) == name; });
}

// What an HTTP server sent with an error status: the code and text of a SOAP fault, or the page's title, rather than
// markup.
std::string page_words(const char *page)
{
    pugi::xml_document document;
    if (page == nullptr || !document.load_string(page))
        return text_of(page);
    if (const pugi::xml_node fault = descendant(document, "Fault")) {
        const pugi::xml_node code = descendant(fault, "faultcode"), value = descendant(fault, "Value"),
                             text = descendant(fault, "faultstring"), reason = descendant(fault, "Text");
        return text_of((text ? text : reason).text().get()) + " (" +
               text_of((code ? code : value).text().get()) + ")";
    }
    const pugi::xml_node title = descendant(document, "title");
    return text_of(title ? title.text().get() : page);
}

bool has_record(const soap *ctx)
{
    return ctx->fault != nullptr;
}

// The fault that the service has sent; null if the failure is another one.
const SOAP_ENV__Fault *received_fault(soap *ctx)
{
    const exit_code kind = exit_code_of(ctx);
    return kind == EXIT_SENDER || kind == EXIT_RECEIVER || kind == EXIT_FAULT ? ctx->fault : nullptr;
}

const SOAP_ENV__Detail *received_detail(soap *ctx)
{
    const SOAP_ENV__Fault *const fault = received_fault(ctx);
    if (fault == nullptr)
        return nullptr;
    return fault->detail != nullptr ? fault->detail : fault->Detail;
}

} // namespace

exit_code exit_code_of(soap *ctx)
{
    if (ctx->error == HTTP_OK) // what came with it is no Envelope
        return EXIT_ANSWER;
    if (ctx->error > 0 && ctx->error == ctx->status) // also where a strange status has the value of a code
        return EXIT_HTTP;
    switch (ctx->error) {
    case SOAP_OK:
        return EXIT_DONE;
    case SOAP_CLIENT_FAULT:
        return EXIT_SENDER;
    case SOAP_SERVER_FAULT:
        return EXIT_RECEIVER;
    case SOAP_MUST_UNDERSTAND:
    case SOAP_FAULT:
    case SOAP_VERSION_MISMATCH:
        return has_record(ctx) ? EXIT_FAULT : EXIT_ANSWER;
    case SOAP_EOF:
    case SOAP_TCP_ERROR:
    case SOAP_FD_EXCEEDED:
        return EXIT_NETWORK;
    case SOAP_TLS_ERROR:
        return EXIT_TLS;
    case SOAP_OUT_OF_MEMORY:
        return EXIT_OTHER;
    default:
        return ctx->error >= HTTP_FIRST && ctx->error <= HTTP_LAST ? EXIT_HTTP : EXIT_ANSWER;
    }
}

std::string fault_name(soap *ctx)
{
    const std::vector<typed_fault> faults = typed_faults(received_detail(ctx));
    return !faults.empty()                  ? faults.front().name
           : received_fault(ctx) != nullptr ? text_of(*soap_fault_code_field(ctx))
                                            : "";
}

std::string failure_line(soap *ctx)
{
    if (*soap_fault_code_field(ctx) == nullptr || *soap_fault_string_field(ctx) == nullptr)
        soap_fault_text_fill(ctx);
    return text_of(*soap_fault_string_field(ctx));
}

std::string fault_report(soap *ctx, const std::string &what, const std::string &where)
{
    const exit_code kind = exit_code_of(ctx);
    const std::vector<typed_fault> faults = typed_faults(received_detail(ctx));
    const std::string line = failure_line(ctx);
    report lines;
    const std::string code = text_of(*soap_fault_code_field(ctx));
    lines.add("fault", faults.empty() ? fault_name(ctx) : faults.front().name + " (" + code + ")");
    lines.add("what", line);
    const char *advice = http_advice(kind == EXIT_HTTP ? ctx->error : 0);
    if (const soap_report *const last = kind == EXIT_NETWORK ? soap_call_report(ctx) : nullptr)
        advice = ending_advice(last->ended_by);
    if (ctx->error == SOAP_VERSION_MISMATCH)
        advice = words_of(EXIT_FAULT).advice;
    lines.add("who", words_of(kind).who);
    lines.add("where", printable(where));
    if (kind == EXIT_HTTP && ctx->error < 400 && ctx->error == ctx->status && ctx->endpoint[0] != '\0')
        lines.add("moved to", printable(ctx->endpoint));
    for (const typed_fault &fault : faults)
        lines.add_all("detail", detail_lines(fault));
    const char *const detail = soap_fault_detail_value(ctx);
    lines.add("detail", kind == EXIT_HTTP ? page_words(detail) : text_of(detail));
    if (advice == nullptr && !faults.empty())
        advice = advice_for(faults.front().name);
    if (advice == nullptr)
        advice = words_of(kind).advice != nullptr ? words_of(kind).advice
                                                  : advice_for(kind == EXIT_SENDER ? "Client" : "Server");
    lines.add("try", advice);
    return "zuv: " + what + " failed\n" + lines.text();
}

} // namespace cli
