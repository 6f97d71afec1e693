// Start tags, text, arrays and the envelope as they are on the wire, in every output mode.
#include <unistd.h>

#include "support/writer_fixture.h"
#include "xml/xml_write_fast.h"

using namespace writer_fixture;

namespace {

std::string inside(writer &w, const calls &write)
{
    return written(w, start::inside, write);
}

std::string inside(std::uint32_t mode, const calls &write, std::int16_t version = 1)
{
    writer w(mode, version);
    return inside(w, write);
}

std::string document(std::uint32_t mode, const calls &write, std::int16_t version = 1)
{
    writer w(mode, version);
    return written(w, start::document, write);
}

void element(soap *ctx, const char *tag, const calls &content = {}, int id = 0, const char *type = nullptr)
{
    EXPECT_EQ(soap_element_out_begin(ctx, tag, id, type), 0);
    if (content)
        content(ctx);
    EXPECT_EQ(soap_element_out_end(ctx, tag), 0);
}

void set_attributes(soap *ctx, std::initializer_list<std::pair<const char *, const char *>> attributes)
{
    for (const auto &[name, value] : attributes)
        EXPECT_EQ(soap_attr_set(ctx, name, value, 1), 0);
}

// What `xmllint` makes of a document; empty if it finds fault with it.
std::string canonical_form(const std::string &text, const char *form)
{
    const std::string path = ::testing::TempDir() + "xml_write_" + std::to_string(::getpid()) + ".xml";
    std::ofstream(path, std::ios::binary) << text;
    std::string result;
    if (std::FILE *pipe = ::popen(("xmllint " + std::string(form) + " " + path).c_str(), "r")) {
        char bytes[4096];
        while (const std::size_t got = std::fread(bytes, 1, sizeof bytes, pipe))
            result.append(bytes, got);
        if (::pclose(pipe) != 0)
            result.clear();
    }
    std::remove(path.c_str());
    return result;
}

} // namespace

// The table of escapes once more, a byte at a time.
static std::string escaped(const std::string &text, int flag, std::uint32_t mode)
{
    std::string result;
    for (const char c : text) {
        const auto byte = static_cast<unsigned char>(c);
        if (c == '\r')
            result += "&#xD;";
        else if (c == '&')
            result += "&amp;";
        else if (c == '<')
            result += "&lt;";
        else if (c == '>' && flag == 0)
            result += "&gt;";
        else if (c == '"' && flag != 0)
            result += "&quot;";
        else if (c == '\t' && flag != 0)
            result += "&#x9;";
        else if (c == '\n' && (flag != 0 || !(mode & MODE_CANONICAL)))
            result += "&#xA;";
        else if (byte >= 128 && flag != 2 && !(mode & MODE_UTF_STRINGS))
            result += {static_cast<char>(0xC0 | byte >> 6), static_cast<char>(0x80 | (byte & 0x3F))};
        else
            result += c;
    }
    return result;
}

TEST(xml_write, escapes_follow_place_and_mode)
{
    static const std::tuple<const char *, std::uint32_t, int, const char *, const char *> cases[] = {
        {"element text", 0, 0, "\t\n\r\"&'<>\x7F", "\t&#xA;&#xD;\"&amp;'&lt;&gt;\x7F"},
        {"canonical text", MODE_CANONICAL, 0, "\t\n\r\"&'<>", "\t\n&#xD;\"&amp;'&lt;&gt;"},
        {"attribute", 0, 1, "\t\n\r\"&'<>", "&#x9;&#xA;&#xD;&quot;&amp;'&lt;>"},
        {"canonical attribute", MODE_CANONICAL, 1, "\n>", "&#xA;>"},
        {"latin-1 text", 0, 0, "\x80\xE9\xFF", "\xC2\x80\xC3\xA9\xC3\xBF"},
        {"latin-1 attribute", 0, 1, "\xE9", "\xC3\xA9"},
        {"raw attribute", 0, 2, "\xC3\xA9\"", "\xC3\xA9&quot;"},
        {"utf-8 strings", MODE_UTF_STRINGS, 0, "\xC3\xA9<", "\xC3\xA9&lt;"},
        {"utf-8 attribute", MODE_UTF_STRINGS, 1, "\xC3\xA9", "\xC3\xA9"},
        {"empty", 0, 0, "", ""},
    };
    for (const auto &[rule, mode, flag, text, bytes] : cases) {
        const auto write = [text = text, flag = flag](soap *ctx) { soap_text_write(ctx, text, flag); };
        EXPECT_EQ(inside(mode, write), bytes) << rule;
        EXPECT_EQ(escaped(text, flag, mode), bytes) << rule;
    }
}

