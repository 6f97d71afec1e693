// base64.cpp - bytes as base64 text and back.
//
// Here: the exported pair for hosts, writing to and reading from a message. Elsewhere: the binary value's
// class.
//
// Always: work is done in stretches, by table: on reading directly in the input buffer.

#include <algorithm>
#include <array>
#include <climits>
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_primitive.h>

#include "core/failure.h"
#include "values/inline_bytes.h"

namespace {

constexpr char ALPHABET[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
constexpr std::size_t WRITE_BYTES = 768; // encoded at once: 1024 characters

// --- encoding ---

struct digit_pair {
    char digits[2];
};

constexpr auto PAIRS = [] {
    std::array<digit_pair, 4096> pairs = {};
    for (std::size_t i = 0; i < pairs.size(); i++)
        pairs[i] = {{ALPHABET[i >> 6], ALPHABET[i & 63]}};
    return pairs;
}();

// Writes (length + 2) / 3 * 4 characters; returns the place after them.
char *encode(const unsigned char *bytes, std::size_t length, char *out)
{
    for (; length >= 3; bytes += 3, length -= 3, out += 4) {
        const auto bits = static_cast<std::uint32_t>(bytes[0] << 16 | bytes[1] << 8 | bytes[2]);
        std::memcpy(out, PAIRS[bits >> 12].digits, 2);
        std::memcpy(out + 2, PAIRS[bits & 4095].digits, 2);
    }
    if (length == 0)
        return out;
    const auto bits = static_cast<std::uint32_t>(bytes[0] << 16 | (length == 2 ? bytes[1] << 8 : 0));
    std::memcpy(out, PAIRS[bits >> 12].digits, 2);
    out[2] = length == 2 ? ALPHABET[bits >> 6 & 63] : '=';
    out[3] = '=';
    return out + 4;
}

// --- decoding ---

constexpr std::uint8_t BLANK = 64; // bytes up to 32: passed over
constexpr std::uint8_t STOP = 65;  // "=" and all that is outside the alphabet

constexpr auto DIGITS = [] {
    std::array<std::uint8_t, 256> digits = {};
    for (std::size_t i = 0; i < digits.size(); i++)
        digits[i] = i <= ' ' ? BLANK : STOP;
    for (std::uint8_t i = 0; i < 64; i++)
        digits[static_cast<unsigned char>(ALPHABET[i])] = i;
    return digits;
}();

constexpr std::uint32_t NO_DIGIT = 0x80000000; // set in what a quartet table holds for other bytes

// Digits shifted to their place in a quartet.
template <int Shift>
constexpr auto SHIFTED = [] {
    std::array<std::uint32_t, 256> shifted = {};
    for (std::size_t i = 0; i < shifted.size(); i++)
        shifted[i] = DIGITS[i] < 64 ? static_cast<std::uint32_t>(DIGITS[i]) << Shift : NO_DIGIT;
    return shifted;
}();

inline std::uint32_t quartet(const char *text)
{
    const auto *bytes = reinterpret_cast<const unsigned char *>(text);
    return SHIFTED<18>[bytes[0]] | SHIFTED<12>[bytes[1]] | SHIFTED<6>[bytes[2]] | SHIFTED<0>[bytes[3]];
}

class decoder {
public:
    // Where the bytes go; `capacity` of them at most.
    void set_target(unsigned char *target, std::size_t capacity)
    {
        out = target;
        out_end = target + capacity;
    }
    const unsigned char *written() const { return out; }
    bool full() const { return out == out_end; }

    // Decodes up to `end`, a byte that is neither digit nor blank, or the target's end; returns where it
    // stopped.
    const char *take(const char *text, const char *end)
    {
        while (text != end && !full()) {
            if (held == 0)
                text = take_quartets(text, end);
            if (text == end || full() || !take_byte(*text))
                break;
            text++;
        }
        return text;
    }

    // A single character; false if it is neither digit nor blank.
    bool take_byte(char byte)
    {
        const std::uint8_t digit = DIGITS[static_cast<unsigned char>(byte)];
        if (digit >= BLANK)
            return digit == BLANK;
        bits = bits << 6 | digit;
        if (++held == 4)
            put(3);
        return true;
    }

    // Writes out what the last, incomplete quartet holds.
    void finish()
    {
        bits <<= 6 * (4 - held);
        put(held > 1 ? held - 1 : 0);
    }

private:
    unsigned char *out = nullptr, *out_end = nullptr;
    std::uint32_t bits = 0;
    unsigned held = 0; // digits in `bits`

    const char *take_quartets(const char *text, const char *end)
    {
        for (; end - text >= 4 && out_end - out >= 3; text += 4, out += 3) {
            const std::uint32_t value = quartet(text);
            if ((value & NO_DIGIT) != 0)
                break;
            out[0] = static_cast<unsigned char>(value >> 16);
            out[1] = static_cast<unsigned char>(value >> 8);
            out[2] = static_cast<unsigned char>(value);
        }
        return text;
    }

    void put(unsigned count)
    {
        for (int shift = 16; count > 0 && !full(); count--, shift -= 8)
            *out++ = static_cast<unsigned char>(bits >> shift);
        bits = 0;
        held = 0;
    }
};

const char *nothing_decoded(soap *ctx, int *length)
{
    if (length != nullptr)
        *length = 0;
    return ctx->error == SOAP_OK ? "" : nullptr;
}

} // namespace

const char *soap_base642s(soap *ctx, const char *text, char *target, std::size_t capacity, int *length)
{
    if (text == nullptr || *text == '\0')
        return nothing_decoded(ctx, length);
    const std::size_t text_length = std::strlen(text);
    if (target == nullptr) {
        capacity = (text_length + 3) / 4 * 3 + 1;
        target = static_cast<char *>(soap_block_alloc(ctx, capacity));
        if (target == nullptr)
            return nullptr;
    }
    decoder decoded;
    decoded.set_target(reinterpret_cast<unsigned char *>(target), capacity);
    const char *stopped = decoded.take(text, text + text_length);
    if (!decoded.full() && *stopped != '\0' && *stopped != '=')
        return fail_null(ctx, SOAP_TYPE_MISMATCH);
    decoded.finish();
    const auto count = static_cast<std::size_t>(reinterpret_cast<const char *>(decoded.written()) - target);
    if (length != nullptr)
        *length = static_cast<int>(std::min<std::size_t>(count, INT_MAX));
    if (count < capacity)
        target[count] = '\0';
    return target;
}

char *soap_s2base64(soap *ctx, const unsigned char *bytes, char *target, int length)
{
    const std::size_t count = bytes != nullptr && length > 0 ? static_cast<std::size_t>(length) : 0;
    if (target == nullptr)
        target = static_cast<char *>(soap_block_alloc(ctx, (count + 2) / 3 * 4 + 1));
    if (target != nullptr)
        *encode(bytes, count, target) = '\0';
    return target;
}

int soap_base64_write(soap *ctx, const unsigned char *bytes, std::size_t length)
{
    char text[WRITE_BYTES / 3 * 4];
    while (length > 0) {
        const std::size_t count = std::min(length, WRITE_BYTES);
        const char *end = encode(bytes, count, text);
        if (soap_send_bytes(ctx, text, static_cast<std::size_t>(end - text)))
            return ctx->error;
        bytes += count;
        length -= count;
    }
    return SOAP_OK;
}

unsigned char *soap_base64_inline_read(soap *ctx, int *length)
{
    decoder decoded;
    ctx->label_index = 0;
    for (std::int32_t token = 0; ctx->has_body != 0;) {
        const inline_stretch stretch = inline_stretch_next(ctx);
        // Three bytes for each four characters, for what the decoder holds and for one that follows.
        if (soap_text_buffer_reserve(ctx, stretch.length() / 4 * 3 + 6))
            return nullptr;
        decoded.set_target(reinterpret_cast<unsigned char *>(ctx->label_buffer) + ctx->label_index,
                           ctx->label_size - ctx->label_index);
        inline_stretch_consume(ctx, decoded.take(stretch.start, stretch.end));
        token = inline_character_next(ctx);
        const bool taken =
            token >= 0 && token != '=' && token < 256 && decoded.take_byte(static_cast<char>(token));
        const bool ends = token < 0 || token == '=';
        if (ends)
            decoded.finish();
        ctx->label_index =
            static_cast<std::size_t>(reinterpret_cast<const char *>(decoded.written()) - ctx->label_buffer);
        if (ends) {
            inline_rest_skip(ctx, token);
            break;
        }
        if (!taken)
            return fail_null(ctx, SOAP_TYPE_MISMATCH);
    }
    return inline_block_save(ctx, length);
}
