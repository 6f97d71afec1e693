// call_cycle.cpp - see call_cycle.h.
#include "call_cycle.h"

#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_xml.h>

namespace cli {

namespace {

int write_message(soap *ctx, const message_parts &parts, const void *request)
{
    if (soap_envelope_out_begin(ctx) || soap_header_put(ctx) || soap_body_out_begin(ctx) ||
        parts.write(ctx, request, parts.request_element) || soap_body_out_end(ctx) ||
        soap_envelope_out_end(ctx))
        return ctx->error;
    return SOAP_OK;
}

int count_message(soap *ctx, const message_parts &parts, const void *request)
{
    if (soap_count_begin(ctx) || ((ctx->mode & MODE_COUNTING) != 0 && write_message(ctx, parts, request)))
        return ctx->error;
    return soap_count_end(ctx);
}

} // namespace

int call(soap *ctx, const char *endpoints, const char *action, const message_parts &parts,
         const void *request, void **response)
{
    *response = nullptr;
    ctx->encoding_style = nullptr;
    soap_reset_call(ctx);
    if (soap_endpoint_check(ctx, endpoints))
        return ctx->error;
    soap_mark_header(ctx);
    parts.mark(ctx, request);
    if (count_message(ctx, parts, request))
        return ctx->error;
    if (soap_server_connect(ctx, endpoints, action) || write_message(ctx, parts, request) ||
        soap_send_finish(ctx) || soap_receive_begin(ctx) || soap_envelope_in_begin(ctx) ||
        soap_header_get(ctx) || soap_body_in_begin(ctx))
        return soap_socket_release(ctx);
    *response = parts.read(ctx, parts.response_element);
    if (*response == nullptr)
        return soap_fault_receive(ctx, 0);
    if (soap_body_in_end(ctx) || soap_envelope_in_end(ctx) || soap_receive_finish(ctx))
        *response = nullptr;
    return soap_socket_release(ctx);
}

} // namespace cli