TEST(xml_write, an_escape_is_found_at_every_place_of_every_length)
{
    for (const std::uint32_t mode : {0U, MODE_UTF_STRINGS, MODE_CANONICAL})
        for (const int flag : {0, 1, 2}) {
            writer w(mode);
            std::string long_text; // passes the end of the buffer
            const auto bytes_of = [&](const std::string &text) {
                return w.pass(MODE_BUFFERED, start::inside,
                              [&](soap *ctx) { soap_text_write_n(ctx, text.data(), text.size(), flag); });
            };
            for (std::size_t length = 1; length <= 50; ++length)
                for (std::size_t at = 0; at < length; ++at) {
                    std::string text(length, 'x');
                    text[length - 1 - at / 2] = '>';
                    text[at] = "&<>\n\r\t\"\xE9"[(at + length) % 8];
                    if (text[at] == '\xE9' && (flag == 2 || (mode & MODE_UTF_STRINGS) != 0))
                        text.replace(at, 1, "\xE2\x82\xAC");
                    ASSERT_EQ(bytes_of(text), escaped(text, flag, mode))
                        << flag << ' ' << length << ' ' << at;
                    long_text += text;
                }
            long_text += long_text + long_text;
            EXPECT_TRUE(bytes_of(long_text) == escaped(long_text, flag, mode)) << flag;
        }
}

static int write_by(int way, soap *ctx, const std::string &text)
{
    char *place = const_cast<char *>(text.data());
    switch (way) {
    case 0:
        return soap_text_write_n(ctx, text.data(), text.size(), 0);
    case 1:
        return soap_string_element_out(ctx, "e", 0, &place, "", 5);
    case 2:
        return soap_attr_write(ctx, "a", place);
    case 3:
        return soap_text_write(ctx, place, 2); // as UTF-8, whatever the mode
    default:
        return soap_literal_write(ctx, "-", &place, nullptr); // likewise
    }
}

TEST(xml_write, what_xml_cannot_carry_is_refused)
{
    constexpr int NONE = 0, UTF8 = 1, ALL = 2; // strings in which it is refused
    static const std::pair<int, std::vector<const char *>> cases[] = {
        {NONE,
         {"\t\n\r ~\x7F", "\xC2\x80\xDF\xBF\xE0\xA0\x80\xED\x9F\xBF\xEE\x80\x80\xEF\xBF\xBD",
          "\xF0\x90\x80\x80\xF4\x8F\xBF\xBF"}},
        {UTF8,
         {"\x80", "\xC3", "\xC1\xBF", "\xE0\x9F\xBF", "\xED\xA0\x80", "\xEF\xBF\xBE", "\xF0\x8F\xBF\xBF",
          "\xF4\x90\x80\x80", "\xF5\x80\x80\x80", "\xE2\x82\xE2", "\xC3\xA9\xA9"}},
        {ALL, {"\x01", "\x08", "\x0B", "\x1F"}},
    };
    for (const std::uint32_t mode : {0U, MODE_UTF_STRINGS}) {
        writer w(mode);
        for (const auto &one : cases)
            for (const std::string bytes : one.second)
                for (int way = 0; way < 5; ++way)
                    for (const int before : {0, 3, 15, 700}) {
                        const bool is_utf8 = way > 2 || mode != 0;
                        const bool refused = one.first == ALL || (is_utf8 && one.first == UTF8);
                        std::string text;
                        for (int i = 0; i < before; ++i)
                            text += is_utf8 && i % 5 != 0 ? "\xC3\xA9" : "x";
                        w.ctx->error = 0;
                        w.pass(MODE_BUFFERED | MODE_COUNTING, start::inside, [&](soap *ctx) {
                            EXPECT_EQ(write_by(way, ctx, text + bytes + "tail"), refused ? SOAP_UTF_ERROR : 0)
                                << testing::PrintToString(bytes) << " by " << way << " after " << before;
                        });
                    }
    }
    const std::u32string good = {9, 0x7F, 0x80, 0xD7FF, 0xE000, 0xFFFD, 0x10000, 0x10FFFF},
                         refused = {1, 0x1F, 0xD800, 0xDFFF, 0xFFFE, 0xFFFF, 0x110000, 0x7FFFFFFF};
    writer w;
    for (const char32_t code : good + refused)
        w.pass(MODE_BUFFERED | MODE_COUNTING, start::inside, [&](soap *ctx) {
            char32_t text[] = {U'a', code, 0}, *place = text;
            const int expected = good.find(code) == good.npos ? SOAP_UTF_ERROR : 0;
            EXPECT_EQ(soap_wide_text_write(ctx, text, 0), expected) << static_cast<std::uint32_t>(code);
            EXPECT_EQ(soap_wide_literal_write(ctx, "-", &place, nullptr), expected);
            ctx->error = 0;
        });
}

