// buffered_out.cpp - the bytes of a message on its way out: counted, buffered, stored or sent.
//
// Elsewhere: compression (deflate_out.cpp), the form of chunks (chunks.cpp), the message as a whole
// (exchange/send.cpp).
//
// The stages of a byte: soap_send_bytes -> buffer -> soap_send_flush -> [compression] -> soap_send_through ->
// [chunks | store] -> on_send. Always: buffer_index <= SOAP_BUFFER_SIZE.
#include "core/buffered_out.h"

#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_memory.h>

#include "core/chunks.h"
#include "core/deflate_out.h"
#include "core/failure.h"
#include "core/limits.h"
#include "core/raw_in.h"

namespace {

int transmit(soap *ctx, const char *data, std::size_t length)
{
    soap_log_write(ctx, SOAP_LOG_SENT, data, length);
    if (ctx->on_send == nullptr)
        return SOAP_OK;
    const int result = ctx->on_send(ctx, data, length);
    return result == SOAP_OK ? SOAP_OK : fail(ctx, result);
}

int store(soap *ctx, const char *data, std::size_t length)
{
    if (ctx->block_stack == nullptr && soap_block_stack_push(ctx) == nullptr)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    void *place = soap_block_stack_grow(ctx, nullptr, length);
    if (place == nullptr)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    std::memcpy(place, data, length);
    if (ctx->max_memory != 0 && ctx->block_stack->total_size > ctx->max_memory)
        return limit_exceeded(ctx, "max_memory", ctx->max_memory);
    return SOAP_OK;
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
        return fail(ctx, SOAP_UDP_ERROR);
    std::memcpy(ctx->buffer + ctx->buffer_index, data, length);
    ctx->buffer_index += length;
    return SOAP_OK;
}

int buffer_bytes(soap *ctx, const char *data, std::size_t length)
{
    std::size_t space = SOAP_BUFFER_SIZE - ctx->buffer_index;
    while (length >= space) {
        std::memcpy(ctx->buffer + ctx->buffer_index, data, space);
        data += space;
        length -= space;
        if (flush_full(ctx) != SOAP_OK)
            return ctx->error;
        space = SOAP_BUFFER_SIZE;
    }
    std::memcpy(ctx->buffer + ctx->buffer_index, data, length);
    ctx->buffer_index += length;
    return SOAP_OK;
}

} // namespace

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
    if (io_bits(ctx->mode) == MODE_CHUNKED) {
        char line[CHUNK_LINE_SIZE];
        if (transmit(ctx, line, chunk_size_line(ctx, length, line)) != SOAP_OK)
            return ctx->error;
    }
    return transmit(ctx, data, length);
}

void output_forget(soap *ctx)
{
    ctx->plain_sent = 0;
    ctx->xml_end_max = 0;
    ctx->exceeded = nullptr;
}

int output_begin(soap *ctx)
{
    if (io_bits(ctx->mode) != MODE_DIRECT)
        ctx->buffer_index = ctx->buffer_length = 0;
    soap_raw_reset(ctx);
    output_forget(ctx);
    ctx->zlib_ratio_out = 1.0F;
    return (ctx->mode & MODE_DEFLATE) != 0 ? soap_deflate_begin(ctx) : static_cast<int>(SOAP_OK);
}

int output_close(soap *ctx)
{
    if (soap_send_flush(ctx) != SOAP_OK)
        return ctx->error;
    if ((ctx->mode & MODE_DEFLATE) != 0 && soap_deflate_finish(ctx) != SOAP_OK)
        return ctx->error;
    const std::string_view end = io_bits(ctx->mode) == MODE_CHUNKED ? chunks_end(ctx) : "";
    return end.empty() ? SOAP_OK : transmit(ctx, end.data(), end.size());
}

int output_send_stored(soap *ctx)
{
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
