// send.cpp - a message on its way out, as a whole: its framing chosen, counted, begun, its attachments
// written, ended.
//
// Elsewhere: its bytes (core/buffered_out.cpp), heads (net/http_write.cpp, called through on_post and
// on_response), attachments (attachments), the elements of the envelope (envelope.cpp).
#include <openssl/err.h>

#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/buffered_out.h"
#include "core/failure.h"
#include "core/limits.h"
#include "core/zlib_common.h"
#include "exchange/context.h"

namespace {

// ---------------------------------------------------------------------------------------------
// Modes.

// Compression makes the length unknown until the end, so a compressed message whose length must be in its
// head is stored first, and counting it would be in vain. Only DIME still needs the count of the plain bytes.
std::uint32_t with_compression(std::uint32_t mode)
{
    const std::uint32_t io = io_bits(mode);
    if ((mode & MODE_DEFLATE) == 0 || io == MODE_STORE || io == MODE_CHUNKED)
        return mode;
    if ((mode & MODE_BARE_XML) != 0)
        return with_io(mode, MODE_BUFFERED);
    if ((mode & MODE_DIME) == 0)
        mode &= ~MODE_COUNTING;
    return with_io(mode, MODE_STORE);
}

// A message is a tree unless an encoding style is set or a graph is asked for.
std::uint32_t with_tree(const soap *ctx, std::uint32_t mode)
{
    return ctx->encoding_style == nullptr && (mode & SOAP_XML_GRAPH) == 0 ? mode | SOAP_XML_TREE : mode;
}

bool needs_counting(const soap *ctx, std::uint32_t mode)
{
    const std::uint32_t io = io_bits(mode);
    if (io == MODE_STORE)
        return false;
    if (io != MODE_CHUNKED && (mode & MODE_BARE_XML) == 0)
        return true;                        // Content-Length
    return ctx->on_send_prepare != nullptr; // the hook sees the message before its first byte is sent
}

std::uint32_t counting_mode(const soap *ctx)
{
    std::uint32_t mode = ctx->output_mode;
    if ((mode & MODE_UDP) != 0)
        mode |= MODE_BARE_XML;
    if (((ctx->mode | mode) & MODE_DIME) != 0)
        mode |= MODE_DIME | MODE_COUNTING;
    else if (needs_counting(ctx, mode))
        mode |= MODE_COUNTING;
    else
        mode &= ~MODE_COUNTING;
    mode = with_tree(ctx, with_compression(mode));
    if ((mode & MODE_DIME) != 0 && (mode & MODE_MTOM) != 0)
        mode |= MODE_MIME;
    else if ((mode & MODE_MIME) == 0)
        mode &= ~MODE_MTOM;
    return mode;
}

// A direct write to a socket would make a packet of every tag. A message that was not counted and needs its
// length in a head is stored.
std::uint32_t with_socket(const soap *ctx, std::uint32_t mode)
{
    if (io_bits(mode) != MODE_DIRECT || ctx->socket == -1)
        return mode;
    const bool unknown = ctx->message_count == 0 && (mode & (MODE_BARE_XML | MODE_COUNTING)) == 0;
    return with_io(mode, unknown ? MODE_STORE : MODE_BUFFERED);
}

std::uint32_t sending_mode(const soap *ctx)
{
    std::uint32_t mode = ctx->output_mode | (ctx->mode & (MODE_DIME | MODE_COUNTING));
    if ((mode & MODE_UDP) != 0)
        mode |= MODE_BARE_XML;
    mode = with_socket(ctx, with_compression(mode)) & ~MODE_COUNTING;
    mode = with_tree(ctx, mode);
    if ((mode & MODE_DIME) != 0 && (mode & MODE_MTOM) != 0)
        mode = (mode & ~MODE_DIME) | MODE_MIME;
    if ((mode & MODE_MIME) == 0)
        mode &= ~MODE_MTOM;
    return mode;
}

int make_boundary(soap *ctx)
{
    return (ctx->mode & MODE_MIME) != 0 ? soap_mime_boundary_make(ctx) : SOAP_OK;
}

// ---------------------------------------------------------------------------------------------
// End.

int send_attachments(soap *ctx)
{
    if (soap_dime_attachments_write(ctx) != SOAP_OK || soap_mime_attachments_write(ctx) != SOAP_OK)
        return ctx->error;
    ctx->dime.list = ctx->dime.first = ctx->dime.last = nullptr;
    ctx->mime.list = ctx->mime.first = ctx->mime.last = nullptr;
    return SOAP_OK;
}

// The head of a stored message, now that its size is known. It goes through the buffer and not into the
// store.
int send_stored_head(soap *ctx)
{
    const std::uint64_t total = ctx->block_stack == nullptr ? 0 : ctx->block_stack->total_size;
    const std::uint32_t io = io_bits(ctx->mode);
    int result = SOAP_OK;
    ctx->mode = with_io(ctx->mode, MODE_BUFFERED);
    if (ctx->status >= STATUS_POST) {
        if (ctx->on_post != nullptr)
            result = ctx->on_post(ctx, ctx->endpoint, ctx->host, ctx->port, ctx->path, ctx->action, total);
    } else if (ctx->status != STATUS_STOP && ctx->on_response != nullptr) {
        result = ctx->on_response(ctx, ctx->status, total);
    }
    if (result == SOAP_OK)
        result = soap_send_flush(ctx);
    ctx->mode = with_io(ctx->mode, io);
    return result == SOAP_OK ? SOAP_OK : fail(ctx, result);
}

int send_stored(soap *ctx)
{
    if (ctx->on_send_prepare_end != nullptr && (ctx->error = ctx->on_send_prepare_end(ctx)) != SOAP_OK)
        return ctx->error;
    if ((ctx->mode & MODE_BARE_XML) == 0 && send_stored_head(ctx) != SOAP_OK)
        return ctx->error;
    return output_send_stored(ctx);
}

int send_rest(soap *ctx)
{
    if (output_close(ctx) != SOAP_OK)
        return ctx->error;
    return io_bits(ctx->mode) == MODE_STORE ? send_stored(ctx) : SOAP_OK;
}

int give_up_sending(soap *ctx)
{
    const int error = ctx->error;
    soap_zlib_drop(ctx);
    if (io_bits(ctx->mode) == MODE_STORE && ctx->block_stack != nullptr)
        soap_block_stack_drop(ctx, nullptr);
    ctx->buffer_index = 0;
    return fail(ctx, error);
}

} // namespace

