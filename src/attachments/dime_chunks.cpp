// dime_chunks.cpp - see dime_chunks.h.
#include "attachments/dime_chunks.h"

#include <zuv_client_pro/soap_error.h>

#include "core/buffered_in.h"

namespace {

constexpr std::size_t HEADER = 12;       // bytes
constexpr unsigned CHUNK_FLAG = 1;       // more chunks follow
constexpr unsigned MESSAGE_END_FLAG = 2; // last record of the message
constexpr unsigned MESSAGE_BEGIN_FLAG = 4;
constexpr unsigned TYPE_FORMAT_MASK = 0xF0; // 0 in it: the type is that of the chunk ahead
constexpr unsigned VERSION_MASK = 0xF8;
constexpr unsigned VERSION = 0x08;
constexpr int END = -1;

int raw_byte(soap *ctx)
{
    if (ctx->buffer_index == ctx->buffer_length && soap_recv_filtered(ctx) != SOAP_OK)
        return END;
    return static_cast<unsigned char>(ctx->buffer[ctx->buffer_index++]);
}

int skip(soap *ctx, std::size_t count)
{
    for (; count != 0; --count) {
        if (raw_byte(ctx) == END)
            return END;
    }
    return 0;
}

std::size_t padded(std::size_t length)
{
    return (length + 3) & ~static_cast<std::size_t>(3);
}

std::size_t number(const unsigned char *bytes, int count)
{
    std::size_t value = 0;
    for (int i = 0; i < count; ++i)
        value = value << 8 | bytes[i];
    return value;
}

// The buffer is seen up to the end of the chunk, if that has arrived.
void clip(soap *ctx)
{
    const std::size_t available = ctx->buffer_length - ctx->buffer_index;
    if (available < ctx->dime.chunk_size) {
        ctx->dime.chunk_size -= available;
        return;
    }
    ctx->message_count -= available - ctx->dime.chunk_size;
    ctx->dime.buffer_length = ctx->buffer_length;
    ctx->buffer_length = ctx->buffer_index + ctx->dime.chunk_size;
    ctx->dime.chunk_size = 0;
}

void unclip(soap *ctx)
{
    ctx->buffer_length = ctx->dime.buffer_length;
    ctx->dime.buffer_length = 0;
}

// Padding of the chunk that ended, then the next header. Its id, type and options are those of the first.
int read_next_header(soap *ctx)
{
    unsigned char header[HEADER];
    for (std::size_t left = padded(ctx->dime.size) - ctx->dime.size; left != 0; --left) {
        const int byte = raw_byte(ctx);
        if (byte != 0)
            return byte == END ? END : ctx->error = SOAP_DIME_ERROR; // the length was too short
    }
    for (unsigned char &byte : header) {
        const int c = raw_byte(ctx);
        if (c == END)
            return END;
        byte = static_cast<unsigned char>(c);
    }
    if ((header[0] & VERSION_MASK) != VERSION)
        return ctx->error = SOAP_DIME_VERSION;
    if (skip(ctx, padded(number(header + 2, 2)) + padded(number(header + 4, 2)) +
                      padded(number(header + 6, 2))) != 0)
        return END;
    if ((header[0] & MESSAGE_BEGIN_FLAG) != 0 || (header[1] & TYPE_FORMAT_MASK) != 0)
        return ctx->error = SOAP_DIME_ERROR; // not a chunk of this record
    ctx->dime.flags = static_cast<std::uint8_t>((header[1] & TYPE_FORMAT_MASK) | (header[0] & 7U));
    ctx->dime.size = number(header + 8, 4);
    if ((ctx->dime.flags & MESSAGE_END_FLAG) != 0)
        ctx->mode &= ~MODE_DIME;
    soap_dime_data_begin(ctx);
    return SOAP_OK;
}

} // namespace

void soap_dime_data_begin(soap *ctx)
{
    ctx->message_count = ctx->buffer_length - ctx->buffer_index;
    ctx->dime.chunk_size = 0;
    ctx->dime.buffer_length = 0;
    if ((ctx->dime.flags & CHUNK_FLAG) == 0)
        return;
    ctx->dime.chunk_size = ctx->dime.size;
    clip(ctx);
}

int soap_dime_chunk_more(soap *ctx)
{
    while (soap_dime_chunk_pending(ctx)) {
        if (ctx->dime.chunk_size != 0) {
            const int result = soap_recv_filtered(ctx);
            if (result == SOAP_OK)
                clip(ctx);
            return result;
        }
        unclip(ctx);
        const int result = read_next_header(ctx);
        if (result != SOAP_OK)
            return result;
        if (ctx->buffer_index != ctx->buffer_length)
            return SOAP_OK;
    }
    return soap_recv_filtered(ctx);
}
