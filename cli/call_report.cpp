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

double milliseconds(std::int64_t microseconds)
{
    return static_cast<double>(microseconds) / 1000;
}

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

void add_connection(lines &out, const soap_report &told)
{
    if (told.lookup_time >= 0)
        out.add("looked up in %.3f ms", milliseconds(told.lookup_time));
    if (told.reused)
        out.add("kept connection to %s from %s", told.peer, told.local);
    else if (told.connect_time >= 0)
        out.add("connected to %s from %s at %.3f ms, addresses tried: %d", told.peer, told.local,
                milliseconds(told.connect_time), told.addresses_tried);
    else if (*told.peer != '\0')
        out.add("no connection to %s, addresses tried: %d", told.peer, told.addresses_tried);
}

void add_tls(lines &out, const soap_report &told)
{
    if (*told.tls_version != '\0')
        out.add("%s, %s%s", told.tls_version, told.tls_cipher, told.resumed ? ", session resumed" : "");
    if (*told.certificate_subject != '\0')
        out.add("certificate of %s, issued by %s, valid from %s to %s", told.certificate_subject,
                told.certificate_issuer, day(told.certificate_not_before).c_str(),
                day(told.certificate_not_after).c_str());
    if (*told.certificate_refusal != '\0')
        out.add("certificate refused: %s", told.certificate_refusal);
    if (told.tls_time >= 0)
        out.add("TLS ready at %.3f ms", milliseconds(told.tls_time));
}

void add_message(lines &out, const soap_report &told)
{
    out.add("sent %llu bytes, %llu on the wire", static_cast<unsigned long long>(told.plain_sent),
            static_cast<unsigned long long>(told.wire_sent));
    if (told.first_byte_time >= 0)
        out.add("first byte of the response at %.3f ms", milliseconds(told.first_byte_time));
    out.add("received %llu bytes, %llu on the wire", static_cast<unsigned long long>(told.plain_received),
            static_cast<unsigned long long>(told.wire_received));
    if (told.http_status != 0)
        out.add("HTTP status %d", told.http_status);
}

void add_ending(lines &out, const soap_report &told)
{
    if (const char *const how = ending(told.ended_by))
        out.add("%s", how);
}

} // namespace

std::string utc_time(std::int64_t seconds)
{
    const std::time_t time = seconds;
    std::tm parts{};
    char text[64] = "";
    gmtime_r(&time, &parts);
    std::strftime(text, sizeof text, "%Y-%m-%dT%H:%M:%SZ", &parts);
    return text;
}

std::vector<std::string> connection_steps(const soap_report &told)
{
    lines out;
    add_connection(out, told);
    add_tls(out, told);
    add_ending(out, told);
    return out.all();
}

std::string call_report(const soap_report &told)
{
    lines out;
    add_connection(out, told);
    add_tls(out, told);
    if (told.wire_sent != 0)
        add_message(out, told);
    add_ending(out, told);
    if (told.total_time >= 0)
        out.add("over at %.3f ms", milliseconds(told.total_time));
    std::string text;
    for (const std::string &line : out.all())
        text += "* " + line + "\n";
    return text;
}

} // namespace cli
