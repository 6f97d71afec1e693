// xml_read.cpp - elements on input: the held start tag, consuming it, its end, and dropping what no one
// knows.
//
// Here: the life of a start tag between questions. Elsewhere: attributes (xml_read_attributes.cpp), names and
// namespaces (tag_compare.cpp), tokens (xml_token.cpp), text (xml_text.cpp).
//
// Always: a start tag is read once and held until it is consumed, skipped or taken as text; nesting_level
// counts consumed elements that have content.
#include "xml/xml_read.h"

#include <cstring>
#include <string_view>

#include <zuv_client_pro/soap_error.h>

#include "core/failure.h"
#include "xml/attributes.h"
#include "xml/default_head.h"
#include "xml/namespace.h"
#include "xml/root_head.h"

namespace {

int no_tag(soap *ctx, int error)
{
    ctx->tag[0] = '\0';
    ctx->tag_length = 0;
    ctx->has_body = 1; // whatever comes is content of the element around it
    return fail(ctx, error);
}

// A code left by a search that found nothing says nothing about the input; any other says why it ended.
int end_of_input(soap *ctx)
{
    const int error = ctx->exceeded != nullptr ? static_cast<int>(SOAP_LENGTH) : ctx->error;
    return error == 0 || error == SOAP_TAG_MISMATCH || error == SOAP_NO_TAG ? SOAP_EOF : error;
}

// A byte-order mark may come before a tag. 0 when the next token can be read, 47 on UTF-16.
int pass_byte_order_mark(soap *ctx)
{
    if (ctx->look_ahead < 0 || ctx->in_cdata != CDATA_OUTSIDE)
        return SOAP_OK;
    const std::int32_t first = soap_recv_byte(ctx);
    if (first < 0) { // the end of input
        ctx->look_ahead = XML_EOF;
        return SOAP_OK;
    }
    if (first != 0xEF && first != 0xFE && first != 0xFF) {
        ctx->look_ahead = first;
        return SOAP_OK;
    }
    const std::int32_t second = soap_recv_byte(ctx);
    if ((first == 0xFE && second == 0xFF) || (first == 0xFF && second == 0xFE))
        return SOAP_UTF_ERROR;
    if (first == 0xEF && second == 0xBB) {
        const std::int32_t third = soap_recv_byte(ctx);
        if (third == 0xBF) {
            ctx->mode &= ~ENCODING_MODES;
            return SOAP_OK;
        }
        // U+FEC0 and the following: pushed back as the one character that the three bytes are
        if (third == XML_EOF)
            ctx->look_ahead = XML_EOF;
        else
            ctx->look_ahead = static_cast<std::int32_t>(
                (0xFEC0u | (static_cast<std::uint32_t>(third) & 0x3F)) | XML_REFERENCE);
        return SOAP_OK;
    }
    if (second != XML_EOF)
        ctx->buffer_index--;
    ctx->look_ahead = first;
    return SOAP_OK;
}

// Token by token: refills, marks, comments, pushed-back tokens.
int find_start_tag_slow(soap *ctx)
{
    const int error = pass_byte_order_mark(ctx);
    if (error != 0)
        return no_tag(ctx, error);
    std::int32_t token;
    do
        token = soap_char_next_utf8(ctx);
    while (is_blank(token));
    if (token == XML_START)
        return SOAP_OK;
    if (token == XML_EOF)
        return no_tag(ctx, end_of_input(ctx));
    token_push_back(ctx, token);
    return no_tag(ctx, SOAP_NO_TAG);
}

// The place after the usual XML declaration, if that is at `p`, which begins an instruction, and a start
// tag follows in the buffer; else `p`.
const char *after_usual_declaration(soap *ctx, const char *p, const char *end)
{
    constexpr std::string_view usual = XML_USUAL_DECLARATION;
    if (static_cast<std::size_t>(end - p) < 2 + usual.size() || !same_name(p + 2, usual.data(), usual.size()))
        return p;
    const char *next = p + 2 + usual.size();
    while (next != end && is_blank(static_cast<unsigned char>(*next)))
        ++next;
    if (end - next < 2 || next[0] != '<' || static_cast<unsigned char>(next[1]) <= '?')
        return p;
    ctx->mode &= ~ENCODING_MODES;
    return next;
}

// Consumes up to and including the "<" of the next start tag; 0, or an error with no tag held.
int find_start_tag(soap *ctx)
{
    if (ctx->look_ahead == 0 && ctx->in_cdata == CDATA_OUTSIDE) {
        const char *p = xml_after_blanks(ctx);
        const char *const end = input_end(ctx);
        if (end - p >= 2 && p[0] == '<') {
            if (p[1] == '?')
                p = after_usual_declaration(ctx, p, end);
            if (static_cast<unsigned char>(p[1]) > '?') { // none of the marks that lead to something else
                input_consume(ctx, p + 1);
                return SOAP_OK;
            }
            if (p[1] == '/') {
                input_consume(ctx, p + 2);
                ctx->look_ahead = XML_END;
                return no_tag(ctx, SOAP_NO_TAG);
            }
        }
    }
    return find_start_tag_slow(ctx);
}

// The end of the name at `name` if it is short, else null. The buffer must hold SHORT_NAME bytes there.
template <template <bool> class Stop> const char *short_name_end(const char *name)
{
    const char *stop = Stop<true>::find(name, name + SHORT_NAME);
    return stop != name + SHORT_NAME ? stop : nullptr;
}

void keep_short_name(soap *ctx, const char *name, const char *stop)
{
    std::memcpy(ctx->tag, name, SHORT_NAME);
    ctx->tag_length = static_cast<std::uint16_t>(stop - name);
    ctx->tag[ctx->tag_length] = '\0';
}

// Takes the name at `name`, of an end tag, and the ">" after it, which most are, if it is short. False: nothing
// was consumed. The buffer must hold SHORT_NAME bytes there.
[[gnu::always_inline]] inline bool take_end_name(soap *ctx, const char *name)
{
    const char *const stop = short_name_end<end_name_stop>(name);
    if (stop == nullptr || *stop != '>')
        return false;
    keep_short_name(ctx, name, stop);
    input_consume(ctx, stop + 1);
    return true;
}

int read_tag_name(soap *ctx)
{
    if (input_skip_blanks(ctx) == XML_EOF)
        return no_tag(ctx, end_of_input(ctx));
    ctx->tag_length = static_cast<std::uint16_t>(xml_name_read<tag_name_stop>(ctx, ctx->tag));
    if (ctx->tag_length != 0)
        return SOAP_OK;
    return no_tag(ctx, xml_is_refused(ctx) ? ctx->error : static_cast<int>(SOAP_SYNTAX_ERROR));
}

// Drops the declarations of elements that have ended.
void pop_prefixes(soap *ctx)
{
    if (xml_prefixes_end(ctx))
        soap_prefix_pop(ctx);
}

int read_tag_end(soap *ctx)
{
    const std::int32_t byte = input_skip_blanks(ctx);
    if (byte == XML_EOF)
        return no_tag(ctx, end_of_input(ctx));
    ctx->buffer_index++;
    ctx->has_body = static_cast<std::int16_t>(byte != '/');
    if (byte != '/')
        return SOAP_OK;
    if (input_skip_blanks(ctx) == XML_EOF)
        return no_tag(ctx, end_of_input(ctx));
    ctx->buffer_index++; // the ">"
    return SOAP_OK;
}

// What the elements before this one have left: declarations of those that have ended, attributes of the last.
[[gnu::noinline]] void leave_previous_head(soap *ctx)
{
    pop_prefixes(ctx);
    if (ctx->attributes_set != 0)
        xml_attributes_hide(ctx);
}

// Reads a start tag that is a short name in brackets, with nothing but a default namespace known by now, and is
// whole in the buffer. False: the next thing is another, and nothing was consumed.
bool read_short_tag(soap *ctx)
{
    if (ctx->look_ahead != 0 || ctx->in_cdata != CDATA_OUTSIDE)
        return false;
    const char *const p = xml_after_blanks(ctx);
    if (input_end(ctx) - p <= static_cast<std::ptrdiff_t>(SHORT_NAME) || p[0] != '<' ||
        static_cast<unsigned char>(p[1]) <= '?') // one of the marks that lead to something else
        return false;
    const char *const name = p + 1, *const stop = short_name_end<tag_name_stop>(name);
    if (stop == nullptr)
        return false;
    if (*stop == '>') {
        input_consume(ctx, stop + 1);
        ctx->has_body = 1;
        if (xml_prefixes_end(ctx) || ctx->attributes_set != 0)
            leave_previous_head(ctx);
    } else if (!default_head_resume(ctx, name, stop)) {
        return false;
    } else if (ctx->attributes_set != 0) {
        xml_attributes_hide(ctx);
    }
    keep_short_name(ctx, name, stop);
    return true;
}

// A start tag of any kind; the rest of soap_element_head_read where it isn't a short one.
[[gnu::noinline]] int read_head(soap *ctx)
{
    if (find_start_tag(ctx) != 0 || read_tag_name(ctx) != 0)
        return ctx->error;
    leave_previous_head(ctx);
    if (input_ready(ctx) && *input_here(ctx) == '>') {
        ctx->buffer_index++;
        ctx->has_body = 1;
        return ctx->error = 0;
    }
    const bool root = root_head_stands_alone(ctx);
    if (root && root_head_resume(ctx))
        return ctx->error = 0;
    const char *const start = input_here(ctx);
    bool names_wide = false, all_taken = false;
    const int error = xml_attributes_read(ctx, &names_wide, &all_taken);
    if (error != 0)
        return no_tag(ctx, error == SOAP_EOF ? end_of_input(ctx) : error);
    if (read_tag_end(ctx) != 0)
        return ctx->error;
    if (all_taken && root)
        root_head_learn(ctx, start);
    else if (all_taken)
        default_head_learn(ctx, start);
    if (ctx->attributes_set != 0)
        xml_attributes_apply(ctx, names_wide);
    return ctx->error = 0;
}

int enter_element(soap *ctx)
{
    if (ctx->has_body == 0)
        return SOAP_OK;
    if (ctx->max_depth != 0 && ctx->nesting_level >= ctx->max_depth)
        return SOAP_LENGTH;
    ctx->nesting_level++;
    return SOAP_OK;
}

// The name of an end tag and its ">". 0, 5 when something else is there, or why the input ended.
int read_end_tag_name(soap *ctx)
{
    ctx->tag_resolved = false;
    if (ctx->look_ahead == 0 && input_end(ctx) - input_here(ctx) >= static_cast<std::ptrdiff_t>(SHORT_NAME) &&
        take_end_name(ctx, input_here(ctx)))
        return SOAP_OK;
    ctx->tag_length = static_cast<std::uint16_t>(xml_name_read<end_name_stop>(ctx, ctx->tag));
    const std::int32_t byte = input_skip_blanks(ctx);
    if (byte == XML_EOF)
        return end_of_input(ctx);
    if (byte != '>')
        return SOAP_SYNTAX_ERROR;
    ctx->buffer_index++;
    return SOAP_OK;
}

// Drops content up to and including the "</" that ends the present element.
int find_end_tag(soap *ctx, std::uint64_t depth)
{
    if (depth == 0 && ctx->look_ahead == XML_END) {
        ctx->look_ahead = 0;
        return SOAP_OK;
    }
    if (depth == 0 && ctx->look_ahead == 0 && ctx->in_cdata == CDATA_OUTSIDE) {
        const char *p = input_here(ctx);
        if (input_end(ctx) - p >= 2 && p[0] == '<' && p[1] == '/') {
            input_consume(ctx, p + 2);
            return SOAP_OK;
        }
    }
    return xml_skip_content(ctx, depth);
}

// `here` begins the end tag that repeats the name in `tag`, whole in the buffer and without blanks.
inline bool is_own_end(const soap *ctx, const char *here)
{
    const std::size_t length = ctx->tag_length;
    return static_cast<std::size_t>(input_end(ctx) - here) >= length + 3 && here[0] == '<' &&
           here[1] == '/' && here[2 + length] == '>' && same_name(here + 2, ctx->tag, length);
}

// The end tag of an element without children comes next, whole, and repeats the name that `tag` still holds.
// True: it was consumed.
bool leaf_ends(soap *ctx)
{
    if (ctx->peeked != 0 || ctx->look_ahead != 0 || ctx->in_cdata != CDATA_OUTSIDE)
        return false;
    const char *here = input_here(ctx);
    if (!is_own_end(ctx, here))
        return false;
    input_consume(ctx, here + ctx->tag_length + 3);
    return true;
}

void leave_element(soap *ctx)
{
    if (ctx->nesting_level != 0)
        ctx->nesting_level--;
}

// A type whose prefix isn't declared names no type at all. Generous reading takes it for one that it
// doesn't know.
bool has_undeclared_type(const soap *ctx)
{
    const std::string_view prefix = xml_prefix_of(ctx->element_type);
    return !prefix.empty() && xml_prefix_find(ctx, prefix) == nullptr;
}

// The ways of soap_element_in_begin and soap_element_in_end that are not the short ones. Kept out of line, so
// that the short ones save no registers for them.
[[gnu::noinline]] int begin_asked(soap *ctx, const char *tag, int nil_allowed, const char *type)
{
    const bool own_element = tag == nullptr || *tag != '-';
    if (soap_element_head_read(ctx) != 0) {
        if (ctx->error == SOAP_NO_TAG && !own_element)
            ctx->error = 0;
        return ctx->error;
    }
    if (ctx->other_flag != 0)
        return fail(ctx, SOAP_TAG_MISMATCH);
    if (!own_element)
        return ctx->error = 0;
    ctx->error = soap_tag_compare(ctx, ctx->tag, tag);
    if (ctx->error != 0)
        return ctx->error;
    // Refused tags stay held, so that nesting_level still shows where the reader is.
    if (type != nullptr && ctx->element_type[0] != '\0' &&
        soap_tag_compare(ctx, ctx->element_type, type) != 0)
        return fail(ctx, SOAP_TYPE_MISMATCH);
    if ((ctx->mode & MODE_STRICT) != 0) {
        if (has_undeclared_type(ctx))
            return fail(ctx, SOAP_TYPE_MISMATCH);
        if (nil_allowed == 0 && ctx->null_flag != 0)
            return fail(ctx, SOAP_NIL);
    }
    ctx->error = enter_element(ctx);
    if (ctx->error == 0)
        ctx->peeked = 0;
    return ctx->error;
}

[[gnu::noinline]] int end_after_content(soap *ctx, const char *tag, bool any_name)
{
    if (ctx->error == SOAP_NO_TAG)
        ctx->error = 0;
    const bool inside_held = ctx->peeked != 0 && ctx->tag[0] != '\0' && ctx->has_body != 0;
    ctx->peeked = 0;
    if (find_end_tag(ctx, inside_held ? 1 : 0) != 0)
        return ctx->error = end_of_input(ctx);
    const int error = read_end_tag_name(ctx);
    if (error != 0)
        return fail(ctx, error);
    if (!any_name) {
        pop_prefixes(ctx);
        if (soap_tag_compare(ctx, ctx->tag, tag) != 0)
            return fail(ctx, SOAP_SYNTAX_ERROR);
    }
    leave_element(ctx);
    return ctx->error = 0;
}

} // namespace

