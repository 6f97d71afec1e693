// call_record.h - private: what is noted of an exchange while it runs, and whether it was cancelled.
//
// Elsewhere: what hosts see of it (soap_report.h).
//
// Always: a context without memory for its record works like any other; what would be noted is lost. Only an
// exchange that runs is noted: what happens between exchanges belongs to none. Texts and certificates are
// parsed when a host asks.
#pragma once

#include <atomic>
#include <sys/socket.h>

#include <openssl/types.h>

#include <zuv_client_pro/soap.h>
#include <zuv_client_pro/soap_report.h>

struct soap_call_record {
    soap_report report;
    std::int64_t began; // microseconds of the monotonic clock
    bool running;       // between begin and end
    bool begun_early;   // soap_call has begun it before it connects
    bool opened;        // the exchange has a connection, or tried to have one
    bool connected;     // it has one

    // Of the connection, which may carry further exchanges.
    sockaddr_storage peer, local;
    X509 *certificate;                    // one reference; null: none
    const char *tls_version, *tls_cipher; // constants of OpenSSL; null: none
    bool resumed;

    // Space of the report's texts.
    char peer_text[64], local_text[64], subject[256], issuer[256], refusal[512];

    // For soap_cancel. The state alone decides; the descriptor only wakes who waits, and may do so for
    // nothing.
    std::atomic<int> state;
    bool held;              // call_cancel_hold
    int wake_fd;            // eventfd; -1: not armed
    std::uint16_t armed_in; // process of a host that forks: a child would take the wake-ups of its parent
};

// The record while an exchange runs; null otherwise.
inline soap_call_record *running_record(const soap *ctx)
{
    return ctx->call_record != nullptr && ctx->call_record->running ? ctx->call_record : nullptr;
}

// --- the exchange ---

// soap_call begins, before it connects.
void call_record_prepare(soap *ctx);
// The exchange begins, if soap_call hasn't begun it.
void call_record_begin(soap *ctx);
// The exchange has ended; does nothing between exchanges.
void call_record_end(soap *ctx);
void call_record_free(soap *ctx);

// --- notes ---

// A step is done now.
void call_note_time(soap *ctx, std::int64_t soap_report::*step);
// A kept connection is used, or a new one is about to be made.
void call_note_connection(soap *ctx, bool reused);
// An address is tried.
void call_note_address(soap *ctx, const sockaddr *address, socklen_t size);
// A socket is connected.
void call_note_connected(soap *ctx, int socket);
// The connection can carry the request.
void call_note_ready(soap *ctx);
// The certificate that the peer has shown.
void call_note_certificate(soap *ctx, X509 *certificate);
// The TLS handshake is done.
void call_note_tls(soap *ctx);
// The certificate isn't accepted.
void call_note_refusal(soap *ctx, const char *reason);
// Why the exchange ends, if it does; the limit of the whole call and a cancel come first.
void call_note_ending(soap *ctx, soap_ending by);

inline void call_note_sent(const soap *ctx, ssize_t count)
{
    if (soap_call_record *const record = count > 0 ? running_record(ctx) : nullptr)
        record->report.wire_sent += static_cast<std::uint64_t>(count);
}

inline void call_note_received(const soap *ctx, ssize_t count)
{
    if (soap_call_record *const record = count > 0 ? running_record(ctx) : nullptr)
        record->report.wire_received += static_cast<std::uint64_t>(count);
}

// The first byte of a response, as the reader gets it.
inline void call_note_response(soap *ctx)
{
    if (const soap_call_record *const record = running_record(ctx))
        if (record->report.first_byte_time < 0)
            call_note_time(ctx, &soap_report::first_byte_time);
}

// What ended the exchange that runs, or the last one.
inline soap_ending call_ending(const soap *ctx)
{
    return ctx->call_record != nullptr ? ctx->call_record->report.ended_by : ENDED_BY_NOTHING;
}

// --- cancelling ---

// The descriptor that wakes a waiting exchange; -1: none does.
int call_wake_fd(const soap *ctx);
// Takes what has made it readable.
void call_wake_clear(const soap *ctx);
// True if the exchange that runs is to end.
bool call_is_cancelled(const soap *ctx);

// From here to call_cancel_release a cancel also counts between exchanges: the next one ends at once.
void call_cancel_hold(soap *ctx);
void call_cancel_release(soap *ctx);
// Waits that long, or until a cancel that counts. Microseconds.
void call_pause(soap *ctx, std::int64_t time);
