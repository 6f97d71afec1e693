// buffered_in.h - the stages of input that other rooms of the engine and the head reader step into.
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
