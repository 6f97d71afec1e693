// The samples of tests/samples: read, cut and changed; records whose lengths lie.
#include "support/annotated_bytes.h"
#include "support/attachment_checks.h"
#include "support/dime_bytes.h"
#include "support/host_streams.h"

using namespace attachment_exchange;

namespace {

std::string sample(const std::string &name)
{
    const std::string bytes = file_content(std::string(ZUV_SAMPLE_DIR) + "/" + name);
    EXPECT_NE(bytes, "") << name;
    return name.starts_with("dime/") ? annotated_bytes(bytes) : bytes;
}

// What is announced as encoded is handed out as it came: its receiver knows the encoding from the record.
// The message ends with the third text; anything after it is ignored.
const std::tuple<const char *, const char *, const char *> SAMPLES[] = {
    {"dime/two_attachments.txt", "[cid:a image/png pixels][b text/plain text]", ""},
    {"dime/chunks.txt", "[cid:big application/octet-stream one two]", ""},
    {"mime/message_between_its_parts.eml",
     "[cid:ahead text/plain; charset=utf-8 ahead of the message][cid:a%20b image/png; name=\"x.png\" pixels]",
     "?d==--"},
    {"mime/include.eml", "[cid:a%40b a/b beside][(null) (null) in place]", "--bb--"},
    {"mime/line_feeds_in_heads.eml", "[cid:a a/b; c=d line one\nline two]", "--bb--"},
    {"mime/encoded.eml", "[cid:b64 (null) cGl4ZWxz][cid:qp (null) caf=C3=A9]", "--bb--"},
};

TEST(samples, are_understood_however_they_arrive_and_wherever_they_are_cut)
{
    std::ptrdiff_t files = 0;
    for (const char *form : {"/dime", "/mime"})
        files += std::distance(std::filesystem::directory_iterator(std::string(ZUV_SAMPLE_DIR) + form), {});
    EXPECT_EQ(files, std::ssize(SAMPLES));
    for (const auto &[name, summary, last] : SAMPLES) {
        SCOPED_TRACE(name);
        const std::string bytes = sample(name);
        expect_same_at_every_split(bytes, summary);
        const std::size_t end = *last == '\0' ? bytes.size() : bytes.rfind(last) + std::strlen(last);
        expect_error_at_every_cut(bytes.substr(0, end - 1));
        expect_survival_of_every_change(bytes);
    }
}

TEST(samples, are_the_same_through_the_callbacks)
{
    for (const auto &[name, summary, last] : SAMPLES) {
        SCOPED_TRACE(name);
        reception in_memory(sample(name)), streamed(sample(name), 0, 3, 7);
        stream_host host;
        host.serve(*streamed.wire);
        ASSERT_EQ(in_memory.run(), 0);
        ASSERT_EQ(streamed.run(), 0);
        for (std::size_t i = 0; i < in_memory.values.size(); ++i) {
            const value &v = streamed.values[i];
            EXPECT_TRUE(v.id == nullptr ||
                        reinterpret_cast<host_stream *>(v.content)->data == in_memory.values[i].bytes());
        }
    }
}

// Each length of each record gives something else than what is there.
TEST(wrong_messages, of_records_with_false_lengths_are_refused)
{
    using namespace dime_bytes;
    const std::string records[] = {message_record(0, "<data href=\"a\"/><data href=\"b\"/>"),
                                   record(CF, MEDIA, "a", "t", "aaaa"), record(0, UNCHANGED, "", "", "AA"),
                                   record(ME, MEDIA, "b", "t", "bbbbbb")};
    const std::pair<std::size_t, int> fields[] = {{2, 2}, {4, 2}, {6, 2}, {8, 4}}; // place and width
    std::string bytes;
    for (const std::string &each : records)
        bytes += each;
    EXPECT_EQ(reception(bytes).summary(), "[a t aaaaAA][b t bbbbbb]");
    std::size_t start = 0;
    for (const std::string &each : records) {
        for (const auto &[at, width] : fields) {
            const std::uint32_t most = width == 2 ? 0xFFFF : 0xFFFFFFFF;
            std::uint32_t right = 0;
            for (std::size_t i = 0; i < static_cast<std::size_t>(width); ++i)
                right = right << 8 | static_cast<unsigned char>(each[at + i]);
            for (const std::uint32_t lie : {right - 1, right + 4, right + 8, most, most - 3}) {
                if (lie + 1 == right && (at == 6 || (at == 4 && start == 0)))
                    continue; // a type, or the message's id, one shorter: followed by what no one checks
                std::string changed = bytes;
                changed.replace(start + at, static_cast<std::size_t>(width), number(lie & most, width));
                EXPECT_EQ(reception(changed).summary().substr(0, 1), "!")
                    << "record at " << start << ", field at " << at << ": " << lie << " for " << right;
            }
        }
        start += each.size();
    }
}

} // namespace
