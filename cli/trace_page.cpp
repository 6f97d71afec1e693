// trace_page.cpp - see trace_page.h.
//
// Always: text from the trace goes through `escaped`, and the page's policy allows no script and no request
// at all.
#include "trace_page.h"

#include <algorithm>

#include "text_files.h"
#include "trace_secrets.h"
#include "trace_style.h"
#include "xml_tokens.h"

namespace cli {

namespace {

constexpr std::size_t XML_SHOWN_MAX = 400000; // bytes of one document; of the rest only the size is shown
constexpr std::size_t FOLDED_FROM = 3;        // namespace declarations of one tag
constexpr std::size_t INDENT_MAX = 40;        // levels; deeper ones are not indented further

std::string escaped(std::string_view text, bool lines = true)
{
    std::string safe;
    for (const char c : printable(text, lines)) {
        switch (c) {
        case '<':
            safe += "&lt;";
            break;
        case '>':
            safe += "&gt;";
            break;
        case '&':
            safe += "&amp;";
            break;
        case '"':
            safe += "&quot;";
            break;
        case '\'':
            safe += "&#39;";
            break;
        default:
            safe += c;
        }
    }
    return safe;
}

std::string span(const char *kind, std::string_view text)
{
    return std::string("<span class=\"") + kind + "\">" + escaped(text) + "</span>";
}

// A document laid out and coloured: one line per element, or per element with text only.
class xml_layout {
public:
    explicit xml_layout(bool show_secrets) : show_secrets_(show_secrets) {}

    std::string text(std::string_view xml)
    {
        const std::size_t hidden = xml.size() > XML_SHOWN_MAX ? xml.size() - XML_SHOWN_MAX : 0;
        xml_tokens tokens(xml.substr(0, XML_SHOWN_MAX));
        for (xml_token token; tokens.next(token);)
            add(token);
        if (hidden != 0)
            out_ += "\n" + span("n", "and " + size_words(hidden) + " more");
        return std::move(out_);
    }

private:
    void add(const xml_token &token)
    {
        switch (token.kind) {
        case xml_kind::start:
            new_line();
            if (!hides())
                out_ += tag(token);
            hide_within(token.name);
            ++depth_;
            after_start_ = true;
            return;
        case xml_kind::empty:
            new_line();
            if (!hides())
                out_ += tag(token);
            break;
        case xml_kind::end:
            add_end(token);
            break;
        case xml_kind::text:
            add_text(token);
            return;
        case xml_kind::other:
            new_line();
            if (!hides())
                out_ += span("c", token.source);
            break;
        }
        after_start_ = false;
    }

    void add_end(const xml_token &token)
    {
        depth_ -= depth_ == 0 ? 0 : 1;
        if (hides()) {
            if (token.name != secret_name_ || --secret_depth_ != 0)
                return;
            out_ += span("s", BLANKED);
        }
        if (!after_start_)
            new_line();
        out_ += span("t", token.source);
    }

    void add_text(const xml_token &token)
    {
        if (hides() || token.source.find_first_not_of(" \t\r\n") == std::string_view::npos)
            return;
        if (!after_start_)
            new_line();
        out_ += span("x", token.source);
    }

    // A secret ends with the end tag of the element that it began with, whatever is inside.
    void hide_within(std::string_view name)
    {
        if (hides())
            secret_depth_ += name == secret_name_ ? 1 : 0;
        else if (!show_secrets_ && is_secret_name(name)) {
            secret_name_ = name;
            secret_depth_ = 1;
        }
    }

    bool hides() const { return secret_depth_ != 0; }

    void new_line()
    {
        if (!hides())
            out_ += (out_.empty() ? "" : "\n") + std::string(2 * std::min(depth_, INDENT_MAX), ' ');
    }

    // A tag; namespace declarations, when there are many, are folded.
    std::string tag(const xml_token &token) const
    {
        std::string_view rest = token.source.substr(1 + token.name.size()), gap, name, value;
        std::string attributes, declared;
        std::size_t declarations = 0;
        while (next_attribute(rest, gap, name, value)) {
            const bool declares = name.starts_with("xmlns");
            declarations += declares ? 1 : 0;
            (declares ? declared : attributes) +=
                " " + span(declares ? "c" : "a", name) + attribute_value(name, value, declares);
        }
        if (declarations > FOLDED_FROM)
            declared = " <details class=\"names\"><summary>" + std::to_string(declarations) +
                       " namespaces</summary>" + declared + "</details>";
        return span("t", token.source.substr(0, 1 + token.name.size())) + attributes + declared +
               span("t", rest);
    }

    std::string attribute_value(std::string_view name, std::string_view value, bool declares) const
    {
        if (value.empty())
            return "";
        if (!show_secrets_ && !declares && is_secret_name(name))
            return "=" + span("s", BLANKED);
        return "=" + span(declares ? "c" : "v", value);
    }

