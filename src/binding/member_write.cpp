// member_write.cpp - leaf operations of writing: texts, enumerations, booleans, what is absent.
//
// Elsewhere: numbers (values), whole objects (class_ops.cpp).
#include "binding/member_write.h"

#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_primitive.h>
#include <zuv_client_pro/soap_xml.h>

#include "xml/xml_write_fast.h"

namespace binding {

namespace {

constexpr int TEXT_TYPE_ID = 8; // all texts held by pointer are of one type to the identity tables

// The message will have neither ids nor references, so that a shared value is written out each time.
bool is_tree(const soap *ctx)
{
    return ctx->encoding_style == nullptr && ((ctx->mode | ctx->output_mode) & SOAP_XML_GRAPH) == 0;
}

// An element with character data alone.
int write_characters(soap *ctx, std::string_view tag, int id, std::string_view text, const char *type)
{
    if (id <= 0 && *type == '\0')
        return xml_text_element_plain(ctx, tag.data(), tag.size(), text.data(), text.size());
    if (soap_element_out_begin(ctx, tag.data(), id, type) ||
        soap_text_write_n(ctx, text.data(), text.size(), 0))
        return ctx->error;
    return soap_element_out_end(ctx, tag.data());
}

} // namespace

int write_text(soap *ctx, const std::string &text)
{
    return soap_text_write_n(ctx, text.data(), text.size(), 0);
}

int write_text_element(soap *ctx, std::string_view tag, int id, const std::string &text, const char *type)
{
    if (text.empty() && (ctx->mode & MODE_NULL_STRINGS))
        return soap_element_null(ctx, tag.data(), id, type);
    return write_characters(ctx, tag, id, text, type);
}

int write_text_pointer(soap *ctx, std::string_view tag, const std::string *text)
{
    const int id = write_reference(ctx, tag, text, TEXT_TYPE_ID);
    return id < 0 ? ctx->error : write_text_element(ctx, tag, id, *text);
}

int write_reference(soap *ctx, std::string_view tag, const void *address, int type_id)
{
    if (ctx->mode & SOAP_XML_TREE)
        return SOAP_OK;
    return soap_element_ref(ctx, tag.data(), -1, address, nullptr, 0, "", type_id);
}

int write_nil(soap *ctx, std::string_view tag, occurs how)
{
    if (how == occurs::required)
        return soap_element_empty_nil(ctx, tag.data());
    return soap_element_null(ctx, tag.data(), -1, "");
}

int write_code(soap *ctx, std::string_view tag, int id, std::int32_t code, const enum_table &names,
               const char *type)
{
    const char *text =
        static_cast<std::uint32_t>(code) < names.count ? names.codes[code].name : soap_long_text(ctx, code);
    return write_characters(ctx, tag, id, text, type);
}

int write_boolean(soap *ctx, std::string_view tag, int id, const bool *value, const char *type)
{
    unsigned char byte; // a host may have stored any byte: one that is no boolean has no word
    std::memcpy(&byte, value, sizeof byte);
    return write_characters(ctx, tag, id, byte == 1 ? "true" : byte == 0 ? "false" : "", type);
}

int write_code_attribute(soap *ctx, const char *name, std::int32_t code, const enum_table &names)
{
    if (static_cast<std::uint32_t>(code) < names.count)
        return soap_attr_set(ctx, name, names.codes[code].name, 1);
    return soap_attr_set(ctx, name, soap_long_text(ctx, code), 1);
}

void mark_text(soap *ctx, const std::string *text)
{
    mark_plain(ctx, text, TEXT_TYPE_ID);
}

void mark_plain(soap *ctx, const void *value, int type_id)
{
    if (value != nullptr && !is_tree(ctx))
        soap_mark_pointer(ctx, value, type_id);
}

} // namespace binding
