// primitives_fuzz.cpp - texts of simple values. What a parser takes, its writer gives back with the same value.

#include "support/memory_wire.h"

namespace {

void check(bool holds)
{
    if (!holds)
        std::abort();
}

void numbers(soap &ctx, const char *text)
{
    std::int64_t number = 0, again = 0;
    if (soap_long_parse(&ctx, text, &number) == 0)
        check(soap_long_parse(&ctx, soap_long_text(&ctx, number), &again) == 0 && again == number);
    std::int32_t small = 0;
    if (soap_int_parse(&ctx, text, &small) == 0)
        check(soap_long_parse(&ctx, text, &number) == 0 && number == small);
    double real = 0, same = 0;
    if (soap_double_parse(&ctx, text, &real) == 0) {
        check(soap_double_parse(&ctx, soap_double_text(&ctx, real), &same) == 0);
        check(same == real || (real != real && same != same));
    }
    std::uint8_t byte = 0;
    std::uint64_t wide = 0;
    float single = 0;
    soap_ubyte_parse(&ctx, text, &byte);
    soap_ulong_parse(&ctx, text, &wide);
    soap_float_parse(&ctx, text, &single);
}

void bytes(soap &ctx, const char *text)
{
    int length = 0;
    const char *decoded = soap_base642s(&ctx, text, nullptr, 0, &length);
    if (decoded && length > 0) {
        const char *encoded =
            soap_s2base64(&ctx, reinterpret_cast<const unsigned char *>(decoded), nullptr, length);
        int again = 0;
        const char *back = encoded ? soap_base642s(&ctx, encoded, nullptr, 0, &again) : nullptr;
        check(back && again == length && std::memcmp(back, decoded, static_cast<std::size_t>(length)) == 0);
    }
    soap_hex_decode(&ctx, text, nullptr, 0, &length);
}

void rest(soap &ctx, const char *text)
{
    std::time_t seconds = 0;
    soap_datetime_parse(&ctx, text, &seconds);
    soap_datetime_text(&ctx, seconds);
    int positions[SOAP_POSITIONS_MAX], sizes[4], offset = 0;
    soap_position_parse(text, positions);
    soap_array_dims_parse(text, sizes, 4);
    soap_array_dims_offset_parse(text, text, &offset);
    char *mapped = nullptr;
    soap_qname_read_map(&ctx, text, &mapped, -1, -1);
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *data, std::size_t size)
{
    static memory_wire ctx;
    const std::string text(reinterpret_cast<const char *>(data), size);
    numbers(ctx, text.c_str());
    bytes(ctx, text.c_str());
    rest(ctx, text.c_str());
    soap_discard_all(&ctx);
    return 0;
}
