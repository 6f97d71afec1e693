// entities.cpp - references in XML text: "&lt;", "&#65;", "&eacute;".
//
// Here: their names and numbers. Elsewhere: where a reference may stand (xml_token.cpp).
#include <cstring>

#include "codec/xml_token.h"

namespace {

constexpr std::size_t NAME_MAX_KEPT = 7;    // bytes; longer names are cut, and are unknown by then
constexpr std::size_t REFERENCE_BYTES = 64; // an "&" with no ";" within this many bytes swallows no more
constexpr std::int32_t UNKNOWN = 127;

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

// Letter case doesn't count in these names, so of two that differ by it the first is found.
std::int32_t named_code(const char *name)
{
    static constexpr struct {
        const char *name;
        std::int32_t code;
    } markup[] = {{"lt", '<'}, {"gt", '>'}, {"amp", '&'}, {"quot", '"'}, {"apos", '\''}};
    for (const auto &row : markup) {
        if (std::strcmp(name, row.name) == 0)
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

int digit_value(char c)
{
    if (c >= '0' && c <= '9')
        return c - '0';
    const char lower = static_cast<char>(c | 0x20);
    return lower >= 'a' && lower <= 'f' ? lower - 'a' + 10 : 16;
}

// At most six digits stand here, so the value stays far below the bit that marks references. Zero can't
// be a character.
std::int32_t numbered_code(const char *digits)
{
    const bool hexadecimal = *digits == 'x' || *digits == 'X';
    const int base = hexadecimal ? 16 : 10;
    std::int32_t code = 0;
    for (const char *p = digits + hexadecimal; digit_value(*p) < base; ++p)
        code = code * base + digit_value(*p);
    return code == 0 ? UNKNOWN : code;
}

// Markup can't stand in a reference: the "&" was a stray one.
bool ends_stray_reference(std::int32_t byte)
{
    return byte == XML_EOF || byte == '<' || byte == '>' || byte == '&' || byte == '"' || byte == '\'';
}

} // namespace

std::int32_t soap_entity_read(soap *ctx)
{
    char name[NAME_MAX_KEPT + 1];
    std::size_t kept = 0;
    for (std::size_t count = 0; count < REFERENCE_BYTES; ++count) {
        const std::int32_t byte = soap_recv_byte(ctx);
        if (byte == ';') {
            name[kept] = '\0';
            return name[0] == '#' ? numbered_code(name + 1) : named_code(name);
        }
        if (ends_stray_reference(byte)) {
            input_unread(ctx, byte);
            return UNKNOWN;
        }
        if (kept < NAME_MAX_KEPT)
            name[kept++] = static_cast<char>(byte);
    }
    return UNKNOWN;
}
