// xml_reference_test.cpp - the reader against another parser: both must see the same document. Documents come
// from a small random grammar with fixed seeds. Texts, attribute values and the order of tags are compared.
// Left out of account: white space in attributes, which the reader keeps as it is.
#include <libxml/xmlreader.h>

#include "support/reader_input.h"
#include "xml/xml_read.h"
#include "xml/xml_text.h"

using reader_input::reception;

namespace {

std::string joined(const std::set<std::string> &attributes)
{
    std::string text;
    for (const std::string &attribute : attributes)
        text += " " + attribute;
    return text;
}

std::string blanks_unified(std::string text)
{
    std::replace_if(
        text.begin(), text.end(), [](char c) { return c == '\n' || c == '\t'; }, ' ');
    return text;
}

// What libxml2 makes of a document; false if it takes it for malformed.
bool reference_events(const std::string &document, std::string &events)
{
    xmlTextReaderPtr reader = xmlReaderForMemory(
        document.data(), static_cast<int>(document.size()), nullptr, nullptr,
        XML_PARSE_NONET | XML_PARSE_NOENT | XML_PARSE_HUGE | XML_PARSE_NOERROR | XML_PARSE_NOWARNING);
    const auto text_of = [](const xmlChar *text) {
        return std::string(text != nullptr ? reinterpret_cast<const char *>(text) : "");
    };
    int more;
    while ((more = xmlTextReaderRead(reader)) == 1) {
        const std::string name = text_of(xmlTextReaderConstName(reader));
        switch (xmlTextReaderNodeType(reader)) {
        case XML_READER_TYPE_ELEMENT: {
            const bool empty = xmlTextReaderIsEmptyElement(reader) == 1;
            std::set<std::string> attributes;
            while (xmlTextReaderMoveToNextAttribute(reader) == 1)
                attributes.insert(text_of(xmlTextReaderConstName(reader)) + "=" +
                                  blanks_unified(text_of(xmlTextReaderConstValue(reader))));
            events += "<" + name + joined(attributes) + (empty ? "/>" : ">");
            break;
        }
        case XML_READER_TYPE_END_ELEMENT:
            events += "</" + name + ">";
            break;
        case XML_READER_TYPE_TEXT:
        case XML_READER_TYPE_CDATA:
        case XML_READER_TYPE_SIGNIFICANT_WHITESPACE:
        case XML_READER_TYPE_WHITESPACE:
            events += text_of(xmlTextReaderConstValue(reader));
            break;
        default:
            break;
        }
    }
    xmlFreeTextReader(reader);
    return more == 0;
}

bool put_start(soap *ctx, std::string &events)
{
    ctx->look_ahead = XML_START;
    if (soap_element_in_begin(ctx, nullptr, 1, nullptr) != 0)
        return false;
    std::set<std::string> attributes;
    EXPECT_EQ(xml_attributes_complete(ctx), 0);
    for (const soap_attribute *p = ctx->attribute_list; p != nullptr; p = p->next) {
        if (p->visible == 2)
            attributes.insert(std::string(p->name) + "=" + blanks_unified(p->value));
    }
    events += "<" + std::string(ctx->tag) + joined(attributes) + (ctx->has_body != 0 ? ">" : "/>");
    const char *text;
    std::size_t length;
    if (ctx->has_body != 0 && xml_text_in_place(ctx, &text, &length))
        events.append(text, length);
    return true;
}

// The same events from the reader. White space outside the root isn't content.
bool reader_events(soap *ctx, std::string &events)
{
    ctx->max_depth = 0;
    for (;;) {
        const std::int32_t token = soap_char_next_utf8(ctx);
        if (token == XML_EOF)
            return ctx->nesting_level == 0;
        if (token == XML_START) {
            if (!put_start(ctx, events))
                return false;
        } else if (token == XML_END) {
            ctx->look_ahead = token;
            if (soap_element_in_end(ctx, nullptr) != 0)
                return false;
            events += "</" + std::string(ctx->tag) + ">";
        } else if (ctx->nesting_level != 0) {
            char bytes[6];
            events.append(bytes, utf8_encode(token_code(token), bytes));
        }
    }
}

// Compares a document's two readings; long texts are cut to where they part.
void compare(const std::string &document, const std::string &expected, std::size_t first, std::size_t piece)
{
    reception in(document, first, piece, MODE_UTF_STRINGS);
    std::string events;
    EXPECT_TRUE(reader_events(in, events));
    const auto parted = std::mismatch(events.begin(), events.end(), expected.begin(), expected.end());
    const auto from =
        static_cast<std::size_t>(std::max<std::ptrdiff_t>(parted.first - events.begin() - 60, 0));
    EXPECT_TRUE(events == expected) << "reader:    " << events.substr(from, 120)
                                    << "\nreference: " << expected.substr(from, 120) << "\nfirst " << first
                                    << " piece " << piece;
}

class grammar {
public:
    explicit grammar(unsigned seed) : random_(seed) {}

