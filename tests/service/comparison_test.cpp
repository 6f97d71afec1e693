// comparison_test.cpp - the operators of the filter languages.
#include <gtest/gtest.h>

#include "comparison.h"

using namespace service;

TEST(comparison, orders_numbers_within_texts_as_numbers)
{
    const char *const ascending[] = {"",   "1",   "1.0", "1.0.1", "1.2", "1.10", "2",
                                     "10", "10a", "a",   "a2",    "a10", "b"};
    for (std::size_t i = 0; i < std::size(ascending); ++i)
        for (std::size_t j = 0; j < std::size(ascending); ++j) {
            const int order = compare_naturally(ascending[i], ascending[j]);
            EXPECT_EQ(order < 0, i < j) << ascending[i] << " and " << ascending[j];
            EXPECT_EQ(order == 0, i == j) << ascending[i] << " and " << ascending[j];
        }
    EXPECT_EQ(compare_naturally("007", "7"), 0);
    EXPECT_LT(compare_naturally("99999999999999999999998", "99999999999999999999999"), 0) << "of any length";
}

TEST(comparison, of_text)
{
    using op = text_operator;
    const struct {
        const char *rule;
        op how;
        values held;
        const char *wanted;
        bool holds;
    } rows[] = {
        {"equal to one of several", op::equal, {"a", "b"}, "b", true},
        {"case counts", op::equal, {"A"}, "a", false},
        {"no value is equal to nothing", op::equal, {}, "", false},
        {"not equal means none is equal", op::not_equal, {"a", "b"}, "b", false},
        {"not equal without a value", op::not_equal, {}, "b", true},
        {"less by number", op::less, {"9"}, "10", true},
        {"greater", op::greater, {"1.2"}, "1.10", false},
        {"less or equal", op::less_or_equal, {"3"}, "3", true},
        {"phrase", op::contains_phrase, {"The Disk-Array hangs"}, "disk array", true},
        {"phrase out of order", op::contains_phrase, {"array disk"}, "disk array", false},
        {"phrase of part of a word", op::contains_phrase, {"diskarray"}, "disk", false},
        {"all words in any order", op::contains_all_words, {"array of a disk"}, "disk array", true},
        {"a word is missing", op::contains_all_words, {"disk"}, "disk array", false},
        {"no words to search for", op::contains_all_words, {"disk"}, " - ", false},
        {"words of other letters",
         op::contains_all_words,
         {"\xC3\x9C"
          "ber Gr\xC3\xB6\xC3\x9F"
          "e"},
         "gr\xC3\xB6\xC3\x9F"
         "e",
         true},
    };
    for (const auto &r : rows)
        EXPECT_EQ(text_holds(r.how, r.held, r.wanted), r.holds) << r.rule;
    // In time that grows with the lengths, however much of what is wanted is there.
    const auto words = [](const char *word, std::size_t count) {
        std::string text;
        for (std::size_t i = 0; i < count; ++i)
            text += word;
        return text;
    };
    const std::string held = words("a ", 400000), letters = words("a", 400000);
    for (const op how : {op::contains_phrase, op::contains_all_words})
        EXPECT_FALSE(text_holds(how, {held, held}, words("a ", 200000) + "b"));
    EXPECT_TRUE(text_holds(op::contains_phrase, {held}, words("A-", 200000)));
    EXPECT_FALSE(text_holds(op::contains, {letters}, words("a", 200000) + "b"));
    EXPECT_FALSE(word_search(op::contains_all_words, "disk", true).found_in("Disk"));
    EXPECT_TRUE(word_search(op::contains_all_words, "disk", false).found_in("Disk"));
}

TEST(comparison, of_sets_truth_and_time)
{
    using set = std::set<std::string_view>;
    EXPECT_TRUE(set_holds(set_operator::equal, {"a", "b"}, {"b", "a"}));
    EXPECT_FALSE(set_holds(set_operator::not_equal, {"a"}, {"a"}));
    EXPECT_TRUE(set_holds(set_operator::subset_of, {"a"}, {"a", "b"}));
    EXPECT_TRUE(set_holds(set_operator::subset_of, set(), {"a"})) << "the empty set is a part of any";
    EXPECT_FALSE(set_holds(set_operator::superset_of, {"a"}, {"a", "b"}));

    EXPECT_TRUE(truth_holds(true, false, false));
    EXPECT_TRUE(truth_holds(false, true, false));
    EXPECT_FALSE(truth_holds(false, true, true));

    constexpr std::time_t noon = 1700049600; // 2023-11-15T12:00:00Z
    constexpr std::time_t evening = noon + 6 * 3600, next_day = noon + 86400;
    using op = moment_operator;
    const struct {
        op how;
        std::time_t held, wanted;
        bool holds;
    } rows[] = {{op::equal, noon, evening, false},         {op::on, noon, evening, true},
                {op::on, noon, next_day, false},           {op::not_equal, noon, evening, true},
                {op::not_on, noon, evening, false},        {op::before, noon, evening, true},
                {op::after, noon, evening, false},         {op::on_or_before, evening, noon, true},
                {op::on_or_before, next_day, noon, false}, {op::on_or_after, noon, evening, true}};
    for (const auto &r : rows)
        EXPECT_EQ(moment_holds(r.how, {r.held}, r.wanted), r.holds) << static_cast<int>(r.how);
    EXPECT_TRUE(moment_holds(op::not_on, {}, noon));
    EXPECT_FALSE(moment_holds(op::before, {}, noon));
}