    bool show_secrets_, after_start_ = false;
    std::string_view secret_name_;
    std::size_t depth_ = 0, secret_depth_ = 0;
    std::string out_;
};

std::string part_text(const body_part &part, bool show_secrets, bool alone)
{
    std::string text;
    if (!alone)
        text += "<p class=\"part\">" + escaped(part.type.empty() ? "part without a type" : part.type, false) +
                (part.id.empty() ? "" : ", " + escaped(part.id, false)) + ", " +
                size_words(part.bytes.size()) + "</p>";
    if (part.xml)
        return text + "<pre>" + xml_layout(show_secrets).text(part.bytes) + "</pre>";
    if (show_secrets && part.type.starts_with("text/"))
        return text + "<pre>" + span("x", part.bytes.substr(0, XML_SHOWN_MAX)) + "</pre>";
    return text + "<p class=\"note\">" + size_words(part.bytes.size()) + " of " +
           escaped(part.type.empty() ? "data without a type" : part.type, false) + ", not shown</p>";
}

std::string message_text(const trace_message &message, bool show_secrets)
{
    std::string text = std::string("<section class=\"") + (message.request ? "request" : "answer") +
                       "\"><h3>" + (message.request ? "Request" : "Answer") + " <small>" +
                       size_words(message.wire_size) + " in the trace, body " +
                       size_words(message.body.size()) + "</small></h3>";
    if (!message.complete)
        text += "<p class=\"note\">Incomplete: it broke off, or its body can't be made out.</p>";
    if (!message.start_line.empty()) {
        text += "<p class=\"start\">" + escaped(shown_start_line(message.start_line, show_secrets), false) +
                "</p><table>";
        for (const auto &[name, value] : message.headers)
            text += "<tr><th>" + escaped(name, false) + "</th><td>" +
                    escaped(shown_header(name, value, show_secrets), false) + "</td></tr>";
        text += "</table>";
    }
    const std::vector<body_part> parts = parts_of(message);
    for (const body_part &part : parts)
        text += part_text(part, show_secrets, parts.size() == 1);
    return text + "</section>";
}

const char *outcome(const exchange &one)
{
    if (one.status == 0)
        return "none";
    if (!one.failed())
        return "good";
    const bool carries_faults = one.status == 200 || one.status == 400 || one.status == 500;
    return carries_faults && !one.fault.empty() ? "fault" : "bad";
}

std::string exchange_text(const exchange &one, std::size_t number, bool show_secrets)
{
    const std::string status = one.status == 0 ? "no answer" : std::to_string(one.status);
    std::string text =
        "<details class=\"exchange\"><summary><span class=\"number\">" + std::to_string(number) +
        "</span><span class=\"badge " + outcome(one) + "\">" + status + "</span><span class=\"operation\">" +
        escaped(one.operation.empty() ? "unknown" : one.operation, false) + "</span><span class=\"target\">" +
        escaped(shown_start_line(one.target, show_secrets), false) +
        (one.fault.empty() ? "" : "<em>" + escaped(one.fault, false) + "</em>") +
        "</span><span class=\"size\">" + (one.soap12 ? "<abbr>SOAP 1.2</abbr> " : "") + "&uarr; " +
        size_words(one.sent) + " &darr; " + size_words(one.received) + "</span></summary>";
    for (const trace_message *message : one.messages)
        text += message_text(*message, show_secrets);
    return text + "</details>\n";
}

} // namespace

std::string trace_page(const std::string &title, const std::vector<exchange> &exchanges, bool show_secrets)
{
    std::size_t sent = 0, received = 0;
    for (const exchange &one : exchanges) {
        sent += one.sent;
        received += one.received;
    }
    const auto failed =
        std::count_if(exchanges.begin(), exchanges.end(), [](const exchange &one) { return one.failed(); });
    const auto fact = [](const std::string &value, const char *label) {
        return "<div><b>" + value + "</b><span>" + label + "</span></div>";
    };
    std::string page = "<!DOCTYPE html>\n<html lang=\"en\"><head><meta charset=\"utf-8\">"
                       "<meta http-equiv=\"Content-Security-Policy\" content=\"default-src 'none'; style-src "
                       "'unsafe-inline'\">"
                       "<meta name=\"viewport\" content=\"width=device-width, initial-scale=1\"><title>" +
                       escaped(title, false) + "</title><style>" + TRACE_STYLE +
                       "</style></head><body><header><h1>" + escaped(title, false) +
                       "</h1><div class=\"facts\">" + fact(std::to_string(exchanges.size()), "exchanges") +
                       fact(std::to_string(failed), "failed") + fact(size_words(sent), "sent") +
                       fact(size_words(received), "received") + "</div></header><main>\n";
    for (std::size_t i = 0; i < exchanges.size(); ++i)
        page += exchange_text(exchanges[i], i + 1, show_secrets);
    page += exchanges.empty() ? "<p class=\"note\">The trace is empty.</p>" : "";
    return page + "</main><footer>" +
           (show_secrets ? "Secrets are shown: keep this page to yourself."
                         : "Certificates, keys, passwords and tokens are not shown.") +
           "</footer></body></html>\n";
}

} // namespace cli
