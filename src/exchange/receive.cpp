// receive.cpp - a message on its way in, as a whole: begun, its form recognised, its attachments taken,
// ended.
//
// Elsewhere: its bytes (core/buffered_in.cpp), heads (net/http_read.cpp, called through on_read_head),
// attachments (attachments), the elements of the envelope (envelope.cpp).
#include <openssl/err.h>

#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_xml.h>

#include "attachments/dime.h"
#include "attachments/mime.h"
#include "core/buffered_in.h"
#include "core/failure.h"
#include "core/inflate_in.h"
#include "core/limits.h"
#include "core/raw_in.h"
#include "core/text_encoding.h"
#include "core/zlib_common.h"
#include "exchange/context.h"

namespace {

constexpr std::int32_t END = -1;
constexpr std::int32_t GZIP_FIRST_BYTE = 0x1F;
constexpr std::size_t BLANKS_MAX = std::size_t{1024} * 1024; // before a head or a message without one
constexpr std::int32_t HIGH_OF_TRUNCATED_MARK = 0xFEC0;

// ---------------------------------------------------------------------------------------------
// Begin.

void forget_attachments(soap *ctx)
{
    ctx->dime = {};
    ctx->mime = {};
    ctx->attachment_stage = nullptr;
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
    return first >= 12 && first <= 15 && (input_peek_byte(ctx) & 0xF0) == 0x20;
}

// The byte c, or if it is blank the first after it that isn't. Blanks without end are refused like a head
// without end.
std::int32_t skip_blanks(soap *ctx, std::int32_t c)
{
    for (std::size_t left = BLANKS_MAX; c >= 0 && c <= ' '; c = soap_recv_byte(ctx)) {
        if (left-- == 0) {
            fail(ctx, SOAP_HEADER_LINE);
            return END;
        }
    }
    return c;
}

// A UTF-8 mark, whose first byte was read, is dropped, and the blanks after it. The byte that follows, or
// what is left of a false mark.
std::int32_t skip_utf8_mark(soap *ctx)
{
    if (input_peek_byte(ctx) != 0xBB)
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
    if (begins_dime(ctx, c)) { // before blanks, of which its first byte would be one
        ctx->mode |= MODE_DIME;
        ctx->look_ahead = c;
        return SOAP_OK;
    }
    c = skip_blanks(ctx, c);
    if (c == '-' && input_peek_byte(ctx) == '-')
        ctx->mode |= MODE_MIME;
    else if (c == 0xEF)
        c = skip_utf8_mark(ctx);
    else if ((c == 0xFE && input_peek_byte(ctx) == 0xFF) || (c == 0xFF && input_peek_byte(ctx) == 0xFE))
        return fail(ctx, SOAP_UTF_ERROR);
    ctx->look_ahead = c;
    return c == END ? fail_at_end(ctx) : SOAP_OK;
}

// The result of the head reader. ctx->input_mode holds what the head announced afterwards.
int read_head(soap *ctx)
{
    ctx->mode &= ~MODE_IO_MASK;
    return ctx->on_read_head != nullptr ? ctx->on_read_head(ctx) : SOAP_OK;
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
// End.

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
    soap_prefix_stack_reset(ctx);
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
    const bool headless = ctx->look_ahead == '<' || (ctx->mode & (MODE_DEFLATE | MODE_MIME | MODE_DIME)) != 0;
    if ((headless ? show_first_bytes(ctx, early) : begin_http(ctx, informative)) != SOAP_OK)
        return ctx->error;
    if (informative != SOAP_OK)
        return end_informatively(ctx, informative);
    if (input_limits_check(ctx) != SOAP_OK) // of the bytes that came with the head
        return ctx->error;
    if ((ctx->mode & MODE_MIME) != 0 && mime_message_begin(ctx) != SOAP_OK)
        return ctx->error;
    if ((ctx->mode & MODE_DIME) != 0 && dime_message_begin(ctx) != SOAP_OK)
        return ctx->error;
    return SOAP_OK;
}

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
    if (body_close(ctx) != SOAP_OK)
        return ctx->error;
    return finish_references(ctx);
}

soap_attachment *soap_mime_next_part(soap *ctx)
{
    if ((ctx->mode & MODE_MIME) == 0)
        return nullptr;
    soap_attachment *part = soap_mime_part_read(ctx, nullptr);
    if (part != nullptr && part == ctx->mime.root)
        part = soap_mime_part_read(ctx, nullptr); // null if the message is the only part
    if (ctx->error == SOAP_OK && (ctx->mode & MODE_MIME) != 0)
        return part;
    if (ctx->error == SOAP_OK)
        soap_receive_finish(ctx);
    ctx->mode &= ~MODE_MIME;
    if (ctx->keep_alive < 0)
        ctx->keep_alive = 0; // the connection was only held for the parts
    return soap_socket_release(ctx) == SOAP_OK ? part : nullptr;
}
