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

// A class of bytes to stop at: up to four single bytes, blanks (0 to 32) and bytes from 128 on.
template <bool Blanks, bool High, char... Marks> struct byte_class {
    static bool holds(char c)
    {
        const auto byte = static_cast<unsigned char>(c);
        return ((c == Marks) || ...) || (Blanks && byte <= ' ') || (High && byte >= 0x80);
    }

    static const char *find(const char *p, const char *end)
    {
#if defined(__SSE2__)
        for (; end - p >= 16; p += 16) {
            const unsigned hits = hits16(p);
            if (hits != 0)
                return p + __builtin_ctz(hits);
        }
#endif
        while (p != end && !holds(*p))
            ++p;
        return p;
    }

#if defined(__SSE2__)
private:
    static unsigned hits16(const char *p)
    {
        const __m128i bytes = _mm_loadu_si128(reinterpret_cast<const __m128i *>(p));
        __m128i hits = _mm_setzero_si128();
        ((hits = _mm_or_si128(hits, _mm_cmpeq_epi8(bytes, _mm_set1_epi8(Marks)))), ...);
        if constexpr (Blanks)
            hits = _mm_or_si128(hits, _mm_cmpeq_epi8(_mm_min_epu8(bytes, _mm_set1_epi8(' ')), bytes));
        if constexpr (High) // the mask takes the top bit of each byte
            hits = _mm_or_si128(hits, bytes);
        return static_cast<unsigned>(_mm_movemask_epi8(hits));
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

using tag_name_stop = byte_class<true, false, '>', '/'>;
using attribute_name_stop = byte_class<true, false, '>', '/', '='>;
using end_name_stop = byte_class<true, false, '>', '<', '&', '"', '\''>;
// A zero byte is no character: it always goes the way of single bytes, so that no text holds one.
using text_stop = byte_class<false, false, '<', '&', '\0'>;
using text_decode_stop = byte_class<false, true, '<', '&', '\0'>;
using cdata_stop = byte_class<false, false, ']', '\0'>;
using cdata_decode_stop = byte_class<false, true, ']', '\0'>;
using quoted_stop = byte_class<false, false, '"', '&', '\0'>;
using quoted_decode_stop = byte_class<false, true, '"', '&', '\0'>;
using apos_stop = byte_class<false, false, '\'', '&', '\0'>;
using apos_decode_stop = byte_class<false, true, '\'', '&', '\0'>;
using unquoted_stop = byte_class<true, false, '>', '/', '&'>;
using unquoted_decode_stop = byte_class<true, true, '>', '/', '&'>;
using markup_stop = byte_class<false, false, '<', '\0'>;
using markup_decode_stop = byte_class<false, true, '<', '\0'>;
