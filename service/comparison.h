// comparison.h - the operators of the filter languages on plain values.
//
// Elsewhere: where the values come from (filter_facts.h), the expression around them (filter.h).
//
// Always: an item may have several values of a kind. A comparison then holds if it holds for one of them;
// "notEqual" and "notOn" hold if their opposites don't, so they also hold for an item without a value.
#pragma once

#include <ctime>
#include <set>
#include <string>
#include <string_view>
#include <vector>

namespace service {

using values = std::vector<std::string_view>;

enum class text_operator {
    equal,
    not_equal,
    less,
    greater,
    less_or_equal,
    greater_or_equal,
    contains,
    starts_with,
    ends_with,
    contains_phrase,
    contains_all_words,
    contains_some_word,
};
enum class set_operator { equal, not_equal, subset_of, superset_of };
enum class moment_operator { equal, on, not_equal, not_on, before, after, on_or_before, on_or_after };

// Natural order: runs of digits compare as numbers, so that 10.2 comes after 9.7. Below 0, 0, or
// above.
int compare_naturally(std::string_view one, std::string_view other);

// Searches for words ignore the case of ASCII letters; the other operators don't.
bool text_holds(text_operator op, const values &held, std::string_view wanted);

// One of the three searches for words in running text. What it searches for is split into words once.
class word_search {
public:
    word_search(text_operator op, std::string_view wanted, bool case_sensitive);
    word_search(const word_search &) = delete;
    word_search &operator=(const word_search &) = delete;

    // False if there is no word to search for.
    bool found_in(std::string_view text) const;

private:
    text_operator op_;
    bool case_sensitive_;
    std::string asked_;                   // the words in turn, with blanks before, between and after them
    std::vector<std::string_view> words_; // within asked_, each once, in order
};

// An absent truth value counts as false.
bool truth_holds(bool equal, bool held, bool wanted);

// Relates the set held to the set wanted: "subset_of" holds if all that is held is wanted.
bool set_holds(set_operator op, const std::set<std::string_view> &held,
               const std::set<std::string_view> &wanted);

// Seconds since 1970; "on" and its relatives compare days, in UTC.
bool moment_holds(moment_operator op, const std::vector<std::time_t> &held, std::time_t wanted);

} // namespace service
