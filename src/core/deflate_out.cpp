// deflate_out.cpp - see deflate_out.h.
//
// Always: zlib_buffer holds what came out and was not handed on: SOAP_BUFFER_SIZE - avail_out bytes.
#include "core/deflate_out.h"

#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_io.h>

#include "core/zlib_common.h"

namespace {

constexpr int RAW_WINDOW = -15; // window bits of a stream without a zlib head
constexpr int MEMORY_LEVEL = 8;
constexpr std::size_t GZIP_HEAD = 10;   // bytes
constexpr std::size_t GZIP_TRAILER = 8; // bytes

void restart_output(soap *ctx, std::size_t used)
{
    ctx->zlib_stream->next_out = zlib_bytes(ctx->zlib_buffer + used);
    ctx->zlib_stream->avail_out = static_cast<uInt>(SOAP_BUFFER_SIZE - used);
}

int hand_on(soap *ctx)
{
    const std::size_t length = SOAP_BUFFER_SIZE - ctx->zlib_stream->avail_out;
    restart_output(ctx, 0);
    return soap_send_through(ctx, ctx->zlib_buffer, length);
}

int begin_deflate(soap *ctx)
{
    restart_output(ctx, 0);
    return deflateInit(ctx->zlib_stream, ctx->zlib_level);
}

int begin_gzip(soap *ctx)
{
    // The third byte names the method; 0xFF warns readers that a dictionary is needed.
    const char method = ctx->zlib_dictionary != nullptr ? '\xFF' : '\x08';
    const char head[GZIP_HEAD] = {'\x1F', '\x8B', method, 0, 0, 0, 0, 0, 0, '\xFF'};
    std::memcpy(ctx->zlib_buffer, head, GZIP_HEAD);
    restart_output(ctx, GZIP_HEAD);
    ctx->zlib_out = ENCODING_GZIP;
    return deflateInit2(ctx->zlib_stream, ctx->zlib_level, Z_DEFLATED, RAW_WINDOW, MEMORY_LEVEL,
                        Z_DEFAULT_STRATEGY);
}

void put_least_first(char *place, unsigned long value)
{
    for (int i = 0; i < 4; ++i)
        place[i] = static_cast<char>(value >> (8 * i) & 0xFFU);
}

int write_gzip_trailer(soap *ctx, unsigned long plain_length)
{
    char trailer[GZIP_TRAILER];
    put_least_first(trailer, ctx->zlib_crc);
    put_least_first(trailer + 4, plain_length);
    return soap_send_through(ctx, trailer, GZIP_TRAILER);
}

} // namespace

int soap_deflate_begin(soap *ctx)
{
    z_stream *stream = ctx->zlib_stream;
    if (ctx->zlib_state == ZLIB_DEFLATING && stream->total_in == 0 && stream->next_out != nullptr)
        return SOAP_OK;
    const std::uint32_t mode = ctx->mode;
    if (soap_zlib_prepare(ctx) != SOAP_OK)
        return ctx->error;
    ctx->mode = mode;
    stream->next_in = nullptr;
    stream->avail_in = 0;
    ctx->zlib_crc = crc32(0, nullptr, 0);
    const int result = ctx->zlib_out == ENCODING_DEFLATE ? begin_deflate(ctx) : begin_gzip(ctx);
    if (result != Z_OK)
        return soap_zlib_fail(ctx);
    ctx->zlib_state = ZLIB_DEFLATING;
    if (ctx->zlib_dictionary != nullptr &&
        deflateSetDictionary(stream, zlib_bytes(ctx->zlib_dictionary), ctx->zlib_dictionary_length) != Z_OK)
        return soap_zlib_fail(ctx);
    stream->total_in = 0; // zlib counts the dictionary as input, the gzip trailer doesn't
    return SOAP_OK;
}

int soap_deflate_write(soap *ctx, const char *data, std::size_t length)
{
    z_stream *stream = ctx->zlib_stream;
    if (ctx->zlib_state != ZLIB_DEFLATING || stream->next_out == nullptr)
        return soap_zlib_fail(ctx);
    stream->next_in = zlib_bytes(data);
    stream->avail_in = static_cast<uInt>(length);
    ctx->zlib_crc = crc32(ctx->zlib_crc, stream->next_in, stream->avail_in);
    while (stream->avail_in != 0) {
        if (deflate(stream, Z_NO_FLUSH) != Z_OK)
            return soap_zlib_fail(ctx);
        if (stream->avail_out == 0 && hand_on(ctx) != SOAP_OK)
            return ctx->error;
    }
    return SOAP_OK;
}

int soap_deflate_finish(soap *ctx)
{
    z_stream *stream = ctx->zlib_stream;
    if (ctx->zlib_state != ZLIB_DEFLATING || stream->next_out == nullptr)
        return soap_zlib_fail(ctx);
    stream->next_in = nullptr;
    stream->avail_in = 0;
    int result;
    do {
        result = deflate(stream, Z_FINISH);
        if (stream->avail_out != SOAP_BUFFER_SIZE && hand_on(ctx) != SOAP_OK)
            return ctx->error;
    } while (result == Z_OK);
    const unsigned long plain_length = stream->total_in;
    if (plain_length != 0)
        ctx->zlib_ratio_out = static_cast<float>(stream->total_out) / static_cast<float>(plain_length);
    if (soap_zlib_drop(ctx) != Z_OK || result != Z_STREAM_END)
        return soap_zlib_fail(ctx);
    return ctx->zlib_out == ENCODING_DEFLATE ? SOAP_OK : write_gzip_trailer(ctx, plain_length);
}
