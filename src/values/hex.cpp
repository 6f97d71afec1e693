// hex.cpp - bytes as hexadecimal text and back.
//
// Always: text that is given whole is taken on trust, content of a message is checked.

#include <algorithm>
#include <climits>
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_primitive.h>

#include "core/failure.h"
#include "core/hex_digit.h"
#include "values/inline_bytes.h"

namespace {

constexpr std::size_t WRITE_BYTES = 512; // encoded at once: 1024 characters
constexpr char LOWER[] = "0123456789abcdef";
constexpr char UPPER[] = "0123456789ABCDEF";

char *encode(const unsigned char *bytes, std::size_t length, const char *digits, char *out)
{
    for (; length > 0; bytes++, length--) {
        *out++ = digits[*bytes >> 4];
        *out++ = digits[*bytes & 15];
    }
    return out;
}

// Value of a digit; for other characters whatever comes out.
inline unsigned digit_value(char digit)
{
    const unsigned code = static_cast<unsigned char>(digit);
    return code >= 'A' ? (code & 7) + 9 : code - '0';
}

inline unsigned char byte_of(char high, char low)
{
    return static_cast<unsigned char>((digit_value(high) << 4) + digit_value(low));
}

inline bool is_hex_digit(std::int32_t code)
{
    return hex_digit(code) >= 0;
}

// Decodes the pairs of digits at the start of a stretch into the growing text, which has space for them.
const char *take_pairs(soap *ctx, const char *text, const char *end)
{
    while (end - text >= 2 && is_hex_digit(text[0]) && is_hex_digit(text[1])) {
        ctx->label_buffer[ctx->label_index++] = static_cast<char>(byte_of(text[0], text[1]));
        text += 2;
    }
    return text;
}

// First character after blanks.
std::int32_t first_character(soap *ctx)
{
    std::int32_t token = inline_character_next(ctx);
    while (token >= 0 && token <= ' ')
        token = inline_character_next(ctx);
    return token;
}

} // namespace

const char *soap_hex_decode(soap *ctx, const char *text, char *target, std::size_t capacity, int *length)
{
    if (length != nullptr)
        *length = 0;
    if (text == nullptr || *text == '\0')
        return ctx->error == SOAP_OK ? "" : nullptr;
    if (target == nullptr) {
        capacity = std::strlen(text) / 2 + 1;
        target = static_cast<char *>(soap_block_alloc(ctx, capacity));
        if (target == nullptr)
            return nullptr;
    }
    std::size_t count = 0;
    for (; count < capacity && text[0] != '\0' && text[1] != '\0'; text += 2)
        target[count++] = static_cast<char>(byte_of(text[0], text[1]));
    if (length != nullptr)
        *length = static_cast<int>(std::min<std::size_t>(count, INT_MAX));
    if (count < capacity)
        target[count] = '\0';
    return target;
}

char *soap_hex_encode(soap *ctx, const unsigned char *bytes, char *target, int length)
{
    const std::size_t count = bytes != nullptr && length > 0 ? static_cast<std::size_t>(length) : 0;
    if (target == nullptr)
        target = static_cast<char *>(soap_block_alloc(ctx, 2 * count + 1));
    if (target != nullptr)
        *encode(bytes, count, LOWER, target) = '\0';
    return target;
}

int soap_hex_write(soap *ctx, const unsigned char *bytes, std::size_t length)
{
    char text[2 * WRITE_BYTES];
    while (length > 0) {
        const std::size_t count = std::min(length, WRITE_BYTES);
        if (soap_send_bytes(ctx, text, static_cast<std::size_t>(encode(bytes, count, UPPER, text) - text)))
            return ctx->error;
        bytes += count;
        length -= count;
    }
    return SOAP_OK;
}

unsigned char *soap_hex_inline_read(soap *ctx, int *length)
{
    ctx->label_index = 0;
    if (ctx->has_body == 0)
        return inline_block_save(ctx, length);
    std::int32_t high = first_character(ctx);
    while (is_hex_digit(high)) {
        const std::int32_t low = inline_character_next(ctx);
        if (!is_hex_digit(low))
            return fail_null(ctx, SOAP_TYPE_MISMATCH);
        const inline_stretch stretch = inline_stretch_next(ctx);
        if (soap_text_buffer_reserve(ctx, stretch.length() / 2 + 1))
            return nullptr;
        ctx->label_buffer[ctx->label_index++] =
            static_cast<char>(byte_of(static_cast<char>(high), static_cast<char>(low)));
        inline_stretch_consume(ctx, take_pairs(ctx, stretch.start, stretch.end));
        high = inline_character_next(ctx);
    }
    inline_rest_skip(ctx, high);
    return inline_block_save(ctx, length);
}
