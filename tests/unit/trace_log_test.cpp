// trace_log_test.cpp - the trace files of a context, and certificates taken out of message texts.
#include <ctime>
#include <sys/stat.h>
#include <unistd.h>

#include "support/memory_wire.h"
#include "support/testing.h"

namespace {

class trace_log : public testing::Test {
protected:
    void SetUp() override
    {
        directory = testing::TempDir() + "trace_log_" + std::to_string(getpid());
        std::filesystem::create_directories(directory);
        set_default(path("default.log"));
    }
    void TearDown() override
    {
        std::filesystem::remove_all(directory);
        set_default("wsTrace.log");
    }
    std::string path(const std::string &name) const { return directory + "/" + name; }
    static void set_default(const std::string &name) { std::strcpy(g_TraceLogFile, name.c_str()); }
    static void write(soap &ctx, int channel, const std::string &text)
    {
        soap_log_write(&ctx, channel, text.data(), text.size());
    }

    std::string directory;
};

TEST_F(trace_log, both_directions_go_to_the_default_file_at_their_first_byte)
{
    soap ctx;
    set_default(path("later.log"));
    EXPECT_FALSE(std::filesystem::exists(path("default.log")));
    write(ctx, SOAP_LOG_SENT, std::string("out\0put;", 8));
    write(ctx, SOAP_LOG_RECEIVED, "input;");
    EXPECT_EQ(file_content(path("default.log")), std::string("out\0put;input;", 14)) << "at each write";
    EXPECT_FALSE(std::filesystem::exists(path("later.log")));
    soap_discard_all(&ctx);
    EXPECT_EQ(ctx.log_streams[SOAP_LOG_SENT], nullptr);
    write(ctx, SOAP_LOG_SENT, "!");
    EXPECT_EQ(file_content(path("default.log")), std::string("out\0put;input;!", 15)) << "appended";
}

TEST_F(trace_log, a_channel_follows_its_own_path)
{
    soap ctx;
    write(ctx, SOAP_LOG_SENT, "a");
    EXPECT_EQ(soap_log_set_sent(&ctx, path("sent.log").c_str()), 0);
    EXPECT_EQ(soap_log_set_received(&ctx, nullptr), 0);
    EXPECT_EQ(soap_log_set(&ctx, 3, "no channel"), 0);
    EXPECT_EQ(soap_log_set(&ctx, SOAP_LOG_SENT, ctx.log_paths[SOAP_LOG_SENT]), 0) << "its own text";
    write(ctx, SOAP_LOG_SENT, "b");
    write(ctx, SOAP_LOG_RECEIVED, "lost");
    EXPECT_EQ(file_content(path("default.log")), "a");
    EXPECT_EQ(file_content(path("sent.log")), "b");
    EXPECT_EQ(ctx.log_streams[SOAP_LOG_RECEIVED], nullptr);
}

TEST_F(trace_log, times_say_where_in_its_file_each_piece_begins_and_when_it_was_written)
{
    soap ctx;
    const std::int64_t before = std::int64_t{std::time(nullptr)} * 1000000;
    write(ctx, SOAP_LOG_SENT, "no times yet;");
    ASSERT_EQ(soap_log_set(&ctx, SOAP_LOG_TIMES, path("times").c_str()), 0);
    write(ctx, SOAP_LOG_SENT, "out;");
    write(ctx, SOAP_LOG_RECEIVED, "in;");
    std::istringstream times(file_content(path("times")));
    long long place = 0, first = 0, second = 0;
    char direction = 0;
    ASSERT_TRUE(times >> place >> first >> direction);
    EXPECT_EQ(std::pair(place, direction), std::pair(13LL, 's'));
    ASSERT_TRUE(times >> place >> second >> direction);
    EXPECT_EQ(std::pair(place, direction), std::pair(17LL, 'r'));
    EXPECT_TRUE(before <= first && first <= second && second < before + 3600000000)
        << before << ' ' << first << ' ' << second;
    EXPECT_FALSE(times >> place);
}

TEST_F(trace_log, holds_the_bytes_on_the_wire_and_what_they_unpack_to)
{
    const std::string sent = path("sent.log"), received = path("received.log"), body = "<plain/>";
    memory_wire wire(0, MODE_BUFFERED | MODE_BARE_XML | MODE_DEFLATE);
    ASSERT_EQ(soap_log_set_sent(&wire, sent.c_str()), 0);
    ASSERT_EQ(soap_log_set_received(&wire, received.c_str()), 0);
    ASSERT_EQ(soap_send_begin(&wire), 0);
    ASSERT_EQ(soap_send_text(&wire, body.c_str()), 0);
    ASSERT_EQ(soap_send_finish(&wire), 0);
    EXPECT_EQ(file_content(sent), wire.sent());
    wire.receive(wire.sent());
    ASSERT_EQ(soap_receive_begin(&wire), 0);
    EXPECT_EQ(wire.read_all(), body);
    EXPECT_EQ(file_content(received), wire.sent() + body);
}

TEST_F(trace_log, a_new_file_is_for_its_owner_alone_and_an_old_one_is_left_as_it_is)
{
    const mode_t before = umask(0);
    std::ofstream(path("old.log")) << "old;";
    for (const char *name : {"old.log", "new.log"}) {
        soap ctx;
        soap_log_set_sent(&ctx, path(name).c_str());
        write(ctx, SOAP_LOG_SENT, "more");
    }
    umask(before);
    const auto rights = [this](const char *name) {
        return std::filesystem::status(path(name)).permissions();
    };
    EXPECT_EQ(rights("new.log"), std::filesystem::perms{0600});
    EXPECT_EQ(rights("old.log"), std::filesystem::perms{0666});
    EXPECT_EQ(file_content(path("old.log")), "old;more");
}

TEST_F(trace_log, a_file_that_cannot_be_opened_is_tried_again)
{
    soap ctx;
    soap_log_set_sent(&ctx, path("missing/sent.log").c_str());
    write(ctx, SOAP_LOG_SENT, "lost");
    EXPECT_EQ(ctx.error, 0);
    std::filesystem::create_directories(path("missing"));
    write(ctx, SOAP_LOG_SENT, "kept");
    EXPECT_EQ(file_content(path("missing/sent.log")), "kept");
}

TEST_F(trace_log, a_default_without_text_or_terminator_is_safe)
{
    set_default("");
    {
        soap ctx;
        EXPECT_EQ(ctx.log_paths[SOAP_LOG_SENT], nullptr);
    }
    std::memset(g_TraceLogFile, 'x', SOAP_LOG_PATH_SIZE);
    soap ctx;
    EXPECT_EQ(std::strlen(ctx.log_paths[SOAP_LOG_SENT]), SOAP_LOG_PATH_SIZE);
}

TEST_F(trace_log, without_memory_for_a_path_the_channel_is_off)
{
    soap ctx;
    {
        const failing_malloc::scope armed(1);
        EXPECT_EQ(soap_log_set_sent(&ctx, "some.log"), SOAP_OUT_OF_MEMORY);
    }
    EXPECT_EQ(ctx.log_paths[SOAP_LOG_SENT], nullptr);
}

std::string redacted(const std::string &message)
{
    const std::unique_ptr<char[]> copy(new char[message.size()]); // no terminator after the message
    std::memcpy(copy.get(), message.data(), message.size());
    std::int32_t length = -1;
    const std::unique_ptr<char[]> result(
        soap_log_redact_certificates(copy.get(), static_cast<std::int32_t>(message.size()), &length));
    return std::string(result.get(), static_cast<std::size_t>(length));
}

TEST(redaction, blanks_certificates_of_the_two_prefixes)
{
    static const std::tuple<const char *, const char *, const char *> cases[] = {
        {"protocol", "<a><protocol:certificate>MIIC<b/></protocol:certificate></a>",
         "<a><protocol:certificate>...</protocol:certificate></a>"},
        {"p760", "<p760:certificate>MIIC</p760:certificate>x", "<p760:certificate>...</p760:certificate>x"},
        {"either end tag ends", "<p760:certificate>MIIC</protocol:certificate>x",
         "<p760:certificate>...</protocol:certificate>x"},
        {"two certificates", "<p760:certificate>A</p760:certificate>-<p760:certificate>B</p760:certificate>",
         "<p760:certificate>...</p760:certificate>-<p760:certificate>...</p760:certificate>"},
        {"start tag at the end", "abc<protocol:certificate>", "abc<protocol:certificate>..."},
        {"end tag alone", "a</p760:certificate>b", "a</p760:certificate>b"},
        {"grows", "<p760:certificate></p760:certificate>", "<p760:certificate>...</p760:certificate>"},
        {"only starts", "<p760:certificate><p760:certificate><p760:certificate>",
         "<p760:certificate>...<p760:certificate>...<p760:certificate>..."},
        {"never closed", "<p760:certificate>MIIC</p760:cert", "<p760:certificate>..."},
        {"attributes and other prefixes stay", "<p760:certificate a=''>M</x:certificate>",
         "<p760:certificate a=''>M</x:certificate>"},
        {"cut tag", "<protocol:certificat", "<protocol:certificat"},
        {"empty", "", ""},
    };
    for (const auto &[rule, message, expected] : cases)
        EXPECT_EQ(redacted(message), expected) << rule;
    std::int32_t length = -1;
    delete[] soap_log_redact_certificates("x", -1, &length);
    EXPECT_EQ(length, 0) << "a negative size is an empty message";
}

} // namespace
