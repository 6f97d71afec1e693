// moment.cpp - see moment.h.
#include "moment.h"

#include <cstdint>
#include <cstdio>
#include <stdexcept>

#include <openssl/rand.h>

#include <zuv_client_pro/soap_primitive.h>

namespace service {

std::string moment_text(soap *ctx, std::time_t seconds)
{
    return soap_datetime_text(ctx, seconds);
}

std::string now_text(soap *ctx)
{
    return moment_text(ctx, std::time(nullptr));
}

std::optional<std::time_t> moment_of(soap *ctx, const std::string &text)
{
    const int error = ctx->error;
    std::time_t seconds = 0;
    const bool understood = soap_datetime_parse(ctx, text.c_str(), &seconds) == 0;
    ctx->error = error;
    if (!understood)
        return std::nullopt;
    if (sizeof seconds == 4 && seconds == -1) // beyond what it holds: after or before all that it does
        return text < "1970" ? INT32_MIN : INT32_MAX;
    return seconds;
}

std::string fresh_uuid()
{
    unsigned char b[16];
    if (RAND_bytes(b, sizeof b) != 1)
        throw std::runtime_error("no random bytes");
    b[6] = static_cast<unsigned char>((b[6] & 0x0F) | 0x40); // version 4
    b[8] = static_cast<unsigned char>((b[8] & 0x3F) | 0x80); // RFC 4122 variant
    char text[37];
    std::snprintf(text, sizeof text, "%02x%02x%02x%02x-%02x%02x-%02x%02x-%02x%02x-%02x%02x%02x%02x%02x%02x",
                  b[0], b[1], b[2], b[3], b[4], b[5], b[6], b[7], b[8], b[9], b[10], b[11], b[12], b[13],
                  b[14], b[15]);
    return text;
}

} // namespace service