TEST(xml_write, code_points_take_one_to_six_bytes_and_are_escaped_like_bytes)
{
    const auto write_each = [](soap *ctx) {
        for (const std::uint32_t code : {0x09U, 0x7FU, 0x80U, 0x7FFU, 0x800U, 0xFFFFU, 0x10000U, 0x1FFFFFU,
                                         0x200000U, 0x3FFFFFFU, 0x4000000U, 0x7FFFFFFFU})
            soap_char_write(ctx, code);
    };
    EXPECT_EQ(inside(0, write_each),
              "\t\x7F\xC2\x80\xDF\xBF\xE0\xA0\x80\xEF\xBF\xBF\xF0\x90\x80\x80\xF7\xBF\xBF\xBF"
              "\xF8\x88\x80\x80\x80\xFB\xBF\xBF\xBF\xBF\xFC\x84\x80\x80\x80\x80\xFD\xBF\xBF\xBF\xBF\xBF");
    const std::u32string wide = U"<\n\t\"&>\u00E9\u20AC\U0001F600" + std::u32string(300, U'\u00E9');
    const std::string text = "<\n\t\"&>\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80" + repeat_text("\xC3\xA9", 300);
    for (const std::uint32_t mode : {0U, MODE_UTF_STRINGS, MODE_CANONICAL})
        for (const int flag : {0, 1})
            EXPECT_EQ(inside(mode, [&](soap *ctx) { soap_wide_text_write(ctx, wide.c_str(), flag); }),
                      escaped(text, flag, mode | MODE_UTF_STRINGS));
}

TEST(xml_write, a_start_tag_carries_what_waits_for_it)
{
    static const auto understand = [](soap *ctx, const char *actor) {
        ctx->must_understand = 1;
        ctx->actor = actor;
    };
    static const auto encode = [](soap *ctx, const char *style) {
        ctx->encoding_flag = 1;
        ctx->encoding_style = style;
    };
    static const auto position = [](soap *ctx, std::int8_t null_flag) {
        ctx->null_flag = null_flag;
        ctx->position_count = 2;
        ctx->positions[0] = 3;
        ctx->positions[1] = -2147483647 - 1;
    };
    using set_up = void (*)(soap *);
    static const std::tuple<const char *, int, const char *, std::uint32_t, std::int16_t, set_up> cases[] = {
        {"", 0, nullptr, 0, 1, nullptr},
        {" id=\"_7\"", 7, "", 0, 1, nullptr},
        {" xsi:type=\"xsd:int\"", 0, "xsd:int", 0, 1, nullptr},
        {" id=\"_2\"", 2, "xsd:int", MODE_NO_TYPE, 1, nullptr},
        {"", 0, "xsd:int", 0, 1, [](soap *c) { c->message_part = PART_HEADER; }},
        {" xsi:type=\"a:own\"", 0, "xsd:int", 0, 1,
         [](soap *c) { soap_attr_set(c, "xsi:type", "a:own", 1); }},
        {" SOAP-ENC:position=\"[3,-2147483648]\"", 0, nullptr, 0, 1, [](soap *c) { position(c, 1); }},
        {"", 0, nullptr, 0, 1, [](soap *c) { position(c, 0); }},
        {" SOAP-ENV:actor=\"urn:x\" SOAP-ENV:mustUnderstand=\"1\"", 0, nullptr, 0, 1,
         [](soap *c) { understand(c, "urn:x"); }},
        {" SOAP-ENV:role=\"urn:x\" SOAP-ENV:mustUnderstand=\"true\"", 0, nullptr, 0, 2,
         [](soap *c) { understand(c, "urn:x"); }},
        {" SOAP-ENV:mustUnderstand=\"1\"", 0, nullptr, 0, 1, [](soap *c) { understand(c, ""); }},
        {" SOAP-ENV:encodingStyle=\"http://schemas.xmlsoap.org/soap/encoding/\"", 0, nullptr, 0, 1,
         [](soap *c) { encode(c, ""); }},
        {" SOAP-ENV:encodingStyle=\"urn:enc\"", 0, nullptr, 0, 1, [](soap *c) { encode(c, "urn:enc"); }},
        {"", 0, nullptr, 0, 1, [](soap *c) { encode(c, nullptr); }},
    };
    for (const auto &[attributes, id, type, mode, version, before] : cases) {
        const auto write = [id = id, type = type, before = before](soap *ctx) {
            if (before)
                before(ctx);
            EXPECT_EQ(soap_element_out_begin(ctx, "a:e", id, type), 0);
            EXPECT_EQ(ctx->null_flag + ctx->position_count + ctx->must_understand + ctx->encoding_flag, 0);
            EXPECT_EQ(ctx->nesting_level, 1U);
            EXPECT_EQ(soap_element_out_end(ctx, "a:e"), 0);
            EXPECT_EQ(ctx->nesting_level, 0U);
        };
        EXPECT_EQ(inside(mode, write, version), "<a:e" + std::string(attributes) + "></a:e>");
    }
}

