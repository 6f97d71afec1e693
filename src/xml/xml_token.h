// xml_token.h - tokens of XML text and markup, for the reader's own files.
//
// Elsewhere: the public token functions and their values (soap_xml.h), elements (xml_read.cpp), text
// (xml_text.cpp).
#pragma once

#include <cstdint>
#include <string_view>

#include <zuv_client_pro/soap_error.h>

#include "xml/xml_input.h"

// The XML declaration that most documents begin with, from after its "<?".
constexpr std::string_view XML_USUAL_DECLARATION = "xml version=\"1.0\" encoding=\"UTF-8\"?>";

// Result of xml_markup_next for a construct that no caller sees: reading continues after it. No character has
// this value: a reference to zero is an unknown one.
constexpr std::int32_t XML_SKIPPED = INT32_MIN;

// Values of soap::in_cdata. In a section with one "]" that was looked at but not yet handed out, the
// next byte is after that bracket.
constexpr std::int16_t CDATA_OUTSIDE = 0;
constexpr std::int16_t CDATA_INSIDE = 1;
constexpr std::int16_t CDATA_BRACKET_DUE = 2;

// Ends the input for what it holds: every later read gives XML_EOF, and the error says why.
inline std::int32_t xml_refuse(soap *ctx, int error)
{
    ctx->error = error;
    return ctx->look_ahead = XML_EOF;
}

// Truth: the input has ended so.
inline bool xml_is_refused(const soap *ctx)
{
    return ctx->look_ahead == XML_EOF && (ctx->error == SOAP_SYNTAX_ERROR || ctx->error == SOAP_UTF_ERROR);
}

// What becomes of a character that no string may hold: "?", or in strict mode the end with an error.
inline std::int32_t xml_no_character(soap *ctx, int error)
{
    return (ctx->mode & MODE_STRICT) != 0 ? xml_refuse(ctx, error) : '?';
}

// A reference unchanged, from after its "&" up to the ";" if there is one.
struct xml_reference {
    char text[64];
    std::size_t length = 0;
};

// Reads a reference whose "&" has been read. Results as soap_entity_read.
std::int32_t xml_reference_read(soap *ctx, xml_reference &reference);

// Continues after a "<": XML_START (the byte after it is unread), XML_END, XML_EOF, or XML_SKIPPED after a
// comment, declaration or instruction, or at the start of a CDATA section.
std::int32_t xml_markup_next(soap *ctx);

// Continues after an XML_START to the end of the tag. 1 if it ended in "/>", 0 in ">", XML_EOF.
int xml_skip_tag(soap *ctx);

// Drops content up to and including the "</" that closes `depth` elements and the one around them; bounded in
// memory whatever the nesting. 0, or XML_EOF with SOAP_LENGTH in ctx->error past max_depth open elements.
int xml_skip_content(soap *ctx, std::uint64_t depth);

// Truth: the token is a character that came from a reference.
inline bool is_reference(std::int32_t token)
{
    return token < XML_APOS;
}

// The character of a token that isn't XML_EOF, XML_START or XML_END.
inline std::uint32_t token_code(std::int32_t token)
{
    switch (token) {
    case XML_GT:
        return '>';
    case XML_QUOTE:
        return '"';
    case XML_APOS:
        return '\'';
    default:
        return static_cast<std::uint32_t>(token) & ~XML_REFERENCE;
    }
}

// Puts a token back. A plain character returns as if it came from a reference, so that it can't turn into
// markup.
inline void token_push_back(soap *ctx, std::int32_t token)
{
    ctx->look_ahead =
        token >= 0 ? static_cast<std::int32_t>(static_cast<std::uint32_t>(token) | XML_REFERENCE) : token;
}
