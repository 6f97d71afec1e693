// buffered_in.cpp - a message on its way in: its start recognised, its bytes handed out, its end checked.
//
// Elsewhere: raw bytes and chunks (raw_in.cpp), decompression (inflate_in.cpp), header lines (recv_line.cpp),
// heads (transport's http_read.cpp, called through on_read_head), attachments (codec).
//
// The stages of a byte: on_recv -> [chunks] -> [decompression] -> buffer -> [on_recv_filter] -> [DIME chunks]
// -> soap_recv_byte. Always: buffer_index <= buffer_length <= SOAP_BUFFER_SIZE; the end of input, once met,
// stays.
#include <algorithm>
#include <cstring>

#include <openssl/err.h>

#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_xml.h>

#include "attachments/dime_chunks.h"
#include "core/buffered_in.h"
#include "core/inflate_in.h"
#include "core/limits.h"
#include "core/raw_in.h"
#include "core/scratch.h"
#include "core/text_encoding.h"
#include "core/zlib_common.h"

namespace {

constexpr std::int32_t END = -1;
constexpr std::int32_t GZIP_FIRST_BYTE = 0x1F;
constexpr std::size_t GZIP_HEAD_REST = 9;                    // bytes behind the first
constexpr std::size_t BLOCK_STEP = 65536;                    // bytes by which a block of announced size grows
constexpr std::size_t BLANKS_MAX = std::size_t{1024} * 1024; // ahead of a head or a bare message
constexpr unsigned DIME_MESSAGE_BEGIN = 4;                   // flag of a message's first record
constexpr std::int32_t HIGH_OF_TRUNCATED_MARK = 0xFEC0;

// The next byte without using it, or -1.
std::int32_t peek_byte(soap *ctx)
{
    if (ctx->look_ahead != 0)
        return ctx->look_ahead;
    if (ctx->buffer_index >= ctx->buffer_length && soap_recv_more(ctx) != SOAP_OK)
        return ctx->look_ahead = END;
    return static_cast<unsigned char>(ctx->buffer[ctx->buffer_index]);
}

int fail_at_end(soap *ctx)
{
    return ctx->error = ctx->error == SOAP_OK ? SOAP_EOF : ctx->error;
}

// The unread bytes at hand, at most `most`; 0 at the end of input.
std::size_t stretch(soap *ctx, std::size_t most)
{
    if (peek_byte(ctx) == END)
        return 0;
    return std::min(most, ctx->buffer_length - ctx->buffer_index);
}

// ---------------------------------------------------------------------------------------------
// Start of a message.

void forget_attachments(soap *ctx)
{
    ctx->dime = {};
    ctx->mime = {};
}

int prepare_start(soap *ctx)
{
    ctx->error = SOAP_OK;
    ctx->filter_stop = 0;
    soap_call_scratch_free(ctx);
    limits_reset(ctx);
    if (soap_namespace_table_copy(ctx) != SOAP_OK)
        return ctx->error;
    ctx->soap_version = 0;
    // A kept connection goes on in chunks once the peer has used them.
    if ((ctx->input_mode & MODE_IO_MASK) == MODE_CHUNKED)
        ctx->output_mode |= MODE_CHUNKED;
    ctx->input_mode &= ~(MODE_IO_MASK | MODE_MIME);
    soap_zlib_drop(ctx);
    ctx->mode = ctx->input_mode & ~MODE_DEFLATE;
    if (ctx->keep_alive == 0)
        ctx->buffer_index = ctx->buffer_length = 0;
    if ((ctx->mode & MODE_KEEP_ALIVE) == 0)
        ctx->keep_alive = 0;
    ctx->response_unfinished = true;
    ctx->endpoint[0] = '\0';
    ctx->look_ahead = 0;
    ctx->status = 0;
    ctx->message_count = 0;
    soap_raw_reset(ctx);
    ctx->plain_received = ctx->buffer_length - ctx->buffer_index;
    soap_element_state_reset(ctx);
    forget_attachments(ctx);
    ctx->zlib_in = ctx->zlib_out = 0;
    ctx->zlib_ratio_in = 1.0F;
    ctx->action = nullptr;
    ctx->header = nullptr;
    ctx->fault = nullptr;
    if (ctx->tls_connection != nullptr)
        ERR_clear_error();
    if (ctx->on_recv_prepare_begin != nullptr)
        return ctx->error = ctx->on_recv_prepare_begin(ctx);
    return SOAP_OK;
}

// The first byte of a gzip stream, which no HTTP head precedes, was read.
int begin_bare_gzip(soap *ctx)
{
    if (soap_gzip_skip_header(ctx) != SOAP_OK)
        return ctx->error;
    ctx->zlib_in = ENCODING_GZIP;
    return soap_inflate_begin(ctx, ZLIB_RAW);
}

bool begins_dime(soap *ctx, std::int32_t first)
{
    return first >= 12 && first <= 15 && (peek_byte(ctx) & 0xF0) == 0x20;
}

// The byte c, or if it is blank the first behind it that isn't. Blanks without end are refused like a head
// without end.
std::int32_t skip_blanks(soap *ctx, std::int32_t c)
{
    for (std::size_t left = BLANKS_MAX; c >= 0 && c <= ' '; c = soap_recv_byte(ctx)) {
        if (left-- == 0) {
            ctx->error = SOAP_HEADER_LINE;
            return END;
        }
    }
    return c;
}

// A UTF-8 mark, whose first byte was read, is dropped, and the blanks behind it. The byte that follows, or
// what is left of a false mark.
std::int32_t skip_utf8_mark(soap *ctx)
{
    if (peek_byte(ctx) != 0xBB)
        return 0xEF;
    soap_recv_byte(ctx);
    const std::int32_t third = soap_recv_byte(ctx);
    if (third == END)
        return END;
    if (third != 0xBF)
        return third | HIGH_OF_TRUNCATED_MARK;
    ctx->mode &= ~ENCODING_MODES;
    return skip_blanks(ctx, soap_recv_byte(ctx));
}

// Finds out by the first bytes what comes, and leaves the first that counts in look_ahead.
int recognise_start(soap *ctx)
{
    std::int32_t c = soap_recv_byte(ctx);
    if (c == GZIP_FIRST_BYTE) {
        if (begin_bare_gzip(ctx) != SOAP_OK)
            return ctx->error;
        c = soap_recv_byte(ctx);
    }
    if (begins_dime(ctx, c)) { // ahead of blanks, of which its first byte would be one
        ctx->mode |= MODE_DIME;
        ctx->look_ahead = c;
        return SOAP_OK;
    }
    c = skip_blanks(ctx, c);
    if (c == '-' && peek_byte(ctx) == '-')
        ctx->mode |= MODE_MIME;
    else if (c == 0xEF)
        c = skip_utf8_mark(ctx);
    else if ((c == 0xFE && peek_byte(ctx) == 0xFF) || (c == 0xFF && peek_byte(ctx) == 0xFE))
        return ctx->error = SOAP_UTF_ERROR;
    ctx->look_ahead = c;
    return c == END ? fail_at_end(ctx) : SOAP_OK;
}

// The result of the head reader. ctx->input_mode holds what the head announced afterwards.
int read_head(soap *ctx)
{
    ctx->mode &= ~MODE_IO_MASK;
    return ctx->on_read_head != nullptr ? ctx->on_read_head(ctx) : SOAP_OK;
}

// There is a first byte.
int begin_announced_compression(soap *ctx)
{
    if (ctx->zlib_in == 0)
        return SOAP_OK;
    const std::int32_t first = soap_recv_byte(ctx);
    if (ctx->zlib_in == ENCODING_GZIP && first == GZIP_FIRST_BYTE) {
        if (soap_gzip_skip_header(ctx) != SOAP_OK)
            return ctx->error;
        return soap_inflate_begin(ctx, ZLIB_RAW);
    }
    ctx->zlib_in = ENCODING_DEFLATE; // some peers name one and send the other
    peek_byte(ctx);                  // the second byte is looked at too
    return soap_inflate_begin_deflate(ctx, static_cast<std::uint8_t>(first));
}

int no_body(soap *ctx)
{
    if (ctx->error != SOAP_OK)
        return ctx->error;
    if (ctx->status == 200)
        return ctx->error = SOAP_NO_DATA;
    return ctx->error = ctx->status != 0 ? ctx->status : SOAP_EOF;
}

// From here on on_recv_prepare sees each refill; what is at hand already is shown now, from `start` on.
int show_first_bytes(soap *ctx, std::size_t start)
{
    ctx->prepare_held = false;
    if (ctx->on_recv_prepare == nullptr || start >= ctx->buffer_length)
        return SOAP_OK;
    return ctx->error = ctx->on_recv_prepare(ctx, ctx->buffer + start, ctx->buffer_length - start);
}

// Head and body of an HTTP message. The head reader's informative result goes to `informative`.
int begin_http(soap *ctx, int &informative)
{
    const std::uint32_t input_mode = ctx->input_mode;
    const int result = read_head(ctx);
    if (result != SOAP_OK && result <= SOAP_STOP) {
        ctx->input_mode = input_mode;
        if (result != SOAP_STOP)
            ctx->keep_alive = 0;
        return ctx->error = result;
    }
    informative = result;
    ctx->error = SOAP_OK;
    const int opened = soap_body_open(ctx);
    ctx->input_mode = input_mode;
    if (opened != SOAP_OK)
        return opened;
    return ctx->prepare_held ? show_first_bytes(ctx, ctx->buffer_index) : SOAP_OK;
}

int end_informatively(soap *ctx, int informative)
{
    if (informative != SOAP_FORM || ctx->on_form == nullptr)
        return ctx->error = informative;
    const int result = ctx->on_form(ctx);
    return ctx->error = result != SOAP_OK ? result : SOAP_STOP;
}

// ---------------------------------------------------------------------------------------------
// Attachments at the start.

// Drops what stands ahead of the first line that begins with "--".
int skip_to_boundary(soap *ctx)
{
    bool line_start = true;
    for (;;) {
        const std::int32_t c = soap_recv_byte(ctx);
        if (c == END)
            return fail_at_end(ctx);
        if (c == '-' && line_start && peek_byte(ctx) == '-') {
            ctx->look_ahead = c;
            return SOAP_OK;
        }
        line_start = c == '\n';
    }
}

// Reads on to the part that holds the message; the parts ahead of it are kept.
int begin_mime(soap *ctx)
{
    if (skip_to_boundary(ctx) != SOAP_OK || soap_mime_part_header_read(ctx) != SOAP_OK)
        return ctx->error;
    while (ctx->mime.start != nullptr && ctx->mime.last != nullptr &&
           soap_cid_compare(ctx, ctx->mime.start, ctx->mime.last->id) != 0) {
        if (soap_mime_part_read(ctx, nullptr) == nullptr)
            break;
    }
    if (ctx->error != SOAP_OK)
        return ctx->error;
    if (ctx->mime.last == nullptr)
        return ctx->error = SOAP_MIME_ERROR;
    ctx->mime.root = ctx->mime.last;
    const char *type = ctx->mime.root->type;
    if (type != nullptr && soap_attr_value(ctx, type, "application/dime") != nullptr)
        ctx->mode |= MODE_DIME;
    if (type != nullptr && soap_attr_value(ctx, type, "application/xop+xml") != nullptr)
        ctx->mode |= MODE_MTOM;
    text_encoding_by_type(ctx, type, ctx->mode);
    return SOAP_OK;
}

int begin_dime(soap *ctx)
{
    if (soap_dime_header_read(ctx) != SOAP_OK)
        return ctx->error;
    if ((ctx->dime.flags & DIME_MESSAGE_BEGIN) == 0)
        return ctx->error = SOAP_DIME_ERROR;
    soap_dime_data_begin(ctx);
    return SOAP_OK;
}

// ---------------------------------------------------------------------------------------------
// End of a message.

int finish_framing(soap *ctx)
{
    if ((ctx->mode & MODE_DEFLATE) != 0 && soap_inflate_finish(ctx) != SOAP_OK)
        return ctx->error;
    if (soap_input_is_chunked(ctx)) {
        int result = SOAP_OK;
        while (result == SOAP_OK && !ctx->body_ended)
            result = soap_recv_refill(ctx);
        ctx->look_ahead = END;
        if (result > 1)
            return ctx->error = result;
    }
    if (ctx->exceeded == nullptr && soap_raw_consumed(ctx)) {
        ctx->buffer_index = ctx->buffer_length = 0;
        ctx->response_unfinished = false;
    }
    return SOAP_OK;
}

// The last chance to find the message too large: what the references led to counts too.
int resolve(soap *ctx)
{
    const int result = soap_forward_resolve(ctx);
    return result != SOAP_OK ? result : input_limits_check(ctx);
}

int finish_references(soap *ctx)
{
    if (resolve(ctx) != SOAP_OK)
        return ctx->error;
    if (ctx->mtom_list != nullptr)
        return ctx->error = (ctx->mode & MODE_MTOM) != 0 ? SOAP_MIME_HREF : SOAP_DIME_HREF;
    soap_prefix_list_free(ctx);
    if (ctx->on_recv_prepare_end != nullptr)
        return ctx->error = ctx->on_recv_prepare_end(ctx);
    return SOAP_OK;
}

} // namespace

