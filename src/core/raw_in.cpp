// raw_in.cpp - see raw_in.h.
//
//   body  = *chunk last *( trailer line LF ) [CR] LF
//   chunk = size [ anything but LF ] LF, size bytes, [CR] LF
//   last  = "0" [ anything but LF ] LF
//   size  = 1*16 hexadecimal digits; more are dropped
//
// Always: sizes from the wire are compared with what was received and never added to an address first.
#include "core/raw_in.h"

#include <algorithm>
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_log.h>

#include "core/limits.h"

namespace {

constexpr int DIGITS_MAX = 16;
constexpr int END = -1;
constexpr int RAW_END = 1; // result of soap_raw_fill

// The raw bytes not used yet of the stretch received last.
struct raw_window {
    char *bytes;
    std::size_t index;
    std::size_t length;
};

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
           !soap_input_is_chunked(ctx);
}

// On a kept connection nothing comes behind the length announced: waiting for it would be for ever.
bool body_is_complete(const soap *ctx)
{
    return length_is_known(ctx) && ctx->keep_alive != 0 && ctx->body_received >= ctx->content_length;
}

std::size_t receive(soap *ctx, char *bytes, std::size_t length)
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

// ---------------------------------------------------------------------------------------------
// Chunks.

int hexadecimal(int c)
{
    if (c >= '0' && c <= '9')
        return c - '0';
    if (c >= 'A' && c <= 'F')
        return c - 'A' + 10;
    return c >= 'a' && c <= 'f' ? c - 'a' + 10 : -1;
}

// A byte between two chunks.
int line_byte(soap *ctx, raw_window &window)
{
    if (window.index == window.length) {
        window.index = 0;
        window.length = receive(ctx, window.bytes, SOAP_BUFFER_SIZE);
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
    return ctx->error = SOAP_HEADER_LINE;
}

// Reads from behind the last chunk to the line feed of the next size line. 0, RAW_END or 22.
int read_size_line(soap *ctx, raw_window &window, std::uint64_t &size)
{
    std::size_t left = CHUNK_LINE_MAX;
    int c = line_byte(ctx, window);
    for (; hexadecimal(c) < 0; c = line_byte(ctx, window)) {
        if (c == END)
            return RAW_END;
        if (c != '\r' && c != '\n')
            ctx->framing_doubtful = true;
        if (--left == 0)
            return line_too_long(ctx);
    }
    size = 0;
    for (int digits = 0; digits < DIGITS_MAX && hexadecimal(c) >= 0; ++digits, c = line_byte(ctx, window))
        size = size << 4 | static_cast<std::uint64_t>(hexadecimal(c));
    if (hexadecimal(c) >= 0)
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

// Everything received behind the last chunk, unused.
void release_clip(soap *ctx, raw_window &window)
{
    if (ctx->chunk_buffer_length == 0) {
        window.index = window.length = 0;
        return;
    }
    window.index = window.length;
    window.length = ctx->chunk_buffer_length;
}

// The window ends where the chunk ends, or the chunk goes on behind what was received.
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
    window.length = receive(ctx, window.bytes, static_cast<std::size_t>(most));
    ctx->chunk_size -= window.length;
    return window.length == 0 ? RAW_END : SOAP_OK;
}

int fill_from_chunks(soap *ctx, raw_window &window)
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

int fill_plainly(soap *ctx, raw_window &window)
{
    window.index = 0;
    window.length = receive(ctx, window.bytes, SOAP_BUFFER_SIZE);
    return window.length == 0 ? RAW_END : SOAP_OK;
}

void drop_promised_rest(soap *ctx)
{
    if (ctx->keep_alive == 0 || ctx->body_received >= ctx->content_length ||
        ctx->content_length - ctx->body_received > DROP_MAX)
        return;
    while (ctx->body_received < ctx->content_length) {
        const std::uint64_t rest = ctx->content_length - ctx->body_received;
        if (receive(ctx, ctx->buffer,
                    static_cast<std::size_t>(std::min<std::uint64_t>(rest, SOAP_BUFFER_SIZE))) == 0)
            return;
    }
}

} // namespace

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
        result = soap_input_is_chunked(ctx) ? fill_from_chunks(ctx, window) : fill_plainly(ctx, window);
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
    if (!soap_input_is_chunked(ctx))
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
    // A length beside chunks, which rule, may be what somebody between us and the peer went by.
    if (soap_input_is_chunked(ctx))
        return ctx->body_open && ctx->body_ended && !ctx->content_length_given;
    if (!length_is_known(ctx))
        return false;
    drop_promised_rest(ctx);
    return ctx->body_received == ctx->content_length;
}
