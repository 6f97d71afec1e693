// xml_text_test.cpp - text of elements: the forms of strings, raw XML, wide strings, simple values.
#include "support/reader_input.h"
#include "xml/tag_view.h"
#include "xml/xml_text.h"

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

TEST(xml_text, strings_hold_characters_and_nested_elements)
{
    const reading bodies[] = {
        {"empty", "", ""},
        {"blanks stay", " \n x \t", " \n x \t"},
        {"quotes and brackets", "a\"b'c>d/>e/", "a\"b'c>d/>e/"},
        {"references", "&lt;x&gt; &amp;amp; &quot;&apos;&#65;", "<x> &amp; \"'A"},
        {"section", "a<![CDATA[<b>&amp;]]]]>c", "a<b>&amp;]]c"},
        {"comment and instruction", "a<!--x--><?y z?>b", "ab"},
        {"references of Latin-1", "&#8364;&#233;|", "?\xE9|"},
        {"references in UTF-8", "&#8364;&#x1F600;&#65;", "\xE2\x82\xAC\xF0\x9F\x98\x80\x41",
         MODE_UTF_STRINGS},
        {"no zero byte", std::string("x\0<b\0/>y", 8), "x?<b?/>y"},
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

// The text in one of the forms that strings come in: attributes, raw XML, characters, simple value, wide string.
std::string in_form(int form, soap *ctx)
{
    std::string text;
    const char *bytes = nullptr;
    const char32_t *wide = nullptr;
    if (soap_element_in_begin(ctx, "e", 1, nullptr) != 0)
        return failure(ctx);
    if (form < 2)
        bytes = soap_attr_get(ctx, "t", 0);
    else if (form < 4)
        bytes = soap_string_read(ctx, form == 2 ? RAW : CHARACTERS, -1, -1);
    else if (form == 4)
        bytes = soap_simple_value_read(ctx);
    else
        wide = soap_wide_string_read(ctx, CHARACTERS, -1, -1);
    if (bytes != nullptr)
        text = bytes;
    char one[6];
    for (; wide != nullptr && *wide != 0; ++wide) {
        if ((ctx->mode & MODE_UTF_STRINGS) != 0)
            text.append(one, utf8_encode(*wide, one));
        else
            text += *wide < 256 ? static_cast<char>(*wide) : '?';
    }
    return soap_element_in_end(ctx, "e") == 0 ? text : failure(ctx);
}

// The text that a piece of a message becomes in all forms alike, or the error.
std::string in_all_forms(const std::string &declaration, const std::string &piece, std::uint32_t mode,
                         bool split)
{
    std::string first;
    for (int form = 0; form < 6; ++form) {
        const std::string document = declaration + (form == 0   ? "<e t=\"" + piece + "\"></e>"
                                                    : form == 1 ? "<e t='" + piece + "'></e>"
                                                                : "<e>" + piece + "</e>");
        const auto read = [form](soap *ctx) { return in_form(form, ctx); };
        const std::string text = split ? every_reading(document, mode, read)
                                       : read(reception(document, SOAP_BUFFER_SIZE, SOAP_BUFFER_SIZE, mode));
        EXPECT_TRUE(form == 0 || text == first) << "form " << form << ": " << text;
        first = text;
    }
    return first;
}

TEST(xml_text, strings_hold_what_they_are_said_to_hold_whatever_the_message_is_encoded_in)
{
    const std::string LATIN = "<?xml version='1.0' encoding='ISO-8859-1'?>",
                      WINDOWS = "<?xml version='1.0' encoding='windows-1252'?>";
    const struct {
        const char *rule;
        std::string declaration, bytes, latin, utf8; // bytes of the message, and of strings in either mode
        int strict_latin = 0, strict_utf8 = 0;       // errors of strict reading
    } rows[] = {
        {"UTF-8", "", "\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80\xED\x9F\xBF", "\xE9???",
         "\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80\xED\x9F\xBF"},
        {"ISO-8859-1", LATIN, "\xE9\x80|\xC3\xA9", "\xE9\x80|\xC3\xA9", "\xC3\xA9\xC2\x80|\xC3\x83\xC2\xA9"},
        {"windows-1252", WINDOWS, "\x80\x9F\xE9", "??\xE9", "\xE2\x82\xAC\xC5\xB8\xC3\xA9"},
        {"a byte without meaning", WINDOWS, "a\x81z", "a?z", "a?z", 47, 47},
        {"white space", "", "a\t\n\rz", "a\t\n\rz", "a\t\n\rz"},
        {"overlong", "", "a\xC0\xBC\xE0\x80\x80\xF0\x8F\xBF\xBFz", "a???z", "a???z", 47, 47},
        {"surrogates", "", "a\xED\xA0\x80z", "a?z", "a?z", 47, 47},
        {"too large", "", "a\xF4\x90\x80\x80z", "a?z", "a?z", 47, 47},
        {"no characters of XML", "", "a\xEF\xBF\xBF\xEF\xBF\xBEz", "a??z", "a??z", 47, 47},
        {"cut", "", "a\xE2\x82z", "a?z", "a?z", 47, 47},
        {"cut by markup", "", "a\xF0\x9F\x98", "a?", "a?", 47, 47},
        {"stray", "", "a\xBF\xBFz", "a?\xBFz", "a??z", 47, 47},
        {"a lone byte stands for itself in Latin-1", "", "a\xE9z\xE9", "a\xE9z\xE9", "a?z?", 0, 47},
        {"control characters", "", "a\x01\x1Fz", "a??z", "a??z", 5, 5},
        {"of ISO-8859-1", LATIN, "a\x0Bz", "a?z", "a?z", 5, 5},
    };
    for (const auto &row : rows)
        for (const bool deep : {false, true}) { // past the end of a search's stride, and of its window
            SCOPED_TRACE(row.rule);
            const auto umlauts = [deep](const char *one) { return repeat_text(one, deep ? 400 : 0); };
            const std::string before = umlauts(row.declaration.empty() ? "\xC3\xBC" : "\xFC"),
                              latin = umlauts("\xFC") + row.latin, utf8 = umlauts("\xC3\xBC") + row.utf8;
            const auto read = [&](std::uint32_t mode) {
                return in_all_forms(row.declaration, before + row.bytes, mode, !deep);
            };
            const auto strict = [](int error, const std::string &text) {
                return error == 0 ? text : "!" + std::to_string(error);
            };
            EXPECT_EQ(read(0), latin);
            EXPECT_EQ(read(MODE_UTF_STRINGS), utf8);
            EXPECT_EQ(read(MODE_STRICT), strict(row.strict_latin, latin));
            EXPECT_EQ(read(MODE_STRICT | MODE_UTF_STRINGS), strict(row.strict_utf8, utf8));
        }
}

TEST(xml_text, raw_xml_is_copied_as_it_stands)
{
    const reading bodies[] = {
        {"references stay", "&lt;&#65;&unknown;&&#x;", "&lt;&#65;&unknown;&&#x;"},
        {"but for those of no character", "&#0;&#xD800;&#x110000;&a\x01;", "???&a?;"},
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

TEST(xml_text, length_is_bounded_in_characters)
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

TEST(xml_text, a_held_tag_begins_the_text)
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

TEST(xml_text, simple_values_are_trimmed_and_bounded)
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

TEST(xml_text, wide_strings_hold_code_points)
{
    const std::tuple<const char *, int, const char *> cases[] = {
        {"a\xC3\xA9\xE2\x82\xAC&#x1F600;&lt;", CHARACTERS, "a#233#8364#128512<"},
        {"<b c=\"1\">x</b><![CDATA[<&>\"]]>", CHARACTERS, "<b c=\"1\">x</b><&>\""},
        {"<b c=\"1\">&amp;&lt;</b><![CDATA[<&>\"]]>", RAW, "<b c=\"1\">&amp;&lt;</b>&lt;&amp;&gt;&quot;"},
        {"", CHARACTERS, ""},
    };
    for (const auto &[body, form, expected] : cases) {
        const reading row[] = {{body, "<a>" + std::string(body) + "</a>", expected}};
        expect_readings(row, [form = form](soap *ctx) {
            soap_element_in_begin(ctx, "a", 1, nullptr);
            const char32_t *text = soap_wide_string_read(ctx, form, -1, -1);
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

TEST(xml_text, string_elements_tell_absent_nil_and_empty_apart)
{
    const std::tuple<const char *, const char *, long, const char *> cases[] = {
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
    for (const auto &[document, tag, minimum, expected] : cases) {
        const reading row[] = {{document, document, expected}};
        expect_readings(row, [tag = tag, minimum = minimum](soap *ctx) {
            char **place = soap_string_element_in(ctx, tag, nullptr, nullptr, 4, 1, minimum, -1);
            return place == nullptr ? failure(ctx) : std::string(*place == nullptr ? "null" : *place);
        });
        expect_readings(row, [tag = tag, minimum = minimum](soap *ctx) {
            char32_t **place = soap_wide_string_element_in(ctx, tag, nullptr, nullptr, 4, 1, minimum, -1);
            return place == nullptr ? failure(ctx) : narrow(*place == nullptr ? U"null" : *place);
        });
    }
}

TEST(xml_text, raw_elements_give_their_content)
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

TEST(xml_text, a_leaf_in_place_counts_as_an_open_element_and_is_for_lenient_reading)
{
    const std::tuple<std::uint32_t, std::uint32_t, const char *> cases[] = {
        {1, 0, ""}, {2, 0, "text"}, {2, MODE_STRICT, ""}};
    for (const auto &[max_depth, mode, content] : cases) {
        reception in("<r><a>text</a></r>", SOAP_BUFFER_SIZE, SOAP_BUFFER_SIZE, mode);
        in->max_depth = max_depth;
        std::string_view text;
        EXPECT_FALSE(xml_leaf_in_place(in.in_root(), &text)) << "nothing is held";
        soap_element_head_read(in);
        EXPECT_EQ(xml_leaf_in_place(in, &text), *content != '\0');
        EXPECT_EQ(text, content);
    }
}

} // namespace
