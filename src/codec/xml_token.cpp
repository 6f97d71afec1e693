// xml_token.cpp - bytes to tokens: markup told from text, references and UTF-8 decoded, comments passed over.
//
// Here: the two token layers, instructions, and skipping of tags and content. Elsewhere: the names of
// references (entities.cpp), what is made of tokens (xml_read.cpp, xml_text.cpp).
//
// Always: one token can be pushed back in look_ahead; a construct may be cut by a refill at any byte.
#include "codec/xml_token.h"

#include <cstring>

#include <zuv_client_pro/soap_error.h>

#include "codec/xml_scan.h"

namespace {

constexpr std::size_t INSTRUCTION_TEXT_MAX = 63; // bytes kept of "<?...": enough for the XML declaration

// Drops bytes up to and including `mark`, which is the result; XML_EOF if it doesn't come.
std::int32_t skip_past(soap *ctx, char mark)
{
    while (input_ready(ctx)) {
        const char *here = input_here(ctx);
        const auto unread = static_cast<std::size_t>(input_end(ctx) - here);
        const void *found = std::memchr(here, mark, unread);
        if (found != nullptr) {
            input_consume(ctx, static_cast<const char *>(found) + 1);
            return mark;
        }
        input_consume(ctx, input_end(ctx));
    }
    return XML_EOF;
}

// From `byte` on, drops all up to the ">" that balances one open "<".
std::int32_t skip_balanced(soap *ctx, std::int32_t byte)
{
    for (std::uint64_t open = 1; byte != XML_EOF; byte = soap_recv_byte(ctx)) {
        if (byte == '<')
            ++open;
        else if (byte == '>' && --open == 0)
            return XML_SKIPPED;
    }
    return XML_EOF;
}

std::int32_t skip_comment(soap *ctx)
{
    std::int32_t byte = skip_past(ctx, '-');
    while (byte != XML_EOF) {
        byte = soap_recv_byte(ctx);
        if (byte == '-')
            return skip_balanced(ctx, soap_recv_byte(ctx));
        if (byte != XML_EOF)
            byte = skip_past(ctx, '-');
    }
    return XML_EOF;
}

std::int32_t skip_declaration(soap *ctx)
{
    std::int32_t byte = soap_recv_byte(ctx);
    if (byte == '[') {
        if (skip_past(ctx, '[') == XML_EOF)
            return XML_EOF;
        ctx->in_cdata = CDATA_INSIDE;
        return XML_SKIPPED;
    }
    if (byte == '-') {
        byte = soap_recv_byte(ctx);
        if (byte == '-')
            return skip_comment(ctx);
    }
    return skip_balanced(ctx, byte);
}

// An instruction ends at "?>", whatever brackets stand in it.
std::int32_t skip_instruction(soap *ctx)
{
    std::int32_t byte = soap_pi_read(ctx);
    while (byte != '>' && byte != XML_EOF)
        byte = byte == '?' ? soap_recv_byte(ctx) : skip_past(ctx, '?');
    return byte == XML_EOF ? XML_EOF : XML_SKIPPED;
}

// The next character of a CDATA section, or XML_SKIPPED at its end.
std::int32_t cdata_next(soap *ctx)
{
    std::int32_t byte = ']';
    const bool pushed_back = ctx->look_ahead != 0 && ctx->look_ahead != XML_EOF;
    if (ctx->in_cdata == CDATA_BRACKET_DUE && !pushed_back)
        ctx->in_cdata = CDATA_INSIDE;
    else
        byte = soap_recv_byte(ctx);
    if (byte != ']')
        return byte;
    byte = soap_recv_byte(ctx);
    if (byte == ']') {
        byte = soap_recv_byte(ctx);
        if (byte == '>') {
            ctx->in_cdata = CDATA_OUTSIDE;
            return XML_SKIPPED;
        }
        ctx->in_cdata = CDATA_BRACKET_DUE;
    }
    input_unread(ctx, byte);
    return ']';
}

std::int32_t content_next(soap *ctx)
{
    const std::int32_t byte = soap_recv_byte(ctx);
    switch (byte) {
    case '<':
        return xml_markup_next(ctx);
    case '>':
        return XML_GT;
    case '"':
        return XML_QUOTE;
    case '\'':
        return XML_APOS;
    case '&':
        return static_cast<std::int32_t>(static_cast<std::uint32_t>(soap_entity_read(ctx)) | XML_REFERENCE);
    default:
        return byte; // a character, or a token that was pushed back
    }
}

// Continuation bytes are taken as they come; one that the end of input swallowed counts as all ones.
std::uint32_t continuation(soap *ctx)
{
    const std::int32_t byte = soap_recv_byte(ctx);
    if (byte == XML_EOF)
        ctx->look_ahead = XML_EOF;
    return static_cast<std::uint32_t>(byte) & 0x3F;
}

void apply_declared_encoding(soap *ctx, const char *text)
{
    constexpr char key[] = " encoding=";
    const char *encoding = std::strncmp(text, "xml ", 4) == 0 ? std::strstr(text, key) : nullptr;
    if (encoding == nullptr || encoding[sizeof key - 1] == '\0')
        return;
    const char *value = encoding + sizeof key; // behind the quote
    if (soap_tag_match(value, "iso-8859-1*") == 0 || soap_tag_match(value, "latin1*") == 0)
        ctx->mode |= MODE_LATIN1;
    else if (soap_tag_match(value, "utf-8*") == 0)
        ctx->mode &= ~MODE_LATIN1;
}

} // namespace

