// MIME and MTOM messages on the wire and back: delimiters at every place, heads, lazy reading, references.
#include <regex>

#include "support/attachment_checks.h"
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
const std::string NO_REFERENCE = "!" + std::to_string(SOAP_MIME_HREF);

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

// Values go out by reference where they have an id or a type, whatever the rules of prefixes, and MIME comes
// on its own with a value that asks for it.
TEST(mime_out, mtom_puts_an_include_in_the_element_and_brackets_around_the_id)
{
    const std::string first = "first";
    const std::string second = std::string("\r\n--b\0\r", 7);
    const std::deque<value> values = {
        make_value(first, nullptr, "image/png"), make_value(second, "cid:two%20", "a/b"),
        make_value(second, "cid:two%20", "a/b"), make_value(first, nullptr, nullptr)};
    const std::string include =
        "<data><xop:Include xmlns:xop=\"http://www.w3.org/2004/08/xop/include\" href=";
    const std::tuple<std::uint32_t, std::string, const char *> forms[] = {
        {MTOM, include, "/></data>"},
        {MODE_MTOM, include, "/></data>"},
        {MTOM | MODE_CANONICAL, include, "></xop:Include></data>"},
        {MTOM | MODE_DEFAULT_NAMESPACE,
         "<data><Include xmlns=\"http://www.w3.org/2004/08/xop/include\" href=", "/></data>"},
    };
    for (const auto &[mode, begin, end] : forms) {
        memory_wire wire(0, SENDING | mode);
        ASSERT_EQ(send(wire, values), 0);
        const std::string sent = wire.sent(), two = begin + "\"cid:two%20\"" + end;
        EXPECT_THAT(sent, HasSubstr(begin + "\"cid:id1\"" + end + two + two + "<data>Zmlyc3Q=</data>"));
        EXPECT_THAT(sent, HasSubstr("\r\nContent-Type: image/png\r\nContent-Transfer-Encoding: binary\r\n"
                                    "Content-ID: <id1>\r\n\r\nfirst\r\n--"));
        EXPECT_THAT(sent, HasSubstr("Content-ID: <two%20>"));
        const std::string both = "[cid:two%20 a/b " + second + "]";
        EXPECT_EQ(reception(sent, MODE_MTOM).summary(),
                  "[cid:id1 image/png first]" + both + both + "[(null) (null) first]");
    }
    memory_wire plain(0, SENDING | MODE_MTOM); // nothing to attach: no MIME
    ASSERT_EQ(send(plain, {make_value(first, nullptr, nullptr)}), 0);
    EXPECT_THAT(plain.sent(), Not(HasSubstr("--")));

    memory_wire wire; // an Include asked for by name takes the reference itself
    wire.mode = MODE_BUFFERED | MTOM;
    wire.namespace_state = 1;
    const value &v = values[1];
    EXPECT_EQ(soap_attachment_ref_out(&wire, "xop:Include", 0, v.content, &v, v.id, v.type, nullptr, 1,
                                      nullptr, VALUE_TYPE),
              -1);
    soap_send_flush(&wire);
    EXPECT_EQ(wire.sent().find("xop:Include href=\"cid:two%20\""), 1U) << wire.sent();
}

TEST(mime_out, draws_boundaries_that_differ)
{
    std::set<std::string> seen;
    for (int i = 0; i < 100; ++i) {
        memory_wire wire;
        for (int pass = 0; pass < 2; ++pass) // both passes have one
            ASSERT_EQ(soap_mime_boundary_make(&wire), 0);
        EXPECT_TRUE(std::regex_match(wire.mime.boundary, std::regex("[A-Za-z0-9_=-]{32,70}")));
        seen.insert(wire.mime.boundary);
    }
    EXPECT_EQ(seen.size(), 100U);
}

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
    EXPECT_EQ(read.wire->mime.list, read.wire->mime.root);
    std::string summary;
    for (const soap_attachment *p = read.wire->mime.list->next; p != nullptr; p = p->next)
        summary += text_of(p->id) + "|" + text_of(p->location) + "|" + text_of(p->type) + "|" +
                   text_of(p->description) + "|" + std::to_string(p->encoding) + "|" + p->content + "\n";
    EXPECT_EQ(summary, "<1>|there|a/b; c=d|what|" + std::to_string(MIME_BASE64) +
                           "|one\n"
                           "two|(null)|(null)|(null)|0|two\n(null)|(null)|(null)|(null)|0|no head\n"
                           "<4>|(null)|(null)|(null)|0|\n"); // a Content-ID is what references mean
}

