// xml_read_test.cpp - elements on input: tags, attributes, namespaces, the envelope's frame.
#include "support/reader_input.h"

#include <zuv_client_pro/soap_error.h>

#include "codec/tag_view.h"
#include "support/failing_malloc.h"

using reader_input::every_reading;
using reader_input::reception;

namespace {

std::string failure(const soap *ctx)
{
    return "!" + std::to_string(ctx->error);
}

std::string attributes(const soap *ctx)
{
    std::string text;
    for (const soap_attribute *p = ctx->attribute_list; p != nullptr; p = p->next) {
        if (p->visible != 0)
            text += std::string(" ") + p->name + (p->visible == 2 ? "=" + std::string(p->value) : "");
    }
    return text;
}

// The elements up to the next end tag, as "name attribute=value{content}"; text of leaves in quotes; failures
// as "!code".
std::string tree(soap *ctx)
{
    std::string text;
    while (soap_element_head_read(ctx) == 0) {
        text += ctx->tag + attributes(ctx);
        if (soap_element_in_begin(ctx, nullptr, 1, nullptr) != 0)
            return text + failure(ctx);
        if (ctx->has_body == 0) {
            text += "; ";
            continue;
        }
        text += "{" + tree(ctx);
        if (text.find('!') != std::string::npos)
            return text;
        if (ctx->look_ahead != XML_END) {
            const char *content = soap_string_read(ctx, 1, -1, -1);
            text += "'" + (content == nullptr ? failure(ctx) : std::string(content)) + "'";
        }
        if (soap_element_in_end(ctx, nullptr) != 0)
            return text + failure(ctx);
        text += "}";
    }
    return ctx->error == SOAP_NO_TAG ? text : text + failure(ctx);
}

struct tree_case {
    const char *rule;
    std::string document;
    std::string expected;
};

TEST(XmlRead, elements_come_out_as_they_stand)
{
    const tree_case cases[] = {
        {"nested", "<a><b>x</b><c/><d></d></a>", "a{b{'x'}c; d{}}!-1"},
        {"blanks everywhere", " <a \n><b  />\t< c >x</ c ></a >", "a{b; c{'x'!5"},
        {"blanks behind names", "<a ><b\n/><c\t>x</c\r\n></a >", "a{b; c{'x'}}!-1"},
        {"prolog and comments", "<?xml version='1.0'?><!-- x --><!DOCTYPE a><a><!-- y --><b/><?z?></a>",
         "a{b; }!-1"},
        {"byte-order mark", "\xEF\xBB\xBF<a/>", "a; !-1"},
        {"UTF-16", std::string("\xFE\xFF\0<", 4), "!47"},
        {"UTF-16 the other way", std::string("\xFF\xFE<\0", 4), "!47"},
        {"mark cut off", "\xEF\xBB<a/>", ""},
        {"text in place of a tag", "\xEF\xBD\xA1", ""},
        {"no name", "<></>", "!5"},
        {"names of many bytes", "<" + std::string(40, 'n') + ":" + std::string(40, 'm') + "/>",
         std::string(40, 'n') + ":" + std::string(40, 'm') + "; !-1"},
        {"end of input", "<a><b", "a{!-1"},
        {"end of input behind the slash", "<a/", "!-1"},
        {"end in an attribute", "<a b='c", "!-1"},
        {"broken end tag", "<a>x</a b>", "a{'x'!5"},
        {"end tag of another name", "<a>x</b>", "a{'x'}!-1"},
    };
    for (const tree_case &c : cases) {
        SCOPED_TRACE(c.rule);
        EXPECT_EQ(every_reading(c.document, 0, tree), c.expected);
        // With bytes to spare behind them, tags are read in blocks where they aren't cut.
        every_reading(c.document + "<!--" + std::string(80, '.') + "-->", 0, tree);
    }
}

TEST(XmlRead, attributes_are_read_in_every_form)
{
    const tree_case cases[] = {
        {"quotes", "<a b=\"1 '2'\" c='3 \"4\"'/>", "a c=3 \"4\" b=1 '2'; !-1"},
        {"blanks around", "<a b = \"1\"\nc\t=\n'2' />", "a c=2 b=1; !-1"},
        {"no value", "<a b c='1' d/>", "a d c=1 b; !-1"},
        {"empty value", "<a b=''/>", "a b=; !-1"},
        {"unquoted", "<a b=1&amp;2 c=x/>", "a c=x b=1&2; !-1"},
        {"unquoted ends the tag", "<a b=1>t</a>", "a b=1{'t'}!-1"},
        {"references", "<a b='&lt;&#233;&quot;x'/>", "a b=<\xE9\"x; !-1"},
        {"decoded", "<a b='\xC3\xA9\xE2\x82\xAC'/>", "a b=\xE9?; !-1"},
        {"markup in a value", "<a b='<c>]]></a>'/>", "a b=<c>]]></a>; !-1"},
        {"plain ones go first", "<a p:b='1' c='2' q:d='3' xmlns='4'/>", "a xmlns=4 c=2 p:b=1 q:d=3; !-1"},
        {"the last of two of a name", "<a b='1' b='2'/>", "a b=2; !-1"},
        {"gone with the next tag", "<a b='1'><c/><d b='2'/></a>", "a b=1{c; d b=2; }!-1"},
        {"no name", "<a ='1'/>", "!5"},
        {"no name but a value", "<a \"1\"/>", "a \"1\"; !-1"},
    };
    for (const tree_case &c : cases) {
        SCOPED_TRACE(c.rule);
        EXPECT_EQ(every_reading(c.document, 0, tree), c.expected);
    }
    EXPECT_EQ(every_reading("<a b='\xC3\xA9&#8364;'/>", MODE_UTF_STRINGS, tree),
              "a b=\xC3\xA9\xE2\x82\xAC; !-1");
}

TEST(XmlRead, names_are_cut_and_values_grow)
{
    const std::string name(3000, 'n');
    reception in("<" + name + " " + name + "='" + name + "'>x</" + name + ">", 700, 700);
    EXPECT_EQ(soap_element_head_read(in.context()), 0);
    EXPECT_EQ(std::string(in.context()->tag), name.substr(0, 1023));
    EXPECT_EQ(attributes(in.context()), " " + name.substr(0, 1023) + "=" + name);
    EXPECT_EQ(soap_element_in_begin(in.context(), nullptr, 1, nullptr), 0);
    EXPECT_EQ(soap_element_in_end(in.context(), nullptr), 0);
    EXPECT_EQ(std::string(in.context()->tag), name.substr(0, 1023));
}

TEST(XmlRead, a_message_of_ever_new_names_does_not_grow_the_table)
{
    std::string document = "<a>";
    for (int i = 0; i < 2000; ++i)
        document += "<b n" + std::to_string(i) + "='1' p:n" + std::to_string(i) + "='2'/>";
    document += "</a>";
    reception in(document);
    soap_element_in_begin(in.context(), "a", 1, nullptr);
    for (int i = 0; i < 2000; ++i) {
        ASSERT_EQ(soap_element_in_begin(in.context(), "b", 1, nullptr), 0);
        ASSERT_STREQ(soap_attr_get(in.context(), ("n" + std::to_string(i)).c_str(), 0), "1");
    }
    std::size_t records = 0;
    for (const soap_attribute *p = in.context()->attribute_list; p != nullptr; p = p->next)
        ++records;
    EXPECT_LE(records, 300u);

    for (const int count : {SOAP_ATTRIBUTES_MAX, SOAP_ATTRIBUTES_MAX + 1}) {
        std::string tag = "<a";
        for (int i = 0; i < count; ++i)
            tag += " b" + std::to_string(i);
        reception many(tag + "/>");
        EXPECT_EQ(soap_element_head_read(many.context()),
                  count == SOAP_ATTRIBUTES_MAX ? 0 : SOAP_SYNTAX_ERROR);
    }
}

TEST(XmlRead, a_held_tag_answers_every_question_until_it_is_consumed)
{
    EXPECT_EQ(every_reading("<a><b/>x</a>", 0,
                            [](soap *ctx) {
                                EXPECT_EQ(soap_element_in_begin(ctx, "b", 0, nullptr), SOAP_TAG_MISMATCH);
                                EXPECT_EQ(soap_element_in_begin(ctx, "-a", 0, nullptr), 0);
                                EXPECT_EQ(ctx->peeked, 1);
                                EXPECT_EQ(soap_element_in_begin(ctx, "a", 0, nullptr), 0);
                                soap_tag_unread(ctx);
                                soap_tag_unread(ctx);
                                EXPECT_EQ(ctx->nesting_level, 0u);
                                EXPECT_EQ(soap_element_in_begin(ctx, "a", 0, nullptr), 0);
                                EXPECT_EQ(ctx->nesting_level, 1u);
                                EXPECT_EQ(soap_element_in_begin(ctx, "b", 0, nullptr), 0);
                                EXPECT_EQ(soap_element_in_begin(ctx, "c", 0, nullptr), SOAP_NO_TAG);
                                EXPECT_EQ(soap_element_in_begin(ctx, "-c", 0, nullptr), 0);
                                EXPECT_EQ(soap_element_in_end(ctx, "-c"), 0);
                                EXPECT_EQ(soap_element_in_end(ctx, "a"), 0);
                                EXPECT_EQ(ctx->nesting_level, 0u);
                                return std::string();
                            }),
              "");
}

TEST(XmlRead, names_are_compared_by_namespace_row)
{
    const struct {
        const char
            *tag; // as sent, behind declarations of p: urn:one, q: urn:two, u: unknown, d: default urn:one
        const char *asked;
        int expected;
    } cases[] = {
        {"p:x", "one:x", 0},   {"p:x", "two:x", 3},   {"p:x", "x", 0},     {"p:x", ":x", 0},
        {"p:x", ":y", 3},      {"p:x", "one:", 0},    {"p:x", "two:", 3},  {"p:x", "on:x", 3},
        {"q:x", "two:x", 0},   {"q:x", "two_:x", 0},  {"q:x", "tw:x", 3},  {"u:x", "one:x", 3},
        {"u:x", ":x", 0},      {"n:x", "one:x", 5},   {"n:x", "one:y", 3}, {"n:x", "x", 0},
        {"x", "one:x", 0},     {"x", "two:x", 3},     {"x", "x", 0},       {"x", "y", 3},
        {"xml:x", "xml:x", 0}, {"xml:x", "one:x", 3}, {"p:x", "", 0},      {"p:x", nullptr, 0},
        {"p:xy", "one:x", 3},  {"p:x", "one:xy", 3},
    };
    for (const auto &c : cases) {
        SCOPED_TRACE(std::string(c.tag) + " asked for as " + (c.asked != nullptr ? c.asked : "anything"));
        reception in("<o xmlns='urn:one' xmlns:p='urn:one' xmlns:q='urn:two' xmlns:u='urn:three'><" +
                     std::string(c.tag) + "/></o>");
        soap_element_in_begin(in.context(), "o", 1, nullptr);
        EXPECT_EQ(soap_element_in_begin(in.context(), c.asked, 1, nullptr), c.expected);
        EXPECT_EQ(soap_tag_compare(in.context(), std::string(c.tag).c_str(), c.asked), c.expected);
        in.context()->mode |= MODE_IGNORE_NAMESPACES;
        const bool other_local = c.expected == 3 && soap_tag_compare(in.context(), c.tag, c.asked) == 3;
        EXPECT_EQ(soap_tag_compare(in.context(), c.tag, c.asked), other_local ? 3 : 0);
    }
    reception none("<x/>");
    EXPECT_EQ(soap_element_in_begin(none.context(), "one:x", 1, nullptr), SOAP_TAG_MISMATCH);
}

TEST(XmlRead, the_row_of_a_tag_follows_the_declarations_in_scope)
{
    reception in(
        "<p:a xmlns:p='urn:one'><p:b xmlns:p='urn:two'><p:c/></p:b><p:d/><p:e xmlns:p='urn:x'/><f/></p:a>");
    const int rows[] = {5, 6, 6, 5, TAG_ROW_UNBOUND, TAG_ROW_NO_PREFIX};
    int next = 0;
    while (next < 6) {
        if (soap_element_in_begin(in.context(), nullptr, 1, nullptr) != 0) {
            ASSERT_EQ(soap_element_in_end(in.context(), nullptr), 0);
            continue;
        }
        const tag_view tag = soap_held_tag(in.context());
        EXPECT_EQ(tag.row, rows[next]) << in.context()->tag;
        EXPECT_EQ(std::string_view(tag.local, tag.local_length),
                  std::string(1, static_cast<char>("abcdef"[next])));
        ++next;
    }
    constexpr std::uint32_t at_compile_time = tag_local_hash("description", 11);
    EXPECT_EQ(tag_local_hash(std::string("description").c_str(), 11), at_compile_time);
    EXPECT_NE(tag_local_hash("description", 10), at_compile_time);
    EXPECT_NE(tag_local_hash("descriptiom", 11), at_compile_time);
    EXPECT_NE(tag_local_hash("ab", 2), tag_local_hash("ba", 2));
}

constexpr char DECLARATIONS[] = " xmlns:i='http://www.w3.org/2001/XMLSchema-instance'"
                                " xmlns:c='http://schemas.xmlsoap.org/soap/encoding/'"
                                " xmlns:e='http://schemas.xmlsoap.org/soap/envelope/'"
                                " xmlns:w='http://schemas.xmlsoap.org/wsdl/'";

// The fields of the held tag that differ from their start.
std::string fields(const soap *ctx)
{
    std::string text;
    const auto show = [&text](const char *name, const std::string &value) {
        if (!value.empty() && value != "0")
            text += std::string(text.empty() ? "" : " ") + name + "=" + value;
    };
    show("id", ctx->element_id);
    show("href", ctx->element_href);
    show("type", ctx->element_type);
    show("arrayType", ctx->array_type);
    show("arraySize", ctx->array_size);
    show("offset", ctx->array_offset);
    show("null", std::to_string(ctx->null_flag));
    show("must", std::to_string(ctx->must_understand));
    show("other", std::to_string(ctx->other_flag));
    show("root", std::to_string(ctx->root_flag + 1));
    show("positions", std::to_string(ctx->position_count));
    return text;
}

TEST(XmlRead, attributes_of_the_engine_are_understood_by_version)
{
    const struct {
        const char *attribute;
        int version;
        std::uint32_t mode;
        const char *expected;
    } cases[] = {
        {"id='x'", 1, 0, "id=#x"},
        {"id='x'", 2, 0, "id=#x"},
        {"id='x'", 0, 0, ""},
        {"id='x'", 1, SOAP_XML_TREE, ""},
        {"id='x'", 0, SOAP_XML_GRAPH, "id=#x"},
        {"href='#x'", 1, 0, "href=#x"},
        {"href='#x'", 2, 0, ""},
        {"href='#x'", 2, MODE_MTOM, "href=#x"},
        {"href='#x'", 2, MODE_DIME, "href=#x"},
        {"href='#x'", 2, SOAP_XML_GRAPH, "href=#x"},
        {"ref='x'", 2, 0, "href=#x"},
        {"ref='x'", 1, 0, ""},
        {"c:ref='x'", 2, 0, "href=#x"},
        {"i:type='y:z'", 0, 0, "type=y:z"},
        {"c:type='y:z'", 0, 0, ""},
        {"type='y:z'", 0, 0, ""},
        {"n:type='y:z'", 0, 0, ""},
        {"i:nil='true'", 1, 0, "null=1"},
        {"i:null='1'", 2, 0, "null=1"},
        {"i:nil='false'", 1, 0, ""},
        {"c:arrayType='y:z[][2,3]'", 1, 0, "arrayType=y:z[] arraySize=[2,3]"},
        {"c:arrayType='y:z'", 1, 0, "arrayType=y:z"},
        {"c:arrayType='y:z[3]'", 2, 0, ""},
        {"c:itemType='y:z' c:arraySize='2 3'", 2, 0, "arrayType=y:z arraySize=2 3"},
        {"c:offset='[2]'", 1, 0, "offset=[2]"},
        {"c:position='[1,2]'", 1, 0, "positions=2"},
        {"c:root='1'", 1, 0, "root=2"},
        {"c:root='0'", 1, 0, "root=1"},
        {"e:mustUnderstand='1'", 1, 0, "must=1"},
        {"e:mustUnderstand='true'", 2, 0, "must=1"},
        {"e:mustUnderstand='0'", 1, 0, ""},
        {"e:actor='urn:me'", 1, 0, ""},
        {"e:actor='http://schemas.xmlsoap.org/soap/actor/next'", 1, 0, ""},
        {"e:actor='urn:you'", 1, 0, "other=1"},
        {"e:role='http://www.w3.org/2003/05/soap-envelope/role/next'", 2, 0, ""},
        {"e:role='urn:you'", 2, 0, "other=1"},
        {"w:required='true'", 0, 0, "must=1"},
        {"w:required='true'", 1, 0, ""},
    };
    for (const auto &c : cases) {
        SCOPED_TRACE(std::string(c.attribute) + " in version " + std::to_string(c.version));
        reception in("<a " + std::string(c.attribute) + DECLARATIONS + "/>", 9, 9, c.mode);
        in.context()->soap_version = static_cast<std::int16_t>(c.version);
        in.context()->actor = "urn:me";
        EXPECT_EQ(soap_element_head_read(in.context()), 0);
        EXPECT_EQ(fields(in.context()), c.expected);
    }
    reception in("<a><b id='" + std::string(2000, 'x') + "' href='" + std::string(2000, 'y') + "'/><b/></a>");
    soap_element_in_begin(in.context(), "a", 1, nullptr);
    soap_element_in_begin(in.context(), "b", 1, nullptr);
    EXPECT_EQ(fields(in.context()), "id=#" + std::string(1022, 'x') + " href=" + std::string(1023, 'y'));
    soap_element_in_begin(in.context(), "b", 1, nullptr);
    EXPECT_EQ(fields(in.context()), "");
}

TEST(XmlRead, consuming_checks_type_nil_actor_and_depth)
{
    const struct {
        const char *attribute;
        std::uint32_t mode;
        int nil_allowed;
        int expected;
    } cases[] = {
        {"i:type='c:int'", 0, 0, 0},      {"i:type='c:long'", 0, 0, SOAP_TYPE_MISMATCH},
        {"i:nil='1'", 0, 0, 0},           {"i:nil='1'", MODE_STRICT, 0, SOAP_NIL},
        {"i:nil='1'", MODE_STRICT, 1, 0}, {"e:actor='urn:you'", 0, 0, SOAP_TAG_MISMATCH},
    };
    for (const auto &c : cases) {
        SCOPED_TRACE(c.attribute);
        reception in("<a " + std::string(c.attribute) + DECLARATIONS + "/>", 9, 9, c.mode);
        EXPECT_EQ(soap_element_in_begin(in.context(), "a", c.nil_allowed, "SOAP-ENC:int"), c.expected);
    }
    for (const std::uint32_t limit : {0u, 3u}) {
        reception in("<a><a><a><a/><a>");
        in.context()->max_depth = limit;
        for (int i = 0; i < 4; ++i)
            ASSERT_EQ(soap_element_in_begin(in.context(), "a", 0, nullptr), 0);
        EXPECT_EQ(soap_element_in_begin(in.context(), "a", 0, nullptr), limit == 0 ? 0 : SOAP_LENGTH);
    }
}

TEST(XmlRead, attribute_queries_follow_the_occurrence_rule)
{
    reception in("<a p:b='1' c xmlns:p='urn:one'/>", 5, 5, MODE_STRICT);
    soap *ctx = in.context();
    soap_element_in_begin(ctx, "a", 1, nullptr);
    EXPECT_STREQ(soap_attr_get(ctx, "one:b", 1), "1");
    EXPECT_STREQ(soap_attr_get(ctx, "b", 0), "1");
    EXPECT_STREQ(soap_attr_get(ctx, "c", 1), "");
    EXPECT_STREQ(soap_attr_get(ctx, "-x", 1), "");
    EXPECT_EQ(soap_attr_get(ctx, "x", 0), nullptr);
    EXPECT_EQ(ctx->error, 0);
    EXPECT_EQ(soap_attr_get(ctx, "x", 1), nullptr);
    EXPECT_EQ(ctx->error, SOAP_REQUIRED);
    EXPECT_EQ(soap_attr_get(ctx, "one:b", 2), nullptr);
    EXPECT_EQ(ctx->error, SOAP_PROHIBITED);
    ctx->mode = 0;
    EXPECT_EQ(soap_attr_get(ctx, "x", 1), nullptr);
    EXPECT_EQ(ctx->error, 0);
    EXPECT_STREQ(soap_attr_get(ctx, "one:b", 2), "1");
}

TEST(XmlRead, unknown_elements_are_dropped_whole)
{
    const char *const unknown[] = {
        "<u/>",
        "<u></u>",
        "<u>text &amp; &stray <v><w a='/>'/>/></v></u>",
        "<u><v/><v></v><![CDATA[</u>]]><!-- </u> --><?p </u>?></u>",
        "<u a=\"</u>\"><v b=x/><v c='>'>t</v></u>",
        "<u>it's \"quoted\" <v d=it's>'</v></u>",
    };
    for (const char *element : unknown) {
        SCOPED_TRACE(element);
        const std::string document = "<a>" + std::string(element) + "<b/></a>";
        EXPECT_EQ(every_reading(document, 0,
                                [](soap *ctx) {
                                    soap_element_in_begin(ctx, "a", 1, nullptr);
                                    if (soap_element_skip(ctx) != 0 || ctx->nesting_level != 1)
                                        return failure(ctx);
                                    if (soap_element_in_begin(ctx, "b", 1, nullptr) != 0)
                                        return failure(ctx);
                                    EXPECT_EQ(soap_element_skip(ctx), SOAP_NO_TAG);
                                    return soap_element_in_end(ctx, "a") == 0 ? "dropped" : failure(ctx);
                                }),
                  "dropped");
        // an end that is asked for early drops what is left, held or not
        EXPECT_EQ(every_reading(document, 0,
                                [](soap *ctx) {
                                    soap_element_in_begin(ctx, "a", 1, nullptr);
                                    soap_element_head_read(ctx);
                                    return soap_element_in_end(ctx, "a") == 0 ? ctx->tag : failure(ctx);
                                }),
                  "a");
    }
    const auto skip = [](const char *attribute, std::uint32_t mode, std::int16_t part) {
        reception in("<u " + std::string(attribute) + DECLARATIONS + ">x</u>", 9, 9, mode);
        in.context()->message_part = part;
        return soap_element_skip(in.context());
    };
    EXPECT_EQ(skip("", MODE_STRICT, PART_BODY), SOAP_TAG_MISMATCH);
    EXPECT_EQ(skip("", MODE_STRICT, PART_HEADER), 0);
    EXPECT_EQ(skip("e:mustUnderstand='1'", 0, PART_HEADER), SOAP_MUST_UNDERSTAND);
    EXPECT_EQ(skip("e:mustUnderstand='1' e:actor='urn:you'", 0, PART_HEADER), 0);
}

TEST(XmlRead, skipping_deep_content_takes_no_stack_and_no_memory)
{
    constexpr int depth = 300000;
    std::string document = "<a>";
    for (int i = 0; i < depth; ++i)
        document += "<b>";
    reception cut(document);
    soap_element_in_begin(cut.context(), "a", 1, nullptr);
    EXPECT_EQ(soap_element_skip(cut.context()), SOAP_EOF);
    for (int i = 0; i < depth; ++i)
        document += "</b>";
    reception in(document + "</a>");
    soap_element_in_begin(in.context(), "a", 1, nullptr);
    const std::size_t before = failing_malloc::allocations();
    EXPECT_EQ(soap_element_skip(in.context()), 0);
    EXPECT_EQ(failing_malloc::allocations(), before);
    EXPECT_EQ(soap_element_in_end(in.context(), "a"), 0);
}

TEST(XmlRead, strict_reading_compares_end_tags)
{
    const auto end = [](const char *document, std::uint32_t mode) {
        reception in(document, 3, 3, mode);
        EXPECT_EQ(soap_element_in_begin(in.context(), "one:a", 1, nullptr), 0);
        return soap_element_in_end(in.context(), "one:a");
    };
    EXPECT_EQ(end("<p:a xmlns:p='urn:one'><b xmlns:p='urn:two'/></p:a>", MODE_STRICT), 0);
    EXPECT_EQ(end("<p:a xmlns:p='urn:one'></p:b>", MODE_STRICT), SOAP_SYNTAX_ERROR);
    EXPECT_EQ(end("<p:a xmlns:p='urn:one'></q:a>", MODE_STRICT), SOAP_SYNTAX_ERROR);
    EXPECT_EQ(end("<p:a xmlns:p='urn:one'></q:b>", 0), 0);
}

TEST(XmlRead, the_envelope_settles_the_version)
{
    const struct {
        const char *uri;
        int error;
        int version;
        const char *encoding;
    } cases[] = {
        {"http://schemas.xmlsoap.org/soap/envelope/", 0, 1, "http://schemas.xmlsoap.org/soap/encoding/"},
        {"http://www.w3.org/2003/05/soap-envelope", 0, 2, "http://www.w3.org/2003/05/soap-encoding"},
        {"http://www.w3.org/2002/12/soap-envelope", 0, 0, nullptr},
        {"urn:other", SOAP_VERSION_MISMATCH, 0, nullptr},
    };
    for (const auto &c : cases) {
        SCOPED_TRACE(c.uri);
        reception in("<?xml version='1.0'?><e:Envelope xmlns:e='" + std::string(c.uri) +
                         "'><e:Body>x</e:Body></e:Envelope>",
                     11, 11);
        soap *ctx = in.context();
        ctx->soap_version = 0;
        EXPECT_EQ(soap_envelope_in_begin(ctx), c.error);
        EXPECT_EQ(ctx->soap_version, c.version);
        EXPECT_EQ(ctx->message_part, PART_ENVELOPE);
        if (c.encoding != nullptr) {
            EXPECT_STREQ(ctx->local_namespaces[1].received, c.encoding);
        }
        EXPECT_STREQ(ctx->local_namespaces[0].uri, "http://schemas.xmlsoap.org/soap/envelope/");
        if (c.error != 0)
            continue;
        EXPECT_EQ(soap_body_in_begin(ctx), 0);
        EXPECT_EQ(ctx->message_part, PART_BODY);
        EXPECT_EQ(soap_body_in_end(ctx), 0);
        EXPECT_EQ(soap_envelope_in_end(ctx), 0);
        EXPECT_EQ(ctx->message_part, PART_AFTER_ENVELOPE);
    }
    static const struct {
        const char *document;
        std::int16_t status;
        int error;
    } responses[] = {{"<html/>", 0, SOAP_TAG_MISMATCH},
                     {"<html/>", 200, 200},
                     {"<html/>", 404, 404},
                     {"text", 200, 200},
                     {"<q:html/>", 200, 200},
                     {"<html", 200, SOAP_EOF},
                     {"<html", 500, 500},
                     {"<Envelope xmlns='urn:x'/>", 500, SOAP_VERSION_MISMATCH}};
    for (const auto &c : responses) {
        SCOPED_TRACE(c.document);
        reception in(c.document);
        in.context()->status = c.status;
        EXPECT_EQ(soap_envelope_in_begin(in.context()), c.error);
    }
}

TEST(XmlRead, an_empty_body_has_no_end_tag)
{
    reception in("<e:Body xmlns:e='http://schemas.xmlsoap.org/soap/envelope/'/>");
    EXPECT_EQ(soap_body_in_begin(in.context()), 0);
    EXPECT_EQ(in.context()->message_part, PART_EMPTY_BODY);
    EXPECT_EQ(soap_body_in_end(in.context()), 0);
}

TEST(XmlRead, every_cut_ends_in_an_error)
{
    const std::string document = "<?xml version='1.0'?><p:a xmlns:p='urn:one' b='&lt;'><!-- c --><d>x&amp;"
                                 "<![CDATA[y]]></d><e f='1'/><g> z </g></p:a>";
    const auto outcome = [](soap *ctx) {
        if (soap_element_in_begin(ctx, "one:a", 1, nullptr) != 0)
            return failure(ctx);
        char *text = nullptr;
        while (soap_string_element_in(ctx, nullptr, &text, nullptr, 4, 1, -1, -1) != nullptr)
            ;
        return soap_element_in_end(ctx, "one:a") == 0 ? "read" : failure(ctx);
    };
    EXPECT_EQ(every_reading(document, MODE_STRICT, outcome), "read");
    for (std::size_t length = 0; length < document.size(); ++length) {
        reception cut(document.substr(0, length), SOAP_BUFFER_SIZE, SOAP_BUFFER_SIZE, MODE_STRICT);
        EXPECT_EQ(outcome(cut.context()), "!-1") << document.substr(0, length);
    }
}

TEST(XmlRead, every_allocation_may_fail)
{
    const std::string document = "<p:a xmlns:p='urn:one' long='" + std::string(2000, 'x') + "&amp;'><p:b>" +
                                 std::string(600, 'y') + "&lt;</p:b><p:c>\xC3\xA9</p:c></p:a>";
    auto in = std::make_unique<reception>(document);
    char *text = nullptr;
    char32_t *wide = nullptr;
    const auto read = [&] {
        soap *const ctx = in->context();
        soap_element_in_begin(ctx, "one:a", 1, nullptr) == 0 &&
            soap_string_element_in(ctx, "one:b", &text, nullptr, 4, 1, -1, -1) !=
                nullptr &&soap_wide_string_element_in(ctx, "one:c", &wide, nullptr, 4, 1, -1, -1) !=
                nullptr &&soap_element_in_end(ctx, "one:a");
    };
    const auto check = [&](bool refused) {
        EXPECT_EQ(in->context()->error, refused ? SOAP_OUT_OF_MEMORY : 0);
        in = std::make_unique<reception>(document);
        text = nullptr;
        wide = nullptr;
    };
    EXPECT_GT(failing_malloc::at_each_allocation(failing_malloc::refuse::one, read, check), 5u);
}

} // namespace