TEST(xml_write, the_root_declares_the_table)
{
    const std::string rows = " xmlns:SOAP-ENV=\"http://schemas.xmlsoap.org/soap/envelope/\""
                             " xmlns:SOAP-ENC=\"http://schemas.xmlsoap.org/soap/encoding/\""
                             " xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\""
                             " xmlns:xsd=\"http://www.w3.org/2001/XMLSchema\"";
    const auto write = [](soap *ctx) { element(ctx, "a:r", [](soap *c) { element(c, "b:e"); }); };
    EXPECT_EQ(document(MODE_DEFAULT_NAMESPACE, write),
              "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<r xmlns=\"urn:a\"" + rows +
                  "><e xmlns=\"urn:b\"></e></r>");
    writer w;
    w.ctx->xml_prolog = "<!--p-->";
    const std::string own = " xmlns:a=\"urn:a\" xmlns:b=\"urn:b\"><b:e></b:e></a:r>";
    EXPECT_EQ(written(w, start::document, write), "<!--p--><a:r" + rows + own);

    // A URI that was received takes the place of the row's own.
    ASSERT_TRUE(soap_prefix_push_in(w.ctx.get(), "e", "http://www.w3.org/2003/05/soap-envelope"));
    EXPECT_EQ(written(w, start::document, write),
              "<!--p--><a:r xmlns:SOAP-ENV=\"http://www.w3.org/2003/05/soap-envelope\"" +
                  rows.substr(rows.find(" xmlns:SOAP-ENC")) + own);
}

TEST(xml_write, odd_tables_are_declared_as_far_as_they_go)
{
    static const soap_namespace odd[] = {{"", "urn:none", nullptr, nullptr},
                                         {"n", nullptr, nullptr, nullptr},
                                         {"q", "urn:<\xE9\">", nullptr, nullptr},
                                         {nullptr, nullptr, nullptr, nullptr}};
    writer w;
    w.ctx->xml_prolog = "";
    ASSERT_EQ(soap_set_namespaces(w.ctx.get(), odd), 0);
    const auto write = [](soap *ctx) { element(ctx, "q:r"); };
    EXPECT_EQ(written(w, start::document, write), "<q:r xmlns:q=\"urn:&lt;\xC3\xA9&quot;>\"></q:r>");
    ASSERT_EQ(soap_set_namespaces(w.ctx.get(), nullptr), 0);
    EXPECT_EQ(written(w, start::document, write), "<q:r></q:r>");
}

TEST(xml_write, default_namespaces_change_with_the_prefix)
{
    const auto write = [](soap *ctx) {
        element(ctx, "a:one", [](soap *c) {
            EXPECT_EQ(soap_element_empty_nil(c, "b:nil"), 0);
            element(c, "b:two", [](soap *d) {
                element(d, "a:three", [](soap *e) {
                    element(e, "a:same");
                    element(e, "b:four");
                });
                set_attributes(d, {{"b:own", "1"}, {"a:other", "2"}});
                element(d, "b:five", {}, 0, "a:type");
            });
        });
    };
    EXPECT_EQ(inside(MODE_DEFAULT_NAMESPACE, write),
              "<one xmlns=\"urn:a\"><nil xmlns=\"urn:b\" xsi:nil=\"true\"/>"
              "<two xmlns=\"urn:b\"><three xmlns=\"urn:a\"><same></same><four xmlns=\"urn:b\"></four></three>"
              "<five xsi:type=\"type\" a:other=\"2\" own=\"1\"></five></two></one>");
}

TEST(xml_write, indentation_stops_at_ten_bytes)
{
    EXPECT_EQ(document(MODE_INDENT,
                       [](soap *ctx) {
                           ctx->xml_prolog = "";
                           soap_namespace_table_drop(ctx);
                           element(ctx, "r", [](soap *c) {
                               element(c, "e", [](soap *d) { soap_text_write(d, "t", 0); });
                               element(c, "f", [](soap *d) { element(d, "g"); });
                           });
                       }),
              "<r>\n\t<e>t</e>\n\t<f>\n\t\t<g></g>\n\t</f>\n</r>");
    const std::string deep = inside(MODE_INDENT, [](soap *ctx) {
        for (int i = 0; i < 12; ++i)
            soap_element_out_begin(ctx, "e", 0, nullptr);
    });
    const std::string full = "\n\t\t\t\t\t\t\t\t\t<e>";
    EXPECT_EQ(deep.substr(deep.size() - 3 * full.size()), full + full + full);
}

TEST(xml_write, table_attributes_come_in_reverse_order_of_setting)
{
    const auto write = [](soap *ctx) {
        for (const char *first : {"1", "2"}) {
            set_attributes(ctx,
                           {{"x", first}, {"x", "later"}, {"-no", "z"}, {"y", nullptr}}); // the first x stays
            EXPECT_EQ(soap_attr_set(ctx, "z", "<\xC3\xA9", 2), 0);
            element(ctx, "a:e", {}, 1, "xsd:int");
        }
        element(ctx, "a:plain");
    };
    EXPECT_EQ(inside(0, write),
              "<a:e id=\"_1\" xsi:type=\"xsd:int\" z=\"&lt;\xC3\xA9\" y x=\"1\"></a:e>"
              "<a:e id=\"_1\" xsi:type=\"xsd:int\" z=\"&lt;\xC3\xA9\" y x=\"2\"></a:e><a:plain></a:plain>");
}