TEST(mime_in, needs_the_start_and_the_boundary_that_are_announced)
{
    const auto outcome = [](const std::string &boundary, const std::string &start) {
        return reception("HTTP/1.1 200 OK\r\nContent-Type: multipart/related; boundary=" + boundary +
                         "; start=" + start +
                         "\r\n\r\n\r\npreamble\r\n--bb\r\nContent-ID: <a>\r\n\r\nfirst\r\n" +
                         root("<data href=\"cid:a\"/>") + END)
            .summary();
    };
    EXPECT_EQ(outcome("\"bb\"", "\"<root>\""), "[cid:a (null) first]");
    EXPECT_EQ(outcome("\"bb\"", "\"<none>\"").substr(0, 1), "!");
    EXPECT_EQ(outcome("\"cc\"", "\"<root>\""), "!" + std::to_string(SOAP_MIME_ERROR));
}

TEST(mime_in, keeps_data_that_only_looks_like_a_delimiter)
{
    const std::string data = std::string("\r") + "\r\n" + "\r\n-" + "\r\n--" + "\r\n--b" + "\r\n--bB" +
                             "\r\r\n--b\r\n--b\n--bb" + "--bb" + std::string("\0\n", 2) + "\r\n--\r";
    const std::string message = root("<data href=\"cid:a\"/>") + part("Content-ID: <a>\r\n", data) + END;
    expect_same_at_every_split(message, "[cid:a (null) " + data + "]");
}

TEST(mime_in, takes_a_delimiter_at_every_place_around_the_end_of_the_buffer)
{
    const std::string start = root("<data href=\"cid:a\"/>") + "\r\n--bb\r\nContent-ID: <a>\r\n\r\n";
    for (std::size_t at = SOAP_BUFFER_SIZE - 12; at <= SOAP_BUFFER_SIZE + 4; ++at) {
        std::string data(at - start.size(), '.');
        data.replace(data.size() - 7, 7, "\r\n--b\r\r"); // nearly one, right before it
        reception read(start + data + "\r\n--bb\r\nContent-ID: <b>\r\n\r\nnext" + END);
        ASSERT_EQ(read.run(), 0) << at;
        ASSERT_TRUE(read.values[0].bytes() == data) << at;
        EXPECT_STREQ(read.wire->mime.last->content, "next");
    }
}

TEST(mime_in, reports_what_is_wrong_with_a_message)
{
    const std::string a = part("Content-ID: <a>\r\n", "x");
    const std::tuple<const char *, std::string, int> cases[] = {
        {"good", a + END, 0},
        {"blanks after the boundary", "\r\n--bb \t\r\nContent-ID: <a>\r\n\r\nx\r\n--bb--", 0},
        {"epilogue", a + END + "\r\nepilogue", 0},
        {"something after the boundary", "\r\n--bbb\r\n\r\nx" + a + END, SOAP_MIME_ERROR},
        {"two of one id", a + a + END, SOAP_MIME_ERROR},
        {"two of one id, spelled differently", a + part("Content-ID: %61\r\n", "y") + END, SOAP_MIME_ERROR},
        {"one dash", a + "\r\n--bb-\r\n", SOAP_MIME_ERROR},
        {"no end", a, SOAP_EOF},
        {"a line of a head too long", part("Content-ID: " + std::string(2000, 'i') + "\r\n", "x") + END,
         SOAP_HEADER_LINE},
        {"no such attachment", END, SOAP_DIME_HREF},
    };
    for (const auto &[rule, rest, error] : cases)
        EXPECT_EQ(reception(root("<data href=\"cid:a\"/>") + rest).run(), error) << rule;
    const std::string endless = part(repeat_text("Content-ID: <a>\r\n", 1100), "x");
    EXPECT_EQ(reception(root("") + endless + END).run(), SOAP_MIME_ERROR);
}