    std::string document()
    {
        std::string text =
            one_of({"", "<?xml version='1.0'?>", "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"});
        text += misc() + element(0) + misc();
        return text;
    }

private:
    unsigned below(unsigned bound) { return static_cast<unsigned>(random_() % bound); }

    std::string one_of(std::initializer_list<const char *> choices)
    {
        return *(choices.begin() + below(static_cast<unsigned>(choices.size())));
    }

    std::string name()
    {
        return one_of({"a", "b", "item", "x:item", "x:a-rather-long.name_1", "y:b", "\xC3\xA9l"});
    }
    std::string blank() { return one_of({"", "", " ", "\n  ", "\t"}); }
    std::string misc()
    {
        return one_of({"", "\n", "<!-- c -->", "<?p q?>", "<!-- <a> & -->\n<?p <a ?b?\?>"});
    }

    std::string characters(bool attribute)
    {
        std::string text;
        for (unsigned i = below(6); i != 0; --i) {
            text += one_of({"text", "a longer run of words without anything special in it", "\xC3\xA9",
                            "\xE2\x82\xAC", "\xF0\x9F\x98\x80", "&lt;", "&amp;", "&#233;", "&#x20AC;",
                            "&quot;", "&gt;", "/", "-", "?", "]]-", " "});
            if (!attribute)
                text += one_of({"", "", "\"", "'", ">", "/>", "\n", "<![CDATA[<x>&y;]]>", "<![CDATA[]]]]>",
                                "<!--t-->", "<?i <j> ?>"});
        }
        return text;
    }

    std::string attributes()
    {
        static const char *const names[] = {"id", "x:type", "y:nil", "long-attribute-name", "n\xC3\xB6"};
        std::string text;
        for (const char *attribute : names) {
            if (below(4) != 0)
                continue;
            const std::string quote = one_of({"\"", "'"});
            text += " " + blank() + attribute + blank() + "=" + blank() + quote + characters(true) + quote;
        }
        return text;
    }

    std::string element(int depth)
    {
        const std::string tag = name();
        const std::string scope = depth == 0 ? " xmlns:x='urn:one' xmlns:y=\"urn:two\"" : "";
        std::string text = "<" + tag + scope + attributes() + blank();
        if (below(5) == 0)
            return text + "/>";
        text += ">";
        for (unsigned i = depth < 6 ? below(5) : 0; i != 0; --i)
            text += characters(false) + element(depth + 1);
        return text + characters(false) + "</" + tag + blank() + ">";
    }

    std::mt19937 random_;
};

TEST(xml_reference, random_documents_read_the_same)
{
    const auto compare_in_pieces = [](const std::string &document, std::size_t first, std::size_t piece) {
        std::string expected;
        ASSERT_TRUE(reference_events(document, expected)) << document;
        compare(document, expected, SOAP_BUFFER_SIZE, SOAP_BUFFER_SIZE);
        compare(document, expected, 1, 1);
        compare(document, expected, first, piece);
    };
    std::string large = "<all>"; // more than the buffer holds
    for (unsigned seed = 1; seed <= 400; ++seed) {
        SCOPED_TRACE(seed);
        const std::string document = grammar(seed).document();
        compare_in_pieces(document, seed % 97 + 1, seed % 13 + 2);
        large += document.substr(document.starts_with("<?xml ") ? document.find("?>") + 2 : 0);
    }
    compare_in_pieces(large + "</all>", 1000, 1447);
}

} // namespace