void xml_name_character(soap *ctx, char *name, std::size_t &kept)
{
    char bytes[6];
    const std::int32_t token = soap_char_next_utf8(ctx);
    const std::size_t size = token == XML_EOF ? 0 : utf8_encode(token_code(token), bytes);
    if (size > SOAP_TEXT_SIZE - 1 - kept)
        return;
    std::memcpy(name + kept, bytes, size);
    kept += size;
}

int soap_element_head_read(soap *ctx)
{
    if (ctx->peeked != 0)
        return ctx->tag[0] != '\0' ? 0 : fail(ctx, SOAP_NO_TAG);
    xml_tag_forget(ctx);
    return read_short_tag(ctx) ? ctx->error = 0 : read_head(ctx);
}

bool xml_head_guess(const soap *ctx, tag_guess &guess)
{
    const soap_namespace_scope *const scope = ctx->namespace_scope;
    const soap_prefix_cache &prefix = ctx->prefix_cache[scope->tag_prefix];
    const std::size_t length = ctx->tag_length;
    if (!ctx->tag_resolved || ctx->attributes_set != 0 || ctx->bare_declarations != 0 ||
        length + 2 > tag_guess::SIZE ||
        tag_name_stop<true>::find(ctx->tag, ctx->tag + length) != ctx->tag + length ||
        ctx->tag_local != (prefix.length != 0 ? prefix.length + 1 : 0) ||
        !same_name(ctx->tag, prefix.text, prefix.length))
        return false;
    guess.prefix_place = scope->tag_prefix;
    guess.changes = scope->prefix_changes[scope->tag_prefix];
    guess.local = static_cast<std::uint8_t>(ctx->tag_local);
    guess.length = static_cast<std::uint8_t>(length + 2);
    guess.text[0] = '<';
    std::memcpy(guess.text + 1, ctx->tag, length);
    guess.text[length + 1] = '>';
    return true;
}

