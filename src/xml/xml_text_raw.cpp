// xml_text_raw.cpp - the content of an element unchanged: raw XML in a byte string.
//
// Here: the states that separate text from CDATA sections, comments and instructions. Elsewhere: decoded text
// (xml_text.cpp).
//
// Always: references stay references, but for those of no character; bytes from 128 on are decoded, but
// inside CDATA only if they would not be of the string's encoding otherwise.
#include <cstring>
#include <string_view>

#include <zuv_client_pro/soap_error.h>

#include "core/failure.h"
#include "xml/xml_read.h"
#include "xml/xml_scan.h"
#include "xml/xml_text.h"

namespace {

// Appends to scratch_text as long as two bytes stay free for the end of the tag.
void append(soap *ctx, std::size_t *length, std::string_view text)
{
    const std::size_t space = SOAP_TEXT_SIZE - 3 - *length;
    std::size_t taken = text.size();
    if (taken > space)
        taken = (ctx->mode & MODE_UTF_STRINGS) != 0 ? utf8_whole(text.data(), space) : space;
    std::memcpy(ctx->scratch_text + *length, text.data(), taken);
    *length += taken;
}

// Names are UTF-8 in every mode.
void append_name(soap *ctx, std::size_t *length, const char *name)
{
    char text[SOAP_TEXT_SIZE] = "";
    const std::string_view whole = name;
    if ((ctx->mode & MODE_UTF_STRINGS) != 0)
        return append(ctx, length, whole);
    append(ctx, length, {text, utf8_to_latin1(text, whole.copy(text, sizeof text))});
}

std::size_t rebuild_tag(soap *ctx)
{
    std::size_t length = 0;
    append(ctx, &length, "<");
    append_name(ctx, &length, ctx->tag);
    const soap_attribute *first = ctx->attributes_set != 0 ? ctx->attribute_list : nullptr;
    for (const soap_attribute *p = first; p != nullptr; p = p->next) {
        if (p->visible == 0)
            continue;
        append(ctx, &length, " ");
        append_name(ctx, &length, p->name);
        if (p->visible != 2 || p->value == nullptr)
            continue;
        append(ctx, &length, "=\"");
        append(ctx, &length, p->value);
        append(ctx, &length, "\"");
    }
    if (ctx->has_body == 0)
        ctx->scratch_text[length++] = '/';
    ctx->scratch_text[length++] = '>';
    return length;
}

// Characters of UTF-8 have one byte each that doesn't go on from another.
std::uint64_t characters(const soap *ctx, const char *text, std::size_t length)
{
    if ((ctx->mode & MODE_UTF_STRINGS) == 0)
        return length;
    std::uint64_t count = 0;
    for (std::size_t i = 0; i < length; ++i)
        count += static_cast<std::size_t>((static_cast<unsigned char>(text[i]) & 0xC0) != 0x80);
    return count;
}

} // namespace

text_depth text_take_held_tag(soap *ctx, std::size_t *length)
{
    const bool held = ctx->peeked != 0 && ctx->tag[0] != '\0';
    ctx->peeked = 0;
    *length = held ? rebuild_tag(ctx) : 0;
    return text_depth(held, held && ctx->has_body != 0);
}

bool text_depth::ends_at(std::int32_t token)
{
    if (token == XML_EOF)
        return true;
    if (quote_ != 0) {
        if (token == quote_)
            quote_ = 0;
        return false;
    }
    if (token == XML_END) {
        if (open_ == 0)
            return true;
        --open_;
        in_tag_ = true;
        start_tag_ = false;
    } else if (token == XML_START) {
        if (held_ && open_ == 0)
            return true;
        ++open_;
        in_tag_ = true;
        start_tag_ = true;
    } else if (in_tag_) {
        tag_token(token);
    }
    last_ = is_blank(token) ? last_ : token;
    return false;
}

void text_depth::tag_token(std::int32_t token)
{
    if (token == XML_GT) {
        if (start_tag_ && last_ == '/' && open_ != 0)
            --open_;
        in_tag_ = false;
    } else if ((token == XML_QUOTE || token == XML_APOS) && last_ == '=') {
        quote_ = token;
    }
}

int text_limits_check(soap *ctx, text_limits &limits)
{
    if (limits.maximum < 0 && limits.minimum <= 0)
        return SOAP_OK;
    if (ctx->label_index > limits.counted)
        limits.count +=
            characters(ctx, ctx->label_buffer + limits.counted, ctx->label_index - limits.counted);
    limits.counted = ctx->label_index;
    if (limits.maximum >= 0 && limits.count > static_cast<std::uint64_t>(limits.maximum))
        return fail(ctx, SOAP_LENGTH);
    return SOAP_OK;
}

