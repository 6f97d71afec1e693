// xml_text_elements.cpp - whole elements that hold a string, and elements taken as raw XML.
//
// Always: a null place gets a managed one; a tag that begins with "-" reads the content without an element of
// its own.
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_identity.h>

#include "xml/xml_text.h"

namespace {

char *read_string(soap *ctx, int form, long minimum, long maximum, char **)
{
    return soap_string_read(ctx, form, minimum, maximum);
}

char32_t *read_string(soap *ctx, int form, long minimum, long maximum, char32_t **)
{
    return soap_wide_string_read(ctx, form, minimum, maximum);
}

template <class Char> Char *empty_string(soap *ctx)
{
    auto *text = static_cast<Char *>(soap_block_alloc(ctx, sizeof(Char)));
    if (text != nullptr)
        *text = 0;
    return text;
}

bool without_element(const char *tag)
{
    return tag != nullptr && *tag == '-';
}

template <class Char> Char **failed(soap *ctx, int error)
{
    ctx->error = error;
    return nullptr;
}

// The text of an element that has content, entered under the element's id.
template <class Char>
bool read_content(soap *ctx, const char *tag, Char **place, int type_id, int form, long minimum, long maximum)
{
    *place = read_string(ctx, form, minimum, maximum, place);
    if (*place == nullptr)
        return false;
    if (without_element(tag) && **place == 0) {
        ctx->error = SOAP_NO_TAG;
        return false;
    }
    return soap_object_register(ctx, ctx->element_id, *place, type_id, sizeof(Char *), 0, nullptr, nullptr,
                                nullptr) != nullptr;
}

template <class Char> bool read_empty(soap *ctx, const char *tag, Char **place, long minimum)
{
    if (without_element(tag)) {
        ctx->error = SOAP_NO_TAG;
        return false;
    }
    if (ctx->element_href[0] == '\0' && minimum >= 1) {
        ctx->error = SOAP_LENGTH;
        return false;
    }
    *place = empty_string<Char>(ctx);
    return *place != nullptr;
}

template <class Char> Char **make_place(soap *ctx, Char **place)
{
    if (place == nullptr)
        place = static_cast<Char **>(soap_block_alloc(ctx, sizeof(Char *)));
    if (place != nullptr)
        *place = nullptr;
    return place;
}

template <class Char>
Char **string_element_in(soap *ctx, const char *tag, Char **place, const char *type, int type_id, int form,
                         long minimum, long maximum)
{
    if (soap_element_in_begin(ctx, tag, 1, type) != 0)
        return nullptr;
    const bool has_body = ctx->has_body != 0;
    place = make_place(ctx, place);
    if (place == nullptr)
        return nullptr;
    if (ctx->null_flag == 0 || without_element(tag)) {
        // a held tag with a "-" name is content, even if it is an empty element
        const bool content = has_body || (without_element(tag) && ctx->peeked != 0);
        if (!(content ? read_content(ctx, tag, place, type_id, form, minimum, maximum)
                      : read_empty(ctx, tag, place, minimum)))
            return nullptr;
    }
    if (ctx->element_href[0] != '\0') {
        place = reinterpret_cast<Char **>(soap_object_forward_ptr(
            ctx, ctx->element_href, reinterpret_cast<void **>(place), type_id, sizeof(Char *), 0));
        if (place == nullptr)
            return nullptr;
    }
    if (has_body && soap_element_in_end(ctx, tag) != 0)
        return nullptr;
    return place;
}

// With no tag at hand, text or an end may come next. False: there is nothing to take.
bool text_follows(soap *ctx)
{
    const std::int32_t token = soap_char_next(ctx);
    ctx->look_ahead = token;
    return token != XML_END && token != XML_EOF;
}

template <class Char> Char **raw_element_in(soap *ctx, const char *tag, Char **place)
{
    const int error = soap_element_in_begin(ctx, tag, 1, nullptr);
    const bool no_tag = ctx->peeked != 0 && ctx->tag[0] == '\0';
    if (error != 0 && error != SOAP_NO_TAG)
        return nullptr;
    if (no_tag && !text_follows(ctx))
        return failed<Char>(ctx, SOAP_NO_TAG);
    ctx->error = 0;
    const bool consumed = ctx->peeked == 0;
    const bool has_body = ctx->has_body != 0;
    place = make_place(ctx, place);
    if (place == nullptr)
        return nullptr;
    if (consumed && ctx->null_flag == 0 && !has_body)
        *place = empty_string<Char>(ctx);
    else if (!consumed || ctx->null_flag == 0)
        *place = read_string(ctx, 0, -1, -1, place);
    if (ctx->error != 0)
        return nullptr;
    if (consumed && has_body && soap_element_in_end(ctx, tag) != 0)
        return nullptr;
    return place;
}

} // namespace

char **soap_string_element_in(soap *ctx, const char *tag, char **place, const char *type, int type_id,
                              int form, long minimum, long maximum)
{
    return string_element_in(ctx, tag, place, type, type_id, form, minimum, maximum);
}

char32_t **soap_wide_string_element_in(soap *ctx, const char *tag, char32_t **place, const char *type,
                                       int type_id, int form, long minimum, long maximum)
{
    return string_element_in(ctx, tag, place, type, type_id, form, minimum, maximum);
}

char **soap_raw_element_in(soap *ctx, const char *tag, char **place)
{
    return raw_element_in(ctx, tag, place);
}

char32_t **soap_wide_raw_element_in(soap *ctx, const char *tag, char32_t **place)
{
    return raw_element_in(ctx, tag, place);
}
