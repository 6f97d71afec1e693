// datetime_test.cpp - xsd:dateTime: forms of the text, zones, hostile fields.
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_primitive.h>

#include <cstdlib>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include <gtest/gtest.h>

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

class Dates : public testing::Test {
protected:
    std::unique_ptr<soap> ctx = std::make_unique<soap>();

    // Seconds, or "4" for a refused text.
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

TEST_F(Dates, AreReadInAllFormsAndZones)
{
    const struct {
        const char *text;
        const char *seconds;
    } cases[] = {
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
    for (const auto &row : cases)
        EXPECT_EQ(parsed(row.text), row.seconds) << row.text;
    std::time_t kept = 5;
    EXPECT_EQ(soap_datetime_parse(ctx.get(), nullptr, &kept), ctx->error);
    EXPECT_EQ(kept, 5);
}

TEST_F(Dates, WithoutAZoneAreLocalTimeAndAreWrittenInUtc)
{
    const local_zone eastern("EST5EDT,M3.2.0,M11.1.0");
    EXPECT_EQ(parsed("2009-02-13T18:31:30"), "1234567890");
    EXPECT_EQ(parsed("2009-07-13T18:31:30.25"), "1247524290") << "in summer with daylight time";
    EXPECT_EQ(parsed("2009-07-13T22:31:30Z"), "1247524290") << "UTC does not depend on the zone of the host";
    EXPECT_STREQ(soap_datetime_text(ctx.get(), 1234567890), "2009-02-13T23:31:30Z");
    EXPECT_STREQ(soap_datetime_text(ctx.get(), INT64_MAX), "1969-12-31T23:59:59Z");
}

TEST_F(Dates, RandomDatesAgreeWithPython)
{
    std::mt19937 random(1);
    const auto pick = [&random](int low, int high) {
        return low + static_cast<int>(random() % static_cast<unsigned>(high - low + 1));
    };
    std::vector<std::string> texts;
    for (int i = 0; i < 2000; i++) {
        char text[64];
        const int zone = pick(-14 * 60, 14 * 60);
        const int minutes = std::abs(zone) < 60 ? 0 : std::abs(zone);
        std::snprintf(text, sizeof text, "%04d-%02d-%02dT%02d:%02d:%02d%c%02d:%02d", pick(1600, 2400),
                      pick(1, 12), pick(1, 28), pick(0, 23), pick(0, 59), pick(0, 59), zone < 0 ? '-' : '+',
                      minutes / 60, minutes % 60);
        texts.emplace_back(text);
    }
    const std::vector<std::string> answers =
        python_batch("from datetime import datetime, timezone\n"
                     "epoch = datetime(1970, 1, 1, tzinfo=timezone.utc)\n"
                     "for t in lines:\n"
                     "    d = datetime.fromisoformat(t)\n"
                     "    u = d.astimezone(timezone.utc)\n"
                     "    print(int((d - epoch).total_seconds()), u.strftime('%Y-%m-%dT%H:%M:%SZ'))\n",
                     texts);
    ASSERT_EQ(answers.size(), texts.size());
    for (std::size_t i = 0; i < texts.size(); i++) {
        const std::string seconds = parsed(texts[i]);
        ASSERT_EQ(seconds + " " + soap_datetime_text(ctx.get(), std::atoll(seconds.c_str())), answers[i])
            << texts[i];
    }
}

} // namespace
