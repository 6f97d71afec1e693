// How a message leaves: modes, stages, framing on the wire, hooks, failures.
#include <zlib.h>

#include "support/memory_wire.h"
#include "support/testing.h"

namespace {

constexpr std::uint32_t HOST_BITS = MODE_IO_MASK | MODE_COUNTING | MODE_BARE_XML | MODE_DEFLATE | MODE_DIME |
                                    MODE_MIME | MODE_MTOM | MODE_UDP;

std::string seen; // by hooks

int see(soap *, const char *data, std::size_t length)
{
    seen.append(data, length);
    return 0;
}
int see_begin(soap *)
{
    return seen += '[', 0;
}
int see_end(soap *)
{
    return seen += ']', 0;
}

int test_response(soap *ctx, int, std::uint64_t count)
{
    return soap_send_text(ctx, ("HEAD " + std::to_string(count) + "\n").c_str());
}
int test_post(soap *ctx, const char *, const char *, int, const char *, const char *, std::uint64_t count)
{
    return test_response(ctx, 0, count);
}

// The whole road of a body, without a head but that of a stored message.
int send_message(memory_wire &wire, const std::string &body, std::size_t step = 7)
{
    const auto write = [&] {
        for (std::size_t at = 0; at < body.size(); at += step) {
            if (soap_send_bytes(&wire, body.data() + at, std::min(step, body.size() - at)) != 0)
                return wire.error;
        }
        return 0;
    };
    if (soap_count_begin(&wire) != 0)
        return wire.error;
    if ((wire.mode & MODE_COUNTING) != 0 && write() != 0)
        return wire.error;
    if (soap_count_end(&wire) != 0 || soap_send_begin(&wire) != 0 || write() != 0)
        return wire.error;
    return soap_send_finish(&wire);
}

std::string text_of_size(std::size_t size)
{
    std::string text;
    for (unsigned i = 1; text.size() < size; i = i * 1103515245U + 12345U)
        text += std::to_string(i >> 8) + "<a/>";
    text.resize(size);
    return text;
}

// zlib's own reading of a stream: window bits 31 for gzip with head and trailer checked, 15 for deflate.
std::string inflated(const std::string &bytes, int window_bits)
{
    z_stream stream{};
    EXPECT_EQ(inflateInit2(&stream, window_bits), Z_OK);
    std::string out(4U << 20, '\0');
    stream.next_in = reinterpret_cast<Bytef *>(const_cast<char *>(bytes.data()));
    stream.avail_in = static_cast<uInt>(bytes.size());
    stream.next_out = reinterpret_cast<Bytef *>(out.data());
    stream.avail_out = static_cast<uInt>(out.size());
    EXPECT_EQ(inflate(&stream, Z_FINISH), Z_STREAM_END);
    out.resize(stream.total_out);
    inflateEnd(&stream);
    return out;
}

constexpr std::uint32_t B = MODE_BUFFERED, S = MODE_STORE, C = MODE_CHUNKED, N = MODE_COUNTING,
                        X = MODE_BARE_XML, Z = MODE_DEFLATE, U = MODE_UDP, D = MODE_DIME, M = MODE_MIME,
                        T = MODE_MTOM;
const std::tuple<const char *, std::uint32_t, bool, bool, std::uint64_t, std::uint32_t, std::uint32_t>
    MODES[] = {
        {"direct, no socket", 0, false, false, 9, N, 0},
        {"direct to a socket, counted", 0, false, true, 9, N, B},
        {"bare direct to a socket", X, false, true, 0, X, X | B},
        {"buffered", B, false, true, 9, B | N, B},
        {"buffered bare", B | X, false, true, 0, B | X, B | X},
        {"buffered bare, hook", B | X, true, true, 9, B | X | N, B | X},
        {"store", S, false, true, 0, S, S},
        {"store, hook", S, true, true, 0, S, S},
        {"chunked", C, false, true, 0, C, C},
        {"chunked, hook", C, true, true, 9, C | N, C},
        {"direct deflate", Z, false, true, 0, Z | S, Z | S},
        {"direct deflate bare", Z | X, false, true, 0, Z | X | B, Z | X | B},
        {"buffered deflate", Z | B, false, true, 0, Z | S, Z | S},
        {"buffered deflate bare", Z | B | X, false, true, 0, Z | X | B, Z | X | B},
        {"chunked deflate", Z | C, false, true, 0, Z | C, Z | C},
        {"stored deflate", Z | S, false, true, 0, Z | S, Z | S},
        {"datagram", U, false, true, 0, U | X, U | X | B},
        {"datagram, hook", U | B, true, true, 9, U | X | B | N, U | X | B},
        {"DIME", B | D, false, true, 9, B | D | N, B | D},
        {"DIME stored", S | D, false, true, 9, S | D | N, S | D},
        {"DIME deflate", Z | D, false, true, 9, Z | S | D | N, Z | S | D},
        {"MTOM alone means nothing", B | T, false, true, 9, B | N, B},
        {"MTOM in MIME", B | T | M, false, true, 9, B | T | M | N, B | T | M},
        {"DIME and MTOM is MIME", B | D | T, false, true, 9, B | D | T | M | N, B | T | M},
};

} // namespace