TEST(xml_write, attribute_records_do_not_grow_with_ever_new_names)
{
    writer w;
    const std::string bytes = inside(w, [](soap *ctx) {
        std::int64_t held = 0;
        for (int i = 1000; i < 5000; ++i) {
            const std::string name = "xmlns:_" + std::to_string(i);
            soap_attr_set(ctx, name.c_str(), std::string(static_cast<std::size_t>(i % 300), 'v').c_str(), 1);
            element(ctx, "e");
            if (i == 3000) // each record has had values of all lengths
                held = ctx->memory_held;
        }
        EXPECT_LT(ctx->memory_held, held + held / 10);
    });
    EXPECT_NE(bytes.find("<e xmlns:_1001=\"" + std::string(101, 'v') + "\"></e>"), std::string::npos);
}

TEST(xml_write, a_wsu_id_is_shown_to_the_signer)
{
    writer w(MODE_WSU_ID);
    w.ctx->encoding_style = nullptr;
    const std::string bytes = inside(w, [](soap *ctx) {
        EXPECT_EQ(soap_body_out_begin(ctx), 0);
        EXPECT_STREQ(ctx->element_id, "Body");
        EXPECT_EQ(ctx->wsu_id_flag, 0);
        EXPECT_EQ(soap_attr_set(ctx, "wsu:Id", std::string(2000, 'i').c_str(), 1), 0);
        EXPECT_EQ(ctx->wsu_id_flag, 1);
        EXPECT_EQ(std::string(ctx->element_id).size(), SOAP_TEXT_SIZE - 1);
        element(ctx, "e");
    });
    EXPECT_EQ(bytes, "<SOAP-ENV:Body wsu:Id=\"Body\"><e wsu:Id=\"" + std::string(2000, 'i') + "\"></e>");
}

TEST(xml_write, null_values_are_left_out_or_nil)
{
    using text = const char *;
    static const std::tuple<text, text, int, std::int16_t, std::int16_t, std::uint32_t, text> cases[] = {
        {"nothing to say", "", 0, 1, 0, 0, nullptr},
        {"a position is said in SOAP 1.2 alone", "", -1, 1, 1, 0, nullptr},
        {"mode", "<e xsi:type=\"t\" xsi:nil=\"true\"/>", 0, 1, 0, MODE_NIL, nullptr},
        {"id", "<e id=\"_3\" xsi:type=\"t\" xsi:nil=\"true\"/>", 3, 1, 0, 0, nullptr},
        {"position", "<e xsi:type=\"t\" SOAP-ENC:position=\"[4]\" xsi:nil=\"true\"/>", 0, 2, 1, 0, nullptr},
        {"attribute", "<e xsi:type=\"t\" k=\"v\"/>", 0, 1, 0, 0, "k"},
    };
    for (const auto &[rule, bytes, id, version, positions, mode, attribute] : cases) {
        SCOPED_TRACE(rule);
        const auto write = [id = id, positions = positions, attribute = attribute, bytes = bytes](soap *ctx) {
            ctx->null_flag = 1;
            ctx->position_count = positions;
            ctx->positions[0] = 4;
            if (attribute)
                set_attributes(ctx, {{attribute, "v"}});
            EXPECT_EQ(soap_element_null(ctx, "e", id, "t"), 0);
            EXPECT_EQ(ctx->nesting_level, 0U);
            EXPECT_EQ(ctx->position_count, 0);
            EXPECT_EQ(ctx->null_flag, *bytes == '\0' ? 1 : 0);
        };
        EXPECT_EQ(inside(mode, write, version), bytes);
    }
}

TEST(xml_write, empty_elements_carry_one_attribute)
{
    const auto write = [](soap *ctx) {
        element(ctx, "-a:none"); // a dash is for no element
        EXPECT_EQ(soap_element_empty_nil(ctx, "-none"), 0);
        EXPECT_EQ(soap_element_empty_nil(ctx, "a:n"), 0);
        EXPECT_EQ(soap_element_href(ctx, "a:r", 0, 12), 0);
        EXPECT_EQ(soap_element_empty_attr(ctx, "a:x", 2, "href", "cid:<"), 0);
    };
    const std::string tail = "<a:x id=\"_2\" href=\"cid:&lt;\"/>";
    EXPECT_EQ(inside(0, write), "<a:n xsi:nil=\"true\"/><a:r href=\"#_12\"/>" + tail);
    EXPECT_EQ(inside(0, write, 2), "<a:n xsi:nil=\"true\"/><a:r SOAP-ENC:ref=\"_12\"/>" + tail);
}

TEST(xml_write, open_elements_stop_at_the_limit)
{
    const auto opened = [](std::uint32_t limit, std::uint32_t mode, std::uint32_t io) {
        writer w(mode);
        w.ctx->max_depth = limit;
        int count = 0;
        w.pass(io, start::inside, [&](soap *ctx) {
            while (count < 10000 && soap_element_out_begin(ctx, "e", 0, nullptr) == 0)
                ++count;
            EXPECT_EQ(ctx->error, limit != 0 ? SOAP_LENGTH : 0);
        });
        return count;
    };
    for (const std::uint32_t mode : {0U, MODE_INDENT})
        for (const std::uint32_t io : {MODE_BUFFERED, MODE_BUFFERED | MODE_COUNTING})
            EXPECT_EQ(opened(4, mode, io), 4);
    EXPECT_EQ(opened(0, 0, MODE_BUFFERED | MODE_COUNTING), 10000) << "no limit";
}

