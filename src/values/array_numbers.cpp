// array_numbers.cpp - the numbers in the attributes of encoded arrays: sizes, offsets, positions.
//
// Always: texts are "[n,m]" or what a sender made of it; a result that would pass ELEMENTS_MAX is refused, so
// that products of sizes can't overflow.

#include <climits>
#include <cstring>

#include <zuv_client_pro/soap_primitive.h>

#include "xml/scan.h"

namespace {

constexpr std::int64_t ELEMENTS_MAX = 1000000; // elements of one array

bool is_separator(char byte)
{
    return byte == ',' || byte == ' ' || byte == '[';
}

// Multiplies a size into the product; false if it is negative or the product too large.
bool multiply(std::int64_t *product, std::int64_t size)
{
    if (size < 0 || size > ELEMENTS_MAX)
        return false;
    *product *= size;
    return *product <= ELEMENTS_MAX;
}

// Goes one dimension further in a linear offset; false if a number is negative or the offset too large for an
// int.
bool advance(std::int64_t *linear, std::int64_t size, std::int64_t offset)
{
    if (offset < 0 || offset > INT_MAX)
        return false;
    *linear = *linear * size + offset;
    return *linear <= INT_MAX;
}

} // namespace

int soap_array_dims_parse(const char *text, int *sizes, int dimensions)
{
    if (text == nullptr || *text == '\0' || dimensions <= 0)
        return -1;
    std::int64_t product = 1;
    const char *at = text + std::strlen(text);
    do {
        const char *number = at;
        while (number != text && !is_separator(number[-1]))
            number--;
        const std::int64_t size = scan_integer(number).as_signed();
        if (!multiply(&product, size))
            return -1;
        sizes[--dimensions] = static_cast<int>(size);
        at = number != text ? number - 1 : nullptr;
    } while (dimensions > 0 && at != nullptr && *at != '[');
    return static_cast<int>(product);
}

int soap_array_dims_offset_parse(const char *text, const char *offset_text, int *offset)
{
    std::int64_t product = 1, linear = 0;
    if (text == nullptr || *text == '\0')
        return -1;
    if (*text == '[')
        text++;
    for (; text != nullptr; text = after_separator(text)) {
        const scanned_integer size = scan_integer(text);
        if (!size.digits || !multiply(&product, size.as_signed()))
            return -1;
        text = size.end;
        if (offset_text == nullptr || *offset_text == '\0')
            continue;
        const scanned_integer step = scan_integer(offset_text + 1);
        if (!advance(&linear, size.as_signed(), step.as_signed()))
            return -1;
        offset_text = step.end;
    }
    *offset = static_cast<int>(linear);
    return static_cast<int>(product - linear);
}

int soap_array_offset_parse(const char *text, const int *sizes, int *offsets, int dimensions)
{
    std::int64_t linear = 0;
    const char *at = text != nullptr && *text == '[' ? text + 1 : text;
    for (int i = 0; i < dimensions; i++) {
        const std::int64_t number = at != nullptr ? scan_integer(at).as_signed() : 0;
        if (!advance(&linear, sizes[i], number))
            return -1;
        if (offsets != nullptr)
            offsets[i] = static_cast<int>(number);
        at = at != nullptr ? after_separator(at) : nullptr;
    }
    return static_cast<int>(linear);
}
