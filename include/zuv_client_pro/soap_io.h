// soap_io.h - the byte pipe between codec and transport: framing, chunks, compression, one shared buffer.
//
// Elsewhere: HTTP heads (soap_http.h), sockets (soap_tcp.h), attachments (soap_attachment.h), the trace log
// (soap_log.h).
// Always: results are 0 or the code that also stands in ctx->error; -1 from a reader is the end of input,
// and stays so for the rest of the message. Every byte passes through ctx->buffer, which serves one direction
// at a time; buffer_index <= buffer_length (input) and buffer_index <= SOAP_BUFFER_SIZE (output) always hold.
// Lengths are bytes. Data handed in is needed only during the call.
//
// A message goes out as: soap_count_begin, the writers (only if ctx->mode has MODE_COUNTING), soap_count_end,
// soap_send_begin, the head, the writers, soap_send_finish. It comes in as: soap_receive_begin, the readers,
// soap_receive_finish.
//
// Limits, each ending the message with 45 (SOAP_LENGTH) from whatever function finds out: max_message and
// max_memory of the context; raw bytes without contents, which are 1 MB and 8 for each plain byte at most
// (framing, flushes of a compressed stream). From there on the input is at its end, or nothing more is sent,
// and the connection carries no other message. soap_fault_text_fill names the limit and its value.
#pragma once

#include <cstring>

#include <zuv_client_pro/soap.h>

// --- output ---

// Settles ctx->mode for a message from ctx->output_mode and clears the writer's state. If ctx->mode has
// MODE_COUNTING afterwards, the message must be written once into the counter ahead of soap_send_begin.
// Returns 0, 20, or the result of on_send_prepare_begin.
ZUV_API int soap_count_begin(soap *ctx);

// Ends the counting pass. Returns 0, 45, or the result of on_send_prepare_end.
ZUV_API int soap_count_end(soap *ctx);

// Settles ctx->mode for the real sending, empties the buffer and starts compression. From here on the
// connection of a request counts as busy (ctx->response_unfinished) until its response was read. Returns 0,
// 20, 27 (UDP, more than 65536 bytes counted), 31 (compression), or the result of on_send_prepare_begin.
ZUV_API int soap_send_begin(soap *ctx);

// soap_send_bytes with hooks set, with a full buffer or without one.
ZUV_API int soap_send_bytes_slow(soap *ctx, const char *data, std::size_t length);

// The one entry for all output: counts, stores or sends. Returns 0, 20, 27 (UDP, more than 65536 bytes), 31,
// 45, the result of a hook, or that of on_send.
inline int soap_send_bytes(soap *ctx, const char *data, std::size_t length)
{
    if (length == 0)
        return 0;
    if (ctx->on_send_filter == nullptr) {
        if ((ctx->mode & MODE_COUNTING) != 0) {
            if (ctx->on_send_prepare == nullptr) {
                ctx->message_count += length;
                return 0;
            }
        } else if ((ctx->mode & MODE_IO_MASK) != MODE_DIRECT &&
                   length < SOAP_BUFFER_SIZE - ctx->buffer_index) {
            std::memcpy(ctx->buffer + ctx->buffer_index, data, length);
            ctx->buffer_index += length;
            return 0;
        }
    }
    return soap_send_bytes_slow(ctx, data, length);
}

// soap_send_bytes for a terminated text.
inline int soap_send_text(soap *ctx, const char *text)
{
    return soap_send_bytes(ctx, text, std::strlen(text));
}

// soap_send_bytes, then 0 to 3 zero bytes up to a multiple of four. Results as there.
ZUV_API int soap_send_padded(soap *ctx, const char *data, std::size_t length);

// Empties the buffer, through compression. Nothing happens with an empty buffer. Results as for
// soap_send_bytes.
ZUV_API int soap_send_flush(soap *ctx);

// The stage behind compression: stores the bytes, or frames, logs and sends them. Returns 0, 20, or the
// result of on_send.
ZUV_API int soap_send_through(soap *ctx, const char *data, std::size_t length);

// Ends the message: attachments, the rest of the buffer, the end of compression, the last chunk, or a stored
// message with its head. Whatever the result, no compression runs and no stored message is left behind.
// Returns 0 or the first error met.
ZUV_API int soap_send_finish(soap *ctx);

// Counted bytes and those of the attachments: the number for Content-Length.
ZUV_API std::uint64_t soap_message_length(soap *ctx);

// --- input ---

// Starts a message: forgets the one before (header, fault, ids, namespaces received), finds out whether it
// has an HTTP head (read by on_read_head), and arms chunks, decompression and attachments. Returns 0; -1 with
// no input; 14 with no body behind a status 200; another status with no body; 20; 22 (over 1 MB of blanks
// ahead of the message); 31; 36; 45; 47 (UTF-16); 1000 if the head was all there was (informative); or the
// result of on_read_head or of a hook.
ZUV_API int soap_receive_begin(soap *ctx);

// soap_recv_byte with a byte pushed back or an empty buffer.
ZUV_API std::int32_t soap_recv_byte_slow(soap *ctx);

// Next byte of the message (or the value pushed back in ctx->look_ahead); -1 at the end of input or on an
// error, which then stands in ctx->error.
inline std::int32_t soap_recv_byte(soap *ctx)
{
    if (ctx->look_ahead == 0 && ctx->buffer_index < ctx->buffer_length)
        return static_cast<unsigned char>(ctx->buffer[ctx->buffer_index++]);
    return soap_recv_byte_slow(ctx);
}

// Drops what is left in the buffer and fills it once, with framing and compression undone. Returns 0 with at
// least one byte at buffer_index; otherwise 1 or -1 at the end of input, 22 (chunk size line over 8192
// bytes), 31, 45, or the result of on_recv_prepare.
ZUV_API int soap_recv_refill(soap *ctx);

// As soap_recv_refill, with on_recv_filter and the chunks of a DIME record around it: what readers use.
// Further results: that of the filter, 21 (the filter claims more than its buffer), 34 (DIME).
ZUV_API int soap_recv_more(soap *ctx);

// Drops bytes. Returns 0, or -1 if the input ended before; ctx->error is not touched by a plain end.
ZUV_API int soap_recv_skip(soap *ctx, std::size_t count);

// Drops the 9 bytes of a gzip header behind its first. Returns 0, or 31 at the end of input.
ZUV_API int soap_gzip_skip_header(soap *ctx);

// Reads one header line into `text` of `size` bytes, terminator included; folded lines are joined, with the
// blank that began the next line. Returns 0; -1 at the end of input; 22 if the line is too long.
ZUV_API int soap_recv_line(soap *ctx, char *text, std::size_t size);

// Reads `length` bytes into a managed block, puts a zero byte behind them, and drops 0 to 3 bytes of padding.
// Memory grows with the bytes that really arrive. Null on failure, with 20, -1 or another error.
ZUV_API char *soap_recv_bytes_block(soap *ctx, std::size_t length);

// Ends the message: reads remaining attachments, ends decompression, checks the gzip trailer, reads to the
// last chunk, resolves references. Clears ctx->response_unfinished only if the message was read exactly to
// its end, by chunks or by Content-Length. With MODE_MIME_AFTER the remaining parts are left for
// soap_mime_next_part. Returns 0, 22, 31 (also for a compressed stream cut short), 33, 37, 45, an error of
// the attachments or of the references, or the result of on_recv_prepare_end.
ZUV_API int soap_receive_finish(soap *ctx);
