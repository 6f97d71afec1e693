// number.cpp - numbers: text to value and back.
//
// Here: integers of all widths, float and double. Elsewhere: numbers as elements (simple_element.cpp).
//
// Always: results are those of the C library in the "C" locale, whatever locale or -ffast-math the host has. The parsers
// store a value also when they refuse the text: the nearest one in the long type, cut to the target's width.

#include <bit>
#include <cfenv>
#include <cfloat>
#include <charconv>
#include <clocale>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <locale.h> // NOLINT(modernize-deprecated-headers): newlocale is POSIX

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_primitive.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/failure.h"
#include "xml/scan.h"

namespace {

int refuse(soap *ctx)
{
    return fail(ctx, SOAP_TYPE_MISMATCH);
}

// --- integers ---

// Signed types narrower than 64 bits, and 64 bits: the whole text, within the type's range.
template <class Value> int parse_signed(soap *ctx, const char *text, Value *target)
{
    if (text == nullptr)
        return ctx->error;
    const scanned_integer number = scan_integer(text);
    const std::int64_t value = number.as_signed();
    *target = static_cast<Value>(value);
    const bool fits =
        value >= std::numeric_limits<Value>::min() && value <= std::numeric_limits<Value>::max();
    const bool whole = number.digits && *number.end == '\0';
    return whole && fits && !number.out_of_signed_range() ? SOAP_OK : refuse(ctx);
}

// Unsigned types of 8 and 16 bits: a negative number is out of range.
template <class Value> int parse_small_unsigned(soap *ctx, const char *text, Value *target)
{
    if (text == nullptr)
        return ctx->error;
    const scanned_integer number = scan_integer(text);
    const std::uint64_t value = number.as_unsigned();
    *target = static_cast<Value>(value);
    const bool whole = number.digits && *number.end == '\0';
    return whole && value <= std::numeric_limits<Value>::max() ? SOAP_OK : refuse(ctx);
}

// Unsigned types of 32 and 64 bits: a negative number wraps, and the empty text is 0 unless reading is
// strict.
template <class Value> int parse_large_unsigned(soap *ctx, const char *text, Value *target)
{
    if (text == nullptr)
        return ctx->error;
    const scanned_integer number = scan_integer(text);
    *target = static_cast<Value>(number.as_unsigned());
    const bool in_range = !number.overflow && number.magnitude <= std::numeric_limits<Value>::max();
    const bool digits = number.digits || (ctx->mode & MODE_STRICT) == 0;
    return digits && *number.end == '\0' && in_range ? SOAP_OK : refuse(ctx);
}

// --- float and double ---

constexpr const char *FLOAT_FORMAT = "%.9G";
constexpr const char *DOUBLE_FORMAT = "%.17lG";

// The "C" locale for the C library's calls of this thread, while it lives.
class c_locale_scope {
public:
    c_locale_scope() : before(uselocale(c_locale())) {}
    c_locale_scope(const c_locale_scope &) = delete;
    c_locale_scope &operator=(const c_locale_scope &) = delete;
    ~c_locale_scope() { uselocale(before); }

private:
    locale_t before;

