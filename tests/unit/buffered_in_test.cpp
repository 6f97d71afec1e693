// How a message comes in: its start recognised, chunks and compression undone, its end proven, hostile bytes
// refused.
#include "support/deflated.h"
#include "support/memory_wire.h"

namespace {

const std::string OK_HEAD = "HTTP/1.1 200 OK\r\nContent-Type: text/xml\r\n";
const std::string CHUNKED_HEAD = OK_HEAD + "Transfer-Encoding: chunked\r\n\r\n";

std::string with_length(const std::string &body, std::size_t length)
{
    return OK_HEAD + "Content-Length: " + std::to_string(length) + "\r\n\r\n" + body;
}

struct outcome {
    int begun = 0;
    std::string body;
    int finished = 0;
    bool reusable = false;
    bool operator==(const outcome &) const = default;
};

void PrintTo(const outcome &o, std::ostream *out)
{
    *out << "begin " << o.begun << ", body of " << o.body.size() << " \"" << o.body.substr(0, 60)
         << "\", finish " << o.finished << (o.reusable ? ", reusable" : ", not reusable");
}

// One message, read as a reader does that takes all it gets; finish is asked only if no error was met before.
outcome read_message(memory_wire &wire)
{
    outcome result;
    result.begun = soap_receive_begin(&wire);
    if (result.begun == 0) {
        result.body = wire.read_all();
        result.finished = wire.error != 0 ? wire.error : soap_receive_finish(&wire);
    }
    result.reusable = !wire.response_unfinished;
    EXPECT_LE(wire.buffer_index, wire.buffer_length);
    EXPECT_LE(wire.buffer_length, SOAP_BUFFER_SIZE);
    return result;
}

using piece_sizes = std::function<std::size_t(std::size_t)>;

piece_sizes split_at(std::size_t split)
{
    return [split](std::size_t given) { return given < split ? split - given : SOAP_BUFFER_SIZE; };
}

std::size_t bytewise(std::size_t)
{
    return 1;
}

struct kept_wire : memory_wire {
    explicit kept_wire(const std::string &bytes, piece_sizes pieces = {}) : memory_wire(MODE_KEEP_ALIVE)
    {
        keep_alive = 1;
        piece = std::move(pieces);
        receive(bytes);
    }
};

outcome read_on_kept_connection(const std::string &bytes, piece_sizes pieces = {})
{
    kept_wire wire(bytes, std::move(pieces));
    return read_message(wire);
}

// Whole, byte by byte, in two pieces at every place; and cut at every place, where it must neither hang nor
// count as read to its end.
void check_every_reading(const std::string &rule, const std::string &bytes, const outcome &expected)
{
    EXPECT_EQ(read_on_kept_connection(bytes), expected) << rule << ", whole";
    EXPECT_EQ(read_on_kept_connection(bytes, bytewise), expected) << rule << ", byte by byte";
    for (std::size_t split = 1; split < bytes.size(); ++split)
        EXPECT_EQ(read_on_kept_connection(bytes, split_at(split)), expected)
            << rule << ", split at " << split;
    for (std::size_t cut = 0; cut < bytes.size() && expected.reusable; ++cut) {
        const outcome result = read_on_kept_connection(bytes.substr(0, cut));
        EXPECT_FALSE(result.reusable) << rule << ", cut at " << cut;
        EXPECT_LE(result.body.size(), expected.body.size()) << rule << ", cut at " << cut;
    }
}

std::string hook_saw;
int hook(soap *, const char *data, std::size_t length)
{
    hook_saw.append(data, length);
    return 0;
}

} // namespace

