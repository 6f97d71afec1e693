// xml_write_text.cpp - text out: escapes, Latin-1 and wide characters as UTF-8, refusal of what XML can't
// carry.
//
// Here: which bytes need a closer look, and finding them sixteen at a time. Elsewhere: who writes text
// (xml_write.cpp), well-formed UTF-8 (xml/utf8.h).
//
// Always: stretches that need no escape go out in one piece; in a counting pass they are only measured.
#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string_view>
#include <utility>
#ifdef __SSE2__
#include <emmintrin.h>
#endif

#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/copy_short.h"
#include "core/failure.h"
#include "xml/xml_scan.h"
#include "xml/xml_write.h"
#include "xml/xml_write_fast.h"

namespace {

// Where a text is written decides what its characters become.
enum class place : std::uint8_t { element = 1, canonical_element = 2, attribute = 4 };

constexpr std::uint8_t HIGH_BYTE = 8;
constexpr std::ptrdiff_t STRETCH = 16384; // bytes looked at before they are sent: still in the cache then

// What a byte needs, by place. Control characters need to be refused, and white space is looked at with them.
constexpr std::array<std::uint8_t, 256> special_table()
{
    constexpr auto element = static_cast<std::uint8_t>(place::element);
    constexpr auto canonical = static_cast<std::uint8_t>(place::canonical_element);
    constexpr auto attribute = static_cast<std::uint8_t>(place::attribute);
    std::array<std::uint8_t, 256> table{};
    for (std::size_t i = 0; i < ' '; ++i)
        table[i] = element | canonical | attribute;
    table['"'] = attribute;
    table['&'] = element | canonical | attribute;
    table['<'] = element | canonical | attribute;
    table['>'] = element | canonical;
    for (std::size_t i = 128; i < 256; ++i)
        table[i] = HIGH_BYTE;
    return table;
}
constexpr std::array<std::uint8_t, 256> SPECIAL = special_table();

// What a special byte below 128 becomes; empty for what XML can't carry.
template <place P> constexpr std::string_view escape_of(unsigned char c)
{
    switch (c) {
    case '\t':
        return P == place::attribute ? "&#x9;" : "\t";
    case '\n':
        return P == place::canonical_element ? "\n" : "&#xA;";
    case '\r':
        return "&#xD;";
    case '"':
        return "&quot;";
    case '&':
        return "&amp;";
    case '<':
        return "&lt;";
    case '>':
        return "&gt;";
    default:
        return {};
    }
}

template <place P> bool is_special(char c)
{
    return (SPECIAL[static_cast<unsigned char>(c)] & (static_cast<std::uint8_t>(P) | HIGH_BYTE)) != 0;
}

#ifdef __SSE2__

// Bit i is set if byte i is special. Pairs of characters that differ in one bit are found together.
template <place P> unsigned special_mask(__m128i bytes)
{
    const auto is = [](__m128i text, char c) { return _mm_cmpeq_epi8(text, _mm_set1_epi8(c)); };
    __m128i found = _mm_cmpeq_epi8(_mm_min_epu8(bytes, _mm_set1_epi8(' ' - 1)), bytes);
    if constexpr (P == place::attribute) {
        const __m128i without_4 = _mm_and_si128(bytes, _mm_set1_epi8(static_cast<char>(~4)));
        found = _mm_or_si128(found, _mm_or_si128(is(without_4, '"'), is(bytes, '<'))); // "&" too
    } else {
        const __m128i with_2 = _mm_or_si128(bytes, _mm_set1_epi8(2));
        found = _mm_or_si128(found, _mm_or_si128(is(with_2, '>'), is(bytes, '&'))); // "<" too
    }
    // Of bytes from 128 on the top bits count.
    return static_cast<unsigned>(_mm_movemask_epi8(_mm_or_si128(found, bytes)));
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

template <place P, class Half>
[[gnu::always_inline]] inline std::size_t clean_short(const char *text, std::size_t length)
{
    const unsigned mask = special_mask<P>(both_ends<Half>(text, length));
    if (mask == 0)
        return length;
    const std::size_t bit = first_bit(mask);
    return bit < sizeof(Half) ? bit : length - 2 * sizeof(Half) + bit;
}

#endif

// Bytes up to the first special one.
template <place P>
[[gnu::always_inline]] inline std::size_t clean_length(const char *text, std::size_t length)
{
    std::size_t done = 0;
#ifdef __SSE2__
    const auto load = [text](std::size_t at) {
        return _mm_loadu_si128(reinterpret_cast<const __m128i *>(text + at));
    };
    for (; done + 16 <= length; done += 16) {
        if (const unsigned mask = special_mask<P>(load(done)))
            return done + first_bit(mask);
    }
    if (done == length)
        return length;
    if (length > 16) {
        const unsigned mask = special_mask<P>(load(length - 16));
        return mask ? length - 16 + first_bit(mask) : length;
    }
    if (length >= 8)
        return clean_short<P, long long>(text, length);
    if (length >= 4)
        return clean_short<P, int>(text, length);
#endif
    while (done < length && !is_special<P>(text[done]))
        ++done;
    return done;
}

// A text that is refused before it is sent: its host learns what it holds.
[[gnu::cold]] int refuse(soap *ctx, const char *format, unsigned value)
{
    char text[96];
    std::snprintf(text, sizeof text, format, value);
    if (ctx->fault == nullptr) { // which may be what is being written
        if (const char *const copy = soap_string_dup(ctx, text))
            fail_as_sender(ctx, copy, nullptr, SOAP_UTF_ERROR);
    }
    return fail(ctx, SOAP_UTF_ERROR);
}

int refuse_character(soap *ctx, std::uint32_t code)
{
    return refuse(ctx, "A text to be sent holds U+%04X, which XML cannot carry", code);
}

int refuse_bytes(soap *ctx, char byte)
{
    return refuse(ctx, "A text to be sent should be UTF-8 and is not, from a byte 0x%02X on",
                  static_cast<unsigned char>(byte));
}

// What may come between bytes from 128 on, by place.
template <bool High> using element_stop = byte_class<false, High, '<', '>', '&', '\n', '\r'>;
template <bool High> using attribute_stop = byte_class<false, High, '<', '"', '&', '\t', '\n', '\r'>;

// From a byte of 128 or above on, sends what is of UTF-8 and needs no escape. `text` moves past it.
template <place P> int put_utf8(soap *ctx, const char *&text, const char *end)
{
    const char *stop = end - text > STRETCH ? text + STRETCH : end;
    if constexpr (P == place::attribute)
        stop = utf8_stretch_end<attribute_stop>(text, stop);
    else
        stop = utf8_stretch_end<element_stop>(text, stop);
    if (stop == text)
        return refuse_bytes(ctx, *text);
    const char *const start = std::exchange(text, stop);
    return soap_send_bytes(ctx, start, static_cast<std::size_t>(stop - start));
}

int put_latin1(soap *ctx, const char *&text)
{
    char bytes[6];
    return soap_send_bytes(ctx, bytes, utf8_encode(static_cast<unsigned char>(*text++), bytes));
}

template <place P> int put_escape(soap *ctx, const char *&text)
{
    const std::string_view escape = escape_of<P>(static_cast<unsigned char>(*text));
    if (escape.empty())
        return refuse_character(ctx, static_cast<unsigned char>(*text));
    ++text;
    return xml_put(ctx, escape);
}

template <place P> [[gnu::noinline]] int put_high(soap *ctx, int flag, const char *&text, const char *end)
{
    const bool is_utf8 = flag == 2 || (ctx->mode & MODE_UTF_STRINGS);
    return is_utf8 ? put_utf8<P>(ctx, text, end) : put_latin1(ctx, text);
}

template <place P>
[[gnu::always_inline]] inline int write_text(soap *ctx, const char *text, std::size_t length, int flag)
{
    const char *const end = text + length;
    while (text != end) {
        const std::size_t clean =
            clean_length<P>(text, static_cast<std::size_t>(std::min(end - text, STRETCH)));
        if (clean > 0 && soap_send_bytes(ctx, text, clean))
            return ctx->error;
        text += clean;
        while (text != end && is_special<P>(*text)) {
            if (is_high(*text) ? put_high<P>(ctx, flag, text, end) : put_escape<P>(ctx, text))
                return ctx->error;
        }
    }
    return SOAP_OK;
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
        return SOAP_OK;
    }
    int put(std::uint32_t code)
    {
        char bytes[6];
        return put(std::string_view(bytes, utf8_encode(code, bytes)));
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

template <place P> int write_wide(soap *ctx, const char32_t *text)
{
    gathered_output output(ctx);
    for (; *text; ++text) {
        const auto code = static_cast<std::uint32_t>(*text);
        if (!xml_carries(code))
            return refuse_character(ctx, code);
        const bool is_escaped = code < 128 && is_special<P>(static_cast<char>(code));
        if (is_escaped ? output.put(escape_of<P>(static_cast<unsigned char>(code))) : output.put(code))
            return ctx->error;
    }
    return output.flush();
}

// Out of line: what escapes need costs the texts that need none more than the look at them.
[[gnu::noinline]] int write_any(soap *ctx, const char *text, std::size_t length, int flag)
{
    if (flag != 0)
        return write_text<place::attribute>(ctx, text, length, flag);
    if (ctx->mode & MODE_CANONICAL)
        return write_text<place::canonical_element>(ctx, text, length, flag);
    return write_text<place::element>(ctx, text, length, 0);
}

} // namespace

int soap_text_write_n(soap *ctx, const char *text, std::size_t length, int flag)
{
    constexpr std::size_t SHORT = 256; // bytes
    if (flag == 0 && length <= SHORT && !(ctx->mode & MODE_CANONICAL) &&
        clean_length<place::element>(text, length) == length) {
        char *const to = xml_reserve(ctx, length);
        if (to == nullptr)
            return soap_send_bytes(ctx, text, length);
        copy_short(to, text, length);
        return SOAP_OK;
    }
    return write_any(ctx, text, length, flag);
}

int soap_text_write(soap *ctx, const char *text, int flag)
{
    return soap_text_write_n(ctx, text, std::strlen(text), flag);
}

int soap_wide_text_write(soap *ctx, const char32_t *text, int flag)
{
    if (flag != 0)
        return write_wide<place::attribute>(ctx, text);
    if (ctx->mode & MODE_CANONICAL)
        return write_wide<place::canonical_element>(ctx, text);
    return write_wide<place::element>(ctx, text);
}

int soap_char_write(soap *ctx, std::uint32_t code)
{
    char bytes[6];
    return soap_send_bytes(ctx, bytes, utf8_encode(code, bytes));
}

int xml_put_literal(soap *ctx, std::string_view text)
{
    const char *const end = text.data() + text.size();
    for (const char *p = text.data(); p != end;) {
        const char *stop = literal_stop<true>::find(p, end);
        p = stop != end && is_high(*stop) ? utf8_stretch_end<literal_stop>(stop, end) : stop;
        if (stop != end && p == stop)
            return is_high(*p) ? refuse_bytes(ctx, *p)
                               : refuse_character(ctx, static_cast<unsigned char>(*p));
    }
    return xml_put(ctx, text);
}

int xml_put_wide(soap *ctx, const char32_t *text)
{
    gathered_output output(ctx);
    for (; *text; ++text) {
        const auto code = static_cast<std::uint32_t>(*text);
        if (!xml_carries(code))
            return refuse_character(ctx, code);
        if (output.put(code))
            return ctx->error;
    }
    return output.flush();
}
