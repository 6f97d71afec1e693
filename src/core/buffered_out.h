// buffered_out.h - the stages of output that exchange steps into, and the I/O bits of a mode.
//
// Elsewhere: what writers call (soap_io.h).
#pragma once

#include <zuv_client_pro/soap.h>

// How a message leaves the buffer: MODE_DIRECT, MODE_BUFFERED, MODE_STORE or MODE_CHUNKED.
inline std::uint32_t io_bits(std::uint32_t mode)
{
    return mode & MODE_IO_MASK;
}
inline std::uint32_t with_io(std::uint32_t mode, std::uint32_t io)
{
    return (mode & ~MODE_IO_MASK) | io;
}

// Nothing of the message has left the buffer yet, and no limit was met.
void output_forget(soap *ctx);

// The bytes of a message begin in the mode that ctx->mode has. Results as soap_deflate_begin.
int output_begin(soap *ctx);

// Ends the body of a message: the rest of the buffer, the end of compression, the last chunk. Results as
// soap_send_flush and soap_deflate_finish.
int output_close(soap *ctx);

// Sends what MODE_STORE has gathered, and frees it. SOAP_OK or the result of on_send.
int output_send_stored(soap *ctx);
