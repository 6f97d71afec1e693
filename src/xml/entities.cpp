// entities.cpp - references in XML text: "&lt;", "&#65;", "&eacute;".
//
// Here: their names and numbers. Elsewhere: where a reference may be (xml_token.cpp).
#include <algorithm>
#include <cstring>
#include <string_view>

#include "core/hex_digit.h"
#include "xml/utf8.h"
#include "xml/xml_scan.h"
#include "xml/xml_token.h"

namespace {

constexpr std::size_t REFERENCE_BYTES = sizeof xml_reference::text; // an "&" with no ";" swallows no more
constexpr std::size_t NAME_MAX_KEPT = 7; // bytes; longer names are cut, and are unknown by then
constexpr std::int32_t UNKNOWN = 127;
constexpr std::uint32_t NO_CODE = 0x110000; // numbers that are too large count as this one

// The Latin-1 set of HTML 4, code 160 and on.
constexpr const char *latin1_names[] = {
    "nbsp",   "iexcl",  "cent",   "pound",  "curren", "yen",    "brvbar", "sect",   "uml",    "copy",
    "ordf",   "laquo",  "not",    "shy",    "reg",    "macr",   "deg",    "plusmn", "sup2",   "sup3",
    "acute",  "micro",  "para",   "middot", "cedil",  "sup1",   "ordm",   "raquo",  "frac14", "frac12",
    "frac34", "iquest", "Agrave", "Aacute", "Acirc",  "Atilde", "Auml",   "Aring",  "AElig",  "Ccedil",
    "Egrave", "Eacute", "Ecirc",  "Euml",   "Igrave", "Iacute", "Icirc",  "Iuml",   "ETH",    "Ntilde",
    "Ograve", "Oacute", "Ocirc",  "Otilde", "Ouml",   "times",  "Oslash", "Ugrave", "Uacute", "Ucirc",
    "Uuml",   "Yacute", "THORN",  "szlig",  "agrave", "aacute", "acirc",  "atilde", "auml",   "aring",
    "aelig",  "ccedil", "egrave", "eacute", "ecirc",  "euml",   "igrave", "iacute", "icirc",  "iuml",
    "eth",    "ntilde", "ograve", "oacute", "ocirc",  "otilde", "ouml",   "divide", "oslash", "ugrave",
    "uacute", "ucirc",  "uuml",   "yacute", "thorn",  "yuml"};
static_assert(sizeof latin1_names / sizeof *latin1_names == 96);

struct markup_row {
    std::string_view reference; // after the "&"
    std::int32_t code;
};
constexpr markup_row MARKUP[] = {{"amp;", '&'}, {"lt;", '<'}, {"gt;", '>'}, {"quot;", '"'}, {"apos;", '\''}};

// Takes a reference to a character of markup that is whole in the buffer. UNKNOWN: nothing was consumed.
std::int32_t take_markup(soap *ctx)
{
    const char *const here = input_here(ctx);
    const auto unread = static_cast<std::size_t>(input_end(ctx) - here);
    for (const markup_row &row : MARKUP) {
        const std::size_t length = row.reference.size();
        if (length <= unread && ctx->look_ahead == 0 && same_name(here, row.reference.data(), length)) {
            input_consume(ctx, here + length);
            return row.code;
        }
    }
    return UNKNOWN;
}

// Letter case doesn't count in these names, so of two that differ by it the first is found.
std::int32_t named_code(const char *name)
{
    for (const markup_row &row : MARKUP) {
        if (row.reference.substr(0, row.reference.size() - 1) == name)
            return row.code;
    }
    std::int32_t code = 160;
    for (const char *row : latin1_names) {
        if (soap_tag_match(name, row) == 0)
            return code;
        ++code;
    }
    return UNKNOWN;
}

// 16 for what is no digit.
int digit_value(char c)
{
    const int value = hex_digit(c);
    return value < 0 ? 16 : value;
}

std::int32_t unknown(soap *ctx)
{
    return (ctx->mode & MODE_STRICT) != 0 ? xml_refuse(ctx, SOAP_SYNTAX_ERROR) : UNKNOWN;
}

// What follows the "#". The digits end where they end, which strict reading demands to be the end.
std::int32_t numbered_code(soap *ctx, std::string_view text)
{
    const bool hexadecimal = !text.empty() && (text[0] == 'x' || text[0] == 'X');
    const int base = hexadecimal ? 16 : 10;
    std::uint32_t code = 0;
    std::size_t at = hexadecimal ? 1 : 0;
    const std::size_t first = at;
    for (; at < text.size() && digit_value(text[at]) < base; ++at)
        code = std::min(code * static_cast<std::uint32_t>(base) +
                            static_cast<std::uint32_t>(digit_value(text[at])),
                        NO_CODE);
    if (at == first || (at != text.size() && (ctx->mode & MODE_STRICT) != 0))
        return unknown(ctx);
    return xml_carries(code) ? static_cast<std::int32_t>(code) : xml_no_character(ctx, SOAP_SYNTAX_ERROR);
}

// Markup, blanks and bytes that may be part of a character can't be in a reference: the "&" was a stray
// one.
bool ends_stray_reference(std::int32_t byte)
{
    return byte <= ' ' || byte >= 0x80 || byte == '<' || byte == '>' || byte == '&' || byte == '"' ||
           byte == '\'';
}

} // namespace

std::int32_t xml_reference_read(soap *ctx, xml_reference &reference)
{
    while (reference.length < REFERENCE_BYTES) {
        const std::int32_t byte = soap_recv_byte(ctx);
        if (ends_stray_reference(byte)) {
            input_unread(ctx, byte);
            return byte == XML_EOF && (ctx->mode & MODE_STRICT) != 0 ? XML_EOF : unknown(ctx);
        }
        reference.text[reference.length++] = static_cast<char>(byte);
        if (byte != ';')
            continue;
        const std::string_view text(reference.text, reference.length - 1);
        if (text.starts_with('#'))
            return numbered_code(ctx, text.substr(1));
        char name[NAME_MAX_KEPT + 1] = "";
        text.copy(name, NAME_MAX_KEPT);
        const std::int32_t code = named_code(name);
        return code == UNKNOWN ? unknown(ctx) : code;
    }
    return unknown(ctx);
}

std::int32_t soap_entity_read(soap *ctx)
{
    const std::int32_t code = take_markup(ctx);
    if (code != UNKNOWN)
        return code;
    xml_reference reference;
    return xml_reference_read(ctx, reference);
}
