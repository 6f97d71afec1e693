// soap_io.h - the bytes of a message on their way out and in: framing, chunks, compression, one shared
// buffer.
//
// Elsewhere: HTTP heads (soap_http.h), sockets (soap_tcp.h), attachments (soap_attachment.h), the trace log
// (soap_log.h).
//
// Always: every byte passes through soap::buffer, which serves one direction at a time; buffer_index <=
// buffer_length (input) and buffer_index <= SOAP_BUFFER_SIZE (output) always hold. Lengths are bytes.
// SOAP_EOF from a reader is the end of input, and stays so for the rest of the message.
//
// A message is sent by: soap_count_begin, the writers (only if soap::mode has MODE_COUNTING), soap_count_end,
// soap_send_begin, the head, the writers, soap_send_finish. It is received by: soap_receive_begin, the
// readers, soap_receive_finish.
//
// Limits, each ending the message with SOAP_LENGTH from whatever function finds out: max_message and
// max_memory of the context; raw bytes without contents (framing, flushes of a compressed stream), which are
// at most 1 MB and 8 for each plain byte. From there on the input is at its end, or nothing more is sent, and
// the connection carries no other message. soap_fault_text_fill names the limit and its value.
#pragma once

#include <cstring>

#include <zuv_client_pro/soap.h>

// --- output ---
//
// Errors of sending, which all functions can give that send bytes: SOAP_OUT_OF_MEMORY (a stored message,
// compression), SOAP_UDP_ERROR (a datagram over 65536 bytes), SOAP_ZLIB_ERROR, SOAP_LENGTH (a limit, see
// above), the result of on_send, by default SOAP_EOF or SOAP_FD_EXCEEDED (tcp_send), and those of
// on_send_prepare and on_send_filter.

// Sets soap::mode for a message from soap::output_mode and clears the writer's state. If soap::mode has
// MODE_COUNTING afterwards, the message must be written once to be counted, before soap_send_begin. Called
// between exchanges.
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY
//   SOAP_FATAL_ERROR    the system has no randomness for a MIME boundary
//   returns             otherwise the result of on_send_prepare_begin
ZUV_API int soap_count_begin(soap *ctx);

// Ends the counting pass. Called after soap_count_begin and the writers.
//   SOAP_OK
//   SOAP_LENGTH  more than max_message
//   returns      otherwise the result of on_send_prepare_end
ZUV_API int soap_count_end(soap *ctx);

// Sets soap::mode for the real sending, empties the buffer and starts compression. From here on the
// connection of a request counts as busy (soap::response_unfinished) until its response was read. Part of
// soap_connect_one; a service calls it for its response.
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY
//   SOAP_UDP_ERROR      UDP, and more than 65536 bytes were counted
//   SOAP_ZLIB_ERROR     compression can't start
//   SOAP_FATAL_ERROR    the system has no randomness for a MIME boundary
//   returns             otherwise the result of on_send_prepare_begin
ZUV_API int soap_send_begin(soap *ctx);

// What soap_send_bytes calls when callbacks are set, or when the buffer is full or not used.
//   data     `length` bytes
//   length   bytes
//   SOAP_OK
//   returns  otherwise an error of sending
ZUV_API int soap_send_bytes_slow(soap *ctx, const char *data, std::size_t length);