TEST(buffered_out, modes_are_settled_by_the_table)
{
    // The last two are what soap_count_begin and soap_send_begin leave in ctx->mode.
    for (const auto &[rule, output_mode, prepare_hook, socket_open, counted, counting, sending] : MODES) {
        memory_wire wire(0, output_mode);
        wire.on_send_prepare = prepare_hook ? see : nullptr;
        ASSERT_EQ(soap_count_begin(&wire), 0) << rule;
        EXPECT_EQ(wire.mode & HOST_BITS, counting) << rule;
        wire.message_count = counted;
        wire.socket = socket_open ? 77 : -1;
        ASSERT_EQ(soap_send_begin(&wire), 0) << rule;
        EXPECT_EQ(wire.mode & HOST_BITS, sending) << rule;
        EXPECT_EQ(wire.message_part, PART_BEGIN);
        wire.socket = -1;
    }
    memory_wire uncounted;
    uncounted.mode = 0;
    uncounted.socket = 77;
    ASSERT_EQ(soap_send_begin(&uncounted), 0);
    EXPECT_EQ(uncounted.mode & MODE_IO_MASK, MODE_STORE) << "direct to a socket, uncounted";
    uncounted.socket = -1;
}

TEST(buffered_out, each_mode_has_its_form_on_the_wire)
{
    const std::tuple<std::uint32_t, int, const char *> rows[] = {
        {MODE_DIRECT, 0, "hello world"},
        {MODE_BUFFERED, 0, "hello world"},
        {MODE_CHUNKED, 0, "B\r\nhello world\r\n0\r\n\r\n"},
        {MODE_STORE, 0, "HEAD 11\nhello world"},
        {MODE_STORE, STATUS_POST, "HEAD 11\nhello world"},
        {MODE_STORE, STATUS_STOP, "hello world"},
        {MODE_STORE | MODE_BARE_XML, 0, "hello world"},
    };
    for (const auto &[mode, status, expected] : rows) {
        memory_wire wire(0, mode | MODE_WSU_ID);
        wire.on_response = test_response;
        wire.on_post = test_post;
        wire.status = status;
        ASSERT_EQ(send_message(wire, "hello world"), 0);
        EXPECT_EQ(wire.sent(), expected) << std::hex << mode << ' ' << std::dec << status;
        EXPECT_EQ(wire.output_mode, mode);
        EXPECT_EQ(wire.message_count, 0U);
        EXPECT_EQ(wire.block_stack, nullptr);
        EXPECT_EQ(wire.response_unfinished, status >= STATUS_POST);
    }
}

