// inflate_in.cpp - see inflate_in.h.
//
// Always: while a stream runs, its input lies in zlib_buffer and `buffer` holds what came out last. next_out
// null marks a stream that has ended or failed.
#include "core/inflate_in.h"

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>

#include "core/buffered_in.h"
#include "core/failure.h"
#include "core/raw_in.h"
#include "core/zlib_common.h"

namespace {

constexpr int STREAM_ENDED = -1;
constexpr int RAW_ENDED = 1;
constexpr int AGAIN = -2; // nothing came out yet

int fail_to_inflate(soap *ctx)
{
    ctx->framing_doubtful = true;
    ctx->buffer_index = ctx->buffer_length = 0;
    return soap_zlib_fail(ctx);
}

int set_dictionary(soap *ctx)
{
    return inflateSetDictionary(ctx->zlib_stream, zlib_bytes(ctx->zlib_dictionary),
                                ctx->zlib_dictionary_length);
}

void take_raw_as_input(soap *ctx)
{
    ctx->zlib_stream->next_in = zlib_bytes(ctx->zlib_buffer + ctx->raw_index);
    ctx->zlib_stream->avail_in = static_cast<uInt>(ctx->zlib_buffer_length - ctx->raw_index);
}

void give_input_back(soap *ctx)
{
    ctx->raw_index = ctx->zlib_buffer_length - ctx->zlib_stream->avail_in;
}

int fetch_input(soap *ctx)
{
    give_input_back(ctx);
    const int result = soap_raw_fill(ctx);
    take_raw_as_input(ctx);
    return result;
}

void end_stream(soap *ctx)
{
    z_stream *stream = ctx->zlib_stream;
    if (stream->total_out != 0)
        ctx->zlib_ratio_in = static_cast<float>(stream->total_in) / static_cast<float>(stream->total_out);
    stream->next_out = nullptr;
}

// One step of zlib. 0 with bytes in `buffer`, AGAIN, STREAM_ENDED or 31.
int inflate_once(soap *ctx)
{
    z_stream *stream = ctx->zlib_stream;
    const uInt available = stream->avail_in;
    stream->next_out = zlib_bytes(ctx->buffer);
    stream->avail_out = SOAP_BUFFER_SIZE;
    const int result = inflate(stream, Z_NO_FLUSH);
    if (result == Z_NEED_DICT)
        return ctx->zlib_dictionary != nullptr && set_dictionary(ctx) == Z_OK ? AGAIN : fail_to_inflate(ctx);
    if (result == Z_BUF_ERROR && stream->avail_in == 0)
        return AGAIN; // it wants more input
    if (result != Z_OK && result != Z_STREAM_END)
        return fail_to_inflate(ctx);
    ctx->buffer_index = 0;
    ctx->buffer_length = SOAP_BUFFER_SIZE - stream->avail_out;
    if (ctx->zlib_in == ENCODING_GZIP)
        ctx->zlib_crc = crc32(ctx->zlib_crc, zlib_bytes(ctx->buffer), static_cast<uInt>(ctx->buffer_length));
    if (result == Z_STREAM_END)
        end_stream(ctx);
    if (ctx->buffer_length != 0)
        return SOAP_OK;
    if (result == Z_STREAM_END)
        return STREAM_ENDED;
    return stream->avail_in == available ? fail_to_inflate(ctx) : AGAIN;
}

bool trailer_number_is(soap *ctx, unsigned long expected)
{
    for (int i = 0; i < 4; ++i) {
        if (soap_recv_byte(ctx) != static_cast<std::int32_t>(expected >> (8 * i) & 0xFFU))
            return false;
    }
    return true;
}

// Whatever came of the stream, the raw bytes after it are read as they are from here on. Result of
// inflateEnd.
int leave_stream(soap *ctx)
{
    give_input_back(ctx);
    soap_raw_move_back(ctx);
    ctx->look_ahead = 0;
    return soap_zlib_drop(ctx);
}

bool trailer_is_right(soap *ctx, unsigned long plain_length)
{
    return trailer_number_is(ctx, ctx->zlib_crc) && trailer_number_is(ctx, plain_length);
}

} // namespace

