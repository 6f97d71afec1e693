// xml_text_test.cpp - text of elements: the forms of strings, raw XML, wide strings, simple values.
#include "support/reader_input.h"

#include <zuv_client_pro/soap_error.h>

#include "codec/tag_view.h"
#include "codec/xml_text.h"

using reader_input::every_reading;
using reader_input::reception;

namespace {

std::string failure(const soap *ctx)
{
    return "error " + std::to_string(ctx->error);
}

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

struct text_case {
    const char *rule;
    std::string body;
    std::string expected;
};

TEST(XmlText, references_and_sections_become_characters)
{
    const text_case cases[] = {
        {"plain", "some text", "some text"},
        {"empty", "", ""},
        {"blanks stay", " \n x \t", " \n x \t"},
        {"quotes and brackets", "a\"b'c>d/>e/", "a\"b'c>d/>e/"},
        {"references", "&lt;x&gt; &amp;amp; &quot;&apos;&#65;", "<x> &amp; \"'A"},
        {"section", "a<![CDATA[<b>&amp;]]]]>c", "a<b>&amp;]]c"},
        {"comment and instruction", "a<!--x--><?y z?>b", "ab"},
        {"Latin-1 comes out as one byte", "\xC3\xA9\xC3\xBF&#233;", "\xE9\xFF\xE9"},
        {"what has no byte is marked", "\xE2\x82\xAC&#8364;\xC4\x80|", "???|"},
        {"no zero from an overlong form", "a\xC0\x80z", "a?z"},
        {"long", std::string(3000, 'x') + "&amp;" + std::string(3000, 'y'),
         std::string(3000, 'x') + "&" + std::string(3000, 'y')},
    };
    for (const text_case &c : cases) {
        SCOPED_TRACE(c.rule);
        if (c.body.size() < 100) {
            EXPECT_EQ(string_text(c.body, 0, 1), c.expected);
            continue;
        }
        reception in("<a>" + c.body + "</a>", 4000, 7);
        soap_element_in_begin(in.context(), "a", 1, nullptr);
        EXPECT_EQ(soap_string_read(in.context(), 1, -1, -1), c.expected);
    }
}

TEST(XmlText, no_text_holds_a_zero_byte)
{
    EXPECT_EQ(every_reading(std::string("<a>x\0<b\0/>y</a>", 15), 0,
                            [](soap *ctx) {
                                soap_element_in_begin(ctx, "a", 1, nullptr);
                                std::size_t length = 0;
                                const char *text = soap_text_read(ctx, &length);
                                return std::string(text, length);
                            }),
              "x?<b?/>y");
}

TEST(XmlText, utf8_strings_keep_their_bytes)
{
    EXPECT_EQ(string_text("\xE2\x82\xAC\xC3\xA9", MODE_UTF_STRINGS, 1), "\xE2\x82\xAC\xC3\xA9");
    EXPECT_EQ(string_text("&#8364;&#x1F600;&#65;&#233;", MODE_UTF_STRINGS, 1), "\xE2\x82\xAC\xF0\x9F\x98\x80"
                                                                               "A\xC3\xA9");
    EXPECT_EQ(string_text("\xC3\xA9", MODE_LATIN1, 1), "\xC3\xA9");
}

TEST(XmlText, nested_elements_are_part_of_the_text)
{
    const text_case cases[] = {
        {"nested", "x<b c=\"1\">y</b>z", "x<b c=\"1\">y</b>z"},
        {"same name", "<a>1<a>2</a></a>", "<a>1<a>2</a></a>"},
        {"empty ones", "<b/>x<c d='/'/>y", "<b/>x<c d='/'/>y"},
        {"bracket in a value", "<b c=\"/>\">x</b>", "<b c=\"/>\">x</b>"},
        {"slash and bracket in text", "<b>x/></b>/>", "<b>x/></b>/>"},
    };
    for (const text_case &c : cases) {
        SCOPED_TRACE(c.rule);
        EXPECT_EQ(string_text(c.body, 0, 1), c.expected);
        EXPECT_EQ(string_text(c.body, 0, 0), c.expected);
        EXPECT_EQ(string_text("&#32;" + c.body, 0, 1), " " + c.expected);
    }
}

TEST(XmlText, raw_xml_is_copied_as_it_stands)
{
    const text_case cases[] = {
        {"references stay", "&lt;&#65;&unknown;", "&lt;&#65;&unknown;"},
        {"section", "a<![CDATA[</a>&]]]>b", "a<![CDATA[</a>&]]]>b"},
        {"section by another name", "<![XYZ[<b]]>", "<![CDATA[<b]]>"},
        {"comment", "a<!-- </a> - -->b<!---->", "a<!-- </a> - -->b<!---->"},
        {"instruction", "<?p </a> ?a?\?>b", "<?p </a> ?a?\?>b"},
        {"declaration", "<!x>y<!-z>", "<!x>y<!-z>"},
        {"decoded", "\xC3\xA9\xE2\x82\xAC", "\xE9?"},
        {"not decoded in a section", "<![CDATA[\xC3\xA9]]>", "<![CDATA[\xC3\xA9]]>"},
        {"quoted bracket", "<b c='<'>x</b>", "<b c='<'>x</b>"},
    };
    for (const text_case &c : cases) {
        SCOPED_TRACE(c.rule);
        EXPECT_EQ(string_text(c.body, 0, 0), c.expected);
    }
    EXPECT_EQ(string_text("\xC3\xA9", MODE_UTF_STRINGS, 0), "\xC3\xA9");
}

TEST(XmlText, length_is_bounded_in_characters)
{
    EXPECT_EQ(string_text("abc", 0, 1, 3, 3), "abc");
    EXPECT_EQ(string_text("abc", 0, 1, 4, -1), "error 45");
    EXPECT_EQ(string_text("abc", 0, 1, -1, 2), "error 45");
    EXPECT_EQ(string_text("a&lt;c", 0, 1, 3, 3), "a<c");
    EXPECT_EQ(string_text("a&lt;c", 0, 1, -1, 2), "error 45");
    EXPECT_EQ(string_text("", 0, 1, 1, -1), "error 45");
    EXPECT_EQ(string_text("\xC3\xA9\xC3\xA9", MODE_UTF_STRINGS, 1, 2, 2), "\xC3\xA9\xC3\xA9");
    EXPECT_EQ(string_text("<b/>", 0, 0, -1, 3), "error 45");
}

TEST(XmlText, a_held_tag_begins_the_text)
{
    const auto any = [](soap *ctx) -> std::string {
        soap_element_in_begin(ctx, "a", 1, nullptr);
        std::string texts;
        for (char *text = nullptr; soap_raw_element_in(ctx, "-any", &text) != nullptr;)
            texts += std::string(text) + "|";
        texts += failure(ctx);
        return soap_element_in_end(ctx, "a") == 0 ? texts : "end " + failure(ctx);
    };
    const text_case cases[] = {
        {"one after the other", "<a><b x=\"1\">t<c/></b> <d/><e>&lt;</e></a>",
         "<b x=\"1\">t<c/></b> |<d/>|<e>&lt;</e>|error 6"},
        {"text around", "<a>t<b/></a>", "t<b/>|error 6"},
        {"only a section", "<a><![CDATA[<x>]]y]]></a>", "<![CDATA[<x>]]y]]>|error 6"},
        {"section of brackets", "<a><![CDATA[]]]]></a>", "<![CDATA[]]]]>|error 6"},
        {"a reference stays one", "<a>&lt;x&#62;</a>", "&lt;x&#62;|error 6"},
        {"nothing", "<a></a>", "error 6"},
    };
    for (const text_case &c : cases) {
        SCOPED_TRACE(c.rule);
        EXPECT_EQ(every_reading(c.body, 0, any), c.expected);
    }
    reception in("<a><b " + std::string(1100, 'n') + "/></a>");
    soap_element_in_begin(in.context(), "a", 1, nullptr);
    char *text = nullptr;
    ASSERT_NE(soap_raw_element_in(in.context(), "-any", &text), nullptr);
    EXPECT_EQ(std::string(text), "<b " + std::string(1018, 'n') + "/>");
}

TEST(XmlText, simple_values_are_trimmed_and_bounded)
{
    const auto simple = [](const std::string &body, std::uint32_t mode = 0) {
        return element_text(body, mode, soap_simple_value_read);
    };
    EXPECT_EQ(simple(" \n 42\t"), "42");
    EXPECT_EQ(simple(" a &amp; 'b' \"c\" > "), "a & 'b' \"c\" >");
    EXPECT_EQ(simple("4<b>2</b>"), "4");
    EXPECT_EQ(simple("<![CDATA[ x ]]>"), "x");
    EXPECT_EQ(simple("\xC3\xA9"), "\xE9");
    EXPECT_EQ(simple("&#233;", MODE_UTF_STRINGS), "\xC3\xA9");

    for (const char *prefix : {"", "&#120;"}) { // text in place, and token by token
        reception in("<a>" + (prefix + std::string(1023, 'x')) + "</a>");
        soap_element_in_begin(in.context(), "a", 1, nullptr);
        EXPECT_EQ(std::strlen(soap_simple_value_read(in.context())), 1023u);
        EXPECT_EQ(soap_element_in_end(in.context(), "a"), 0);
        reception strict("<a>" + (prefix + std::string(1024, 'x')) + "</a>", SOAP_BUFFER_SIZE, 1,
                         MODE_STRICT);
        soap_element_in_begin(strict.context(), "a", 1, nullptr);
        EXPECT_EQ(soap_simple_value_read(strict.context()), nullptr);
        EXPECT_EQ(strict.context()->error, SOAP_LENGTH);
    }
    reception empty("<a/>");
    soap_element_in_begin(empty.context(), "a", 1, nullptr);
    EXPECT_STREQ(soap_simple_value_read(empty.context()), "");
}

TEST(XmlText, wide_strings_hold_code_points)
{
    const auto wide = [](const std::string &body, int form) {
        return every_reading("<a>" + body + "</a>", 0, [form](soap *ctx) {
            soap_element_in_begin(ctx, "a", 1, nullptr);
            const char32_t *text = soap_wide_string_read(ctx, form, -1, -1);
            std::string result;
            for (; text != nullptr && *text != 0; ++text)
                result +=
                    *text < 128 ? std::string(1, static_cast<char>(*text)) : "#" + std::to_string(*text);
            return soap_element_in_end(ctx, "a") == 0 ? result : failure(ctx);
        });
    };
    EXPECT_EQ(wide("a\xC3\xA9\xE2\x82\xAC&#x1F600;&lt;", 1), "a#233#8364#128512<");
    EXPECT_EQ(wide("<b c=\"1\">x</b><![CDATA[<&>\"]]>", 1), "<b c=\"1\">x</b><&>\"");
    EXPECT_EQ(wide("<b c=\"1\">&amp;&lt;</b><![CDATA[<&>\"]]>", 0),
              "<b c=\"1\">&amp;&lt;</b>&lt;&amp;&gt;&quot;");
    EXPECT_EQ(wide("", 1), "");

    for (const std::size_t length : {255u, 256u, 257u, 5000u}) {
        reception in("<a>" + std::string(length, 'x') + "</a>");
        soap_element_in_begin(in.context(), "a", 1, nullptr);
        const char32_t *text =
            soap_wide_string_read(in.context(), 1, static_cast<long>(length), static_cast<long>(length));
        ASSERT_NE(text, nullptr);
        EXPECT_EQ(std::u32string(text), std::u32string(length, U'x'));
        EXPECT_EQ(in.context()->block_stack, nullptr);
        for (const long bound : {-1L, 1L}) { // one too many for the minimum, then for the maximum
            reception out("<a>" + std::string(length, 'x') + "</a>");
            soap_element_in_begin(out.context(), "a", 1, nullptr);
            EXPECT_EQ(bound < 0 ? soap_wide_string_read(out.context(), 1, static_cast<long>(length) + 1, -1)
                                : soap_wide_string_read(out.context(), 1, -1, static_cast<long>(length) - 1),
                      nullptr);
            EXPECT_EQ(out.context()->error, SOAP_LENGTH);
            EXPECT_EQ(out.context()->block_stack, nullptr);
        }
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
        {"<s/>", "s", 1, "error 45"},
        {"<s></s>", "s", 1, "error 45"},
        {"<t/>", "s", -1, "error 3"},
        {"<s xmlns:i='http://www.w3.org/2001/XMLSchema-instance' i:nil='1'></s>", "s", 1, "null"},
        {"<s xmlns:i='http://www.w3.org/2001/XMLSchema-instance' i:nil='true'/>", "s", -1, "null"},
        {"<s xmlns:i='http://www.w3.org/2001/XMLSchema-instance' i:nil='false'>x</s>", "s", -1, "x"},
        {"text</o>", "-s", -1, "text"},
        {"</o>", "-s", -1, "error 6"},
        {"</o>", "s", -1, "error 6"},
    };
    for (const auto &c : cases) {
        SCOPED_TRACE(c.document);
        const auto read = [&c](soap *ctx) {
            char **place = soap_string_element_in(ctx, c.tag, nullptr, nullptr, 4, 1, c.minimum, -1);
            return place == nullptr ? failure(ctx) : std::string(*place == nullptr ? "null" : *place);
        };
        EXPECT_EQ(every_reading(c.document, 0, read), c.expected);
        EXPECT_EQ(every_reading(c.document, 0,
                                [&c](soap *ctx) {
                                    char32_t **place = soap_wide_string_element_in(
                                        ctx, c.tag, nullptr, nullptr, 4, 1, c.minimum, -1);
                                    if (place == nullptr)
                                        return failure(ctx);
                                    const std::u32string text(*place == nullptr ? U"null" : *place);
                                    return std::string(text.begin(), text.end());
                                }),
                  c.expected);
    }
}

TEST(XmlText, raw_elements_give_their_content)
{
    const auto raw = [](soap *ctx) {
        char *text = nullptr;
        if (soap_raw_element_in(ctx, "r", &text) == nullptr)
            return failure(ctx);
        char32_t *wide = nullptr;
        const bool more = soap_wide_raw_element_in(ctx, "w", &wide) != nullptr;
        const std::u32string second(more && wide != nullptr ? wide : U"none");
        return (text == nullptr ? "null" : std::string(text)) + "|" +
               std::string(second.begin(), second.end());
    };
    EXPECT_EQ(every_reading("<r><b>&lt;</b></r><w>x<c/></w>", 0, raw), "<b>&lt;</b>|x<c/>");
    EXPECT_EQ(every_reading("<r/><w/>", 0, raw), "|");
    EXPECT_EQ(every_reading("<q/>", 0, raw), "error 3");
    EXPECT_EQ(every_reading("</x>", 0, raw), "error 6");
}

TEST(XmlText, in_place_text_is_only_what_needs_no_work)
{
    const struct {
        const char *body;
        std::uint32_t mode;
        bool in_place;
    } cases[] = {
        {"plain > \"text\" ]]", 0, true},
        {"", 0, true},
        {"a text of more than sixteen bytes, so that vectors count", 0, true},
        {"a&lt;", 0, false},
        {"a text of more than sixteen bytes, then &lt;", 0, false},
        {"a<b/>", 0, false},
        {"a<!-- -->", 0, false},
        {"\xC3\xA9", 0, false},
        {"\xC3\xA9", MODE_UTF_STRINGS, true},
        {"\xC3\xA9", MODE_LATIN1, true},
    };
    for (const auto &c : cases) {
        SCOPED_TRACE(c.body);
        reception in("<a>" + std::string(c.body) + "</a>", SOAP_BUFFER_SIZE, SOAP_BUFFER_SIZE, c.mode);
        soap_element_in_begin(in.context(), "a", 1, nullptr);
        const char *text = nullptr;
        std::size_t length = 0;
        EXPECT_EQ(xml_text_in_place(in.context(), &text, &length), c.in_place);
        if (c.in_place) {
            EXPECT_EQ(std::string_view(text, length), c.body);
            EXPECT_FALSE(std::strcmp(text + length, "</a>") > 0 && text[length] != '<');
        }
        EXPECT_EQ(soap_element_in_end(in.context(), "a"), 0);
    }
    reception cut("<a>text</a>", 8);
    soap_element_in_begin(cut.context(), "a", 1, nullptr);
    const char *text = nullptr;
    std::size_t length = 0;
    EXPECT_FALSE(xml_text_in_place(cut.context(), &text, &length));
    ASSERT_NE(text = soap_text_read(cut.context(), &length), nullptr);
    EXPECT_EQ(std::string_view(text, length), "text");
    EXPECT_EQ(text[length], '\0');
}

// What a reading that begins with the held tag of the first child of <r> leaves behind.
std::string state(soap *ctx, std::string_view text)
{
    std::string seen = std::string(text) + "; level " + std::to_string(ctx->nesting_level) + ", error " +
                       std::to_string(ctx->error) + ", next ";
    return seen + (soap_element_head_read(ctx) == 0 ? ctx->tag : "none");
}

TEST(XmlText, a_leaf_in_place_is_read_as_step_by_step)
{
    const struct {
        const char *element;
        std::uint32_t mode;
        bool in_place;
    } cases[] = {
        {"<a>text</a>", 0, true},
        {"<a></a>", 0, true},
        {"<p:name_of_more_than_sixteen>text</p:name_of_more_than_sixteen>", 0, true},
        {"<a>\xC3\xA9</a>", MODE_UTF_STRINGS, true},
        {"<a>\xC3\xA9</a>", 0, false},
        {"<a>text</a>", MODE_STRICT, false},
        {"<a>text</a >", 0, false},
        {"<a>text</ab>", 0, false},
        {"<a>t&amp;t</a>", 0, false},
        {"<a>t<!-- -->t</a>", 0, false},
        {"<a b='c'>text</a>", 0, false},
        {"<a/>", 0, false},
    };
    for (const auto &c : cases) {
        SCOPED_TRACE(c.element);
        const std::string document = "<r>" + std::string(c.element) + "<next/></r>";
        reception quick(document, SOAP_BUFFER_SIZE, SOAP_BUFFER_SIZE, c.mode);
        soap *const ctx = quick.context();
        soap_element_in_begin(ctx, nullptr, 1, nullptr);
        std::string_view text = "none";
        EXPECT_FALSE(xml_leaf_in_place(ctx, &text)) << "nothing is held";
        soap_element_head_read(ctx);
        EXPECT_EQ(xml_leaf_in_place(ctx, &text), c.in_place);
        if (!c.in_place) {
            EXPECT_EQ(text, "none");
            EXPECT_EQ(soap_element_in_begin(ctx, nullptr, 1, nullptr), 0) << "the tag is still held";
            continue;
        }
        reception steps(document, 1, 1, c.mode);
        soap *const slow = steps.context();
        soap_element_in_begin(slow, nullptr, 1, nullptr);
        soap_element_in_begin(slow, nullptr, 1, nullptr);
        std::size_t length = 0;
        const char *const read = soap_text_read(slow, &length);
        ASSERT_NE(read, nullptr);
        const std::string expected(read, length);
        ASSERT_EQ(soap_element_in_end(slow, nullptr), 0);
        EXPECT_EQ(state(ctx, text), state(slow, expected));
    }
    reception deep("<r><a>text</a></r>");
    deep.context()->max_depth = 1;
    soap_element_in_begin(deep.context(), nullptr, 1, nullptr);
    soap_element_head_read(deep.context());
    std::string_view text;
    EXPECT_FALSE(xml_leaf_in_place(deep.context(), &text)) << "too deep";
}

} // namespace
