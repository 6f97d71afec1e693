// raw_in.h - raw bytes of a message from on_recv, and where the message ends.
//
// Elsewhere: chunks (chunks.h), what is made of the bytes (inflate_in.h, buffered_in.cpp).
//
// Raw bytes lie in ctx->buffer, or in ctx->zlib_buffer while ctx->raw_aside is set because `buffer` holds
// something made of them.
#pragma once

#include <cstddef>

#include <zuv_client_pro/soap.h>

constexpr std::size_t DROP_MAX = 65536; // bytes read beyond what the reader wanted, to keep a connection

// Forgets the framing of the previous message.
void soap_raw_reset(soap *ctx);

// The next stretch of the body's raw bytes, once the one before was used. 0 with at least one byte, 1 at the
// end of input or past a limit (limits.h), 22 if a chunk's size line is too long.
int soap_raw_fill(soap *ctx);

// From here on raw bytes are received into zlib_buffer. What `buffer` still holds moves there, and `buffer`
// is empty. zlib_buffer must exist.
void soap_raw_move_aside(soap *ctx);

// Undoes soap_raw_move_aside; raw_index must be at the next raw byte.
void soap_raw_move_back(soap *ctx);

// The body begins at buffer_index: puts the chunks announced in ctx->mode into force.
void soap_raw_open_body(soap *ctx);

// True if the message was read to its end, by chunks or by Content-Length, with nothing after it. Reads and
// drops up to DROP_MAX bytes that Content-Length still promises if the connection is to be kept.
bool soap_raw_consumed(soap *ctx);

// Bytes received after the length that the head announced.
std::uint64_t soap_raw_surplus(const soap *ctx);

// The raw bytes of the stretch received last that were not used yet.
struct raw_window {
    char *bytes;
    std::size_t index;
    std::size_t length;
};
constexpr int RAW_END = 1; // result of filling a window: the input is at its end

// The next bytes from on_recv, at most `length`, logged and counted. 0 at the end of input, after an
// announced length, or beyond a limit.
std::size_t raw_receive(soap *ctx, char *bytes, std::size_t length);
