// xml_token.cpp - bytes to tokens: markup separated from text, references and UTF-8 decoded, comments passed over.
//
// Here: the two token layers, instructions, and skipping of tags and content. Elsewhere: the names of
// references (entities.cpp), what is made of tokens (xml_read.cpp, xml_text.cpp).
//
// Always: one token can be pushed back in look_ahead; a construct may be cut by a refill at any byte.
#include "xml/xml_token.h"

#include <algorithm>
#include <cstring>
#include <string_view>

#include <zuv_client_pro/soap_error.h>

#include "core/failure.h"
#include "core/text_encoding.h"
#include "xml/utf8.h"
#include "xml/xml_scan.h"

namespace {

constexpr std::size_t INSTRUCTION_TEXT_MAX = 255; // bytes kept of "<?...": enough for the XML declaration

// The characters of windows-1252 from 0x80 on that aren't those of ISO-8859-1; 0 for bytes that are none.
constexpr char16_t WINDOWS_1252[] = {0x20AC, 0,      0x201A, 0x0192, 0x201E, 0x2026, 0x2020, 0x2021,
                                     0x02C6, 0x2030, 0x0160, 0x2039, 0x0152, 0,      0x017D, 0,
                                     0,      0x2018, 0x2019, 0x201C, 0x201D, 0x2022, 0x2013, 0x2014,
                                     0x02DC, 0x2122, 0x0161, 0x203A, 0x0153, 0,      0x017E, 0x0178};
static_assert(sizeof WINDOWS_1252 / sizeof *WINDOWS_1252 == 32);

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

// An instruction ends at "?>", whatever brackets it holds.
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

// The byte that comes next and stays unread, or XML_EOF.
std::int32_t next_byte(soap *ctx)
{
    return input_ready(ctx) ? static_cast<unsigned char>(*input_here(ctx)) : XML_EOF;
}

// Takes the rest of a character of UTF-8, as many bytes as its lead byte calls for and belong to it.
std::int32_t utf8_rest(soap *ctx, std::uint32_t lead)
{
    static constexpr std::uint32_t least[] = {0, 0x80, 0x800, 0x10000, 0x200000, 0x4000000};
    const unsigned more = lead < 0xC0   ? 0
                          : lead < 0xE0 ? 1
                          : lead < 0xF0 ? 2
                          : lead < 0xF8 ? 3
                          : lead < 0xFC ? 4
                                        : 5;
    std::uint32_t code = lead & (0x3FU >> more);
    unsigned taken = 0;
    std::int32_t next = next_byte(ctx);
    for (; taken < more && next >= 0x80 && next < 0xC0; ++taken) {
        code = code << 6 | (static_cast<std::uint32_t>(next) & 0x3F);
        ctx->buffer_index++;
        next = taken + 1 < more ? next_byte(ctx) : XML_EOF;
    }
    if (taken == 0 && next < 0x80 && (ctx->mode & MODE_UTF_STRINGS) == 0)
        return static_cast<std::int32_t>(lead); // a sender of Latin-1 that doesn't say so
    if (taken < more && ctx->look_ahead == XML_EOF && (ctx->mode & MODE_STRICT) != 0)
        return XML_EOF; // cut by the end of input, which has an error of its own
    if (taken != more || more == 0 || code < least[more] || !xml_carries(code))
        return xml_no_character(ctx, SOAP_UTF_ERROR);
    return static_cast<std::int32_t>(code);
}

std::int32_t windows_1252(soap *ctx, std::int32_t byte)
{
    if (byte >= 0xA0)
        return byte;
    const char16_t code = WINDOWS_1252[byte - 0x80];
    return code != 0 ? static_cast<std::int32_t>(code) : xml_no_character(ctx, SOAP_UTF_ERROR);
}

const char *behind_blanks(const char *text)
{
    while (*text == ' ')
        ++text;
    return text;
}

// The name in an XML declaration, without its quotes; empty if there is none.
std::string_view declared_encoding(const char *instruction)
{
    constexpr std::string_view key = " encoding";
    const char *text =
        std::strncmp(instruction, "xml ", 4) == 0 ? std::strstr(instruction, key.data()) : nullptr;
    if (text == nullptr || *(text = behind_blanks(text + key.size())) != '=')
        return {};
    text = behind_blanks(text + 1);
    const char *end = *text == '"' || *text == '\'' ? std::strchr(text + 1, *text) : nullptr;
    return end != nullptr ? std::string_view(text + 1, static_cast<std::size_t>(end - text - 1))
                          : std::string_view();
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
    if (token < 0x80 || token > 0xFF)
        return token;
    if ((ctx->mode & MODE_LATIN1) == 0)
        return utf8_rest(ctx, static_cast<std::uint32_t>(token));
    return (ctx->mode & MODE_WINDOWS_1252) != 0 ? windows_1252(ctx, token) : token;
}

std::int32_t soap_pi_read(soap *ctx)
{
    constexpr std::string_view usual = XML_USUAL_DECLARATION;
    const char *const begin = input_here(ctx);
    if (ctx->look_ahead == 0 && static_cast<std::size_t>(input_end(ctx) - begin) >= usual.size() &&
        same_name(begin, usual.data(), usual.size())) {
        ctx->mode &= ~ENCODING_MODES;
        input_consume(ctx, begin + usual.size());
        return usual.back();
    }
    char text[INSTRUCTION_TEXT_MAX + 1];
    std::size_t kept = 0;
    std::int32_t byte = XML_EOF;
    while (byte == XML_EOF && input_ready(ctx)) {
        const char *const here = input_here(ctx), *const end = input_end(ctx);
        const char *const stop = std::find(here, end, '?');
        const auto taken = std::min(static_cast<std::size_t>(stop - here), INSTRUCTION_TEXT_MAX - kept);
        std::transform(here, here + taken, text + kept,
                       [](char c) { return static_cast<unsigned char>(c) < ' ' ? ' ' : c; });
        kept += taken;
        byte = stop != end ? '?' : XML_EOF;
        input_consume(ctx, stop != end ? stop + 1 : end);
    }
    text[kept] = '\0';
    const std::string_view encoding = declared_encoding(text);
    if (!encoding.empty() && !text_encoding_set(ctx->mode, encoding))
        return xml_refuse(ctx, text_encoding_refuse(ctx, encoding));
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
                return static_cast<int>(last == '/');
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

namespace {

// An element begins, with content, within `depth` others that are skipped: true if it is one too many.
bool skips_too_deep(soap *ctx, std::uint64_t depth)
{
    if (ctx->max_depth == 0 || ctx->nesting_level + depth < ctx->max_depth)
        return false;
    fail(ctx, SOAP_LENGTH);
    return true;
}

} // namespace

int xml_skip_content(soap *ctx, std::uint64_t depth)
{
    bool too_deep = depth != 0 && skips_too_deep(ctx, depth - 1);
    for (;;) {
        std::int32_t token = XML_EOF;
        if (!too_deep && (ctx->look_ahead != 0 || ctx->in_cdata != CDATA_OUTSIDE))
            token = soap_char_next(ctx);
        else if (!too_deep && skip_past(ctx, '<') != XML_EOF)
            token = xml_markup_next(ctx);
        if (token == XML_END && depth-- == 0)
            return SOAP_OK;
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
