// call_report.cpp - see call_report.h.
#include "call_report.h"

#include <cstdarg>
#include <cstdio>
#include <ctime>

#include "text_files.h"

namespace cli {

namespace {

class lines {
public:
    [[gnu::format(printf, 2, 3)]] void add(const char *format, ...)
    {
        char text[1024];
        std::va_list values;
        va_start(values, format);
        std::vsnprintf(text, sizeof text, format, values);
        va_end(values);
        lines_.push_back(printable(text));
    }
    const std::vector<std::string> &all() const { return lines_; }

private:
    std::vector<std::string> lines_;
};

std::string day(std::int64_t seconds)
{
    return utc_time(seconds).substr(0, 10);
}

const char *ending(soap_ending by)
{
    switch (by) {
    case ENDED_BY_NOTHING:
        break;
    case ENDED_BY_PEER:
        return "ended by the peer, which closed the connection";
    case ENDED_BY_CONNECT_LIMIT:
        return "ended by --connect-limit";
    case ENDED_BY_SEND_LIMIT:
    case ENDED_BY_RECV_LIMIT:
        return "ended by --silence-limit";
    case ENDED_BY_CALL_LIMIT:
        return "ended by the limit of the whole call";
    case ENDED_BY_CANCEL:
        return "cancelled";
    }
    return nullptr;
}

void add_connection(lines &out, const soap_report &report)
{
    if (report.lookup_time >= 0)
        out.add("looked up in %.3f ms", milliseconds(report.lookup_time));
    if (report.reused)
        out.add("kept connection to %s from %s", report.peer, report.local);
    else if (report.connect_time >= 0)
        out.add("connected to %s from %s at %.3f ms, addresses tried: %d", report.peer, report.local,
                milliseconds(report.connect_time), report.addresses_tried);
    else if (*report.peer != '\0')
        out.add("no connection to %s, addresses tried: %d", report.peer, report.addresses_tried);
}

void add_tls(lines &out, const soap_report &report)
{
    if (*report.tls_version != '\0')
        out.add("%s, %s%s", report.tls_version, report.tls_cipher, report.resumed ? ", session resumed" : "");
    if (*report.certificate_subject != '\0')
        out.add("certificate of %s, issued by %s, valid from %s to %s", report.certificate_subject,
                report.certificate_issuer, day(report.certificate_not_before).c_str(),
                day(report.certificate_not_after).c_str());
    if (*report.certificate_refusal != '\0')
        out.add("certificate refused: %s", report.certificate_refusal);
    if (report.tls_time >= 0)
        out.add("TLS ready at %.3f ms", milliseconds(report.tls_time));
}

void add_message(lines &out, const soap_report &report)
{
    out.add("sent %llu bytes, %llu on the wire", static_cast<unsigned long long>(report.plain_sent),
            static_cast<unsigned long long>(report.wire_sent));
    if (report.first_byte_time >= 0)
        out.add("first byte of the response at %.3f ms", milliseconds(report.first_byte_time));
    out.add("received %llu bytes, %llu on the wire", static_cast<unsigned long long>(report.plain_received),
            static_cast<unsigned long long>(report.wire_received));
    if (report.http_status != 0)
        out.add("HTTP status %d", report.http_status);
}

void add_ending(lines &out, const soap_report &report)
{
    if (const char *const how = ending(report.ended_by))
        out.add("%s", how);
}

} // namespace

double milliseconds(std::int64_t microseconds)
{
    return static_cast<double>(microseconds) / 1000;
}

std::string utc_time(std::int64_t seconds)
{
    const auto time = static_cast<std::time_t>(seconds);
    std::tm parts{};
    char text[64] = "";
    gmtime_r(&time, &parts);
    std::strftime(text, sizeof text, "%Y-%m-%dT%H:%M:%SZ", &parts);
    return text;
}

std::vector<std::string> connection_steps(const soap_report &report)
{
    lines out;
    add_connection(out, report);
    add_tls(out, report);
    add_ending(out, report);
    return out.all();
}

std::string call_report(const soap_report &report)
{
    lines out;
    add_connection(out, report);
    add_tls(out, report);
    if (report.wire_sent != 0)
        add_message(out, report);
    add_ending(out, report);
    if (report.total_time >= 0)
        out.add("over at %.3f ms", milliseconds(report.total_time));
    std::string text;
    for (const std::string &line : out.all())
        text += "* " + line + "\n";
    return text;
}

} // namespace cli
