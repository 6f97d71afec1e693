// Both directions together: any bytes through every framing and compression come back equal.
#include "support/memory_wire.h"
#include "support/testing.h"

namespace {

using random_source = std::mt19937;

struct framing {
    std::uint32_t io;
    bool bare;       // no head: the message is recognised by its first bytes
    int compression; // 0 none, 1 deflate, 2 gzip
    const char *dictionary;
};

void PrintTo(const framing &f, std::ostream *out)
{
    *out << "io " << f.io << (f.bare ? " without a head" : "") << " compression " << f.compression
         << (f.dictionary != nullptr ? " dictionary" : "");
}

// Without a head, deflate looks like text, and chunks are no form at all.
std::vector<framing> all_framings()
{
    std::vector<framing> rows;
    for (const std::uint32_t io : {MODE_DIRECT, MODE_BUFFERED, MODE_STORE, MODE_CHUNKED})
        for (const bool bare : {false, true})
            for (const int compression : {0, 1, 2})
                for (const char *dictionary : {static_cast<const char *>(nullptr), "<element>text</element>"})
                    if (!(bare && (io == MODE_CHUNKED || compression == 1)) &&
                        !(dictionary && compression == 0))
                        rows.push_back({io, bare, compression, dictionary});
    return rows;
}

void set_dictionary(soap &ctx, const char *dictionary)
{
    ctx.zlib_dictionary = dictionary;
    ctx.zlib_dictionary_length = dictionary != nullptr ? static_cast<unsigned>(std::strlen(dictionary)) : 0;
}

std::string random_body(random_source &random, std::size_t size)
{
    std::string body(size, '<');
    const bool text = random() % 2 == 0; // compresses well, or not at all
    for (std::size_t i = 1; i < size; ++i)
        body[i] = text ? "<element>text</element>"[random() % 23] : static_cast<char>(random());
    return body;
}

// Writes the body in random stretches; the same ones for the same seed.
int write_body(soap *ctx, const std::string &body, unsigned seed)
{
    random_source random(seed);
    const std::size_t longest = random() % 3 == 0 ? 100000 : 1000;
    for (std::size_t at = 0; at < body.size();) {
        const std::size_t length = std::min<std::size_t>(random() % longest, body.size() - at);
        if (soap_send_bytes(ctx, body.data() + at, length) != 0)
            return ctx->error;
        at += length;
    }
    return 0;
}

std::string sent_message(const framing &form, const std::string &body, unsigned seed)
{
    memory_wire wire(MODE_KEEP_ALIVE, MODE_KEEP_ALIVE | form.io | (form.bare ? MODE_BARE_XML : 0U) |
                                          (form.compression != 0 ? MODE_DEFLATE : 0U));
    set_dictionary(wire, form.dictionary);
    wire.zlib_out = static_cast<std::int16_t>(form.compression);
    wire.on_open = [](soap *, const char *, const char *, int) { return -1; }; // sent to no one
    EXPECT_EQ(soap_count_begin(&wire), 0);
    if ((wire.mode & MODE_COUNTING) != 0) {
        EXPECT_EQ(write_body(&wire, body, seed), 0);
        EXPECT_EQ(soap_message_length(&wire), body.size());
    }
    EXPECT_EQ(soap_count_end(&wire), 0);
    EXPECT_EQ(form.bare ? soap_send_begin(&wire) : soap_server_connect(&wire, "http://host/path", ""), 0);
    EXPECT_EQ(write_body(&wire, body, seed), 0);
    EXPECT_EQ(soap_send_finish(&wire), 0);
    return wire.sent();
}

void expect_received(memory_wire &wire, const framing &form, const std::string &body)
{
    SCOPED_TRACE(testing::PrintToString(form) + " size " + std::to_string(body.size()));
    wire.keep_alive = 1;
    set_dictionary(wire, form.dictionary);
    ASSERT_EQ(soap_receive_begin(&wire), 0);
    EXPECT_TRUE(wire.read_all() == body);
    EXPECT_EQ(soap_receive_finish(&wire), 0);
    EXPECT_EQ(wire.response_unfinished, form.bare);
    EXPECT_EQ(wire.zlib_state, 0);
}

} // namespace

