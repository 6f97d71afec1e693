// buffered_in.h - the stages of input that decompression, attachments, the head reader and exchange step
// into.
//
// Elsewhere: what readers call (soap_io.h).
#pragma once

#include <zuv_client_pro/soap.h>

// soap_recv_refill with on_recv_filter around it and without DIME. Results as soap_recv_more.
int soap_recv_filtered(soap *ctx);

// New plain bytes are in the buffer: counts them and shows them to on_recv_prepare; those of a compressed
// message are logged too. 0 or the result of the hook.
int soap_recv_deliver(soap *ctx);

// The head was read and the body begins at buffer_index: takes the framing and the compression that the head
// announced (ctx->input_mode, ctx->zlib_in) into force, so that soap_recv_byte gives the body's plain bytes.
// A head reader that drops an error's body calls it itself. Once for each message. Returns 0; with no body 14
// if the status is 200, otherwise the status, or -1 if that is 0; 20; 22; 31.
int soap_body_open(soap *ctx);

// Ends the body: the end of the compressed stream is checked, chunks are read to the last one.
// ctx->response_unfinished is cleared if that was all of the message. SOAP_OK, SOAP_HEADER_LINE,
// SOAP_ZLIB_ERROR.
int body_close(soap *ctx);

// The next byte, which stays the next one; -1 at the end of input.
std::int32_t input_peek_byte(soap *ctx);
