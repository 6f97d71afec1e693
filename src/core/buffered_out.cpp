// buffered_out.cpp - a message on its way out: its framing settled, its bytes counted, buffered, stored or
// sent.
//
// Elsewhere: compression (deflate_out.cpp), heads (transport's http_write.cpp, called through on_post and
// on_response), attachments (codec).
//
// The stages of a byte: soap_send_bytes -> buffer -> soap_send_flush -> [compression] -> soap_send_through ->
// [chunks | store] -> on_send. Always: buffer_index <= SOAP_BUFFER_SIZE.
#include <algorithm>
#include <cstdio>
#include <cstring>

#include <openssl/err.h>

#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/deflate_out.h"
#include "core/limits.h"
#include "core/raw_in.h"
#include "core/scratch.h"
#include "core/zlib_common.h"

namespace {

constexpr std::size_t SIZE_LINE = 24; // bytes; CR LF, 16 digits, CR LF and the terminator fit

std::uint32_t io_bits(std::uint32_t mode)
{
    return mode & MODE_IO_MASK;
}
std::uint32_t with_io(std::uint32_t mode, std::uint32_t io)
{
    return (mode & ~MODE_IO_MASK) | io;
}

// ---------------------------------------------------------------------------------------------
// Modes.

// Compression makes the length unknown until the end, so a compressed message whose length must stand in its
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

// Without encoding style and wish for a graph, a message is a tree.
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
    return ctx->on_send_prepare != nullptr; // the hook sees the message ahead of its first byte sent
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
// The last stages.

int transmit(soap *ctx, const char *data, std::size_t length)
{
    soap_log_write(ctx, SOAP_LOG_SENT, data, length);
    if (ctx->on_send == nullptr)
        return SOAP_OK;
    const int result = ctx->on_send(ctx, data, length);
    return result == SOAP_OK ? SOAP_OK : ctx->error = result;
}

int store(soap *ctx, const char *data, std::size_t length)
{
    if (ctx->block_stack == nullptr && soap_block_stack_push(ctx) == nullptr)
        return ctx->error = SOAP_OUT_OF_MEMORY;
    void *place = soap_block_stack_grow(ctx, nullptr, length);
    if (place == nullptr)
        return ctx->error = SOAP_OUT_OF_MEMORY;
    std::memcpy(place, data, length);
    if (ctx->max_memory != 0 && ctx->block_stack->total_size > ctx->max_memory)
        return limit_exceeded(ctx, "max_memory", ctx->max_memory);
    return SOAP_OK;
}

int send_chunk_size(soap *ctx, std::size_t length)
{
    char line[SIZE_LINE];
    const char *format = ctx->chunk_size == 0 ? "%lX\r\n" : "\r\n%lX\r\n";
    const int written = std::snprintf(line, sizeof line, format, static_cast<unsigned long>(length));
    ctx->chunk_size += length;
    return transmit(ctx, line, static_cast<std::size_t>(written));
}

// The buffer is full and more follows. A datagram cannot be continued.
int flush_full(soap *ctx)
{
    ctx->buffer_index = SOAP_BUFFER_SIZE;
    return soap_send_flush(ctx);
}

// A datagram stays in the buffer to its end, as all of it must go out at once.
int buffer_datagram(soap *ctx, const char *data, std::size_t length)
{
    if (length > SOAP_BUFFER_SIZE - ctx->buffer_index)
        return ctx->error = SOAP_UDP_ERROR;
    std::memcpy(ctx->buffer + ctx->buffer_index, data, length);
    ctx->buffer_index += length;
    return SOAP_OK;
}

int buffer_bytes(soap *ctx, const char *data, std::size_t length)
{
    std::size_t room = SOAP_BUFFER_SIZE - ctx->buffer_index;
    while (length >= room) {
        std::memcpy(ctx->buffer + ctx->buffer_index, data, room);
        data += room;
        length -= room;
        if (flush_full(ctx) != SOAP_OK)
            return ctx->error;
        room = SOAP_BUFFER_SIZE;
    }
    std::memcpy(ctx->buffer + ctx->buffer_index, data, length);
    ctx->buffer_index += length;
    return SOAP_OK;
}

// ---------------------------------------------------------------------------------------------
// The end of a message.

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
    return result == SOAP_OK ? SOAP_OK : ctx->error = result;
}

int send_stored(soap *ctx)
{
    if (ctx->on_send_prepare_end != nullptr && (ctx->error = ctx->on_send_prepare_end(ctx)) != SOAP_OK)
        return ctx->error;
    if ((ctx->mode & MODE_BARE_XML) == 0 && send_stored_head(ctx) != SOAP_OK)
        return ctx->error;
    if (ctx->block_stack == nullptr)
        return SOAP_OK;
    for (const char *data = soap_block_stack_first(ctx, nullptr); data != nullptr;
         data = soap_block_stack_next(ctx, nullptr)) {
        if (transmit(ctx, data, soap_block_stack_size(ctx, nullptr)) != SOAP_OK)
            return ctx->error;
    }
    soap_block_stack_drop(ctx, nullptr);
    return SOAP_OK;
}

