// xml_write_text.cpp - text out: escapes, Latin-1 and wide characters as UTF-8.
//
// Here: which bytes need an escape, and finding them sixteen at a time. Elsewhere: who writes text
// (xml_write.cpp).
//
// Always: stretches that need no escape go out in one piece; in a counting pass they are only measured.
#include <algorithm>
#include <array>
#include <cstdint>
#include <cstring>
#include <string_view>
#ifdef __SSE2__
#include <emmintrin.h>
#endif

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_xml.h>

#include "codec/xml_write.h"

namespace {

// Where a text stands decides what its characters become.
enum class place : std::uint8_t { element = 1, canonical_element = 2, attribute = 4 };

// How bytes of 128 and above are meant.
enum class charset : std::uint8_t { utf8, latin1 };

constexpr std::uint8_t HIGH_BYTE = 8;

constexpr std::array<std::uint8_t, 256> escape_table()
{
    constexpr auto element = static_cast<std::uint8_t>(place::element);
    constexpr auto canonical = static_cast<std::uint8_t>(place::canonical_element);
    constexpr auto attribute = static_cast<std::uint8_t>(place::attribute);
    std::array<std::uint8_t, 256> table{};
    table['\t'] = attribute;
    table['\n'] = element | attribute;
    table['\r'] = element | canonical | attribute;
    table['"'] = attribute;
    table['&'] = element | canonical | attribute;
    table['<'] = element | canonical | attribute;
    table['>'] = element | canonical;
    for (std::size_t i = 128; i < 256; ++i)
        table[i] = HIGH_BYTE;
    return table;
}
constexpr std::array<std::uint8_t, 256> ESCAPES = escape_table();

constexpr std::string_view escape_of(unsigned char c)
{
    switch (c) {
    case '\t':
        return "&#x9;";
    case '\n':
        return "&#xA;";
    case '\r':
        return "&#xD;";
    case '"':
        return "&quot;";
    case '&':
        return "&amp;";
    case '<':
        return "&lt;";
    default:
        return "&gt;";
    }
}

template <place P, charset C> bool needs_escape(char c)
{
    constexpr auto mask = static_cast<std::uint8_t>(P) | (C == charset::latin1 ? HIGH_BYTE : 0);
    return (ESCAPES[static_cast<unsigned char>(c)] & mask) != 0;
}

#ifdef __SSE2__

// Bit i is set if byte i needs an escape. Pairs of characters that differ in one bit are found together.
template <place P, charset C> unsigned escape_mask(__m128i bytes)
{
    const auto is = [](__m128i text, char c) { return _mm_cmpeq_epi8(text, _mm_set1_epi8(c)); };
    __m128i found = is(bytes, '\r');
    if constexpr (P == place::attribute) {
        const __m128i without_4 = _mm_and_si128(bytes, _mm_set1_epi8(static_cast<char>(~4)));
        found = _mm_or_si128(is(without_4, '\t'), is(without_4, '"')); // CR and "&" too
        found = _mm_or_si128(found, _mm_or_si128(is(bytes, '<'), is(bytes, '\n')));
    } else {
        const __m128i with_2 = _mm_or_si128(bytes, _mm_set1_epi8(2));
        found = _mm_or_si128(found, _mm_or_si128(is(with_2, '>'), is(bytes, '&'))); // "<" too
        if constexpr (P == place::element)
            found = _mm_or_si128(found, is(bytes, '\n'));
    }
    if constexpr (C == charset::latin1)
        found = _mm_or_si128(found, bytes); // of which the top bits count
    return static_cast<unsigned>(_mm_movemask_epi8(found));
}

std::size_t first_bit(unsigned mask)
{
    return static_cast<std::size_t>(__builtin_ctz(mask));
}

// The first and the last N bytes of a text of N to 2 * N bytes, side by side, N being 4 or 8.
template <class Half> __m128i both_ends(const char *text, std::size_t length)
{
    Half first;
    Half last;
    std::memcpy(&first, text, sizeof first);
    std::memcpy(&last, text + length - sizeof last, sizeof last);
    if constexpr (sizeof(Half) == 8)
        return _mm_set_epi64x(last, first);
    else
        return _mm_set_epi32(0, 0, last, first);
}

template <place P, charset C, class Half> std::size_t clean_short(const char *text, std::size_t length)
{
    const unsigned mask = escape_mask<P, C>(both_ends<Half>(text, length));
    if (mask == 0)
        return length;
    const std::size_t bit = first_bit(mask);
    return bit < sizeof(Half) ? bit : length - 2 * sizeof(Half) + bit;
}

#endif

// Bytes up to the first that needs an escape.
template <place P, charset C> std::size_t clean_length(const char *text, std::size_t length)
{
    std::size_t done = 0;
#ifdef __SSE2__
    const auto load = [text](std::size_t at) {
        return _mm_loadu_si128(reinterpret_cast<const __m128i *>(text + at));
    };
    for (; done + 16 <= length; done += 16) {
        if (const unsigned mask = escape_mask<P, C>(load(done)))
            return done + first_bit(mask);
    }
    if (done == length)
        return length;
    if (length > 16) {
        const unsigned mask = escape_mask<P, C>(load(length - 16));
        return mask ? length - 16 + first_bit(mask) : length;
    }
    if (length >= 8)
        return clean_short<P, C, long long>(text, length);
    if (length >= 4)
        return clean_short<P, C, int>(text, length);
#endif
    while (done < length && !needs_escape<P, C>(text[done]))
        ++done;
    return done;
}

int put_latin1(soap *ctx, unsigned char c)
{
    const char bytes[2] = {static_cast<char>(0xC0 | c >> 6), static_cast<char>(0x80 | (c & 0x3F))};
    return soap_send_bytes(ctx, bytes, 2);
}

template <place P, charset C> int write_text(soap *ctx, const char *text, std::size_t length)
{
    constexpr std::size_t STRETCH = 16384; // bytes looked at before they are sent: still in the cache then
    const char *const end = text + length;
    while (text != end) {
        const std::size_t clean =
            clean_length<P, C>(text, std::min(static_cast<std::size_t>(end - text), STRETCH));
        if (clean > 0 && soap_send_bytes(ctx, text, clean))
            return ctx->error;
        text += clean;
        for (; text != end && needs_escape<P, C>(*text); ++text) {
            const auto c = static_cast<unsigned char>(*text);
            if (C == charset::latin1 && c >= 128 ? put_latin1(ctx, c) : xml_put(ctx, escape_of(c)))
                return ctx->error;
        }
    }
    return 0;
}

template <charset C> int write_text(soap *ctx, const char *text, std::size_t length, int flag)
{
    if (flag != 0)
        return write_text<place::attribute, C>(ctx, text, length);
    if (ctx->mode & MODE_CANONICAL)
        return write_text<place::canonical_element, C>(ctx, text, length);
    return write_text<place::element, C>(ctx, text, length);
}

// Bytes of a code point's UTF-8 form, at most 6.
std::size_t encode(std::uint32_t code, char *bytes)
{
    if (code < 0x80) {
        bytes[0] = static_cast<char>(code);
        return 1;
    }
    static constexpr std::uint32_t beyond[] = {0x800, 0x10000, 0x200000, 0x4000000};
    static constexpr std::uint32_t lead[] = {0xC0, 0xE0, 0xF0, 0xF8, 0xFC};
    std::size_t form = 0;
    while (form < 4 && code >= beyond[form])
        ++form;
    const std::size_t length = form + 2;
    for (std::size_t i = length - 1; i > 0; --i) {
        bytes[i] = static_cast<char>(0x80 | (code & 0x3F));
        code >>= 6;
    }
    bytes[0] = static_cast<char>(lead[form] | (form == 4 ? code & 1 : code)); // the sixth form holds 31 bits
    return length;
}

// Gathers the bytes of single characters.
class gathered_output {
public:
    explicit gathered_output(soap *context) : ctx(context) {}
    int put(std::string_view bytes)
    {
        if (fill + bytes.size() > sizeof buffer && flush())
            return ctx->error;
        std::memcpy(buffer + fill, bytes.data(), bytes.size());
        fill += bytes.size();
        return 0;
    }
    int put(std::uint32_t code)
    {
        char bytes[6];
        return put(std::string_view(bytes, encode(code, bytes)));
    }
    int flush()
    {
        const std::size_t length = fill;
        fill = 0;
        return soap_send_bytes(ctx, buffer, length);
    }

private:
    soap *ctx;
    std::size_t fill = 0;
    char buffer[256];
};

} // namespace