TEST(buffered_in, the_first_bytes_decide_what_is_read)
{
    const std::tuple<const char *, std::string, int, std::uint32_t, std::int32_t> rows[] = {
        {"plain XML", "<a/>", 0, MODE_LATIN1, '<'},
        {"blanks first", " \r\n\t<a/>", 0, MODE_LATIN1, '<'},
        {"nothing", "", SOAP_EOF, MODE_LATIN1, -1},
        {"blanks alone", "   ", SOAP_EOF, MODE_LATIN1, -1},
        {"UTF-8 mark", "\xEF\xBB\xBF<a/>", 0, 0, '<'},
        {"UTF-8 mark, blanks after it", "\xEF\xBB\xBF \r\n<a/>", 0, 0, '<'},
        {"UTF-8 mark and blanks alone", "\xEF\xBB\xBF  ", SOAP_EOF, 0, -1},
        {"UTF-16, low byte first", "\xFF\xFE<", SOAP_UTF_ERROR, MODE_LATIN1, -1},
        {"UTF-16, high byte first", "\xFE\xFF<", SOAP_UTF_ERROR, MODE_LATIN1, -1},
        {"gzip", gzipped("\n<a/>"), 0, MODE_LATIN1 | MODE_DEFLATE, '<'},
        {"gzip of nothing", gzipped(""), SOAP_EOF, MODE_LATIN1 | MODE_DEFLATE, -1},
        {"gzip cut in its head", "\x1F\x8B\x08", SOAP_ZLIB_ERROR, MODE_LATIN1, -1},
        {"gzip with a broken stream", "\x1F\x8B\x08zzzzzzz\xFF\xFF\xFF\xFF", SOAP_ZLIB_ERROR,
         MODE_LATIN1 | MODE_DEFLATE, -1},
        {"HTTP", with_length("x", 1), 0, MODE_LATIN1, 'x'},
    };
    for (const auto &[rule, bytes, result, mode, first] : rows) {
        for (const piece_sizes &pieces : {piece_sizes(), piece_sizes(bytewise)}) {
            memory_wire wire(MODE_LATIN1);
            wire.receive(bytes);
            wire.piece = pieces;
            EXPECT_EQ(soap_receive_begin(&wire), result) << rule;
            EXPECT_EQ(wire.error, result) << rule;
            EXPECT_EQ(wire.mode & (MODE_LATIN1 | MODE_DEFLATE | MODE_MIME | MODE_DIME), mode) << rule;
            if (result == 0) {
                EXPECT_EQ(soap_recv_byte(&wire), first) << rule;
            } else {
                EXPECT_EQ(wire.keep_alive, 0) << rule;
            }
        }
    }
}

TEST(buffered_in, a_false_mark_keeps_its_last_byte)
{
    for (const auto &[bytes, first] : {std::pair{"\xEF\xBBz", 0xFEC0 | 'z'}, {"\xEF<", 0xEF}}) {
        memory_wire wire;
        wire.on_read_head = [](soap *) { return 404; };
        wire.receive(bytes);
        EXPECT_EQ(soap_receive_begin(&wire), 404);
        EXPECT_EQ(wire.look_ahead, first);
    }
}

TEST(buffered_in, bodies_read_the_same_at_every_split)
{
    const std::tuple<const char *, std::string, outcome> rows[] = {
        {"two chunks", "3\r\n<a>\r\n4\r\n</a>\r\n0\r\n\r\n", {0, "<a></a>", 0, true}},
        {"extensions", "4;x=1\r\n<a/>\r\n0;y\r\n\r\n", {0, "<a/>", 0, true}},
        {"no carriage returns", "4\n<a/>\n0\n\n", {0, "<a/>", 0, true}},
        {"either case",
         "a\r\n0123456789\r\nB\r\n0123456789a\r\n0\r\n\r\n",
         {0, "01234567890123456789a", 0, true}},
        {"leading zeros", "0000000000000004\r\n<a/>\r\n0\r\n\r\n", {0, "<a/>", 0, true}},
        {"trailers", "4\r\n<a/>\r\n0\r\nA: b\r\nC: d\r\n\r\n", {0, "<a/>", 0, true}},
        {"digits past the sixteenth", "00000000000000041\r\n<a/>\r\n0\r\n\r\n", {0, "<a/>", 0, false}},
        {"junk between chunks", "2\r\n<a\r\n?!\r\n2\r\n/>\r\n0\r\n\r\n", {0, "<a/>", 0, false}},
        {"no end", "4\r\n<a/>\r\n", {0, "<a/>", 0, false}},
        {"no empty line at the end", "4\r\n<a/>\r\n0\r\n", {0, "<a/>", 0, false}},
        {"a chunk cut short", "9\r\n<a/>", {0, "<a/>", 0, false}},
        {"the largest size", "FFFFFFFFFFFFFFFF\r\n<a/>", {0, "<a/>", 0, false}},
    };
    for (const auto &[rule, body, expected] : rows)
        check_every_reading(rule, CHUNKED_HEAD + body, expected);
    check_every_reading("a length", with_length("<a/>", 4), {0, "<a/>", 0, true});

    const std::string text = "<a>compressed compressed compressed</a>";
    const std::string gzip = gzipped(text), deflate = deflated(text, 15), raw = deflated(text, -15);
    // Five bytes of head and the text as it stands, in a block whose unused bits are those of a zlib head.
    const std::string stored =
        "\x78\x27" + std::string(1, '\0') + "\xD8\xFF" + text + "\x03" + std::string(1, '\0');
    std::string with_flags = gzip;
    with_flags[3] = 8; // a file name announced and not there: the flags are not looked at
    const std::tuple<const char *, const char *, std::string> compressed[] = {
        {"gzip", "gzip\r\n\r\n", gzip},
        {"deflate", "deflate\r\n\r\n", deflate},
        {"deflate sent as gzip", "gzip\r\n\r\n", deflate},
        {"gzip flags", "gzip\r\n\r\n", with_flags},
        {"gzip in two chunks", "gzip\r\nTransfer-Encoding: chunked\r\n\r\n",
         chunk(gzip.substr(0, 20)) + chunk(gzip.substr(20)) + "0\r\n\r\n"},
        {"gzip in chunks of one byte", "gzip\r\nTransfer-Encoding: chunked\r\n\r\n", in_chunks_of(1, gzip)},
        {"deflate in chunks of one byte", "deflate\r\nTransfer-Encoding: chunked\r\n\r\n",
         in_chunks_of(1, deflate)},
        {"deflate without its zlib head", "deflate\r\n\r\n", raw},
        {"the same sent as gzip", "gzip\r\n\r\n", raw},
        {"the same in chunks of one byte", "deflate\r\nTransfer-Encoding: chunked\r\n\r\n",
         in_chunks_of(1, raw)},
        {"stored", "deflate\r\n\r\n", stored},
    };
    for (const auto &[rule, encoding, body] : compressed) {
        std::string head = OK_HEAD + "Content-Encoding: " + encoding;
        if (head.find("chunked") == head.npos)
            head.insert(OK_HEAD.size(), "Content-Length: " + std::to_string(body.size()) + "\r\n");
        check_every_reading(rule, head + body, {0, text, 0, true});
    }
    check_every_reading("gzip alone", gzip, {0, text, 0, false});
}

