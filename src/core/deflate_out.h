// deflate_out.h - compression between the send buffer and soap_send_through.
#pragma once

#include <cstddef>

#include <zuv_client_pro/soap.h>

// Starts a deflate (zlib_out 1) or gzip stream (else) unless a fresh one waits; a stream that an earlier
// message left is dropped. 0, 20 or 31.
int soap_deflate_begin(soap *ctx);

// Compresses a stretch; full zlib_buffers go on. 0, 31, or the result of soap_send_through.
int soap_deflate_write(soap *ctx, const char *data, std::size_t length);

// Brings out the rest, ends the stream and writes the gzip trailer. MODE_DEFLATE is out of ctx->mode
// afterwards. 0, 31, or the result of soap_send_through.
int soap_deflate_finish(soap *ctx);
