// xml_text_test.cpp - text of elements: the forms of strings, raw XML, wide strings, simple values.
#include "support/reader_input.h"

#include <zuv_client_pro/soap_error.h>

#include "codec/tag_view.h"
#include "codec/xml_text.h"

using namespace reader_input;

namespace {

constexpr int RAW = 0, CHARACTERS = 1; // forms of strings

// The element "a" around a body, read by `read`, which gives its text or null; then the rest of the document.
template <class Read> std::string element_text(const std::string &body, std::uint32_t mode, Read read)
{
    return every_reading("<a>" + body + "</a><z/>", mode, [&](soap *ctx) {
        if (soap_element_in_begin(ctx, "a", 1, nullptr) != 0)
            return failure(ctx);
        const char *text = read(ctx);
        if (text == nullptr)
            return failure(ctx);
        const std::string result = text;
        if (soap_element_in_end(ctx, "a") != 0 || soap_element_in_begin(ctx, "z", 1, nullptr) != 0)
            return "after " + result + " " + failure(ctx);
        EXPECT_EQ(ctx->nesting_level, 0u);
        return result;
    });
}

std::string string_text(const std::string &body, std::uint32_t mode, int form, long minimum = -1,
                        long maximum = -1)
{
    return element_text(body, mode, [&](soap *ctx) { return soap_string_read(ctx, form, minimum, maximum); });
}

std::string narrow(const char32_t *text)
{
    std::string result;
    for (; *text != 0; ++text)
        result += *text < 128 ? std::string(1, static_cast<char>(*text)) : "#" + std::to_string(*text);
    return result;
}

TEST(XmlText, strings_hold_characters_and_nested_elements)
{
    const reading bodies[] = {
        {"empty", "", ""},
        {"blanks stay", " \n x \t", " \n x \t"},
        {"quotes and brackets", "a\"b'c>d/>e/", "a\"b'c>d/>e/"},
        {"references", "&lt;x&gt; &amp;amp; &quot;&apos;&#65;", "<x> &amp; \"'A"},
        {"section", "a<![CDATA[<b>&amp;]]]]>c", "a<b>&amp;]]c"},
        {"comment and instruction", "a<!--x--><?y z?>b", "ab"},
        {"Latin-1 comes out as one byte", "\xC3\xA9\xC3\xBF&#233;", "\xE9\xFF\xE9"},
        {"what has no byte is marked", "\xE2\x82\xAC&#8364;\xC4\x80|", "???|"},
        {"no zero from an overlong form", "a\xC0\x80z", "a?z"},
        {"no zero byte", std::string("x\0<b\0/>y", 8), "x?<b?/>y"},
        {"UTF-8", "\xE2\x82\xAC\xC3\xA9", "\xE2\x82\xAC\xC3\xA9", MODE_UTF_STRINGS},
        {"references in UTF-8", "&#8364;&#x1F600;&#65;", "\xE2\x82\xAC\xF0\x9F\x98\x80\x41",
         MODE_UTF_STRINGS},
        {"Latin-1 on input", "\xC3\xA9", "\xC3\xA9", MODE_LATIN1},
    };
    for (const reading &body : bodies)
        EXPECT_EQ(string_text(body.document, body.mode, CHARACTERS), body.expected) << body.rule;

    for (const std::string body : {"x<b c=\"1\">y</b>z", "<a>1<a>2</a></a>", "<b/>x<c d='/'/>y",
                                   "<b c=\"/>\">x</b>", "<b>x/></b>/>"}) {
        EXPECT_EQ(string_text(body, 0, CHARACTERS), body);
        EXPECT_EQ(string_text(body, 0, RAW), body);
        EXPECT_EQ(string_text("&#32;" + body, 0, CHARACTERS), " " + body);
    }

    const std::string half(3000, 'x');
    reception in("<a>" + half + "&amp;" + half + "</a>", 4000, 7);
    EXPECT_EQ(soap_string_read(in.in_root(), CHARACTERS, -1, -1), half + "&" + half);
}

TEST(XmlText, raw_xml_is_copied_as_it_stands)
{
    const reading bodies[] = {
        {"references stay", "&lt;&#65;&unknown;", "&lt;&#65;&unknown;"},
        {"section", "a<![CDATA[</a>&]]]>b", "a<![CDATA[</a>&]]]>b"},
        {"section by another name", "<![XYZ[<b]]>", "<![CDATA[<b]]>"},
        {"comment", "a<!-- </a> - -->b<!---->", "a<!-- </a> - -->b<!---->"},
        {"instruction", "<?p </a> ?a?\?>b", "<?p </a> ?a?\?>b"},
        {"declaration", "<!x>y<!-z>", "<!x>y<!-z>"},
        {"decoded", "\xC3\xA9\xE2\x82\xAC", "\xE9?"},
        {"not decoded in a section", "<![CDATA[\xC3\xA9]]>", "<![CDATA[\xC3\xA9]]>"},
        {"quoted bracket", "<b c='<'>x</b>", "<b c='<'>x</b>"},
        {"not decoded", "\xC3\xA9", "\xC3\xA9", MODE_UTF_STRINGS},
    };
    for (const reading &body : bodies)
        EXPECT_EQ(string_text(body.document, body.mode, RAW), body.expected) << body.rule;
}

TEST(XmlText, length_is_bounded_in_characters)
{
    EXPECT_EQ(string_text("abc", 0, CHARACTERS, 3, 3), "abc");
    EXPECT_EQ(string_text("abc", 0, CHARACTERS, 4, -1), "!45");
    EXPECT_EQ(string_text("abc", 0, CHARACTERS, -1, 2), "!45");
    EXPECT_EQ(string_text("a&lt;c", 0, CHARACTERS, 3, 3), "a<c");
    EXPECT_EQ(string_text("a&lt;c", 0, CHARACTERS, -1, 2), "!45");
    EXPECT_EQ(string_text("", 0, CHARACTERS, 1, -1), "!45");
    EXPECT_EQ(string_text("\xC3\xA9\xC3\xA9", MODE_UTF_STRINGS, CHARACTERS, 2, 2), "\xC3\xA9\xC3\xA9");
    EXPECT_EQ(string_text("<b/>", 0, RAW, -1, 3), "!45");
}

TEST(XmlText, a_held_tag_begins_the_text)
{
    const reading rows[] = {
        {"one after the other", "<a><b x=\"1\">t<c/></b> <d/><e>&lt;</e></a>",
         "<b x=\"1\">t<c/></b> |<d/>|<e>&lt;</e>|!6"},
        {"text around", "<a>t<b/></a>", "t<b/>|!6"},
        {"only a section", "<a><![CDATA[<x>]]y]]></a>", "<![CDATA[<x>]]y]]>|!6"},
        {"section of brackets", "<a><![CDATA[]]]]></a>", "<![CDATA[]]]]>|!6"},
        {"a reference stays one", "<a>&lt;x&#62;</a>", "&lt;x&#62;|!6"},
        {"nothing", "<a></a>", "!6"},
    };
    expect_readings(rows, [](soap *ctx) {
        soap_element_in_begin(ctx, "a", 1, nullptr);
        std::string texts;
        for (char *text = nullptr; soap_raw_element_in(ctx, "-any", &text) != nullptr;)
            texts += std::string(text) + "|";
        texts += failure(ctx);
        return soap_element_in_end(ctx, "a") == 0 ? texts : "end " + failure(ctx);
    });
    reception in("<a><b " + std::string(1100, 'n') + "/></a>");
    char *text = nullptr;
    ASSERT_NE(soap_raw_element_in(in.in_root(), "-any", &text), nullptr);
    EXPECT_EQ(std::string(text), "<b " + std::string(1018, 'n') + "/>");
}

TEST(XmlText, simple_values_are_trimmed_and_bounded)
{
    const reading bodies[] = {
        {"blanks", " \n 42\t", "42"},
        {"only blanks", " \n", ""},
        {"blanks within", " a &amp; 'b' \"c\" > ", "a & 'b' \"c\" >"},
        {"up to a child", "4<b>2</b>", "4"},
        {"section", "<![CDATA[ x ]]>", "x"},
        {"Latin-1", "\xC3\xA9", "\xE9"},
        {"UTF-8", "&#233;", "\xC3\xA9", MODE_UTF_STRINGS},
    };
    for (const reading &body : bodies)
        EXPECT_EQ(element_text(body.document, body.mode, soap_simple_value_read), body.expected) << body.rule;

    for (const char *prefix : {"", "&#120;"}) { // text in place, and token by token
        reception in("<a>" + (prefix + std::string(1023, 'x')) + "</a>");
        EXPECT_EQ(std::strlen(soap_simple_value_read(in.in_root())), 1023u);
        EXPECT_EQ(soap_element_in_end(in, "a"), 0);
        reception strict("<a>" + (prefix + std::string(1024, 'x')) + "</a>", SOAP_BUFFER_SIZE, 1,
                         MODE_STRICT);
        EXPECT_EQ(soap_simple_value_read(strict.in_root()), nullptr);
        EXPECT_EQ(strict->error, SOAP_LENGTH);
    }
    reception empty("<a/>");
    EXPECT_STREQ(soap_simple_value_read(empty.in_root()), "");
}

TEST(XmlText, wide_strings_hold_code_points)
{
    const struct {
        const char *body;
        int form;
        const char *text;
    } cases[] = {
        {"a\xC3\xA9\xE2\x82\xAC&#x1F600;&lt;", CHARACTERS, "a#233#8364#128512<"},
        {"<b c=\"1\">x</b><![CDATA[<&>\"]]>", CHARACTERS, "<b c=\"1\">x</b><&>\""},
        {"<b c=\"1\">&amp;&lt;</b><![CDATA[<&>\"]]>", RAW, "<b c=\"1\">&amp;&lt;</b>&lt;&amp;&gt;&quot;"},
        {"", CHARACTERS, ""},
    };
    for (const auto &c : cases) {
        const reading row[] = {{c.body, "<a>" + std::string(c.body) + "</a>", c.text}};
        expect_readings(row, [&c](soap *ctx) {
            soap_element_in_begin(ctx, "a", 1, nullptr);
            const char32_t *text = soap_wide_string_read(ctx, c.form, -1, -1);
            const std::string result = text != nullptr ? narrow(text) : failure(ctx);
            return soap_element_in_end(ctx, "a") == 0 ? result : failure(ctx);
        });
    }
    for (const long length : {255L, 256L, 257L, 5000L}) {
        const std::string characters(static_cast<std::size_t>(length), 'x');
        const auto read = [&](long minimum, long maximum) -> std::string {
            reception in("<a>" + characters + "</a>");
            const char32_t *text = soap_wide_string_read(in.in_root(), CHARACTERS, minimum, maximum);
            EXPECT_EQ(in->block_stack, nullptr);
            return text != nullptr ? narrow(text) : failure(in);
        };
        EXPECT_EQ(read(length, length), characters);
        EXPECT_EQ(read(length + 1, -1), "!45");
        EXPECT_EQ(read(-1, length - 1), "!45");
    }
}

TEST(XmlText, string_elements_tell_absent_nil_and_empty_apart)
{
    const struct {
        const char *document;
        const char *tag;
        long minimum;
        const char *expected;
    } cases[] = {
        {"<s>text</s>", "s", -1, "text"},
        {"<s/>", "s", -1, ""},
        {"<s></s>", "s", -1, ""},
        {"<s/>", "s", 1, "!45"},
        {"<s></s>", "s", 1, "!45"},
        {"<t/>", "s", -1, "!3"},
        {"<s xmlns:i='http://www.w3.org/2001/XMLSchema-instance' i:nil='1'></s>", "s", 1, "null"},
        {"<s xmlns:i='http://www.w3.org/2001/XMLSchema-instance' i:nil='false'>x</s>", "s", -1, "x"},
        {"text</o>", "-s", -1, "text"},
        {"</o>", "-s", -1, "!6"},
        {"</o>", "s", -1, "!6"},
    };
    for (const auto &c : cases) {
        const reading row[] = {{c.document, c.document, c.expected}};
        expect_readings(row, [&c](soap *ctx) {
            char **place = soap_string_element_in(ctx, c.tag, nullptr, nullptr, 4, 1, c.minimum, -1);
            return place == nullptr ? failure(ctx) : std::string(*place == nullptr ? "null" : *place);
        });
        expect_readings(row, [&c](soap *ctx) {
            char32_t **place = soap_wide_string_element_in(ctx, c.tag, nullptr, nullptr, 4, 1, c.minimum, -1);
            return place == nullptr ? failure(ctx) : narrow(*place == nullptr ? U"null" : *place);
        });
    }
}

TEST(XmlText, raw_elements_give_their_content)
{
    const reading rows[] = {
        {"content", "<r><b>&lt;</b></r><w>x<c/></w>", "<b>&lt;</b>|x<c/>"},
        {"empty", "<r/><w/>", "|"},
        {"another element", "<q/>", "!3"},
        {"none", "</x>", "!6"},
    };
    expect_readings(rows, [](soap *ctx) {
        char *text = nullptr;
        if (soap_raw_element_in(ctx, "r", &text) == nullptr)
            return failure(ctx);
        char32_t *wide = nullptr;
        const bool more = soap_wide_raw_element_in(ctx, "w", &wide) != nullptr;
        return (text == nullptr ? "null" : std::string(text)) + "|" +
               narrow(more && wide != nullptr ? wide : U"none");
    });
}

TEST(XmlText, a_leaf_in_place_counts_as_an_open_element_and_is_for_lenient_reading)
{
    const struct {
        std::uint32_t max_depth, mode;
        const char *text;
    } cases[] = {{1, 0, ""}, {2, 0, "text"}, {2, MODE_STRICT, ""}};
    for (const auto &c : cases) {
        reception in("<r><a>text</a></r>", SOAP_BUFFER_SIZE, SOAP_BUFFER_SIZE, c.mode);
        in->max_depth = c.max_depth;
        std::string_view text;
        EXPECT_FALSE(xml_leaf_in_place(in.in_root(), &text)) << "nothing is held";
        soap_element_head_read(in);
        EXPECT_EQ(xml_leaf_in_place(in, &text), *c.text != '\0');
        EXPECT_EQ(text, c.text);
    }
}

} // namespace