TEST(buffered_in, the_framing_settles_the_result_and_whether_the_connection_is_kept)
{
    const std::string typed = "Content-Type: text/xml\r\nContent-Length: 0\r\n\r\n";
    const std::pair<std::string, outcome> rows[] = {
        {with_length("<a/>", 3), {0, "<a/>", 0, false}},
        {with_length("<a/>", 5), {0, "<a/>", 0, false}},
        {OK_HEAD + "\r\n<a/>", {0, "<a/>", 0, false}},
        {"<a/>", {0, "<a/>", 0, false}},
        {CHUNKED_HEAD + "4\r\n<a/>\r\n0\r\n\r\nHTTP/1.1 200 OK\r\n\r\n", {0, "<a/>", 0, false}},
        {OK_HEAD + "\r\n", {SOAP_NO_DATA, "", 0, false}},
        {CHUNKED_HEAD + "0\r\n\r\n", {SOAP_NO_DATA, "", 0, false}},
        {"HTTP/1.1 500 Oops\r\nTransfer-Encoding: chunked\r\n\r\n0\r\n\r\n", {500, "", 0, false}},
        {"HTTP/1.1 500 Oops\r\nContent-Length: 5\r\n\r\n", {500, "", 0, false}},
        {"POST / HTTP/1.1\r\n" + typed, {SOAP_EOF, "", 0, false}},
    };
    for (const auto &[bytes, expected] : rows)
        EXPECT_EQ(read_on_kept_connection(bytes), expected) << bytes;
}

TEST(buffered_in, lines_between_chunks_are_bounded)
{
    const std::string endless(9000, 'z'), first = CHUNKED_HEAD + "4\r\n<a/>\r\n", last = "\r\n0\r\n\r\n";
    const outcome refused{0, "<a/>", SOAP_HEADER_LINE, false};
    EXPECT_EQ(read_on_kept_connection(first + endless + last), refused);
    EXPECT_EQ(read_on_kept_connection(first + "4;" + endless + "\r\n<a/>" + last), refused);
    EXPECT_EQ(read_on_kept_connection(first + "4;" + endless.substr(0, 8000) + "\r\n<b/>" + last),
              (outcome{0, "<a/><b/>", 0, true}));
    kept_wire wire(first + "0\r\n" + repeat_text("A: b\r\n", 100000), [](std::size_t) { return 1000; });
    EXPECT_EQ(read_message(wire), (outcome{0, "<a/>", 0, false}));
    EXPECT_LT(wire.given, 20000U);
}