std::int32_t xml_markup_next(soap *ctx)
{
    switch (input_skip_blanks(ctx)) {
    case XML_EOF:
        return XML_EOF;
    case '/':
        ctx->buffer_index++;
        return XML_END;
    case '!':
        ctx->buffer_index++;
        return skip_declaration(ctx);
    case '?':
        ctx->buffer_index++;
        return skip_instruction(ctx);
    case '%':
        ctx->buffer_index++;
        return skip_balanced(ctx, soap_recv_byte(ctx));
    default:
        return XML_START;
    }
}

std::int32_t soap_char_next(soap *ctx)
{
    std::int32_t token = XML_SKIPPED;
    while (token == XML_SKIPPED) {
        token = ctx->in_cdata != CDATA_OUTSIDE ? cdata_next(ctx) : content_next(ctx);
    }
    if (token == XML_EOF)
        ctx->look_ahead = XML_EOF;
    return token;
}

std::int32_t soap_char_next_utf8(soap *ctx)
{
    const std::int32_t token = soap_char_next(ctx);
    if (token < 0x80 || token > 0xFF || (ctx->mode & MODE_LATIN1) != 0)
        return token;
    const std::int32_t second = soap_recv_byte(ctx);
    if (second < 0x80 && second != XML_EOF) {
        input_unread(ctx, second);
        return token;
    }
    if (second == XML_EOF)
        ctx->look_ahead = XML_EOF;
    const auto lead = static_cast<std::uint32_t>(token);
    const int more = lead < 0xE0 ? 1 : lead < 0xF0 ? 2 : lead < 0xF8 ? 3 : lead < 0xFC ? 4 : 5;
    std::uint32_t code = lead & (more == 5 ? 0x01u : 0x3Fu >> more);
    code = (code << 6) | (static_cast<std::uint32_t>(second) & 0x3F);
    for (int i = 1; i < more; ++i)
        code = (code << 6) | continuation(ctx);
    return static_cast<std::int32_t>(code);
}

std::int32_t soap_pi_read(soap *ctx)
{
    char text[INSTRUCTION_TEXT_MAX + 1];
    std::size_t kept = 0;
    std::int32_t byte;
    while ((byte = soap_recv_byte(ctx)) != XML_EOF && byte != '?') {
        if (kept < INSTRUCTION_TEXT_MAX)
            text[kept++] = static_cast<char>(byte < ' ' ? ' ' : byte);
    }
    text[kept] = '\0';
    apply_declared_encoding(ctx, text);
    if (byte != XML_EOF)
        byte = soap_recv_byte(ctx);
    if (byte == XML_EOF)
        ctx->look_ahead = XML_EOF;
    return byte;
}

int xml_skip_tag(soap *ctx)
{
    char last = '\0'; // the last byte that is no blank
    char quote = '\0';
    while (input_ready(ctx)) {
        const char *end = input_end(ctx);
        for (const char *p = input_here(ctx); p != end; ++p) {
            if (quote != '\0') {
                if (*p == quote)
                    quote = '\0';
            } else if (*p == '>') {
                input_consume(ctx, p + 1);
                return last == '/';
            } else if ((*p == '"' || *p == '\'') && last == '=') {
                quote = *p;
            }
            if (static_cast<unsigned char>(*p) > ' ')
                last = *p;
        }
        input_consume(ctx, end);
    }
    return XML_EOF;
}

// An element begins, with content, within `depth` others that are skipped: true if it is one too many.
static bool skips_too_deep(soap *ctx, std::uint64_t depth)
{
    if (ctx->max_depth == 0 || ctx->nesting_level + depth < ctx->max_depth)
        return false;
    ctx->error = SOAP_LENGTH;
    return true;
}

int xml_skip_content(soap *ctx, std::uint64_t depth)
{
    bool too_deep = depth != 0 && skips_too_deep(ctx, depth - 1);
    for (;;) {
        std::int32_t token;
        if (too_deep)
            token = XML_EOF;
        else if (ctx->look_ahead != 0 || ctx->in_cdata != CDATA_OUTSIDE)
            token = soap_char_next(ctx);
        else if (skip_past(ctx, '<') != XML_EOF)
            token = xml_markup_next(ctx);
        else
            token = XML_EOF;
        if (token == XML_END && depth-- == 0)
            return 0;
        if (token == XML_START) {
            token = xml_skip_tag(ctx);
            too_deep = token == 0 && skips_too_deep(ctx, depth++);
        }
        if (token == XML_EOF) {
            ctx->look_ahead = XML_EOF;
            return XML_EOF;
        }
    }
}
