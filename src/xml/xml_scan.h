// xml_scan.h - searches over a stretch of bytes, sixteen at a time where the processor can, and comparison of
// names.
//
// Always: a search returns the first byte of its class in [p, end), or end; nothing outside is read.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

#if defined(__SSE2__)
#include <emmintrin.h>
#endif

#include "xml/utf8.h"

// Control characters that are no white space: what XML can't carry among the bytes below 128.
constexpr bool is_control(char c)
{
    const auto byte = static_cast<unsigned char>(c);
    return byte < ' ' && c != '\t' && c != '\n' && c != '\r';
}

constexpr bool is_high(char c)
{
    return static_cast<unsigned char>(c) >= 0x80;
}

// A class of bytes to stop at: up to four single bytes, bytes from 128 on, and either blanks (0 to 32) or the
// control characters among them.
template <bool Blanks, bool High, char... Marks> struct byte_class {
    static bool holds(char c)
    {
        const auto byte = static_cast<unsigned char>(c);
        return ((c == Marks) || ...) || (Blanks ? byte <= ' ' : is_control(c)) || (High && is_high(c));
    }

    static const char *find(const char *p, const char *end)
    {
#if defined(__SSE2__)
        for (; end - p >= 16; p += 16) {
            const __m128i bytes = _mm_loadu_si128(reinterpret_cast<const __m128i *>(p));
            if (const char *const hit = first_of(hits16(bytes), p))
                return hit;
        }
#endif
        while (p != end && !holds(*p))
            ++p;
        return p;
    }

#if defined(__SSE2__)
    // Bit i is set if byte i may be of the class.
    static unsigned hits16(__m128i bytes)
    {
        __m128i hits = _mm_setzero_si128();
        ((hits = _mm_or_si128(hits, _mm_cmpeq_epi8(bytes, _mm_set1_epi8(Marks)))), ...);
        // White space is among the hits for control characters too: each is checked singly.
        const __m128i low = _mm_set1_epi8(Blanks ? ' ' : ' ' - 1);
        hits = _mm_or_si128(hits, _mm_cmpeq_epi8(_mm_min_epu8(bytes, low), bytes));
        if constexpr (High) // the mask takes the top bit of each byte
            hits = _mm_or_si128(hits, bytes);
        return static_cast<unsigned>(_mm_movemask_epi8(hits));
    }

    // The first byte that is, of those at `p`; null if none is.
    static const char *first_of(unsigned hits, const char *p)
    {
        for (; hits != 0; hits &= hits - 1) {
            const char *const hit = p + __builtin_ctz(hits);
            if (Blanks || static_cast<unsigned char>(*hit) > '\r' || holds(*hit))
                return hit;
        }
        return nullptr;
    }
#endif
};

template <class Word> bool same_word(const char *one, const char *other)
{
    Word a, b;
    std::memcpy(&a, one, sizeof a);
    std::memcpy(&b, other, sizeof b);
    return a == b;
}

// The same of at least a word's bytes; the last word may overlap the one before.
template <class Word> bool same_words(const char *one, const char *other, std::size_t length)
{
    const std::size_t last = length - sizeof(Word);
    for (std::size_t done = 0; done < last; done += sizeof(Word)) {
        if (!same_word<Word>(one + done, other + done))
            return false;
    }
    return same_word<Word>(one + last, other + last);
}

// True if `length` bytes are equal. Names are so short that a call of memcmp costs more than the comparison.
inline bool same_name(const char *one, const char *other, std::size_t length)
{
    if (length >= sizeof(std::uint64_t))
        return same_words<std::uint64_t>(one, other, length);
    if (length >= sizeof(std::uint32_t))
        return same_words<std::uint32_t>(one, other, length);
    for (std::size_t i = 0; i < length; ++i) {
        if (one[i] != other[i])
            return false;
    }
    return true;
}

// True if the first `length` bytes of two stretches of 32 are equal.
inline bool same_of_32(const char *one, const char *other, std::size_t length)
{
#if defined(__SSE2__)
    const auto equal = [&](std::size_t at) {
        const __m128i a = _mm_loadu_si128(reinterpret_cast<const __m128i *>(one + at));
        const __m128i b = _mm_loadu_si128(reinterpret_cast<const __m128i *>(other + at));
        return static_cast<std::uint32_t>(_mm_movemask_epi8(_mm_cmpeq_epi8(a, b)));
    };
    const std::uint64_t differ = ~(equal(0) | equal(16) << 16);
    return static_cast<std::uint32_t>(differ << (32 - length)) == 0;
#else
    return std::memcmp(one, other, length) == 0;
#endif
}

// What ends a stretch that may be taken unchanged. Control characters always go the way of single bytes,
// so that no text holds one; bytes from 128 on do unless they are known to be what the text is made of.
template <bool High> using tag_name_stop = byte_class<true, High, '>', '/'>;
template <bool High> using attribute_name_stop = byte_class<true, High, '>', '/', '='>;
template <bool High> using end_name_stop = byte_class<true, High, '>', '<', '&', '"', '\''>;
template <bool High> using text_stop = byte_class<false, High, '<', '&'>;
template <bool High> using cdata_stop = byte_class<false, High, ']'>;
template <bool High> using quoted_stop = byte_class<false, High, '"', '&'>;
template <bool High> using apos_stop = byte_class<false, High, '\'', '&'>;
template <bool High> using unquoted_stop = byte_class<true, High, '>', '/', '&'>;
template <bool High> using markup_stop = byte_class<false, High, '<', '&'>;
template <bool High> using literal_stop = byte_class<false, High>;

// From a byte of 128 or above on, the first that ends well-formed UTF-8 or is of the class Stop<false>; a
// character that continues after `end` ends it too. Nothing after the result is looked at twice, so that the
// cost is linear however often a text is broken off.
template <template <bool> class Stop>
[[gnu::noinline]] const char *utf8_stretch_end(const char *p, const char *end)
{
    using stop = Stop<false>;
    while (p != end) {
#if defined(__SSE2__)
        while (end - p >= 16) {
            const __m128i bytes = _mm_loadu_si128(reinterpret_cast<const __m128i *>(p));
            const unsigned whole = utf8_whole16(bytes);
            if (whole == 0)
                break;
            if (const char *const hit = stop::first_of(stop::hits16(bytes), p))
                return hit;
            p += whole;
        }
#endif
        const char *const looked_at = end - p < 16 ? end : p + 16;
        while (p < looked_at) {
            const std::size_t length = stop::holds(*p) ? 0 : utf8_character_length(p, end);
            if (length == 0)
                return p;
            p += length;
        }
    }
    return p;
}
