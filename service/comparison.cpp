// comparison.cpp - see comparison.h.
#include "comparison.h"

#include <algorithm>
#include <cctype>
#include <cstring>
#include <string>
#include <utility>

namespace service {

namespace {

constexpr std::time_t DAY = 86400; // seconds

bool is_digit(char c)
{
    return c >= '0' && c <= '9';
}

// Removes the digits at the beginning of a text, without leading zeros.
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

bool is_ascii(char c)
{
    return static_cast<unsigned char>(c) < 128;
}

// Letters, digits and all bytes of letters beyond ASCII.
bool is_word_byte(char c)
{
    return !is_ascii(c) || std::isalnum(static_cast<unsigned char>(c)) != 0;
}

// The words of a text in turn, with blanks before, between and after them; empty without a word.
std::string words_of(std::string_view text, bool case_sensitive)
{
    std::string words;
    bool inside = false;
    for (const char c : text) {
        const bool was_inside = std::exchange(inside, is_word_byte(c));
        if (inside ? words.empty() : was_inside)
            words += ' ';
        if (inside)
            words += case_sensitive || !is_ascii(c) ? c : static_cast<char>(std::tolower(c));
    }
    if (inside)
        words += ' ';
    return words;
}

// Removes the first word from what words_of made; empty at the end.
std::string_view take_word(std::string_view &words)
{
    words.remove_prefix(std::min<std::size_t>(words.size(), 1));
    const std::string_view word = words.substr(0, words.find(' '));
    words.remove_prefix(word.size());
    return word;
}

// In time that grows with the sum of the lengths, whatever the texts are, which std::string_view::find
// doesn't promise.
bool contains(std::string_view text, std::string_view part)
{
    return part.empty() || memmem(text.data(), text.size(), part.data(), part.size()) != nullptr;
}

bool is_word_search(text_operator op)
{
    return op == text_operator::contains_phrase || op == text_operator::contains_all_words ||
           op == text_operator::contains_some_word;
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
        return contains(held, wanted);
    case text_operator::starts_with:
        return held.starts_with(wanted);
    case text_operator::ends_with:
        return held.ends_with(wanted);
    case text_operator::contains_phrase:
    case text_operator::contains_all_words:
    case text_operator::contains_some_word:
        return false; // not here
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
    if (is_word_search(op)) {
        const word_search search(op, wanted, false);
        return std::any_of(held.begin(), held.end(),
                           [&](std::string_view one) { return search.found_in(one); });
    }
    const bool found = std::any_of(held.begin(), held.end(),
                                   [&](std::string_view one) { return one_text_holds(op, one, wanted); });
    return op == text_operator::not_equal ? !found : found;
}

word_search::word_search(text_operator op, std::string_view wanted, bool case_sensitive)
    : op_(op), case_sensitive_(case_sensitive), asked_(words_of(wanted, case_sensitive))
{
    std::string_view rest = asked_;
    for (std::string_view word = take_word(rest); !word.empty(); word = take_word(rest))
        words_.push_back(word);
    std::sort(words_.begin(), words_.end());
    words_.erase(std::unique(words_.begin(), words_.end()), words_.end());
}

bool word_search::found_in(std::string_view text) const
{
    const std::string held = words_of(text, case_sensitive_);
    if (op_ == text_operator::contains_phrase)
        return !asked_.empty() && contains(held, asked_);
    const bool all = op_ == text_operator::contains_all_words;
    if (words_.empty() ||
        (all && held.size() / 2 < words_.size())) // a word takes two bytes at least, with its blank
        return false;
    std::vector<bool> found(all ? words_.size() : 0);
    std::size_t missing = words_.size();
    std::string_view rest = held;
    for (std::string_view word = take_word(rest); !word.empty() && missing != 0; word = take_word(rest)) {
        const auto place = std::lower_bound(words_.begin(), words_.end(), word);
        if (place == words_.end() || *place != word)
            continue;
        if (!all)
            return true;
        std::vector<bool>::reference known = found[static_cast<std::size_t>(place - words_.begin())];
        missing -= known ? 0 : 1;
        known = true;
    }
    return missing == 0;
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
