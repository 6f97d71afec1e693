// xml_read.h - start tags, for the reader's own files and the binding.
//
// Elsewhere: elements as the public sees them (soap_xml.h), text (xml_text.h).
#pragma once

#include <zuv_client_pro/soap_error.h>

#include "xml/namespace_scope.h"
#include "xml/tag_view.h"
#include "xml/xml_input.h"
#include "xml/xml_scan.h"
#include "xml/xml_text.h"

// A name up to this many bytes is copied by one block of so many: cheaper than a copy of its exact length.
constexpr std::size_t SHORT_NAME = 64;

// Reads the attributes after a tag's name up to the ">" or "/" that ends them, which stays unread: records
// in the attribute table, declarations on the prefix stack. Those that come first of all attributes have no
// records until others follow; soap::bare_declarations counts them. 0, -1, 5, 20 or 47. `names_wide` is set if values
// that are names are UTF-8 though strings are Latin-1, until they have been applied.
// `all_taken`: there were only such, whole in the buffer and with them the end of the tag.
int xml_attributes_read(soap *ctx, bool *names_wide, bool *all_taken);

// Makes attribute records of the held element's declarations, where none were needed yet: whoever looks at
// the records themselves calls it first. 0 or 20.
int xml_attributes_complete(soap *ctx);

// Sets the context's fields from the attributes that the library itself understands, without the white space
// around them. Clears the error.
void xml_attributes_apply(soap *ctx, bool names_wide);

// Nothing is held any more, nor known of a tag but what `tag` holds.
inline void xml_tag_forget(soap *ctx)
{
    ctx->peeked = 1;
    ctx->tag_resolved = false;
    ctx->bare_declarations = 0;
    ctx->element_id[0] = '\0';
    ctx->element_href[0] = '\0';
    ctx->element_type[0] = '\0';
    ctx->array_type[0] = '\0';
    ctx->array_size[0] = '\0';
    ctx->array_offset[0] = '\0';
    ctx->other_flag = 0;
    ctx->root_flag = -1;
    ctx->position_count = 0;
    ctx->null_flag = 0;
    ctx->must_understand = 0;
}

// The innermost declaration is of an element that has ended.
inline bool xml_prefixes_end(const soap *ctx)
{
    return ctx->prefix_list != nullptr && ctx->prefix_list->level >= ctx->nesting_level;
}

// Where the next thing that is no blank begins, in the buffer or at its end.
inline const char *xml_after_blanks(const soap *ctx)
{
    const char *p = input_here(ctx);
    const char *const end = input_end(ctx);
    while (p != end && is_blank(static_cast<unsigned char>(*p)))
        ++p;
    return p;
}

// The short way of soap_element_head_read and soap_held_tag where the tag guessed at comes next, whole in the
// buffer. False: nothing was consumed.
inline bool xml_guessed_head_read(soap *ctx, const tag_guess &guess, tag_view *tag)
{
    if (ctx->peeked != 0 || ctx->look_ahead != 0 || ctx->in_cdata != CDATA_OUTSIDE ||
        ctx->attributes_set != 0 || ctx->prefix_cache_list != ctx->prefix_list || xml_prefixes_end(ctx))
        return false;
    const char *const p = xml_after_blanks(ctx);
    if (input_end(ctx) - p <= static_cast<std::ptrdiff_t>(SHORT_NAME) ||
        !same_of_32(p, guess.text, guess.length) ||
        (ctx->prefix_cache_valid >> guess.prefix_place & 1) == 0 ||
        ctx->namespace_scope->prefix_changes[guess.prefix_place] != guess.changes)
        return false;
    const std::size_t length = guess.length - 2U;
    xml_tag_forget(ctx);
    std::memcpy(ctx->tag, guess.text + 1, tag_guess::SIZE - 1);
    ctx->tag[length] = '\0';
    ctx->tag_length = static_cast<std::uint16_t>(length);
    ctx->tag_local = guess.local;
    ctx->tag_row = ctx->prefix_cache[guess.prefix_place].row;
    ctx->tag_resolved = true;
    ctx->namespace_scope->tag_prefix = guess.prefix_place;
    ctx->has_body = 1;
    ctx->error = 0;
    input_consume(ctx, p + guess.length);
    *tag = {ctx->tag + guess.local, static_cast<std::uint32_t>(length - guess.local), ctx->tag_row};
    return true;
}

// Makes the held tag, which soap_held_tag has resolved, the one guessed at; false if it is none to guess.
bool xml_head_guess(const soap *ctx, tag_guess &guess);

// The short way of soap_element_head_read, which finds no tag, and soap_element_in_end for any name where a
// short end tag comes next, whole in the buffer. False, in strict mode too: nothing was consumed.
bool xml_next_end_read(soap *ctx);

// Reads a character of a name from 128 on, and appends it to the `kept` bytes of `name` if it fits.
void xml_name_character(soap *ctx, char *name, std::size_t &kept);

// Reads a name up to a byte of the class Stop, which stays unread. Keeps what fits `name` (SOAP_TEXT_SIZE
// bytes), in UTF-8, terminated; the rest is dropped. The kept length.
template <template <bool> class Stop> std::size_t xml_name_read(soap *ctx, char *name)
{
    std::size_t kept = 0;
    while (input_ready(ctx)) {
        const char *here = input_here(ctx);
        const char *stop = Stop<true>::find(here, input_end(ctx));
        const auto found = static_cast<std::size_t>(stop - here);
        if (kept == 0 && found < SHORT_NAME &&
            input_end(ctx) - here >= static_cast<std::ptrdiff_t>(SHORT_NAME) && !is_high(*stop)) {
            std::memcpy(name, here, SHORT_NAME);
            name[found] = '\0';
            input_consume(ctx, stop);
            return found;
        }
        const std::size_t space = SOAP_TEXT_SIZE - 1 - kept;
        const std::size_t taken = found < space ? found : space;
        std::memcpy(name + kept, here, taken);
        kept += taken;
        input_consume(ctx, stop);
        if (stop == input_end(ctx))
            continue;
        if (!is_high(*stop))
            break;
        xml_name_character(ctx, name, kept);
    }
    name[kept] = '\0';
    return kept;
}