int send_rest(soap *ctx)
{
    static const char LAST_CHUNK[] = "\r\n0\r\n\r\n";
    if (soap_send_flush(ctx) != SOAP_OK)
        return ctx->error;
    if ((ctx->mode & MODE_DEFLATE) != 0 && soap_deflate_finish(ctx) != SOAP_OK)
        return ctx->error;
    if (io_bits(ctx->mode) == MODE_CHUNKED)
        return transmit(ctx, LAST_CHUNK, sizeof LAST_CHUNK - 1);
    if (io_bits(ctx->mode) == MODE_STORE)
        return send_stored(ctx);
    return SOAP_OK;
}

void forget_output(soap *ctx)
{
    ctx->plain_sent = 0;
    ctx->xml_end_max = 0;
    ctx->exceeded = nullptr;
}

int give_up_sending(soap *ctx)
{
    const int error = ctx->error;
    soap_zlib_drop(ctx);
    if (io_bits(ctx->mode) == MODE_STORE && ctx->block_stack != nullptr)
        soap_block_stack_drop(ctx, nullptr);
    ctx->buffer_index = 0;
    return ctx->error = error;
}

} // namespace

// ---------------------------------------------------------------------------------------------
// Counting.

int soap_count_begin(soap *ctx)
{
    soap_prefix_list_free(ctx);
    ctx->mode = counting_mode(ctx);
    if (make_boundary(ctx) != SOAP_OK)
        return ctx->error;
    ctx->message_count = 0;
    forget_output(ctx);
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
    soap_prefix_list_free(ctx);
    ctx->error = SOAP_OK;
    ctx->mode = sending_mode(ctx);
    if ((ctx->mode & MODE_UDP) != 0 && ctx->message_count > SOAP_BUFFER_SIZE)
        return ctx->error = SOAP_UDP_ERROR;
    if (io_bits(ctx->mode) == MODE_STORE && soap_block_stack_push(ctx) == nullptr)
        return ctx->error;
    if ((ctx->mode & MODE_KEEP_ALIVE) == 0)
        ctx->keep_alive = 0;
    if (make_boundary(ctx) != SOAP_OK)
        return ctx->error;
    if (io_bits(ctx->mode) != MODE_DIRECT)
        ctx->buffer_index = ctx->buffer_length = 0;
    soap_raw_reset(ctx);
    forget_output(ctx);
    soap_element_state_reset(ctx);
    if (ctx->status >= STATUS_POST)
        ctx->response_unfinished = true; // the connection owes a response from here on
    ctx->zlib_ratio_out = 1.0F;
    if ((ctx->mode & MODE_DEFLATE) != 0 && soap_deflate_begin(ctx) != SOAP_OK)
        return ctx->error;
    if (ctx->tls_connection != nullptr)
        ERR_clear_error();
    ctx->message_part = PART_BEGIN;
    if (ctx->on_send_prepare_begin != nullptr && io_bits(ctx->mode) == MODE_STORE)
        return ctx->error = ctx->on_send_prepare_begin(ctx);
    return SOAP_OK;
}

int soap_send_bytes_slow(soap *ctx, const char *data, std::size_t length)
{
    if (length == 0)
        return SOAP_OK;
    const bool counting = (ctx->mode & MODE_COUNTING) != 0;
    if (ctx->on_send_prepare != nullptr && counting && io_bits(ctx->mode) != MODE_STORE) {
        ctx->error = ctx->on_send_prepare(ctx, data, length);
        if (ctx->error != SOAP_OK)
            return ctx->error;
    }
    if (ctx->on_send_filter != nullptr) {
        ctx->error = ctx->on_send_filter(ctx, &data, &length);
        if (ctx->error != SOAP_OK || length == 0)
            return ctx->error;
    }
    if (counting) {
        ctx->message_count += length;
        return SOAP_OK;
    }
    if (io_bits(ctx->mode) == MODE_DIRECT)
        return output_limit_check(ctx, length) == SOAP_OK ? soap_send_through(ctx, data, length) : ctx->error;
    if ((ctx->mode & MODE_UDP) != 0)
        return buffer_datagram(ctx, data, length);
    return buffer_bytes(ctx, data, length);
}

int soap_send_padded(soap *ctx, const char *data, std::size_t length)
{
    if (soap_send_bytes(ctx, data, length) != SOAP_OK)
        return ctx->error;
    return soap_send_bytes(ctx, "\0\0\0", (0 - length) & 3);
}

int soap_send_flush(soap *ctx)
{
    const std::size_t length = ctx->buffer_index;
    if (length == 0)
        return SOAP_OK;
    if (output_limit_check(ctx, length) != SOAP_OK)
        return ctx->error;
    if (io_bits(ctx->mode) == MODE_STORE && ctx->on_send_prepare != nullptr) {
        ctx->error = ctx->on_send_prepare(ctx, ctx->buffer, length);
        if (ctx->error != SOAP_OK)
            return ctx->error;
    }
    ctx->buffer_index = 0;
    if ((ctx->mode & MODE_DEFLATE) != 0)
        return soap_deflate_write(ctx, ctx->buffer, length);
    return soap_send_through(ctx, ctx->buffer, length);
}

int soap_send_through(soap *ctx, const char *data, std::size_t length)
{
    if (length == 0)
        return SOAP_OK; // a chunk of no bytes would end the body
    if (io_bits(ctx->mode) == MODE_STORE)
        return store(ctx, data, length);
    if (io_bits(ctx->mode) == MODE_CHUNKED && send_chunk_size(ctx, length) != SOAP_OK)
        return ctx->error;
    return transmit(ctx, data, length);
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
