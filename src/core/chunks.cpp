// chunks.cpp - see chunks.h.
//
//   body  = *chunk last *( trailer line LF ) [CR] LF
//   chunk = size [ anything but LF ] LF, size bytes, [CR] LF
//   last  = "0" [ anything but LF ] LF
//   size  = 1*16 hexadecimal digits; more are dropped
//
// Always: sizes from the wire are compared with what was received and never added to an address first.
#include "core/chunks.h"

#include <algorithm>
#include <cstdio>

#include <zuv_client_pro/soap_error.h>

#include "core/failure.h"
#include "core/hex_digit.h"

// ---------------------------------------------------------------------------------------------
// Out.

std::size_t chunk_size_line(soap *ctx, std::size_t length, char (&line)[CHUNK_LINE_SIZE])
{
    const char *format = ctx->chunk_size == 0 ? "%lX\r\n" : "\r\n%lX\r\n";
    const int written = std::snprintf(line, sizeof line, format, static_cast<unsigned long>(length));
    ctx->chunk_size += length;
    return static_cast<std::size_t>(written);
}

// ---------------------------------------------------------------------------------------------
// In.

namespace {

constexpr int DIGITS_MAX = 16;
constexpr int END = -1;

// A byte between two chunks.
int line_byte(soap *ctx, raw_window &window)
{
    if (window.index == window.length) {
        window.index = 0;
        window.length = raw_receive(ctx, window.bytes, SOAP_BUFFER_SIZE);
        ctx->chunk_buffer_length = window.length;
        if (window.length == 0)
            return END;
    }
    return static_cast<unsigned char>(window.bytes[window.index++]);
}

int line_too_long(soap *ctx)
{
    ctx->body_ended = true;
    ctx->framing_doubtful = true;
    return fail(ctx, SOAP_HEADER_LINE);
}

// Reads from the end of the last chunk to the line feed of the next size line. 0, RAW_END or 22.
int read_size_line(soap *ctx, raw_window &window, std::uint64_t &size)
{
    std::size_t left = CHUNK_LINE_MAX;
    int c = line_byte(ctx, window);
    for (; hex_digit(c) < 0; c = line_byte(ctx, window)) {
        if (c == END)
            return RAW_END;
        if (c != '\r' && c != '\n')
            ctx->framing_doubtful = true;
        if (--left == 0)
            return line_too_long(ctx);
    }
    size = 0;
    for (int digits = 0; digits < DIGITS_MAX && hex_digit(c) >= 0; ++digits, c = line_byte(ctx, window))
        size = size << 4 | static_cast<std::uint64_t>(hex_digit(c));
    if (hex_digit(c) >= 0)
        ctx->framing_doubtful = true;
    for (; c != '\n'; c = line_byte(ctx, window)) {
        if (c == END)
            return RAW_END;
        if (--left == 0)
            return line_too_long(ctx);
    }
    return SOAP_OK;
}

// Reads on to the empty line that ends the message. What is missing costs the connection and nothing else;
// when that is not to be kept, nothing more is waited for.
void read_trailers(soap *ctx, raw_window &window)
{
    std::size_t line_length = 0;
    for (std::size_t left = CHUNK_LINE_MAX; left != 0; --left) {
        if (window.index == window.length && ctx->keep_alive == 0)
            break;
        const int c = line_byte(ctx, window);
        if (c == END)
            break;
        if (c == '\n' && line_length == 0)
            return;
        if (c == '\n')
            line_length = 0;
        else if (c != '\r')
            ++line_length;
    }
    ctx->framing_doubtful = true;
}

void end_body(soap *ctx, raw_window &window)
{
    read_trailers(ctx, window);
    if (window.index != window.length)
        ctx->framing_doubtful = true;
    ctx->body_ended = true;
}

// Everything received after the last chunk, unused.
void release_clip(soap *ctx, raw_window &window)
{
    if (ctx->chunk_buffer_length == 0) {
        window.index = window.length = 0;
        return;
    }
    window.index = window.length;
    window.length = ctx->chunk_buffer_length;
}

// The window ends where the chunk ends, or the chunk goes on after what was received.
void clip_to_chunk(soap *ctx, raw_window &window, std::uint64_t size)
{
    const std::size_t available = window.length - window.index;
    ctx->chunk_buffer_length = window.length;
    if (size <= available) {
        window.length = window.index + static_cast<std::size_t>(size);
        return;
    }
    ctx->chunk_size = size - available;
    ctx->chunk_buffer_length = 0;
}

int receive_open_chunk(soap *ctx, raw_window &window)
{
    const std::uint64_t most = std::min<std::uint64_t>(ctx->chunk_size, SOAP_BUFFER_SIZE);
    window.index = 0;
    window.length = raw_receive(ctx, window.bytes, static_cast<std::size_t>(most));
    ctx->chunk_size -= window.length;
    return window.length == 0 ? RAW_END : SOAP_OK;
}

} // namespace

int chunk_fill(soap *ctx, raw_window &window)
{
    for (;;) {
        if (ctx->chunk_size != 0)
            return receive_open_chunk(ctx, window);
        release_clip(ctx, window);
        std::uint64_t size = 0;
        const int result = read_size_line(ctx, window, size);
        if (result != SOAP_OK)
            return result;
        if (size == 0) {
            end_body(ctx, window);
            return RAW_END;
        }
        clip_to_chunk(ctx, window, size);
        if (window.index != window.length)
            return SOAP_OK;
    }
}
