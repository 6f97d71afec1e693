// attachment_id.h - an id of an attachment as references may spell it: with or without angle brackets,
// percent-encoded or not.
#pragma once

#include <cstdint>
#include <cstring>

#include "core/hex_digit.h"

// A piece of text read unchanged or percent-decoded, character by character.
class id_view {
public:
    id_view(const char *text, std::size_t length, bool decodes)
        : at_(text), end_(text + length), decodes_(decodes)
    {}
    // The next character, or -1.
    int next()
    {
        if (at_ == end_)
            return -1;
        if (decodes_ && *at_ == '%' && end_ - at_ > 2 && hex_digit(at_[1]) >= 0 && hex_digit(at_[2]) >= 0) {
            const int value = hex_digit(at_[1]) << 4 | hex_digit(at_[2]);
            at_ += 3;
            return value;
        }
        return static_cast<unsigned char>(*at_++);
    }

private:
    const char *at_, *end_;
    bool decodes_;
};

// Below 0, 0 or above 0, by the first characters that differ.
inline int id_compare(id_view one, id_view other)
{
    for (;;) {
        const int c = one.next(), d = other.next();
        if (c != d || c == -1)
            return c - d;
    }
}

inline std::uint64_t id_hash(id_view text, std::uint64_t seed)
{
    std::uint64_t value = seed;
    for (int c = text.next(); c != -1; c = text.next()) {
        value ^= static_cast<std::uint64_t>(c) + 1;
        value *= 0x9E3779B97F4A7C15;
        value ^= value >> 29;
    }
    return value;
}

// An id without the angle brackets around it.
inline id_view bare_id(const char *id, bool decodes)
{
    const std::size_t length = std::strlen(id);
    if (*id == '<')
        return {id + 1, length < 2 ? 0 : length - 2, decodes};
    return {id, length, decodes};
}