int soap_text_write_n(soap *ctx, const char *text, std::size_t length, int flag)
{
    if (flag == 2 || (ctx->mode & MODE_UTF_STRINGS))
        return write_text<charset::utf8>(ctx, text, length, flag);
    return write_text<charset::latin1>(ctx, text, length, flag);
}

int soap_text_write(soap *ctx, const char *text, int flag)
{
    return soap_text_write_n(ctx, text, std::strlen(text), flag);
}

int soap_wide_text_write(soap *ctx, const char32_t *text, int flag)
{
    const place where = flag != 0                    ? place::attribute
                        : ctx->mode & MODE_CANONICAL ? place::canonical_element
                                                     : place::element;
    gathered_output output(ctx);
    for (; *text; ++text) {
        const auto code = static_cast<std::uint32_t>(*text);
        const bool is_escaped = code < 128 && (ESCAPES[code] & static_cast<std::uint8_t>(where));
        if (is_escaped ? output.put(escape_of(static_cast<unsigned char>(code))) : output.put(code))
            return ctx->error;
    }
    return output.flush();
}

int soap_char_write(soap *ctx, std::uint32_t code)
{
    char bytes[6];
    return soap_send_bytes(ctx, bytes, encode(code, bytes));
}

int xml_put_wide(soap *ctx, const char32_t *text)
{
    gathered_output output(ctx);
    for (; *text; ++text) {
        if (output.put(static_cast<std::uint32_t>(*text)))
            return ctx->error;
    }
    return output.flush();
}
