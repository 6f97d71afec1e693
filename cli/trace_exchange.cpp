// trace_exchange.cpp - see trace_exchange.h.
#include "trace_exchange.h"

#include <algorithm>

#include "contract.h"
#include "xml_tokens.h"

namespace cli {

namespace {

constexpr std::size_t PARTS_MAX = 1000;
constexpr std::size_t FAULT_MAX = 300; // bytes of a fault's text
// How long a request is held to wait for its answer: until so many later ones were answered, or so many
// exchanges, or bytes of their bodies, are held.
constexpr int OVERTAKEN_MAX = 3;
constexpr std::size_t ENTRIES_MAX = 64, HELD_MAX = 16U << 20;

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

// Type, id and name of a MIME part from its head.
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
        if (same_name(line.substr(0, colon), "Content-Description") && part.name.empty())
            part.name = text;
        if (const std::string file = parameter(text, "filename"); !file.empty())
            part.name = file;
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

std::size_t big_endian(std::string_view bytes, std::size_t at, std::size_t size)
{
    std::size_t value = 0;
    for (std::size_t i = 0; i < size; ++i)
        value = value << 8U | static_cast<unsigned char>(bytes[at + i]);
    return value;
}

// Records of a DIME message: a head of 12 bytes with the sizes of options, id, type and data, each of which is
// filled up to a multiple of 4. Chunks of one record are joined by name only: each is a part.
std::vector<body_part> dime_parts(std::string_view body)
{
    constexpr std::size_t HEAD = 12;
    std::vector<body_part> parts;
    for (std::size_t at = 0; body.size() - at >= HEAD && parts.size() < PARTS_MAX;) {
        const std::size_t sizes[] = {big_endian(body, at + 2, 2), big_endian(body, at + 4, 2),
                                     big_endian(body, at + 6, 2), big_endian(body, at + 8, 4)};
        std::string_view fields[4];
        at += HEAD;
        for (std::size_t i = 0; i < 4; ++i) {
            fields[i] = body.substr(std::min(at, body.size()), sizes[i]);
            at = std::min(at + (sizes[i] + 3) / 4 * 4, body.size());
        }
        body_part &one = parts.emplace_back();
        one.id = fields[1];
        one.type = fields[2];
        one.bytes = fields[3];
        one.xml = looks_like_xml(one.bytes);
    }
    return parts;
}

struct message_facts {
    std::string operation; // local name of the Body's element without "Request" or "Response"
    std::string fault;
    bool soap12 = false;
};

void cut_end(std::string &name, std::string_view end)
{
    if (name.size() > end.size() && name.ends_with(end))
        name.resize(name.size() - end.size());
}

message_facts facts_of(std::string_view xml)
{
    message_facts found;
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
        if (name == "Fault")
            found.fault = "fault";
        else if (found.fault.empty()) {
            found.operation = name;
            cut_end(found.operation, "Request");
            cut_end(found.operation, "Response");
            return found;
        }
        in_text = token.kind == xml_kind::start && (name == "faultstring" || name == "Text");
        if (name == "detail" || name == "Detail")
            break;
    }
    return found;
}

message_facts facts_of(const trace_message &message)
{
    for (const body_part &part : parts_of(message))
        if (part.xml)
            return facts_of(part.bytes);
    return {};
}

void add_times(const trace_message &message, const trace_times &times, exchange &to)
{
    const trace_times::span span = times.of(message.request, message.begin, message.wire_size);
    std::int64_t &first = message.request ? to.sent_first_us : to.received_first_us;
    if (first == 0)
        first = span.first_us;
    to.last_us = std::max(to.last_us, span.last_us);
}

void add_message(trace_message &&message, const message_facts &facts, exchange &to)
{
    to.complete = to.complete && message.complete;
    to.soap12 = to.soap12 || facts.soap12;
    (message.request ? to.sent : to.received) += message.wire_size;
    if (message.request) {
        const std::string_view line = message.start_line;
        const std::size_t blank = std::min(line.find(' '), line.size());
        const std::size_t end = std::min(line.find(' ', blank + 1), line.size());
        to.operation = facts.operation.empty() ? std::string(line.substr(0, blank)) : facts.operation;
        to.target = blank < end ? line.substr(blank + 1, end - blank - 1) : "";
    } else {
        if (!message.start_line.empty())
            to.status = message.status();
        if (!facts.fault.empty())
            to.fault = facts.fault;
    }
    to.messages.push_back(std::move(message));
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
    else if (type.starts_with("application/dime"))
        parts = dime_parts(message.body);
    for (std::size_t i = 1; i < parts.size(); ++i)
        parts[i].attached = true;
    if (parts.empty())
        parts.push_back({std::string(type), "", "", message.body, looks_like_xml(message.body)});
    return parts;
}

// The request that an answer belongs to; null if none waits for one.
exchange_reader::entry *exchange_reader::asked_by(const trace_message &answer, const std::string &operation)
{
    if (answer.start_line.empty()) // bytes that can't be made out
        return entries_.empty() ? nullptr : &entries_.back();
    std::vector<entry *> waiting, same;
    for (entry &one : entries_)
        if (one.waits) {
            waiting.push_back(&one);
            if (!operation.empty() && one.content.operation == operation)
                same.push_back(&one);
        }
    const std::vector<entry *> &candidates = same.empty() ? waiting : same;
    if (candidates.empty())
        return nullptr;
    const contest kind = same.empty() ? contest::by_any : contest::by_operation;
    for (entry *one : candidates)
        if (candidates.size() > 1)
            one->contested = std::max(one->contested, kind);
    if (candidates.back()->contested >= kind && candidates.back()->contested != contest::none)
        candidates.back()->content.doubt = "the answer may be another's: several requests waited";
    return candidates.back();
}

void exchange_reader::take(trace_message &&message)
{
    const message_facts facts = facts_of(message);
    entry *to = message.request ? nullptr : asked_by(message, facts.operation);
    if (to == nullptr) {
        to = &entries_.emplace_back();
        to->content.number = ++count_;
        to->waits = message.request;
        if (!message.request && !message.start_line.empty())
            to->content.doubt = "an answer whose request isn't known";
    }
    to->size += message.body.size();
    const bool answers = !message.request && message.status() >= 200;
    add_times(message, times_, to->content);
    add_message(std::move(message), facts, to->content);
    if (!answers)
        return;
    to->waits = false;
    for (entry &one : entries_)
        if (&one != to && one.waits && one.content.number < to->content.number &&
            ++one.overtaken >= OVERTAKEN_MAX)
            one.waits = false;
}

// The last one may still get bytes that can't be made out.
bool exchange_reader::is_ready() const
{
    if (entries_.empty() || ended_)
        return ended_;
    std::size_t held = 0;
    for (const entry &one : entries_)
        held += one.size;
    return (entries_.size() > 1 && !entries_.front().waits) || entries_.size() > ENTRIES_MAX ||
           (entries_.size() > 1 && held > HELD_MAX);
}

bool exchange_reader::next(exchange &found)
{
    while (!is_ready()) {
        trace_message message;
        ended_ = !messages_.next(message);
        if (!ended_)
            take(std::move(message));
    }
    if (entries_.empty())
        return false;
    found = std::move(entries_.front().content);
    entries_.pop_front();
    return true;
}

} // namespace cli
