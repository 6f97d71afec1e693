// call_record.cpp - see call_record.h; and soap_report.h.
#include "net/call_record.h"

#include <algorithm>
#include <arpa/inet.h>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <netinet/in.h>
#include <new>
#include <poll.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <openssl/ssl.h>
#include <openssl/x509.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>

#include "core/failure.h"
#include "net/tcp_socket.h"
#include "net/tcp_wait.h"
#include "net/tls_connection.h"

namespace {

// Values of soap_call_record::state.
constexpr int IDLE = 0, RUNNING = 1, CANCELLED = 2;
static_assert(std::atomic<int>::is_always_lock_free, "a signal handler changes it");

constexpr int STATUS_MIN = 100, STATUS_MAX = 999;

soap_call_record *record_of(soap *ctx)
{
    if (ctx->call_record != nullptr)
        return ctx->call_record;
    void *const memory = SOAP_MALLOC(ctx, sizeof(soap_call_record));
    if (memory == nullptr)
        return nullptr;
    ctx->call_record = new (memory) soap_call_record{};
    ctx->call_record->wake_fd = -1;
    return ctx->call_record;
}

bool is_armed(const soap_call_record &record)
{
    return record.wake_fd >= 0 && record.armed_in == tcp_process();
}

void clear(const soap_call_record &record)
{
    eventfd_t count;
    eventfd_read(record.wake_fd, &count);
}

void begin(soap *ctx, bool early)
{
    soap_call_record *const record = record_of(ctx);
    if (record == nullptr)
        return;
    soap_report &report = record->report;
    report = {};
    report.lookup_time = report.connect_time = report.tls_time = report.first_byte_time = report.total_time =
        -1;
    record->running = true;
    record->begun_early = early;
    record->opened = record->connected = false;
    record->refusal[0] = '\0';
    record->began = tcp_clock();
    ctx->plain_received = 0; // an exchange may end before the reader begins to count
    if (is_armed(*record) && !record->held)
        record->state.store(RUNNING);
}

void become_idle(soap_call_record &record)
{
    if (is_armed(record) && record.state.exchange(IDLE) == CANCELLED)
        clear(record);
}

// A close by the peer ends many a response in good order.
soap_ending ending_of(const soap *ctx, soap_ending noted)
{
    const bool broken =
        ctx->error == SOAP_EOF || ctx->error == SOAP_TCP_ERROR || ctx->error == SOAP_TLS_ERROR;
    return ctx->error == SOAP_OK || (noted == ENDED_BY_PEER && !broken) ? ENDED_BY_NOTHING : noted;
}

void write_address(char (&text)[64], const sockaddr_storage &address)
{
    char host[INET6_ADDRSTRLEN] = "";
    text[0] = '\0';
    if (address.ss_family == AF_INET6) {
        const auto &six = reinterpret_cast<const sockaddr_in6 &>(address);
        inet_ntop(AF_INET6, &six.sin6_addr, host, sizeof host);
        std::snprintf(text, sizeof text, "[%s]:%d", host, ntohs(six.sin6_port));
    } else if (address.ss_family == AF_INET) {
        const auto &four = reinterpret_cast<const sockaddr_in &>(address);
        inet_ntop(AF_INET, &four.sin_addr, host, sizeof host);
        std::snprintf(text, sizeof text, "%s:%d", host, ntohs(four.sin_port));
    }
}

std::int64_t seconds_of(const ASN1_TIME *time)
{
    std::tm parts{};
    return ASN1_TIME_to_tm(time, &parts) == 1 ? timegm(&parts) : 0;
}

const char *text_or_empty(const char *text)
{
    return text != nullptr ? text : "";
}

void describe_connection(soap_call_record &record)
{
    soap_report &report = record.report;
    write_address(record.peer_text, record.peer);
    write_address(record.local_text, record.local);
    report.peer = record.peer_text;
    report.local = record.local_text;
    report.resumed = record.resumed;
    report.tls_version = text_or_empty(record.tls_version);
    report.tls_cipher = text_or_empty(record.tls_cipher);
    if (record.certificate == nullptr)
        return;
    tls_write_name(X509_get_subject_name(record.certificate), record.subject, sizeof record.subject);
    tls_write_name(X509_get_issuer_name(record.certificate), record.issuer, sizeof record.issuer);
    report.certificate_subject = record.subject;
    report.certificate_issuer = record.issuer;
    report.certificate_not_before = seconds_of(X509_get0_notBefore(record.certificate));
    report.certificate_not_after = seconds_of(X509_get0_notAfter(record.certificate));
}

void forget_connection(soap_call_record &record)
{
    std::memset(&record.peer, 0, sizeof record.peer);
    std::memset(&record.local, 0, sizeof record.local);
    X509_free(record.certificate);
    record.certificate = nullptr;
    record.tls_version = record.tls_cipher = nullptr;
    record.resumed = false;
}

} // namespace

