// xml_token.h - tokens of XML text and markup, for the reader's own files.
//
// Elsewhere: the public token functions and their values (soap_xml.h), elements (xml_read.cpp), text
// (xml_text.cpp).
#pragma once

#include <cstdint>

#include "codec/xml_input.h"

// Result of xml_markup_next for a construct that no caller sees: reading goes on behind it. No character has
// this value: a reference to zero is an unknown one.
constexpr std::int32_t XML_SKIPPED = INT32_MIN;

// Values of soap::in_cdata. In a section with one "]" that was looked at but not yet handed out, the
// next byte is behind that bracket.
constexpr std::int16_t CDATA_OUTSIDE = 0;
constexpr std::int16_t CDATA_INSIDE = 1;
constexpr std::int16_t CDATA_BRACKET_DUE = 2;

// Goes on behind a "<": XML_START (the byte after it is unread), XML_END, XML_EOF, or XML_SKIPPED after a
// comment, declaration or instruction, or at the start of a CDATA section.
std::int32_t xml_markup_next(soap *ctx);

// Goes on behind an XML_START to the end of the tag. 1 if it ended in "/>", 0 in ">", XML_EOF.
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
