// DIME records on the wire and back, streams, chunks, and lengths that lie.
#include <malloc.h>

#include "support/attachment_checks.h"
#include "support/dime_bytes.h"
#include "support/host_streams.h"

using namespace attachment_exchange;
using namespace dime_bytes;

namespace {

constexpr std::uint32_t SENDING = MODE_BUFFERED | MODE_BARE_XML;
const std::string START = message_record(0, "<data href=\"a\"/>");

TEST(dime_out, is_one_record_for_the_message_and_one_for_each_attachment)
{
    const std::string first = "first";
    const std::string second = "second!!";
    memory_wire wire(0, SENDING);
    char *options = soap_dime_options_make(&wire, 7, "opt");
    ASSERT_NE(options, nullptr);
    options[5] = '\0'; // the length says where they end
    ASSERT_EQ(soap_dime_attach(&wire, const_cast<char *>("host's"), 6, nullptr, "own", 0, "o"), 0);
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
    EXPECT_THAT(xml, HasSubstr("<data href=\"cid:id1\""));
    EXPECT_THAT(xml, HasSubstr("<data href=\"cid:two\""));
    EXPECT_THAT(xml, HasSubstr("<data>Zmlyc3Q=</data>")); // neither id nor type: inline
    EXPECT_EQ(xml.substr(xml.size() - 2), "\r\n");
    EXPECT_EQ(sent, record(MB, URI, "cid:id0", ENVELOPE_URI, xml) +
                        record(0, MEDIA, "own", "", "host's", std::string("\0\0\0\1o", 5)) +
                        record(0, MEDIA, "id1", "image/png", first) +
                        record(ME, MEDIA, "two", "", second, std::string("\0\7\0\3o\0t", 7)));
    expect_same_at_every_split(sent,
                               "[cid:id1 image/png first][cid:two (null) second!!][(null) (null) first]");
}

TEST(dime_out, cuts_texts_and_refuses_data_that_no_header_can_announce)
{
    std::string long_text(70000, 't');
    memory_wire wire;
    wire.mode = MODE_BUFFERED | MODE_DIME;
    wire.dime.id = long_text.data();
    wire.dime.options = soap_dime_options_make(&wire, 0, long_text.c_str());
    ASSERT_NE(wire.dime.options, nullptr);
    EXPECT_EQ(std::strlen(wire.dime.options + 4), 65531U);
    EXPECT_EQ(soap_dime_header_write(&wire), 0);
    soap_send_flush(&wire);
    EXPECT_EQ(wire.sent().size(), 12U + 65536U + 65536U);
    EXPECT_EQ(wire.sent().substr(2, 4), "\xFF\xFF\xFF\xFF");
    if constexpr (sizeof wire.dime.size > 4) {
        wire.dime.size = std::size_t{1} << (sizeof wire.dime.size * 4);
        EXPECT_EQ(soap_dime_header_write(&wire), SOAP_DIME_ERROR);
    }
    memory_wire large(0, SENDING | MODE_DIME);
    soap_reset_call(&large);
    ASSERT_EQ(soap_count_begin(&large), 0);
    ASSERT_EQ(soap_envelope_out_begin(&large), 0);
    large.message_count += std::uint64_t{1} << 32; // as if so much had been written
    EXPECT_EQ(soap_envelope_out_end(&large), SOAP_DIME_ERROR);
}

// Parts of the host's memory and of its streams, whose ends are closed; MIME as well as DIME.
TEST(attachments_out, end_in_an_error_wherever_sends_are_refused)
{
    const std::string first = "first";
    for (const std::uint32_t form : {MODE_DIME, MODE_MIME | MODE_MTOM, MODE_MTOM | MODE_CANONICAL}) {
        const bool dime = form == MODE_DIME;
        std::size_t all = 1;
        for (std::size_t limit = SIZE_MAX; limit == SIZE_MAX || limit < all;
             ++limit) { // first all, then from 0 on
            SCOPED_TRACE(std::to_string(form) + " after " + std::to_string(limit));
            host_stream source = {std::string(2500, 's')};
            stream_host host;
            memory_wire wire(0, MODE_DIRECT | MODE_BARE_XML | form);
            host.serve(wire);
            wire.send_limit = limit;
            auto *const handle = reinterpret_cast<char *>(&source);
            if (dime)
                soap_dime_attach(&wire, handle, 2500, "a/b", "s", 1, "options");
            else
                soap_mime_attach(&wire, handle, 2500, MIME_BINARY, "a/b", "<s>", "there", "what");
            const int result = send(wire, {make_value(first, "cid:memory", "image/png")});
            EXPECT_EQ(result, limit == SIZE_MAX ? 0 : -1);
            EXPECT_EQ(source.closed, source.at != 0 ? 1 : source.closed);
            all = limit == SIZE_MAX ? wire.sends.size() : all;
        }
        EXPECT_GT(all, 20U);
    }
}

TEST(dime_stream, goes_out_as_one_record_or_in_chunks_if_its_length_is_unknown)
{
    for (const bool known : {true, false})
        for (const std::size_t length : {0U, 1U, 1023U, 1024U, 2500U}) {
            if (known && length == 0)
                continue;
            host_stream source = {std::string(length, 's')};
            stream_host host;
            memory_wire wire(0, (known ? MODE_BUFFERED : MODE_STORE) | MODE_BARE_XML | MODE_DIME);
            host.serve(wire);
            soap_dime_attach(&wire, reinterpret_cast<char *>(&source), known ? length : 0, "a/b", "s", 0,
                             nullptr);
            ASSERT_EQ(send(wire, {}, known), 0);
            std::string tail;
            for (std::size_t at = 0; at <= length; at += 1024) {
                const std::string part = source.data.substr(at, known ? length : 1024);
                const unsigned flags = known || part.size() < 1024 ? ME : CF;
                tail +=
                    at == 0 ? record(flags, MEDIA, "s", "a/b", part) : record(flags, UNCHANGED, "", "", part);
                if (known)
                    break;
            }
            EXPECT_TRUE(wire.sent().ends_with(tail)) << length;
            reception back(wire.sent());
            EXPECT_EQ(back.summary(), "");
            const soap_attachment *const list = back.wire->dime.list;
            ASSERT_NE(list, nullptr);
            ASSERT_EQ(list->size, source.data.size());
            EXPECT_EQ(std::string_view(list->content, source.data.size() + 1), source.data + '\0');
            EXPECT_EQ(list->next, nullptr);
        }
}

TEST(dime_stream, takes_received_data_over_all_chunks)
{
    stream_host host;
    reception read(START + record(CF, MEDIA, "a", "t", "one") + record(CF, UNCHANGED, "", "", "") +
                       record(0, UNCHANGED, "", "", "two") + record(ME, MEDIA, "memory", "", "m"),
                   0, 7, 5);
    host.serve(*read.wire);
    EXPECT_EQ(read.run(), 0);
    EXPECT_EQ(host.of("a").data, "onetwo");
    EXPECT_EQ(host.of("a").closed, 1);
    EXPECT_EQ(read.values[0].size, 6);
    EXPECT_STREQ(read.wire->dime.list->next->content, "m");
}

// What no header can announce goes out in chunks that one can. The data is a stream of zeros, and what leaves is
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
    EXPECT_THAT(headers, HasSubstr(header(CF, MEDIA, 0, 1, 3, 0xFFFFFFFC)));
    EXPECT_EQ(headers.find(header(ME, UNCHANGED, 0, 0, 0, 5)), headers.size() - 12 - 8);
#endif
}