TEST(buffered_in, what_the_reader_left_of_a_body_is_dropped_up_to_a_bound)
{
    struct {
        std::size_t body, announced, piece;
        bool reusable;
    } rows[] = {{5000, 5000, 1000, true},        {65540, 65540, 1000, true}, {200000, 200000, 1000, false},
                {200000, 200000, 180000, false}, {5000, 5001, 1000, false},  {5000, 4999, 9000, false}};
    for (const auto &row : rows) {
        kept_wire wire(with_length("<a/>" + std::string(row.body - 4, '\n'), row.announced),
                       [&row](std::size_t) { return row.piece; });
        ASSERT_EQ(soap_receive_begin(&wire), 0);
        EXPECT_TRUE(wire.response_unfinished);
        ASSERT_EQ(soap_recv_skip(&wire, 4), 0);
        EXPECT_EQ(soap_receive_finish(&wire), 0);
        EXPECT_EQ(!wire.response_unfinished, row.reusable) << row.body << " of " << row.announced;
        if (row.reusable) {
            EXPECT_EQ(wire.buffer_index, wire.buffer_length);
        }
    }
}

TEST(buffered_in, no_more_is_asked_for_after_the_end)
{
    const std::tuple<const char *, std::string, std::size_t> rows[] = {
        {"the length is zero", OK_HEAD + "Content-Length: 0\r\n\r\n", 1},
        {"the end of the length", with_length("<a>", 3), 1},
        {"the end of the connection", "<a>", 2},
    };
    for (const auto &[rule, message, receives] : rows) {
        SCOPED_TRACE(rule);
        kept_wire wire(message);
        read_message(wire);
        EXPECT_EQ(soap_recv_byte(&wire), -1);
        EXPECT_EQ(soap_recv_skip(&wire, 1), -1);
        EXPECT_EQ(wire.receives, receives);
    }
}

TEST(buffered_in, a_preset_dictionary_must_be_the_right_one)
{
    const std::string right = "words of the dictionary", text = "<a>" + right + " " + right + "</a>";
    for (const int window_bits : {15, -15})
        for (const std::string &dictionary : {right, std::string("another dictionary"), std::string()}) {
            kept_wire wire(OK_HEAD + "Content-Encoding: deflate\r\n\r\n" +
                           deflated(text, window_bits, right));
            wire.zlib_dictionary = dictionary.empty() ? nullptr : dictionary.data();
            wire.zlib_dictionary_length = static_cast<unsigned>(dictionary.size());
            const outcome read = read_message(wire);
            EXPECT_EQ(read.body == text, dictionary == right) << window_bits << dictionary;
            if (dictionary == right || window_bits > 0) { // a raw stream doesn't know its dictionary
                EXPECT_EQ(read.finished, dictionary == right ? 0 : SOAP_ZLIB_ERROR) << dictionary;
            }
        }
}

TEST(buffered_in, a_damaged_compressed_body_is_an_error_wherever_it_is_damaged)
{
    const std::string good = gzipped("<a>" + std::string(1000, 'x') + "compressed</a>");
    const std::string head = OK_HEAD + "Content-Encoding: gzip\r\n\r\n";
    ASSERT_EQ(read_on_kept_connection(head + good).finished, 0);
    for (std::size_t at = 10; at < good.size(); ++at) {
        std::string damaged = good;
        damaged[at] = static_cast<char>(damaged[at] ^ 0x55);
        const std::string cut = good.substr(0, at), length = "Content-Length: " + std::to_string(at) + "\r\n";
        for (const std::string &message :
             {head + damaged, head + cut, OK_HEAD + length + head.substr(OK_HEAD.size()) + cut}) {
            const outcome result = read_on_kept_connection(message);
            EXPECT_EQ(result.finished, SOAP_ZLIB_ERROR) << message.size() << " bytes, byte " << at;
            EXPECT_FALSE(result.reusable);
        }
    }
}

TEST(buffered_in, a_bomb_streams_through_the_one_buffer)
{
    const std::string text(30U << 20, ' ');
    memory_wire wire;
    wire.receive(gzipped("<" + text));
    ASSERT_EQ(soap_receive_begin(&wire), 0);
    EXPECT_EQ(soap_recv_byte(&wire), '<');
    EXPECT_EQ(soap_receive_finish(&wire), 0);
    EXPECT_LT(wire.zlib_ratio_in, 0.01F);
}

