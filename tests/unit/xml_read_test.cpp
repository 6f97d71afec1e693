// xml_read_test.cpp - elements on input: tags, attributes, namespaces, the envelope's frame.

#include "support/reader_input.h"
#include "xml/namespace.h"
#include "xml/namespace_scope.h"
#include "xml/xml_read.h"

using namespace reader_input;

namespace {

int begin(soap *ctx, const char *tag)
{
    return soap_element_in_begin(ctx, tag, 0, nullptr);
}

std::string attributes(soap *ctx)
{
    std::string text = xml_attributes_complete(ctx) == 0 ? "" : failure(ctx);
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

TEST(xml_read, elements_and_attributes_come_out_as_they_are)
{
    const reading rows[] = {
        {"blanks everywhere", " <a \n><b  />\t< c >x</ c ></a >", "a{b; c{'x'!5"},
        {"byte-order mark", "\xEF\xBB\xBF<a/>", "a; !-1"},
        {"UTF-16", std::string("\xFE\xFF\0<", 4), "!47"},
        {"UTF-16 the other way", std::string("\xFF\xFE<\0", 4), "!47"},
        {"mark cut off", "\xEF\xBB<a/>", ""},
        {"text in place of a tag", "\xEF\xBD\xA1", ""},
        {"no name", "<></>", "!5"},
        {"end of input", "<a><b", "a{!-1"},
        {"end of input after the slash", "<a/", "!-1"},
        {"end in an attribute", "<a b='c", "!-1"},
        {"broken end tag", "<a>x</a b>", "a{'x'!5"},
        {"end tag of another name", "<a>x</b>", "a{'x'}!-1"},
        {"no value", "<a b c='1' d/>", "a d c=1 b; !-1"},
        {"empty value", "<a b=''/>", "a b=; !-1"},
        {"unquoted", "<a b=1&amp;2 c=x/>", "a c=x b=1&2; !-1"},
        {"unquoted ends the tag", "<a b=1>t</a>", "a b=1{'t'}!-1"},
        {"decoded", "<a b='\xC3\xA9\xE2\x82\xAC'/>", "a b=\xE9?; !-1"},
        {"not decoded", "<a b='\xC3\xA9&#8364;'/>", "a b=\xC3\xA9\xE2\x82\xAC; !-1", MODE_UTF_STRINGS},
        {"plain ones go first", "<a p:b='1' c='2' q:d='3' xmlns='4'/>", "a xmlns=4 c=2 p:b=1 q:d=3; !-1"},
        {"the last of two of a name", "<a b='1' b='2'/>", "a b=2; !-1"},
        {"no name of an attribute", "<a ='1'/>", "!5"},
        {"no name but a value", "<a \"1\"/>", "a \"1\"; !-1"},
    };
    expect_readings(rows, tree);
    // With bytes to spare after them, tags are read in blocks where they aren't cut.
    for (const reading &row : rows)
        every_reading(row.document + "<!--" + std::string(80, '.') + "-->", row.mode, tree);
}

TEST(xml_read, names_are_cut_and_values_grow)
{
    const std::string name(3000, 'n');
    reception in("<" + name + " " + name + "='" + name + "'>x</" + name + ">", 700, 700);
    in.in_root();
    EXPECT_EQ(std::string(in->tag), name.substr(0, 1023));
    EXPECT_EQ(attributes(in), " " + name.substr(0, 1023) + "=" + name);
    EXPECT_EQ(soap_element_in_end(in, nullptr), 0);
    EXPECT_EQ(std::string(in->tag), name.substr(0, 1023));
}

TEST(xml_read, a_message_of_ever_new_names_does_not_grow_the_table)
{
    std::string document = "<a>";
    for (int i = 0; i < 2000; ++i)
        document += "<b n" + std::to_string(i) + "='1' p:n" + std::to_string(i) + "='2'/>";
    reception in(document + "</a>");
    in.in_root();
    std::int64_t held = 0;
    for (int i = 0; i < 2000; ++i) {
        ASSERT_EQ(begin(in, "b"), 0);
        ASSERT_STREQ(soap_attr_get(in, ("n" + std::to_string(i)).c_str(), 0), "1");
        if (i == 200)
            held = in->memory_held;
    }
    EXPECT_LE(in->memory_held, held);
}

TEST(xml_read, many_attributes_of_an_element_keep_their_values)
{
    std::string tag;
    for (int i = 0; i + 1 < SOAP_ATTRIBUTES_MAX; ++i)
        tag += " b" + std::string(static_cast<std::size_t>(i % 30), 'n') + std::to_string(i) + "='" +
               std::to_string(i) + "'";
    const std::string element = "<a" + tag + " b0='again'/>";
    EXPECT_EQ(soap_element_head_read(reception("<a c='d'" + tag + " more/>")), SOAP_SYNTAX_ERROR);
    reception in("<a>" + element + "<a c='d'/>" + element + "</a>");
    in.in_root();
    for (int round = 0; round < 2; ++round) {
        ASSERT_EQ(soap_element_head_read(in), 0);
        const std::string seen = attributes(in);
        EXPECT_EQ(std::count(seen.begin(), seen.end(), '='), SOAP_ATTRIBUTES_MAX - 1);
        EXPECT_STREQ(soap_attr_get(in, "b0", 0), "again") << "the last one counts";
        EXPECT_STREQ(soap_attr_get(in, "bnnnnnnn997", 0), "997");
        EXPECT_EQ(soap_element_skip(in), 0);
        if (round == 0) {
            EXPECT_EQ(soap_element_head_read(in), 0);
            EXPECT_EQ(attributes(in), " c=d");
            EXPECT_EQ(soap_element_skip(in), 0);
        }
    }
}

TEST(xml_read, a_held_tag_answers_every_question_until_it_is_consumed)
{
    const reading row[] = {{"held", "<a><b/>x</a>", ""}};
    expect_readings(row, [](soap *ctx) {
        EXPECT_EQ(begin(ctx, "b"), SOAP_TAG_MISMATCH);
        EXPECT_EQ(begin(ctx, "-a"), 0);
        EXPECT_EQ(ctx->peeked, 1);
        for (int times = 0; times < 2; ++times) {
            EXPECT_EQ(begin(ctx, "a"), 0);
            EXPECT_EQ(ctx->nesting_level, 1u);
            if (times == 0)
                soap_tag_unread(ctx), soap_tag_unread(ctx); // once counts
        }
        EXPECT_EQ(begin(ctx, "b"), 0);
        EXPECT_EQ(begin(ctx, "c"), SOAP_NO_TAG);
        EXPECT_EQ(begin(ctx, "-c"), 0);
        EXPECT_EQ(soap_element_in_end(ctx, "-c"), 0);
        EXPECT_EQ(soap_element_in_end(ctx, "a"), 0);
        EXPECT_EQ(ctx->nesting_level, 0u);
        return std::string();
    });
}

TEST(xml_read, names_are_compared_by_namespace_row)
{
    const struct {
        // As sent, after declarations of p: urn:one, q: urn:two, u: unknown, default: urn:one.
        const char *tag;
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
        EXPECT_EQ(soap_element_in_begin(in.in_root(), c.asked, 1, nullptr), c.expected);
        EXPECT_EQ(soap_tag_compare(in, c.tag, c.asked), c.expected);
        in->mode |= MODE_IGNORE_NAMESPACES;
        const bool other_local = c.expected == 3 && soap_tag_compare(in, c.tag, c.asked) == 3;
        EXPECT_EQ(soap_tag_compare(in, c.tag, c.asked), other_local ? 3 : 0);
    }
    EXPECT_EQ(begin(reception("<x/>"), "one:x"), SOAP_TAG_MISMATCH);
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

TEST(xml_read, attributes_of_the_engine_are_understood_by_version)
{
    const auto name_of = [](std::size_t length) { return std::string(length, 'n'); };
    const std::tuple<std::string, std::int16_t, std::string, std::uint32_t> cases[] = {
        {"id='x'", 1, "id=#x", 0},
        {"id='x'", 0, "", 0},
        {"id='x'", 1, "", SOAP_XML_TREE},
        {"id='x'", 0, "id=#x", SOAP_XML_GRAPH},
        {"href='#x'", 1, "href=#x", 0},
        {"href='#x'", 2, "", 0},
        {"href='#x'", 2, "href=#x", MODE_MTOM},
        {"href='#x'", 2, "href=#x", SOAP_XML_GRAPH},
        {"ref='x'", 2, "href=#x", 0},
        {"ref='x'", 1, "", 0},
        {"c:ref='x'", 2, "href=#x", 0},
        {"i:type='y:z'", 0, "type=y:z", 0},
        {"type='y:z'", 0, "", 0},
        {"n:type='y:z'", 0, "", 0},
        {"i:nil='true'", 1, "null=1", 0},
        {"i:null='1'", 2, "null=1", 0},
        {"i:nil='false'", 1, "", 0},
        {"c:arrayType='y:z[][2,3]'", 1, "arrayType=y:z[] arraySize=[2,3]", 0},
        {"c:arrayType='y:z'", 1, "arrayType=y:z", 0},
        {"c:arrayType='y:z[3]'", 2, "", 0},
        {"c:arrayType='" + name_of(1023) + "[3]'", 1, "arrayType=" + name_of(1023) + " arraySize=[3]", 0},
        {"c:arrayType='" + name_of(1024) + "[3]'", 1, "arrayType=" + name_of(1023), 0},
        {"c:itemType='y:z' c:arraySize='2 3'", 2, "arrayType=y:z arraySize=2 3", 0},
        {"c:offset='[2]'", 1, "offset=[2]", 0},
        {"c:position='[1,2]'", 1, "positions=2", 0},
        {"c:root='1'", 1, "root=2", 0},
        {"c:root='0'", 1, "root=1", 0},
        {"e:mustUnderstand='1'", 1, "must=1", 0},
        {"e:mustUnderstand='true'", 2, "must=1", 0},
        {"e:mustUnderstand='0'", 1, "", 0},
        {"e:actor='urn:me'", 1, "", 0},
        {"e:actor='http://schemas.xmlsoap.org/soap/actor/next'", 1, "", 0},
        {"e:actor='urn:you'", 1, "other=1", 0},
        {"e:role='http://www.w3.org/2003/05/soap-envelope/role/next'", 2, "", 0},
        {"e:role='urn:you'", 2, "other=1", 0},
        {"w:required='true'", 0, "must=1", 0},
        {"w:required='true'", 1, "", 0},
    };
    for (const auto &[attribute, version, expected, mode] : cases) {
        reception in("<a " + attribute + DECLARATIONS + "/>", 9, 9, mode);
        in->soap_version = version;
        in->actor = "urn:me";
        EXPECT_EQ(soap_element_head_read(in), 0);
        EXPECT_EQ(fields(in), expected) << attribute << " in version " << version;
    }
    reception in("<a><b id='" + std::string(2000, 'x') + "' href='" + std::string(2000, 'y') + "'/><b/></a>");
    begin(in.in_root(), "b");
    EXPECT_EQ(fields(in), "id=#" + std::string(1022, 'x') + " href=" + std::string(1023, 'y'));
    begin(in, "b");
    EXPECT_EQ(fields(in), "");
}

TEST(xml_read, consuming_checks_type_nil_actor_and_depth)
{
    const std::tuple<const char *, std::uint32_t, int, int> cases[] = {
        {"i:type='c:int'", 0, 0, 0},      {"i:type='c:long'", 0, 0, SOAP_TYPE_MISMATCH},
        {"i:nil='1'", 0, 0, 0},           {"i:nil='1'", MODE_STRICT, 0, SOAP_NIL},
        {"i:nil='1'", MODE_STRICT, 1, 0}, {"e:actor='urn:you'", 0, 0, SOAP_TAG_MISMATCH},
    };
    for (const auto &[attribute, mode, nil_allowed, expected] : cases) {
        reception in("<a " + std::string(attribute) + DECLARATIONS + "/>", 9, 9, mode);
        EXPECT_EQ(soap_element_in_begin(in, "a", nil_allowed, "SOAP-ENC:int"), expected) << attribute;
    }
    for (const std::uint32_t limit : {0u, 3u}) {
        reception in("<a><a><a><a/><a>");
        in->max_depth = limit;
        for (int i = 0; i < 4; ++i)
            ASSERT_EQ(begin(in, "a"), 0);
        EXPECT_EQ(begin(in, "a"), limit == 0 ? 0 : SOAP_LENGTH);
    }
}

TEST(xml_read, attribute_queries_follow_the_occurrence_rule)
{
    const struct {
        const char *name;
        int occurrence; // 1 required, 2 prohibited
        std::uint32_t mode;
        const char *value;
        int error;
    } cases[] = {
        {"one:b", 1, MODE_STRICT, "1", 0},
        {"b", 0, MODE_STRICT, "1", 0},
        {"c", 1, MODE_STRICT, "", 0},
        {"-x", 1, MODE_STRICT, "", 0},
        {"x", 0, MODE_STRICT, nullptr, 0},
        {"x", 1, MODE_STRICT, nullptr, SOAP_REQUIRED},
        {"one:b", 2, MODE_STRICT, nullptr, SOAP_PROHIBITED},
        {"x", 1, 0, nullptr, 0},
        {"one:b", 2, 0, "1", 0},
    };
    for (const auto &c : cases) {
        reception in("<a p:b='1' c xmlns:p='urn:one'/>", 5, 5, c.mode);
        EXPECT_STREQ(soap_attr_get(in.in_root(), c.name, c.occurrence), c.value) << c.name;
        EXPECT_EQ(in->error, c.error) << c.name;
    }
}

TEST(xml_read, unknown_elements_are_dropped_whole)
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
        const reading row[] = {{element, "<a>" + std::string(element) + "<b/></a>", "a"}};
        expect_readings(row, [](soap *ctx) {
            soap_element_in_begin(ctx, "a", 1, nullptr);
            if (soap_element_skip(ctx) != 0 || ctx->nesting_level != 1 || begin(ctx, "b") != 0)
                return failure(ctx);
            EXPECT_EQ(soap_element_skip(ctx), SOAP_NO_TAG);
            return soap_element_in_end(ctx, "a") == 0 ? ctx->tag : failure(ctx);
        });
        // An end that is asked for early drops what is left, held or not.
        expect_readings(row, [](soap *ctx) {
            soap_element_in_begin(ctx, "a", 1, nullptr);
            soap_element_head_read(ctx);
            return soap_element_in_end(ctx, "a") == 0 ? ctx->tag : failure(ctx);
        });
    }
    const auto skip = [](const char *attribute, std::uint32_t mode, std::int16_t part) {
        reception in("<u " + std::string(attribute) + DECLARATIONS + ">x</u>", 9, 9, mode);
        in->message_part = part;
        return soap_element_skip(in);
    };
    EXPECT_EQ(skip("", MODE_STRICT, PART_BODY), SOAP_TAG_MISMATCH);
    EXPECT_EQ(skip("", MODE_STRICT, PART_HEADER), 0);
    EXPECT_EQ(skip("e:mustUnderstand='1'", 0, PART_HEADER), SOAP_MUST_UNDERSTAND);
    EXPECT_EQ(skip("e:mustUnderstand='1' e:actor='urn:you'", 0, PART_HEADER), 0);
}

TEST(xml_read, skipping_deep_content_takes_no_stack_and_no_memory)
{
    const std::string document = "<a>" + repeat_text("<b>", 300000);
    reception cut(document);
    cut->max_depth = 0;
    EXPECT_EQ(soap_element_skip(cut.in_root()), SOAP_EOF);
    reception in(document + repeat_text("</b>", 300000) + "</a>");
    in->max_depth = 0;
    in.in_root();
    const std::size_t before = failing_malloc::allocations();
    EXPECT_EQ(soap_element_skip(in), 0);
    EXPECT_EQ(failing_malloc::allocations(), before);
    EXPECT_EQ(soap_element_in_end(in, "a"), 0);
}

TEST(xml_read, skipped_elements_count_as_open)
{
    const std::tuple<std::string, std::uint32_t, int> cases[] = {
        {"<b><c><d>x</d></c></b>", 0, 0},
        {"<b><c><d>x</d></c></b>", 4, 0},
        {"<b><c><d>x</d></c></b>", 3, SOAP_LENGTH},
        {"<b><e/><c><d/><d>x</d></c></b>", 4, 0},
        {"<b><e/><c><d/><d>x</d></c></b>", 3, SOAP_LENGTH},
        {"<b>x</b>", 1, SOAP_LENGTH},
    };
    for (const auto &[content, limit, error] : cases)
        for (const char *way :
             {"to the end tag", "to the end tag past a text", "from a held tag", "the element"}) {
            SCOPED_TRACE(content + way);
            reception in((std::strstr(way, "text") ? "<a>x" : "<a>") + content + "</a>");
            in->max_depth = limit;
            in.in_root();
            const bool held = std::strstr(way, "held") != nullptr;
            const int begun = held ? soap_element_head_read(in) : 0;
            EXPECT_EQ(begun, 0);
            EXPECT_EQ(*way == 't' && std::strstr(way, "tag") == nullptr ? soap_element_skip(in)
                                                                        : soap_element_in_end(in, "a"),
                      error);
        }
}

TEST(xml_read, strict_reading_compares_end_tags)
{
    const std::tuple<std::string, std::uint32_t, int> cases[] = {
        {"<b xmlns:p='urn:two'/></p:a>", MODE_STRICT, 0},
        {"</p:b>", MODE_STRICT, SOAP_SYNTAX_ERROR},
        {"</q:a>", MODE_STRICT, SOAP_SYNTAX_ERROR},
        {"</q:b>", 0, 0},
    };
    for (const auto &[content_and_end, mode, error] : cases) {
        reception in("<p:a xmlns:p='urn:one'>" + content_and_end, 3, 3, mode);
        EXPECT_EQ(soap_element_in_end(in.in_root(), "one:a"), error) << content_and_end;
    }
}

TEST(xml_read, the_envelope_settles_the_version)
{
    const std::tuple<const char *, int, int, const char *> cases[] = {
        {"http://schemas.xmlsoap.org/soap/envelope/", 0, 1, "http://schemas.xmlsoap.org/soap/encoding/"},
        {"http://www.w3.org/2003/05/soap-envelope", 0, 2, "http://www.w3.org/2003/05/soap-encoding"},
        {"http://www.w3.org/2002/12/soap-envelope", 0, 0, nullptr},
        {"urn:other", SOAP_VERSION_MISMATCH, 0, nullptr},
    };
    for (const auto &[uri, error, version, encoding] : cases)
        for (const bool empty : {false, true}) {
            SCOPED_TRACE(uri);
            reception in("<?xml version='1.0'?><e:Envelope xmlns:e='" + std::string(uri) + "'><e:Body" +
                             (empty ? "/></e:Envelope>" : ">x</e:Body></e:Envelope>"),
                         11, 11);
            in->soap_version = 0;
            ASSERT_EQ(soap_envelope_in_begin(in), error);
            EXPECT_EQ(in->soap_version, version);
            if (encoding != nullptr) {
                EXPECT_STREQ(in->local_namespaces[1].received, encoding);
            }
            EXPECT_STREQ(in->local_namespaces[0].uri, "http://schemas.xmlsoap.org/soap/envelope/");
            if (error != 0)
                continue;
            EXPECT_EQ(soap_body_in_begin(in), 0);
            EXPECT_EQ(in->message_part, empty ? PART_EMPTY_BODY : PART_BODY);
            EXPECT_EQ(soap_body_in_end(in), 0);
            EXPECT_EQ(soap_envelope_in_end(in), 0);
            EXPECT_EQ(in->message_part, PART_AFTER_ENVELOPE);
        }
    const std::tuple<const char *, std::int16_t, int> responses[] = {
        {"<html/>", 0, SOAP_TAG_MISMATCH},
        {"<html/>", 200, 200},
        {"<html/>", 404, 404},
        {"text", 200, 200},
        {"<q:html/>", 200, 200},
        {"<html", 200, SOAP_EOF},
        {"<html", 500, 500},
        {"<Envelope xmlns='urn:x'/>", 500, SOAP_VERSION_MISMATCH},
    };
    for (const auto &[document, status, error] : responses) {
        reception in(document);
        in->status = status;
        EXPECT_EQ(soap_envelope_in_begin(in), error) << document << " with " << status;
    }
}

// What follows the name of a root element, in the forms that peers write.
constexpr const char *ROOT_HEADS[] = {
    "",
    "/",
    " /",
    " xmlns:p=\"urn:one\"",
    " xmlns:p=\"urn:two\"",
    " xmlns:p=\"urn:one\"/",
    " xmlns:p='urn:one' xmlns:q=\"urn:two\"",
    " xmlns:q=\"urn:other\" xmlns:p=\"urn:one\"",
    "\nxmlns:p=\"urn:none\" \t xmlns='urn:one' ",
    " xmlns=\"\" xmlns:p = \"urn:one\"",
    " xmlns:p=\"urn:&#x6F;ne\" xmlns:q=\" urn:one\"",
    " xmlns:p=\"urn:one\" a=\"1\" xsi:type='p:t'",
    " xmlns:p=\"urn:one\" plain q:x=\"<>'\"",
    " xmlns:p=\"urn:one\" xmlns:p=\"urn:two\"",
    " xmlns:=\"urn:one\" xmlns:q xmlnsx=\"urn:one\" xmlns:q=urn:one",
    " xmlns:p=\"urn:one\" xmlns:a_name_of_more_than_eight=\"urn:two\" xmlns:\xC3\xA9=\"urn:\xC3\xA9\"",
    " xmlns:e=\"http://schemas.xmlsoap.org/soap/envelope/\" xmlns:p=\"http://www.w3.org/1/soap-encoding\"",
    " xmlns:e=\"http://www.w3.org/2003/05/soap-envelope\" xmlns:p=\"urn:one\"",
    (" xmlns:e=\"http://www.w3.org/2003/05/soap-envelope\" "
     "xmlns:f=\"http://schemas.xmlsoap.org/soap/envelope/\"/"),
    " xmlns:q=urn:one",
    " xmlns:e=\"http://www.w3.org/1/soap-envelope\" xmlns:p=\"http://www.w3.org/2003/05/soap-envelope\"",
};

// All that a message's root element leaves in the context. `asks`: its attributes are looked at, too.
std::string root_and_content(soap *ctx, bool asks)
{
    std::string text =
        std::to_string(soap_element_head_read(ctx)) + " " + ctx->tag + (ctx->has_body ? "" : "/");
    if (asks)
        text += attributes(ctx);
    for (const char *name :
         {"x", "p:x", "q:x", "e:x", "a_name_of_more_than_eight:x", "\xC3\xA9:x", "xml:x"}) {
        const char *const uri = soap_namespace_of(ctx, name);
        const soap_prefix *const record = xml_prefix_find(ctx, xml_prefix_of(name));
        text += std::string("\n") + name + " " + (uri ? uri : "(none)");
        if (record)
            text += " " + std::to_string(record->index) + " " + std::to_string(record->level);
        text += " " + std::to_string(soap_tag_compare(ctx, name, "one:x"));
    }
    for (const soap_namespace *row = ctx->local_namespaces; row->prefix != nullptr; ++row)
        text += std::string(" ") + (row->received ? row->received : "-");
    for (const soap_prefix *p = ctx->prefix_list; p != nullptr; p = p->next)
        text += std::string(" <") + p->prefix + "=" + (p->uri ? p->uri : std::to_string(p->index));
    text += "\n" + tree(ctx);
    return text + std::to_string(ctx->error) + " " + std::to_string(ctx->nesting_level);
}

TEST(xml_read, a_root_element_like_the_last_one_is_read_as_if_it_were_the_first)
{
    static constexpr soap_namespace other_rows[] = {
        {"SOAP-ENV", "http://www.w3.org/2003/05/soap-envelope", nullptr, nullptr},
        {"SOAP-ENC", "urn:two", "http://*/soap-encoding", nullptr},
        {"any", "urn:none", "urn:*", nullptr}, // takes what a later row calls its own
        {"one", "urn:one", nullptr, nullptr},
        {nullptr, nullptr, nullptr, nullptr},
    };
    int round = 0; // settles what varies from message to message
    const auto seen = [&round](reception &in, const std::string &head, std::size_t piece) {
        const std::string document = "<p:root" + head + "><p:x xmlns:q=\"urn:two\"><q:y/></p:x><x/></p:root>";
        in.receive(document, round % 4 == 1 ? 1 + piece % document.size() : piece, piece);
        soap_reset_call(in);
        in->namespaces = round % 7 == 1 ? other_rows : NAMESPACES;
        in->mode = round % 3 == 1 ? MODE_UTF_STRINGS : 0;
        soap_namespace_table_copy(in);
        return root_and_content(in, round % 2 == 1);
    };
    for (const std::string earlier : ROOT_HEADS)
        for (const std::string head : ROOT_HEADS) {
            reception kept("");
            for (const std::string &next : {earlier, head, head, earlier, head}) {
                SCOPED_TRACE(next + " after " + earlier + ", " + std::to_string(++round));
                reception fresh(""), bytewise(""); // the latter has no declaration whole in the buffer
                const std::string expected = seen(bytewise, next, 1);
                EXPECT_EQ(seen(fresh, next, SOAP_BUFFER_SIZE), expected);
                EXPECT_EQ(seen(kept, next, SOAP_BUFFER_SIZE), expected);
            }
        }
}

// Elements within each other, most with a default namespace, as toolkits without prefixes write them.
std::string random_elements(std::mt19937 &random, int depth)
{
    static constexpr const char *heads[] = {
        "",
        " xmlns='urn:one'",
        " xmlns=\"urn:one\"",
        " xmlns=\"urn:two\"",
        " xmlns=\"urn:two\"",
        " xmlns=\"\"",
        " xmlns=\"urn:none\"",
        "\n xmlns=\"urn:one\" ",
        " xmlns=\"urn:one\" a=\"1\"",
        " xmlns:p=\"urn:one\"",
        " xmlns=\"urn:one\" xmlns=\"urn:two\"",
        " xmlns=\"urn:two\" xmlns:x=\"urn:one\"",
        " a=\"2\"",
        " xmlns=\"http://www.w3.org/1/soap-encoding\"",
        " xmlns=\"http://schemas.xmlsoap.org/soap/encoding/\"",
    };
    static constexpr const char *names[] = {"x", "x", "y", "p:x", "x:y", "a-name-of-more-bytes-than-eight"};
    std::string text;
    for (auto count = 1 + random() % 3; count > 0; --count) {
        const std::string name = names[random() % std::size(names)];
        const std::string head = "<" + name + heads[random() % std::size(heads)];
        const bool empty = random() % 4 == 0;
        text += empty ? head + "/>"
                      : head + ">" + (depth > 0 ? random_elements(random, depth - 1) : "text") + "</" + name +
                            ">";
    }
    return text;
}

// Each element with its row, what it declares, and what the rows have received.
std::string rows_of_elements(soap *ctx, std::mt19937 random)
{
    std::string text;
    while (soap_element_head_read(ctx) == 0) {
        text += ctx->tag;
        if (random() % 2 == 0)
            text += attributes(ctx);
        if (random() % 2 == 0)
            text += " " + std::to_string(soap_held_tag(ctx).row) +
                    std::to_string(soap_tag_compare(ctx, ctx->tag, "one:x"));
        for (const char *name : {"x", "p:x", "x:x"})
            text += " " + std::to_string(soap_tag_compare(ctx, name, "two:x"));
        for (const soap_prefix *p = ctx->prefix_list; p != nullptr; p = p->next)
            text += " <" + std::to_string(p->index) + "@" + std::to_string(p->level);
        text += ctx->local_namespaces[1].received ? " received" : "";
        const bool skips = random() % 8 == 0;
        if (skips ? soap_element_skip(ctx) : soap_element_in_begin(ctx, nullptr, 1, nullptr))
            return text + failure(ctx);
        if (skips || ctx->has_body == 0)
            continue;
        text += "{" + rows_of_elements(ctx, random) + "}";
        if (soap_element_in_end(ctx, nullptr) != 0)
            return text + failure(ctx);
    }
    return text + failure(ctx);
}

TEST(xml_read, a_default_namespace_declared_again_is_read_as_if_it_were_the_first)
{
    static constexpr soap_namespace other_rows[] = {
        NAMESPACES[0], NAMESPACES[1], NAMESPACES[2], NAMESPACES[3],
        NAMESPACES[4], NAMESPACES[6], NAMESPACES[5], NAMESPACES[7],
    };
    std::mt19937 random(20261122);
    reception kept("");
    for (int round = 0; round < 600; ++round) {
        const std::string document = "<x xmlns:x=\"urn:two\">" + random_elements(random, 4) + "</x>";
        const auto seen = [&](reception &in, std::size_t piece) {
            in.receive(document, piece, piece);
            soap_reset_call(in);
            in->namespaces = round % 7 == 6 ? other_rows : NAMESPACES;
            in->mode = round % 5 == 0 ? MODE_STRICT : 0;
            soap_namespace_table_copy(in);
            return rows_of_elements(in, std::mt19937(static_cast<unsigned>(round)));
        };
        reception bytewise(""); // which has no declaration whole in the buffer
        const std::string expected = seen(bytewise, 1);
        EXPECT_EQ(seen(kept, SOAP_BUFFER_SIZE), expected) << document;
        EXPECT_EQ(seen(kept, 100 + random() % 100), expected) << document;
    }
}

// The rows of prefixes are kept by a few places, which prefixes of other lengths share: none at all among them.
TEST(xml_read, a_name_without_prefix_is_never_taken_for_one_with)
{
    for (char letter = 'b'; letter <= 'z'; ++letter) {
        const std::string prefix(1, letter);
        reception in("<" + prefix + ":v xmlns:" + prefix + "=\"urn:one\"><v/></" + prefix + ":v>");
        ASSERT_EQ(begin(in, "one:v"), 0) << prefix;
        EXPECT_EQ(begin(in, "one:v"), SOAP_TAG_MISMATCH) << prefix;
        EXPECT_EQ(begin(in, "v"), 0) << prefix;
    }
}

TEST(xml_read, the_header_callback_judges_a_header_that_was_read)
{
    for (const int judged : {0, 77}) {
        reception in(
            "<E:Envelope xmlns:E=\"http://schemas.xmlsoap.org/soap/envelope/\"><E:Header/></E:Envelope>");
        in->user = judged == 0 ? nullptr : in.context();
        in->on_soap_header = [](soap *ctx) { return ctx->user == nullptr ? 0 : 77; };
        EXPECT_EQ(soap_envelope_in_begin(in), 0);
        EXPECT_EQ(soap_header_get(in), judged);
    }
}

TEST(xml_read, every_allocation_may_fail)
{
    const std::string document = "<p:a xmlns:p='urn:one' long='" + std::string(2000, 'x') + "&amp;'><p:b>" +
                                 std::string(600, 'y') + "&lt;</p:b><p:c>\xC3\xA9</p:c></p:a>";
    const auto make = [&] { return std::make_unique<reception>(document); };
    expect_out_of_memory_at_each_allocation(6, make, [](reception &in) {
        char *text = nullptr;
        char32_t *wide = nullptr;
        if (begin(in, "one:a") == 0 &&
            soap_string_element_in(in, "one:b", &text, nullptr, 4, 1, -1, -1) != nullptr &&
            soap_wide_string_element_in(in, "one:c", &wide, nullptr, 4, 1, -1, -1) != nullptr)
            soap_element_in_end(in, "one:a");
        return in.error;
    });
}

} // namespace
