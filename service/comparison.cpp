// comparison.cpp - see comparison.h.
#include "comparison.h"

#include <algorithm>
#include <cctype>
#include <string>

namespace service {

namespace {

constexpr std::time_t DAY = 86400; // seconds

bool is_digit(char c)
{
    return c >= '0' && c <= '9';
}

// Takes the digits at the head of a text, without leading zeros.
std::string_view take_number(std::string_view &text)
{
    const std::size_t end = std::min(text.find_first_not_of("0123456789"), text.size());
    std::string_view digits = text.substr(0, end);
    text.remove_prefix(end);
    digits.remove_prefix(std::min(digits.find_first_not_of('0'), digits.size()));
    return digits;
}

int compare_numbers(std::string_view one, std::string_view other)
{
    if (one.size() != other.size())
        return one.size() < other.size() ? -1 : 1;
    return one.compare(other);
}

// Letters, digits and all bytes of letters beyond ASCII.
bool is_word_byte(char c)
{
    const auto byte = static_cast<unsigned char>(c);
    return byte >= 128 || std::isalnum(byte) != 0;
}

std::vector<std::string> words_of(std::string_view text, bool case_sensitive)
{
    std::vector<std::string> words;
    bool inside = false;
    for (const char c : text) {
        if (is_word_byte(c)) {
            if (!inside)
                words.emplace_back();
            const bool ascii = static_cast<unsigned char>(c) < 128;
            words.back().push_back(case_sensitive || !ascii ? c : static_cast<char>(std::tolower(c)));
        }
        inside = is_word_byte(c);
    }
    return words;
}

bool one_text_holds(text_operator op, std::string_view held, std::string_view wanted)
{
    switch (op) {
    case text_operator::equal:
    case text_operator::not_equal:
        return held == wanted;
    case text_operator::less:
        return compare_naturally(held, wanted) < 0;
    case text_operator::greater:
        return compare_naturally(held, wanted) > 0;
    case text_operator::less_or_equal:
        return compare_naturally(held, wanted) <= 0;
    case text_operator::greater_or_equal:
        return compare_naturally(held, wanted) >= 0;
    case text_operator::contains:
        return held.find(wanted) != std::string_view::npos;
    case text_operator::starts_with:
        return held.starts_with(wanted);
    case text_operator::ends_with:
        return held.ends_with(wanted);
    case text_operator::contains_phrase:
    case text_operator::contains_all_words:
    case text_operator::contains_some_word:
        return words_hold(op, held, wanted, false);
    }
    return false;
}

bool one_moment_holds(moment_operator op, std::time_t held, std::time_t wanted)
{
    switch (op) {
    case moment_operator::equal:
    case moment_operator::not_equal:
        return held == wanted;
    case moment_operator::before:
        return held < wanted;
    case moment_operator::after:
        return held > wanted;
    case moment_operator::on:
    case moment_operator::not_on:
        return held / DAY == wanted / DAY;
    case moment_operator::on_or_before:
        return held / DAY <= wanted / DAY;
    case moment_operator::on_or_after:
        return held / DAY >= wanted / DAY;
    }
    return false;
}

} // namespace

int compare_naturally(std::string_view one, std::string_view other)
{
    while (!one.empty() && !other.empty()) {
        if (is_digit(one.front()) && is_digit(other.front())) {
            const std::string_view left = take_number(one);
            if (const int order = compare_numbers(left, take_number(other)))
                return order;
            continue;
        }
        if (one.front() != other.front())
            return static_cast<unsigned char>(one.front()) < static_cast<unsigned char>(other.front()) ? -1
                                                                                                       : 1;
        one.remove_prefix(1);
        other.remove_prefix(1);
    }
    return one.empty() ? (other.empty() ? 0 : -1) : 1;
}

bool text_holds(text_operator op, const values &held, std::string_view wanted)
{
    const bool found = std::any_of(held.begin(), held.end(),
                                   [&](std::string_view one) { return one_text_holds(op, one, wanted); });
    return op == text_operator::not_equal ? !found : found;
}

bool words_hold(text_operator op, std::string_view text, std::string_view wanted, bool case_sensitive)
{
    const std::vector<std::string> held = words_of(text, case_sensitive),
                                   asked = words_of(wanted, case_sensitive);
    if (asked.empty())
        return false;
    if (op == text_operator::contains_phrase)
        return std::search(held.begin(), held.end(), asked.begin(), asked.end()) != held.end();
    const std::set<std::string> known(held.begin(), held.end());
    const auto is_known = [&](const std::string &word) { return known.contains(word); };
    return op == text_operator::contains_all_words ? std::all_of(asked.begin(), asked.end(), is_known)
                                                   : std::any_of(asked.begin(), asked.end(), is_known);
}

bool truth_holds(bool equal, bool held, bool wanted)
{
    return (held == wanted) == equal;
}

bool set_holds(set_operator op, const std::set<std::string_view> &held,
               const std::set<std::string_view> &wanted)
{
    switch (op) {
    case set_operator::equal:
        return held == wanted;
    case set_operator::not_equal:
        return held != wanted;
    case set_operator::subset_of:
        return std::includes(wanted.begin(), wanted.end(), held.begin(), held.end());
    case set_operator::superset_of:
        return std::includes(held.begin(), held.end(), wanted.begin(), wanted.end());
    }
    return false;
}

bool moment_holds(moment_operator op, const std::vector<std::time_t> &held, std::time_t wanted)
{
    const bool found = std::any_of(held.begin(), held.end(),
                                   [&](std::time_t one) { return one_moment_holds(op, one, wanted); });
    return op == moment_operator::not_equal || op == moment_operator::not_on ? !found : found;
}

} // namespace service