TEST(dime_in, reports_what_is_wrong_with_a_message)
{
    const std::string good = record(ME, MEDIA, "a", "t", "x");
    const auto with_byte = [](std::string bytes, std::size_t at, char byte) {
        return bytes[at] = byte, bytes;
    };
    const auto with_options = [](const std::string &options) {
        return START + record(ME, MEDIA, "a", "t", "x", options);
    };
    const std::string begun = record(MB | CF, URI, "m", "", envelope("").substr(0, 101)); // with padding
    const std::tuple<const char *, std::string, int> cases[] = {
        {"good", START + good, 0},
        {"version", START + with_byte(good, 0, 0x10), SOAP_DIME_VERSION},
        {"no end", START + record(0, MEDIA, "a", "t", "x"), SOAP_EOF},
        {"no such attachment", START + record(ME, MEDIA, "b", "t", "x"), SOAP_DIME_HREF},
        {"no attachment", message_record(ME, "<data href=\"a\"/>"), SOAP_DIME_HREF},
        {"a chunk without a beginning", START + record(CF, UNCHANGED, "", "", "x") + good, SOAP_DIME_ERROR},
        {"a beginning within chunks", START + record(CF, MEDIA, "b", "t", "x") + good, SOAP_DIME_ERROR},
        {"the message again", START + START + good, SOAP_DIME_ERROR},
        {"nothing but the attachment's end", START + record(ME, UNCHANGED, "", "", "x"), SOAP_DIME_ERROR},
        {"end within a record", START + record(ME | CF, MEDIA, "a", "t", "x") + good, SOAP_DIME_ERROR},
        {"a part of the message, then a record", begun + good, SOAP_DIME_ERROR},
        {"the message unfinished", message_record(CF, "<data href=\"a\"/>") + good, SOAP_DIME_ERROR},
        {"padding that is none: the length was too short",
         with_byte(begun, begun.size() - 1, '!') + record(ME, UNCHANGED, "", "", envelope("").substr(101)),
         SOAP_DIME_ERROR},
        {"options", with_options(std::string("\1\2\0\3opt", 7)), 0},
        {"options longer than their block", with_options(std::string("\1\2\0\4opt", 7)), SOAP_DIME_ERROR},
        {"options of the largest size", with_options(std::string("\1\2\xFF\xFFopt", 7)), SOAP_DIME_ERROR},
        {"options without a length", with_options("\1"), SOAP_DIME_ERROR},
    };
    for (const auto &[rule, message, error] : cases)
        EXPECT_EQ(reception(message).run(), error) << rule;
    EXPECT_NE(reception(with_byte(START + good, 11, 10)).run(), 0) << "a record shorter than the message";
}

TEST(dime_in, costs_no_memory_for_what_is_only_announced)
{
#if defined(__SANITIZE_ADDRESS__)
    GTEST_SKIP() << "the allocator's statistics are those of the sanitizer";
#else
    for (const std::string &rest :
         {header(ME, MEDIA, 0, 0, 0, 0xFFFFFFFF) + "x", header(CF, MEDIA, 0, 0, 0, 0xFFFFFFF0) + "x"}) {
        reception read(START + rest);
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

} // namespace
