// moment.h - points in time as the contract's dateTime texts, and new names.
#pragma once

#include <ctime>
#include <optional>
#include <string>

struct soap;

namespace service {

// "2031-05-01T12:00:00Z".
std::string moment_text(soap *ctx, std::time_t seconds);
std::string now_text(soap *ctx);

// Seconds since 1970 of a dateTime, or the nearest that time_t holds; nothing for any other text. ctx->error stays
// unchanged.
std::optional<std::time_t> moment_of(soap *ctx, const std::string &text);

// A random identifier, "123e4567-e89b-42d3-a456-426614174000". Throws std::runtime_error without random
// bytes.
std::string fresh_uuid();

} // namespace service
