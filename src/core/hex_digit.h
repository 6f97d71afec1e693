// hex_digit.h - the value of a hexadecimal digit, for chunk sizes, URLs, character references and binary
// text.
#pragma once

// 0 to 15, or -1 for any other character, code or token.
constexpr int hex_digit(int c)
{
    if (c >= '0' && c <= '9')
        return c - '0';
    const int lower = c | 0x20;
    return c > 0 && lower >= 'a' && lower <= 'f' ? lower - 'a' + 10 : -1;
}
