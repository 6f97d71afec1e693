// chunks.h - the chunked transfer coding, both ways.
//
// Elsewhere: where the bytes come from and go to (raw_in.h, buffered_out.cpp). In soap:
//   chunk_size           input: bytes of the open chunk that were not received yet; output: bytes sent in
//   chunks chunk_buffer_length  input: bytes received, when the open chunk ends among them; 0 when all
//   received were used
#pragma once

#include <string_view>

#include "core/raw_in.h"

constexpr std::size_t CHUNK_LINE_MAX =
    8192; // input: bytes of a size line, and of all lines after the last chunk
constexpr std::size_t CHUNK_LINE_SIZE = 24; // output: bytes; CR LF, 16 digits, CR LF and the terminator fit

inline bool input_is_chunked(const soap *ctx)
{
    return (ctx->mode & MODE_IO_MASK) == MODE_CHUNKED;
}

// Puts what comes before `length` bytes of data, the end of the previous chunk included, into `line`.
// Returns its bytes.
std::size_t chunk_size_line(soap *ctx, std::size_t length, char (&line)[CHUNK_LINE_SIZE]);

// What ends a body: the end of the previous chunk, if there is one, and the last chunk.
inline std::string_view chunks_end(const soap *ctx)
{
    return ctx->chunk_size == 0 ? "0\r\n\r\n" : "\r\n0\r\n\r\n";
}

// Moves the window to the next data of a chunked body, receiving what is needed. SOAP_OK with at least one
// byte, RAW_END, or SOAP_HEADER_LINE if a size line is too long.
int chunk_fill(soap *ctx, raw_window &window);
