// string_element.cpp - strings as elements, in and out, elements taken as raw XML, literal XML and encoded
// arrays.
//
// Elsewhere: tags (xml/xml_write.cpp), text (xml/xml_text.cpp, xml/xml_write_text.cpp), which objects go out
// as references (soap_identity.h), elements of simple values (simple_element.cpp). Always: a null place gets
// a managed one; a tag that begins with "-" reads the content without an element of its own.
#include <algorithm>
#include <charconv>
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/failure.h"
#include "values/values.h"
#include "xml/namespace.h"
#include "xml/xml_text.h"
#include "xml/xml_write.h"

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
        fail(ctx, SOAP_NO_TAG);
        return false;
    }
    return soap_object_register(ctx, ctx->element_id, *place, type_id, sizeof(Char *), 0, nullptr, nullptr,
                                nullptr) != nullptr;
}

template <class Char> bool read_empty(soap *ctx, const char *tag, Char **place, long minimum)
{
    if (without_element(tag)) {
        fail(ctx, SOAP_NO_TAG);
        return false;
    }
    if (ctx->element_href[0] == '\0' && minimum >= 1) {
        fail(ctx, SOAP_LENGTH);
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

char *soap_string_read(soap *ctx, int form, long minimum, long maximum)
{
    std::size_t length;
    if (form != 2) {
        const char *const text = xml_string_text(ctx, form, minimum, maximum, &length);
        return text != nullptr ? soap_string_dup_n(ctx, text, length) : nullptr;
    }
    // Prefixes are declared in UTF-8 and have to be looked up in it.
    const std::uint32_t strings = ctx->mode & MODE_UTF_STRINGS;
    ctx->mode |= MODE_UTF_STRINGS;
    const char *text = xml_string_text(ctx, 1, minimum, maximum, &length);
    text = text != nullptr ? soap_string_dup_n(ctx, text, length) : nullptr;
    ctx->mode = (ctx->mode & ~MODE_UTF_STRINGS) | strings;
    char *mapped = nullptr;
    return text != nullptr && xml_qname_map_utf8(ctx, text, &mapped) == 0 ? mapped : nullptr;
}

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

namespace {

constexpr const char *SOAP_12_RPC = "http://www.w3.org/2003/05/soap-rpc";

bool is_literal(const soap *ctx)
{
    return ctx->encoding_style == nullptr;
}

// URI of the table's row for a prefix; empty if there is none.
const char *uri_of_prefix(const soap *ctx, std::string_view prefix)
{
    for (const soap_namespace *row = ctx->local_namespaces; row->prefix != nullptr; ++row) {
        if (prefix == row->prefix) {
            const char *uri = xml_row_uri(*row);
            return uri != nullptr ? uri : "";
        }
    }
    return "";
}

bool has_own_tag(const char *tag)
{
    return tag != nullptr && *tag != '-';
}

// Tag under which literal content is written: with its namespace as the default one, the name goes without a
// prefix.
const char *literal_name(const soap *ctx, const char *tag)
{
    const char *colon = ctx->local_namespaces != nullptr ? std::strchr(tag, ':') : nullptr;
    return colon != nullptr ? colon + 1 : tag;
}

int open_literal(soap *ctx, const char *tag)
{
    if (!has_own_tag(tag))
        return SOAP_OK;
    const char *name = literal_name(ctx, tag);
    if (name == tag)
        return soap_element_out_begin(ctx, tag, 0, nullptr);
    if (soap_element_open(ctx, name, 0, nullptr) ||
        soap_attr_write(ctx, "xmlns", uri_of_prefix(ctx, xml_prefix_of(tag))))
        return ctx->error;
    return soap_element_attrs_close(ctx, nullptr);
}

int close_literal(soap *ctx, const char *tag)
{
    return has_own_tag(tag) ? soap_element_out_end(ctx, literal_name(ctx, tag)) : 0;
}

// Appends numbers to a context's text, as far as they fit.
class dimension_text {
public:
    dimension_text(char (&text)[SOAP_TEXT_SIZE]) : begin(text), end(text), last(text + SOAP_TEXT_SIZE - 1) {}
    void put(std::string_view part)
    {
        const std::size_t fits = std::min(part.size(), static_cast<std::size_t>(last - end));
        end = std::copy_n(part.data(), fits, end);
    }
    void put(std::int64_t number)
    {
        char digits[24];
        const auto result = std::to_chars(digits, digits + sizeof digits, number);
        put(std::string_view(digits, static_cast<std::size_t>(result.ptr - digits)));
    }
    const char *finish()
    {
        *end = '\0';
        return begin;
    }

private:
    char *begin;
    char *end;
    char *last;
};

// "[type" of SOAP 1.2 comes before the last bracket of the array type, the sizes after it.
int put_soap12_array(soap *ctx, const char *array_type)
{
    const char *bracket = std::strrchr(array_type, '[');
    const auto length = bracket != nullptr ? static_cast<std::size_t>(bracket - array_type) : SOAP_TEXT_SIZE;
    if (length >= SOAP_TEXT_SIZE)
        return SOAP_OK;
    char item_type[SOAP_TEXT_SIZE];
    *std::copy_n(array_type, length, item_type) = '\0';
    if (soap_attr_write(ctx, "SOAP-ENC:itemType", item_type))
        return ctx->error;
    return soap_attr_write(ctx, "SOAP-ENC:arraySize", bracket + 1);
}

int put_soap11_array(soap *ctx, const char *array_type, const char *offset)
{
    if (offset != nullptr && soap_attr_write(ctx, "SOAP-ENC:offset", offset))
        return ctx->error;
    return soap_attr_write(ctx, "SOAP-ENC:arrayType", array_type);
}

} // namespace

const char *soap_array_size_text(soap *ctx, const int *sizes, int dimensions)
{
    dimension_text text(ctx->array_size);
    for (int i = 0; i < dimensions; ++i) {
        text.put(i == 0 ? "[" : ",");
        text.put(sizes[i]);
    }
    text.put("]");
    return text.finish();
}

const char *soap_array_type_text(soap *ctx, const char *type, const int *sizes, const int *offsets,
                                 int dimensions)
{
    const bool is_soap12 = ctx->soap_version == 2;
    dimension_text text(ctx->array_type);
    text.put(type);
    for (int i = 0; i < dimensions; ++i) {
        text.put(i == 0 ? "[" : is_soap12 ? " " : ",");
        text.put(std::int64_t{sizes[i]} + (offsets != nullptr && !is_soap12 ? offsets[i] : 0));
    }
    if (!is_soap12)
        text.put("]");
    return text.finish();
}

int soap_array_open(soap *ctx, const char *tag, int id, const char *array_type, const char *offset)
{
    if (array_type == nullptr || *array_type == '\0')
        return soap_element_out_begin(ctx, tag, id, nullptr);
    if (soap_element_open(ctx, tag, id, "SOAP-ENC:Array"))
        return ctx->error;
    if (ctx->soap_version == 2 ? put_soap12_array(ctx, array_type)
                               : put_soap11_array(ctx, array_type, offset))
        return ctx->error;
    if ((ctx->mode & MODE_CANONICAL) && soap_prefix_use(ctx, array_type))
        return ctx->error;
    return soap_element_attrs_close(ctx, nullptr);
}

int soap_result_out(soap *ctx, const char *name)
{
    constexpr const char *TAG = "SOAP-RPC:result";
    if (ctx->soap_version != 2 || is_literal(ctx))
        return SOAP_OK;
    if (soap_element_open(ctx, TAG, 0, nullptr) || soap_attr_write(ctx, "xmlns:SOAP-RPC", SOAP_12_RPC))
        return ctx->error;
    if ((ctx->mode & MODE_CANONICAL) && soap_prefix_use(ctx, name))
        return ctx->error;
    if (soap_element_attrs_close(ctx, nullptr) || xml_put(ctx, std::string_view(name)))
        return ctx->error;
    return soap_element_out_end(ctx, TAG);
}

int soap_literal_write(soap *ctx, const char *tag, char *const *text, const char *)
{
    if (text == nullptr || *text == nullptr)
        return SOAP_OK;
    if (open_literal(ctx, tag) || xml_put_literal(ctx, *text))
        return ctx->error;
    return close_literal(ctx, tag);
}

int soap_wide_literal_write(soap *ctx, const char *tag, char32_t *const *text, const char *)
{
    if (text == nullptr || *text == nullptr)
        return SOAP_OK;
    if (open_literal(ctx, tag) || xml_put_wide(ctx, *text))
        return ctx->error;
    return close_literal(ctx, tag);
}

namespace {

// Asks for the id of a text held by pointer, which may go out as a reference, a null or an empty nil element
// instead. True if the text itself is to be written.
template <class Char>
bool begins_string(soap *ctx, const char *tag, int id, const Char *text, const char *type, int type_id)
{
    id = soap_element_ref(ctx, tag, id, text, nullptr, 0, type, type_id);
    if (id < 0 || !text)
        return false;
    if (*text == 0 && (ctx->mode & MODE_NULL_STRINGS)) {
        soap_element_null(ctx, tag, id, type);
        return false;
    }
    return soap_element_out_begin(ctx, tag, id, type) == 0;
}

} // namespace

int soap_string_element_out(soap *ctx, const char *tag, int id, char *const *text, const char *type,
                            int type_id)
{
    const char *value = text != nullptr ? *text : nullptr;
    if (!begins_string(ctx, tag, id, value, type, type_id) || soap_text_write(ctx, value, 0))
        return ctx->error;
    return soap_element_out_end(ctx, tag);
}

int soap_wide_string_element_out(soap *ctx, const char *tag, int id, char32_t *const *text, const char *type,
                                 int type_id)
{
    const char32_t *value = text != nullptr ? *text : nullptr;
    if (!begins_string(ctx, tag, id, value, type, type_id) || soap_wide_text_write(ctx, value, 0))
        return ctx->error;
    return soap_element_out_end(ctx, tag);
}
