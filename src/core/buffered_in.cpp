// buffered_in.cpp - the bytes of a message on its way in: its body opened, handed out and closed.
//
// Elsewhere: raw bytes (raw_in.cpp) and chunks (chunks.cpp), decompression (inflate_in.cpp), header lines
// (recv_line.cpp), the message as a whole (exchange/receive.cpp).
//
// The stages of a byte: on_recv -> [chunks] -> [decompression] -> buffer -> [on_recv_filter] ->
// [attachment_stage: DIME chunks] -> soap_recv_byte. Always: buffer_index <= buffer_length <=
// SOAP_BUFFER_SIZE; the end of input, once met, stays.
#include <algorithm>
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_memory.h>

#include "core/buffered_in.h"
#include "core/chunks.h"
#include "core/failure.h"
#include "core/inflate_in.h"
#include "core/limits.h"
#include "core/memory.h"
#include "core/zlib_common.h"

namespace {

constexpr std::int32_t END = -1;
constexpr std::int32_t GZIP_FIRST_BYTE = 0x1F;
constexpr std::size_t GZIP_HEAD_REST = 9; // bytes after the first
constexpr std::size_t BLOCK_STEP = 65536; // bytes by which a block of announced size grows

// The unread bytes at hand, at most `most`; 0 at the end of input.
std::size_t stretch(soap *ctx, std::size_t most)
{
    if (input_peek_byte(ctx) == END)
        return 0;
    return std::min(most, ctx->buffer_length - ctx->buffer_index);
}

// There is a first byte.
int begin_announced_compression(soap *ctx)
{
    if (ctx->zlib_in == 0)
        return SOAP_OK;
    const std::int32_t first = soap_recv_byte(ctx);
    if (ctx->zlib_in == ENCODING_GZIP && first == GZIP_FIRST_BYTE) {
        if (soap_gzip_skip_header(ctx) != SOAP_OK)
            return ctx->error;
        return soap_inflate_begin(ctx, ZLIB_RAW);
    }
    ctx->zlib_in = ENCODING_DEFLATE; // some peers name one and send the other
    input_peek_byte(ctx);            // the second byte is looked at too
    return soap_inflate_begin_deflate(ctx, static_cast<std::uint8_t>(first));
}

int no_body(soap *ctx)
{
    if (ctx->error != SOAP_OK)
        return ctx->error;
    if (ctx->status == 200)
        return fail(ctx, SOAP_NO_DATA);
    return ctx->error = ctx->status != 0 ? ctx->status : SOAP_EOF;
}

} // namespace

std::int32_t input_peek_byte(soap *ctx)
{
    if (ctx->look_ahead != 0)
        return ctx->look_ahead;
    if (ctx->buffer_index >= ctx->buffer_length && soap_recv_more(ctx) != SOAP_OK)
        return ctx->look_ahead = END;
    return static_cast<unsigned char>(ctx->buffer[ctx->buffer_index]);
}

// ---------------------------------------------------------------------------------------------
// Begin and end of the body.

int soap_body_open(soap *ctx)
{
    ctx->mode = ctx->input_mode & ~MODE_DEFLATE;
    soap_raw_open_body(ctx);
    if (input_is_chunked(ctx))
        ctx->prepare_held = false; // refills begin with the body
    if (input_peek_byte(ctx) == END)
        return no_body(ctx);
    return begin_announced_compression(ctx);
}

int body_close(soap *ctx)
{
    if ((ctx->mode & MODE_DEFLATE) != 0 && soap_inflate_finish(ctx) != SOAP_OK)
        return ctx->error;
    if (input_is_chunked(ctx)) {
        int result = SOAP_OK;
        while (result == SOAP_OK && !ctx->body_ended)
            result = soap_recv_refill(ctx);
        ctx->look_ahead = END;
        if (result > 1)
            return ctx->error = result;
    }
    if (ctx->exceeded == nullptr && soap_raw_consumed(ctx)) {
        ctx->buffer_index = ctx->buffer_length = 0;
        ctx->response_unfinished = false;
    }
    return SOAP_OK;
}

// ---------------------------------------------------------------------------------------------
// Bytes.

std::int32_t soap_recv_byte_slow(soap *ctx)
{
    const std::int32_t c = input_peek_byte(ctx);
    if (ctx->look_ahead == 0)
        ctx->buffer_index++;
    else if (c != END)
        ctx->look_ahead = 0;
    return c;
}

int soap_recv_deliver(soap *ctx)
{
    const std::size_t fresh = ctx->buffer_length - ctx->buffer_index;
    ctx->message_count += fresh;
    const bool plain = (ctx->mode & MODE_DEFLATE) != 0 || ctx->zlib_in == 0;
    if (plain)
        ctx->plain_received += fresh;
    if ((ctx->mode & MODE_DEFLATE) != 0)
        soap_log_write(ctx, SOAP_LOG_RECEIVED, ctx->buffer, ctx->buffer_length);
    if (!ctx->prepare_held && input_limits_check(ctx) != SOAP_OK) {
        ctx->buffer_index = ctx->buffer_length = 0;
        return ctx->error;
    }
    if (ctx->on_recv_prepare == nullptr || ctx->prepare_held || !plain)
        return SOAP_OK;
    const int result = ctx->on_recv_prepare(ctx, ctx->buffer + ctx->buffer_index, fresh);
    return result == SOAP_OK ? SOAP_OK : fail(ctx, result);
}

