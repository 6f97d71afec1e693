// text_encoding.cpp - see text_encoding.h.
#include "core/text_encoding.h"

#include "core/failure.h"

#include <algorithm>
#include <cstdio>
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_xml.h>

namespace {

constexpr std::size_t NAME_SHOWN = 40; // bytes of a name that a fault text quotes

struct encoding_row {
    const char *name; // pattern of soap_tag_match
    std::uint32_t mode;
};
constexpr encoding_row ENCODINGS[] = {
    {"utf-8", 0},
    {"utf8", 0},
    {"us-ascii", 0},
    {"ascii", 0},
    {"iso-8859-1", MODE_LATIN1},
    {"iso8859-1", MODE_LATIN1},
    {"latin1", MODE_LATIN1},
    {"windows-1252", MODE_LATIN1 | MODE_WINDOWS_1252},
    {"cp1252", MODE_LATIN1 | MODE_WINDOWS_1252},
};
constexpr std::size_t NAME_MAX = 15; // bytes; longer names are none of these

} // namespace

bool text_encoding_set(std::uint32_t &mode, std::string_view name)
{
    char text[NAME_MAX + 1] = "";
    if (name.size() > NAME_MAX)
        return false;
    name.copy(text, NAME_MAX);
    for (const encoding_row &row : ENCODINGS) {
        if (soap_tag_match(text, row.name) == 0) {
            mode = (mode & ~ENCODING_MODES) | row.mode;
            return true;
        }
    }
    return false;
}

void text_encoding_by_type(soap *ctx, const char *type, std::uint32_t &mode)
{
    if ((mode & MODE_LATIN1) != 0)
        return;
    if (type != nullptr && std::strcmp(type, "text/xml; charset=utf-8") == 0) { // as nearly all say
        mode &= ~ENCODING_MODES;
        return;
    }
    const char *name = soap_attr_value(ctx, type, "charset");
    if (name != nullptr && *name != '\0' && !text_encoding_set(mode, name))
        mode |= MODE_UNREAD_ENCODING;
}

int text_encoding_refuse(soap *ctx, std::string_view name)
{
    char shown[NAME_SHOWN + 1] = "";
    const std::size_t length = name.copy(shown, NAME_SHOWN);
    std::replace_if(
        shown, shown + length, [](char c) { return c < ' ' || c > '~'; }, '?');
    char text[NAME_SHOWN + 96];
    std::snprintf(text, sizeof text, "The encoding '%s' is not read: send UTF-8, ISO-8859-1 or windows-1252",
                  shown);
    if (const char *const copy = soap_string_dup(ctx, text))
        fail_as_sender(ctx, copy, nullptr, SOAP_UTF_ERROR);
    return fail(ctx, SOAP_UTF_ERROR);
}
