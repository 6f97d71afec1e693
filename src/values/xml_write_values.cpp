// xml_write_values.cpp - whole elements of strings, literal XML and encoded arrays.
//
// Elsewhere: tags (xml_write.cpp), text (xml_write_text.cpp), which objects go out as references
// (soap_identity.h), elements of simple values (soap_primitive.h).
#include <algorithm>
#include <charconv>
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_xml.h>

#include "xml/namespace.h"
#include "xml/xml_write.h"

namespace {

constexpr const char *SOAP_12_RPC = "http://www.w3.org/2003/05/soap-rpc";

bool is_literal(const soap *ctx)
{
    return ctx->encoding_style == nullptr;
}

// URI of the table's row for a prefix; empty if there is none.
const char *uri_of_prefix(const soap *ctx, std::string_view prefix)
{
    for (const soap_namespace *row = ctx->local_namespaces; row->prefix; ++row) {
        if (prefix == row->prefix) {
            const char *uri = xml_row_uri(*row);
            return uri ? uri : "";
        }
    }
    return "";
}

bool has_own_tag(const char *tag)
{
    return tag && *tag != '-';
}

// Tag under which literal content stands: with its namespace as the default one, the name goes without a
// prefix.
const char *literal_name(const soap *ctx, const char *tag)
{
    const char *colon = ctx->local_namespaces ? std::strchr(tag, ':') : nullptr;
    return colon ? colon + 1 : tag;
}

int open_literal(soap *ctx, const char *tag)
{
    if (!has_own_tag(tag))
        return 0;
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

// "[type" of SOAP 1.2 stands before the last bracket of the array type, the sizes behind it.
int put_soap12_array(soap *ctx, const char *array_type)
{
    const char *bracket = std::strrchr(array_type, '[');
    const auto length = bracket ? static_cast<std::size_t>(bracket - array_type) : SOAP_TEXT_SIZE;
    if (length >= SOAP_TEXT_SIZE)
        return 0;
    char item_type[SOAP_TEXT_SIZE];
    *std::copy_n(array_type, length, item_type) = '\0';
    if (soap_attr_write(ctx, "SOAP-ENC:itemType", item_type))
        return ctx->error;
    return soap_attr_write(ctx, "SOAP-ENC:arraySize", bracket + 1);
}

int put_soap11_array(soap *ctx, const char *array_type, const char *offset)
{
    if (offset && soap_attr_write(ctx, "SOAP-ENC:offset", offset))
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
        text.put(std::int64_t{sizes[i]} + (offsets && !is_soap12 ? offsets[i] : 0));
    }
    if (!is_soap12)
        text.put("]");
    return text.finish();
}

int soap_array_open(soap *ctx, const char *tag, int id, const char *array_type, const char *offset)
{
    if (!array_type || *array_type == '\0')
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
        return 0;
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
    if (!text || !*text)
        return 0;
    if (open_literal(ctx, tag) || xml_put_literal(ctx, *text))
        return ctx->error;
    return close_literal(ctx, tag);
}

int soap_wide_literal_write(soap *ctx, const char *tag, char32_t *const *text, const char *)
{
    if (!text || !*text)
        return 0;
    if (open_literal(ctx, tag) || xml_put_wide(ctx, *text))
        return ctx->error;
    return close_literal(ctx, tag);
}

// Asks for the id of a text held by pointer, which may go out as a reference, a null or an empty nil element
// instead. True if the text itself is to be written.
template <class Char>
static bool begins_string(soap *ctx, const char *tag, int id, const Char *text, const char *type, int type_id)
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

int soap_string_element_out(soap *ctx, const char *tag, int id, char *const *text, const char *type,
                            int type_id)
{
    const char *value = text ? *text : nullptr;
    if (!begins_string(ctx, tag, id, value, type, type_id) || soap_text_write(ctx, value, 0))
        return ctx->error;
    return soap_element_out_end(ctx, tag);
}

int soap_wide_string_element_out(soap *ctx, const char *tag, int id, char32_t *const *text, const char *type,
                                 int type_id)
{
    const char32_t *value = text ? *text : nullptr;
    if (!begins_string(ctx, tag, id, value, type, type_id) || soap_wide_text_write(ctx, value, 0))
        return ctx->error;
    return soap_element_out_end(ctx, tag);
}
