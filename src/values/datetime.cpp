// datetime.cpp - xsd:dateTime: text to seconds since 1970 and back.
//
// Elsewhere: dates that the data classes hold as text.
// Always: fields may lie outside their usual range and then carry over, as mktime does it; fields that don't
// fit an int are refused.

#include <algorithm>
#include <climits>
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_primitive.h>

#include "core/failure.h"
#include "xml/scan.h"

namespace {

constexpr std::size_t ZONE_SIZE = 32; // what follows the seconds, terminator included
constexpr int FIELDS = 6;             // year, month, day, hour, minute, second

// A form of the text: the byte before each field (0 for none) and the field's greatest width (0 for any).
struct date_form {
    char before[FIELDS];
    int width[FIELDS];
};

constexpr date_form EXTENDED = {{0, '-', '-', 'T', ':', ':'}, {0, 0, 0, 0, 0, 0}};
constexpr date_form BASIC_DATE = {{0, 0, 0, 'T', ':', ':'}, {4, 2, 2, 0, 0, 0}};
constexpr date_form BASIC = {{0, 0, 0, 'T', 0, 0}, {4, 2, 2, 2, 2, 2}};

const date_form &form_of(const char *text)
{
    if (std::strchr(text, '-') != nullptr)
        return EXTENDED;
    return std::strchr(text, ':') != nullptr ? BASIC_DATE : BASIC;
}

bool fits_int(std::int64_t value)
{
    return value >= INT_MIN && value <= INT_MAX;
}

// Reads an int field; null if there is none or it is out of range.
const char *scan_field(const char *text, int width, std::int64_t *field)
{
    const scanned_integer number = scan_integer(text, width);
    *field = number.as_signed();
    return number.digits && !number.out_of_signed_range() && fits_int(*field) ? number.end : nullptr;
}

// Reads the six fields; null if one is missing, else what follows.
const char *scan_fields(const char *text, std::int64_t fields[FIELDS])
{
    const date_form &form = form_of(text);
    for (int i = 0; i < FIELDS && text != nullptr; i++) {
        if (form.before[i] != 0 && *text++ != form.before[i])
            return nullptr;
        text = scan_field(text, form.width[i], &fields[i]);
    }
    return text;
}

// The word after the seconds, cut to its buffer, less the fraction.
const char *zone_of(const char *text, char word[ZONE_SIZE])
{
    while (is_c_space(*text))
        text++;
    std::size_t length = 0;
    while (length < ZONE_SIZE - 1 && text[length] != '\0' && !is_c_space(text[length]))
        length++;
    std::memcpy(word, text, length);
    word[length] = '\0';
    if (*word != '.')
        return word;
    for (word++; is_digit(*word);)
        word++;
    return word;
}

struct zone_offset {
    std::int64_t hours, minutes;
};

zone_offset parse_zone(const char *zone)
{
    const scanned_integer first = scan_integer(zone);
    if (std::strlen(zone) < 4 || zone[3] != ':')
        return {first.as_signed() / 100, first.as_signed() % 100};
    const std::int64_t hours = first.digits ? first.as_signed() : 0;
    const std::int64_t minutes =
        first.digits && *first.end == ':' ? scan_integer(first.end + 1).as_signed() : 0;
    return {hours, hours < 0 ? -std::max(minutes, -INT64_MAX) : minutes};
}

// Takes `units` of `size` out of a value too small or too great for its field.
std::int64_t carry(std::int64_t *value, std::int64_t size)
{
    std::int64_t units = *value / size;
    *value %= size;
    if (*value < 0) {
        *value += size;
        units--;
    }
    return units;
}

// Moves a local time to UTC. False if the fields leave their range.
bool apply_zone(std::tm *time, zone_offset offset)
{
    if (!fits_int(offset.hours) || !fits_int(offset.minutes))
        return false;
    std::int64_t minute = time->tm_min - offset.minutes;
    std::int64_t hour = time->tm_hour - offset.hours + carry(&minute, 60);
    const std::int64_t day = time->tm_mday + carry(&hour, 24);
    time->tm_min = static_cast<int>(minute);
    time->tm_hour = static_cast<int>(hour);
    time->tm_mday = static_cast<int>(day);
    return fits_int(day);
}

// False if the text is no date.
bool parse(const char *text, std::time_t *target)
{
    std::int64_t fields[FIELDS] = {};
    text = scan_fields(text, fields);
    if (text == nullptr || !fits_int(fields[0]) || !fits_int(fields[1]))
        return false;
    // Year 1 stands for "no date" with senders that count from it; it is read as the first year of the count.
    const std::int64_t year = fields[0] == 1 ? 70 : fields[0] - 1900;
    const std::int64_t month = fields[1] - 1;
    if (!fits_int(year) || !fits_int(month))
        return false;
    std::tm time = {};
    time.tm_year = static_cast<int>(year);
    time.tm_mon = static_cast<int>(month);
    time.tm_mday = static_cast<int>(fields[2]);
    time.tm_hour = static_cast<int>(fields[3]);
    time.tm_min = static_cast<int>(fields[4]);
    time.tm_sec = static_cast<int>(fields[5]);
    char word[ZONE_SIZE];
    const char *zone = zone_of(text, word);
    if (*zone == '\0') {
        time.tm_isdst = -1;
        *target = std::mktime(&time);
        return true;
    }
    if ((*zone == '+' || *zone == '-') && !apply_zone(&time, parse_zone(zone)))
        return false;
    *target = soap_timegm(&time);
    return true;
}

} // namespace

int soap_datetime_parse(soap *ctx, const char *text, std::time_t *target)
{
    if (text == nullptr)
        return ctx->error;
    return parse(text, target) ? SOAP_OK : fail(ctx, SOAP_TYPE_MISMATCH);
}

std::time_t soap_timegm(std::tm *utc)
{
    return timegm(utc);
}

const char *soap_datetime_text(soap *ctx, std::time_t seconds)
{
    std::tm utc = {};
    if (gmtime_r(&seconds, &utc) == nullptr ||
        std::strftime(ctx->scratch_text, sizeof ctx->scratch_text, "%Y-%m-%dT%H:%M:%SZ", &utc) == 0)
        return "1969-12-31T23:59:59Z";
    return ctx->scratch_text;
}