TEST(mime_in, mtom_needs_no_mode_of_the_host_when_the_part_or_the_message_says_so)
{
    const auto message = [](const std::string &element) {
        return "--bb\r\nContent-Type: application/xop+xml; type=\"text/xml\"\r\n\r\n" + envelope(element) +
               part("Content-ID: <a b>\r\n", "x") + END;
    };
    const std::string include =
        "<xop:Include xmlns:xop=\"http://www.w3.org/2004/08/xop/include\" href=\"cid:a%20b\"";
    const std::pair<std::string, std::string> cases[] = {
        {"<data>\r\n " + include + "/> </data>", "[cid:a%20b (null) x]"},
        {"<data>" + include + "> </xop:Include></data>", "[cid:a%20b (null) x]"},
        {"<data> eA== </data>", "[(null) (null) x]"},
        {"<data/>", "[(null) (null) ]"},
        {"<data><xop:Include xmlns:xop=\"u\"/></data>", NO_REFERENCE},
        {"<data><xop:Include xmlns:xop=\"u\" href=\"cid:c\"/></data>", NO_REFERENCE},
    };
    for (const auto &[element, summary] : cases)
        EXPECT_EQ(reception(message(element)).summary(), summary) << element;
    const std::string by_its_head = root(cases[0].first) + part("Content-ID: <a b>\r\n", "x") + END;
    for (const char *type : {"application/xop+xml", "\"application/XOP+xml\"", "\"text/xml\""})
        EXPECT_EQ(reception(std::string("HTTP/1.1 200 OK\r\nContent-Type: multipart/related; type=") + type +
                            "; boundary=bb\r\n\r\n" + by_its_head)
                          .summary() == cases[0].second,
                  std::strstr(type, "text") == nullptr)
            << type;
}

