// zlib_common.h - what compression and decompression share: the buffer, the failure, the end.
//
// Elsewhere: deflate_out.cpp and inflate_in.cpp, one direction each.
#pragma once

#include <zlib.h>

#include <zuv_client_pro/soap.h>

constexpr int ZLIB_IDLE = 0;
constexpr int ZLIB_DEFLATING = 1;
constexpr int ZLIB_INFLATING = 2;
constexpr int ENCODING_DEFLATE = 1; // zlib_in, zlib_out
constexpr int ENCODING_GZIP = 2;

// Makes zlib_buffer if there is none, and ends a stream that an earlier message left. 0 or 20.
int soap_zlib_prepare(soap *ctx);

// Ends whatever stream runs, without regard to its data, and takes MODE_DEFLATE out of ctx->mode. Z_OK or
// zlib's complaint.
int soap_zlib_drop(soap *ctx);

// The failure of either direction: SOAP_ZLIB_ERROR, and no more bytes come out of the stream. Returns the error.
int soap_zlib_fail(soap *ctx);

inline Bytef *zlib_bytes(const char *bytes)
{
    return reinterpret_cast<Bytef *>(const_cast<char *>(bytes));
}