TEST(xml_write, short_ways_write_what_the_long_ways_do)
{
    const auto many = [](soap *ctx, const calls &write) {
        for (int i = 0; i < 4000; ++i) // past the end of the buffer
            write(ctx);
    };
    const auto by_short_ways = [](soap *ctx) {
        EXPECT_EQ(xml_open_plain(ctx, "a:list", 6), 0);
        EXPECT_EQ(xml_text_element_plain(ctx, "b:item", 6, "x<y", 3), 0);
        EXPECT_EQ(xml_close_plain(ctx, "a:list", 6), 0);
    };
    const auto by_long_ways = [](soap *ctx) {
        element(ctx, "a:list",
                [](soap *c) { element(c, "b:item", [](soap *d) { soap_text_write(d, "x<y", 0); }); });
    };
    for (const std::uint32_t mode : {0U, MODE_INDENT, MODE_DEFAULT_NAMESPACE, MODE_CANONICAL})
        EXPECT_EQ(document(mode, [&](soap *ctx) { many(ctx, by_short_ways); }),
                  document(mode, [&](soap *ctx) { many(ctx, by_long_ways); }));
}

TEST(xml_write, arrays_are_typed_by_version)
{
    const auto write = [](soap *ctx) {
        const int sizes[] = {2, 3};
        const int offsets[] = {1, 0};
        const std::string sized = soap_array_size_text(ctx, sizes, 2);
        EXPECT_EQ(sized, "[2,3]");
        const std::string type =
            soap_array_type_text(ctx, "xsd:int", sizes, ctx->soap_version == 1 ? offsets : nullptr, 2);
        EXPECT_EQ(soap_array_open(ctx, "a:l", 4, type.c_str(), "[1]"), 0);
        EXPECT_EQ(soap_element_out_end(ctx, "a:l"), 0);
        EXPECT_EQ(soap_array_open(ctx, "a:m", 0, "", nullptr), 0);
        EXPECT_EQ(soap_element_out_end(ctx, "a:m"), 0);
    };
    EXPECT_EQ(inside(0, write), "<a:l id=\"_4\" xsi:type=\"SOAP-ENC:Array\" SOAP-ENC:offset=\"[1]\""
                                " SOAP-ENC:arrayType=\"xsd:int[3,3]\"></a:l><a:m></a:m>");
    EXPECT_EQ(inside(0, write, 2), "<a:l id=\"_4\" xsi:type=\"SOAP-ENC:Array\" SOAP-ENC:itemType=\"xsd:int\""
                                   " SOAP-ENC:arraySize=\"2 3\"></a:l><a:m></a:m>");
}

TEST(xml_write, array_texts_never_pass_their_buffer)
{
    writer w;
    std::vector<int> sizes(500, -2147483647 - 1);
    EXPECT_LT(std::string(soap_array_size_text(w.ctx.get(), sizes.data(), 500)).size(), SOAP_TEXT_SIZE);
    const std::string type(2000, 't');
    EXPECT_LT(
        std::string(soap_array_type_text(w.ctx.get(), type.c_str(), sizes.data(), sizes.data(), 500)).size(),
        SOAP_TEXT_SIZE);
    EXPECT_STREQ(soap_array_type_text(w.ctx.get(), "t", sizes.data(), sizes.data(), 1), "t[-4294967296]");
    w.ctx->soap_version = 2;
    EXPECT_EQ(inside(w, [&](soap *ctx) { soap_array_open(ctx, "e", 0, (type + "[2").c_str(), nullptr); }),
              "<e xsi:type=\"SOAP-ENC:Array\">");
}

TEST(xml_write, the_result_name_is_for_encoded_soap_12)
{
    const auto write = [](soap *ctx) { EXPECT_EQ(soap_result_out(ctx, "a:return"), 0); };
    EXPECT_EQ(
        inside(0, write, 2),
        "<SOAP-RPC:result xmlns:SOAP-RPC=\"http://www.w3.org/2003/05/soap-rpc\">a:return</SOAP-RPC:result>");
    EXPECT_EQ(inside(0, write, 1), "");
    writer literal(0, 2);
    literal.ctx->encoding_style = nullptr;
    EXPECT_EQ(inside(literal, write), "");
}