// The parts come as they are asked for, out of a compressed stream too and whatever carries it, and the
// context serves another message afterwards, also if parts were left unread.
TEST(mime_in, gives_the_parts_one_by_one_when_asked_to)
{
    const std::string one(70000, 'o'), two = "two";
    const std::deque<value> values = {make_value(one, "cid:one", "a/b"), make_value(two, "cid:two", "c/d")};
    const std::string next = root("<data href=\"cid:n\"/>") + part("Content-ID: <n>\r\n", "next") + END;
    for (const std::uint32_t framing : {MODE_STORE, MODE_CHUNKED})
        for (const int format : {0, 1, 2}) { // none, deflate, gzip
            memory_wire sender(0, MTOM | (format != 0 ? MODE_DEFLATE : 0U) | framing);
            sender.zlib_out = static_cast<std::int16_t>(format);
            ASSERT_EQ(send_request(sender, values), 0);
            const std::string sent = sender.sent();
            EXPECT_EQ(sent.size() < one.size(), format != 0);
            for (const std::size_t piece : {100U, 65536U})
                for (const std::size_t taken : {2U, 1U, 0U}) {
                    SCOPED_TRACE(taken);
                    reception read(sent, MODE_MIME_AFTER | MODE_MTOM, piece, piece);
                    soap *const ctx = read.wire.get();
                    ASSERT_EQ(read.run(), 0);
                    EXPECT_EQ(soap_socket_release(ctx), 0);
                    for (std::size_t i = 0; i < taken; ++i) {
                        EXPECT_EQ(read.values[i].content, nullptr);
                        const soap_attachment *p = soap_mime_next_part(ctx);
                        ASSERT_NE(p, nullptr);
                        EXPECT_EQ(p->size, values[i].bytes().size());
                        EXPECT_EQ(read.values[i].bytes(), values[i].bytes());
                    }
                    if (taken == 2) {
                        EXPECT_EQ(soap_mime_next_part(ctx), nullptr);
                        EXPECT_EQ(ctx->error, 0);
                        EXPECT_EQ(ctx->zlib_state, 0);
                    }
                    EXPECT_EQ(ctx->response_unfinished, taken != 2); // no other call may use the connection
                    ctx->keep_alive = 0;
                    ctx->input_mode = 0;
                    read.wire->receive(next);
                    read.wire->piece = nullptr;
                    read.values.clear();
                    EXPECT_EQ(read.summary(), "[cid:n (null) next]");
                }
            reception cut(sent.substr(0, sent.size() - 20), MODE_MIME_AFTER | MODE_MTOM);
            if (cut.run() == 0)
                while (soap_mime_next_part(cut.wire.get()) != nullptr) {
                }
            EXPECT_NE(cut.wire->error, 0);
        }
    reception none(root("") + END, MODE_MIME_AFTER);
    ASSERT_EQ(none.run(), 0);
    EXPECT_EQ(soap_mime_next_part(none.wire.get()), nullptr);
    EXPECT_EQ(none.wire->error, 0);
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

TEST(mime_in, a_head_may_come_without_a_delimiter)
{
    memory_wire wire;
    wire.receive("X-Own: text\r\nContent-ID: i\r\n\r\n");
    ASSERT_EQ(soap_mime_part_header_read(&wire), 0);
    EXPECT_STREQ(wire.mime.last->id, "i");
    EXPECT_EQ(wire.mime.boundary, nullptr);
}

TEST(mime_in, survives_every_refused_allocation)
{
    expect_survival_of_every_refused_allocation(
        root("<data href=\"cid:a\"/>") +
        part("Content-ID: <a>\r\nContent-Type: t\r\nContent-Description: d\r\n", std::string(5000, 'x')) +
        part("Content-Disposition: x; name=b\r\nContent-Location: l\r\n", "") + END);
}

TEST(cid, means_an_id_in_several_spellings)
{
    static const std::tuple<const char *, const char *, bool> cases[] = {
        {"cid:a", "<a>", true},      {"cid:a", "a", true},           {"a", "<a>", true},
        {"cid:a", "cid:a", true},    {"<a>", "<a>", true},           {"cid:a%40b", "<a@b>", true},
        {"cid:a%4", "<a%4>", true},  {"cid:a%40b", "<a%40b>", true}, {"cid:A", "<a>", false},
        {"cid:a", "<ab>", false},    {"cid:ab", "<a>", false},       {"cid:", "<>", true},
        {"cid:", "<", true},         {nullptr, "a", false},          {"a", nullptr, false},
        {"cid:a%00b", "<a>", false},
    };
    memory_wire wire;
    for (const auto &[href, id, same] : cases)
        EXPECT_EQ(soap_cid_compare(&wire, href, id) == 0, same) << text_of(href) << " and " << text_of(id);
}

TEST(references, are_answered_in_linear_time_in_any_order_and_spelling)
{
    constexpr int COUNT = 20000;
    std::string body, parts, wanted, got;
    for (int i = 0; i < COUNT; ++i) {
        const std::string n = std::to_string(i), last = std::to_string(COUNT - 1 - i);
        const char *const href[] = {"cid:x%2D", "cid:x-", "y%2D"}, *const id[] = {"<x-", "<x-", "<y%2D"};
        body += "<data href=\"" + (href[i % 3] + n) + "\"/>";
        parts += part("Content-ID: " + (id[(COUNT - 1 - i) % 3] + last) + ">\r\n", last) +
                 part("Content-ID: <unasked" + n + ">\r\n", "");
        wanted += n + ",";
    }
    reception read(root(body) + parts + END);
    const double start = cpu_time();
    ASSERT_EQ(read.run(), 0);
    const double taken = cpu_time() - start;
    for (const value &v : read.values)
        got += v.bytes() + ",";
    EXPECT_TRUE(got == wanted);
    EXPECT_LT(taken, 10.0); // 800 million comparisons would not fit
    EXPECT_EQ(read.wire->mtom_list, nullptr);
}

TEST(references, to_one_attachment_are_all_answered)
{
    for (const std::size_t count : {1U, 32U, 33U, 500U}) {
        const std::string body = repeat_text("<data href=\"cid:a\"/><data href=\"cid:b\"/>", count);
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
    for (const char *id : {"unknown", "a"}) {
        huge.id = const_cast<char *>(id);
        soap_attachment_bind(&wire, &huge);
        EXPECT_EQ(wire.error, *id == 'a' ? SOAP_LENGTH : 0);
    }
    EXPECT_EQ(v.size, 0);
}

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

constexpr std::uint32_t FORMS[] = {0, MTOM}; // of values: DIME, MTOM

// The bytes are one buffer, the values are not one attachment: each goes out under its own id, type and
// options, or in place. What is alike in all of them goes once.
TEST(values, over_one_buffer_go_out_each_in_its_form)
{
    const std::string bytes = "one buffer";
    memory_wire keeper;
    char *const some = soap_dime_options_make(&keeper, 7, "opt"), *const same = soap_dime_options_make(
                                                                      &keeper, 7, "opt");
    const struct {
        const char *id, *type;
        char *options;
        int size;
        int attachment; // 0 in place
    } forms[] = {{nullptr, nullptr, nullptr, 10, 0}, {nullptr, "a/b", nullptr, 10, 1},
                 {nullptr, "c/d", nullptr, 10, 2},   {"cid:x", nullptr, nullptr, 10, 3},
                 {"cid:y", "a/b", some, 10, 4},      {"cid:y", "a/b", same, 10, 4},
                 {"cid:z", "a/b", nullptr, 4, 5},    {nullptr, nullptr, nullptr, 4, 0},
                 {nullptr, "a/b", some, 10, 6},      {"", "a/b", nullptr, 10, 1},
                 {"", nullptr, nullptr, 10, 0}};
    for (const std::uint32_t mode :
         {FORMS[0], FORMS[1], FORMS[0] | SOAP_XML_GRAPH, FORMS[1] | SOAP_XML_GRAPH})
        for (const auto &one : forms)
            for (const auto &other : forms) {
                std::deque<value> values;
                std::set<int> attachments;
                for (const auto *form : {&one, &other, &one}) {
                    values.push_back(make_value(bytes, form->id, form->type, form->options));
                    values.back().size = form->size;
                    const bool alike = (mode & MODE_MTOM) != 0 && form->attachment == 6; // no options in MIME
                    attachments.insert(alike ? 1 : form->attachment);
                }
                memory_wire wire(0, SENDING | mode);
                ASSERT_EQ(send(wire, values), 0);
                reception read(wire.sent(), mode & MODE_MTOM);
                ASSERT_EQ(read.run(), 0) << wire.sent();
                ASSERT_EQ(read.values.size(), 3U);
                for (std::size_t i = 0; i < 3; ++i) {
                    const value &sent = values[i], &got = read.values[i];
                    EXPECT_EQ(got.bytes(), sent.bytes()) << wire.sent();
                    EXPECT_EQ(text_of(got.type), text_of(sent.type)) << wire.sent();
                    const bool has_id = sent.id != nullptr && *sent.id != '\0';
                    EXPECT_EQ(got.id != nullptr, has_id || sent.type != nullptr) << wire.sent();
                    EXPECT_TRUE(!has_id || text_of(sent.id) == got.id) << wire.sent();
                    EXPECT_EQ(got.options != nullptr, sent.options != nullptr && (mode & MODE_MTOM) == 0);
                }
                attachments.erase(0);
                std::size_t count = 0;
                for (const soap_attachment *list : {read.wire->dime.list, read.wire->mime.list})
                    for (; list != nullptr; list = list->next)
                        count += list != read.wire->mime.root;
                EXPECT_EQ(count, attachments.size()) << wire.sent();
            }
}

TEST(attachments, of_one_id_are_refused_by_the_writer)
{
    const std::string bytes = "some", others = "more";
    const auto attach = [](soap &ctx, std::uint32_t form, const char *id) {
        char *const content = const_cast<char *>("host's");
        if ((form & MODE_MIME) != 0)
            soap_mime_attach(&ctx, content, 6, MIME_BINARY, "a/b", id, nullptr, nullptr);
        else
            soap_dime_attach(&ctx, content, 6, "a/b", id, 0, nullptr);
    };
    const value a = make_value(bytes, "cid:a", "a/b"), typed = make_value(bytes, "cid:a", "c/d"),
                elsewhere = make_value(others, "cid:a", "a/b"), b = make_value(others, "cid:b", "a/b");
    const std::tuple<const char *, std::deque<value>, std::vector<const char *>, std::uint32_t, int> cases[] =
        {
            {"different", {a, b}, {"c", nullptr, nullptr}, 0, 0},
            {"different parts", {a, b}, {"<c>", nullptr, nullptr}, MTOM, 0},
            {"one value twice", {a, a}, {}, 0, 0},
            {"two types", {a, typed}, {}, 0, SOAP_DIME_ERROR},
            {"two types in parts", {a, typed}, {}, MTOM, SOAP_MIME_ERROR},
            {"two buffers", {a, elsewhere}, {}, MTOM, SOAP_MIME_ERROR},
            {"a value's and the host's", {a, b}, {"b"}, 0, SOAP_DIME_ERROR},
            {"a value's and the host's part", {a, b}, {"<b>"}, MTOM, SOAP_MIME_ERROR},
            {"without the brackets", {a, b}, {"b"}, MTOM, SOAP_MIME_ERROR},
            {"two of the host's", {a}, {"c", "c"}, 0, SOAP_DIME_ERROR},
            {"two spellings of one id", {a}, {"<x@y>", "<x%40y>"}, MTOM, SOAP_MIME_ERROR},
            {"the message's part", {a}, {"<root>"}, MTOM, SOAP_MIME_ERROR},
        };
    for (const auto &[rule, values, ids, form, error] : cases)
        for (const std::uint32_t framing : {MODE_BUFFERED, MODE_STORE, MODE_CHUNKED}) {
            memory_wire wire(0, framing | MODE_BARE_XML | form);
            if (form != 0)
                soap_mime_start(&wire, "bb", "<root>");
            for (const char *id : ids)
                attach(wire, form, id);
            EXPECT_EQ(send(wire, values, framing != MODE_CHUNKED), error) << rule;
            EXPECT_TRUE(error == 0 || framing == MODE_CHUNKED || wire.sent().empty()) << rule;
        }
}

TEST(streams, of_the_host_that_misbehave_end_the_message)
{
    static std::size_t excess;
    static int opened;
    static const auto open = [](soap *ctx, void *handle, const char *id, const char *,
                                const char *) -> void * {
        if (std::strstr(id, "memory") != nullptr)
            return soap_attachment_in_memory(ctx);
        if (std::strstr(id, "refused") != nullptr)
            ctx->error = 55;
        if (std::strstr(id, "null") != nullptr || ctx->error != 0)
            return nullptr;
        ++opened;
        return handle;
    };
    static const auto read = [](soap *ctx, void *handle, char *buffer, std::size_t length) {
        return stream_host::read(ctx, handle, buffer, length) + excess;
    };
    const struct {
        const char *id;
        std::size_t has, excess, size; // bytes: in the stream, more than asked for, as announced
        std::uint32_t framing;
        int error;
        const char *text; // in the fault
    } cases[] = {
        {"fine", 3000, 0, 3000, MODE_BUFFERED, 0, ""},
        {"unknown", 3000, 0, 0, MODE_CHUNKED, 0, ""},
        {"memory", 0, 0, sizeof(host_stream), MODE_BUFFERED, 0, ""},
        {"no content, null", 0, 0, 0, MODE_BUFFERED, 0, ""}, // an empty attachment
        {"no content, memory", 0, 0, 1, MODE_BUFFERED, SOAP_USER_ERROR, "has a length and no content"},
        {"null", 0, 0, 3000, MODE_BUFFERED, SOAP_USER_ERROR, "open callback gave null for \"null\""},
        {"refused", 0, 0, 3000, MODE_STORE, 55, ""},
        {"short", 2999, 0, 3000, MODE_BUFFERED, SOAP_EOF, "\"short\" ended after 2999 of 3000 bytes"},
        {"greedy", 3000, 1, 3000, MODE_BUFFERED, SOAP_CORRUPTION,
         "gave 1025 bytes where 1024 were asked for"},
        {"greedy", 1024, 1, 0, MODE_CHUNKED, SOAP_CORRUPTION, "gave 1025 bytes where 1024 were asked for"},
        {"unknown", 3000, 0, 0, MODE_BUFFERED, SOAP_USER_ERROR,
         "\"unknown\" was attached without its length"},
    };
    for (const std::uint32_t form : {MODE_DIME, MTOM, MODE_MIME})
        for (const auto &c : cases) {
            SCOPED_TRACE(std::string(c.id) + " " + std::to_string(form));
            host_stream source = {std::string(c.has, 'x'), 0, SOAP_BUFFER_SIZE};
            stream_host host;
            memory_wire wire(0, c.framing | MODE_BARE_XML | form);
            host.serve(wire);
            wire.dime_read_open = wire.mime_read_open = open;
            wire.dime_read = wire.mime_read = read;
            excess = c.excess;
            opened = 0;
            const bool has_content = std::strstr(c.id, "no content") == nullptr;
            char *const handle = has_content ? reinterpret_cast<char *>(&source) : nullptr;
            if (form == MODE_DIME)
                soap_dime_attach(&wire, handle, c.size, "a/b", c.id, 0, nullptr);
            else
                soap_mime_attach(&wire, handle, c.size, MIME_BINARY, "a/b", c.id, nullptr, nullptr);
            EXPECT_EQ(send(wire, {}, false), c.error);
            EXPECT_EQ(source.closed, opened);
            char reported[1024] = "";
            soap_fault_print_text(&wire, reported, sizeof reported);
            EXPECT_THAT(reported, HasSubstr(c.text));
            EXPECT_TRUE(c.error != 0 || std::ranges::count(wire.sent(), 'x') >= static_cast<long>(c.has));
        }
}

TEST(streams, of_the_host_take_what_is_received_or_end_the_message)
{
    const std::string bytes(5000, 's');
    const std::tuple<const char *, bool, int, int> cases[] = {{"takes it", true, 0, 0},
                                                              {"refuses its bytes", true, 55, 55},
                                                              {"opens nothing", false, 0, SOAP_USER_ERROR}};
    for (const std::uint32_t form : FORMS)
        for (const auto &[rule, opens, refusal, error] : cases) {
            SCOPED_TRACE(rule);
            memory_wire wire(0, SENDING | form);
            ASSERT_EQ(send(wire, {make_value(bytes, "cid:a", "a/b")}), 0);
            reception read(wire.sent(), form & MODE_MTOM, 7, 500);
            stream_host host;
            host.serve(*read.wire);
            host.refusal = refusal;
            if (!opens) {
                read.wire->dime_write_open = [](soap *, auto...) -> void * { return nullptr; };
                read.wire->mime_write_open = [](soap *, auto...) -> void * { return nullptr; };
            }
            EXPECT_EQ(read.run(), error);
            char reported[1024] = "";
            soap_fault_print_text(read.wire.get(), reported, sizeof reported);
            const char *const reason = opens ? "" : "open callback gave null for \"";
            EXPECT_THAT(reported, HasSubstr(reason));
            if (!opens)
                continue;
            const host_stream &target = host.of(form == 0 ? "a" : "<a>");
            EXPECT_EQ(target.closed, 1);
            if (error == 0) {
                EXPECT_EQ(target.data, bytes);
                EXPECT_EQ(static_cast<const void *>(read.values[0].content), &target);
                EXPECT_EQ(read.values[0].size, 5000);
            }
        }
}

TEST(http_exchange, carries_attachments_in_every_framing)
{
    const std::string bytes = "some bytes";
    std::string more(300000, '\0'); // looks like delimiters
    for (std::size_t i = 0; i < more.size(); ++i)
        more[i] = "\r\n-=x\0\xFFy"[i * 2654435761U >> 13 & 7];
    for (const std::uint32_t form : {MODE_MTOM, MTOM, std::uint32_t{0}}) { // 0: DIME
        for (const std::uint32_t framing :
             {MODE_DIRECT, MODE_BUFFERED, MODE_STORE, MODE_CHUNKED, MODE_DIRECT | MODE_DEFLATE,
              MODE_STORE | MODE_DEFLATE, MODE_CHUNKED | MODE_DEFLATE}) {
            SCOPED_TRACE(form | framing);
            memory_wire wire(0, form | framing);
            ASSERT_EQ(
                send_request(wire, {make_value(bytes, "cid:i", "a/b"), make_value(more, nullptr, "c/d")}), 0);
            const std::string sent = wire.sent();
            const std::size_t at = sent.find("Content-Length: ");
            EXPECT_EQ(at == std::string::npos, (framing & MODE_IO_MASK) == MODE_CHUNKED);
            if (at != std::string::npos) {
                EXPECT_EQ(std::stoul(sent.substr(at + 16)), sent.size() - sent.find("\r\n\r\n") - 4);
            }
            EXPECT_EQ(reception(sent, form & MODE_MTOM, 100, 3000).summary(),
                      "[cid:i a/b some bytes][cid:id2 c/d " + more + "]");
        }
    }
}

} // namespace