TEST(buffered_in, the_prepare_hook_sees_the_plain_body_once)
{
    const std::string text = "<a>plain text, plain text</a>";
    const std::string gzip = gzipped(text);
    const std::string messages[] = {
        text,
        gzip,
        with_length(text, text.size()),
        CHUNKED_HEAD + chunk(text.substr(0, 5)) + chunk(text.substr(5)) + "0\r\n\r\n",
        OK_HEAD + "Content-Encoding: gzip\r\n\r\n" + gzip,
        OK_HEAD + "Content-Encoding: gzip\r\nTransfer-Encoding: chunked\r\n\r\n" + chunk(gzip) + "0\r\n\r\n",
    };
    for (const std::string &message : messages) {
        for (std::size_t split = 1; split <= message.size(); ++split) {
            memory_wire wire;
            wire.on_recv_prepare = hook;
            wire.receive(message);
            wire.piece = split_at(split);
            hook_saw.clear();
            EXPECT_EQ(read_message(wire).body, text);
            EXPECT_EQ(hook_saw, text) << message.substr(0, 80) << " split at " << split;
        }
    }
}

// Each "a" becomes 1000 of them, each "b" goes, and "!" is added at the end of input.
static int growing_filter(soap *ctx, char *buffer, std::size_t *length, std::size_t size)
{
    std::string out;
    for (std::size_t i = 0; i < *length; ++i)
        out += buffer[i] == 'a' ? std::string(1000, 'a') : std::string(buffer[i] != 'b', buffer[i]);
    if (*length == 0 && ctx->filter_stop == 0 && ctx->user == nullptr) {
        out = "!";
        ctx->user = ctx;
    }
    EXPECT_LE(out.size(), size);
    std::copy(out.begin(), out.end(), buffer);
    return *length = out.size(), 0;
}

TEST(buffered_in, a_receive_filter_may_grow_shrink_and_hold_back)
{
    std::string chunks = CHUNKED_HEAD, expected;
    for (int i = 0; i < 200; ++i) {
        chunks += chunk("ca") + chunk("bb");
        expected += "c" + std::string(1000, 'a');
    }
    memory_wire wire;
    wire.on_read_head = [](soap *ctx) {
        const int result = http_read_head(ctx);
        ctx->on_recv_filter = growing_filter; // from the body on
        return result;
    };
    wire.receive(chunks + "0\r\n\r\n");
    EXPECT_EQ(read_message(wire), (outcome{0, expected + "!", 0, true}));
    EXPECT_EQ(wire.on_recv_filter, nullptr);

    wire.user = nullptr;
    wire.receive(OK_HEAD + "Content-Encoding: gzip\r\nTransfer-Encoding: chunked\r\n\r\n" +
                 chunk(gzipped("<abc>")) + "0\r\n\r\n");
    EXPECT_EQ(read_message(wire), (outcome{0, "<" + std::string(1000, 'a') + "c>!", 0, true}));

    wire.receive("<a/>");
    wire.on_recv_filter = [](soap *, char *, std::size_t *length, std::size_t size) {
        return *length = size + 1, 0;
    };
    EXPECT_EQ(soap_receive_begin(&wire), SOAP_CORRUPTION) << "more than there is space for";
    EXPECT_LE(wire.buffer_index, wire.buffer_length);
}

TEST(buffered_in, blocks_hold_their_bytes_and_cost_no_more_than_what_came)
{
    const std::string large = "<abcde...<wxyz" + std::string(300000, 'q');
    memory_wire wire;
    wire.receive(large);
    wire.piece = [](std::size_t given) { return given < 20 ? 3 : 60000; };
    ASSERT_EQ(soap_receive_begin(&wire), 0);
    EXPECT_STREQ(soap_recv_bytes_block(&wire, 6), "<abcde");
    EXPECT_EQ(soap_recv_byte(&wire), '.'); // two bytes of padding are gone
    EXPECT_STREQ(soap_recv_bytes_block(&wire, 0), "");
    EXPECT_STREQ(soap_recv_bytes_block(&wire, 200003), large.substr(9, 200003).c_str());
    EXPECT_EQ(soap_recv_bytes_block(&wire, 0xFFFFFFFFU), nullptr);
    EXPECT_EQ(wire.error, SOAP_EOF);
    EXPECT_EQ(wire.block_stack, nullptr);
}

TEST(buffered_in, a_reading_that_stops_midway_is_over_with_the_next_message)
{
    kept_wire wire(OK_HEAD + "Content-Encoding: gzip\r\n\r\n" + gzipped("<a/>"));
    ASSERT_EQ(soap_receive_begin(&wire), 0);
    EXPECT_TRUE(wire.response_unfinished);
    ASSERT_EQ(wire.zlib_state, 2);
    wire.buffer_index = wire.buffer_length;
    wire.receive(with_length("<b/>", 4));
    EXPECT_EQ(read_message(wire).body, "<b/>");
    EXPECT_EQ(wire.zlib_state, 0);
}