// The one function through which all output passes: counts, stores or sends. Called during a counting pass or
// during sending.
//   data     `length` bytes
//   length   bytes
//   SOAP_OK
//   returns  otherwise an error of sending
inline int soap_send_bytes(soap *ctx, const char *data, std::size_t length)
{
    if (length == 0)
        return 0;
    if (ctx->on_send_filter == nullptr) {
        if ((ctx->mode & MODE_COUNTING) != 0) {
            if (ctx->on_send_prepare == nullptr) {
                ctx->message_count += length;
                if (length <= ctx->store_space) {
                    std::memcpy(ctx->store_end, data, length);
                    ctx->store_end += length;
                    ctx->store_space -= length;
                }
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
//   text     not null
//   SOAP_OK
//   returns  otherwise an error of sending
inline int soap_send_text(soap *ctx, const char *text)
{
    return soap_send_bytes(ctx, text, std::strlen(text));
}

// soap_send_bytes, then 0 to 3 zero bytes up to a multiple of four.
//   data     `length` bytes
//   length   bytes
//   SOAP_OK
//   returns  otherwise an error of sending
ZUV_API int soap_send_padded(soap *ctx, const char *data, std::size_t length);

// Sends what is in the buffer, through compression; nothing if it is empty.
//   SOAP_OK
//   returns  otherwise an error of sending
ZUV_API int soap_send_flush(soap *ctx);

// The stage after compression: stores the bytes, or frames, logs and sends them.
//   data     `length` bytes
//   length   bytes
//   SOAP_OK
//   returns  otherwise SOAP_OUT_OF_MEMORY, SOAP_LENGTH (max_memory) or the result of on_send
ZUV_API int soap_send_through(soap *ctx, const char *data, std::size_t length);

// Ends the message: attachments, the rest of the buffer, the end of compression, the last chunk, or a stored
// message with its head. Whatever the result, no compression runs and no stored message is left. Called once,
// after the writers.
//   SOAP_OK
//   returns  otherwise the first error of sending, of the attachments (soap_dime_attachments_write,
//            soap_mime_attachments_write) or of on_send_prepare_end
ZUV_API int soap_send_finish(soap *ctx);

// Length of the message: counted bytes and those of the attachments. Called after soap_count_end.
//   returns  bytes, the number for Content-Length
ZUV_API std::uint64_t soap_message_length(soap *ctx);

// --- input ---
//
// Errors of receiving, which all functions can give that read bytes: SOAP_EOF (the end of input; errno_value
// holds the system's reason, 0 at a plain end or when a time limit has passed), SOAP_HEADER_LINE (a chunk's
// size line over 8192 bytes), SOAP_ZLIB_ERROR, SOAP_LENGTH (a limit, see above), SOAP_CORRUPTION
// (on_recv_filter claims more than its buffer holds), SOAP_DIME_VERSION and SOAP_DIME_ERROR (chunks of a DIME
// record), and those of on_recv_prepare and on_recv_filter.

// Starts a message: forgets the one before (header, fault, ids, namespaces received), finds out whether it
// has an HTTP head (read by on_read_head), and sets up chunks, decompression and attachments. Called after a
// request was sent, or by a service for the next one.
//   SOAP_OK
//   SOAP_NO_DATA        a status 200 without a body
//   SOAP_OUT_OF_MEMORY
//   SOAP_HEADER_LINE    more than 1 MB of blanks before the message
//   SOAP_MIME_ERROR     the part that holds the message is missing, or a boundary is wrong
//   SOAP_DIME_ERROR     the first record doesn't begin a message
//   SOAP_UTF_ERROR      UTF-16
//   SOAP_STOP           the head was all there was: the exchange is complete
//   returns             otherwise an error of receiving, the HTTP status of a head without a body, or the
//                       result of on_read_head or another callback
ZUV_API int soap_receive_begin(soap *ctx);

// What soap_recv_byte calls when a byte was pushed back or the buffer is empty.
//   returns   the byte, 0 to 255
//   SOAP_EOF  end of input; ctx->error says why, SOAP_OK at a plain end
ZUV_API std::int32_t soap_recv_byte_slow(soap *ctx);

// The next byte of the message. Called during receiving, as are all functions below.
//   returns   the byte, 0 to 255
//   SOAP_EOF  end of input; ctx->error says why, SOAP_OK at a plain end
inline std::int32_t soap_recv_byte(soap *ctx)
{
    if (ctx->look_ahead == 0 && ctx->buffer_index < ctx->buffer_length)
        return static_cast<unsigned char>(ctx->buffer[ctx->buffer_index++]);
    return soap_recv_byte_slow(ctx);
}

// Drops what is left in the buffer and fills it once, with framing and compression undone.
//   SOAP_OK    at least one byte is at buffer_index
//   SOAP_EOF   end of input
//   1          end of input
//   returns    otherwise an error of receiving
ZUV_API int soap_recv_refill(soap *ctx);

// As soap_recv_refill, with on_recv_filter and the chunks of a DIME record undone: what readers use.
//   SOAP_OK    at least one byte is at buffer_index
//   SOAP_EOF   end of input
//   1          end of input
//   returns    otherwise an error of receiving
ZUV_API int soap_recv_more(soap *ctx);

// Drops bytes.
//   count     bytes
//   SOAP_OK
//   SOAP_EOF  the input ended before; ctx->error says why, SOAP_OK at a plain end
ZUV_API int soap_recv_skip(soap *ctx, std::size_t count);

// Drops the 9 bytes of a gzip header that follow its first.
//   SOAP_OK
//   SOAP_ZLIB_ERROR  end of input
ZUV_API int soap_gzip_skip_header(soap *ctx);

// Reads one header line; folded lines are joined, with the blank that began the next line.
//   text              takes the line, terminated, also on failure
//   size              bytes in `text`, terminator included
//   SOAP_OK
//   SOAP_HEADER_LINE  the line is too long
//   returns           otherwise an error of receiving
ZUV_API int soap_recv_line(soap *ctx, char *text, std::size_t size);

// Reads bytes and drops 0 to 3 bytes of padding after them, up to a multiple of four. Memory grows with the
// bytes that really arrive.
//   length   bytes
//   returns  a managed block with the bytes and a terminator
//   null     SOAP_OUT_OF_MEMORY or an error of receiving, in ctx->error
ZUV_API char *soap_recv_bytes_block(soap *ctx, std::size_t length);

// Ends the message: reads remaining attachments, ends decompression, checks the gzip trailer, reads to the
// last chunk, resolves references. Clears soap::response_unfinished only if the message was read exactly to
// its end, by chunks or by Content-Length. With MODE_MIME_AFTER the remaining parts are left for
// soap_mime_next_part.
//   SOAP_OK
//   SOAP_ZLIB_ERROR  also for a compressed stream that was cut short
//   SOAP_DIME_HREF   a value's attachment is missing
//   SOAP_MIME_HREF   the same in MTOM
//   SOAP_MISSING_ID  a reference to an id that the message lacks
//   returns          otherwise an error of receiving, of the attachments (soap_dime_attachments_read,
//                    soap_mime_part_read), of soap_forward_resolve, or the result of on_recv_prepare_end
ZUV_API int soap_receive_finish(soap *ctx);
