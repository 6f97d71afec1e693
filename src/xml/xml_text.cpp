// xml_text.cpp - text of elements as byte strings.
//
// Here: text in place, gathered text, simple values. Elsewhere: raw XML (xml_text_raw.cpp), wide strings
// (xml_text_wide.cpp), whole string elements (values/string_element.cpp).
//
// Always: text runs in stretches between two special bytes; only those go through the tokens. Gathered text
// is in the growing text and is copied once to managed memory.
#include "xml/xml_text.h"
#include "xml/xml_read.h"

#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_primitive.h>

#include "core/failure.h"
#include "xml/namespace.h"
#include "xml/xml_scan.h"

namespace {

constexpr std::size_t SIMPLE_BYTES_MAX = SOAP_TEXT_SIZE - 1;

// The end of the plain stretch at the read position.
const char *plain_end(const soap *ctx, const char *here, const char *end)
{
    return ctx->in_cdata == CDATA_OUTSIDE ? text_end(ctx, here, end)
                                          : stretch_end<cdata_stop>(ctx, here, end);
}

// Copies what needs no look at single bytes.
int gather_plain(soap *ctx)
{
    if (ctx->look_ahead != 0 || ctx->in_cdata == CDATA_BRACKET_DUE || !input_ready(ctx))
        return SOAP_OK;
    const char *here = input_here(ctx);
    const char *stop = plain_end(ctx, here, input_end(ctx));
    input_consume(ctx, stop);
    return text_put(ctx, here, static_cast<std::size_t>(stop - here));
}

// Forms 1 and 2: text with references and nested markup resolved, in the growing text.
int gather_text(soap *ctx, text_limits &limits)
{
    std::size_t length;
    if (ctx->peeked != 0 && xml_attributes_complete(ctx) != 0)
        return ctx->error;
    text_depth depth = text_take_held_tag(ctx, &length);
    ctx->label_index = 0;
    if (text_put(ctx, ctx->scratch_text, length) != 0)
        return ctx->error;
    for (;;) {
        if (!depth.in_tag() && gather_plain(ctx) != 0)
            return ctx->error;
        const std::int32_t token = text_token(ctx);
        if (depth.ends_at(token)) {
            ctx->look_ahead = token;
            return xml_is_refused(ctx) ? ctx->error : text_limits_finish(ctx, limits);
        }
        if (text_put_token(ctx, token) != 0 || text_limits_check(ctx, limits) != 0)
            return ctx->error;
    }
}

bool fits(const soap *ctx, const char *text, std::size_t length, long minimum, long maximum)
{
    if (minimum <= 0 && maximum < 0)
        return true;
    std::size_t count = length;
    if ((ctx->mode & MODE_UTF_STRINGS) != 0) {
        for (std::size_t i = 0; i < length; ++i)
            count -= static_cast<std::size_t>((static_cast<unsigned char>(text[i]) & 0xC0) == 0x80);
    }
    return (minimum <= 0 || count >= static_cast<std::size_t>(minimum)) &&
           (maximum < 0 || count <= static_cast<std::size_t>(maximum));
}

bool ends_simple_value(std::int32_t token)
{
    return token == XML_EOF || token == XML_START || token == XML_END;
}

std::size_t trimmed_length(const char *text, std::size_t length)
{
    while (length != 0 && is_blank(static_cast<unsigned char>(text[length - 1])))
        --length;
    return length;
}

const char *simple_value_done(soap *ctx, std::size_t length, bool cut)
{
    if (cut && (ctx->mode & MODE_STRICT) != 0)
        return fail_null(ctx, SOAP_LENGTH);
    ctx->scratch_text[trimmed_length(ctx->scratch_text, length)] = '\0';
    return ctx->scratch_text;
}

// The bytes of a character in a byte string; `target` has six bytes.
std::size_t code_bytes(const soap *ctx, std::uint32_t code, char *target)
{
    if ((ctx->mode & MODE_UTF_STRINGS) != 0)
        return utf8_encode(code, target);
    *target = code <= 0xFF ? static_cast<char>(code) : '?';
    return 1;
}

const char *simple_value_by_tokens(soap *ctx)
{
    std::int32_t token;
    do
        token = soap_char_next_utf8(ctx);
    while (is_blank(token));
    std::size_t length = 0;
    char bytes[6];
    while (!ends_simple_value(token)) {
        const std::size_t size = code_bytes(ctx, token_code(token), bytes);
        if (size > SIMPLE_BYTES_MAX - length)
            break;
        std::memcpy(ctx->scratch_text + length, bytes, size);
        length += size;
        token = text_token(ctx);
    }
    token_push_back(ctx, token);
    return xml_is_refused(ctx) ? nullptr : simple_value_done(ctx, length, !ends_simple_value(token));
}

} // namespace

