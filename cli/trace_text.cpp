// trace_text.cpp - see trace_text.h.
#include "trace_text.h"

#include <algorithm>
#include <set>

#include "contract.h"
#include "text_files.h"
#include "trace_secrets.h"
#include "xml_tokens.h"

namespace cli {

namespace {

constexpr std::size_t FOLDED_FROM = 3; // namespace declarations of one tag
constexpr std::size_t INDENT_MAX = 40; // levels; deeper ones are not indented further

class xml_layout {
public:
    xml_layout(text_form form, bool show_secrets) : form_(form), show_secrets_(show_secrets) {}

    std::string text(std::string_view xml, std::size_t shown_max)
    {
        if (!show_secrets_)
            find_shared_secrets(xml);
        xml_tokens tokens(xml.substr(0, shown_max));
        for (xml_token token; tokens.next(token);)
            add(token);
        return std::move(out_);
    }

private:
    void put(std::string_view text) { out_ += shown(text, form_); }

    void put_open(std::string_view text) { put(show_secrets_ ? std::string(text) : without_secrets(text)); }

    void put_blanked()
    {
        out_ += form_ == text_form::html ? "<span class=\"s\">" : "";
        out_ += BLANKED;
        out_ += form_ == text_form::html ? "</span>" : "";
    }

    void add(const xml_token &token)
    {
        switch (token.kind) {
        case xml_kind::start:
            new_line();
            if (!hides())
                put_tag(token);
            hide_within(token);
            ++depth_;
            after_start_ = true;
            return;
        case xml_kind::empty:
            new_line();
            if (!hides())
                put_tag(token);
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
                put_open(token.source);
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
            put_blanked();
        }
        if (!after_start_)
            new_line();
        put(token.source);
    }

    void add_text(const xml_token &token)
    {
        if (hides() || token.source.find_first_not_of(" \t\r\n") == std::string_view::npos)
            return;
        if (!after_start_)
            new_line();
        put_open(token.source);
    }

    // A value that several elements share stands outside of them: an element with the id that they refer to.
    void find_shared_secrets(std::string_view xml)
    {
        xml_tokens tokens(xml);
        for (xml_token token; tokens.next(token);)
            if ((token.kind == xml_kind::start || token.kind == xml_kind::empty) &&
                is_secret_name(token.name))
                for (const std::string_view name : {"href", "ref"})
                    if (const std::string_view to = attribute_of(token, name); !to.empty())
                        shared_secrets_.insert(to.substr(to.front() == '#' ? 1 : 0));
    }

    // Without quotes, whatever the prefix of its name; empty for none.
    static std::string_view attribute_of(const xml_token &tag, std::string_view wanted)
    {
        std::string_view rest = tag.source.substr(1 + tag.name.size()), gap, name, value;
        while (next_attribute(rest, gap, name, value))
            if (contract::local_name(name) == wanted)
                return value.size() > 2 ? value.substr(1, value.size() - 2) : std::string_view();
        return {};
    }

    // A secret ends with the end tag of the element that it began with, whatever is inside.
    void hide_within(const xml_token &tag)
    {
        if (hides())
            secret_depth_ += tag.name == secret_name_ ? 1 : 0;
        else if (!show_secrets_ &&
                 (is_secret_name(tag.name) || shared_secrets_.count(attribute_of(tag, "id")) != 0)) {
            secret_name_ = tag.name;
            secret_depth_ = 1;
        }
    }

    bool hides() const { return secret_depth_ != 0; }

    void new_line()
    {
        if (hides())
            return;
        if (!out_.empty())
            out_ += '\n';
        out_.append(2 * std::min(depth_, INDENT_MAX), ' ');
    }

    // A tag; namespace declarations, when there are many, are folded.
    void put_tag(const xml_token &token)
    {
        const std::string_view start = token.source.substr(0, 1 + token.name.size());
        std::string_view rest = token.source.substr(start.size()), gap, name, value;
        put(start);
        std::string declared;
        std::size_t declarations = 0;
        while (next_attribute(rest, gap, name, value)) {
            if (!name.starts_with("xmlns")) {
                put_attribute(name, value);
                continue;
            }
            ++declarations;
            declared.append(" ").append(name).append(value.empty() ? "" : "=").append(value);
        }
        if (declarations <= FOLDED_FROM)
            put(declared);
        else if (form_ == text_form::html)
            out_ += " <details class=\"names\"><summary>" + std::to_string(declarations) +
                    " namespaces</summary>" + shown(declared, form_) + "</details>";
        else
            out_ += " (" + std::to_string(declarations) + " namespaces)";
        put(rest);
    }

