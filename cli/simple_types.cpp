// simple_types.cpp - see simple_types.h.
#include "simple_types.h"

#include <algorithm>
#include <charconv>
#include <cstdint>
#include <regex>

#include "contract.h"

namespace cli {

namespace {

constexpr std::size_t PATTERN_TEXT_MAX = 64; // longer texts are no dates; bounds the work of a pattern
constexpr std::size_t NUMBER_TEXT_MAX = 400;

bool matches(std::string_view text, const char *pattern)
{
    return text.size() <= PATTERN_TEXT_MAX &&
           std::regex_match(text.begin(), text.end(), std::regex(pattern, std::regex::extended));
}

bool is_moment(std::string_view text)
{
    return matches(text, "-?[0-9]{4,9}-(0[1-9]|1[0-2])-(0[1-9]|[12][0-9]|3[01])"
                         "T([01][0-9]|2[0-4]):[0-5][0-9]:[0-5][0-9]([.][0-9]+)?(Z|[+-][0-9]{2}:[0-9]{2})?");
}

bool is_duration(std::string_view text)
{
    return text.find_first_of("0123456789") != std::string_view::npos && !text.ends_with('T') &&
           matches(text, "-?P([0-9]+Y)?([0-9]+M)?([0-9]+D)?(T([0-9]+H)?([0-9]+M)?([0-9]+([.][0-9]+)?S)?)?");
}

// A whole number of any size: its sign in `sign`, -1, 0 or 1.
bool is_whole(std::string_view text, int &sign)
{
    const bool minus = text.starts_with('-');
    if (minus || text.starts_with('+'))
        text.remove_prefix(1);
    if (text.empty() || text.find_first_not_of("0123456789") != std::string_view::npos)
        return false;
    sign = text.find_first_not_of('0') == std::string_view::npos ? 0 : minus ? -1 : 1;
    return true;
}

template <class T> bool converts(std::string_view text)
{
    if (text.starts_with('+'))
        text.remove_prefix(1);
    T value{};
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
    return error == std::errc() && end == text.data() + text.size();
}

bool is_double(std::string_view text)
{
    return text.size() <= NUMBER_TEXT_MAX &&
           (text == "INF" || text == "-INF" || text == "NaN" ||
            (text.find_first_not_of("0123456789+-.eE") == std::string_view::npos && converts<double>(text)));
}

bool is_base64(std::string_view text)
{
    std::size_t digits = 0, padding = 0;
    for (const unsigned char c : text) {
        if (c == ' ' || c == '\t' || c == '\r' || c == '\n')
            continue;
        const bool digit = (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') ||
                           c == '+' || c == '/';
        if (c != '=' && (!digit || padding != 0))
            return false;
        ++(c == '=' ? padding : digits);
    }
    return padding <= 2 && (digits + padding) % 4 == 0;
}

std::string_view trimmed(std::string_view text)
{
    const std::size_t first = text.find_first_not_of(" \t\r\n");
    return first == std::string_view::npos ? ""
                                           : text.substr(first, text.find_last_not_of(" \t\r\n") - first + 1);
}

bool is_valid(std::string_view type, std::string_view value)
{
    int sign = 0;
    if (type == "xsd:dateTime")
        return is_moment(value);
    if (type == "xsd:duration")
        return is_duration(value);
    if (type == "xsd:boolean")
        return value == "true" || value == "false" || value == "1" || value == "0";
    if (type == "xsd:int")
        return converts<std::int32_t>(value);
    if (type == "xsd:integer")
        return is_whole(value, sign);
    if (type == "xsd:nonNegativeInteger")
        return is_whole(value, sign) && sign >= 0;
    if (type == "xsd:positiveInteger")
        return is_whole(value, sign) && sign > 0;
    if (type == "xsd:double")
        return is_double(value);
    return type != "xsd:base64Binary" || is_base64(value);
}

std::string words_of(const contract::enumeration &type)
{
    std::string list;
    for (const contract::word &word : type.words)
        list += (list.empty() ? "" : ", ") + std::string(word.text);
    return "one of " + list;
}

} // namespace

std::string value_problem(std::string_view type, std::string_view value)
{
    if (const contract::enumeration *const known = contract::find_enumeration(type)) {
        const std::string_view word = trimmed(value);
        const bool found = std::any_of(known->words.begin(), known->words.end(),
                                       [&](const contract::word &w) { return word == w.text; });
        return found ? "" : words_of(*known);
    }
    return is_valid(type, trimmed(value)) ? "" : value_words(type);
}

namespace {

struct type_words {
    const char *type, *words, *sample;
};
constexpr type_words TYPE_WORDS[] = {
    {"xsd:dateTime", "a date and time such as 2024-05-01T12:00:00Z", "2024-05-01T12:00:00Z"},
    {"xsd:duration", "a duration such as P1DT12H", "P1D"},
    {"xsd:boolean", "true or false", "false"},
    {"xsd:int", "a whole number of 32 bits", "0"},
    {"xsd:integer", "a whole number", "0"},
    {"xsd:nonNegativeInteger", "a whole number, 0 or more", "0"},
    {"xsd:positiveInteger", "a whole number, 1 or more", "1"},
    {"xsd:double", "a number", "0"},
    {"xsd:base64Binary", "bytes in base64", ""}};

const type_words *find_words(std::string_view type)
{
    for (const type_words &one : TYPE_WORDS)
        if (type == one.type)
            return &one;
    return nullptr;
}

} // namespace

std::string value_words(std::string_view type)
{
    if (const contract::enumeration *const known = contract::find_enumeration(type))
        return words_of(*known);
    const type_words *const found = find_words(type);
    return found == nullptr ? "text" : found->words;
}

std::string sample_value(std::string_view type)
{
    if (const contract::enumeration *const known = contract::find_enumeration(type))
        return known->words.front().text;
    const type_words *const found = find_words(type);
    return found == nullptr ? "" : found->sample;
}

bool is_number(std::string_view type)
{
    return type == "xsd:int" || type == "xsd:double";
}

bool is_whole_number(std::string_view type)
{
    return type == "xsd:int" || type == "xsd:integer" || type == "xsd:nonNegativeInteger" ||
           type == "xsd:positiveInteger";
}

} // namespace cli
