// xml_text.h - element text for the reader's own files and the binding: in place, or gathered in the growing
// text.
//
// Elsewhere: managed texts (soap_string_read and its kin in soap_xml.h).
#pragma once

#include <string_view>

#include <zuv_client_pro/soap_memory.h>

#include "codec/xml_scan.h"
#include "codec/xml_token.h"

// When the whole text up to "</" stands in the buffer as it is to be (no child, no reference, no CDATA
// section, nothing to decode), consumes it and gives its place and length; else false, with nothing consumed.
// The text isn't terminated, and lives until the next read. Nothing may be held.
bool xml_text_in_place(soap *ctx, const char **text, std::size_t *length);

// The same for the whole element whose start tag is held: when it has neither attributes nor children, and
// all of it stands in the buffer, consumes it with its end tag. Any name and no type is asked for. Not in
// strict mode.
bool xml_leaf_in_place(soap *ctx, std::string_view *text);

// Truth: bytes from 128 on have to be decoded before they become characters of a byte string.
inline bool text_needs_decoding(const soap *ctx)
{
    return (ctx->mode & (MODE_LATIN1 | MODE_UTF_STRINGS)) == 0;
}

// The first byte of [here, end) that isn't text as it stands.
inline const char *text_end(const soap *ctx, const char *here, const char *end)
{
    return text_needs_decoding(ctx) ? text_decode_stop::find(here, end) : text_stop::find(here, end);
}

// The next token of a byte string: a byte of UTF-8 if strings are kept so, else a decoded character.
inline std::int32_t text_token(soap *ctx)
{
    return (ctx->mode & MODE_UTF_STRINGS) != 0 ? soap_char_next(ctx) : soap_char_next_utf8(ctx);
}

// Appends to the growing text. 0 or error 20.
int text_put(soap *ctx, const char *text, std::size_t length);

// Appends a decoded character. In a string of UTF-8 it takes up to six bytes. In any other string a character
// has one byte: those above 255 become "?", and so does zero, in text of any kind.
int text_put_code(soap *ctx, std::uint32_t code);

// Appends the character of a token of text_token. Bytes of UTF-8 pass as they are.
int text_put_token(soap *ctx, std::int32_t token);

// Writes a code point as UTF-8, one to six bytes. The number of bytes.
std::size_t utf8_encode(std::uint32_t code, char target[6]);

// Bounds of a text in characters, and what has been counted of it in the growing text.
struct text_limits {
    long minimum;            // no bound from 0 down
    long maximum;            // no bound below 0
    std::uint64_t count = 0; // characters
    std::size_t counted = 0; // bytes of the growing text that `count` covers
};

// Counts what was appended since the last call. 0, or error 45 when that is more than the maximum.
int text_limits_check(soap *ctx, text_limits &limits);

// The same at the end of the text, against both bounds.
int text_limits_finish(soap *ctx, text_limits &limits);

// Where markup inside a text stands: which token ends the text, and which one is part of it.
//
// A text ends at the end tag of the element around it. One that began with a held start tag takes that whole
// element in and ends at the next start tag too.
class text_depth {
public:
    text_depth() = default;
    explicit text_depth(bool held, bool open) : held_(held), open_(open ? 1 : 0) {}

    // Takes the next token into account. True: the text ends ahead of it.
    bool ends_at(std::int32_t token);

    bool in_tag() const { return in_tag_; }
    bool in_quotes() const { return quote_ != 0; }

private:
    void tag_token(std::int32_t token);

    bool held_ = false;      // the text began with a start tag
    bool in_tag_ = false;    // between "<" and ">"
    bool start_tag_ = false; // it is a start tag, or an empty element's
    std::int32_t quote_ = 0; // token that ends the attribute value
    std::int32_t last_ = 0;  // last token of the tag that is no blank
    std::uint64_t open_ = 0; // elements begun in the text
};

// Gives up a held tag: its text is rebuilt in scratch_text (a managed text has it first), empty if none is
// held.
text_depth text_take_held_tag(soap *ctx, std::size_t *length);

// Form 0 of soap_string_read, gathered in the growing text. 0 or an error.
int text_gather_raw(soap *ctx, text_limits &limits);