// ---------------------------------------------------------------------------------------------
// The exchange.

void call_record_prepare(soap *ctx)
{
    begin(ctx, true);
}

void call_record_begin(soap *ctx)
{
    soap_call_record *const record = running_record(ctx);
    if (record == nullptr || !record->begun_early)
        begin(ctx, false);
    else
        record->begun_early = false;
}

void call_record_end(soap *ctx)
{
    soap_call_record *const record = running_record(ctx);
    if (record == nullptr)
        return;
    soap_report &report = record->report;
    call_note_time(ctx, &soap_report::total_time);
    report.plain_sent = record->connected ? ctx->plain_sent : 0;
    report.plain_received = ctx->plain_received;
    report.http_status = ctx->status >= STATUS_MIN && ctx->status <= STATUS_MAX ? ctx->status : 0;
    report.ended_by = ending_of(ctx, report.ended_by);
    record->running = false;
    if (!record->held)
        become_idle(*record);
}

void call_record_free(soap *ctx)
{
    soap_call_record *const record = ctx->call_record;
    if (record == nullptr)
        return;
    forget_connection(*record);
    if (record->wake_fd >= 0)
        close(record->wake_fd);
    SOAP_FREE(ctx, record);
    ctx->call_record = nullptr;
}

const soap_report *soap_call_report(soap *ctx)
{
    soap_call_record *const record = ctx->call_record;
    if (record == nullptr || (record->began == 0 && !record->running)) // it serves soap_cancel only
        return nullptr;
    soap_report &report = record->report;
    report.peer = report.local = report.tls_version = report.tls_cipher = "";
    report.certificate_subject = report.certificate_issuer = "";
    if (record->opened)
        describe_connection(*record);
    report.certificate_refusal = record->refusal;
    return &report;
}

// ---------------------------------------------------------------------------------------------
// Notes.

void call_note_time(soap *ctx, std::int64_t soap_report::*step)
{
    if (soap_call_record *const record = running_record(ctx))
        record->report.*step = tcp_clock() - record->began;
}

void call_note_connection(soap *ctx, bool reused)
{
    soap_call_record *const record = running_record(ctx);
    if (record == nullptr)
        return;
    record->opened = true;
    record->connected = record->report.reused = reused;
    if (reused)
        return;
    forget_connection(*record);
    record->refusal[0] = '\0';
    record->report.lookup_time = record->report.connect_time = record->report.tls_time = -1;
}

void call_note_address(soap *ctx, const sockaddr *address, socklen_t size)
{
    soap_call_record *const record = running_record(ctx);
    if (record == nullptr)
        return;
    ++record->report.addresses_tried;
    std::memcpy(&record->peer, address, std::min<std::size_t>(size, sizeof record->peer));
}

void call_note_connected(soap *ctx, int socket)
{
    soap_call_record *const record = running_record(ctx);
    if (record == nullptr)
        return;
    socklen_t size = sizeof record->local;
    getsockname(socket, reinterpret_cast<sockaddr *>(&record->local), &size);
    record->report.ended_by = ENDED_BY_NOTHING; // of an address before
    call_note_time(ctx, &soap_report::connect_time);
}

void call_note_ready(soap *ctx)
{
    soap_call_record *const record = running_record(ctx);
    if (record == nullptr)
        return;
    record->connected = true;
    record->report.first_byte_time = -1; // that of an HTTP proxy's answer to CONNECT
}