TEST(buffered_out, the_buffer_leaves_when_it_is_exactly_full_and_chunks_close_earlier_ones)
{
    for (const std::uint32_t mode : {MODE_BUFFERED, MODE_CHUNKED}) {
        memory_wire wire(0, mode);
        const std::string body = text_of_size(SOAP_BUFFER_SIZE + 10);
        ASSERT_EQ(soap_send_begin(&wire), 0);
        soap_send_bytes(&wire, body.data(), SOAP_BUFFER_SIZE - 1);
        EXPECT_TRUE(wire.sends.empty());
        soap_send_bytes(&wire, body.data() + SOAP_BUFFER_SIZE - 1, 1);
        EXPECT_EQ(wire.sends.back(), body.substr(0, SOAP_BUFFER_SIZE));
        soap_send_bytes(&wire, body.data() + SOAP_BUFFER_SIZE, 10);
        ASSERT_EQ(soap_send_finish(&wire), 0);
        EXPECT_EQ(wire.sent(), mode == MODE_BUFFERED
                                   ? body
                                   : "10000\r\n" + body.substr(0, SOAP_BUFFER_SIZE) + "\r\nA\r\n" +
                                         body.substr(SOAP_BUFFER_SIZE) + "\r\n0\r\n\r\n");
    }
    memory_wire none(0, MODE_CHUNKED);
    ASSERT_EQ(soap_send_begin(&none) + soap_send_finish(&none), 0);
    EXPECT_EQ(none.sent(), "0\r\n\r\n");
}

TEST(buffered_out, compressed_streams_are_what_zlib_reads)
{
    for (const std::size_t size : {0U, 1U, 700000U})
        for (const int encoding : {1, 2, 0}) { // deflate, gzip, and gzip if nothing was agreed on
            memory_wire wire(0, MODE_BUFFERED | MODE_BARE_XML | MODE_DEFLATE);
            wire.zlib_out = static_cast<std::int16_t>(encoding);
            const std::string body = text_of_size(size);
            ASSERT_EQ(send_message(wire, body, 4096), 0);
            EXPECT_EQ(wire.zlib_state, 0);
            EXPECT_EQ(inflated(wire.sent(), encoding == 1 ? 15 : 31), body);
            if (size > 1) {
                EXPECT_NEAR(wire.zlib_ratio_out, 0.5F, 0.5F);
            }
        }
    memory_wire wire(0, MODE_BUFFERED | MODE_BARE_XML | MODE_DEFLATE);
    wire.zlib_dictionary = "<a/>";
    wire.zlib_dictionary_length = 4;
    ASSERT_EQ(send_message(wire, "<a/>"), 0);
    EXPECT_EQ(wire.sent().substr(0, 10), std::string("\x1F\x8B\xFF\0\0\0\0\0\0\xFF", 10))
        << "a form of our own: the flags announce the dictionary, which gzip doesn't have";
}

TEST(buffered_out, the_prepare_hooks_see_each_byte_once_and_before_the_head)
{
    const std::string body = text_of_size(200000);
    for (const std::uint32_t mode :
         {MODE_DIRECT, MODE_BUFFERED, MODE_STORE, MODE_CHUNKED, MODE_BUFFERED | MODE_BARE_XML,
          MODE_CHUNKED | MODE_DEFLATE, MODE_STORE | MODE_DEFLATE, MODE_DEFLATE,
          MODE_BUFFERED | MODE_BARE_XML | MODE_DEFLATE, MODE_DEFLATE | MODE_BARE_XML}) {
        memory_wire wire(0, mode);
        wire.on_response = test_response;
        wire.on_send_prepare_begin = see_begin;
        wire.on_send_prepare = see;
        wire.on_send_prepare_end = see_end;
        seen.clear();
        ASSERT_EQ(send_message(wire, body, 3001), 0);
        EXPECT_TRUE(seen == '[' + body + ']') << std::hex << mode << ' ' << seen.size();
    }
}

TEST(buffered_out, a_send_filter_changes_what_is_counted_and_sent)
{
    memory_wire wire(0, MODE_BUFFERED);
    wire.on_send_filter = [](soap *, const char **data, std::size_t *length) {
        *length = **data == 'x' ? 0 : 3;
        return *data = "abc", 0;
    };
    const auto send_texts = [&] { soap_send_text(&wire, "12345"), soap_send_text(&wire, "x"); };
    soap_count_begin(&wire);
    send_texts();
    EXPECT_EQ(soap_message_length(&wire), 3U);
    soap_send_begin(&wire);
    send_texts();
    ASSERT_EQ(soap_send_finish(&wire), 0);
    EXPECT_EQ(wire.sent(), "abc");
}