int soap_receive_begin(soap *ctx)
{
    // Bytes that are in the buffer already belong to this message; after a refill it begins at 0.
    const std::size_t early =
        ctx->keep_alive != 0 && ctx->buffer_index < ctx->buffer_length ? ctx->buffer_index : 0;
    if (prepare_start(ctx) != SOAP_OK)
        return ctx->error;
    if (recognise_start(ctx) != SOAP_OK) {
        ctx->keep_alive = 0;
        return ctx->error;
    }
    int informative = SOAP_OK;
    const bool bare = ctx->look_ahead == '<' || (ctx->mode & (MODE_DEFLATE | MODE_MIME | MODE_DIME)) != 0;
    if ((bare ? show_first_bytes(ctx, early) : begin_http(ctx, informative)) != SOAP_OK)
        return ctx->error;
    if (informative != SOAP_OK)
        return end_informatively(ctx, informative);
    if (input_limits_check(ctx) != SOAP_OK) // of the bytes that came with the head
        return ctx->error;
    if ((ctx->mode & MODE_MIME) != 0 && begin_mime(ctx) != SOAP_OK)
        return ctx->error;
    if ((ctx->mode & MODE_DIME) != 0 && begin_dime(ctx) != SOAP_OK)
        return ctx->error;
    return SOAP_OK;
}

