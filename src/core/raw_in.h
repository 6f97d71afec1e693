// raw_in.h - raw bytes of a message from on_recv, with chunks undone and the end of the message watched.
//
// Elsewhere: what is made of them (inflate_in.h, buffered_in.cpp).
//
// Raw bytes lie in ctx->buffer, or in ctx->zlib_buffer while ctx->raw_aside is set because `buffer` holds
// something made of them. With chunks:
//   chunk_size           bytes of the open chunk that were not received yet
//   chunk_buffer_length  bytes received, when the open chunk ends among them; 0 when all received were used
#pragma once

#include <cstddef>

#include <zuv_client_pro/soap.h>

constexpr std::size_t CHUNK_LINE_MAX =
    8192; // bytes of a chunk's size line, and of all lines behind the last chunk
constexpr std::size_t DROP_MAX = 65536; // bytes read beyond what the reader wanted, to keep a connection

// Forgets the framing of the message before.
void soap_raw_reset(soap *ctx);

// The next stretch of the body's raw bytes, once the one before was used. 0 with at least one byte, 1 at the
// end of input or past a limit (limits.h), 22 if a chunk's size line is too long.
int soap_raw_fill(soap *ctx);

// From here on raw bytes are received into zlib_buffer. What `buffer` still holds moves there, and `buffer`
// is empty. zlib_buffer must exist.
void soap_raw_move_aside(soap *ctx);

// Undoes soap_raw_move_aside; raw_index must stand at the next raw byte.
void soap_raw_move_back(soap *ctx);

// The body begins at buffer_index: puts the chunks announced in ctx->mode into force.
void soap_raw_open_body(soap *ctx);

// True if the message was read to its end, by chunks or by Content-Length, with nothing behind it. Reads and
// drops up to DROP_MAX bytes that Content-Length still promises if the connection is to be kept.
bool soap_raw_consumed(soap *ctx);

// Bytes received behind the length that the head told.
std::uint64_t soap_raw_surplus(const soap *ctx);

inline bool soap_input_is_chunked(const soap *ctx)
{
    return (ctx->mode & MODE_IO_MASK) == MODE_CHUNKED;
}