bool xml_next_end_read(soap *ctx)
{
    if (ctx->peeked != 0 || ctx->look_ahead != 0 || ctx->in_cdata != CDATA_OUTSIDE ||
        (ctx->mode & MODE_STRICT) != 0)
        return false;
    const char *const p = xml_after_blanks(ctx);
    if (input_end(ctx) - p <= static_cast<std::ptrdiff_t>(SHORT_NAME) + 1 || p[0] != '<' || p[1] != '/' ||
        !take_end_name(ctx, p + 2))
        return false;
    xml_tag_forget(ctx);
    ctx->peeked = 0;
    ctx->has_body = 1;
    leave_element(ctx);
    ctx->error = 0;
    return true;
}

int soap_element_in_begin(soap *ctx, const char *tag, int nil_allowed, const char *type)
{
    if (tag == nullptr && ctx->peeked != 0 && ctx->tag[0] != '\0' && ctx->attributes_set == 0) {
        ctx->peeked = 0; // any element, and no attribute has a say
        return ctx->error = enter_element(ctx);
    }
    return begin_asked(ctx, tag, nil_allowed, type);
}

bool xml_leaf_in_place(soap *ctx, std::string_view *text)
{
    const bool is_plain_head =
        ctx->peeked != 0 && ctx->tag[0] != '\0' && ctx->attributes_set == 0 && ctx->has_body != 0;
    const bool too_deep = ctx->max_depth != 0 && ctx->nesting_level >= ctx->max_depth;
    if (!is_plain_head || too_deep || (ctx->mode & MODE_STRICT) != 0 || ctx->look_ahead != 0 ||
        ctx->in_cdata != CDATA_OUTSIDE)
        return false;
    const char *here = input_here(ctx);
    const char *stop = text_end(ctx, here, input_end(ctx));
    if (!is_own_end(ctx, stop))
        return false;
    *text = {here, static_cast<std::size_t>(stop - here)};
    input_consume(ctx, stop + ctx->tag_length + 3);
    ctx->peeked = 0;
    ctx->error = 0;
    return true;
}