int soap_recv_refill(soap *ctx)
{
    if (ctx->exceeded != nullptr) {
        ctx->buffer_index = ctx->buffer_length = 0;
        return fail(ctx, SOAP_LENGTH);
    }
    if ((ctx->mode & MODE_DEFLATE) != 0)
        return soap_inflate_refill(ctx);
    const int result = soap_raw_fill(ctx);
    if (result != SOAP_OK) {
        ctx->buffer_index = ctx->buffer_length = 0;
        return result;
    }
    if (ctx->raw_aside) {
        ctx->buffer_index = 0;
        ctx->buffer_length = ctx->zlib_buffer_length - ctx->raw_index;
        std::memcpy(ctx->buffer, ctx->zlib_buffer + ctx->raw_index, ctx->buffer_length);
        ctx->raw_index = ctx->zlib_buffer_length;
    }
    return soap_recv_deliver(ctx);
}

namespace {

// A filter may make more of its bytes than came, so those of later chunks must not lie after them.
int make_room_for_filter(soap *ctx)
{
    if (ctx->raw_aside || !input_is_chunked(ctx) || (ctx->mode & MODE_DEFLATE) != 0)
        return SOAP_OK;
    if (soap_zlib_prepare(ctx) != SOAP_OK)
        return ctx->error;
    soap_raw_move_aside(ctx);
    return SOAP_OK;
}

} // namespace

int soap_recv_filtered(soap *ctx)
{
    // A filter works on plain text: compressed bytes, and the trailer of their stream, pass it by.
    const bool compressed = ctx->zlib_in != 0 && (ctx->mode & MODE_DEFLATE) == 0;
    while (ctx->on_recv_filter != nullptr && !compressed) {
        if (make_room_for_filter(ctx) != SOAP_OK)
            return ctx->error;
        int status = ctx->filter_stop;
        if (status != 0)
            ctx->buffer_index = ctx->buffer_length = 0;
        else
            status = soap_recv_refill(ctx);
        const int result = ctx->on_recv_filter(ctx, ctx->buffer, &ctx->buffer_length, SOAP_BUFFER_SIZE);
        if (result == SOAP_OK && ctx->buffer_length > SOAP_BUFFER_SIZE)
            fail(ctx, SOAP_CORRUPTION);
        if (result != SOAP_OK)
            ctx->error = result;
        if (result != SOAP_OK || ctx->buffer_length > SOAP_BUFFER_SIZE) {
            ctx->buffer_index = ctx->buffer_length = 0;
            return ctx->error;
        }
        if (ctx->buffer_length != 0) {
            ctx->filter_stop = status;
            return SOAP_OK;
        }
        if (status != 0)
            return status;
    }
    return soap_recv_refill(ctx);
}

int soap_recv_more(soap *ctx)
{
    return ctx->attachment_stage != nullptr ? ctx->attachment_stage(ctx) : soap_recv_filtered(ctx);
}

int soap_recv_skip(soap *ctx, std::size_t count)
{
    if (count != 0 && ctx->look_ahead > 0) {
        ctx->look_ahead = 0;
        --count;
    }
    while (count != 0) {
        const std::size_t length = stretch(ctx, count);
        if (length == 0)
            return END;
        ctx->buffer_index += length;
        count -= length;
    }
    return SOAP_OK;
}

int soap_gzip_skip_header(soap *ctx)
{
    return soap_recv_skip(ctx, GZIP_HEAD_REST) == SOAP_OK ? SOAP_OK : fail(ctx, SOAP_ZLIB_ERROR);
}

// ---------------------------------------------------------------------------------------------
// Blocks.

namespace {

// Copies `length` bytes of input. 0 or -1.
int recv_into(soap *ctx, char *target, std::size_t length)
{
    if (length != 0 && ctx->look_ahead > 0) {
        *target++ = static_cast<char>(ctx->look_ahead);
        ctx->look_ahead = 0;
        --length;
    }
    while (length != 0) {
        const std::size_t part = stretch(ctx, length);
        if (part == 0)
            return END;
        std::memcpy(target, ctx->buffer + ctx->buffer_index, part);
        ctx->buffer_index += part;
        target += part;
        length -= part;
    }
    return SOAP_OK;
}

// Gathers the bytes in steps: a length announced and never sent costs no memory.
int gather(soap *ctx, std::size_t length)
{
    while (length != 0) {
        const std::size_t step = std::min(length, BLOCK_STEP);
        char *place = static_cast<char *>(soap_block_stack_grow(ctx, nullptr, step));
        if (place == nullptr)
            return ctx->error;
        if (recv_into(ctx, place, step) != SOAP_OK)
            return fail_at_end(ctx);
        length -= step;
    }
    char *terminator = static_cast<char *>(soap_block_stack_grow(ctx, nullptr, 1));
    if (terminator == nullptr)
        return ctx->error;
    *terminator = '\0';
    return SOAP_OK;
}

} // namespace

char *soap_recv_bytes_block(soap *ctx, std::size_t length)
{
    if (soap_block_stack_push(ctx) == nullptr)
        return nullptr;
    if (gather(ctx, length) != SOAP_OK) {
        soap_block_stack_drop(ctx, nullptr);
        return nullptr;
    }
    char *block = static_cast<char *>(block_stack_gather(ctx, nullptr, nullptr, nullptr));
    if (block != nullptr && soap_recv_skip(ctx, (0 - length) & 3) != SOAP_OK) {
        fail_at_end(ctx);
        return nullptr;
    }
    return block;
}
