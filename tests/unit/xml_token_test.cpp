// xml_token_test.cpp - tokens, references and encodings of XML input.
#include "support/reader_input.h"
#include "xml/xml_token.h"

using namespace reader_input;

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
    return ctx->error == 0 ? text : text + failure(ctx);
}

std::string utf8_tokens(soap *ctx)
{
    return tokens(soap_char_next_utf8, ctx);
}

std::string raw_tokens(soap *ctx)
{
    return tokens(soap_char_next, ctx);
}

// What is well-formed is compared with another parser, in xml_reference_test.cpp.
TEST(xml_tokens, markup_is_folded_into_tokens_and_comments_are_invisible)
{
    const reading rows[] = {
        {"blanks after the bracket", "< a>< / b>", "[<]a[>][</]#32b[>][eof]"},
        {"quotes", "x=\"a'", "x=[\"]a['][eof]"},
        {"comments of dashes", "a<!------><!--> - <b-->c", "ac[eof]"},
        {"instruction with marks inside", "a<?p ?a>b?\?>c", "ac[eof]"},
        {"declarations", "<!DOCTYPE d [<!ENTITY e 'v'>]><!-d>a", "a[eof]"},
        {"percent", "<%p <x> %>a", "a[eof]"},
        {"section by another name", "<![XYZ[<]]>b", "<b[eof]"},
        {"brackets in a section", "<![CDATA[]a]]b]]]>]]", "]a]]b]]][eof]"},
        {"end in a comment", "a<!-- b", "a[eof]"},
        {"end after a comment's dash", "a<!-- b -", "a[eof]"},
        {"end in a declaration", "a<!DOCTYPE b", "a[eof]"},
        {"end in a section's name", "a<![CDA", "a[eof]"},
        {"end after the bracket", "a<", "a[eof]"},
        {"end in an instruction", "<?xml ", "[eof]"},
        {"end in a section", "<![CDATA[a]]", "a]][eof]"},
    };
    expect_readings(rows, raw_tokens);
}

TEST(xml_tokens, references_give_their_character_and_never_markup)
{
    const reading rows[] = {
        {"named", "&lt;&gt;&amp;&quot;&apos;", "{<}{>}{&}{\"}{'}[eof]"},
        {"numbered", "&#65;&#x41;&#X4a;&#x1F600;", "{A}{A}{J}{#128512}[eof]"},
        {"Latin-1 names", "&nbsp;&yuml;&euro;", "{#160}{#255}{#127}[eof]"},
        {"case doesn't count, the first row wins", "&Auml;&auml;&EURO;", "{#196}{#196}{#127}[eof]"},
        {"upper case is no markup name", "&AMP;", "{#127}[eof]"},
        {"zeros before and the last character", "&#0000065;&#x000000000041;&#x10FFFF;&#1114111;",
         "{A}{A}{#1114111}{#1114111}[eof]"},
        {"numbers of no character",
         "&#0;&#11;&#xD800;&#xDFFF;&#xFFFE;&#x110000;&#xFFFFFFFFFFFFFFFF;&#4294967361;",
         "{?}{?}{?}{?}{?}{?}{?}{?}[eof]"},
        {"no numbers", "&#;&#x;&#-1;&;", "{#127}{#127}{#127}{#127}[eof]"},
        {"stray ampersands", "a&b<c>&&lt; & \xE9;", "a{#127}[<]c[>]{#127}{<}#32{#127}#32#233;[eof]"},
        {"swallows a bounded stretch", "&" + std::string(64, 'n') + ";ok", "{#127};ok[eof]"},
        {"end of input", "&am", "{#127}[eof]"},
    };
    expect_readings(rows, raw_tokens);
    for (const char *wrong :
         {"&#0;", "&#xD800;", "&#x110000;", "&#;", "&#65x;", "&euro;", "&;", "&b<c>", "& "}) {
        const reading row[] = {{wrong, wrong, "[eof]!5", MODE_STRICT}};
        expect_readings(row, raw_tokens);
    }
}

TEST(xml_tokens, bytes_are_decoded_by_the_encoding)
{
    const reading rows[] = {
        {"five and six bytes", "\xF8\x88\x80\x80\x80\xFC\x84\x80\x80\x80\x80|", "??|[eof]"},
        {"a lone byte is Latin-1", "\xE9t\xE9", "#233t#233[eof]"},
        {"a lone byte isn't UTF-8", "\xE9t\xE9", "?t?[eof]", MODE_UTF_STRINGS},
        {"markup stays markup", "\xE9<b>\xE2\x82</", "#233[<]b[>]?[</][eof]"},
        {"in a section", "<![CDATA[\xC3\xA9\xE2]]>", "#233#226[eof]"},
        {"Latin-1", "\xC3\xA9", "#195#169[eof]", MODE_LATIN1},
        {"refused", "a\xE2\x82|", "a[eof]!47", MODE_STRICT},
    };
    expect_readings(rows, utf8_tokens);
}

TEST(xml_tokens, the_declaration_chooses_the_encoding)
{
    const reading rows[] = {
        {"double quotes", "<?xml version='1.0' encoding=\"ISO-8859-1\"?>x", "latin1"},
        {"single quotes", "<?xml version='1.0' encoding='Latin1'?>x", "latin1"},
        {"no version", "<?xml\nencoding=\"iso-8859-1\"?>x", "latin1"},
        {"blanks", "<?xml version='1.0'" + std::string(80, ' ') + "encoding\n= 'ISO-8859-1' ?>x", "latin1"},
        {"utf-8", "<?xml version='1.0' encoding=\"utf-8\"?>x", "utf-8", MODE_LATIN1},
        {"ascii", "<?xml version='1.0' encoding=\"US-ASCII\"?>x", "utf-8", MODE_LATIN1},
        {"windows", "<?xml version='1.0' encoding=\"Windows-1252\"?>x", "windows"},
        {"the last one counts", "<?xml encoding='cp1252'?><?xml encoding='latin1'?>x", "latin1"},
        {"no name", "<?xml version='1.0' encoding=?>x", "latin1", MODE_LATIN1},
        {"another instruction", "<?xsl version='1.0' encoding=\"latin1\"?>x", "utf-8"},
        {"unknown", "<?xml version='1.0' encoding=\"koi8-r\"?>x", "refused 'koi8-r'", MODE_LATIN1},
        {"unknown, with strings in UTF-8", "<?xml encoding='iso-8859-15'?>x", "refused 'iso-8859-15'",
         MODE_UTF_STRINGS},
        {"not in these bytes", "<?xml encoding='UTF-16'?>x", "refused 'UTF-16'"},
        {"no bytes for a trace", "<?xml encoding='a\xE9&amp;\x7F<b'?>x", "refused 'a?&amp;?<b'"},
    };
    expect_readings(rows, [](soap *ctx) -> std::string {
        const std::int32_t token = soap_char_next_utf8(ctx);
        if (token == XML_EOF && ctx->error == SOAP_UTF_ERROR) {
            const std::string text = *soap_fault_string_field(ctx);
            return "refused " + text.substr(text.find('\''), text.rfind('\'') - text.find('\'') + 1);
        }
        EXPECT_EQ(token, 'x');
        ctx->look_ahead = 0x80;
        const std::int32_t sign = ctx->mode & MODE_LATIN1 ? soap_char_next_utf8(ctx) : 0;
        return sign == 0x20AC ? "windows" : sign == 0x80 ? "latin1" : "utf-8";
    });
}

} // namespace