int soap_inflate_begin(soap *ctx, int window_bits)
{
    if (soap_zlib_prepare(ctx) != SOAP_OK)
        return ctx->error;
    z_stream *stream = ctx->zlib_stream;
    stream->next_in = nullptr;
    stream->avail_in = 0;
    if (inflateInit2(stream, window_bits) != Z_OK)
        return fail_to_inflate(ctx);
    ctx->zlib_state = ZLIB_INFLATING;
    ctx->mode |= MODE_DEFLATE;
    ctx->zlib_crc = crc32(0, nullptr, 0);
    ctx->plain_received = 0;
    soap_raw_move_aside(ctx);
    take_raw_as_input(ctx);
    stream->next_out = zlib_bytes(ctx->buffer);
    stream->avail_out = SOAP_BUFFER_SIZE;
    // A stream with a zlib head asks for its dictionary; a raw one cannot.
    if (window_bits < 0 && ctx->zlib_dictionary != nullptr && set_dictionary(ctx) != Z_OK)
        return fail_to_inflate(ctx);
    return SOAP_OK;
}

int soap_inflate_begin_deflate(soap *ctx, std::uint8_t first)
{
    // The second byte is looked at in the buffer; the first, which a refill may have taken away, is handed
    // on by itself.
    const bool has_second = ctx->look_ahead == 0 && ctx->buffer_index < ctx->buffer_length;
    const auto second = static_cast<unsigned char>(has_second ? ctx->buffer[ctx->buffer_index] : 0);
    const bool has_zlib_head =
        (first & 0x0F) == Z_DEFLATED && first >> 4 <= 7 && (first << 8 | second) % 31 == 0;
    if (soap_inflate_begin(ctx, has_zlib_head ? ZLIB_WRAPPED : ZLIB_RAW) != SOAP_OK)
        return ctx->error;
    if (inflatePrime(ctx->zlib_stream, 8, first) != Z_OK)
        return fail_to_inflate(ctx);
    ctx->zlib_stream->total_in = 1;
    return SOAP_OK;
}

int soap_inflate_refill(soap *ctx)
{
    z_stream *stream = ctx->zlib_stream;
    ctx->buffer_index = ctx->buffer_length = 0;
    if (ctx->zlib_state != ZLIB_INFLATING || stream->next_out == nullptr)
        return STREAM_ENDED;
    for (;;) {
        // With the buffer full last time, more may come out of the input taken already.
        if (stream->avail_in == 0 && stream->avail_out != 0) {
            const int result = fetch_input(ctx);
            if (result != SOAP_OK)
                return result;
        }
        const int result = inflate_once(ctx);
        if (result == SOAP_OK)
            return soap_recv_deliver(ctx);
        if (result != AGAIN)
            return result;
    }
}

int soap_inflate_finish(soap *ctx)
{
    if (ctx->zlib_state != ZLIB_INFLATING)
        return fail_to_inflate(ctx);
    int result;
    do
        result = soap_inflate_refill(ctx);
    while (result == SOAP_OK);
    const unsigned long plain_length = ctx->zlib_stream->total_out;
    const bool gzip = ctx->zlib_in == ENCODING_GZIP;
    const bool left = leave_stream(ctx) == Z_OK;
    if (!left || result == RAW_ENDED ||
        (result == STREAM_ENDED && gzip && !trailer_is_right(ctx, plain_length)))
        result = fail_to_inflate(ctx);
    ctx->zlib_in = 0;
    if (ctx->exceeded != nullptr) // what the stream lacks is beyond the limit
        return fail(ctx, SOAP_LENGTH);
    return result == STREAM_ENDED ? SOAP_OK : fail(ctx, result);
}