int soap_body_open(soap *ctx)
{
    ctx->mode = ctx->input_mode & ~MODE_DEFLATE;
    soap_raw_open_body(ctx);
    if (soap_input_is_chunked(ctx))
        ctx->prepare_held = false; // refills begin with the body
    if (peek_byte(ctx) == END)
        return no_body(ctx);
    return begin_announced_compression(ctx);
}

// ---------------------------------------------------------------------------------------------
// Bytes.

std::int32_t soap_recv_byte_slow(soap *ctx)
{
    const std::int32_t c = peek_byte(ctx);
    if (ctx->look_ahead == 0)
        ctx->buffer_index++;
    else if (c != END)
        ctx->look_ahead = 0;
    return c;
}

int soap_recv_deliver(soap *ctx)
{
    const std::size_t fresh = ctx->buffer_length - ctx->buffer_index;
    ctx->message_count += fresh;
    const bool plain = (ctx->mode & MODE_DEFLATE) != 0 || ctx->zlib_in == 0;
    if (plain)
        ctx->plain_received += fresh;
    if ((ctx->mode & MODE_DEFLATE) != 0)
        soap_log_write(ctx, SOAP_LOG_RECEIVED, ctx->buffer, ctx->buffer_length);
    if (!ctx->prepare_held && input_limits_check(ctx) != SOAP_OK) {
        ctx->buffer_index = ctx->buffer_length = 0;
        return ctx->error;
    }
    if (ctx->on_recv_prepare == nullptr || ctx->prepare_held || !plain)
        return SOAP_OK;
    const int result = ctx->on_recv_prepare(ctx, ctx->buffer + ctx->buffer_index, fresh);
    return result == SOAP_OK ? SOAP_OK : ctx->error = result;
}

