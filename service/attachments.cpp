// attachments.cpp - see attachments.h.
#include "attachments.h"

#include <algorithm>
#include <map>
#include <set>

#include <zuv_client_pro/protocolHTTP.h>
#include <zuv_client_pro/soap_binary.h>

#include "faults.h"
#include "moment.h"

namespace service {

namespace {

using state = protocol__AttachmentState;

constexpr double ALL = 100;                  // per cent
constexpr std::size_t REFERENCES_MAX = 1000; // attachments of one request that refer to data sent with it

template <class T> bool admits(const std::vector<T> &wanted, std::initializer_list<T> offered)
{
    return wanted.empty() ||
           std::find_first_of(wanted.begin(), wanted.end(), offered.begin(), offered.end()) != wanted.end();
}

bool admits_uri(const protocol__URITypePreference *wanted)
{
    return wanted == nullptr || *wanted == protocol__URITypePreference::direct ||
           *wanted == protocol__URITypePreference::directIPv4 ||
           *wanted == protocol__URITypePreference::respondentDecide;
}

protocol__Authentication authentication_of(const call &c)
{
    return c.config.user.empty() ? protocol__Authentication::anonymous : protocol__Authentication::private_;
}

// What a client must do at a data port, and what it may expect.
template <class Exchange, class Request, class Response>
protocol__TransportDetail *exchange_at(const call &c, const std::string &path)
{
    auto *const exchange = make<Exchange>(c.ctx);
    exchange->request = make<Request>(c.ctx);
    exchange->request->requestUri = make_text(c.ctx, path);
    auto *const success = make<protocolHTTP__StatusCodeInformation>(c.ctx);
    success->statusCode = make_value(c.ctx, 200);
    success->interpretation = make_value(c.ctx, protocolHTTP__StatusCodeInterpretation::success);
    success->directive = make_value(c.ctx, protocolHTTP__StatusCodeDirective::proceed);
    exchange->response = make<Response>(c.ctx);
    exchange->response->statusCodeInformation.push_back(success);
    auto *const detail = make<protocol__ExchangeDetail>(c.ctx);
    detail->exchange.push_back(exchange);
    return detail;
}

bool holds_data(const protocol__Attachment &attachment)
{
    return attachment.data != nullptr || attachment.dataHandler != nullptr;
}

// ---------------------------------------------------------------------------------------------
// Data sent with the message. What the service keeps is referred to by its name.

constexpr std::string_view SCHEME = "cid:";

// The name that a reference gives, if it is one of the service's own.
std::string name_of(const std::string *reference)
{
    const std::string &text = text_of(reference);
    return text.starts_with(SCHEME) ? text.substr(SCHEME.size()) : std::string();
}

// Attachments of a request may refer to each other: in a ring, in chains of any length, or from many places.
// Each is used once.
template <class Use> void each_attachment(const attachments &list, const Use &use)
{
    std::set<const protocol__Attachment *> used;
    attachments waiting(list.rbegin(), list.rend());
    while (!waiting.empty()) {
        protocol__Attachment *const next = waiting.back();
        waiting.pop_back();
        if (next == nullptr || !used.insert(next).second)
            continue;
        use(*next);
        waiting.insert(waiting.end(), next->attachment.rbegin(), next->attachment.rend());
    }
}

// All names under which the service may keep data of the attachments: of those that came with a message,
// and of those that came through a data port.
std::set<std::string> names_in(const attachments &list)
{
    std::set<std::string> names;
    each_attachment(list, [&](const protocol__Attachment &attachment) {
        names.insert(name_of(attachment.dataHandler));
        for (const protocol__DataPort *port : attachment.dataPort) {
            const std::string &uri = port == nullptr ? text_of(nullptr) : text_of(port->dataURI);
            const std::size_t path = uri.find(DATA_PATH);
            if (path != std::string::npos)
                names.insert(uri.substr(path + DATA_PATH.size()));
        }
    });
    names.erase(std::string());
    return names;
}

struct kept_data {
    std::string name;
    std::uint64_t size;
};

// Keeps data that came with the message under a new name.
kept_data keep_enclosed(call &c, const std::string &reference)
{
    enclosed_data data{};
    if (!c.enclosed.find(c.ctx, reference, data))
        refuse<protocol__Client_x002eInvalidInformation>(
            c.ctx, "Nothing came with the message under the reference " + reference + ".");
    kept_data kept{fresh_uuid(), data.size};
    c.documents.expect_data(kept.name);
    c.documents.note_data(kept.name, data.size);
    c.enclosed.keep(data, kept.name);
    return kept;
}

void refer_to(call &c, protocol__Attachment &attachment, const kept_data &kept)
{
    attachment.dataHandler = make_text(c.ctx, std::string(SCHEME) + kept.name);
    attachment.size = make_text(c.ctx, std::to_string(kept.size));
    attachment.state = make_value(c.ctx, state::complete);
    attachment.dataPort = {make_data_port(c, protocol__Direction::out, kept.name)};
    attachment.dataPort.front()->attachmentURI = attachment.thisURI;
}

// A document is kept as plain XML, with binary values inline.
void put_values_in_place(const protocol__Attachment &attachment)
{
    for (protocol__DataPort *port : attachment.dataPort)
        if (port != nullptr && port->hash != nullptr)
            port->hash->id = port->hash->type = port->hash->options = nullptr;
}

bool leads_to(const protocol__Attachment &attachment, const std::string &data_uri)
{
    return text_of(attachment.dataURI) == data_uri ||
           std::any_of(attachment.dataPort.begin(), attachment.dataPort.end(),
                       [&](const protocol__DataPort *port) {
                           return port != nullptr && text_of(port->dataURI) == data_uri;
                       });
}

bool reports_problem(const protocol__AttachStatusRequest &report)
{
    return report.problemEncountered != nullptr && *report.problemEncountered;
}

state state_after(const protocol__AttachStatusRequest &report)
{
    if (report.recommendedAttachmentState != nullptr)
        return *report.recommendedAttachmentState;
    if (reports_problem(report))
        return state::error;
    return report.percentComplete != nullptr && *report.percentComplete >= ALL ? state::complete
                                                                               : state::pending;
}

} // namespace

protocol__DataPort *make_data_port(const call &c, protocol__Direction direction, const std::string &name)
{
    auto *const port = make<protocol__DataPort>(c.ctx);
    port->state = make_value(c.ctx, protocol__DataPortState::open);
    const std::string path = std::string(DATA_PATH) + name;
    port->dataURI = make_text(c.ctx, c.root + path);
    port->dataURIMetaData = make<protocol__URIMetaData>(c.ctx);
    port->dataURIMetaData->type = make_value(c.ctx, protocol__URIType::direct);
    port->direction = make_value(c.ctx, direction);
    port->transport = make_value(c.ctx, protocol__Transport::HTTP);
    port->transportDetail.push_back(
        direction == protocol__Direction::in
            ? exchange_at<protocolHTTP__HttpPost, protocolHTTP__HttpPostRequest,
                          protocolHTTP__HttpPostResponse>(c, path)
            : exchange_at<protocolHTTP__HttpGet, protocolHTTP__HttpGetRequest, protocolHTTP__HttpGetResponse>(
                  c, path));
    return port;
}

bool serves(const call &c, const protocol__DataPortPreference *preference, protocol__Direction direction)
{
    return preference == nullptr || (admits_uri(preference->dataURIType) &&
                                     admits(preference->direction, {direction, protocol__Direction::inout}) &&
                                     admits(preference->transport, {protocol__Transport::HTTP}) &&
                                     admits(preference->authentication, {authentication_of(c)}));
}

protocol__Client_x002eDataPortIncompatibility *
incompatibility(const call &c, const protocol__DataPortPreference *preference, protocol__Direction direction)
{
    if (serves(c, preference, direction))
        return nullptr;
    auto *const fault = make_fault<protocol__Client_x002eDataPortIncompatibility>(
        c.ctx, "The service has no data port of the kind preferred.");
    fault->direction = {direction};
    fault->transport = {protocol__Transport::HTTP};
    fault->authentication = {authentication_of(c)};
    return fault;
}

void take_attachment(call &c, attachments &held, protocol__Attachment *given,
                     const protocol__DataPortPreference *preference)
{
    if (given == nullptr)
        refuse<protocol__Client_x002eInsufficientInformation>(c.ctx, "The request holds no attachment.");
    const std::string name = fresh_uuid();
    given->thisURI = make_text(c.ctx, "urn:zuv:attachment:" + name);
    given->state = make_value(c.ctx, holds_data(*given) ? state::complete : state::pending);
    given->dataPort.clear();
    attachments taken = {given};
    take_references(c, taken);
    if (!holds_data(*given)) {
        if (auto *const fault = incompatibility(c, preference, protocol__Direction::in))
            refuse(fault);
        c.documents.expect_data(name);
        protocol__DataPort *const port = make_data_port(c, protocol__Direction::in, name);
        port->attachmentURI = given->thisURI;
        given->dataPort.push_back(port);
    }
    held.push_back(given);
}

protocol__Attachment &find_attachment(call &c, const attachments &held,
                                      const protocol__AttachStatusRequest &report)
{
    const std::string &uri = text_of(report.attachmentURI), &data_uri = text_of(report.dataURI);
    if (uri.empty() && data_uri.empty())
        refuse<protocol__Client_x002eInsufficientInformation>(c.ctx,
                                                              "The request does not name its attachment.");
    for (protocol__Attachment *attachment : held)
        if (attachment != nullptr &&
            (uri.empty() ? leads_to(*attachment, data_uri) : text_of(attachment->thisURI) == uri))
            return *attachment;
    refuse_not_found(c.ctx, uri.empty() ? data_uri : uri);
}

void take_references(call &c, attachments &given, const attachments *held)
{
    const std::set<std::string> known = held == nullptr ? std::set<std::string>() : names_in(*held);
    std::map<std::string, kept_data> kept; // by reference: data is kept once, however many refer to it
    std::size_t references = 0;
    each_attachment(given, [&](protocol__Attachment &attachment) {
        put_values_in_place(attachment);
        if (attachment.dataHandler == nullptr || known.count(name_of(attachment.dataHandler)) != 0)
            return;
        if (++references > REFERENCES_MAX)
            refuse<protocol__Client_x002eInvalidInformation>(
                c.ctx, "Too many attachments of the request refer to data sent with it.");
        const std::string &reference = *attachment.dataHandler;
        auto place = kept.find(reference);
        if (place == kept.end())
            place = kept.emplace(reference, keep_enclosed(c, reference)).first;
        refer_to(c, attachment, place->second);
    });
}

void settle_references(call &c, attachments &answered,
                       const std::function<bool(const protocol__Attachment &)> &is_sent)
{
    each_attachment(answered, [&](protocol__Attachment &attachment) {
        const std::string name = name_of(attachment.dataHandler);
        const bool enclosed = !name.empty() && c.enclosed.has_form() && is_sent(attachment) &&
                              c.documents.data_size(name) && c.enclosed.enclose(name);
        if (!enclosed)
            attachment.dataHandler = nullptr;
    });
}

void forget_data(call &c, const attachments &gone, const attachments *remaining)
{
    std::set<std::string> names = names_in(gone);
    if (remaining != nullptr)
        for (const std::string &name : names_in(*remaining))
            names.erase(name);
    std::erase_if(names, [&c](const std::string &name) { return !c.documents.data_size(name); });
    if (names.empty())
        return;
    store::writing transaction(c.documents);
    for (const std::string &name : names)
        c.documents.forget_data(name);
    transaction.commit();
    for (const std::string &name : names)
        remove_data(c.documents.data_directory(), name);
}

void note_progress(call &c, const attachments &held, const protocol__AttachStatusRequest &report)
{
    protocol__Attachment &attachment = find_attachment(c, held, report);
    attachment.state = make_value(c.ctx, state_after(report));
    if (report.sizeTransferred != nullptr)
        attachment.size = report.sizeTransferred;
    if (reports_problem(report))
        attachment.error = make_fault<protocol__Client>(c.ctx, text_of(report.description));
    if (*attachment.state == state::pending)
        return;
    for (protocol__DataPort *port : attachment.dataPort)
        if (port != nullptr)
            port->state = make_value(c.ctx, protocol__DataPortState::closed);
}

bool all_arrived(const attachments &held)
{
    return std::none_of(held.begin(), held.end(), [](const protocol__Attachment *attachment) {
        return attachment != nullptr && attachment->state != nullptr && *attachment->state == state::pending;
    });
}

} // namespace service