void call_note_certificate(soap *ctx, X509 *certificate)
{
    soap_call_record *const record = running_record(ctx);
    if (record == nullptr || certificate == nullptr)
        return;
    X509_up_ref(certificate);
    X509_free(record->certificate);
    record->certificate = certificate;
}

void call_note_tls(soap *ctx)
{
    soap_call_record *const record = running_record(ctx);
    if (record == nullptr)
        return;
    const SSL *const ssl = ctx->tls_connection;
    call_note_certificate(ctx, SSL_get0_peer_certificate(ssl));
    record->tls_version = SSL_get_version(ssl);
    record->tls_cipher = SSL_CIPHER_get_name(SSL_get_current_cipher(ssl));
    record->resumed = SSL_session_reused(ssl) != 0;
}

void call_note_refusal(soap *ctx, const char *reason)
{
    if (soap_call_record *const record = running_record(ctx))
        std::snprintf(record->refusal, sizeof record->refusal, "%s", reason);
}

void call_note_ending(soap *ctx, soap_ending by)
{
    soap_call_record *const record = running_record(ctx);
    if (record == nullptr)
        return;
    if (ctx->call_expired)
        by = call_is_cancelled(ctx) ? ENDED_BY_CANCEL : ENDED_BY_CALL_LIMIT;
    record->report.ended_by = by;
}

// ---------------------------------------------------------------------------------------------
// Cancelling.

int call_wake_fd(const soap *ctx)
{
    const soap_call_record *const record = running_record(ctx);
    return record != nullptr && is_armed(*record) ? record->wake_fd : -1;
}

void call_wake_clear(const soap *ctx)
{
    clear(*ctx->call_record);
}

bool call_is_cancelled(const soap *ctx)
{
    const soap_call_record *const record = running_record(ctx);
    return record != nullptr && is_armed(*record) &&
           record->state.load(std::memory_order_relaxed) == CANCELLED;
}

void call_cancel_hold(soap *ctx)
{
    soap_call_record *const record = ctx->call_record;
    if (record == nullptr || !is_armed(*record))
        return;
    record->held = true;
    record->state.store(RUNNING);
}

void call_cancel_release(soap *ctx)
{
    soap_call_record *const record = ctx->call_record;
    if (record == nullptr || !record->held)
        return;
    record->held = false;
    become_idle(*record);
}

void call_pause(soap *ctx, std::int64_t time)
{
    const bool held = ctx->call_record != nullptr && ctx->call_record->held && is_armed(*ctx->call_record);
    const soap_call_record *const record = held ? ctx->call_record : nullptr;
    pollfd wake{record != nullptr ? record->wake_fd : -1, POLLIN, 0};
    const std::int64_t end = tcp_clock() + time;
    while (record == nullptr || record->state.load() != CANCELLED) {
        const std::int64_t left = end - tcp_clock();
        if (left <= 0)
            return;
        const timespec limit{static_cast<std::time_t>(left / 1000000),
                             static_cast<long>(left % 1000000 * 1000)};
        if (ppoll(&wake, 1, &limit, nullptr) > 0 && record != nullptr)
            clear(*record);
    }
}

int soap_cancel_arm(soap *ctx)
{
    soap_call_record *const record = record_of(ctx);
    if (record == nullptr)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    if (is_armed(*record))
        return SOAP_OK;
    const int made = eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
    if (made < 0 || tcp_too_large_to_wait(ctx, made)) {
        if (made >= 0)
            close(made);
        return fail(ctx, SOAP_FD_EXCEEDED);
    }
    if (record->wake_fd >= 0) // the parent's
        close(record->wake_fd);
    record->wake_fd = made;
    record->armed_in = tcp_process();
    record->state.store(IDLE);
    return SOAP_OK;
}

bool soap_cancel(soap *ctx)
{
    soap_call_record *const record = ctx->call_record;
    int expected = RUNNING;
    if (record == nullptr || !is_armed(*record) ||
        !record->state.compare_exchange_strong(expected, CANCELLED))
        return expected == CANCELLED;
    const int before = errno;
    eventfd_write(record->wake_fd, 1); // fails only if it is readable already
    errno = before;
    return true;
}