    void put_attribute(std::string_view name, std::string_view value)
    {
        out_ += ' ';
        put(name);
        if (value.empty())
            return;
        out_ += '=';
        if (!show_secrets_ && is_secret_name(name))
            put_blanked();
        else
            put_open(value);
    }

    text_form form_;
    bool show_secrets_, after_start_ = false;
    std::string_view secret_name_;
    std::set<std::string_view> shared_secrets_; // ids
    std::size_t depth_ = 0, secret_depth_ = 0;
    std::string out_;
};

std::string message_text(const trace_message &message, bool show_secrets)
{
    std::string text =
        std::string(message.request ? "\nrequest" : "\nanswer") + ", " + size_words(message.wire_size) +
        " in the trace, body " + size_words(message.body.size()) +
        (message.complete ? "" : "; incomplete: it broke off, or its body can't be made out") + "\n\n";
    if (!message.start_line.empty())
        text += printable(shown_start_line(message.start_line, show_secrets)) + "\n";
    for (const auto &[name, value] : message.headers)
        text += printable(name) + ": " + printable(shown_header(name, value, show_secrets)) + "\n";
    const std::vector<body_part> parts = parts_of(message);
    for (const body_part &part : parts) {
        const bool as_text = part.xml || (show_secrets && part.type.starts_with("text/"));
        if (parts.size() > 1 || !as_text)
            text += "\n" + printable(part_label(part)) + (as_text ? "" : ", not shown") + "\n";
        if (part.xml)
            text += "\n" + xml_text(part.bytes, text_form::plain, show_secrets, part.bytes.size()) + "\n";
        else if (as_text)
            text += "\n" + printable(part.bytes, true) + "\n";
    }
    return text;
}

} // namespace

std::string shown(std::string_view text, text_form form, bool lines)
{
    std::string clean = printable(text, lines);
    if (form == text_form::plain)
        return clean;
    std::string safe;
    safe.reserve(clean.size() + clean.size() / 8);
    // What the page holds is content of elements, never an attribute.
    for (std::size_t at = 0; at < clean.size();) {
        const std::size_t end = std::min(clean.find_first_of("<&", at), clean.size());
        safe.append(clean, at, end - at);
        if (end < clean.size())
            safe += clean[end] == '<' ? "&lt;" : "&amp;";
        at = end + 1;
    }
    return safe;
}

std::string xml_text(std::string_view xml, text_form form, bool show_secrets, std::size_t shown_max)
{
    return xml_layout(form, show_secrets).text(xml, shown_max);
}

std::string part_label(const body_part &part)
{
    return (part.attached ? "attachment" + (part.name.empty() ? "" : " " + part.name) + ": " : "") +
           (part.type.empty() ? "data without a type" : part.type) + (part.id.empty() ? "" : ", " + part.id) +
           ", " + size_words(part.bytes.size());
}

std::string exchange_text(const exchange &one, bool show_secrets)
{
    std::string text = "exchange " + std::to_string(one.number) + ": " +
                       printable(one.operation.empty() ? "unknown" : one.operation) + ", " +
                       (one.status == 0 ? "no answer" : std::to_string(one.status)) +
                       (one.soap12 ? ", SOAP 1.2" : ", SOAP 1.1") + "\n";
    if (one.sent_first_us != 0)
        text += "began " + moment_words(one.sent_first_us) + ", last byte after " +
                elapsed_words(one.sent_first_us, one.last_us) + "\n";
    if (const std::string waited = elapsed_words(one.sent_first_us, one.received_first_us); !waited.empty())
        text += "answer after " + waited + "\n";
    if (!one.fault.empty())
        text += "fault: " + printable(show_secrets ? one.fault : without_secrets(one.fault)) + "\n";
    if (!one.doubt.empty())
        text += one.doubt + "\n";
    for (const trace_message &message : one.messages)
        text += message_text(message, show_secrets);
    return text;
}

} // namespace cli
