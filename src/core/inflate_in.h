// inflate_in.h - decompression between the raw bytes (raw_in.h) and the receive buffer.
#pragma once

#include <zuv_client_pro/soap.h>

constexpr int ZLIB_WRAPPED =
    15; // window bits of a stream with a zlib head and trailer, as a deflate body has it
constexpr int ZLIB_RAW = -15; // window bits of one without, as a gzip body has it

// Arms decompression: raw bytes from buffer_index on are the stream, and `buffer` is empty until the next
// refill. zlib_in must be set. 0, 20 or 31.
int soap_inflate_begin(soap *ctx, int window_bits);

// The same for a deflate body, whose first byte was read: some senders leave the zlib head and trailer away.
int soap_inflate_begin_deflate(soap *ctx, std::uint8_t first);

// Fills `buffer` with plain bytes. 0 with at least one byte; -1 after the end of the stream; 1 if the input
// ended before; 22; 31; or the result of on_recv_prepare.
int soap_inflate_refill(soap *ctx);

// Drops the rest of the stream, ends it and checks the gzip trailer. The raw bytes after it are in `buffer`
// then. 0, 22, 31 (also for a stream cut short), or the result of on_recv_prepare.
int soap_inflate_finish(soap *ctx);