// ---------------------------------------------------------------------------------------------
// Counting.

int soap_count_begin(soap *ctx)
{
    soap_prefix_stack_reset(ctx);
    ctx->mode = counting_mode(ctx);
    if (make_boundary(ctx) != SOAP_OK)
        return ctx->error;
    ctx->message_count = 0;
    output_forget(ctx);
    soap_element_state_reset(ctx);
    soap_attr_table_reset(ctx);
    if (soap_namespace_table_copy(ctx) != SOAP_OK)
        return ctx->error;
    ctx->dime.count = 0;
    ctx->dime.size = 0;
    if (ctx->on_send_prepare_begin != nullptr && io_bits(ctx->mode) != MODE_STORE)
        return ctx->error = ctx->on_send_prepare_begin(ctx);
    return SOAP_OK;
}

int soap_count_end(soap *ctx)
{
    if (output_xml_end(ctx) != SOAP_OK)
        return ctx->error;
    // A stored message shows itself to the hooks when it leaves the buffer.
    if ((ctx->mode & MODE_COUNTING) != 0 && io_bits(ctx->mode) != MODE_STORE &&
        ctx->on_send_prepare_end != nullptr)
        return ctx->error = ctx->on_send_prepare_end(ctx);
    return SOAP_OK;
}

std::uint64_t soap_message_length(soap *ctx)
{
    return ctx->message_count + soap_attachments_length(ctx);
}

// ---------------------------------------------------------------------------------------------
// Sending.

int soap_send_begin(soap *ctx)
{
    soap_prefix_stack_reset(ctx);
    ctx->error = SOAP_OK;
    ctx->mode = sending_mode(ctx);
    if ((ctx->mode & MODE_UDP) != 0 && ctx->message_count > SOAP_BUFFER_SIZE)
        return fail(ctx, SOAP_UDP_ERROR);
    if (io_bits(ctx->mode) == MODE_STORE && soap_block_stack_push(ctx) == nullptr)
        return ctx->error;
    if ((ctx->mode & MODE_KEEP_ALIVE) == 0)
        ctx->keep_alive = 0;
    if (make_boundary(ctx) != SOAP_OK)
        return ctx->error;
    soap_element_state_reset(ctx);
    if (ctx->status >= STATUS_POST)
        ctx->response_unfinished = true; // the connection owes a response from here on
    if (output_begin(ctx) != SOAP_OK)
        return ctx->error;
    if (ctx->tls_connection != nullptr)
        ERR_clear_error();
    ctx->message_part = PART_BEGIN;
    if (ctx->on_send_prepare_begin != nullptr && io_bits(ctx->mode) == MODE_STORE)
        return ctx->error = ctx->on_send_prepare_begin(ctx);
    return SOAP_OK;
}

int soap_send_finish(soap *ctx)
{
    if (output_xml_end(ctx) != SOAP_OK || send_attachments(ctx) != SOAP_OK)
        return give_up_sending(ctx);
    if (io_bits(ctx->mode) != MODE_DIRECT && send_rest(ctx) != SOAP_OK)
        return give_up_sending(ctx);
    ctx->output_mode &= ~MODE_WSU_ID;
    ctx->message_count = 0;
    ctx->message_part = PART_OUTSIDE;
    return SOAP_OK;
}

int http_method_default(soap *ctx)
{
    constexpr std::uint32_t FRAMING = MODE_IO_MASK | MODE_DEFLATE | MODE_DIME | MODE_MIME | MODE_MTOM;
    const std::uint32_t output_mode = ctx->output_mode;
    ctx->output_mode = (output_mode & ~FRAMING) | MODE_BUFFERED;
    int result = soap_send_begin(ctx);
    if (result == SOAP_OK && ctx->on_response != nullptr)
        result = ctx->on_response(ctx, 200, 0);
    if (result == SOAP_OK)
        result = soap_send_finish(ctx);
    ctx->output_mode = output_mode;
    return ctx->error = result == SOAP_OK ? static_cast<int>(SOAP_STOP) : result;
}
