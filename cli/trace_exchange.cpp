// trace_exchange.cpp - see trace_exchange.h.
#include "trace_exchange.h"

#include <algorithm>

#include "contract.h"
#include "xml_tokens.h"

namespace cli {

namespace {

constexpr std::size_t PARTS_MAX = 1000;
constexpr std::size_t FAULT_MAX = 300; // bytes of a fault's text

bool looks_like_xml(std::string_view bytes)
{
    const std::size_t first = bytes.find_first_not_of(" \t\r\n\xEF\xBB\xBF");
    return first != std::string_view::npos && bytes[first] == '<';
}

// The parameter of a header value such as `multipart/related; boundary="x"`.
std::string parameter(std::string_view value, std::string_view name)
{
    for (std::size_t at = value.find(';'); at != std::string_view::npos;) {
        const std::size_t begin = value.find_first_not_of("; \t", at);
        if (begin == std::string_view::npos)
            break;
        const std::size_t equals = std::min(value.find('=', begin), value.size());
        const bool quoted = equals + 1 < value.size() && value[equals + 1] == '"';
        const std::size_t end = quoted ? std::min(value.find('"', equals + 2), value.size())
                                       : std::min(value.find(';', equals), value.size());
        if (same_name(value.substr(begin, equals - begin), name) && equals < value.size())
            return std::string(value.substr(equals + (quoted ? 2 : 1), end - equals - (quoted ? 2 : 1)));
        at = value.find(';', end);
    }
    return "";
}

// Type and id of a MIME part from its head.
void read_part_head(std::string_view head, body_part &part)
{
    while (!head.empty()) {
        const std::size_t end = std::min(head.find('\n'), head.size());
        std::string_view line = head.substr(0, end);
        head.remove_prefix(std::min(end + 1, head.size()));
        const std::size_t colon = line.find(':');
        if (colon == std::string_view::npos)
            continue;
        const std::string_view value = line.substr(colon + 1);
        const std::size_t first = value.find_first_not_of(" \t\r"), last = value.find_last_not_of(" \t\r");
        const std::string text(first == std::string_view::npos ? "" : value.substr(first, last - first + 1));
        if (same_name(line.substr(0, colon), "Content-Type"))
            part.type = text;
        if (same_name(line.substr(0, colon), "Content-ID"))
            part.id = text;
    }
}

std::vector<body_part> mime_parts(std::string_view body, const std::string &boundary)
{
    std::vector<body_part> parts;
    const std::string delimiter = "--" + boundary;
    std::size_t at = body.find(delimiter);
    while (at != std::string_view::npos && parts.size() < PARTS_MAX) {
        const std::size_t begin = at + delimiter.size();
        if (body.substr(begin).starts_with("--"))
            break;
        at = body.find("\r\n" + delimiter, begin);
        std::string_view part =
            body.substr(begin, at == std::string_view::npos ? std::string_view::npos : at - begin);
        at = at == std::string_view::npos ? at : at + 2;
        const std::size_t head_end = part.find("\r\n\r\n");
        body_part &one = parts.emplace_back();
        read_part_head(part.substr(0, head_end), one);
        one.bytes = head_end == std::string_view::npos ? "" : part.substr(head_end + 4);
        one.xml = looks_like_xml(one.bytes);
    }
    return parts;
}

// Takes operation and fault of the exchange from the SOAP message.
void read_message(std::string_view xml, bool request, exchange &found)
{
    xml_tokens tokens(xml);
    xml_token token;
    bool in_body = false, in_text = false;
    while (tokens.next(token)) {
        if (token.kind == xml_kind::text && in_text)
            found.fault = std::string(token.source.substr(0, FAULT_MAX));
        in_text = false;
        if (token.kind != xml_kind::start && token.kind != xml_kind::empty)
            continue;
        const std::string_view name = contract::local_name(token.name);
        if (name == "Envelope" && token.source.find("2003/05/soap-envelope") != std::string_view::npos)
            found.soap12 = true;
        if (name == "Body" && !in_body) {
            in_body = true;
            continue;
        }
        if (!in_body)
            continue;
        if (request) {
            found.operation = name;
            return;
        }
        if (name == "Fault")
            found.fault = "fault";
        else if (found.fault.empty())
            return; // an answer
        in_text = token.kind == xml_kind::start && (name == "faultstring" || name == "Text");
        if (name == "detail" || name == "Detail")
            return;
    }
}

void add_message(const trace_message &message, exchange &to)
{
    to.messages.push_back(&message);
    to.complete = to.complete && message.complete;
    (message.request ? to.sent : to.received) += message.wire_size;
    if (message.request) {
        const std::string_view line = message.start_line;
        const std::size_t blank = std::min(line.find(' '), line.size());
        const std::size_t end = std::min(line.find(' ', blank + 1), line.size());
        to.operation = line.substr(0, blank);
        to.target = blank < end ? line.substr(blank + 1, end - blank - 1) : "";
    } else if (!message.start_line.empty())
        to.status = message.status();
    for (const body_part &part : parts_of(message))
        if (part.xml) {
            read_message(part.bytes, message.request, to);
            break;
        }
    constexpr std::string_view REQUEST = "Request";
    if (to.operation.size() > REQUEST.size() && to.operation.ends_with(REQUEST))
        to.operation.resize(to.operation.size() - REQUEST.size());
}

} // namespace

std::vector<body_part> parts_of(const trace_message &message)
{
    if (message.body.empty())
        return {};
    const std::string_view type = message.header("Content-Type");
    const std::string boundary = parameter(type, "boundary");
    std::vector<body_part> parts;
    if (!boundary.empty())
        parts = mime_parts(message.body, boundary);
    if (parts.empty())
        parts.push_back({std::string(type), "", message.body, looks_like_xml(message.body)});
    return parts;
}

std::vector<exchange> exchanges_of(const std::vector<trace_message> &messages)
{
    std::vector<exchange> all;
    for (const trace_message &message : messages) {
        const bool answers =
            !message.request && !all.empty() && (all.back().status < 200 || message.start_line.empty());
        if (!answers)
            all.emplace_back();
        add_message(message, all.back());
    }
    return all;
}

} // namespace cli
