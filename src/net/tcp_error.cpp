// tcp_error.cpp - texts of what fails on a socket: the system's, the resolver's, and time limits that ran
// out.
#include <cstdio>
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_tcp.h>

#include "net/call_record.h"
#include "net/tcp_wait.h"

namespace {

// What a time limit adds to a text: "u" for microseconds, blank for seconds.
std::size_t append_limit(char *text, std::size_t size, const char *what, int timeout)
{
    if (timeout == 0)
        return 0;
    const long long amount = timeout < 0 ? -static_cast<long long>(timeout) : timeout;
    const int written = std::snprintf(text, size, " (%lld%cs %s)", amount, timeout < 0 ? 'u' : ' ', what);
    return static_cast<std::size_t>(written);
}

const char *text_of_ending(const soap_call_record &record)
{
    if (record.report.ended_by == ENDED_BY_CANCEL)
        return "The call was cancelled";
    return record.report.first_byte_time < 0 ? "The peer closed the connection without an answer"
                                             : "The peer closed the connection before the end of its answer";
}

} // namespace

const char *soap_eof_text(soap *ctx)
{
    if (ctx->errno_value != 0 && !ctx->call_expired) {
        char own[SOAP_TEXT_SIZE];
        std::snprintf(ctx->message_text, sizeof ctx->message_text, "%s",
                      strerror_r(ctx->errno_value, own, sizeof own));
        return ctx->message_text;
    }
    char *text = ctx->message_text;
    const std::size_t size = sizeof ctx->message_text;
    if (call_ending(ctx) == ENDED_BY_CANCEL || call_ending(ctx) == ENDED_BY_PEER) {
        std::snprintf(text, size, "%s", text_of_ending(*ctx->call_record));
        return text;
    }
    auto length = static_cast<std::size_t>(std::snprintf(text, size, "Operation interrupted or timed out"));
    if (ctx->call_expired) {
        append_limit(text + length, size - length, "call limit", ctx->call_timeout);
        return text;
    }
    length += append_limit(text + length, size - length, "receive delay", ctx->recv_timeout);
    append_limit(text + length, size - length, "send delay", ctx->send_timeout);
    return text;
}

const char *tcp_error_text(soap *ctx)
{
    static const char *const resolver_texts[] = {"Host not found", "Try Again", "No Recovery", "No Data"};
    if (ctx->error_mode == 1)
        return "WSAStartup failed";
    if (ctx->error_mode != 2)
        return soap_eof_text(ctx); // the system's text, or that of an interruption with the limits in force
    if (ctx->errno_value >= 1 && ctx->errno_value <= 4)
        return resolver_texts[ctx->errno_value - 1];
    std::snprintf(ctx->message_text, sizeof ctx->message_text, "TCP/UDP IP error %d", ctx->errno_value);
    return ctx->message_text;
}

const char *tcp_timeout_text(soap *ctx)
{
    return ctx->call_expired ? soap_eof_text(ctx) : "Timeout";
}
