// copy_short.h - copies of a few bytes, such as names and short texts, without a call.
#pragma once

#include <cstddef>
#include <cstring>
#include <type_traits>

// As memcpy, for lengths that are under 33 nearly always: two stores of a fixed size, which may overlap.
[[gnu::always_inline]] inline void copy_short(char *to, const char *from, std::size_t length)
{
    const auto both_ends = [&]<std::size_t Size>(std::integral_constant<std::size_t, Size>) {
        char first[Size];
        char last[Size];
        std::memcpy(first, from, Size);
        std::memcpy(last, from + length - Size, Size);
        std::memcpy(to, first, Size);
        std::memcpy(to + length - Size, last, Size);
    };
    if (length - 8 <= 8) // the commonest first
        both_ends(std::integral_constant<std::size_t, 8>{});
    else if (length - 16 <= 16)
        both_ends(std::integral_constant<std::size_t, 16>{});
    else if (length > 32)
        std::memcpy(to, from, length);
    else if (length >= 4)
        both_ends(std::integral_constant<std::size_t, 4>{});
    else
        for (std::size_t i = 0; i < length; ++i)
            to[i] = from[i];
}
