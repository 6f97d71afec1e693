// call.cpp - the cycle of a call: mark, count, connect, send, receive, release; and what all proxies have in
// common.
//
// Always: until the connection is asked for, a failure returns at once and leaves a kept connection alone,
// but for a message that is too large; from there on every way out releases the connection.
#include "exchange/call.h"

#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_xml.h>

#include "attachments/attachment_list.h"
#include "binding/envelope.h"
#include "binding/registry.h"
#include "core/failure.h"
#include "core/message_store.h"
#include "exchange/request.h"
#include "net/call_record.h"

namespace {

// What an operation puts into the Body, or expects there.
struct body_part {
    const char *element;
    const binding::class_ops *ops;
};

// Of a request's or response's record; no element if the id is of none.
body_part part_of(int record, binding::type_kind kind)
{
    const binding::type_entry *const entry = binding::type_entry_of(record);
    if (entry == nullptr || entry->kind != kind)
        return {nullptr, nullptr};
    return {entry->element, binding::type_entry_of(entry->item)->ops};
}

int send_message(soap *ctx, const char *endpoint, const char *action, const request_message &message)
{
    if (soap_server_connect(ctx, endpoint, action) || request_write(ctx, message))
        return ctx->error;
    return soap_send_finish(ctx);
}

// A value of the header is wrong. That must not hide a fault, which the Body may hold; what else it may hold
// is not looked at.
int look_for_fault(soap *ctx, std::uint32_t envelope_level)
{
    const int error = ctx->error;
    const bool at_fault = error != SOAP_MUST_UNDERSTAND && binding::drop_bad_value(ctx, envelope_level) &&
                          soap_body_in_begin(ctx) == 0 && soap_element_head_read(ctx) == 0 &&
                          soap_tag_compare(ctx, ctx->tag, "SOAP-ENV:Fault") == 0;
    ctx->error = error;
    return at_fault ? soap_fault_receive(ctx, 1) : error;
}

int begin_response(soap *ctx)
{
    if (soap_receive_begin(ctx) || soap_envelope_in_begin(ctx))
        return ctx->error;
    const std::uint32_t level = ctx->nesting_level;
    if (soap_header_get(ctx))
        return ctx->message_part == PART_HEADER ? look_for_fault(ctx, level) : ctx->error;
    return soap_body_in_begin(ctx);
}

// Reads the response out of the Body. The error stays in the context when it isn't there.
void read_response(soap *ctx, const body_part &body, void **result)
{
    bool wanted = true, seen = false;
    for (;;) {
        fail(ctx, SOAP_TAG_MISMATCH);
        if (wanted && binding::class_pointer_in(ctx, *body.ops, body.element, result)) {
            wanted = false;
            seen = true;
            continue;
        }
        if (ctx->error == SOAP_TAG_MISMATCH)
            soap_result_check(ctx);
        if (ctx->error == SOAP_TAG_MISMATCH || (seen && ctx->error == SOAP_NO_TAG))
            break;
        if (ctx->error)
            return;
        seen = true;
    }
    if (!seen)
        return;
    ctx->error = 0;
    binding::independents_read(ctx);
}

int end_response(soap *ctx)
{
    if (soap_body_in_end(ctx) || soap_envelope_in_end(ctx))
        return ctx->error;
    return soap_receive_finish(ctx);
}

// A call from its first step to its release. *response is left alone until a response is awaited.
int run_exchange(soap *ctx, const char *endpoint, const char *action, const soap_operation &operation,
                 const void *request, void **response)
{
    const body_part sent = part_of(operation.request, binding::type_kind::request);
    const body_part expected = part_of(operation.response, binding::type_kind::response);
    ctx->encoding_style = nullptr;
    soap_reset_call(ctx);
    if (sent.element == nullptr || expected.element == nullptr)
        return fail(ctx, SOAP_NO_METHOD);
    if (soap_endpoint_check(ctx, endpoint))
        return ctx->error;
    request_message message{sent.element, sent.ops, request};
    if (request_count(ctx, message)) {
        attachments_forget(ctx); // they belong to this call, as they do when it fails later
        return ctx->exceeded != nullptr ? soap_socket_release(ctx) : ctx->error;
    }
    const int sending = send_message(ctx, endpoint, action != nullptr ? action : "", message);
    message_store_wipe(ctx);
    if (sending || response == nullptr)
        return soap_socket_release(ctx);
    *response = nullptr;
    if (begin_response(ctx))
        return soap_socket_release(ctx);
    read_response(ctx, expected, response);
    if (ctx->error)
        return soap_fault_receive(ctx, 0);
    end_response(ctx);
    return soap_socket_release(ctx);
}

// soap_call, but for what becomes of *response in a failure.
int run_call(soap *ctx, const char *endpoint, const char *action, const soap_operation &operation,
             const void *request, void **response)
{
    call_record_prepare(ctx);
    const int error = run_exchange(ctx, endpoint, action, operation, request, response);
    if (error != SOAP_OK) // also one that ended before there was anything to release
        call_record_end(ctx);
    return error;
}

} // namespace

int soap_call(soap *ctx, const char *endpoint, const char *action, const soap_operation &operation,
              const void *request, void **response)
{
    if (response != nullptr)
        *response = nullptr;
    const int error = run_call(ctx, endpoint, action, operation, request, response);
    if (error && response != nullptr)
        *response = nullptr;
    return error;
}

// ---------------------------------------------------------------------------------------------
// Proxies.

namespace proxies {

int call(soap *ctx, const char *&proxy_endpoint, const char *default_endpoint,
         const soap_operation &operation, const char *endpoint, const char *action, const void *request,
         void **result)
{
    if (endpoint != nullptr)
        proxy_endpoint = endpoint;
    if (proxy_endpoint == nullptr)
        proxy_endpoint = default_endpoint;
    return run_call(ctx, proxy_endpoint, action, operation, request, result);
}

void *record_or(void *record, void *stand_in)
{
    return record != nullptr ? record : stand_in;
}

int init(soap *ctx, int input_mode, int output_mode, const soap_namespace *namespaces)
{
    ctx->input_mode = static_cast<std::uint32_t>(input_mode);
    ctx->output_mode = static_cast<std::uint32_t>(output_mode);
    return soap_set_namespaces(ctx, namespaces);
}

void destroy(soap *ctx)
{
    soap_discard_objects(ctx, nullptr);
    soap_discard_all(ctx);
}

void set_header(soap *ctx, protocol__Header *header)
{
    soap_header_record(ctx);
    if (ctx->header != nullptr)
        ctx->header->header = header;
}

const char *fault_string(soap *ctx)
{
    return *soap_fault_string_field(ctx);
}

const char *fault_detail(soap *ctx)
{
    return *soap_fault_detail_field(ctx);
}

} // namespace proxies