int text_limits_finish(soap *ctx, text_limits &limits)
{
    if (text_limits_check(ctx, limits) != 0)
        return ctx->error;
    if (limits.minimum > 0 && limits.count < static_cast<std::uint64_t>(limits.minimum))
        return fail(ctx, SOAP_LENGTH);
    return SOAP_OK;
}

namespace {

// Each construct ends with a run of marks and a ">"; the members after the first count the marks seen.
enum class raw_state {
    content,
    cdata,
    cdata_bracket,
    cdata_brackets,
    comment,
    comment_dash,
    comment_dashes,
    instruction,
    instruction_mark,
};

constexpr char CDATA_HEAD[] = "<![CDATA[";

bool in_cdata(raw_state state)
{
    return state >= raw_state::cdata && state <= raw_state::cdata_brackets;
}

raw_state next_state(raw_state state, std::int32_t byte)
{
    switch (state) {
    case raw_state::content:
        return state;
    case raw_state::cdata:
        return byte == ']' ? raw_state::cdata_bracket : state;
    case raw_state::cdata_bracket:
        return byte == ']' ? raw_state::cdata_brackets : raw_state::cdata;
    case raw_state::cdata_brackets:
        return byte == '>' ? raw_state::content : byte == ']' ? state : raw_state::cdata;
    case raw_state::comment:
        return byte == '-' ? raw_state::comment_dash : state;
    case raw_state::comment_dash:
        return byte == '-' ? raw_state::comment_dashes : raw_state::comment;
    case raw_state::comment_dashes:
        return byte == '>' ? raw_state::content : byte == '-' ? state : raw_state::comment;
    case raw_state::instruction:
        return byte == '?' ? raw_state::instruction_mark : state;
    case raw_state::instruction_mark:
        return byte == '>' ? raw_state::content : byte == '?' ? state : raw_state::instruction;
    }
    return state;
}

int put_text(soap *ctx, const char *text)
{
    return text_put(ctx, text, std::strlen(text));
}

// A character, unless reading has come to its end.
int put_token(soap *ctx, std::int32_t token)
{
    return token == XML_EOF ? ctx->error : text_put_code(ctx, token_code(token));
}

// A character from a reference or a decoded sequence: markup goes back to a reference.
int put_decoded(soap *ctx, std::uint32_t code)
{
    switch (code) {
    case '<':
        return put_text(ctx, "&lt;");
    case '>':
        return put_text(ctx, "&gt;");
    case '&':
        return put_text(ctx, "&amp;");
    case '"':
        return put_text(ctx, "&quot;");
    default:
        return text_put_code(ctx, code);
    }
}

// A byte inside text, a tag or a construct. Only the last one read is given back, so that it is still there.
int put_raw(soap *ctx, raw_state state, std::int32_t byte)
{
    const std::uint32_t bytes = ctx->mode & BYTE_MODES;
    const char c = static_cast<char>(byte);
    if (is_control(c))
        return put_token(ctx, xml_no_character(ctx, SOAP_SYNTAX_ERROR));
    if (byte < 0x80 || bytes == MODE_LATIN1 || (bytes == 0 && in_cdata(state)))
        return text_put(ctx, &c, 1);
    ctx->look_ahead = byte;
    return put_token(ctx, soap_char_next_utf8(ctx));
}

// The text after an "&" is copied, unless it is the number of no character.
int copy_reference(soap *ctx)
{
    xml_reference reference;
    const std::int32_t code = xml_reference_read(ctx, reference);
    if (xml_is_refused(ctx))
        return ctx->error;
    if (code == '?')
        return text_put(ctx, "?", 1);
    return text_put(ctx, "&", 1) != 0 ? ctx->error : text_put(ctx, reference.text, reference.length);
}

std::int32_t skip_to_bracket(soap *ctx)
{
    std::int32_t byte;
    do
        byte = soap_recv_byte(ctx);
    while (byte != '[' && byte != XML_EOF);
    return byte;
}

// After "<!": a section, a comment or anything else.
int open_declaration(soap *ctx, raw_state &state)
{
    std::int32_t byte = soap_recv_byte(ctx);
    if (byte == '[') {
        state = raw_state::cdata;
        if (skip_to_bracket(ctx) == XML_EOF)
            ctx->look_ahead = XML_EOF;
        return put_text(ctx, CDATA_HEAD);
    }
    if (byte != '-') {
        input_unread(ctx, byte);
        return put_text(ctx, "<!");
    }
    byte = soap_recv_byte(ctx);
    if (byte != '-') {
        input_unread(ctx, byte);
        return put_text(ctx, "<!-");
    }
    state = raw_state::comment;
    return put_text(ctx, "<!--");
}

// The token of a byte or pushed-back token of the content state; a construct's head and a reference are
// copied and give XML_SKIPPED.
std::int32_t content_token(soap *ctx, std::int32_t byte, bool in_quotes, raw_state &state, int *error)
{
    switch (byte) {
    case '>':
        return XML_GT;
    case '"':
        return XML_QUOTE;
    case '\'':
        return XML_APOS;
    case '&':
        *error = copy_reference(ctx);
        return XML_SKIPPED;
    case '<':
        break;
    default:
        return byte;
    }
    if (in_quotes)
        return byte;
    const std::int32_t next = soap_recv_byte(ctx);
    switch (next) {
    case XML_EOF:
        ctx->look_ahead = XML_EOF;
        return XML_EOF;
    case '/':
        return XML_END;
    case '!':
        *error = open_declaration(ctx, state);
        return XML_SKIPPED;
    case '?':
        state = raw_state::instruction;
        *error = put_text(ctx, "<?");
        return XML_SKIPPED;
    default:
        input_unread(ctx, next);
        return XML_START;
    }
}

int gather_plain(soap *ctx)
{
    if (ctx->look_ahead != 0 || !input_ready(ctx))
        return SOAP_OK;
    const char *here = input_here(ctx);
    const char *stop = stretch_end<markup_stop>(ctx, here, input_end(ctx));
    input_consume(ctx, stop);
    return text_put(ctx, here, static_cast<std::size_t>(stop - here));
}

int put_content(soap *ctx, std::int32_t token)
{
    if (is_reference(token))
        return put_decoded(ctx, token_code(token));
    return token >= 0 ? put_raw(ctx, raw_state::content, token) : text_put_token(ctx, token);
}

// A search for a tag may have gone into a section.
int resume_cdata(soap *ctx, raw_state &state)
{
    if (ctx->in_cdata == CDATA_OUTSIDE)
        return SOAP_OK;
    if (put_text(ctx, CDATA_HEAD) != 0)
        return ctx->error;
    state = raw_state::cdata;
    if (ctx->look_ahead < 0 && ctx->look_ahead != XML_EOF) {
        const std::uint32_t code = token_code(ctx->look_ahead);
        ctx->look_ahead = 0;
        if (text_put_code(ctx, code) != 0)
            return ctx->error;
    }
    if (ctx->in_cdata == CDATA_BRACKET_DUE) {
        state = raw_state::cdata_bracket;
        if (put_text(ctx, "]") != 0)
            return ctx->error;
    }
    ctx->in_cdata = CDATA_OUTSIDE;
    return SOAP_OK;
}

int gather_construct(soap *ctx, raw_state &state, bool *end)
{
    const std::int32_t byte = soap_recv_byte(ctx);
    *end = byte == XML_EOF;
    if (*end) {
        ctx->look_ahead = XML_EOF;
        return SOAP_OK;
    }
    const int error = put_raw(ctx, state, byte);
    state = next_state(state, byte);
    return error;
}

int gather_content(soap *ctx, text_depth &depth, raw_state &state, bool *end)
{
    if (!depth.in_tag() && gather_plain(ctx) != 0)
        return ctx->error;
    int error = 0;
    const std::int32_t token = content_token(ctx, soap_recv_byte(ctx), depth.in_quotes(), state, &error);
    if (token == XML_SKIPPED)
        return error;
    *end = depth.ends_at(token);
    if (*end) {
        ctx->look_ahead = token;
        return SOAP_OK;
    }
    return put_content(ctx, token);
}

} // namespace

int text_gather_raw(soap *ctx, text_limits &limits)
{
    std::size_t length;
    if (ctx->peeked != 0 && xml_attributes_complete(ctx) != 0)
        return ctx->error;
    text_depth depth = text_take_held_tag(ctx, &length);
    raw_state state = raw_state::content;
    ctx->label_index = 0;
    if (text_put(ctx, ctx->scratch_text, length) != 0 || resume_cdata(ctx, state) != 0)
        return ctx->error;
    for (bool end = false; !end;) {
        const int error = state == raw_state::content ? gather_content(ctx, depth, state, &end)
                                                      : gather_construct(ctx, state, &end);
        if (error != 0 || text_limits_check(ctx, limits) != 0)
            return ctx->error;
    }
    return text_limits_finish(ctx, limits);
}