TEST(xml_write, literal_content_is_not_escaped)
{
    std::string text = "<b>\xC3\xA9&amp;</b>";
    std::u32string wide = U"<b>\u00E9&amp;</b>";
    static const std::tuple<const char *, std::string, std::string> cases[] = {
        {"a:x", "<x xmlns=\"urn:a\">", "</x>"},
        {"q:x", "<x xmlns=\"\">", "</x>"},
        {"x", "<x>", "</x>"},
        {"-x", "", ""},
        {nullptr, "", ""},
    };
    for (const auto &[tag, before, after] : cases) {
        char *place = text.data(), *none = nullptr;
        char32_t *wide_place = wide.data();
        const char *const name = tag;
        const auto write = [&](char **content) {
            return inside(0, [&](soap *ctx) { soap_literal_write(ctx, name, content, nullptr); });
        };
        EXPECT_EQ(write(&place), before + text + after);
        EXPECT_EQ(write(&none), "");
        EXPECT_EQ(inside(0, [&](soap *ctx) { soap_wide_literal_write(ctx, name, &wide_place, nullptr); }),
                  before + text + after);
    }
}

TEST(xml_write, strings_are_elements_with_an_identity)
{
    char text[] = "a<b", empty[] = "";
    char32_t wide[] = U"\u00E9", *wide_place = wide;
    const auto write = [&](soap *ctx) {
        const std::tuple<char *, int, const char *> strings[] = {
            {text, 0, "xsd:string"}, {empty, 3, ""}, {nullptr, 0, ""}};
        for (const auto &[content, id, type] : strings) {
            char *place = content;
            EXPECT_EQ(soap_string_element_out(ctx, "a:s", id, &place, type, 5), 0);
        }
        EXPECT_EQ(soap_wide_string_element_out(ctx, "a:w", 0, &wide_place, "", 5), 0);
    };
    const std::string first = "<a:s xsi:type=\"xsd:string\">a&lt;b</a:s>", last = "<a:w>\xC3\xA9</a:w>";
    EXPECT_EQ(inside(0, write), first + "<a:s id=\"_3\"></a:s>" + last);
    EXPECT_EQ(inside(MODE_NULL_STRINGS, write), first + "<a:s id=\"_3\" xsi:nil=\"true\"/>" + last);
    EXPECT_EQ(inside(MODE_NIL, write), first + "<a:s id=\"_3\"></a:s><a:s xsi:nil=\"true\"/>" + last);
}

static void envelope(soap *ctx)
{
    EXPECT_EQ(soap_envelope_out_begin(ctx), 0);
    EXPECT_EQ(soap_body_out_begin(ctx), 0);
    EXPECT_EQ(ctx->message_part, PART_BODY);
    EXPECT_EQ(soap_body_out_end(ctx), 0);
    EXPECT_EQ(soap_envelope_out_end(ctx), 0);
    EXPECT_EQ(ctx->message_part, PART_AFTER_ENVELOPE);
    EXPECT_EQ(ctx->nesting_level, 0U);
}

TEST(xml_write, the_envelope_names_its_encoding_in_soap_11)
{
    const auto sent = [](const char *style, std::int16_t version) {
        writer w(0, version);
        w.ctx->encoding_style = style;
        return inside(w, envelope);
    };
    const std::string plain = "<SOAP-ENV:Envelope><SOAP-ENV:Body></SOAP-ENV:Body></SOAP-ENV:Envelope>\r\n";
    EXPECT_EQ(sent(nullptr, 1), plain);
    EXPECT_EQ(sent("urn:s", 1), "<SOAP-ENV:Envelope><SOAP-ENV:Body SOAP-ENV:encodingStyle=\"urn:s\">"
                                "</SOAP-ENV:Body></SOAP-ENV:Envelope>\r\n");
    EXPECT_EQ(sent("urn:s", 2), plain);
}

TEST(xml_write, the_part_head_names_what_the_part_is)
{
    static const std::tuple<std::uint32_t, std::int16_t, const char *> cases[] = {
        {MODE_MIME, 1, "text/xml; charset=utf-8"},
        {MODE_MIME, 2, "application/soap+xml; charset=utf-8"},
        {MODE_MIME | MODE_MTOM, 1, "application/xop+xml; charset=utf-8; type=\"text/xml\""},
        {MODE_MIME | MODE_MTOM, 2, "application/xop+xml; charset=utf-8; type=\"application/soap+xml\""},
    };
    std::string boundary = "==b==", start = "<s>", large(941, 'b'); // the last leaves no head at all
    for (const auto &[mode, version, type] : cases)
        for (std::string *chosen : {&boundary, &large}) {
            writer w(mode, version);
            w.ctx->encoding_style = nullptr;
            w.ctx->mime.boundary = chosen->data();
            w.ctx->mime.start = start.data();
            const std::string head = "--==b==\r\nContent-Type: " + std::string(type) +
                                     "\r\nContent-Transfer-Encoding: binary\r\nContent-ID: <s>\r\n\r\n";
            EXPECT_TRUE(
                inside(w, envelope).starts_with((chosen == &large ? "" : head) + "<SOAP-ENV:Envelope>"));
            w.ctx->mime = {};
        }
}

static void namespaces_where_used(soap *ctx)
{
    element(ctx, "SOAP-ENV:Envelope", [](soap *c) {
        element(c, "a:one", [](soap *d) {
            element(d, "b:two", [](soap *e) { soap_text_write(e, "\t\n\r<>&\"\xE9", 0); });
            element(d, "b:two");
            element(d, "a:three");
            element(d, "none");
        });
        element(c, "b:again");
    });
}

