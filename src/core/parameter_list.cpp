// parameter_list.cpp - items of lists such as `multipart/related; boundary="x"; start=y`, found by name.
//
// Elsewhere: the headers that hold such lists (net/http_headers.cpp, attachments/mime.cpp).
//
//   list  = item *( ("," / ";") item )
//   item  = name [ "=" value ]
//   value = '"' characters '"' / characters; between quotes a backslash may come before a quote or
//   backslash
#include <cstddef>
#include <cstring>

#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/hex_digit.h"

namespace {

const char *skip_blanks(const char *text)
{
    while (*text == ' ' || *text == '\t')
        ++text;
    return text;
}

// Copies into `target` (SOAP_TEXT_SIZE bytes), percent-decoding, up to one of the characters of `stops`;
// blanks at the end are left out. Returns the place of the stop.
const char *copy_plain(const char *text, const char *stops, char *target)
{
    std::size_t length = 0;
    std::size_t kept = 0; // length without the blanks at the end
    while (*text != '\0' && std::strchr(stops, *text) == nullptr) {
        char c = *text++;
        if (c == '%' && hex_digit(text[0]) >= 0 && hex_digit(text[1]) >= 0) {
            c = static_cast<char>(hex_digit(text[0]) * 16 + hex_digit(text[1]));
            text += 2;
        }
        if (length == SOAP_TEXT_SIZE - 1)
            continue;
        target[length++] = c;
        if (c != ' ' && c != '\t')
            kept = length;
    }
    target[kept] = '\0';
    return text;
}

// As above, for what is between double quotes; `text` is after the first. A missing second quote is the
// end.
const char *copy_quoted(const char *text, char *target)
{
    std::size_t length = 0;
    for (; *text != '\0' && *text != '"'; ++text) {
        if (*text == '\\' && (text[1] == '"' || text[1] == '\\'))
            ++text;
        if (length < SOAP_TEXT_SIZE - 1)
            target[length++] = *text;
    }
    target[length] = '\0';
    return text + static_cast<int>(*text == '"');
}

const char *copy_value(const char *text, char *target)
{
    text = skip_blanks(text);
    if (*text == '"')
        return copy_quoted(text + 1, target);
    return copy_plain(text, ",;", target);
}

} // namespace

const char *soap_attr_value(soap *ctx, const char *text, const char *key)
{
    char *const target = ctx->scratch_text;
    if (text == nullptr)
        return nullptr;
    while (*text != '\0') {
        text = copy_plain(skip_blanks(text), ",;=", target);
        const bool found = soap_tag_match(target, key) == 0;
        target[0] = '\0';
        if (*text == '=')
            text = copy_value(text + 1, target);
        if (found)
            return target;
        text += std::strcspn(text, ",;");
        text = *text == '\0' ? text : text + 1;
    }
    return nullptr;
}