int soap_element_in_end(soap *ctx, const char *tag)
{
    if (tag != nullptr && *tag == '-')
        return SOAP_OK;
    const bool any_name = tag == nullptr || (ctx->mode & MODE_STRICT) == 0;
    if (!any_name || !leaf_ends(ctx))
        return end_after_content(ctx, tag, any_name);
    leave_element(ctx);
    return ctx->error = 0;
}

int soap_element_skip(soap *ctx)
{
    if (soap_element_head_read(ctx) != 0)
        return ctx->error;
    if (ctx->must_understand != 0 && ctx->other_flag == 0)
        return fail(ctx, SOAP_MUST_UNDERSTAND);
    if ((ctx->mode & MODE_STRICT) != 0 && ctx->message_part != PART_HEADER)
        return fail(ctx, SOAP_TAG_MISMATCH);
    ctx->peeked = 0;
    ctx->error = enter_element(ctx);
    if (ctx->error != 0 || ctx->has_body == 0)
        return ctx->error;
    return soap_element_in_end(ctx, nullptr); // which takes the level back
}

void soap_tag_unread(soap *ctx)
{
    if (ctx->peeked != 0)
        return;
    ctx->peeked = 1;
    if (ctx->has_body != 0 && ctx->nesting_level != 0)
        ctx->nesting_level--;
}

const char *soap_attr_get(soap *ctx, const char *name, int occurrence)
{
    const bool strict = (ctx->mode & MODE_STRICT) != 0;
    if (*name == '-')
        return "";
    if (xml_attributes_complete(ctx) != 0)
        return nullptr;
    if (ctx->attributes_set != 0) {
        for (const soap_attribute *p = ctx->attribute_list; p != nullptr; p = p->next) {
            if (p->visible == 0 || soap_tag_compare(ctx, p->name, name) != 0)
                continue;
            ctx->error = strict && occurrence == 2 ? SOAP_PROHIBITED : 0;
            if (ctx->error != 0)
                return nullptr;
            return p->visible == 2 && p->value != nullptr ? p->value : "";
        }
    }
    ctx->error = strict && occurrence == 1 ? SOAP_REQUIRED : 0;
    return nullptr;
}
