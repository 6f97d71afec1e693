// datetime_test.cpp - xsd:dateTime: forms of the text, zones, hostile fields.
#include "support/python_batch.h"

namespace {

// Sets the zone of local time while it lives. The tests need none but UTC besides.
struct local_zone {
    explicit local_zone(const char *name) { set(name); }
    ~local_zone() { set("UTC0"); }
    static void set(const char *name)
    {
        setenv("TZ", name, 1);
        tzset();
    }
};

class dates : public testing::Test {
protected:
    std::unique_ptr<soap> ctx = std::make_unique<soap>();

    std::string parsed(const std::string &text)
    {
        std::time_t seconds = -77;
        ctx->error = 0;
        const int result = soap_datetime_parse(ctx.get(), text.c_str(), &seconds);
        EXPECT_EQ(ctx->error, result);
        EXPECT_TRUE(result == 0 || (result == SOAP_TYPE_MISMATCH && seconds == -77));
        return result == 0 ? std::to_string(seconds) : "refused";
    }
};

TEST_F(dates, are_read_in_all_forms_and_zones)
{
    const std::pair<const char *, const char *> cases[] = {
        {"2009-02-13T23:31:30.999Z", "1234567890"},
        {"20090213T23:31:30Z", "1234567890"},
        {"20090213T233130Z", "1234567890"},
        {"2009-02-14T00:31:30+0100", "1234567890"},
        {"2009-02-13T18:01:30.5-0530", "1234567890"},
        {"2009-02-14T00:31:30+100", "1234567890"},
        {"2009-13-13T23:31:30Z", "1263425490"}, // a 13th month is next year's first
        {"0001-01-01T00:00:00Z", "0"},          // no date: the first year of the count
        {"2009-01-01T00:00:00+ab:cd", "1230768000"},
        {"2009-02-13T23:31", "refused"},
        {"2009-02-13 23:31:30Z", "refused"},
        {"2009-02-13", "refused"},
        {"20090213T23:31:30-05:00", "refused"}, // the zone's dash makes it the long form
        {"", "refused"},
        {"99999999999-01-01T00:00:00Z", "refused"},
        {"2009-99999999999999999999-01T00:00:00Z", "refused"},
        {"2009-01-01T00:00:00+99999999999999999999", "refused"},
        {"2009-01-01T00:00:00-99:99999999999999", "refused"},
        {"-2147483648-01-01T00:00:00Z", "refused"},
        {"2009-01-2147483647T2147483647:2147483647:2147483647-2147483647", "refused"},
    };
    for (const auto &[text, seconds] : cases)
        EXPECT_EQ(parsed(text), seconds) << text;
    std::time_t kept = 5;
    EXPECT_EQ(soap_datetime_parse(ctx.get(), nullptr, &kept), ctx->error);
    EXPECT_EQ(kept, 5);
}

TEST_F(dates, without_a_zone_are_local_time_and_are_written_in_utc)
{
    const local_zone eastern("EST5EDT,M3.2.0,M11.1.0");
    EXPECT_EQ(parsed("2009-02-13T18:31:30"), "1234567890");
    EXPECT_EQ(parsed("2009-07-13T18:31:30.25"), "1247524290") << "in summer with daylight time";
    EXPECT_EQ(parsed("2009-07-13T22:31:30Z"), "1247524290") << "UTC does not depend on the zone of the host";
    EXPECT_STREQ(soap_datetime_text(ctx.get(), 1234567890), "2009-02-13T23:31:30Z");
    EXPECT_STREQ(soap_datetime_text(ctx.get(), static_cast<std::time_t>(INT64_MAX)), "1969-12-31T23:59:59Z");
}

TEST_F(dates, random_dates_agree_with_python)
{
    const std::vector<std::string> answers = python_batch(
        "import random\n"
        "from datetime import datetime, timedelta, timezone\n"
        "random.seed(1)\n"
        "for _ in range(2000):\n"
        "    zone = timezone(random.choice((-1, 1)) * timedelta(minutes=random.randint(60, 840)))\n"
        "    d = datetime(random.randint(1600, 2400), 1, 1, tzinfo=zone)\n"
        "    d += timedelta(seconds=random.randrange(365 * 86400))\n"
        "    u = d.astimezone(timezone.utc)\n"
        "    print(d.isoformat(), int(u.timestamp()), u.strftime('%Y-%m-%dT%H:%M:%SZ'))\n",
        {});
    ASSERT_EQ(answers.size(), 2000U);
    for (const std::string &answer : answers) {
        const std::size_t end = answer.find(' ');
        const std::string text = answer.substr(0, end), seconds = parsed(text);
        const long long right = std::stoll(answer.substr(end));
        const bool held = static_cast<std::time_t>(right) == right; // not all are where it has 32 bits
        ASSERT_EQ(text + " " + seconds + " " +
                      soap_datetime_text(ctx.get(), static_cast<std::time_t>(std::stoll(seconds))),
                  held ? answer : text + " -1 1969-12-31T23:59:59Z");
    }
}

} // namespace
