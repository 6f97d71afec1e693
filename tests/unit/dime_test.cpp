// DIME records on the wire and back, streams, chunks, and lengths that lie.
#include <malloc.h>

#include "support/attachment_checks.h"
#include "support/dime_bytes.h"
#include "support/host_streams.h"

using namespace attachment_exchange;
using namespace dime_bytes;

namespace {

constexpr std::uint32_t SENDING = MODE_BUFFERED | MODE_BARE_XML;

TEST(dime_out, is_one_record_for_the_message_and_one_for_each_attachment)
{
    const std::string first = "first";
    const std::string second = "second!!";
    memory_wire wire(0, SENDING);
    char *options = soap_dime_options_make(&wire, 7, "opt");
    options[5] = '\0'; // the length tells where they end
    ASSERT_EQ(soap_dime_attach(&wire, const_cast<char *>("host's"), 6, nullptr, "own", 0, nullptr), 0);
    ASSERT_EQ(
        send(wire, {make_value(first, nullptr, "image/png"), make_value(second, "cid:two", nullptr, options),
                    make_value(first, nullptr, nullptr)}),
        0);
    const std::string sent = wire.sent();
    const std::size_t xml_at = 12 + 8 + 44;
    ASSERT_GT(sent.size(), xml_at);
    const std::size_t xml_size =
        static_cast<unsigned char>(sent[10]) * 256U + static_cast<unsigned char>(sent[11]);
    const std::string xml = sent.substr(xml_at, xml_size);
    EXPECT_NE(xml.find("<data href=\"cid:id1\""), std::string::npos) << xml;
    EXPECT_NE(xml.find("<data href=\"cid:two\""), std::string::npos) << xml;
    EXPECT_NE(xml.find("<data>Zmlyc3Q=</data>"), std::string::npos) << xml; // neither id nor type: inline
    EXPECT_EQ(xml.substr(xml.size() - 2), "\r\n");
    EXPECT_EQ(sent, record(MB, URI, "cid:id0", ENVELOPE_URI, xml) + record(0, MEDIA, "own", "", "host's") +
                        record(0, MEDIA, "id1", "image/png", first) +
                        record(ME, MEDIA, "two", "", second, std::string("\0\7\0\3o\0t", 7)));
    expect_same_at_every_split(sent,
                               "[cid:id1 image/png first][cid:two (null) second!!][(null) (null) first]");
}

TEST(dime_out, of_a_message_alone_is_one_record)
{
    memory_wire wire(0, SENDING | MODE_DIME);
    ASSERT_EQ(send(wire, {}), 0);
    EXPECT_EQ(wire.sent().substr(0, 2), "\x0E\x20");
}

TEST(dime_out, cuts_texts_and_refuses_data_that_no_header_can_tell)
{
    std::string long_text(70000, 't');
    memory_wire wire;
    wire.mode = MODE_BUFFERED | MODE_DIME;
    wire.dime.id = long_text.data();
    wire.dime.options = soap_dime_options_make(&wire, 0, long_text.c_str());
    EXPECT_EQ(std::strlen(wire.dime.options + 4), 65531U);
    EXPECT_EQ(soap_dime_header_write(&wire), 0);
    soap_send_flush(&wire);
    EXPECT_EQ(wire.sent().size(), 12U + 65536U + 65536U);
    EXPECT_EQ(wire.sent().substr(2, 4), "\xFF\xFF\xFF\xFF");
    wire.dime.size = 0x100000000;
    EXPECT_EQ(soap_dime_header_write(&wire), SOAP_DIME_ERROR);
}

// --- streams of the host ---

TEST(dime_stream, of_known_length_goes_out_as_one_record_unless_it_ends_early)
{
    for (const std::size_t missing : {0U, 1U}) {
        host_stream source = {std::string(5001, 's')};
        stream_host host;
        memory_wire wire(0, SENDING | MODE_DIME);
        host.serve(wire);
        soap_dime_attach(&wire, reinterpret_cast<char *>(&source), source.data.size() + missing, "a/b", "s",
                         0, nullptr);
        soap_dime_attach(&wire, const_cast<char *>("m"), 1, "a/b", "memory", 0, "o");
        EXPECT_EQ(send(wire, {}), missing == 0 ? 0 : SOAP_EOF);
        EXPECT_EQ(source.closed, 1);
        if (missing == 0) {
            EXPECT_TRUE(
                wire.sent().ends_with(record(0, MEDIA, "s", "a/b", source.data) +
                                      record(ME, MEDIA, "memory", "a/b", "m", std::string("\0\0\0\1o", 5))));
        }
    }
}

TEST(dime_stream, of_unknown_length_goes_out_in_chunks)
{
    for (const std::size_t length : {0U, 1U, 1023U, 1024U, 2500U}) {
        host_stream source = {std::string(length, 's')};
        stream_host host;
        memory_wire wire(0, MODE_STORE | MODE_BARE_XML | MODE_DIME);
        host.serve(wire);
        soap_dime_attach(&wire, reinterpret_cast<char *>(&source), 0, "a/b", "s", 0, nullptr);
        ASSERT_EQ(send(wire, {}, false), 0);
        std::string tail;
        std::size_t left = length;
        for (bool first = true;; first = false) {
            const std::size_t part = std::min<std::size_t>(left, 1024);
            tail += record(part == 1024 ? CF : ME, first ? MEDIA : UNCHANGED, first ? "s" : "",
                           first ? "a/b" : "", std::string(part, 's'));
            left -= part;
            if (part != 1024)
                break;
        }
        EXPECT_TRUE(wire.sent().ends_with(tail)) << length;
        reception back(wire.sent());
        EXPECT_EQ(back.summary(), "");
        ASSERT_NE(back.wire->dime.list, nullptr);
        EXPECT_EQ(std::string(back.wire->dime.list->content, back.wire->dime.list->size), source.data);
        EXPECT_EQ(back.wire->dime.list->content[length], '\0');
        EXPECT_EQ(back.wire->dime.list->next, nullptr);
    }
}

TEST(dime_stream, takes_received_data_over_all_chunks)
{
    const std::string message = message_record(0, "<data href=\"a\"/>") + record(CF, MEDIA, "a", "t", "one") +
                                record(CF, UNCHANGED, "", "", "") + record(0, UNCHANGED, "", "", "two") +
                                record(ME, MEDIA, "memory", "", "m");
    stream_host host;
    reception read(message, 0, 7, 5);
    host.serve(*read.wire);
    EXPECT_EQ(read.run(), 0);
    EXPECT_EQ(host.of("a").data, "onetwo");
    EXPECT_EQ(host.of("a").closed, 1);
    EXPECT_EQ(static_cast<const void *>(read.values[0].content), &host.of("a"));
    EXPECT_EQ(read.values[0].size, 6);
    EXPECT_STREQ(read.wire->dime.list->next->content, "m");

    reception failing(message);
    host.refusal = 55;
    host.serve(*failing.wire);
    EXPECT_EQ(failing.run(), 55);
    EXPECT_EQ(host.of("a").closed, 1);
}

// What no header can tell goes out in chunks that one can. The data is a stream of zeros, and what leaves is
// only counted.
TEST(dime_stream, of_more_than_32_bits_goes_out_in_chunks)
{
#if defined(ZUV_SANITIZED)
    GTEST_SKIP() << "four gigabytes are too slow here";
#else
    static std::uint64_t sent;
    static std::string headers;
    sent = 0;
    headers.clear();
    const std::uint64_t length = 0xFFFFFFFC + std::uint64_t{5};
    memory_wire wire(0, SENDING | MODE_DIME);
    wire.dime_read_open = [](soap *, void *handle, const char *, const char *, const char *) {
        return handle;
    };
    wire.dime_read = [](soap *, void *, char *, std::size_t size) { return size; };
    wire.on_send = [](soap *, const char *data, std::size_t size) {
        if (sent == 0 || size < SOAP_BUFFER_SIZE)
            headers.append(data, size);
        sent += size;
        return 0;
    };
    char handle = 0;
    soap_dime_attach(&wire, &handle, length, "a/b", "s", 0, nullptr);
    soap_reset_call(&wire);
    ASSERT_EQ(soap_count_begin(&wire), 0);
    ASSERT_EQ(write_message(&wire, {}), 0);
    const std::uint64_t counted = soap_message_length(&wire);
    ASSERT_EQ(soap_send_begin(&wire), 0);
    ASSERT_EQ(write_message(&wire, {}), 0);
    ASSERT_EQ(soap_send_finish(&wire), 0);
    EXPECT_EQ(sent, counted);
    EXPECT_NE(headers.find(header(CF, MEDIA, 0, 1, 3, 0xFFFFFFFC)), std::string::npos);
    EXPECT_EQ(headers.find(header(ME, UNCHANGED, 0, 0, 0, 5)), headers.size() - 12 - 8);
#endif
}

// --- received ---

TEST(dime_in, keeps_options_and_refuses_those_that_lie)
{
    const std::string good("\1\2\0\3opt", 7);
    for (const std::string &options :
         {good, std::string("\1\2\0\4opt", 7), std::string("\1\2\xFF\xFFopt", 7), std::string("\1", 1)}) {
        reception read(message_record(0, "<data href=\"a\"/>") + record(ME, MEDIA, "a", "t", "x", options));
        EXPECT_EQ(read.run(), options == good ? 0 : SOAP_DIME_ERROR);
        if (options == good) {
            EXPECT_EQ(std::string(read.values[0].options, 7), good);
        }
    }
}

TEST(dime_in, reports_what_is_wrong_with_a_message)
{
    const std::string start = message_record(0, "<data href=\"a\"/>");
    const std::string good = record(ME, MEDIA, "a", "t", "x");
    std::string wrong_version = good;
    wrong_version[0] = static_cast<char>(wrong_version[0] ^ 0x10);
    struct wrong_case {
        const char *rule;
        std::string rest;
        int error;
    };
    const wrong_case cases[] = {
        {"good", good, 0},
        {"version", wrong_version, SOAP_DIME_VERSION},
        {"no end", record(0, MEDIA, "a", "t", "x"), SOAP_EOF},
        {"no such attachment", record(ME, MEDIA, "b", "t", "x"), SOAP_DIME_HREF},
        {"a chunk without a beginning", record(CF, UNCHANGED, "", "", "x") + good, SOAP_DIME_ERROR},
        {"a beginning within chunks", record(CF, MEDIA, "b", "t", "x") + good, SOAP_DIME_ERROR},
        {"the message again", start + good, SOAP_DIME_ERROR},
        {"nothing but the attachment's end", record(ME, UNCHANGED, "", "", "x"), SOAP_DIME_ERROR},
        {"end within a record", record(ME | CF, MEDIA, "a", "t", "x") + good, SOAP_DIME_ERROR},
    };
    for (const wrong_case &c : cases)
        EXPECT_EQ(reception(start + c.rest).run(), c.error) << c.rule;
    std::string overrun = start + good; // the message's own record is shorter than the message
    overrun[11] = 10;
    EXPECT_NE(reception(overrun).run(), 0);
    std::string chunk = record(MB | CF, URI, "m", "", envelope("").substr(0, 101));
    EXPECT_EQ(reception(chunk + good).run(), SOAP_DIME_ERROR);
    EXPECT_EQ(reception(message_record(CF, "<data href=\"a\"/>") + good).run(), SOAP_DIME_ERROR);
    chunk.back() = '!'; // padding that isn't: the length was too short
    EXPECT_EQ(reception(chunk + record(ME, UNCHANGED, "", "", envelope("").substr(101))).run(),
              SOAP_DIME_ERROR);
    EXPECT_EQ(reception(message_record(ME, "<data href=\"a\"/>")).run(), SOAP_DIME_HREF);
}

TEST(dime_in, costs_no_memory_for_what_is_only_announced)
{
#if defined(__SANITIZE_ADDRESS__)
    GTEST_SKIP() << "the allocator's statistics are those of the sanitizer";
#else
    const std::string start = message_record(0, "<data href=\"a\"/>");
    for (const std::string &rest :
         {header(ME, MEDIA, 0, 0, 0, 0xFFFFFFFF) + "x", header(CF, MEDIA, 0, 0, 0, 0xFFFFFFF0) + "x"}) {
        reception read(start + rest);
        const struct mallinfo2 before = mallinfo2();
        const std::size_t used = before.uordblks + before.hblkhd;
        EXPECT_EQ(read.run(), SOAP_EOF);
        const struct mallinfo2 after = mallinfo2();
        EXPECT_LT(after.uordblks + after.hblkhd, used + 1000000);
    }
#endif
}

TEST(dime_in, survives_every_refused_allocation)
{
    expect_survival_of_every_refused_allocation(
        message_record(CF, "<data href=\"a\"/>") + record(0, UNCHANGED, "", "", "") +
        record(CF, MEDIA, "a", "t", "one") + record(0, UNCHANGED, "", "", std::string(5000, 'x')) +
        record(ME, MEDIA, "b", "", "y"));
}

TEST(dime, carries_megabytes_unchanged)
{
    expect_megabytes_unchanged(SENDING, 0);
}

} // namespace
