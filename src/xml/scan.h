// scan.h - integers in text, read as the C library reads them in the "C" locale.
//
// Elsewhere: which of them a type takes (number.cpp, datetime.cpp, array_numbers.cpp).
#pragma once

#include <cstdint>
#include <cstring>

// White space of the "C" locale.
inline bool is_c_space(char byte)
{
    return byte == ' ' || (byte >= '\t' && byte <= '\r');
}

inline bool is_digit(char byte)
{
    return byte >= '0' && byte <= '9';
}

// Result of scan_integer. Numbers of any length are safe: past 64 bits only `overflow` is set.
struct scanned_integer {
    const char *end;         // after the last digit; the start of the text without digits
    std::uint64_t magnitude; // UINT64_MAX on overflow
    bool negative;
    bool digits;   // there was at least one
    bool overflow; // the magnitude needs more than 64 bits

    bool out_of_signed_range() const
    {
        return overflow || magnitude > static_cast<std::uint64_t>(INT64_MAX) + (negative ? 1 : 0);
    }
    // As strtol: the nearest value in range.
    std::int64_t as_signed() const
    {
        if (out_of_signed_range())
            return negative ? INT64_MIN : INT64_MAX;
        return static_cast<std::int64_t>(negative ? 0 - magnitude : magnitude);
    }
    // As strtoul: a negative number wraps.
    std::uint64_t as_unsigned() const { return negative && !overflow ? 0 - magnitude : magnitude; }
};

// Reads white space, a sign and digits; at most `width` bytes after the white space, 0 for any number.
inline scanned_integer scan_integer(const char *text, int width = 0)
{
    scanned_integer number = {text, 0, false, false, false};
    const char *at = text;
    while (is_c_space(*at))
        at++;
    const char *const start = at;
    if (*at == '-' || *at == '+')
        number.negative = *at++ == '-';
    for (; is_digit(*at) && (width == 0 || at - start < width); at++) {
        const auto digit = static_cast<std::uint64_t>(*at - '0');
        if (number.magnitude > (UINT64_MAX - digit) / 10)
            number.overflow = true;
        number.magnitude = number.overflow ? UINT64_MAX : number.magnitude * 10 + digit;
        number.digits = true;
    }
    if (number.digits)
        number.end = at;
    return number;
}

// After the next ",", or if there is none, the next blank; null if neither is there.
inline const char *after_separator(const char *text)
{
    const char *found = std::strchr(text, ',');
    if (found == nullptr)
        found = std::strchr(text, ' ');
    return found != nullptr ? found + 1 : nullptr;
}
