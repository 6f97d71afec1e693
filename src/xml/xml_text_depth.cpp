// xml_text_depth.cpp - markup inside a text: the held tag that begins it, nested elements, bounds of length.
//
// Here: what the forms of text have in common. Elsewhere: the forms (xml_text.cpp, xml_text_raw.cpp,
// xml_text_wide.cpp).
#include <cstring>
#include <string_view>

#include <zuv_client_pro/soap_error.h>

#include "xml/xml_text.h"

namespace {

// Appends to scratch_text as long as two bytes stay free for the end of the tag.
void append(soap *ctx, std::size_t *length, std::string_view text)
{
    const std::size_t room = SOAP_TEXT_SIZE - 3 - *length;
    std::size_t taken = text.size();
    if (taken > room)
        taken = (ctx->mode & MODE_UTF_STRINGS) != 0 ? utf8_whole(text.data(), room) : room;
    std::memcpy(ctx->scratch_text + *length, text.data(), taken);
    *length += taken;
}

// Names are UTF-8 in every mode.
void append_name(soap *ctx, std::size_t *length, const char *name)
{
    char text[SOAP_TEXT_SIZE] = "";
    const std::string_view whole = name;
    if ((ctx->mode & MODE_UTF_STRINGS) != 0)
        return append(ctx, length, whole);
    append(ctx, length, {text, utf8_to_latin1(text, whole.copy(text, sizeof text))});
}

std::size_t rebuild_tag(soap *ctx)
{
    std::size_t length = 0;
    append(ctx, &length, "<");
    append_name(ctx, &length, ctx->tag);
    const soap_attribute *first = ctx->attributes_set != 0 ? ctx->attribute_list : nullptr;
    for (const soap_attribute *p = first; p != nullptr; p = p->next) {
        if (p->visible == 0)
            continue;
        append(ctx, &length, " ");
        append_name(ctx, &length, p->name);
        if (p->visible != 2 || p->value == nullptr)
            continue;
        append(ctx, &length, "=\"");
        append(ctx, &length, p->value);
        append(ctx, &length, "\"");
    }
    if (ctx->has_body == 0)
        ctx->scratch_text[length++] = '/';
    ctx->scratch_text[length++] = '>';
    return length;
}

// Characters of UTF-8 have one byte each that doesn't go on from another.
std::uint64_t characters(const soap *ctx, const char *text, std::size_t length)
{
    if ((ctx->mode & MODE_UTF_STRINGS) == 0)
        return length;
    std::uint64_t count = 0;
    for (std::size_t i = 0; i < length; ++i)
        count += (static_cast<unsigned char>(text[i]) & 0xC0) != 0x80;
    return count;
}

} // namespace

text_depth text_take_held_tag(soap *ctx, std::size_t *length)
{
    const bool held = ctx->peeked != 0 && ctx->tag[0] != '\0';
    ctx->peeked = 0;
    *length = held ? rebuild_tag(ctx) : 0;
    return text_depth(held, held && ctx->has_body != 0);
}

bool text_depth::ends_at(std::int32_t token)
{
    if (token == XML_EOF)
        return true;
    if (quote_ != 0) {
        if (token == quote_)
            quote_ = 0;
        return false;
    }
    if (token == XML_END) {
        if (open_ == 0)
            return true;
        --open_;
        in_tag_ = true;
        start_tag_ = false;
    } else if (token == XML_START) {
        if (held_ && open_ == 0)
            return true;
        ++open_;
        in_tag_ = true;
        start_tag_ = true;
    } else if (in_tag_) {
        tag_token(token);
    }
    last_ = is_blank(token) ? last_ : token;
    return false;
}

void text_depth::tag_token(std::int32_t token)
{
    if (token == XML_GT) {
        if (start_tag_ && last_ == '/' && open_ != 0)
            --open_;
        in_tag_ = false;
    } else if ((token == XML_QUOTE || token == XML_APOS) && last_ == '=') {
        quote_ = token;
    }
}

int text_limits_check(soap *ctx, text_limits &limits)
{
    if (limits.maximum < 0 && limits.minimum <= 0)
        return 0;
    if (ctx->label_index > limits.counted)
        limits.count +=
            characters(ctx, ctx->label_buffer + limits.counted, ctx->label_index - limits.counted);
    limits.counted = ctx->label_index;
    if (limits.maximum >= 0 && limits.count > static_cast<std::uint64_t>(limits.maximum))
        return ctx->error = SOAP_LENGTH;
    return 0;
}

int text_limits_finish(soap *ctx, text_limits &limits)
{
    if (text_limits_check(ctx, limits) != 0)
        return ctx->error;
    if (limits.minimum > 0 && limits.count < static_cast<std::uint64_t>(limits.minimum))
        return ctx->error = SOAP_LENGTH;
    return 0;
}
