// utf8.h - UTF-8 as XML may hold it: what is well-formed, to and from code points, to Latin-1.
//
// Elsewhere: where such text is and what ends it (xml/xml_scan.h), sequences that a refill cuts
// (xml/xml_token.cpp).
//
// Always: well-formed are the shortest forms of characters up to U+10FFFF but surrogates, U+FFFE and U+FFFF.
// Control characters count as well-formed here: who looks for markup meets them in the same search.
#pragma once

#include <cstddef>
#include <cstdint>

#ifdef __SSE2__
#include <emmintrin.h>
#endif

// True for code points that XML can carry.
constexpr bool xml_carries(std::uint32_t code)
{
    if (code < ' ')
        return code == '\t' || code == '\n' || code == '\r';
    return code < 0xD800 || (code >= 0xE000 && code < 0xFFFE) || (code >= 0x10000 && code <= 0x10FFFF);
}

// Bytes of the well-formed character at the start of [p, end), which isn't empty; 0 if there is none.
std::size_t utf8_character_length(const char *p, const char *end);

#ifdef __SSE2__

// Bytes of the whole characters at the start of sixteen; 0 where a closer look is needed.
inline unsigned utf8_whole16(__m128i bytes)
{
    const auto places = [](__m128i found) { return static_cast<unsigned>(_mm_movemask_epi8(found)); };
    const auto within = [bytes](int first, int last) {
        const __m128i distance = _mm_sub_epi8(bytes, _mm_set1_epi8(static_cast<char>(first)));
        return _mm_cmpeq_epi8(_mm_min_epu8(distance, _mm_set1_epi8(static_cast<char>(last - first))),
                              distance);
    };
    const unsigned high = places(bytes);
    if (high == 0)
        return 16;
    const unsigned rest = places(_mm_cmplt_epi8(bytes, _mm_set1_epi8(static_cast<char>(0xC0)))); // signed
    const unsigned pairs = places(within(0xC2, 0xDF));
    unsigned due = pairs << 1; // where the rests of the characters belong
    if (high != (pairs | rest)) {
        // Three bytes, but for those leads that not every rest may follow.
        const __m128i hangul = _mm_cmpeq_epi8(bytes, _mm_set1_epi8(static_cast<char>(0xED)));
        const unsigned threes = places(_mm_andnot_si128(hangul, within(0xE1, 0xEE)));
        if (high != (pairs | rest | threes))
            return 0;
        due |= threes << 1 | threes << 2;
    }
    if ((due & 0xFFFF) != rest)
        return 0;
    return due >> 16 == 0 ? 16 : 31U - static_cast<unsigned>(__builtin_clz(high & ~rest));
}

#endif

// Bytes of a text without a character that its end cuts.
std::size_t utf8_whole(const char *text, std::size_t length);

// Writes a code point, one to six bytes for up to 31 bits. The number of bytes.
std::size_t utf8_encode(std::uint32_t code, char target[6]);

// Makes Latin-1 of well-formed text, in place and without a terminator: a character above 255 becomes "?".
// The new length.
std::size_t utf8_to_latin1(char *text, std::size_t length);

// Code point of the well-formed character at `p`, which moves past it.
std::uint32_t utf8_decode(const char *&p);
