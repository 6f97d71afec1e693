// xml_text.h - element text for the reader's own files and the binding: in place, or gathered in the growing
// text.
//
// Elsewhere: managed texts (soap_string_read and those after it in soap_xml.h).
#pragma once

#include <string_view>

#include <zuv_client_pro/soap_memory.h>

#include "core/text_encoding.h"
#include "xml/xml_scan.h"
#include "xml/xml_token.h"

// When the whole text up to "</" is in the buffer as it is to be (no child, no reference, no CDATA
// section, nothing to decode), consumes it and gives its place and length; else false, with nothing consumed.
// The text isn't terminated, and lives until the next read. Nothing may be held.
bool xml_text_in_place(soap *ctx, const char **text, std::size_t *length);

// The same for the whole element whose start tag is held: when it has neither attributes nor children, and
// all of it is in the buffer, consumes it with its end tag. Any name and no type is asked for. Not in
// strict mode.
bool xml_leaf_in_place(soap *ctx, std::string_view *text);

// What the message and its strings are made of, as far as bytes from 128 on go.
constexpr std::uint32_t BYTE_MODES = MODE_LATIN1 | MODE_WINDOWS_1252 | MODE_UTF_STRINGS;

// The rest of stretch_end from a byte of 128 or above on. From Latin-1 to Latin-1 all stay as they are,
// from UTF-8 to UTF-8 what is well-formed; else none.
template <template <bool> class Stop>
[[gnu::noinline]] const char *high_stretch_end(const soap *ctx, const char *here, const char *end)
{
    const std::uint32_t bytes = ctx->mode & BYTE_MODES;
    if (bytes == MODE_UTF_STRINGS)
        return utf8_stretch_end<Stop>(here, end);
    return bytes == MODE_LATIN1 ? Stop<false>::find(here, end) : here;
}

// The first byte of [here, end) that isn't part of a string unchanged: one of the class Stop, or one from
// 128 on that has to be decoded.
template <template <bool> class Stop>
[[gnu::always_inline]] inline const char *stretch_end(const soap *ctx, const char *here, const char *end)
{
    const char *const stop = Stop<true>::find(here, end);
    return stop != end && is_high(*stop) ? high_stretch_end<Stop>(ctx, stop, end) : stop;
}

[[gnu::always_inline]] inline const char *text_end(const soap *ctx, const char *here, const char *end)
{
    return stretch_end<text_stop>(ctx, here, end);
}

// The next token of a string, decoded. A control character means no character.
inline std::int32_t text_token(soap *ctx)
{
    const std::int32_t token = soap_char_next_utf8(ctx);
    return token >= 0 && token < ' ' && is_control(static_cast<char>(token))
               ? xml_no_character(ctx, SOAP_SYNTAX_ERROR)
               : token;
}

// Appends to the growing text. SOAP_OK or SOAP_OUT_OF_MEMORY.
int text_put(soap *ctx, const char *text, std::size_t length);

// Appends a decoded character: as UTF-8 in a string of UTF-8; else as one byte, those above 255 as "?".
int text_put_code(soap *ctx, std::uint32_t code);

// Appends the character of a token of text_token.
int text_put_token(soap *ctx, std::int32_t token);

// Bounds of a text in characters, and what has been counted of it in the growing text.
struct text_limits {
    long minimum;            // no bound from 0 down
    long maximum;            // no bound below 0
    std::uint64_t count = 0; // characters
    std::size_t counted = 0; // bytes of the growing text that `count` covers
};

// Counts what was appended since the last call. SOAP_OK or SOAP_LENGTH when that is more than the maximum.
int text_limits_check(soap *ctx, text_limits &limits);

// The same at the end of the text, against both bounds.
int text_limits_finish(soap *ctx, text_limits &limits);

// Where markup inside a text is: which token ends the text, and which one is part of it.
//
// A text ends at the end tag of the element around it. One that began with a held start tag takes that whole
// element in and ends at the next start tag too.
class text_depth {
public:
    text_depth() = default;
    explicit text_depth(bool held, bool open) : held_(held), open_(open ? 1 : 0) {}

    // Takes the next token into account. True: the text ends before it.
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
// held, as a string of the mode.
text_depth text_take_held_tag(soap *ctx, std::size_t *length);

// Form 0 of soap_string_read, gathered in the growing text. 0 or an error.
int text_gather_raw(soap *ctx, text_limits &limits);

// The content of an element as form 0 or 1 of soap_string_read, in place or in the growing text, not
// terminated; until the next read. Null on failure.
const char *xml_string_text(soap *ctx, int form, long minimum, long maximum, std::size_t *length);
