// Both directions together: any bytes through every framing and compression come back equal.
#include <algorithm>
#include <random>
#include <string>

#include <gtest/gtest.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_io.h>

#include "support/failing_malloc.h"
#include "support/memory_wire.h"

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
    *out << "io " << f.io << (f.bare ? " bare" : "") << " compression " << f.compression
         << (f.dictionary != nullptr ? " dictionary" : "");
}

std::vector<framing> all_framings()
{
    std::vector<framing> rows;
    for (const std::uint32_t io : {MODE_DIRECT, MODE_BUFFERED, MODE_STORE, MODE_CHUNKED}) {
        for (const bool bare : {false, true}) {
            for (const int compression : {0, 1, 2}) {
                for (const char *dictionary :
                     {static_cast<const char *>(nullptr), "<element>text</element>"}) {
                    // Bare deflate cannot be told from text, bare chunks are no form at all.
                    if (!(bare && (compression == 1 || io == MODE_CHUNKED)) &&
                        !(dictionary != nullptr && compression == 0))
                        rows.push_back({io, bare, compression, dictionary});
                }
            }
        }
    }
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

int write_head(soap *ctx, std::uint64_t count)
{
    std::string head = "HTTP/1.1 200 OK\r\nContent-Type: text/xml\r\n";
    if ((ctx->output_mode & MODE_DEFLATE) != 0)
        head += ctx->zlib_out == 1 ? "Content-Encoding: deflate\r\n" : "Content-Encoding: gzip\r\n";
    if ((ctx->output_mode & MODE_IO_MASK) == MODE_CHUNKED)
        head += "Transfer-Encoding: chunked\r\n\r\n";
    else
        head += "Content-Length: " + std::to_string(count) + "\r\n\r\n";
    return soap_send_text(ctx, head.c_str());
}

int write_stored_head(soap *ctx, int, std::uint64_t count)
{
    return write_head(ctx, count);
}

// As a connection does it: the head is neither compressed nor chunked.
int write_head_first(soap *ctx, std::uint64_t count)
{
    const std::uint32_t mode = ctx->mode;
    if ((mode & MODE_IO_MASK) == MODE_STORE || (mode & MODE_BARE_XML) != 0)
        return 0;
    ctx->mode &= ~(MODE_IO_MASK | MODE_DEFLATE);
    if ((mode & MODE_IO_MASK) != MODE_DIRECT)
        ctx->mode |= MODE_BUFFERED;
    if (write_head(ctx, count) != 0)
        return ctx->error;
    if ((mode & MODE_IO_MASK) == MODE_CHUNKED && soap_send_flush(ctx) != 0)
        return ctx->error;
    ctx->mode = mode;
    return 0;
}

std::string sent_message(const framing &form, const std::string &body, unsigned seed)
{
    memory_wire wire(0, form.io | (form.bare ? MODE_BARE_XML : 0U) |
                            (form.compression != 0 ? MODE_DEFLATE : 0U));
    set_dictionary(wire, form.dictionary);
    wire.zlib_out = static_cast<std::int16_t>(form.compression);
    wire.on_response = write_stored_head;
    EXPECT_EQ(soap_count_begin(&wire), 0);
    if ((wire.mode & MODE_COUNTING) != 0) {
        EXPECT_EQ(write_body(&wire, body, seed), 0);
        EXPECT_EQ(soap_message_length(&wire), body.size());
    }
    EXPECT_EQ(soap_count_end(&wire), 0);
    const std::uint64_t count = soap_message_length(&wire);
    EXPECT_EQ(soap_send_begin(&wire), 0);
    EXPECT_EQ(write_head_first(&wire, count), 0);
    EXPECT_EQ(write_body(&wire, body, seed), 0);
    EXPECT_EQ(soap_send_finish(&wire), 0);
    return wire.sent();
}

void expect_received(memory_wire &wire, const framing &form, const std::string &body)
{
    wire.keep_alive = 1;
    set_dictionary(wire, form.dictionary);
    ASSERT_EQ(soap_receive_begin(&wire), 0) << testing::PrintToString(form);
    EXPECT_TRUE(wire.read_all() == body) << testing::PrintToString(form) << " size " << body.size();
    EXPECT_EQ(soap_receive_finish(&wire), 0) << testing::PrintToString(form);
    EXPECT_EQ(wire.response_unfinished, form.bare) << testing::PrintToString(form);
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
            // Three messages on one connection: what one leaves behind must not meet the next.
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
        if (form.bare)
            continue;
        const std::string body = random_body(random, 200);
        const std::string message = sent_message(form, body, 1);
        for (std::size_t cut = 0; cut < message.size(); ++cut) {
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
        const std::string body = random_body(random, 3000);
        const std::string message = sent_message(form, body, 1);
        for (int round = 0; round < 200; ++round) {
            std::string damaged = message;
            for (unsigned i = random() % 8 + 1; i != 0; --i) {
                const std::size_t at = random() % damaged.size();
                if (random() % 3 == 0)
                    damaged.erase(at, random() % 20);
                else
                    damaged[at] = static_cast<char>(random());
                if (damaged.empty())
                    damaged = "x";
            }
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

namespace {

// A wire that allocates nothing.
struct {
    char bytes[4000];
    std::size_t length, given;
} still_wire;

int take_still(soap *, const char *data, std::size_t length)
{
    if (length > sizeof still_wire.bytes - still_wire.length)
        return SOAP_EOF;
    std::memcpy(still_wire.bytes + still_wire.length, data, length);
    still_wire.length += length;
    return 0;
}

std::size_t give_still(soap *, char *buffer, std::size_t length)
{
    length = std::min(length, still_wire.length - still_wire.given);
    std::memcpy(buffer, still_wire.bytes + still_wire.given, length);
    still_wire.given += length;
    return length;
}

int send_still(soap *ctx)
{
    static const char TEXT[] = "<a>stored and compressed, stored and compressed!</a>"; // 52 bytes
    still_wire.length = still_wire.given = 0;
    ctx->on_send = take_still;
    ctx->on_response = nullptr;
    if (soap_count_begin(ctx) != 0 || soap_count_end(ctx) != 0 || soap_send_begin(ctx) != 0 ||
        soap_send_text(ctx, TEXT) != 0)
        return ctx->error;
    return soap_send_finish(ctx);
}

int receive_still(soap *ctx)
{
    ctx->on_recv = give_still;
    still_wire.given = 0;
    if (soap_receive_begin(ctx) != 0)
        return ctx->error;
    if (soap_recv_bytes_block(ctx, 52) == nullptr)
        return ctx->error;
    return soap_receive_finish(ctx);
}

} // namespace

TEST(framing, every_allocation_may_fail_once)
{
    for (const auto operation : {send_still, receive_still}) {
        int result = 0;
        memory_wire wire(0, MODE_STORE | MODE_DEFLATE);
        const std::size_t refused = failing_malloc::at_each_allocation(
            failing_malloc::refuse::one, [&] { result = operation(&wire); },
            [&](bool was_refused) {
                if (was_refused)
                    EXPECT_TRUE(result == SOAP_OUT_OF_MEMORY || result == SOAP_ZLIB_ERROR) << result;
                else
                    EXPECT_EQ(result, 0);
                soap_reset_call(&wire);
                soap_discard_all(&wire);
                EXPECT_EQ(wire.zlib_state, 0);
            });
        EXPECT_GT(refused, 3U);
    }
}
