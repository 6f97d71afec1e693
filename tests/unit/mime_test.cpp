// MIME and MTOM messages on the wire and back: delimiters at every place, heads, lazy reading, references.
#include "support/attachment_checks.h"

#include <chrono>
#include <set>

#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_tcp.h>

#include "support/host_streams.h"

using namespace attachment_exchange;

namespace {

constexpr std::uint32_t SENDING = MODE_BUFFERED | MODE_BARE_XML;
constexpr std::uint32_t MTOM = MODE_MTOM | MODE_MIME;

std::string part(const std::string &fields, const std::string &content)
{
    return "\r\n--bb\r\n" + fields + "\r\n" + content;
}

std::string root(const std::string &body)
{
    return "--bb\r\nContent-Type: text/xml\r\nContent-ID: <root>\r\n\r\n" + envelope(body);
}

constexpr char END[] = "\r\n--bb--";

// --- out ---

TEST(mime_out, writes_heads_with_the_fields_that_are_set)
{
    memory_wire wire(0, SENDING);
    soap_mime_start(&wire, "bb", "<root>");
    soap_mime_attach(&wire, const_cast<char *>("one"), 3, MIME_QUOTED_PRINTABLE, "a/b", "<1>", "there",
                     "what");
    soap_mime_attach(&wire, nullptr, 0, MIME_NONE, nullptr, "<2>\r\nEvil: yes", nullptr, nullptr);
    ASSERT_EQ(send(wire, {}), 0);
    const std::string sent = wire.sent();
    const std::string head = "--bb\r\nContent-Type: text/xml; charset=utf-8\r\n"
                             "Content-Transfer-Encoding: binary\r\nContent-ID: <root>\r\n\r\n<";
    EXPECT_EQ(sent.substr(0, head.size()), head);
    const std::string tail =
        "\r\n\r\n--bb\r\nContent-Type: a/b\r\nContent-Transfer-Encoding: quoted-printable\r\n"
        "Content-ID: <1>\r\nContent-Location: there\r\nContent-Description: what\r\n\r\none"
        "\r\n--bb\r\nContent-ID: <2>Evil: yes\r\n\r\n\r\n--bb--";
    EXPECT_EQ(sent.substr(sent.size() - tail.size()), tail);
}

TEST(mime_out, mtom_puts_an_include_in_the_element_and_brackets_around_the_id)
{
    const std::string first = "first";
    const std::string second = std::string("\r\n--b\0\r", 7);
    for (const std::uint32_t flags :
         {MTOM, MODE_MTOM}) { // MIME comes on its own with a value that asks for it
        memory_wire wire(0, SENDING | flags);
        ASSERT_EQ(send(wire, {make_value(first, nullptr, "image/png"),
                              make_value(second, "cid:two%20", "a/b"), make_value(first, nullptr, nullptr)}),
                  0);
        const std::string sent = wire.sent();
        EXPECT_NE(
            sent.find(
                "<data><xop:Include xmlns:xop=\"http://www.w3.org/2004/08/xop/include\" href=\"cid:id1\""),
            std::string::npos)
            << sent;
        EXPECT_NE(sent.find("\r\nContent-Type: image/png\r\nContent-Transfer-Encoding: binary\r\nContent-ID: "
                            "<id1>\r\n\r\n"
                            "first\r\n--"),
                  std::string::npos)
            << sent;
        EXPECT_NE(sent.find("Content-ID: <two%20>"), std::string::npos) << sent;
        reception back(sent, MODE_MTOM);
        EXPECT_EQ(back.summary(),
                  "[cid:id1 image/png first][cid:two%20 a/b " + second + "][(null) (null) first]");
    }
    memory_wire plain(0, SENDING | MODE_MTOM); // nothing to attach: no MIME
    ASSERT_EQ(send(plain, {make_value(first, nullptr, nullptr)}), 0);
    EXPECT_EQ(plain.sent().find("--"), std::string::npos);
}

TEST(mime_out, an_include_has_its_namespace_whatever_the_rules_of_prefixes)
{
    const std::string bytes = "x";
    struct form {
        std::uint32_t mode;
        const char *include;
    };
    const form forms[] = {
        {MODE_CANONICAL, "<data><xop:Include xmlns:xop=\"http://www.w3.org/2004/08/xop/include\" "
                         "href=\"cid:i\"></xop:Include></data>"},
        {MODE_DEFAULT_NAMESPACE,
         "<data><Include xmlns=\"http://www.w3.org/2004/08/xop/include\" href=\"cid:i\"/></data>"},
    };
    for (const form &f : forms) {
        memory_wire wire(0, SENDING | MTOM | f.mode);
        const value v = make_value(bytes, "cid:i", "a/b");
        ASSERT_EQ(send(wire, {v, v}), 0);
        const std::size_t first = wire.sent().find(f.include);
        ASSERT_NE(first, std::string::npos) << wire.sent();
        EXPECT_NE(wire.sent().find(f.include, first + 1), std::string::npos) << wire.sent();
        EXPECT_EQ(reception(wire.sent(), MODE_MTOM).summary(), "[cid:i a/b x][cid:i a/b x]");
    }
}

TEST(mime_out, an_include_asked_for_by_name_takes_the_reference_itself)
{
    const std::string bytes = "x";
    const value v = make_value(bytes, "cid:i", "a/b");
    memory_wire wire(0, SENDING);
    wire.mode = MODE_BUFFERED | MTOM;
    wire.namespace_state = 1;
    EXPECT_EQ(soap_attachment_ref_out(&wire, "xop:Include", 0, v.content, &v, v.id, v.type, nullptr, 1,
                                      nullptr, VALUE_TYPE),
              -1);
    soap_send_flush(&wire);
    EXPECT_EQ(wire.sent().find("xop:Include href=\"cid:i\""), 1U) << wire.sent();
}

TEST(mime_out, chunked_without_a_counting_pass_still_carries_its_attachments)
{
    const std::string bytes = "bytes";
    memory_wire wire(0, MODE_STORE | MODE_BARE_XML | MTOM);
    wire.encoding_style = nullptr;
    soap_reset_call(&wire);
    const std::deque<value> values = {make_value(bytes, "cid:i", "a/b")};
    ASSERT_EQ(soap_count_begin(&wire), 0);
    EXPECT_EQ(wire.mode & MODE_COUNTING, 0U);
    ASSERT_EQ(soap_send_begin(&wire), 0);
    ASSERT_EQ(write_message(&wire, values), 0);
    ASSERT_EQ(soap_send_finish(&wire), 0);
    EXPECT_EQ(reception(wire.sent(), MODE_MTOM).summary(), "[cid:i a/b bytes]");
}

TEST(mime_out, draws_boundaries_that_differ)
{
    std::set<std::string> seen;
    for (int i = 0; i < 100; ++i) {
        memory_wire wire;
        ASSERT_EQ(soap_mime_boundary_make(&wire), 0);
        const std::string boundary = wire.mime.boundary;
        EXPECT_GE(boundary.size(), 32U);
        EXPECT_LE(boundary.size(), 70U);
        EXPECT_EQ(
            boundary.find_first_not_of("abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789_-="),
            std::string::npos);
        EXPECT_TRUE(seen.insert(boundary).second);
        ASSERT_EQ(soap_mime_boundary_make(&wire), 0);
        EXPECT_EQ(wire.mime.boundary, boundary); // one for both passes
    }
}

TEST(mime_stream, goes_out_and_comes_in_piece_by_piece)
{
    for (const bool known : {true, false}) {
        host_stream source = {std::string(5000, 's')};
        stream_host sender, receiver;
        memory_wire wire(0, MODE_STORE | MODE_BARE_XML);
        sender.serve(wire);
        soap_mime_start(&wire, "bb", nullptr);
        soap_mime_attach(&wire, reinterpret_cast<char *>(&source), known ? 5000 : 0, MIME_BINARY, "a/b",
                         "<s>", nullptr, nullptr);
        ASSERT_EQ(send(wire, {}), 0);
        EXPECT_EQ(source.closed, 1);

        reception read(wire.sent());
        receiver.serve(*read.wire);
        EXPECT_EQ(read.run(), 0);
        const host_stream &target = receiver.of("<s>");
        EXPECT_EQ(target.data, source.data);
        EXPECT_EQ(target.closed, 1);
        const soap_attachment *last = read.wire->mime.last;
        EXPECT_EQ(static_cast<const void *>(last->content), &target);
        EXPECT_EQ(last->size, 5000U);
        EXPECT_EQ(last->encoding, MIME_BINARY);
    }
}

// --- in ---

TEST(mime_in, reads_part_heads)
{
    const std::string message =
        root("") +
        part("CONTENT-ID:<1>\r\nContent-Location: \tthere \r\nContent-Type: a/b;\r\n c=d\r\n"
             "Content-Description: what\r\nContent-Transfer-Encoding: BASE64\r\nOther: x\r\nno colon\r\n",
             "one") +
        part("Content-Disposition: form-data; name=\"two\"\r\nContent-Transfer-Encoding: odd\r\n", "two") +
        part("", "no head") + part("Content-ID: <4>\r\nContent-Disposition: attachment; name=file\r\n", "") +
        END;
    reception read(message);
    ASSERT_EQ(read.run(), 0);
    const soap_attachment *p = read.wire->mime.list;
    EXPECT_EQ(p, read.wire->mime.root);
    EXPECT_STREQ(p->id, "<root>");
    p = p->next;
    EXPECT_EQ(text(p->id) + "|" + text(p->location) + "|" + text(p->type) + "|" + text(p->description),
              "<1>|there|a/b; c=d|what");
    EXPECT_EQ(p->encoding, MIME_BASE64);
    EXPECT_STREQ(p->content, "one");
    p = p->next;
    EXPECT_STREQ(p->id, "two");
    EXPECT_EQ(p->encoding, MIME_NONE);
    p = p->next;
    EXPECT_EQ(p->id, nullptr);
    EXPECT_STREQ(p->content, "no head");
    p = p->next;
    EXPECT_STREQ(p->id, "<4>"); // a Content-ID is what references mean
    EXPECT_EQ(p->size, 0U);
    EXPECT_EQ(p->next, nullptr);
}

TEST(mime_in, finds_the_message_by_its_start_id_and_binds_parts_ahead_of_it)
{
    const std::string http =
        "HTTP/1.1 200 OK\r\nContent-Type: multipart/related; boundary=\"bb\"; start=\"<root>\"\r\n\r\n";
    const std::string ahead = "--bb\r\nContent-ID: <a>\r\nContent-Type: t/a\r\n\r\nahead\r\n";
    const std::string rest = part("Content-ID: <b>\r\n", "behind") + END;
    const std::string body = "<data href=\"cid:a\"/><data href=\"cid:b\"/>";
    expect_same_at_every_split(http + "\r\npreamble\r\n" + ahead + root(body) + rest,
                               "[cid:a t/a ahead][cid:b (null) behind]");
    std::string other = http;
    other.replace(other.find("<root>"), 6, "<none>");
    EXPECT_EQ(reception(other + root(body) + rest).summary().substr(0, 1), "!");
    other = http;
    other.replace(other.find("\"bb\""), 4, "\"cc\"");
    EXPECT_EQ(reception(other + root(body) + rest).run(), SOAP_MIME_ERROR);
}

TEST(mime_in, keeps_data_that_only_looks_like_a_delimiter)
{
    const std::string data = std::string("\r") + "\r\n" + "\r\n-" + "\r\n--" + "\r\n--b" + "\r\n--bB" +
                             "\r\r\n--b\r\n--b\n--bb" + "--bb" + std::string("\0\n", 2) + "\r\n--\r";
    const std::string message = root("<data href=\"cid:a\"/>") + part("Content-ID: <a>\r\n", data) + END;
    expect_same_at_every_split(message, "[cid:a (null) " + data + "]");
    expect_error_at_every_cut(message);
}

TEST(mime_in, takes_a_delimiter_at_every_place_around_the_end_of_the_buffer)
{
    const std::string start = root("<data href=\"cid:a\"/>") + "\r\n--bb\r\nContent-ID: <a>\r\n\r\n";
    for (std::size_t at = SOAP_BUFFER_SIZE - 12; at <= SOAP_BUFFER_SIZE + 4; ++at) {
        std::string data(at - start.size(), '.');
        data.replace(data.size() - 7, 7, "\r\n--b\r\r"); // nearly one, right ahead of it
        reception read(start + data + "\r\n--bb\r\nContent-ID: <b>\r\n\r\nnext" + END);
        ASSERT_EQ(read.run(), 0) << at;
        ASSERT_TRUE(read.values[0].bytes() == data) << at;
        EXPECT_STREQ(read.wire->mime.last->content, "next");
    }
}

TEST(mime_in, reports_what_is_wrong_with_a_message)
{
    struct wrong_case {
        const char *rule;
        std::string rest;
        int error;
    };
    const std::string a = part("Content-ID: <a>\r\n", "x");
    const wrong_case cases[] = {
        {"good", a + END, 0},
        {"blanks behind the boundary", "\r\n--bb \t\r\nContent-ID: <a>\r\n\r\nx\r\n--bb--", 0},
        {"epilogue", a + END + "\r\nepilogue", 0},
        {"something behind the boundary", "\r\n--bbb\r\n\r\nx" + a + END, SOAP_MIME_ERROR},
        {"two of one id", a + a + END, SOAP_MIME_ERROR},
        {"one dash", a + "\r\n--bb-\r\n", SOAP_MIME_ERROR},
        {"no end", a, SOAP_EOF},
        {"a line of a head too long", part("Content-ID: " + std::string(2000, 'i') + "\r\n", "x") + END,
         SOAP_HEADER_LINE},
        {"no such attachment", END, SOAP_DIME_HREF},
    };
    for (const wrong_case &c : cases)
        EXPECT_EQ(reception(root("<data href=\"cid:a\"/>") + c.rest).run(), c.error) << c.rule;
    std::string fields;
    for (int i = 0; i < 1100; ++i)
        fields += "Content-ID: <a>\r\n";
    EXPECT_EQ(reception(root("") + part(fields, "x") + END).run(), SOAP_MIME_ERROR);
}

TEST(mime_in, mtom_needs_no_mode_of_the_host_when_the_part_says_so)
{
    const auto message = [](const std::string &element) {
        return "--bb\r\nContent-Type: application/xop+xml; type=\"text/xml\"\r\n\r\n" + envelope(element) +
               part("Content-ID: <a b>\r\n", "x") + END;
    };
    const std::string include =
        "<xop:Include xmlns:xop=\"http://www.w3.org/2004/08/xop/include\" href=\"cid:a%20b\"";
    EXPECT_EQ(reception(message("<data>\r\n " + include + "/> </data>")).summary(), "[cid:a%20b (null) x]");
    EXPECT_EQ(reception(message("<data>" + include + "> </xop:Include></data>")).summary(),
              "[cid:a%20b (null) x]");
    EXPECT_EQ(reception(message("<data> eA== </data>")).summary(), "[(null) (null) x]");
    EXPECT_EQ(reception(message("<data/>")).summary(), "[(null) (null) (null)]");
    EXPECT_EQ(reception(message("<data><xop:Include xmlns:xop=\"u\"/></data>")).run(), SOAP_MIME_HREF);
    EXPECT_EQ(reception(message("<data><xop:Include xmlns:xop=\"u\" href=\"cid:c\"/></data>")).run(),
              SOAP_MIME_HREF);
}

TEST(mime_in, gives_the_parts_one_by_one_when_asked_to)
{
    const std::string message = root("<data href=\"cid:b\"/>") + part("Content-ID: <a>\r\n", "A") +
                                part("Content-ID: <b>\r\n", "B") + END;
    for (const std::size_t piece : {1U, 65536U}) {
        reception read(message, MODE_MIME_AFTER, piece, piece);
        ASSERT_EQ(read.run(), 0);
        soap *const ctx = read.wire.get();
        EXPECT_EQ(soap_socket_release(ctx), 0);
        EXPECT_EQ(read.values[0].content, nullptr);
        const soap_attachment *p = soap_mime_next_part(ctx);
        ASSERT_NE(p, nullptr);
        EXPECT_STREQ(p->content, "A");
        EXPECT_EQ(read.values[0].content, nullptr);
        p = soap_mime_next_part(ctx);
        ASSERT_NE(p, nullptr);
        EXPECT_EQ(read.values[0].bytes(), "B");
        EXPECT_EQ(ctx->keep_alive, 0);
        EXPECT_EQ(soap_mime_next_part(ctx), nullptr);
        EXPECT_EQ(ctx->error, 0);
    }
    reception none(root("") + END, MODE_MIME_AFTER);
    ASSERT_EQ(none.run(), 0);
    EXPECT_EQ(soap_mime_next_part(none.wire.get()), nullptr);
    EXPECT_EQ(none.wire->error, 0);
    reception cut(message.substr(0, message.size() - 9), MODE_MIME_AFTER);
    ASSERT_EQ(cut.run(), 0);
    EXPECT_NE(soap_mime_next_part(cut.wire.get()), nullptr);
    EXPECT_EQ(soap_mime_next_part(cut.wire.get()), nullptr);
    EXPECT_EQ(cut.wire->error, SOAP_EOF);
}

// The parts of a compressed message come out of the stream as they are asked for, whatever carries it, and
// the context serves another message afterwards, also if parts were left unread.
TEST(mime_in, gives_the_parts_of_a_compressed_message_one_by_one)
{
    const std::string one(70000, 'o'), two = "two";
    const std::deque<value> values = {make_value(one, "cid:one", "a/b"), make_value(two, "cid:two", "c/d")};
    for (const std::uint32_t framing : {MODE_STORE, MODE_CHUNKED}) {
        for (const int format : {1, 2}) { // deflate, gzip
            for (const std::size_t piece : {100U, 65536U}) {
                memory_wire sender(0, MTOM | MODE_DEFLATE | framing);
                sender.zlib_out = static_cast<std::int16_t>(format);
                ASSERT_EQ(send_request(sender, values), 0);
                EXPECT_LT(sender.sent().size(), one.size());
                const std::string plain_next =
                    root("<data href=\"cid:n\"/>") + part("Content-ID: <n>\r\n", "next") + END;
                for (const int taken : {2, 1, 0}) {
                    SCOPED_TRACE(taken);
                    reception read(sender.sent(), MODE_MIME_AFTER | MODE_MTOM, piece, piece);
                    soap *const ctx = read.wire.get();
                    ASSERT_EQ(read.run(), 0);
                    EXPECT_EQ(soap_socket_release(ctx), 0);
                    for (int i = 0; i < taken; ++i) {
                        const soap_attachment *p = soap_mime_next_part(ctx);
                        ASSERT_NE(p, nullptr);
                        EXPECT_EQ(p->size, i == 0 ? one.size() : two.size());
                        EXPECT_EQ(read.values[static_cast<std::size_t>(i)].bytes(), i == 0 ? one : two);
                    }
                    if (taken == 2) {
                        EXPECT_EQ(soap_mime_next_part(ctx), nullptr);
                        EXPECT_EQ(ctx->error, 0);
                        EXPECT_FALSE(ctx->response_unfinished);
                        EXPECT_EQ(ctx->zlib_state, 0);
                    } else {
                        EXPECT_TRUE(ctx->response_unfinished); // no other call may use the connection
                    }
                    ctx->keep_alive = 0;
                    ctx->input_mode = 0;
                    read.wire->receive(plain_next);
                    read.wire->piece = nullptr;
                    read.values.clear();
                    EXPECT_EQ(read.summary(), "[cid:n (null) next]");
                }
                std::string cut = sender.sent();
                cut.resize(cut.size() - 20);
                reception read(cut, MODE_MIME_AFTER | MODE_MTOM, piece, piece);
                if (read.run() == 0) {
                    while (soap_mime_next_part(read.wire.get()) != nullptr) {
                    }
                }
                EXPECT_NE(read.wire->error, 0);
            }
        }
    }
}

TEST(mime_in, takes_a_byte_that_the_reader_gave_back_into_account)
{
    for (const char byte : {'\r', 'x'}) {
        memory_wire wire;
        const std::string rest = std::string(byte == '\r' ? "" : "\r") + "\n--bb--";
        wire.receive("--bb\r\n\r\n" + rest);
        wire.mode = MODE_MIME;
        ASSERT_EQ(soap_mime_part_header_read(&wire), 0);
        wire.look_ahead = byte;
        const soap_attachment *read = soap_mime_part_read(&wire, nullptr);
        ASSERT_NE(read, nullptr);
        EXPECT_STREQ(read->content, byte == 'x' ? "x" : "");
        EXPECT_EQ(wire.mode & MODE_MIME, 0U);
    }
}

TEST(mime_in, survives_any_change_of_a_byte)
{
    expect_survival_of_every_change("--bb\r\nContent-Type: application/xop+xml\r\n\r\n" +
                                    envelope("<data><x:Include xmlns:x=\"u\" href=\"cid:a\"/></data>") +
                                    part("Content-ID: <a>\r\nContent-Type: t; name=\"x\"\r\n", "one\r\n--b") +
                                    END);
}

TEST(mime_in, survives_every_refused_allocation)
{
    expect_survival_of_every_refused_allocation(
        root("<data href=\"cid:a\"/>") +
        part("Content-ID: <a>\r\nContent-Type: t\r\nContent-Description: d\r\n", std::string(5000, 'x')) +
        part("Content-Disposition: x; name=b\r\nContent-Location: l\r\n", "") + END);
}

// --- references ---

TEST(cid, means_an_id_in_several_spellings)
{
    struct cid_case {
        const char *href, *id;
        bool same;
    };
    static const cid_case cases[] = {
        {"cid:a", "<a>", true},
        {"cid:a", "a", true},
        {"a", "<a>", true},
        {"cid:a", "cid:a", true},
        {"<a>", "<a>", true},
        {"cid:a%40b", "<a@b>", true},
        {"cid:a%40b", "<a%40b>", true},
        {"cid:a%4", "<a%4>", true},
        {"cid:A", "<a>", false},
        {"cid:a", "<ab>", false},
        {"cid:ab", "<a>", false},
        {"cid:", "<>", true},
        {"cid:", "<", true},
        {nullptr, "a", false},
        {"a", nullptr, false},
        {"cid:a%00b", "<a>", false},
    };
    memory_wire wire;
    for (const cid_case &c : cases)
        EXPECT_EQ(soap_cid_compare(&wire, c.href, c.id) == 0, c.same)
            << text(c.href) << " and " << text(c.id);
}

TEST(references, are_answered_in_linear_time_in_any_order_and_spelling)
{
    const int count = 20000;
    std::string body;
    std::string parts;
    std::string wanted;
    for (int i = 0; i < count; ++i) {
        const std::string n = std::to_string(i);
        const std::string href = i % 3 == 0 ? "cid:x%2D" + n : i % 3 == 1 ? "cid:x-" + n : "y%2D" + n;
        body += "<data href=\"" + href + "\"/>";
        wanted += n + ",";
    }
    for (int i = count; i-- > 0;) {
        const std::string n = std::to_string(i);
        parts += part("Content-ID: " +
                          (i % 3 != 2   ? "<x-" + n + ">"
                           : i % 2 == 0 ? "y%2D" + n
                                        : "<y%2D" + n + ">") +
                          "\r\n",
                      n);
        parts += part("Content-ID: <nobody" + n + ">\r\n", "");
    }
    reception read(root(body) + parts + END);
    const auto start = std::chrono::steady_clock::now();
    ASSERT_EQ(read.run(), 0);
    const std::chrono::duration<double> taken = std::chrono::steady_clock::now() - start;
    std::string got;
    for (const value &v : read.values)
        got += v.bytes() + ",";
    EXPECT_TRUE(got == wanted);
    EXPECT_LT(taken.count(), 10.0); // 800 million comparisons would not fit
    EXPECT_EQ(read.wire->mtom_list, nullptr);
}

TEST(references, to_one_attachment_are_all_answered)
{
    for (const int count : {1, 32, 33, 500}) {
        std::string body;
        for (int i = 0; i < count; ++i)
            body += "<data href=\"cid:a\"/><data href=\"cid:b" + std::to_string(i) + "\"/>";
        reception read(root(body) + part("Content-ID: <a>\r\nContent-Description: d\r\n", "A") + END);
        EXPECT_EQ(read.run(), SOAP_DIME_HREF); // those to b are left
        for (std::size_t i = 0; i < read.values.size(); i += 2) {
            ASSERT_EQ(read.values[i].bytes(), "A");
            EXPECT_STREQ(read.values[i].options, "d");
            EXPECT_EQ(read.values[i + 1].content, nullptr);
        }
    }
}

TEST(references, take_no_attachment_larger_than_a_value_can_hold)
{
    memory_wire wire;
    value v = {};
    std::strcpy(wire.element_href, "cid:a");
    ASSERT_EQ(soap_attachment_ref_in(&wire, &v.content, &v.size, &v.id, &v.type, &v.options), 0);
    soap_attachment huge = {};
    huge.size = std::size_t{1} << 31;
    huge.id = "other";
    soap_attachment_bind(&wire, &huge);
    EXPECT_EQ(wire.error, 0); // nobody waits for it
    huge.id = "a";
    soap_attachment_bind(&wire, &huge);
    EXPECT_EQ(wire.error, SOAP_LENGTH);
    EXPECT_EQ(v.size, 0);
}

// What came with a part's description in place of options is no DIME options block.
TEST(references, answered_by_a_part_go_out_in_a_record)
{
    for (const char *description : {"", "d", "longer than it says"}) {
        reception read(
            root("<data href=\"cid:a\"/>") +
            part("Content-ID: <a>\r\nContent-Description: " + std::string(description) + "\r\n", "A") + END);
        ASSERT_EQ(read.run(), 0);
        memory_wire wire(0, SENDING);
        ASSERT_EQ(send(wire, read.values), 0);
        EXPECT_EQ(reception(wire.sent()).summary(), "[cid:a (null) A]");
    }
}

// A whole HTTP request in each framing, read as its receiver would.
TEST(http_exchange, carries_attachments_in_every_framing)
{
    const std::string bytes = "some bytes";
    const std::string more(70000, 'm');
    for (const std::uint32_t form : {MODE_MTOM, MTOM, std::uint32_t{0}}) { // 0: DIME
        for (const std::uint32_t framing : {MODE_DIRECT, MODE_BUFFERED, MODE_STORE, MODE_CHUNKED}) {
            for (const std::uint32_t deflate : {0U, MODE_DEFLATE}) {
                const std::uint32_t mode = form | framing | deflate;
                if (deflate != 0 && framing == MODE_BUFFERED)
                    continue; // its length can't be told ahead
                memory_wire wire(0, mode);
                const std::deque<value> values = {make_value(bytes, "cid:i", "a/b"),
                                                  make_value(more, nullptr, "c/d")};
                ASSERT_EQ(send_request(wire, values), 0);
                const std::string sent = wire.sent();
                const std::size_t at = sent.find("Content-Length: ");
                EXPECT_EQ(at == std::string::npos, framing == MODE_CHUNKED) << mode;
                if (at != std::string::npos) {
                    EXPECT_EQ(std::stoul(sent.substr(at + 16)), sent.size() - sent.find("\r\n\r\n") - 4)
                        << mode;
                }
                EXPECT_EQ(reception(sent, form & MODE_MTOM, 100, 3000).summary(),
                          "[cid:i a/b some bytes][cid:id2 c/d " + more + "]")
                    << std::hex << mode;
            }
        }
    }
}

TEST(mime, carries_megabytes_unchanged)
{
    expect_megabytes_unchanged(SENDING | MTOM, MODE_MTOM);
}

} // namespace
