// raw_in.cpp - see raw_in.h.
#include "core/raw_in.h"

#include <algorithm>
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_log.h>

#include "core/chunks.h"
#include "core/limits.h"

namespace {

raw_window window_of(soap *ctx)
{
    if (ctx->raw_aside)
        return {ctx->zlib_buffer, ctx->raw_index, ctx->zlib_buffer_length};
    return {ctx->buffer, ctx->buffer_index, ctx->buffer_length};
}

void keep_window(soap *ctx, const raw_window &window)
{
    (ctx->raw_aside ? ctx->raw_index : ctx->buffer_index) = window.index;
    (ctx->raw_aside ? ctx->zlib_buffer_length : ctx->buffer_length) = window.length;
}

bool length_is_known(const soap *ctx)
{
    return ctx->body_open && (ctx->content_length_given || ctx->content_length != 0) &&
           !input_is_chunked(ctx);
}

// On a kept connection nothing comes after the length announced: waiting for it would be for ever.
bool body_is_complete(const soap *ctx)
{
    return length_is_known(ctx) && ctx->keep_alive != 0 && ctx->body_received >= ctx->content_length;
}

int fill_plainly(soap *ctx, raw_window &window)
{
    window.index = 0;
    window.length = raw_receive(ctx, window.bytes, SOAP_BUFFER_SIZE);
    return window.length == 0 ? RAW_END : SOAP_OK;
}

void drop_promised_rest(soap *ctx)
{
    if (ctx->keep_alive == 0 || ctx->body_received >= ctx->content_length ||
        ctx->content_length - ctx->body_received > DROP_MAX)
        return;
    while (ctx->body_received < ctx->content_length) {
        const std::uint64_t rest = ctx->content_length - ctx->body_received;
        if (raw_receive(ctx, ctx->buffer,
                        static_cast<std::size_t>(std::min<std::uint64_t>(rest, SOAP_BUFFER_SIZE))) == 0)
            return;
    }
}

} // namespace

std::size_t raw_receive(soap *ctx, char *bytes, std::size_t length)
{
    if (ctx->on_recv == nullptr || body_is_complete(ctx))
        return 0;
    const std::size_t received = ctx->on_recv(ctx, bytes, length);
    if (received == 0 || received > length) // a hook's -1 is no length
        return 0;
    soap_log_write(ctx, SOAP_LOG_RECEIVED, bytes, received);
    ctx->body_received += received;
    return raw_bytes_check(ctx) == SOAP_OK ? received : 0;
}

void soap_raw_reset(soap *ctx)
{
    ctx->body_received = 0;
    ctx->content_length = 0;
    ctx->content_length_given = false;
    ctx->chunk_size = 0;
    ctx->chunk_buffer_length = 0;
    ctx->zlib_buffer_length = 0;
    ctx->raw_index = 0;
    ctx->raw_aside = false;
    ctx->body_open = false;
    ctx->body_ended = false;
    ctx->prepare_held = true;
    ctx->framing_doubtful = false;
}

int soap_raw_fill(soap *ctx)
{
    raw_window window = window_of(ctx);
    int result = RAW_END;
    if (!ctx->body_ended)
        result = input_is_chunked(ctx) ? chunk_fill(ctx, window) : fill_plainly(ctx, window);
    if (result != SOAP_OK) {
        ctx->chunk_buffer_length = 0;
        window.index = window.length = 0;
    }
    keep_window(ctx, window);
    return result;
}

void soap_raw_move_aside(soap *ctx)
{
    std::memcpy(ctx->zlib_buffer, ctx->buffer, std::max(ctx->buffer_length, ctx->chunk_buffer_length));
    ctx->raw_aside = true;
    ctx->raw_index = ctx->buffer_index;
    ctx->zlib_buffer_length = ctx->buffer_length;
    ctx->buffer_index = ctx->buffer_length = 0;
}

void soap_raw_move_back(soap *ctx)
{
    std::memcpy(ctx->buffer, ctx->zlib_buffer, std::max(ctx->zlib_buffer_length, ctx->chunk_buffer_length));
    ctx->raw_aside = false;
    ctx->buffer_index = ctx->raw_index;
    ctx->buffer_length = ctx->zlib_buffer_length;
}

void soap_raw_open_body(soap *ctx)
{
    ctx->body_open = true;
    ctx->body_received = ctx->plain_received = ctx->buffer_length - ctx->buffer_index;
    if (!input_is_chunked(ctx))
        return;
    ctx->plain_received = 0;
    ctx->chunk_size = 0;
    ctx->chunk_buffer_length = ctx->buffer_length;
    ctx->buffer_length = ctx->buffer_index;
}

std::uint64_t soap_raw_surplus(const soap *ctx)
{
    const bool surplus = length_is_known(ctx) && !ctx->raw_aside && ctx->body_received > ctx->content_length;
    return surplus ? ctx->body_received - ctx->content_length : 0;
}

bool soap_raw_consumed(soap *ctx)
{
    if (ctx->framing_doubtful)
        return false;
    // A length in addition to chunks, which rule, may be what a proxy on the way went by.
    if (input_is_chunked(ctx))
        return ctx->body_open && ctx->body_ended && !ctx->content_length_given;
    if (!length_is_known(ctx))
        return false;
    drop_promised_rest(ctx);
    return ctx->body_received == ctx->content_length;
}
