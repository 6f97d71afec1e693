// number_test.cpp - numbers: what the parsers accept and refuse, texts of values, independence of the locale.
#include <bit>
#include <clocale>
#include <cmath>

#include "support/python_batch.h"

namespace {

class numbers : public testing::Test {
protected:
    std::unique_ptr<soap> ctx = std::make_unique<soap>();

    // Result of a parser and the value that it left, as text: "4 -128".
    template <class Value>
    std::string parsed(int (*parse)(soap *, const char *, Value *), const char *text, std::uint32_t mode = 0)
    {
        Value value = 77;
        ctx->error = 0;
        ctx->mode = mode;
        const int result = parse(ctx.get(), text, &value);
        EXPECT_EQ(ctx->error, result);
        return std::to_string(result) + " " + std::to_string(value);
    }
};

TEST_F(numbers, take_the_whole_text_within_their_range)
{
    EXPECT_EQ(parsed(soap_byte_parse, "-128"), "0 -128");
    EXPECT_EQ(parsed(soap_byte_parse, "128"), "4 -128");
    EXPECT_EQ(parsed(soap_byte_parse, ""), "4 0");
    EXPECT_EQ(parsed(soap_short_parse, "-32769"), "4 32767");
    EXPECT_EQ(parsed(soap_int_parse, " +2147483647"), "0 2147483647");
    EXPECT_EQ(parsed(soap_int_parse, "2147483648"), "4 -2147483648");
    EXPECT_EQ(parsed(soap_int_parse, "12 "), "4 12");
    EXPECT_EQ(parsed(soap_int_parse, "0x10"), "4 0");
    EXPECT_EQ(parsed(soap_int_parse, "- 1"), "4 0");
    EXPECT_EQ(parsed(soap_int_parse, nullptr), "0 77");
    EXPECT_EQ(parsed(soap_long_parse, "-9223372036854775808"), "0 -9223372036854775808");
    EXPECT_EQ(parsed(soap_long_parse, "9223372036854775808"), "4 9223372036854775807");
    EXPECT_EQ(parsed(soap_long_parse, std::string(5000, '9').c_str()), "4 9223372036854775807");
    EXPECT_EQ(parsed(soap_long64_parse, "12abc"), "0 12");
    EXPECT_EQ(parsed(soap_long64_parse, "-99999999999999999999"), "0 -9223372036854775808");
    EXPECT_EQ(parsed(soap_long64_parse, "abc"), "4 77");
    EXPECT_EQ(parsed(soap_ubyte_parse, "256"), "4 0");
    EXPECT_EQ(parsed(soap_ubyte_parse, "-1"), "4 255");
    EXPECT_EQ(parsed(soap_ushort_parse, "65536"), "4 0");
    EXPECT_EQ(parsed(soap_ushort_parse, ""), "4 0");
    EXPECT_EQ(parsed(soap_uint_parse, "4294967296"), "4 0");
    EXPECT_EQ(parsed(soap_uint_parse, "-1"), "0 4294967295");
    EXPECT_EQ(parsed(soap_uint_parse, ""), "0 0");
    EXPECT_EQ(parsed(soap_uint_parse, "", MODE_STRICT), "4 0");
    EXPECT_EQ(parsed(soap_uint_parse, "7x"), "4 7");
    EXPECT_EQ(parsed(soap_ulong_parse, "18446744073709551615"), "0 18446744073709551615");
    EXPECT_EQ(parsed(soap_ulong_parse, "18446744073709551616"), "4 18446744073709551615");
    EXPECT_EQ(parsed(soap_ulong_parse, "-18446744073709551616"), "4 18446744073709551615");
    EXPECT_EQ(parsed(soap_ulong_parse, "-2"), "0 18446744073709551614");
    EXPECT_EQ(parsed(soap_ulong64_parse, "5 6"), "0 5");
    EXPECT_EQ(parsed(soap_ulong64_parse, ""), "4 77");
    ctx->error = SOAP_REQUIRED;
    std::int32_t value = 3;
    EXPECT_EQ(soap_int_parse(ctx.get(), nullptr, &value), SOAP_REQUIRED)
        << "a failed look-up of an attribute";
    EXPECT_EQ(value, 3);
    EXPECT_EQ(soap_int_parse(ctx.get(), "4", &value), 0) << "an old error is not the parser's";
}

TEST_F(numbers, floating_text_is_what_the_c_library_takes_and_names_in_any_case)
{
    constexpr double NONE = -77; // refused
    const std::tuple<const char *, double> cases[] = {
        {"1.5", 1.5},        {" \t-2e3", -2000},     {"+.5", 0.5},
        {"0x1p4", 16},       {"12abc", 12},          {"1.5.6", 1.5},
        {"1e400", HUGE_VAL}, {"1e-400", 0},          {"-0", -0.0},
        {"1,5", 1},          {"infinity", HUGE_VAL}, {"INF", HUGE_VAL},
        {"", NONE},          {"abc", NONE},          {"+inf", HUGE_VAL},
        {"-Inf", -HUGE_VAL}, {"0x", NONE},           {".", NONE},
        {"-", NONE},         {"xINF", -HUGE_VAL}, // a dash of the pattern stands for any character
    };
    for (const auto &[text, expected] : cases) {
        double value = NONE;
        ctx->error = 0;
        EXPECT_EQ(soap_double_parse(ctx.get(), text, &value), expected == NONE ? 4 : 0) << text;
        if (expected != NONE) {
            EXPECT_EQ(value, expected) << text;
        }
    }
    double bits = 0;
    float small = 0;
    const std::string ones(sizeof bits, '\xff');
    ctx->error = 0;
    EXPECT_EQ(soap_double_parse(ctx.get(), "nan", &bits), 0);
    EXPECT_EQ(std::memcmp(&bits, ones.data(), sizeof bits), 0);
    EXPECT_EQ(soap_float_parse(ctx.get(), "NaN", &small), 0);
    EXPECT_EQ(std::memcmp(&small, ones.data(), sizeof small), 0);
    EXPECT_STREQ(soap_double_text(ctx.get(), bits), "NaN");
    EXPECT_EQ(soap_float_parse(ctx.get(), "1e39", &small), 0);
    EXPECT_STREQ(soap_float_text(ctx.get(), -small), "-INF");
    EXPECT_STREQ(soap_double_text(ctx.get(), HUGE_VAL), "INF");
}

TEST_F(numbers, the_hosts_locale_does_not_reach_the_wire)
{
    // A locale of our own whose decimal point is "~": no machine need have it. As glibc keeps it, in the machine's
    // byte order.
    static const struct {
        std::uint32_t head[8] = {0x20031114, 6, 0x20, 0x22, 0x23, 0x24, 0x28, 0x2C};
        char narrow[4] = "~";
        std::uint32_t wide[2] = {'~'};
        char codeset[15] = "ANSI_X3.4-1968";
    } category;
    const std::string place = testing::TempDir() + "number_test_" + std::to_string(::getpid());
    std::filesystem::create_directories(place + "/zz_ZZ");
    std::ofstream(place + "/zz_ZZ/LC_NUMERIC", std::ios::binary)
        .write(reinterpret_cast<const char *>(&category), sizeof category);
    ::setenv("LOCPATH", place.c_str(), 1);
    const bool foreign = std::setlocale(LC_NUMERIC, "zz_ZZ") != nullptr;
    char shown[8] = "";
    std::snprintf(shown, sizeof shown, "%.1f", 1.5);
    double plain = 0, by_library = 0;
    EXPECT_EQ(soap_double_parse(ctx.get(), "1.5", &plain), 0);
    EXPECT_EQ(soap_double_parse(ctx.get(), "+1.5 ", &by_library), 0);
    const std::string wide = soap_double_text(ctx.get(), 1.5), narrow = soap_float_text(ctx.get(), 0.25F);
    std::setlocale(LC_NUMERIC, "C");
    ::unsetenv("LOCPATH");
    std::filesystem::remove_all(place);
    ASSERT_TRUE(foreign && shown == std::string("1~5")) << shown;
    EXPECT_EQ(plain, 1.5);
    EXPECT_EQ(by_library, 1.5);
    EXPECT_EQ(wide, "1.5");
    EXPECT_EQ(narrow, "0.25");
    ctx->double_format = "1,%.0f"; // a host's own
    EXPECT_STREQ(soap_double_text(ctx.get(), 5), "1.5");
}

// As the start-up code of a host made with -ffast-math has it: operations take and give 0 in place of the smallest
// numbers.
#if defined(__SSE2__)
#define FLOAT_MODE(change) (__builtin_ia32_ldmxcsr(__builtin_ia32_stmxcsr() change 0x8040))
#elif defined(__aarch64__)
#define FLOAT_MODE(change) (__builtin_aarch64_set_fpcr(__builtin_aarch64_get_fpcr() change 1U << 24))
#else
#define FLOAT_MODE(change) (static_cast<void>(0))
#endif
struct fast_math {
    fast_math() { FLOAT_MODE(|); }
    ~fast_math() { FLOAT_MODE(^); }
};

TEST_F(numbers, the_hosts_floating_point_mode_does_not_reach_the_wire)
{
    static const std::tuple<const char *, const char *, const char *> rows[] = {
        {"4.9406564584124654E-324", "4.9406564584124654E-324", "0"},
        {"-2.2250738585072009e-308", "-2.2250738585072009E-308", "-0"},
        {" 0x1p-1074", "4.9406564584124654E-324", "0"},
        {"1.4e-45", "1.4000000000000001E-45", "1.40129846E-45"},
        {"-1.17549421e-38", "-1.17549421E-38", "-1.17549421E-38"},
        {"+1e-40", "9.9999999999999993E-41", "9.9999461E-41"},
        {"0.1", "0.10000000000000001", "0.100000001"},
        {"INF", "INF", "INF"},
        {"-INF", "-INF", "-INF"},
        {"NaN", "NaN", "NaN"},
    };
    for (const auto &[text, wide_text, narrow_text] : rows)
        for (const bool fast : {false, true}) {
            SCOPED_TRACE(text + std::string(fast ? ", fast" : ", precise"));
            const auto mode = fast ? std::make_unique<fast_math>() : nullptr;
            double wide = 1;
            float narrow = 1;
            EXPECT_EQ(soap_double_parse(ctx.get(), text, &wide), 0);
            EXPECT_EQ(soap_float_parse(ctx.get(), text, &narrow), 0);
            EXPECT_STREQ(soap_double_text(ctx.get(), wide), wide_text);
            EXPECT_STREQ(soap_float_text(ctx.get(), narrow), narrow_text);
        }
}

TEST_F(numbers, texts_go_through_the_contexts_formats)
{
    EXPECT_STREQ(soap_long_text(ctx.get(), INT64_MIN), "-9223372036854775808");
    EXPECT_STREQ(soap_ulong_text(ctx.get(), UINT64_MAX), "18446744073709551615");
    EXPECT_STREQ(soap_float_text(ctx.get(), 0.1F), "0.100000001");
    EXPECT_STREQ(soap_double_text(ctx.get(), 1e300), "1.0000000000000001E+300");
    ctx->float_format = "%.3f";
    EXPECT_STREQ(soap_float_text(ctx.get(), 2), "2.000");
}

TEST_F(numbers, random_values_agree_with_python)
{
    std::mt19937_64 random(1);
    std::vector<double> values;
    std::vector<std::string> texts;
    while (values.size() < 3000) {
        const auto value = std::bit_cast<double>(random());
        if (!std::isfinite(value))
            continue;
        values.push_back(value);
        texts.push_back(soap_double_text(ctx.get(), value));
    }
    const std::vector<std::string> answers =
        python_batch("for t in lines: print(float(t).hex(), repr(float(t)))\n", texts);
    ASSERT_EQ(answers.size(), values.size());
    for (std::size_t i = 0; i < values.size(); i++) {
        double back = 0;
        ASSERT_EQ(std::strtod(answers[i].c_str(), nullptr), values[i]) << texts[i];
        ASSERT_EQ(soap_double_parse(ctx.get(), answers[i].c_str() + answers[i].find(' ') + 1, &back), 0);
        ASSERT_EQ(back, values[i]) << answers[i];
    }
}

} // namespace