TEST(framing, any_bytes_come_back_through_every_framing)
{
    random_source random(20240611);
    for (const framing &form : all_framings()) {
        for (const std::size_t size : {1U, 2U, 300U, 65535U, 65536U, 65537U, 131072U, 400000U}) {
            const std::string body = random_body(random, size);
            const std::string message = sent_message(form, body, static_cast<unsigned>(random()));
            memory_wire wire(MODE_KEEP_ALIVE);
            const std::size_t longest = size < 1000 ? 3 : random() % 2 == 0 ? 70000 : 500;
            wire.piece = [&random, longest](std::size_t) { return random() % longest; };
            // Three messages on one connection: what one leaves must not meet the next.
            for (int i = 0; i < 3; ++i) {
                wire.receive(message);
                expect_received(wire, form, body);
                if (form.bare)
                    break;
            }
        }
    }
}

TEST(framing, a_message_cut_anywhere_never_counts_as_read_to_its_end)
{
    random_source random(7);
    for (const framing &form : all_framings()) {
        const std::string body = random_body(random, 200);
        const std::string message = sent_message(form, body, 1);
        for (std::size_t cut = 0; !form.bare && cut < message.size(); ++cut) {
            memory_wire wire(MODE_KEEP_ALIVE);
            wire.keep_alive = 1;
            set_dictionary(wire, form.dictionary);
            wire.receive(message.substr(0, cut));
            if (soap_receive_begin(&wire) == 0) {
                const std::string read = wire.read_all();
                EXPECT_EQ(body.compare(0, read.size(), read), 0);
                soap_receive_finish(&wire);
            }
            EXPECT_TRUE(wire.response_unfinished) << testing::PrintToString(form) << " cut at " << cut;
            EXPECT_LT(wire.receives, 10U);
        }
    }
}

TEST(framing, damaged_messages_end_with_bounded_work)
{
    random_source random(99);
    for (const framing &form : all_framings()) {
        const std::string message = sent_message(form, random_body(random, 3000), 1);
        for (int round = 0; round < 200; ++round) {
            std::string damaged = message;
            for (unsigned i = random() % 8 + 1; i != 0; --i)
                damaged.replace(random() % damaged.size(), random() % 3 == 0 ? random() % 20 : 1, 1,
                                static_cast<char>(random()));
            memory_wire wire(MODE_KEEP_ALIVE);
            wire.keep_alive = static_cast<std::int16_t>(random() % 2);
            set_dictionary(wire, form.dictionary);
            wire.receive(damaged);
            wire.piece = [&random](std::size_t) { return random() % 1000; };
            if (soap_receive_begin(&wire) == 0) {
                EXPECT_LT(wire.read_all().size(), damaged.size() * 1100);
                soap_receive_finish(&wire);
            }
            EXPECT_LE(wire.buffer_index, wire.buffer_length);
            EXPECT_LE(wire.buffer_length, SOAP_BUFFER_SIZE);
            EXPECT_LT(wire.receives, damaged.size() + 20);
        }
    }
}

TEST(framing, every_allocation_of_reading_may_fail_once)
{
    const std::string text = "<a>stored and compressed, stored and compressed!</a>";
    memory_wire wire;
    wire.receive(sent_message({MODE_STORE, true, 2, nullptr}, text, 1));
    int result = 0;
    const auto read = [&] {
        wire.given = 0;
        result = soap_receive_begin(&wire) != 0 || !soap_recv_bytes_block(&wire, text.size())
                     ? wire.error
                     : soap_receive_finish(&wire);
    };
    const auto check = [&](bool refused) {
        EXPECT_TRUE(refused ? result == SOAP_OUT_OF_MEMORY || result == SOAP_ZLIB_ERROR : result == 0)
            << result;
        soap_reset_call(&wire);
        soap_discard_all(&wire);
        EXPECT_EQ(wire.zlib_state, 0);
    };
    EXPECT_GT(failing_malloc::at_each_allocation(failing_malloc::refuse::one, read, check), 3U);
}
