// engine.cpp - see engine.h.
#include "client/engine.h"

#include <algorithm>
#include <atomic>

#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_tls.h>

#include "net/call_record.h"

namespace zuv {

namespace {

using std::chrono::microseconds;

// "calls.log" as "calls-3.log" for the third client that traces.
std::string trace_name(const options &wanted)
{
    static std::atomic<unsigned> last{0};
    std::string name = wanted.trace;
    if (wanted.trace_as_named || name.empty())
        return name;
    const std::size_t dot = name.rfind('.');
    const bool extension = dot != std::string::npos && name.find('/', dot) == std::string::npos;
    return name.insert(extension ? dot : name.size(), "-" + std::to_string(++last));
}

// A time limit as a context takes it: seconds, or negative for microseconds, which reach up to 35 minutes.
int limit_of(std::chrono::microseconds limit)
{
    constexpr std::int64_t most = 2147483647;
    const std::int64_t count = limit.count();
    if (count <= 0)
        return 0;
    if (count <= most)
        return -static_cast<int>(count);
    const std::int64_t seconds = count / 1000000;
    return static_cast<int>(seconds < most ? seconds : most);
}

const char *text_or_null(const std::string &text)
{
    return text.empty() ? nullptr : text.c_str();
}

microseconds shortened(microseconds pause)
{
    const std::int64_t half = pause.count() / 2;
    return pause - microseconds(half > 0 ? tls_random_word() % (half + 1) : 0);
}

} // namespace

engine::engine(std::string_view to, const options &given)
    : soap(0U), url(to), wanted(given), via(proxy_for(wanted, url)), trace(trace_name(wanted))
{
    set_modes();
    connect_timeout = limit_of(wanted.connect_limit);
    send_timeout = limit_of(wanted.send_limit);
    recv_timeout = limit_of(wanted.recv_limit);
    call_timeout = limit_of(wanted.total_limit);
    wait_with_poll = 1;
    max_message = wanted.max_message;
    max_memory = wanted.max_memory;
    max_depth = wanted.max_depth;
    set_tls();
    set_proxy();
    soap_log_set_sent(this, text_or_null(trace));
    soap_log_set_received(this, text_or_null(trace));
    if (wanted.trace_times && !trace.empty())
        soap_log_set(this, SOAP_LOG_TIMES, (trace + ".times").c_str());
}

void engine::discard()
{
    soap_discard_objects(this, nullptr);
    soap_discard_all(this);
}

void engine::set_modes()
{
    const std::uint32_t both = MODE_UTF_STRINGS | (wanted.keep_alive ? MODE_KEEP_ALIVE : 0U);
    input_mode = both | (wanted.strict_reading ? MODE_STRICT : 0U);
    output_mode = both | (wanted.compression ? MODE_DEFLATE : 0U) | (wanted.chunked ? MODE_CHUNKED : 0U);
}

void engine::set_tls()
{
    tls_flags = static_cast<std::uint16_t>((wanted.check_peer ? TLS_VERIFY_PEER : TLS_SKIP_HOST_CHECK) |
                                           (wanted.strict_check ? TLS_STRICT_HOST_CHECK : 0) |
                                           (wanted.system_ca ? 0 : TLS_NO_DEFAULT_CA));
    tls_key_file = text_or_null(wanted.certificate);
    tls_password = text_or_null(wanted.key_password);
    tls_ca_file = text_or_null(wanted.ca_file);
    tls_ca_path = text_or_null(wanted.ca_path);
    tls_crl = text_or_null(wanted.revocations);
}

void engine::set_proxy()
{
    if (via.host.empty())
        return;
    proxy_host = via.host.c_str();
    proxy_port = via.port;
    proxy_user = text_or_null(via.user);
    proxy_password = via.user.empty() ? nullptr : via.password.c_str();
}

int engine::run(const soap_operation &operation, const void *request, const extras &how, void **object)
{
    call_cancel_hold(this); // also between attempts
    const int code = repeat(operation, request, how, object);
    call_cancel_release(this);
    return code;
}

int engine::repeat(const soap_operation &operation, const void *request, const extras &how, void **object)
{
    const auto began = std::chrono::steady_clock::now();
    const auto total = wanted.total_limit;
    auto pause = microseconds(wanted.retry.first_pause);
    if (total.count() > 0)
        call_timeout = limit_of(total);
    for (attempts = 1;; ++attempts) {
        const int code = attempt(operation, request, how, object);
        if (code == SOAP_OK || attempts >= wanted.retry.attempts || !may_repeat(how))
            return code;
        const auto wait = connection_was_stale() ? microseconds(0) : shortened(pause);
        const auto passed =
            std::chrono::duration_cast<microseconds>(std::chrono::steady_clock::now() - began);
        if (total.count() > 0 && passed + wait >= total)
            return code;
        discard();
        call_pause(this, wait.count());
        pause = std::min<microseconds>(pause * 2, wanted.retry.longest_pause);
        if (total.count() > 0)
            call_timeout = limit_of(total - passed - wait);
    }
}

failure_kind engine::kind() const
{
    const bool unconnected = opens > 0 && !connected;
    if (error != SOAP_OK && call_expired)
        return call_ending(this) == ENDED_BY_CANCEL ? failure_kind::cancelled : failure_kind::out_of_time;
    switch (error) {
    case SOAP_OK:
        return failure_kind::none;
    case SOAP_TCP_ERROR:
        return opens == 0 ? failure_kind::request : failure_kind::no_connection;
    case SOAP_FD_EXCEEDED:
        return failure_kind::no_connection;
    case SOAP_TLS_ERROR:
        return failure_kind::not_trusted;
    case SOAP_EOF:
        return unconnected             ? failure_kind::no_connection
               : closed || broken != 0 ? failure_kind::broken
                                       : failure_kind::out_of_time;
    case SOAP_USER_ERROR:
        return failure_kind::request;
    case SOAP_CLIENT_FAULT:
    case SOAP_MUST_UNDERSTAND:
    case SOAP_VERSION_MISMATCH:
        return failure_kind::refused;
    case SOAP_SERVER_FAULT:
    case SOAP_FAULT:
        return failure_kind::failed;
    case SOAP_LENGTH:
        return failure_kind::too_large;
    case SOAP_OUT_OF_MEMORY:
        return failure_kind::memory;
    case 401:
    case 403:
    case 407:
        return failure_kind::unauthorized;
    default:
        break;
    }
    if (error >= 100 && error <= 999)
        return unconnected    ? failure_kind::no_connection
               : error >= 500 ? failure_kind::failed
                              : failure_kind::http;
    return received ? failure_kind::unreadable : failure_kind::request;
}

// --- one attempt ---

int engine::attempt(const soap_operation &operation, const void *request, const extras &how, void **object)
{
    begin_notes();
    *object = nullptr;
    int code = prepare(how);
    if (code == SOAP_OK) {
        code = soap_call(this, url.c_str(), nullptr, operation, request, object);
        broken = code == SOAP_EOF ? errno_value : 0;
    }
    if (how.attachments_ != nullptr)
        code = carried.end(this, code);
    if (code != SOAP_OK)
        *object = nullptr;
    return error = code;
}

void engine::begin_notes()
{
    opens = broken = 0;
    connected = received = closed = carried.consumed = false;
    if (on_open != note_open && on_open != nullptr) {
        open_ = on_open;
        on_open = note_open;
    }
    if (on_recv != note_recv && on_recv != nullptr) {
        recv_ = on_recv;
        on_recv = note_recv;
    }
    had_connection = soap::socket != -1;
    status = 0;
    call_expired = false;
}

int engine::prepare(const extras &how)
{
    soap::header = nullptr;
    error = SOAP_OK;
    if ((via.host.empty() && !wanted.proxy.empty()) || via.port <= 0)
        return refuse(this, "the HTTP proxy is not of the form [http://][user:password@]host[:port]",
                      via.host);
    if (const protocol__Header *const wanted_header = header_of(how)) {
        soap_header_record(this);
        if (soap::header == nullptr)
            return error;
        soap::header->header = const_cast<protocol__Header *>(wanted_header);
    }
    if (!wanted.user.empty()) {
        auth_user = wanted.user.c_str();
        auth_password = wanted.password.c_str();
    }
    return how.attachments_ != nullptr ? carried.begin(this, *how.attachments_) : SOAP_OK;
}

const protocol__Header *engine::header_of(const extras &how)
{
    if (how.target_.empty())
        return how.header_;
    targeted = how.header_ != nullptr ? *how.header_ : protocol__Header();
    targeted.targetURI = const_cast<std::string *>(&how.target_);
    return &targeted;
}

// --- attempts again ---

bool engine::connection_was_stale() const
{
    return had_connection && opens == 0 && !received && error == SOAP_EOF && !call_expired &&
           (closed || broken != 0);
}

bool engine::may_repeat(const extras &how) const
{
    if (carried.consumed || call_expired)
        return false;
    if (connection_was_stale())
        return true;
    const bool gateway = error == 502 || error == 503 || error == 504;
    if (opens > 0 && !connected)
        return error == SOAP_TCP_ERROR || error == SOAP_EOF || gateway;
    return how.repeatable_ && (error == SOAP_EOF || gateway);
}

// --- notes ---

int engine::note_open(soap *ctx, const char *endpoint, const char *host, int port)
{
    engine &self = of(ctx);
    ++self.opens;
    const int made = self.open_(ctx, endpoint, host, port);
    self.connected = ctx->error == SOAP_OK;
    return made;
}

// The end of input and a limit that ran out look alike; only of the former the socket is readable.
std::size_t engine::note_recv(soap *ctx, char *buffer, std::size_t length)
{
    engine &self = of(ctx);
    const std::size_t count = self.recv_(ctx, buffer, length);
    if (count != 0) {
        self.received = true;
    } else if (ctx->errno_value == 0 && !ctx->call_expired && ctx->socket != -1) {
        const int code = ctx->error;
        self.closed = tcp_wait(ctx, ctx->socket, WAIT_RECV, 0) != 0;
        ctx->errno_value = 0;
        ctx->error = code;
    }
    return count;
}

} // namespace zuv