    static locale_t c_locale()
    {
        static const locale_t locale = newlocale(LC_ALL_MASK, "C", nullptr);
        return locale;
    }
};

enum class number_kind { finite, positive_infinity, negative_infinity, not_a_number };

number_kind kind_of(const char *text)
{
    if (soap_tag_match(text, "INF") == 0 || soap_tag_match(text, "+INF") == 0)
        return number_kind::positive_infinity;
    if (soap_tag_match(text, "-INF") == 0)
        return number_kind::negative_infinity;
    return soap_tag_match(text, "NaN") == 0 ? number_kind::not_a_number : number_kind::finite;
}

// Plain decimal numbers, which are nearly all that comes.
bool parse_plain(const char *text, double *value)
{
    if ((*text < '0' || *text > '9') && *text != '-')
        return false;
    const char *end = text + std::strlen(text);
    const std::from_chars_result result = std::from_chars(text, end, *value);
    return result.ec == std::errc() && result.ptr == end;
}

// Everything else that the C library takes: a sign, white space, hexadecimal, numbers out of range, and,
// where sscanf finds a number at the start, text after it.
bool parse_by_library(const char *text, double *value)
{
    const c_locale_scope scope;
    char *end = nullptr;
    *value = std::strtod(text, &end);
    return *end == '\0' || std::sscanf(text, "%lg", value) == 1;
}

// The arithmetic of IEEE 754 in this thread, while it lives: a host made with -ffast-math takes numbers below the
// normal ones for 0.
class exact_arithmetic_scope {
public:
    exact_arithmetic_scope()
    {
        std::fegetenv(&before);
        std::fesetenv(FE_DFL_ENV);
    }
    exact_arithmetic_scope(const exact_arithmetic_scope &) = delete;
    exact_arithmetic_scope &operator=(const exact_arithmetic_scope &) = delete;
    ~exact_arithmetic_scope() { std::fesetenv(&before); }

private:
    std::fenv_t before;
};

// From one floating type to the other where the float is below its normal numbers. Volatile: the compiler may
// move a conversion over the change of arithmetic, but neither reading nor writing.
template <class To, class From> To convert_exactly(From value)
{
    const exact_arithmetic_scope scope;
    const volatile From from = value;
    const volatile To to = static_cast<To>(from);
    return to;
}

float to_float(double value)
{
    return value == 0 || std::fabs(value) >= FLT_MIN ? static_cast<float>(value)
                                                     : convert_exactly<float>(value);
}

double to_double(float value)
{
    const std::uint32_t magnitude = std::bit_cast<std::uint32_t>(value) & 0x7FFFFFFF;
    const std::uint32_t normal = std::bit_cast<std::uint32_t>(FLT_MIN);
    return magnitude == 0 || magnitude >= normal ? static_cast<double>(value)
                                                 : convert_exactly<double>(value);
}

template <class Value> void store_number(double value, Value *target)
{
    if constexpr (std::is_same_v<Value, float>) {
        // Halfway between FLT_MAX and the next number of that spacing: from here on the value rounds to
        // infinity.
        constexpr double overflow_from = 0x1.ffffffp127;
        if (std::isfinite(value) && std::fabs(value) >= overflow_from)
            value = std::copysign(HUGE_VAL, value);
        *target = to_float(value);
    } else {
        *target = value;
    }
}

template <class Value> int parse_floating(soap *ctx, const char *text, Value *target)
{
    if (text == nullptr)
        return ctx->error;
    if (*text == '\0')
        return refuse(ctx);
    double value = 0;
    if (parse_plain(text, &value)) {
        store_number(value, target);
        return SOAP_OK;
    }
    switch (kind_of(text)) {
    case number_kind::positive_infinity:
        *target = std::numeric_limits<Value>::infinity();
        return SOAP_OK;
    case number_kind::negative_infinity:
        *target = -std::numeric_limits<Value>::infinity();
        return SOAP_OK;
    case number_kind::not_a_number:
        std::memset(target, 0xFF, sizeof *target);
        return SOAP_OK;
    case number_kind::finite:
        break;
    }
    const bool parsed = parse_by_library(text, &value);
    store_number(value, target);
    return parsed ? SOAP_OK : refuse(ctx);
}

const char *floating_text(soap *ctx, double value, const char *format)
{
    if (std::isnan(value))
        return "NaN";
    if (std::isinf(value))
        return value > 0 ? "INF" : "-INF";
    const c_locale_scope scope;
    std::snprintf(ctx->scratch_text, sizeof ctx->scratch_text, format, value);
    if (char *comma = std::strchr(ctx->scratch_text, ','))
        *comma = '.';
    return ctx->scratch_text;
}

template <class Value> const char *integer_text(soap *ctx, Value value)
{
    *std::to_chars(ctx->scratch_text, ctx->scratch_text + sizeof ctx->scratch_text - 1, value).ptr = '\0';
    return ctx->scratch_text;
}

} // namespace

int soap_byte_parse(soap *ctx, const char *text, std::int8_t *target)
{
    return parse_signed(ctx, text, target);
}

int soap_short_parse(soap *ctx, const char *text, std::int16_t *target)
{
    return parse_signed(ctx, text, target);
}

int soap_int_parse(soap *ctx, const char *text, std::int32_t *target)
{
    return parse_signed(ctx, text, target);
}

int soap_long_parse(soap *ctx, const char *text, std::int64_t *target)
{
    return parse_signed(ctx, text, target);
}

int soap_long64_parse(soap *ctx, const char *text, std::int64_t *target)
{
    if (text == nullptr)
        return ctx->error;
    const scanned_integer number = scan_integer(text);
    if (!number.digits)
        return refuse(ctx);
    *target = number.as_signed();
    return SOAP_OK;
}

int soap_ubyte_parse(soap *ctx, const char *text, std::uint8_t *target)
{
    return parse_small_unsigned(ctx, text, target);
}

int soap_ushort_parse(soap *ctx, const char *text, std::uint16_t *target)
{
    return parse_small_unsigned(ctx, text, target);
}

int soap_uint_parse(soap *ctx, const char *text, std::uint32_t *target)
{
    return parse_large_unsigned(ctx, text, target);
}

int soap_ulong_parse(soap *ctx, const char *text, std::uint64_t *target)
{
    return parse_large_unsigned(ctx, text, target);
}

int soap_ulong64_parse(soap *ctx, const char *text, std::uint64_t *target)
{
    if (text == nullptr)
        return ctx->error;
    const scanned_integer number = scan_integer(text);
    if (!number.digits)
        return refuse(ctx);
    *target = number.as_unsigned();
    return SOAP_OK;
}

int soap_float_parse(soap *ctx, const char *text, float *target)
{
    return parse_floating(ctx, text, target);
}

int soap_double_parse(soap *ctx, const char *text, double *target)
{
    return parse_floating(ctx, text, target);
}

const char *soap_long_text(soap *ctx, std::int64_t value)
{
    return integer_text(ctx, value);
}

const char *soap_ulong_text(soap *ctx, std::uint64_t value)
{
    return integer_text(ctx, value);
}

const char *soap_float_text(soap *ctx, float value)
{
    return floating_text(ctx, to_double(value),
                         ctx->float_format != nullptr ? ctx->float_format : FLOAT_FORMAT);
}

const char *soap_double_text(soap *ctx, double value)
{
    return floating_text(ctx, value, ctx->double_format != nullptr ? ctx->double_format : DOUBLE_FORMAT);
}