static void attributes_in_order(soap *ctx)
{
    element(ctx, "b:root", [](soap *c) {
        set_attributes(c, {{"z", "\t\n\r<>&\"'\xE9"}, {"b:a", "1"}, {"xsi:n", "2"}, {"a:z", "3"}});
        set_attributes(c, {{"a:b", "4"}, {"xml:lang", "en"}, {"b", "5"}});
        element(c, "a:e", [](soap *d) {
            set_attributes(d, {{"a:b", "6"}, {"SOAP-ENC:q", "7"}});
            element(d, "b:e");
        });
        set_attributes(c, {{"b", "8"}});
        EXPECT_EQ(soap_element_empty_nil(c, "a:nil"), 0);
        EXPECT_EQ(soap_element_href(c, "a:ref", 9, 1), 0);
    });
}

static void prefixes_redefined(soap *ctx)
{
    char raw[] = "<in xmlns:p=\"urn:p\" p:x=\"1\"></in>";
    char *place = raw;
    element(ctx, "a:root", [&](soap *c) {
        EXPECT_EQ(soap_literal_write(c, "b:literal", &place, nullptr), 0);
        EXPECT_EQ(soap_element_open(c, "a:e", 0, nullptr), 0);
        EXPECT_EQ(soap_attr_write(c, "xmlns:b", "urn:other"), 0);
        EXPECT_EQ(soap_attr_write(c, "b:x", "1"), 0);
        EXPECT_EQ(soap_element_attrs_close(c, nullptr), 0);
        EXPECT_EQ(soap_element_open(c, "b:inner", 0, nullptr), 0);
        EXPECT_EQ(soap_attr_write(c, "xmlns:b", "urn:other"), 0); // says what is known
        EXPECT_EQ(soap_element_attrs_close(c, nullptr), 0);
        EXPECT_EQ(soap_element_out_end(c, "b:inner"), 0);
        EXPECT_EQ(soap_element_out_end(c, "a:e"), 0);
        element(c, "b:outer");
        set_attributes(c, {{"xmlns:_1", "urn:generated"}, {"_1:x", "2"}});
        element(c, "a:generated");
    });
}

static void types_and_arrays(soap *ctx)
{
    element(ctx, "SOAP-ENV:Envelope", [](soap *c) {
        element(c, "a:typed", {}, 3, "xsd:int");
        EXPECT_EQ(soap_array_open(c, "a:list", 0, "b:item[2]", nullptr), 0);
        EXPECT_EQ(soap_element_out_end(c, "a:list"), 0);
        EXPECT_EQ(soap_prefix_use(c, "xsd:value"), 0); // before an element whose text is a name
        element(c, "a:name");
        element(c, "xsd:next");
        EXPECT_EQ(soap_result_out(c, "b:return"), 0);
    });
}

TEST(xml_write, canonical_output_is_what_canonicalisation_makes_of_the_plain_form)
{
    if (std::system("xmllint --version >/dev/null 2>&1") != 0)
        GTEST_SKIP() << "xmllint is not installed";
    static const std::tuple<const char *, void (*)(soap *), std::int16_t, bool> cases[] = {
        {"namespaces where used", namespaces_where_used, 1, true},
        {"attributes in order", attributes_in_order, 1, true},
        {"prefixes redefined", prefixes_redefined, 1, true},
        {"types and arrays", types_and_arrays, 1, false},
        {"arrays of 1.2", types_and_arrays, 2, false},
        {"envelope", envelope, 1, true},
    };
    // is_exclusive: names in values keep prefixes declared that the exclusive form drops
    for (const auto &[rule, write, version, is_exclusive] : cases) {
        SCOPED_TRACE(rule);
        std::string bytes = document(MODE_CANONICAL, write, version);
        if (bytes.ends_with("\r\n"))
            bytes.resize(bytes.size() - 2); // after the document element
        EXPECT_NE(bytes, "");
        EXPECT_EQ(bytes, canonical_form(bytes, "--c14n"));
        if (is_exclusive) {
            EXPECT_EQ(bytes, canonical_form(document(0, write, version), "--exc-c14n"));
        }
    }
}

TEST(xml_write, canonical_lists_include_and_exclude_prefixes)
{
    writer w(MODE_CANONICAL);
    const auto write = [](soap *ctx) { element(ctx, "a:r", [](soap *c) { element(c, "b:e"); }); };
    w.ctx->canonical_include = "xsi2 xsd\tb:"; // names whole prefixes
    EXPECT_EQ(written(w, start::document, write),
              "<a:r xmlns:a=\"urn:a\" xmlns:b=\"urn:b\""
              " xmlns:xsd=\"http://www.w3.org/2001/XMLSchema\"><b:e></b:e></a:r>");
    w.ctx->canonical_include = nullptr;
    w.ctx->canonical_exclude = " b: SOAP-ENV";
    EXPECT_EQ(written(w, start::document, write), "<a:r xmlns:a=\"urn:a\"><b:e></b:e></a:r>");
}