TEST(buffered_out, a_datagram_is_one_send_or_an_error)
{
    memory_wire wire(0, MODE_UDP | MODE_BUFFERED);
    ASSERT_EQ(send_message(wire, text_of_size(SOAP_BUFFER_SIZE), 1000), 0);
    EXPECT_EQ(wire.sends.size(), 1U);
    wire.sends.clear();
    EXPECT_EQ(send_message(wire, text_of_size(SOAP_BUFFER_SIZE + 1), 1000), SOAP_UDP_ERROR);
    EXPECT_EQ(wire.error, SOAP_UDP_ERROR);
    EXPECT_EQ(wire.sends.size(), 0U);
    wire.message_count = SOAP_BUFFER_SIZE + 1;
    EXPECT_EQ(soap_send_begin(&wire), SOAP_UDP_ERROR);
}

TEST(buffered_out, the_error_of_a_hook_is_that_of_the_message)
{
    static const auto see_none = [](soap *, const char *, std::size_t) { return 77; };
    static const auto pass_none = [](soap *, const char **, std::size_t *) { return 77; };
    static const std::tuple<const char *, std::uint32_t, void (*)(soap &)> rows[] = {
        {"send", MODE_BUFFERED, [](soap &ctx) { ctx.on_send = see_none; }},
        {"send of a stored message", MODE_STORE, [](soap &ctx) { ctx.on_send = see_none; }},
        {"send of a chunk", MODE_CHUNKED, [](soap &ctx) { ctx.on_send = see_none; }},
        {"send of a datagram", MODE_UDP | MODE_BUFFERED, [](soap &ctx) { ctx.on_send = see_none; }},
        {"counting", MODE_BUFFERED, [](soap &ctx) { ctx.on_send_prepare = see_none; }},
        {"storing", MODE_STORE, [](soap &ctx) { ctx.on_send_prepare = see_none; }},
        {"filter", MODE_BUFFERED, [](soap &ctx) { ctx.on_send_filter = pass_none; }},
    };
    for (const auto &[rule, mode, set] : rows) {
        memory_wire wire(0, mode);
        set(wire);
        EXPECT_EQ(send_message(wire, "hello world"), 77) << rule;
        EXPECT_EQ(wire.error, 77) << rule;
    }
    memory_wire wire(0, MODE_BUFFERED);
    wire.on_send = see_none;
    ASSERT_EQ(soap_send_begin(&wire), 0);
    EXPECT_EQ(soap_send_bytes(&wire, text_of_size(SOAP_BUFFER_SIZE).data(), SOAP_BUFFER_SIZE), 77)
        << "at once";
}

TEST(buffered_out, without_a_callback_a_head_has_no_lines)
{
    memory_wire wire;
    wire.mode = MODE_BUFFERED;
    wire.status = STATUS_POST;
    wire.on_header_line = nullptr;
    EXPECT_EQ(http_write_request(&wire, "http://host/path", "host", 80, "path", "urn:a", 1), 0);
    EXPECT_EQ(soap_send_flush(&wire), 0);
    EXPECT_EQ(wire.sent(), "");
}

TEST(buffered_out, every_send_may_fail_and_leaves_nothing_behind)
{
    const std::string body = text_of_size(300000);
    for (const std::uint32_t mode :
         {MODE_BUFFERED, MODE_STORE, MODE_CHUNKED, MODE_CHUNKED | MODE_DEFLATE, MODE_STORE | MODE_DEFLATE,
          MODE_BUFFERED | MODE_DEFLATE | MODE_BARE_XML}) {
        memory_wire counter(0, mode);
        counter.on_response = test_response;
        ASSERT_EQ(send_message(counter, body, 5000), 0);
        for (std::size_t limit = 0; limit < counter.sends.size(); ++limit) {
            memory_wire wire(0, mode);
            wire.on_response = test_response;
            wire.send_limit = limit;
            EXPECT_EQ(send_message(wire, body, 5000), SOAP_EOF)
                << std::hex << mode << " at " << std::dec << limit;
            EXPECT_LE(wire.buffer_index, SOAP_BUFFER_SIZE);
            soap_send_finish(&wire);
            EXPECT_EQ(wire.zlib_state, 0);
            EXPECT_EQ(wire.block_stack, nullptr);
        }
    }
}
