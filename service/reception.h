// reception.h - what is checked before the content of a request is read: its path, its sender, its size and
// its pace.
//
// Here: the hooks of the context that watch the arriving bytes and the head. Elsewhere: the content
// (exchange.cpp).
#pragma once

#include <chrono>
#include <cstdint>
#include <string>
#include <string_view>

#include <zuv_client_pro/soap.h>

#include "enclosures.h"
#include "local_resources.h"
#include "port.h"
#include "request_target.h"
#include "rules.h"
#include "session.h"
#include "settings.h"

namespace service {

// What is known about the request that arrives on a context; ctx->user points here.
class reception {
public:
    // Installs the hooks; the context must not be used longer than this object.
    reception(soap *ctx, const settings &config, session &borrowed);
    reception(const reception &) = delete;
    reception &operator=(const reception &) = delete;

    // Forgets the previous request.
    void reset();

    const settings &config() const { return config_; }
    session &borrowed() const { return borrowed_; }
    bool started() const { return started_; } // some byte has arrived
    bool too_large() const { return body_bytes_ > body_limit() || enclosures_.too_large(); }
    bool too_slow() const { return too_slow_; }
    std::uint64_t message_bytes() const { return body_bytes_; } // that came and belong to no file
    const port *target() const { return target_; }              // null if no head was read, or none of a call
    std::string_view data_name() const; // below the path of data; empty for another path
    const std::string &root() const { return where_.root; }
    enclosures &enclosed() { return enclosures_; }

    // What a rule says of the bytes of the answer to this request; before the answer is begun.
    void distort(soap *ctx, const rule &how);
    bool at_control() const { return config_.control && (where_.path == CONTROL_PATH || at_reset()); }
    bool at_reset() const { return where_.path == RESET_PATH; }

    // Notes which operation the request is for, and writes the finished exchange in the journal.
    void note_operation(soap *ctx, std::string_view name);
    void note_exchange();

    // For --record and --replay. The whole body of a call's request, framing and compression undone; what the answer
    // is to say of its type; and the finished exchange, written to the file.
    const std::string &request_body() const { return exchange_.request; }
    void replay(const recorded_answer &answer) { played_type_ = answer.type.c_str(); }
    void record_exchange(const soap *ctx);

    // What the exchange held in its context, and the documents that were read for it.
    void note_memory(std::int64_t bytes)
    {
        memory_ = bytes + static_cast<std::int64_t>(borrowed_.codec.held());
    }
    std::int64_t memory() const { return memory_; }

private:
    // Bytes of a body that belong to no file; all data sent to a data port does. Bytes that
    // just arrived in the buffer are counted before it is known whether they belong to an attachment.
    std::uint64_t body_limit() const
    {
        if (!data_name().empty())
            return config_.attachment_limit;
        return config_.body_limit + (enclosures_.has_form() ? SOAP_BUFFER_SIZE : 0);
    }
    static void install_attachment_hooks(soap *ctx);
    int settle_request(soap *ctx);
    int answer_get(soap *ctx);
    int answer_local(soap *ctx);
    bool knows_sender(const soap *ctx) const;
    bool is_local() const; // a client on this machine that names this service so

    static reception &of(soap *ctx) { return *static_cast<reception *>(ctx->user); }
    static int read_head(soap *ctx);
    static int send(soap *ctx, const char *data, std::size_t length);
    static int keep_answer(soap *ctx, const char **data, std::size_t *length);
    static int keep_line(soap *ctx, const char *key, const char *value);
    static int send_head(soap *ctx, int status, std::uint64_t length);
    std::size_t length_in_body(const soap *ctx, std::size_t length) const;
    static int count_body(soap *ctx, const char *data, std::size_t length);
    static std::size_t receive(soap *ctx, char *buffer, std::size_t length);
    static int write_line(soap *ctx, const char *key, const char *value);
    static int get(soap *ctx);
    static int option_or_head(soap *ctx);
    static int erase(soap *ctx);
    static int refuse_method(soap *ctx);
    template <class Answer> static int answered(soap *ctx, Answer answer);

    const settings &config_;
    session &borrowed_;
    bool started_ = false, too_slow_ = false;
    std::uint64_t body_bytes_ = 0;
    std::int64_t memory_ = 0;
    std::chrono::steady_clock::time_point deadline_;
    const port *target_ = nullptr;
    request_target where_;
    const peer_address peer_;
    rule distortion_;
    exchange_note note_;
    recorded_exchange exchange_; // filled if exchanges are recorded or replayed
    bool writes_head_ = false;
    const char *played_type_ = nullptr; // Content-Type of a recorded answer
    std::chrono::steady_clock::time_point begun_;
    enclosures enclosures_;
};

} // namespace service
