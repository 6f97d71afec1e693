// text_encoding.h - which encoding received XML is in: its names, and the bits of soap::mode that mean
// it.
//
// Elsewhere: who names it (the XML declaration, xml/xml_token.cpp; heads and MIME parts),
// decoding (xml/xml_token.cpp).
#pragma once

#include <string_view>

#include <zuv_client_pro/soap.h>

// With MODE_LATIN1: the bytes 0x80 to 0x9F are those of windows-1252.
constexpr std::uint32_t MODE_WINDOWS_1252 = 0x100000;
// A head names an encoding that isn't read: there must be an XML declaration that names another.
constexpr std::uint32_t MODE_UNREAD_ENCODING = 0x200000;
constexpr std::uint32_t ENCODING_MODES = MODE_LATIN1 | MODE_WINDOWS_1252 | MODE_UNREAD_ENCODING;

// Puts an encoding into force in `mode`, by its name in any case. False, with `mode` as it was, if it isn't
// read.
bool text_encoding_set(std::uint32_t &mode, std::string_view name);

// The same by the charset parameter of a media type, which gives way to MODE_LATIN1. Uses scratch_text.
void text_encoding_by_type(soap *ctx, const char *type, std::uint32_t &mode);

// The error for an encoding that isn't read: 47, with a fault text that quotes its name.
int text_encoding_refuse(soap *ctx, std::string_view name);
