// xml_token_test.cpp - tokens, references and encodings of XML input.
#include "support/reader_input.h"

#include "codec/xml_token.h"

using reader_input::every_reading;

namespace {

// Tokens as a text: characters from references in braces, other codes by number, markup as [..].
std::string token_text(std::int32_t token)
{
    static const char *const markup[] = {"", "[eof]", "[<]", "[</]", "[>]", "[\"]", "[']"};
    if (token < 0 && !is_reference(token))
        return markup[-token];
    const std::uint32_t code = token_code(token);
    std::string text =
        code > ' ' && code < 127 ? std::string(1, static_cast<char>(code)) : "#" + std::to_string(code);
    return is_reference(token) ? "{" + text + "}" : text;
}

std::string tokens(std::int32_t (*next)(soap *), soap *ctx)
{
    std::string text;
    for (int i = 0; i < 400; ++i) {
        const std::int32_t token = next(ctx);
        text += token_text(token);
        if (token == XML_EOF)
            break;
    }
    return text;
}

struct token_case {
    const char *rule;
    std::string document;
    const char *expected;
};

void check_tokens(std::int32_t (*next)(soap *), std::uint32_t mode, const token_case &c)
{
    SCOPED_TRACE(c.rule);
    EXPECT_EQ(every_reading(c.document, mode, [next](soap *ctx) { return tokens(next, ctx); }), c.expected);
}

TEST(XmlTokens, markup_is_folded_into_tokens_and_comments_are_invisible)
{
    const token_case cases[] = {
        {"tags", "<a>b</a>", "[<]a[>]b[</]a[>][eof]"},
        {"blanks behind the bracket", "< a>< / b>", "[<]a[>][</]#32b[>][eof]"},
        {"quotes", "x=\"a'", "x=[\"]a['][eof]"},
        {"comment", "a<!-- <b> ' -->c", "ac[eof]"},
        {"comment of dashes", "a<!------>c", "ac[eof]"},
        {"instruction", "a<?p <x> ?>b", "ab[eof]"},
        {"instruction with marks inside", "a<?p ?a>b?\?>c", "ac[eof]"},
        {"declaration", "<!DOCTYPE d [<!ENTITY e 'v'>]>a", "a[eof]"},
        {"percent", "<%p <x> %>a", "a[eof]"},
        {"section", "<![CDATA[<&\"]]>b", "<&\"b[eof]"},
        {"section by another name", "<![XYZ[<]]>b", "<b[eof]"},
        {"brackets in a section", "<![CDATA[]a]]b]]]>]]", "]a]]b]]][eof]"},
        {"empty section", "a<![CDATA[]]>b", "ab[eof]"},
        {"end in a comment", "a<!-- b", "a[eof]"},
        {"end behind the bracket", "a<", "a[eof]"},
        {"end in an instruction", "<?xml ", "[eof]"},
        {"end in a section", "<![CDATA[a]]", "a]][eof]"},
    };
    for (const token_case &c : cases)
        check_tokens(soap_char_next, 0, c);
}

TEST(XmlTokens, references_give_their_character_and_never_markup)
{
    const token_case cases[] = {
        {"named", "&lt;&gt;&amp;&quot;&apos;", "{<}{>}{&}{\"}{'}[eof]"},
        {"numbered", "&#65;&#x41;&#X4a;&#x1F600;", "{A}{A}{J}{#128512}[eof]"},
        {"Latin-1 names", "&nbsp;&yuml;&euro;", "{#160}{#255}{#127}[eof]"},
        {"case doesn't count, the first row wins", "&Auml;&auml;&EURO;", "{#196}{#196}{#127}[eof]"},
        {"upper case is no markup name", "&AMP;", "{#127}[eof]"},
        {"unknown", "&unknown;", "{#127}[eof]"},
        {"seven bytes are kept", "&#x12345678;", "{#74565}[eof]"},
        {"too large for the flag", "&#xFFFFFFFF;&#4294967295;", "{#1048575}{#429496}[eof]"},
        {"no character", "&#0;&#;&#x;&#-1;&;", "{#127}{#127}{#127}{#127}{#127}[eof]"},
        {"stray ampersand", "a&b<c>", "a{#127}[<]c[>][eof]"},
        {"two stray ones", "&&lt;", "{#127}{<}[eof]"},
        {"swallows a bounded stretch", "&" + std::string(64, 'n') + ";ok", "{#127};ok[eof]"},
        {"end of input", "&am", "{#127}[eof]"},
    };
    for (const token_case &c : cases)
        check_tokens(soap_char_next, 0, c);
}

TEST(XmlTokens, utf8_is_decoded_unless_the_input_is_latin1)
{
    const token_case utf8[] = {
        {"two to four bytes", "\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80", "#233#8364#128512[eof]"},
        {"five and six bytes", "\xF8\x88\x80\x80\x80\xFC\x84\x80\x80\x80\x80\xFD\xBF\xBF\xBF\xBF\xBF",
         "#2097152#67108864#2147483647[eof]"},
        {"a lone byte is Latin-1", "\xE9t\xE9", "#233t#40959[eof]"},
        {"markup stays markup", "\xE9<b>", "#233[<]b[>][eof]"},
        {"missing continuation", "\xE2\x82", "#8383[eof]"},
        {"in a section", "<![CDATA[\xC3\xA9]]>", "#233[eof]"},
    };
    for (const token_case &c : utf8)
        check_tokens(soap_char_next_utf8, 0, c);
    check_tokens(soap_char_next_utf8, MODE_LATIN1, {"Latin-1", "\xC3\xA9", "#195#169[eof]"});
    check_tokens(soap_char_next, 0, {"raw layer", "\xC3\xA9", "#195#169[eof]"});
}

TEST(XmlTokens, the_declaration_chooses_the_encoding)
{
    const struct {
        const char *document;
        std::uint32_t before;
        bool latin1;
    } cases[] = {
        {"<?xml version='1.0' encoding=\"ISO-8859-1\"?>x", 0, true},
        {"<?xml version='1.0' encoding='iso-8859-15'?>x", 0, true},
        {"<?xml encoding=\"latin1\"?>x", 0, true},
        {"<?xml\nencoding=\"latin1\"?>x", 0, true},
        {"<?xml version='1.0' encoding=\"utf-8\"?>x", MODE_LATIN1, false},
        {"<?xml version='1.0' encoding=\"UTF-8\"?>x", MODE_LATIN1, false},
        {"<?xml version='1.0' encoding=\"koi8-r\"?>x", MODE_LATIN1, true},
        {"<?xml version='1.0' encoding=?>x", MODE_LATIN1, true},
        {"<?xsl version='1.0' encoding=\"latin1\"?>x", 0, false},
    };
    for (const auto &c : cases) {
        SCOPED_TRACE(c.document);
        EXPECT_EQ(every_reading(c.document, c.before,
                                [](soap *ctx) {
                                    EXPECT_EQ(soap_char_next(ctx), 'x');
                                    return std::string(ctx->mode & MODE_LATIN1 ? "latin1" : "utf-8");
                                }),
                  c.latin1 ? "latin1" : "utf-8");
    }
}

TEST(XmlTokens, the_end_of_input_stays)
{
    reader_input::reception in("a");
    EXPECT_EQ(soap_char_next(in.context()), 'a');
    EXPECT_EQ(soap_char_next(in.context()), XML_EOF);
    in.context()->on_recv = [](soap *, char *, std::size_t) -> std::size_t {
        ADD_FAILURE() << "asked for more input behind its end";
        return 0;
    };
    EXPECT_EQ(soap_char_next(in.context()), XML_EOF);
    EXPECT_EQ(soap_char_next_utf8(in.context()), XML_EOF);
}

} // namespace
