// exchange.cpp - see exchange.h.
//
// Elsewhere: limits and the head (reception.cpp), writing answers (answer.cpp).
// Always: every request that was begun gets an answer, unless the peer is gone or too slow.
#include "exchange.h"

#include <algorithm>
#include <cstdio>
#include <optional>
#include <stdexcept>
#include <string_view>
#include <vector>

#include <poll.h>

#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_xml.h>

#include "answer.h"
#include "contract_files.h"
#include "data_port.h"
#include "local_resources.h"
#include "moment.h"
#include "seed.h"

namespace service {

namespace {

constexpr int BAD_REQUEST = 400, REQUEST_TIMEOUT = 408, TOO_LARGE = 413, INTERNAL_ERROR = 500;
constexpr int HTTP_STATUS_MIN = 400, HTTP_STATUS_MAX = 599;
constexpr int METHOD_NOT_ALLOWED = 405, UNSUPPORTED_TYPE = 415;

// The engine could not read the request; ctx->error says why.
struct unreadable {};

void demand(int result)
{
    if (result != SOAP_OK && result != SOAP_STOP)
        throw unreadable{};
}

// ---------------------------------------------------------------------------------------------
// Reading.

[[noreturn]] void refuse_operation(soap *ctx)
{
    ctx->error = SOAP_OK;
    const std::string name = ctx->tag;
    refuse<protocol__Client_x002eMalformedRequest>(
        ctx, "Method '" + name + "' not implemented: method name or namespace not recognized");
}

// An entry of the Header that is named as the contract's own, in none of the namespaces that an extension may
// have.
bool is_misplaced_header(soap *ctx)
{
    const std::string_view tag = ctx->tag, local = tag.substr(tag.find(':') + 1);
    const char *const bound = soap_namespace_of(ctx, ctx->tag);
    const std::string_view found = bound == nullptr ? std::string_view() : bound;
    ctx->error = SOAP_OK; // of a prefix without a declaration
    return local == "header" && (found.empty() || found.starts_with(namespaces_of_element("header").front()));
}

// As soap_header_get, but what the contract's own entry holds is refused like what is unknown in the Body.
// Entries of others are extensions, to be skipped.
void read_header_strictly(soap *ctx)
{
    if (soap_element_in_begin(ctx, "SOAP-ENV:Header", 0, nullptr) == SOAP_TAG_MISMATCH) {
        ctx->message_part = PART_AFTER_HEADER;
        ctx->error = SOAP_OK;
        return;
    }
    demand(ctx->error);
    const bool has_content = ctx->has_body != 0;
    ctx->message_part = PART_HEADER;
    soap_header_record(ctx);
    if (ctx->header == nullptr)
        throw std::bad_alloc();
    while (has_content && ctx->error == SOAP_OK && soap_element_head_read(ctx) == SOAP_OK) {
        const bool known = soap_tag_compare(ctx, ctx->tag, "protocol:header") == SOAP_OK;
        if (known ? ctx->header->header != nullptr : is_misplaced_header(ctx))
            refuse_unexpected(ctx);
        if (!known) {
            soap_element_skip(ctx);
            continue;
        }
        ctx->message_part = PART_AFTER_HEADER; // here what is unknown is no extension
        ctx->header->header = make<protocol__Header>(ctx);
        if (ctx->header->header->soap_in(ctx, "protocol:header", nullptr) == nullptr &&
            ctx->error == SOAP_TAG_MISMATCH)
            refuse_unexpected(ctx);
        ctx->message_part = PART_HEADER;
    }
    if (ctx->error == SOAP_NO_TAG)
        ctx->error = SOAP_OK;
    demand(ctx->error);
    if (has_content)
        demand(soap_element_in_end(ctx, "SOAP-ENV:Header"));
    ctx->message_part = PART_AFTER_HEADER;
}

struct request {
    const operation *op;
    void *object;
};

// The request element, which is the first of the Body, and all that follows it.
request read_request(soap *ctx, const port &target)
{
    const bool strict = (ctx->mode & MODE_STRICT) != 0;
    demand(soap_envelope_in_begin(ctx));
    if (strict)
        read_header_strictly(ctx);
    else
        demand(soap_header_get(ctx));
    demand(soap_body_in_begin(ctx));
    if (ctx->message_part == PART_EMPTY_BODY || soap_element_head_read(ctx) == SOAP_NO_TAG)
        refuse<protocol__Client_x002eMalformedRequest>(ctx, "The Body holds no request.");
    demand(ctx->error);
    const operation *const op = find_operation(ctx, target);
    if (op == nullptr)
        refuse_operation(ctx);
    void *const object = op->read(ctx, target.by_type ? nullptr : op->request_element);
    if (object != nullptr)
        soap_read_independents(ctx);
    if (ctx->error == SOAP_TAG_MISMATCH && strict)
        refuse_unexpected(ctx);
    if (object == nullptr)
        throw unreadable{};
    if (ctx->error == SOAP_TAG_MISMATCH)
        ctx->error = SOAP_OK; // unknown: the end of the Body skips it
    demand(ctx->error);
    demand(soap_body_in_end(ctx));
    demand(soap_envelope_in_end(ctx));
    demand(soap_receive_finish(ctx));
    return {op, object};
}

const protocol__Header *header_of(const soap *ctx)
{
    return ctx->header == nullptr ? nullptr : ctx->header->header;
}

bool has_expired(soap *ctx, const protocol__Credentials &credentials)
{
    if (credentials.state != nullptr && *credentials.state == protocol__CredentialsState::expired)
        return true;
    const auto end = moment_of(ctx, text_of(credentials.expiration));
    return end && *end < std::time(nullptr);
}

void check_credentials(soap *ctx, const protocol__Header *header)
{
    if (header == nullptr)
        return;
    for (protocol__Credentials *credentials : header->credentials) {
        if (credentials == nullptr || !has_expired(ctx, *credentials))
            continue;
        auto *const fault = make_fault<protocol__Client_x002eAuthentication_x002eCredentialsExpired>(
            ctx, "The credentials of the request have expired.");
        fault->credentials.push_back(credentials);
        refuse(fault);
    }
}

// ---------------------------------------------------------------------------------------------
// Answering.

// The answer's header names the exchange as the request did; without such a name there is no header.
void settle_header(soap *ctx)
{
    const protocol__Header *const received = header_of(ctx);
    ctx->header = nullptr;
    if (received == nullptr || (received->transactionId == nullptr && received->correlationId == nullptr))
        return;
    auto *const echo = make<protocol__Header>(ctx);
    echo->transactionId = received->transactionId;
    echo->correlationId = received->correlationId;
    soap_header_record(ctx);
    if (ctx->header == nullptr)
        throw std::bad_alloc();
    ctx->header->header = echo;
}

// The HTTP status for a request that could not be read.
int status_of_error(const soap *ctx, const reception &received)
{
    if (received.too_large() || ctx->exceeded != nullptr)
        return TOO_LARGE;
    if (received.too_slow())
        return REQUEST_TIMEOUT;
    if (ctx->error >= HTTP_STATUS_MIN && ctx->error <= HTTP_STATUS_MAX)
        return ctx->error;
    switch (ctx->error) {
    case SOAP_GET_METHOD:
    case SOAP_PUT_METHOD:
    case SOAP_HTTP_METHOD:
        return METHOD_NOT_ALLOWED;
    case SOAP_MUST_UNDERSTAND:
    case SOAP_VERSION_MISMATCH:
    case SOAP_OUT_OF_MEMORY:
        return INTERNAL_ERROR;
    default:
        return BAD_REQUEST;
    }
}

// Adds the typed fault of an unreadable request to the text that the engine made.
void describe_unreadable(soap *ctx)
{
    const char *const *const text = soap_fault_string_field(ctx);
    auto *const fault =
        make_fault<protocol__Client_x002eMalformedRequest>(ctx, *text == nullptr ? "" : *text);
    soap_fault_detail_field(ctx);
    SOAP_ENV__Detail *const detail = ctx->soap_version == 1 ? ctx->fault->detail : ctx->fault->Detail;
    if (detail != nullptr)
        place_fault(*detail, fault);
}

void answer_unreadable(soap *ctx, const reception &received)
{
    if (!received.started())
        return; // the end of a kept connection, not a request
    ctx->keep_alive = 0;
    const int status = status_of_error(ctx, received);
    settle_version(ctx);
    settle_header(ctx);
    if (status == INTERNAL_ERROR || status == BAD_REQUEST || ctx->exceeded != nullptr) {
        soap_fault_text_fill(ctx);
        if (status == BAD_REQUEST)
            describe_unreadable(ctx);
    } else {
        ctx->fault = nullptr;
        soap_fault_sender(ctx, http_reason(status), nullptr, SOAP_FAULT);
    }
    send_fault(ctx, status);
}

void answer_refusal(soap *ctx, const refusal &refused)
{
    settle_header(ctx);
    if (ctx->response_unfinished)
        ctx->keep_alive = 0;
    send_fault(ctx, fault_from_refusal(ctx, refused));
}

// The request is fine, and the service failed on it. What happened is for the operator, not for the client.
void answer_failure(soap *ctx, const char *what)
{
    std::fprintf(stderr, "zuv-service: %s\n", what);
    ctx->error = SOAP_OK;
    answer_refusal(
        ctx, {make_fault<protocol__Server_x002eProcessing>(ctx, "The service could not process the request."),
              [](SOAP_ENV__Detail &detail, protocol__Fault *fault) {
                  place_fault(detail, static_cast<protocol__Server_x002eProcessing *>(fault));
              }});
}

protocol__Server_x002eDataTooLarge *too_large(soap *ctx, const char *text, std::uint64_t limit)
{
    auto *const fault = make_fault<protocol__Server_x002eDataTooLarge>(ctx, text);
    fault->maxSize = make_text(ctx, std::to_string(limit));
    return fault;
}

// A document that can't be kept or shown: too large, or nested without end.
[[noreturn]] void refuse_document(soap *ctx, const document_error &error)
{
    if (error.error != 0)
        refuse<protocol__Client_x002eInvalidInformation>(ctx, error.what());
    refuse(too_large(ctx, error.what(), error.limit));
}

// The answer could not be sent. Where counting found it too large nothing has been sent yet, and the client
// gets a fault.
void answer_unsent(soap *ctx)
{
    const bool was_counting = ctx->exceeded != nullptr && (ctx->mode & MODE_COUNTING) != 0;
    const std::uint64_t limit = ctx->exceeded_value;
    ctx->keep_alive = 0;
    if (!was_counting)
        return;
    ctx->error = SOAP_OK;
    answer_refusal(ctx, {too_large(ctx, "The answer is larger than the service sends.", limit),
                         [](SOAP_ENV__Detail &detail, protocol__Fault *fault) {
                             place_fault(detail, static_cast<protocol__Server_x002eDataTooLarge *>(fault));
                         }});
}

const void *run(soap *ctx, const request &asked, reception &received)
{
    const protocol__Header *const header = header_of(ctx);
    check_credentials(ctx, header);
    session &borrowed = received.borrowed();
    call c{ctx,
           borrowed.documents,
           borrowed.codec,
           received.config(),
           header,
           received.root(),
           received.enclosed(),
           borrowed.judged,
           received.message_bytes(),
           {{ctx}}};
    try {
        const auto inside = borrowed.shared.gate.enter();
        const void *const response = asked.op->run(c, asked.object);
        received.enclosed().confirm_kept();
        return response;
    } catch (const document_error &error) {
        refuse_document(ctx, error);
    }
}

// The wait ends early with the connection, or with the service.
void wait(int socket, int milliseconds)
{
    pollfd end{socket, POLLRDHUP, 0};
    if (milliseconds != 0)
        poll(&end, 1, milliseconds);
}

// Takes rules and answers with those that wait, or with what is wrong with them. JSON must say that it is JSON:
// a page of elsewhere can't make a browser do that.
int receive_rules(soap *ctx, reception &received)
{
    if (!is_json(ctx->http_content))
        return ctx->error = UNSUPPORTED_TYPE;
    rule_book &rules = received.borrowed().shared.rules;
    std::string body;
    if (!read_body(ctx, [&body](const char *data, std::size_t length) { body.append(data, length); }))
        return ctx->error != SOAP_OK ? ctx->error : ctx->error = BAD_REQUEST;
    try {
        rules.add(body);
    } catch (const std::invalid_argument &wrong) {
        settle_version(ctx);
        return soap_fault_sender(ctx, soap_string_dup(ctx, wrong.what()), nullptr, BAD_REQUEST);
    }
    return send_file(ctx, JSON_TYPE, rules.waiting());
}

bool has_body(const soap *ctx)
{
    return !ctx->content_length_given || ctx->content_length != 0;
}

// Empties the store and seeds it again. What asks for it must say that it is JSON, as above.
int reset_store(soap *ctx, reception &received)
{
    if (!is_json(ctx->http_content))
        return ctx->error = UNSUPPORTED_TYPE;
    if (has_body(ctx) && !read_body(ctx, [](const char *, std::size_t) {}))
        return ctx->error != SOAP_OK ? ctx->error : ctx->error = BAD_REQUEST;
    std::size_t seeded = 0;
    try {
        const auto alone = received.borrowed().shared.gate.close();
        received.borrowed().shared.played.rewind();
        empty_store(received.borrowed());
        seeded = seed_store(received.borrowed(), received.config());
    } catch (const std::runtime_error &wrong) {
        settle_version(ctx);
        return soap_fault_receiver(ctx, soap_string_dup(ctx, wrong.what()), nullptr, INTERNAL_ERROR);
    }
    return send_file(ctx, JSON_TYPE, "{\"seeded\":" + std::to_string(seeded) + "}");
}

// What the rules say of this call.
void follow_rule(soap *ctx, const operation &op, reception &received)
{
    const std::string_view name = name_of(op);
    received.note_operation(ctx, name);
    const std::optional<rule> asked = received.borrowed().shared.rules.take(received.target()->name, name);
    if (!asked)
        return;
    wait(ctx->socket, asked->delay_ms);
    received.distort(ctx, *asked);
    if (!asked->fault.empty() || asked->status != 0)
        refuse_by_name(ctx,
                       !asked->fault.empty()            ? asked->fault
                       : asked->status < INTERNAL_ERROR ? "Client"
                                                        : "Server",
                       asked->text.empty() ? "A rule asks for this answer." : asked->text);
}

// Answers with what is recorded for such a call.
void replay(soap *ctx, const request &asked, reception &received)
{
    try {
        const recorded_answer &answer = received.borrowed().shared.played.take(
            received.target()->name, name_of(*asked.op), received.request_body());
        received.replay(answer);
        if (ctx->response_unfinished)
            ctx->keep_alive = 0;
        if (send_recorded(ctx, answer) != SOAP_OK)
            answer_unsent(ctx);
    } catch (const no_recording &none) {
        refuse<protocol__Server_x002eProcessing>(ctx, none.what());
    }
}

void receive_and_answer(soap *ctx, reception &received)
{
    int begun = soap_receive_begin(ctx);
    if (begun == SOAP_STOP)
        return; // answered when the head was read
    if (begun == SOAP_EOF && received.at_reset() && !has_body(ctx))
        begun = ctx->error = SOAP_OK; // nothing is said in it that a body must say
    demand(begun);
    if (!received.data_name().empty()) {
        demand(receive_data(ctx, received.borrowed().documents, received.data_name()));
        return;
    }
    if (received.at_control()) {
        demand(received.at_reset() ? reset_store(ctx, received) : receive_rules(ctx, received));
        return;
    }
    if (received.target() == nullptr) { // XML without an HTTP head
        ctx->error = SOAP_HTTP_ERROR;
        throw unreadable{};
    }
    received.enclosed().add_form(ctx->mode & MODE_MTOM);
    const request asked = read_request(ctx, *received.target());
    follow_rule(ctx, *asked.op, received);
    if (received.borrowed().shared.played.is_on()) {
        replay(ctx, asked, received);
        return;
    }
    const void *const response = run(ctx, asked, received);
    if (ctx->response_unfinished)
        ctx->keep_alive = 0; // bytes follow the request, which can't be distinguished from a next one
    settle_header(ctx);
    if (send_response(ctx, *asked.op, response, received.enclosed()) != SOAP_OK)
        answer_unsent(ctx);
}

void serve(soap *ctx, reception &received)
{
    try {
        receive_and_answer(ctx, received);
    } catch (const refusal &refused) {
        received.enclosed().discard_arrived();
        answer_refusal(ctx, refused);
    } catch (const unreadable &) {
        received.enclosed().discard_arrived();
        answer_unreadable(ctx, received);
    } catch (const std::exception &failure) {
        received.enclosed().discard_arrived();
        answer_failure(ctx, failure.what());
    }
}

} // namespace

bool serve_exchange(soap *ctx, reception &received)
{
    received.reset();
    ctx->on_send_filter = nullptr;
    try {
        serve(ctx, received);
    } catch (const std::exception &failure) { // not even an answer could be made
        std::fprintf(stderr, "zuv-service: %s\n", failure.what());
        ctx->keep_alive = 0;
    }
    received.note_memory(ctx->memory_held);
    received.record_exchange(ctx);
    received.note_exchange();
    received.borrowed().codec.reset();
    received.borrowed().judged.reset();
    received.enclosed().reset();
    if (!received.started() || (ctx->error != SOAP_OK && ctx->error != SOAP_STOP))
        ctx->keep_alive = 0;
    return ctx->keep_alive != 0;
}

} // namespace service