int text_put(soap *ctx, const char *text, std::size_t length)
{
    if (length == 0)
        return SOAP_OK;
    if (ctx->label_size - ctx->label_index < length && soap_text_buffer_reserve(ctx, length) != 0)
        return ctx->error;
    std::memcpy(ctx->label_buffer + ctx->label_index, text, length);
    ctx->label_index += length;
    return SOAP_OK;
}

int text_put_code(soap *ctx, std::uint32_t code)
{
    char bytes[6];
    return text_put(ctx, bytes, code_bytes(ctx, code, bytes));
}

int text_put_token(soap *ctx, std::int32_t token)
{
    if (token == XML_START)
        return text_put(ctx, "<", 1);
    if (token == XML_END)
        return text_put(ctx, "</", 2);
    return text_put_code(ctx, token_code(token));
}

bool xml_text_in_place(soap *ctx, const char **text, std::size_t *length)
{
    if (ctx->look_ahead != 0 || ctx->peeked != 0 || ctx->in_cdata != CDATA_OUTSIDE)
        return false;
    const char *here = input_here(ctx);
    const char *end = input_end(ctx);
    const char *stop = text_end(ctx, here, end);
    if (end - stop < 2 || stop[0] != '<' || stop[1] != '/')
        return false;
    *text = here;
    *length = static_cast<std::size_t>(stop - here);
    input_consume(ctx, stop);
    return true;
}

const char *soap_text_read(soap *ctx, std::size_t *length)
{
    text_limits limits{-1, -1};
    if (gather_text(ctx, limits) != 0 || text_put(ctx, "", 1) != 0)
        return nullptr;
    *length = --ctx->label_index;
    return ctx->label_buffer;
}

const char *xml_string_text(soap *ctx, int form, long minimum, long maximum, std::size_t *length)
{
    const char *text;
    if (form != 0 && xml_text_in_place(ctx, &text, length)) {
        if (fits(ctx, text, *length, minimum, maximum))
            return text;
        return fail_null(ctx, SOAP_LENGTH);
    }
    text_limits limits{minimum, maximum};
    if ((form == 0 ? text_gather_raw(ctx, limits) : gather_text(ctx, limits)) != 0)
        return nullptr;
    *length = ctx->label_index;
    return ctx->label_index != 0 ? ctx->label_buffer : "";
}

const char *soap_simple_value_read(soap *ctx)
{
    ctx->scratch_text[0] = '\0';
    if (ctx->has_body == 0)
        return ctx->scratch_text;
    const char *text;
    std::size_t length;
    if (!xml_text_in_place(ctx, &text, &length))
        return simple_value_by_tokens(ctx);
    while (length != 0 && is_blank(static_cast<unsigned char>(*text))) {
        ++text;
        --length;
    }
    const bool cut = length > SIMPLE_BYTES_MAX;
    const std::size_t kept = !cut                                  ? length
                             : (ctx->mode & MODE_UTF_STRINGS) != 0 ? utf8_whole(text, SIMPLE_BYTES_MAX)
                                                                   : SIMPLE_BYTES_MAX;
    std::memcpy(ctx->scratch_text, text, kept);
    return simple_value_done(ctx, kept, cut);
}