int soap_recv_refill(soap *ctx)
{
    if (ctx->exceeded != nullptr) {
        ctx->buffer_index = ctx->buffer_length = 0;
        return ctx->error = SOAP_LENGTH;
    }
    if ((ctx->mode & MODE_DEFLATE) != 0)
        return soap_inflate_refill(ctx);
    const int result = soap_raw_fill(ctx);
    if (result != SOAP_OK) {
        ctx->buffer_index = ctx->buffer_length = 0;
        return result;
    }
    if (ctx->raw_aside) {
        ctx->buffer_index = 0;
        ctx->buffer_length = ctx->zlib_buffer_length - ctx->raw_index;
        std::memcpy(ctx->buffer, ctx->zlib_buffer + ctx->raw_index, ctx->buffer_length);
        ctx->raw_index = ctx->zlib_buffer_length;
    }
    return soap_recv_deliver(ctx);
}

// A filter may make more of its bytes than came, so those of later chunks must not lie behind them.
static int make_room_for_filter(soap *ctx)
{
    if (ctx->raw_aside || !soap_input_is_chunked(ctx) || (ctx->mode & MODE_DEFLATE) != 0)
        return SOAP_OK;
    if (soap_zlib_prepare(ctx) != SOAP_OK)
        return ctx->error;
    soap_raw_move_aside(ctx);
    return SOAP_OK;
}

