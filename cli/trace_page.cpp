// trace_page.cpp - see trace_page.h.
//
// Always: text from the trace goes through `shown`, and the page's policy allows its own script only, known by
// its hash, and no request at all.
#include "trace_page.h"

#include <array>

#include <openssl/evp.h>

#include "text_files.h"
#include "trace_script.h"
#include "trace_secrets.h"
#include "trace_style.h"
#include "trace_text.h"

namespace cli {

namespace {

// What a browser opens in a few seconds: bytes of one document, and of a document after so many on the page. Of
// what is beyond only the size is shown.
constexpr std::size_t DOCUMENT_MAX = 400000, PAGE_MAX = 16U << 20, DOCUMENT_AFTER_MAX = 1000;

std::string html(std::string_view text)
{
    return shown(text, text_form::html, false);
}

// The hash of the script as a browser's policy names it.
std::string script_hash()
{
    std::array<unsigned char, EVP_MAX_MD_SIZE> hash{};
    std::array<unsigned char, EVP_MAX_MD_SIZE * 2> base64{};
    unsigned size = 0;
    if (EVP_Digest(TRACE_SCRIPT, sizeof TRACE_SCRIPT - 1, hash.data(), &size, EVP_sha256(), nullptr) != 1)
        throw std::bad_alloc();
    EVP_EncodeBlock(base64.data(), hash.data(), static_cast<int>(size));
    return reinterpret_cast<const char *>(base64.data());
}

class page_writer {
public:
    page_writer(std::FILE *file, bool show_secrets) : file_(file), show_secrets_(show_secrets) {}

    void begin(const std::string &title)
    {
        put("<!DOCTYPE html>\n<html lang=\"en\"><head><meta charset=\"utf-8\">"
            "<meta http-equiv=\"Content-Security-Policy\" content=\"default-src 'none'; style-src "
            "'unsafe-inline'; script-src 'sha256-" +
            script_hash() +
            "'\"><meta name=\"viewport\" content=\"width=device-width, initial-scale=1\"><title>" +
            html(title) + "</title><style>" + TRACE_STYLE + "</style></head><body><main>\n");
    }

    void add(const exchange &one)
    {
        ++count_;
        failed_ += one.failed() ? 1 : 0;
        sent_ += one.sent;
        received_ += one.received;
        const std::string status = one.status == 0 ? "no answer" : std::to_string(one.status);
        std::string text =
            std::string("<details class=\"exchange") + (one.failed() ? " failed" : "") +
            "\"><summary><span class=\"number\">" + std::to_string(one.number) +
            "</span><span class=\"badge " + outcome(one) + "\">" + status +
            "</span><span class=\"operation\">" + html(one.operation.empty() ? "unknown" : one.operation) +
            "</span><span class=\"target\">" + html(shown_start_line(one.target, show_secrets_)) +
            remark(one.fault) + remark(one.doubt) + "</span><span class=\"size\">" +
            (one.soap12 ? "<abbr>SOAP 1.2</abbr> " : "") + times(one) + "&uarr; " + size_words(one.sent) +
            " &darr; " + size_words(one.received) + "</span></summary>";
        for (const trace_message &message : one.messages)
            text += message_text(message, one.number);
        put(text + "</details>\n");
    }

    // What is counted comes last; the style puts it first.
    void end(const std::string &title)
    {
        const auto fact = [](const std::string &value, const char *label) {
            return "<div><b>" + value + "</b><span>" + label + "</span></div>";
        };
        put((count_ == 0 ? "<p class=\"note\">There are no exchanges.</p>" : "") +
            std::string("</main><header><h1>") + html(title) + "</h1><div class=\"facts\">" +
            fact(std::to_string(count_), "exchanges") + fact(std::to_string(failed_), "failed") +
            fact(size_words(sent_), "sent") + fact(size_words(received_), "received") +
            "</div><form id=\"find\" hidden><input id=\"words\" type=\"search\" placeholder=\"Search\" "
            "aria-label=\"Search\"><label><input id=\"failed\" type=\"checkbox\"> Failed only</label>"
            "<output id=\"found\"></output></form></header><footer>" +
            (show_secrets_ ? "Secrets are shown: keep this page to yourself."
                           : "Certificates, keys, passwords and tokens are not shown.") +
            "</footer><script>" + TRACE_SCRIPT + "</script></body></html>\n");
    }

private:
    void put(const std::string &text) { std::fwrite(text.data(), 1, text.size(), file_); }

