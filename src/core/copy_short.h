// copy_short.h - copies of a few bytes, such as names and short texts, without a call.
#pragma once

#include <cstddef>
#include <cstring>

template <std::size_t Size>
[[gnu::always_inline]] inline void copy_both_ends(char *to, const char *from, std::size_t length)
{
    char first[Size];
    char last[Size];
    std::memcpy(first, from, Size);
    std::memcpy(last, from + length - Size, Size);
    std::memcpy(to, first, Size);
    std::memcpy(to + length - Size, last, Size);
}

// As memcpy, for lengths that are under 33 nearly always: two stores of a fixed size, which may overlap.
[[gnu::always_inline]] inline void copy_short(char *to, const char *from, std::size_t length)
{
    if (length - 8 <= 8) // the commonest first
        copy_both_ends<8>(to, from, length);
    else if (length - 16 <= 16)
        copy_both_ends<16>(to, from, length);
    else if (length > 32)
        std::memcpy(to, from, length);
    else if (length >= 4)
        copy_both_ends<4>(to, from, length);
    else
        for (std::size_t i = 0; i < length; ++i)
            to[i] = from[i];
}