int soap_recv_filtered(soap *ctx)
{
    // A filter works on plain text: compressed bytes, and the trailer of their stream, pass it by.
    const bool compressed = ctx->zlib_in != 0 && (ctx->mode & MODE_DEFLATE) == 0;
    while (ctx->on_recv_filter != nullptr && !compressed) {
        if (make_room_for_filter(ctx) != SOAP_OK)
            return ctx->error;
        int status = ctx->filter_stop;
        if (status != 0)
            ctx->buffer_index = ctx->buffer_length = 0;
        else
            status = soap_recv_refill(ctx);
        const int result = ctx->on_recv_filter(ctx, ctx->buffer, &ctx->buffer_length, SOAP_BUFFER_SIZE);
        if (result == SOAP_OK && ctx->buffer_length > SOAP_BUFFER_SIZE)
            ctx->error = SOAP_CORRUPTION;
        if (result != SOAP_OK)
            ctx->error = result;
        if (result != SOAP_OK || ctx->buffer_length > SOAP_BUFFER_SIZE) {
            ctx->buffer_index = ctx->buffer_length = 0;
            return ctx->error;
        }
        if (ctx->buffer_length != 0) {
            ctx->filter_stop = status;
            return SOAP_OK;
        }
        if (status != 0)
            return status;
    }
    return soap_recv_refill(ctx);
}

int soap_recv_more(soap *ctx)
{
    if (soap_dime_chunk_pending(ctx))
        return soap_dime_chunk_more(ctx);
    return soap_recv_filtered(ctx);
}

int soap_recv_skip(soap *ctx, std::size_t count)
{
    if (count != 0 && ctx->look_ahead > 0) {
        ctx->look_ahead = 0;
        --count;
    }
    while (count != 0) {
        const std::size_t length = stretch(ctx, count);
        if (length == 0)
            return END;
        ctx->buffer_index += length;
        count -= length;
    }
    return SOAP_OK;
}

int soap_gzip_skip_header(soap *ctx)
{
    return soap_recv_skip(ctx, GZIP_HEAD_REST) == SOAP_OK ? SOAP_OK : ctx->error = SOAP_ZLIB_ERROR;
}

// ---------------------------------------------------------------------------------------------
// Blocks.

// Copies `length` bytes of input. 0 or -1.
static int recv_into(soap *ctx, char *target, std::size_t length)
{
    if (length != 0 && ctx->look_ahead > 0) {
        *target++ = static_cast<char>(ctx->look_ahead);
        ctx->look_ahead = 0;
        --length;
    }
    while (length != 0) {
        const std::size_t part = stretch(ctx, length);
        if (part == 0)
            return END;
        std::memcpy(target, ctx->buffer + ctx->buffer_index, part);
        ctx->buffer_index += part;
        target += part;
        length -= part;
    }
    return SOAP_OK;
}

// Gathers the bytes in steps: a length announced and never sent costs no memory.
static int gather(soap *ctx, std::size_t length)
{
    while (length != 0) {
        const std::size_t step = std::min(length, BLOCK_STEP);
        char *place = static_cast<char *>(soap_block_stack_grow(ctx, nullptr, step));
        if (place == nullptr)
            return ctx->error;
        if (recv_into(ctx, place, step) != SOAP_OK)
            return fail_at_end(ctx);
        length -= step;
    }
    char *terminator = static_cast<char *>(soap_block_stack_grow(ctx, nullptr, 1));
    if (terminator == nullptr)
        return ctx->error;
    *terminator = '\0';
    return SOAP_OK;
}

char *soap_recv_bytes_block(soap *ctx, std::size_t length)
{
    if (soap_block_stack_push(ctx) == nullptr)
        return nullptr;
    if (gather(ctx, length) != SOAP_OK) {
        soap_block_stack_drop(ctx, nullptr);
        return nullptr;
    }
    char *block = static_cast<char *>(soap_block_stack_save(ctx, nullptr, nullptr, 0));
    if (block != nullptr && soap_recv_skip(ctx, (0 - length) & 3) != SOAP_OK) {
        fail_at_end(ctx);
        return nullptr;
    }
    return block;
}

// ---------------------------------------------------------------------------------------------
// End.

int soap_receive_finish(soap *ctx)
{
    ctx->message_part = PART_OUTSIDE;
    ctx->canonical_include = nullptr;
    ctx->canonical_exclude = nullptr;
    ctx->on_recv_filter = nullptr;
    if ((ctx->mode & MODE_DIME) != 0 && soap_dime_attachments_read(ctx) != SOAP_OK)
        return ctx->error;
    if ((ctx->mode & MODE_MIME) != 0 && (ctx->mode & MODE_MIME_AFTER) != 0) {
        if (ctx->keep_alive == 0)
            ctx->keep_alive = -1; // the parts to come need the connection
        return resolve(ctx);
    }
    if ((ctx->mode & MODE_MIME) != 0 && soap_mime_parts_read_all(ctx) != SOAP_OK)
        return ctx->error;
    if (finish_framing(ctx) != SOAP_OK)
        return ctx->error;
    return finish_references(ctx);
}
