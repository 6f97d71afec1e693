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

#include "documents.h"
#include "text_files.h"

namespace cli {

namespace {

constexpr std::size_t RAW_DETAIL_MAX = 500; // bytes of a detail that nobody knows
constexpr int DETAIL_DEPTH_MAX = 20;
constexpr int HTTP_FIRST = 201, HTTP_LAST = 599;

// --- what to try, by what failed ---

struct advice {
    const char *about; // a fault, with all that are derived from it
    const char *text;
};
constexpr advice FAULT_ADVICE[] = { // the first that fits
    {"Client.Authentication.CredentialsExpired", "renew the credentials: zuv profile refreshCredentials"},
    {"Client.Authentication.NotAuthorized", "ask the service's operator for the right to do this"},
    {"Client.Authentication", "check --user, --password-file and --credentials"},
    {"Client.AccountInformation", "check the account in the document that --credentials names"},
    {"Client.ObjectNotFound", "check the URI given with --target, and the port"},
    {"Client.ObjectNotAvailable", "the document exists, but can't be had now; ask again later"},
    {"Client.InvalidInformation.DataSequenceError", "send what comes first, then this again"},
    {"Client.InsufficientInformation",
     "zuv new CLASS tells all members of a document; --target names the document"},
    {"Client.DataPortIncompatibility", "ask for a data port of the kind in the detail"},
    {"Client.DeliveryIncompatibility", "ask for a delivery of the kind in the detail"},
    {"Client.LanguageIncompatibility", "ask for a language in the detail"},
    {"Client.TypeIncompatibility", "use a type of data in the detail"},
    {"Client", "check the request: zuv check FILE; zuv new CLASS explains the members"},
    {"Server.Redirection", "call the endpoint that the detail names"},
    {"Server.ServiceUnavailable", "try again later, or give further addresses by --endpoint"},
    {"Server.DataTooLarge", "send or ask for less at a time"},
    {"Server.UnsupportedRequest.FilterExpressionTooComplex", "make the filter simpler"},
    {"Server.UnsupportedRequest", "this service doesn't do that; ask its operator"},
    {"Server", "try again; if it stays so, tell the service's operator"}};

struct kind_words {
    exit_code code;
    const char *who;
    const char *advice;
};
constexpr kind_words KINDS[] = {
    {EXIT_NETWORK, "the network, or nobody listens there",
     "check the address and that the service runs; --connect-limit and --silence-limit give it more time"},
    {EXIT_TLS, "this side and the service don't trust each other",
     "name the authority by --ca-file; the certificate must be made out to the host in the address (see "
     "--no-host-check)"},
    {EXIT_HTTP, "the HTTP server ahead of the service",
     "check the path of the address, and the service's log"},
    {EXIT_ANSWER, "the service's answer can't be read",
     "keep a trace by --trace FILE and look at it by zuv trace FILE"},
    {EXIT_SENDER, "the request", nullptr},
    {EXIT_RECEIVER, "the service", nullptr},
    {EXIT_FAULT, "the two sides don't understand each other", "try with or without --soap12"},
    {EXIT_OTHER, "this program", "free memory"}};

const kind_words &words_of(exit_code code)
{
    for (const kind_words &kind : KINDS)
        if (kind.code == code)
            return kind;
    return KINDS[std::size(KINDS) - 1];
}

const char *http_advice(int status)
{
    switch (status) {
    case 401:
        return "give --user and --password-file";
    case 407:
        return "give --proxy-user and --proxy-password-file";
    case 403:
        return "ask the service's operator for the right to do this";
    case 404:
        return "check the path of the address";
    case 413:
        return "send less at a time";
    case 503:
        return "try again later, or give further addresses by --endpoint";
    default:
        return status >= 300 && status < 400 ? "call the address that it names" : nullptr;
    }
}

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
        fault.name = name == nullptr
                         ? ""
                         : name + (std::strchr(name, ':') == nullptr ? 0 : std::strcspn(name, ":") + 1);
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
        const std::string_view name = child.name();
        add_leaves(child, (path.empty() ? "" : path + " / ") + std::string(name.substr(name.find(':') + 1)),
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

const char *advice_for(const std::string &fault)
{
    for (const advice &one : FAULT_ADVICE)
        if (fault == one.about || fault.starts_with(std::string(one.about) + "."))
            return one.text;
    return nullptr;
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

bool has_record(const soap *ctx)
{
    return ctx->fault != nullptr;
}

} // namespace

exit_code exit_code_of(soap *ctx)
{
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

std::string fault_report(soap *ctx, const std::string &what, const std::string &where)
{
    const exit_code kind = exit_code_of(ctx);
    const bool received = kind == EXIT_SENDER || kind == EXIT_RECEIVER || kind == EXIT_FAULT;
    const SOAP_ENV__Fault *const record = received ? ctx->fault : nullptr;
    const SOAP_ENV__Detail *const parts = record == nullptr           ? nullptr
                                          : record->detail != nullptr ? record->detail
                                                                      : record->Detail;
    const std::vector<typed_fault> faults = typed_faults(parts);
    if (*soap_fault_code_field(ctx) == nullptr || *soap_fault_string_field(ctx) == nullptr)
        soap_fault_text_fill(ctx);
    report lines;
    const std::string code = text_of(*soap_fault_code_field(ctx));
    lines.add("fault", faults.empty() ? (received ? code : "") : faults.front().name + " (" + code + ")");
    lines.add("what", text_of(*soap_fault_string_field(ctx)));
    const char *advice = http_advice(kind == EXIT_HTTP ? ctx->error : 0);
    if (ctx->error == SOAP_VERSION_MISMATCH)
        advice = words_of(EXIT_FAULT).advice;
    lines.add("who", words_of(kind).who);
    lines.add("where", printable(where));
    if (kind == EXIT_HTTP && ctx->error < 400 && ctx->endpoint[0] != '\0')
        lines.add("moved to", printable(ctx->endpoint));
    for (const typed_fault &fault : faults)
        lines.add_all("detail", detail_lines(fault));
    lines.add("detail", text_of(soap_fault_detail_value(ctx)));
    if (advice == nullptr && !faults.empty())
        advice = advice_for(faults.front().name);
    if (advice == nullptr)
        advice = words_of(kind).advice != nullptr ? words_of(kind).advice
                                                  : advice_for(kind == EXIT_SENDER ? "Client" : "Server");
    lines.add("try", advice);
    return "zuv: " + what + " failed\n" + lines.text();
}

} // namespace cli
