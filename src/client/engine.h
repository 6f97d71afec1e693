// engine.h - the context of a client, and the way of one call through it: attempts, pauses, what a failure
// was.
//
// Elsewhere: the exchange itself (soap_call), attachments (transfers.h), results (client.cpp).
//
// Always: the context is a soap like any other. Its callbacks on_open and on_recv only note what happened, and
// call those that were there.
#pragma once

#include <chrono>
#include <string>

#include <zuv_client_pro/client.h>
#include <zuv_client_pro/protocol.h>

#include "client/http_proxy.h"
#include "client/transfers.h"

namespace zuv {

struct engine : soap {
    engine(std::string_view to, const options &given);
    engine(const engine &) = delete;
    engine &operator=(const engine &) = delete;

    // What is in the context of the last call is gone; the connection may be kept.
    void discard();
    // One call with its repetitions; what it brought is the context's until `discard`. Returns the code of the
    // last attempt.
    int run(const soap_operation &operation, const void *request, const extras &how, void **object);
    // What kind of failure the last call's error was.
    failure_kind kind() const;

    const std::string url;     // the endpoint
    const options wanted;      // what the client was made with
    const http_proxy via;      // none: direct
    const std::string trace;   // the file; empty: none
    outcome *holder = nullptr; // the result whose objects are still in this context
    int attempts = 0;          // of the last call
    transfers carried;         // by the call in progress

private:
    void set_modes();
    void set_tls();
    void set_proxy();
    int repeat(const soap_operation &operation, const void *request, const extras &how, void **object);
    int attempt(const soap_operation &operation, const void *request, const extras &how, void **object);
    void begin_notes();
    int prepare(const extras &how);
    const protocol__Header *header_of(const extras &how);
    bool connection_was_stale() const;
    bool may_repeat(const extras &how) const;
    static engine &of(soap *ctx) { return *static_cast<engine *>(ctx); }
    static int note_open(soap *ctx, const char *endpoint, const char *host, int port);
    static std::size_t note_recv(soap *ctx, char *buffer, std::size_t length);

    int (*open_)(soap *, const char *, const char *, int) = nullptr; // the context's own on_open
    std::size_t (*recv_)(soap *, char *, std::size_t) = nullptr;     // and on_recv
    protocol__Header targeted;                                       // of the call in progress
    // Of the attempt in progress, or the last one.
    int opens = 0;               // connections that were tried
    int broken = 0;              // the system's reason of SOAP_EOF
    bool connected = false;      // the last of them came about
    bool had_connection = false; // a kept one was there
    bool received = false;       // a byte was received
    bool closed = false;         // the input was ended by the peer
};

} // namespace zuv