    static const char *outcome(const exchange &one)
    {
        if (one.status == 0)
            return "none";
        if (!one.failed())
            return "good";
        const bool carries_faults = one.status == 200 || one.status == 400 || one.status == 500;
        return carries_faults && !one.fault.empty() ? "fault" : "bad";
    }

    static std::string times(const exchange &one)
    {
        const std::string took = elapsed_words(one.sent_first_us, one.last_us);
        return one.sent_first_us == 0 ? ""
                                      : "<time>" + moment_words(one.sent_first_us) + "</time> " + took + " ";
    }

    std::string remark(const std::string &text) const
    {
        return text.empty() ? "" : "<em>" + html(show_secrets_ ? text : without_secrets(text)) + "</em>";
    }

    std::string message_text(const trace_message &message, std::size_t number)
    {
        std::string text = std::string("<section class=\"") + (message.request ? "request" : "answer") +
                           "\"><h3>" + (message.request ? "Request" : "Answer") + " <small>" +
                           size_words(message.wire_size) + " in the trace, body " +
                           size_words(message.body.size()) + "</small></h3>";
        if (!message.complete)
            text += "<p class=\"note\">Incomplete: it broke off, or its body can't be made out.</p>";
        if (!message.start_line.empty()) {
            text += "<p class=\"start\">" + html(shown_start_line(message.start_line, show_secrets_)) +
                    "</p><table>";
            for (const auto &[name, value] : message.headers)
                text += "<tr><th>" + html(name) + "</th><td>" +
                        html(shown_header(name, value, show_secrets_)) + "</td></tr>";
            text += "</table>";
        }
        const std::vector<body_part> parts = parts_of(message);
        for (const body_part &part : parts)
            text += part_text(part, parts.size() == 1, number);
        return text + "</section>";
    }

    std::string part_text(const body_part &part, bool alone, std::size_t number)
    {
        std::string text;
        if (!alone)
            text += "<p class=\"part\">" + html(part_label(part)) + "</p>";
        const bool as_text = part.xml || (show_secrets_ && part.type.starts_with("text/"));
        if (!as_text)
            return text + "<p class=\"note\">" + (alone ? html(part_label(part)) + ", not" : "Not") +
                   " shown</p>";
        const std::size_t limit = shown_ < PAGE_MAX ? DOCUMENT_MAX : DOCUMENT_AFTER_MAX;
        const std::string_view bytes = part.bytes.substr(0, limit);
        shown_ += bytes.size();
        text += "<pre>" +
                (part.xml ? xml_text(bytes, text_form::html, show_secrets_, limit)
                          : shown(bytes, text_form::html)) +
                "</pre>";
        if (part.bytes.size() > limit)
            text += "<p class=\"note\">and " + size_words(part.bytes.size() - limit) +
                    " more; zuv trace --show " + std::to_string(number) + " shows all</p>";
        return text;
    }

    std::FILE *file_;
    bool show_secrets_;
    std::size_t count_ = 0, failed_ = 0, sent_ = 0, received_ = 0;
    std::size_t shown_ = 0; // bytes of documents
};

} // namespace

void write_trace_page(std::FILE *file, const std::string &title, bool show_secrets,
                      const std::function<bool(exchange &)> &next)
{
    page_writer page(file, show_secrets);
    page.begin(title);
    for (exchange one; next(one);)
        page.add(one);
    page.end(title);
}

} // namespace cli
