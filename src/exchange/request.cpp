// request.cpp - the message of a call on its way out: marked, counted and written, or written only once.
//
// The short way: the bytes are kept as they are counted, without marks, and the head is sent before them. Always:
// the bytes, the trace, the error, and what hooks and a host's own classes are called with are those of the long
// way, which all other messages take.
#include "exchange/request.h"

#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/buffered_out.h"
#include "core/message_store.h"

namespace {

int write_message(soap *ctx, const request_message &message)
{
    if (soap_envelope_out_begin(ctx) || soap_header_put(ctx) || soap_body_out_begin(ctx) ||
        binding::class_pointer_out(ctx, *message.ops, message.element, -1, message.object, "") ||
        soap_body_out_end(ctx) || soap_envelope_out_end(ctx))
        return ctx->error;
    return SOAP_OK;
}

// True if no one can see whether the message is written once or twice, and with marks or without: a tree with
// a Content-Length, nothing but its XML, and no hook that sees or changes it or what it is made from.
bool writes_once(const soap *ctx)
{
    constexpr std::uint32_t OTHER_WAYS =
        MODE_UDP | MODE_BARE_XML | MODE_DIME | MODE_MIME | MODE_MTOM | MODE_DEFLATE | SOAP_XML_GRAPH;
    const std::uint32_t io = io_bits(ctx->output_mode);
    return (io == MODE_DIRECT || io == MODE_BUFFERED) && (ctx->output_mode & OTHER_WAYS) == 0 &&
           ctx->dime.first == nullptr && ctx->mime.first == nullptr && ctx->on_send_filter == nullptr &&
           ctx->on_send_prepare_begin == nullptr && ctx->on_send_prepare == nullptr &&
           ctx->on_send_prepare_end == nullptr && ctx->on_connect == nullptr &&
           ctx->on_post == http_write_request && ctx->on_header_line == http_write_line;
}

// The mode without the bits for how bytes leave, on which those of a message don't depend.
std::uint32_t writing_mode(const soap *ctx)
{
    return ctx->mode & ~(MODE_IO_MASK | MODE_COUNTING | MODE_TLS);
}

int count_message(soap *ctx, const request_message &message)
{
    if (soap_count_begin(ctx))
        return ctx->error;
    if ((ctx->mode & MODE_COUNTING) && write_message(ctx, message))
        return ctx->error;
    return soap_count_end(ctx);
}

int count_marked(soap *ctx, const request_message &message)
{
    soap_mark_header(ctx);
    binding::class_pointer_mark(ctx, *message.ops, message.object);
    return count_message(ctx, message);
}

// Counts without marks, and keeps the bytes as long as the store takes them. What needs marks is met while
// no one has seen anything of the message, which then begins anew.
int count_stored(soap *ctx, request_message &message)
{
    message_store_begin(ctx);
    ctx->mark_state = MARKS_SAVED;
    const int error = count_message(ctx, message);
    const bool again = ctx->mark_state == MARKS_MISSING;
    ctx->mark_state = MARKS_MADE;
    if (error == SOAP_OK) {
        message.mode = writing_mode(ctx);
        message.stored = message_store_close(ctx);
        return SOAP_OK;
    }
    message_store_wipe(ctx);
    if (!again)
        return ctx->error;
    soap_reset_call(ctx);
    return count_marked(ctx, message);
}

// True if the message would be written as it was when it was counted, and through the buffer.
bool leaves_as_stored(const soap *ctx, const request_message &message)
{
    return message.stored != 0 && io_bits(ctx->mode) == MODE_BUFFERED && writing_mode(ctx) == message.mode &&
           writes_once(ctx);
}

int send_stored(soap *ctx, std::size_t length)
{
    ctx->message_part = PART_BODY;
    if (message_store_send(ctx, length))
        return ctx->error;
    ctx->message_part = PART_AFTER_ENVELOPE;
    return SOAP_OK;
}

} // namespace

int request_count(soap *ctx, request_message &message)
{
    return writes_once(ctx) ? count_stored(ctx, message) : count_marked(ctx, message);
}

int request_write(soap *ctx, const request_message &message)
{
    return leaves_as_stored(ctx, message) ? send_stored(ctx, message.stored) : write_message(ctx, message);
}
