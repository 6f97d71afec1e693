// trace_reader.cpp - see trace_reader.h.
#include "trace_reader.h"

#include <algorithm>
#include <cctype>
#include <charconv>

namespace cli {

namespace {

constexpr std::size_t START_LINE_MAX = 4096, HEADERS_MAX = 1000, NOT_FOUND = std::string_view::npos;
constexpr std::uint64_t INFLATED_PER_BYTE = 8; // of the trace, in all, beside what any trace may have
constexpr std::string_view VERSION = "HTTP/1.";
constexpr std::string_view METHODS[] = {"POST ", "GET ", "CONNECT ", "PUT ", "DELETE ", "OPTIONS ", "HEAD "};

bool is_digit(std::string_view text, std::size_t at)
{
    return at < text.size() && text[at] >= '0' && text[at] <= '9';
}

// True if "HTTP/1.1 200" or its like begins here.
bool is_status_line(std::string_view text, std::size_t at)
{
    return text.substr(at).starts_with(VERSION) && is_digit(text, at + 7) &&
           text.substr(at + 8).starts_with(' ') && is_digit(text, at + 9) && is_digit(text, at + 10) &&
           is_digit(text, at + 11);
}

// "POST /path HTTP/1.1" at this place.
bool is_request_line(std::string_view text, std::size_t at)
{
    const std::string_view rest = text.substr(at, START_LINE_MAX);
    if (std::none_of(std::begin(METHODS), std::end(METHODS),
                     [&](std::string_view method) { return rest.starts_with(method); }))
        return false;
    const std::string_view line = rest.substr(0, rest.find('\n'));
    const std::size_t version = line.rfind(" HTTP/1.");
    return version != NOT_FOUND && is_digit(line, version + 8) && line.size() <= version + 10;
}

bool is_start_line(std::string_view text, std::size_t at)
{
    return is_status_line(text, at) || is_request_line(text, at);
}

// The request line whose version is at `version`; NOT_FOUND if there is none.
std::size_t request_line_before(std::string_view text, std::size_t from, std::size_t version)
{
    const std::size_t least = std::max(from, version > START_LINE_MAX ? version - START_LINE_MAX : 0);
    std::size_t best = NOT_FOUND;
    for (const std::string_view method : METHODS) {
        const std::size_t at = text.substr(least, version - least).rfind(method);
        if (at != NOT_FOUND && is_request_line(text, least + at) && (best == NOT_FOUND || least + at > best))
            best = least + at;
    }
    return best;
}

// Where the next message begins; the end if there is none. No byte is examined for two request lines.
std::size_t next_start(std::string_view text, std::size_t from)
{
    std::size_t line = from;
    for (std::size_t at = text.find(VERSION, from); at != NOT_FOUND; at = text.find(VERSION, at + 1)) {
        if (is_status_line(text, at))
            return at;
        if (at > from && text[at - 1] == ' ')
            if (const std::size_t request = request_line_before(text, line, at); request != NOT_FOUND)
                return request;
        line = at;
    }
    return text.size();
}

std::string_view trimmed(std::string_view text)
{
    const std::size_t first = text.find_first_not_of(" \t\r");
    return first == NOT_FOUND ? "" : text.substr(first, text.find_last_not_of(" \t\r") - first + 1);
}

// Reads the head at `at`, which moves to its end.
void read_head(std::string_view trace, std::size_t &at, trace_message &message)
{
    bool first = true;
    while (at < trace.size() && message.headers.size() < HEADERS_MAX) {
        const std::size_t end = std::min(trace.find('\n', at), trace.size());
        const std::string_view line = trimmed(trace.substr(at, end - at));
        at = std::min(end + 1, trace.size());
        if (line.empty())
            return;
        const std::size_t colon = line.find(':');
        if (first)
            message.start_line = line;
        else if (colon != NOT_FOUND)
            message.headers.emplace_back(line.substr(0, colon), trimmed(line.substr(colon + 1)));
        first = false;
    }
    message.complete = false;
}

bool has_word(std::string_view value, std::string_view word)
{
    return std::search(value.begin(), value.end(), word.begin(), word.end(),
                       [](unsigned char a, unsigned char b) { return std::tolower(a) == b; }) != value.end();
}

body_framing framing_of(const trace_message &message)
{
    body_framing framing;
    framing.received = !message.request;
    framing.chunked = has_word(message.header("Transfer-Encoding"), "chunked");
    const std::string_view length = message.header("Content-Length"),
                           coding = message.header("Content-Encoding");
    framing.length_known =
        std::from_chars(length.data(), length.data() + length.size(), framing.length).ec == std::errc() &&
        !length.empty();
    framing.compressed = has_word(coding, "gzip") || has_word(coding, "deflate");
    const bool bodiless =
        message.request ? !message.start_line.starts_with("POST") && !message.start_line.starts_with("PUT")
                        : message.status() < 200 || message.status() == 204;
    if (!framing.length_known && !framing.chunked && bodiless)
        framing.length_known = true; // a length of 0
    return framing;
}

// Reads the body. One that is not followed by a message, or whose length is unknown, ends where the next
// message begins.
void read_body(std::string_view trace, std::size_t &at, trace_message &message, trace_budget &budget)
{
    const body_framing framing = framing_of(message);
    const std::size_t begin = at;
    if (framing.chunked || framing.length_known) {
        trace_body body = read_trace_body(trace, begin, framing, budget);
        const std::size_t next = std::min(trace.find_first_not_of("\r\n", body.end), trace.size());
        if (body.complete && (next == trace.size() || is_start_line(trace, next))) {
            message.body = std::move(body.bytes);
            at = body.end;
            return;
        }
    }
    at = next_start(trace, begin);
    message.complete = message.complete && !framing.chunked && !framing.length_known;
    body_framing rest = framing;
    rest.length_known = true;
    rest.length = at - begin;
    trace_body body = read_trace_body(trace.substr(0, at), begin, rest, budget);
    message.body = std::move(body.bytes);
}

} // namespace

bool same_name(std::string_view a, std::string_view b)
{
    return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                      [](unsigned char x, unsigned char y) { return std::tolower(x) == std::tolower(y); });
}

int trace_message::status() const
{
    int code = 0;
    if (!request && start_line.size() >= 12)
        std::from_chars(start_line.data() + 9, start_line.data() + 12, code);
    return code;
}

std::string_view trace_message::header(std::string_view name) const
{
    for (const auto &[key, value] : headers)
        if (same_name(key, name))
            return value;
    return "";
}

trace_reader::trace_reader(std::string_view trace) : trace_(trace)
{
    budget_.inflated += INFLATED_PER_BYTE * trace.size();
    budget_.compared += INFLATED_PER_BYTE * trace.size();
}

bool trace_reader::next(trace_message &message)
{
    at_ = std::min(trace_.find_first_not_of("\r\n", at_), trace_.size());
    if (at_ == trace_.size())
        return false;
    message = {};
    const std::size_t begin = at_;
    if (is_start_line(trace_, at_)) {
        message.request = !is_status_line(trace_, at_);
        read_head(trace_, at_, message);
        read_body(trace_, at_, message, budget_);
    } else {
        at_ = next_start(trace_, at_);
        message.body = trace_.substr(begin, at_ - begin);
        message.complete = false;
    }
    message.begin = begin;
    message.wire_size = at_ - begin;
    return true;
}

} // namespace cli
