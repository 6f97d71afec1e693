// xml_write.cpp - elements out: start tags with what they carry, end tags, empty elements.
//
// Here: the tags in all output modes. Elsewhere: text and escapes (xml_write_text.cpp), arrays and string
// elements (values/string_element.cpp), the envelope (exchange/envelope_frame.cpp), canonical order
// (xml_write_canonical.cpp), the attribute table (attributes.cpp), prefixes in scope (namespace_prefix.cpp).
//
// Always: a message is written twice when its length must be known first, and both passes give the same
// bytes; so nothing here depends on anything but the context's state and the arguments.
#include <algorithm>
#include <charconv>
#include <cstring>
#include <limits>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/limits.h"
#include "xml/attributes.h"
#include "xml/namespace.h"
#include "xml/xml_write.h"
#include "xml/xml_write_fast.h"

namespace {

constexpr std::string_view DECLARATION = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n";
constexpr std::string_view INDENT = "\n\t\t\t\t\t\t\t\t\t";
constexpr std::size_t DEFAULT_NAMESPACE_ROWS = 4; // rows whose prefixes stay in use with default namespaces

bool has_mode(const soap *ctx, std::uint32_t flag)
{
    return (ctx->mode & flag) != 0;
}

// Canonical output keeps its prefixes.
bool has_default_namespaces(const soap *ctx)
{
    return (ctx->mode & (MODE_DEFAULT_NAMESPACE | MODE_CANONICAL)) == MODE_DEFAULT_NAMESPACE;
}

bool stands_for_none(const char *tag)
{
    return *tag == '-';
}

int put_indent(soap *ctx)
{
    return xml_put(ctx, INDENT.substr(0, ctx->nesting_level));
}

int put_prolog(soap *ctx)
{
    if (ctx->xml_prolog != nullptr)
        return xml_put(ctx, ctx->xml_prolog);
    return xml_put(ctx, DECLARATION);
}

bool is_default_prefix(const soap *ctx, std::string_view prefix)
{
    const soap_prefix *top = ctx->prefix_list;
    return top != nullptr && prefix == std::string_view(top->prefix, top->prefix_length);
}

// Makes the namespace of `prefix` the default one, with a declaration if it isn't that already.
int put_default_namespace(soap *ctx, std::string_view prefix)
{
    if (is_default_prefix(ctx, prefix) || ctx->local_namespaces == nullptr)
        return SOAP_OK;
    for (const soap_namespace *row = ctx->local_namespaces; row->prefix != nullptr; ++row) {
        const char *uri = xml_row_uri(*row);
        if (uri == nullptr || prefix != row->prefix)
            continue;
        if (soap_prefix_push_out(ctx, row->prefix, uri, 2))
            return ctx->error;
        return soap_attr_write(ctx, "xmlns", uri);
    }
    return SOAP_OK;
}

bool drops_prefix(const soap *ctx, std::string_view tag)
{
    return has_default_namespaces(ctx) && tag.find(':') != std::string_view::npos;
}

int put_name(soap *ctx, std::string_view tag)
{
    if (!drops_prefix(ctx, tag))
        return xml_put(ctx, "<") ? ctx->error : xml_put(ctx, tag);
    if (xml_put(ctx, "<") || xml_put(ctx, xml_local_part(tag)))
        return ctx->error;
    return put_default_namespace(ctx, xml_prefix_of(tag));
}

// Declares the namespaces of the whole message, or in canonical output makes them known.
int put_root_namespaces(soap *ctx)
{
    const std::size_t rows =
        has_default_namespaces(ctx) ? DEFAULT_NAMESPACE_ROWS : std::numeric_limits<std::size_t>::max();
    if (ctx->local_namespaces == nullptr)
        return SOAP_OK;
    if (has_mode(ctx, MODE_CANONICAL))
        return xml_canonical_root(ctx, rows);
    std::size_t length = 0;
    if (const char *stretch = xml_root_declarations(ctx, rows, &length))
        return soap_send_bytes(ctx, stretch, length);
    for (std::size_t i = 0; i < rows && ctx->local_namespaces[i].prefix != nullptr; ++i) {
        const soap_namespace &row = ctx->local_namespaces[i];
        const char *uri = xml_row_uri(row);
        if (uri == nullptr || *row.prefix == '\0')
            continue;
        if (xml_put(ctx, " xmlns:") || xml_put(ctx, row.prefix) || xml_put(ctx, "=\"") ||
            soap_text_write(ctx, uri, 1) || xml_put(ctx, "\""))
            return ctx->error;
    }
    return SOAP_OK;
}

int put_type(soap *ctx, const char *type)
{
    if (type == nullptr || *type == '\0' || has_mode(ctx, MODE_NO_TYPE) || ctx->message_part == PART_HEADER)
        return SOAP_OK;
    const char *text = has_default_namespaces(ctx) ? xml_local_part(type).data() : type;
    // A type that the caller set as an attribute comes first and stays the only one.
    if (ctx->attributes_set ? soap_attr_set(ctx, "xsi:type", text, 1)
                            : soap_attr_write(ctx, "xsi:type", text))
        return ctx->error;
    return has_mode(ctx, MODE_CANONICAL) ? soap_prefix_use(ctx, type) : 0;
}

int put_position(soap *ctx)
{
    if (!ctx->null_flag || ctx->position_count < 1)
        return SOAP_OK;
    const int dimensions = std::min<int>(ctx->position_count, SOAP_POSITIONS_MAX);
    char text[SOAP_POSITIONS_MAX * 12 + 2]; // a sign, ten digits and a comma each, a bracket, the end
    char *end = text;
    for (int i = 0; i < dimensions; ++i) {
        *end++ = i == 0 ? '[' : ',';
        end = std::to_chars(end, text + sizeof text, ctx->positions[i]).ptr;
    }
    *end++ = ']';
    *end = '\0';
    return soap_attr_write(ctx, "SOAP-ENC:position", text);
}

int put_must_understand(soap *ctx)
{
    if (!ctx->must_understand)
        return SOAP_OK;
    const bool is_soap12 = ctx->soap_version == 2;
    if (ctx->actor != nullptr && *ctx->actor &&
        soap_attr_write(ctx, is_soap12 ? "SOAP-ENV:role" : "SOAP-ENV:actor", ctx->actor))
        return ctx->error;
    if (soap_attr_write(ctx, "SOAP-ENV:mustUnderstand", is_soap12 ? "true" : "1"))
        return ctx->error;
    ctx->must_understand = 0;
    return SOAP_OK;
}

bool table_has_encoding_row(const soap *ctx)
{
    return ctx->local_namespaces != nullptr && ctx->local_namespaces[0].prefix != nullptr &&
           (ctx->local_namespaces[1].prefix != nullptr);
}

int put_encoding_style(soap *ctx)
{
    if (ctx->encoding_flag && ctx->encoding_style != nullptr && ctx->local_namespaces != nullptr) {
        if (*ctx->encoding_style == '\0' && table_has_encoding_row(ctx)) {
            const char *uri = xml_row_uri(ctx->local_namespaces[1]);
            ctx->encoding_style = uri != nullptr ? uri : "";
        }
        if (soap_attr_write(ctx, "SOAP-ENV:encodingStyle", ctx->encoding_style))
            return ctx->error;
    }
    ctx->encoding_flag = 0;
    return SOAP_OK;
}

// The visible attributes of the table, each of which becomes idle.
int put_waiting_attributes(soap *ctx)
{
    for (soap_attribute *record = ctx->attribute_list; (record != nullptr) && ctx->attributes_set > 0;
         record = record->next) {
        std::string_view name = xml_attribute_name(record);
        if (drops_prefix(ctx, name) && is_default_prefix(ctx, xml_prefix_of(name)))
            name = xml_local_part(name);
        const char *value = record->visible == 2 ? record->value : nullptr;
        if (xml_put_attribute(ctx, name, value, record->escape))
            return ctx->error;
        --ctx->attributes_set;
    }
    xml_attributes_hide(ctx);
    return SOAP_OK;
}

int write_empty(soap *ctx, const char *tag, int id, const char *type, const char *name, const char *value)
{
    if (stands_for_none(tag))
        return SOAP_OK;
    if (soap_element_open(ctx, tag, id, type) || soap_attr_write(ctx, name, value))
        return ctx->error;
    return soap_element_attrs_close(ctx, tag);
}

// "#_%d" for the attribute href; the name alone follows the "#".
void compose_reference(char *text, std::size_t size, int number)
{
    text[0] = '#';
    text[1] = '_';
    *std::to_chars(text + 2, text + size - 1, number).ptr = '\0';
}

} // namespace

int xml_put_attribute(soap *ctx, std::string_view name, const char *value, int escape)
{
    if (xml_put(ctx, " ") || xml_put(ctx, name))
        return ctx->error;
    if (value == nullptr)
        return SOAP_OK;
    if (xml_put(ctx, "=\"") || soap_text_write(ctx, value, escape) || xml_put(ctx, "\""))
        return ctx->error;
    return SOAP_OK;
}

int soap_attr_write(soap *ctx, const char *name, const char *value)
{
    if (!has_mode(ctx, MODE_CANONICAL))
        return xml_put_attribute(ctx, name, value, 1);
    if (std::strcmp(name, "xmlns") == 0)
        return soap_prefix_push_out(ctx, "", value, 0);
    if (std::strncmp(name, "xmlns:", 6) == 0)
        return soap_prefix_push_out(ctx, name + 6, value, 0);
    return soap_attr_set(ctx, name, value, 1);
}

int soap_element_open(soap *ctx, const char *tag, int id, const char *type)
{
    if (xml_enter(ctx))
        return ctx->error;
    const bool is_first = ctx->namespace_state == 0;
    if (is_first)
        output_xml_begin(ctx);
    if (is_first && !has_mode(ctx, MODE_CANONICAL) && put_prolog(ctx))
        return ctx->error;
    if (!is_first && has_mode(ctx, MODE_INDENT)) {
        if (put_indent(ctx))
            return ctx->error;
        ctx->has_body = 1;
    }
    if (put_name(ctx, tag) || (is_first && put_root_namespaces(ctx)))
        return ctx->error;
    ctx->namespace_state = 1;
    if (has_mode(ctx, MODE_CANONICAL) && soap_prefix_use(ctx, tag))
        return ctx->error;
    if (id > 0) {
        char text[16];
        compose_reference(text, sizeof text, id);
        if (soap_attr_write(ctx, "id", text + 1))
            return ctx->error;
    }
    if (put_type(ctx, type) || put_position(ctx) || put_must_understand(ctx) || put_encoding_style(ctx))
        return ctx->error;
    ctx->null_flag = 0;
    ctx->position_count = 0;
    ctx->wsu_id_flag = 0;
    return SOAP_OK;
}

int soap_element_attrs_close(soap *ctx, const char *tag)
{
    const bool is_canonical = has_mode(ctx, MODE_CANONICAL);
    if (is_canonical && xml_canonical_attributes(ctx))
        return ctx->error;
    if (ctx->attributes_set && put_waiting_attributes(ctx))
        return ctx->error;
    if (tag == nullptr)
        return xml_put(ctx, ">");
    if (is_canonical)
        return xml_put(ctx, ">") ? ctx->error : soap_element_out_end(ctx, tag);
    if (drops_prefix(ctx, tag))
        soap_prefix_pop(ctx);
    xml_leave(ctx);
    return xml_put(ctx, "/>");
}

int xml_open_long(soap *ctx, const char *tag, int id, const char *type)
{
    return soap_element_open(ctx, tag, id, type) ? ctx->error : soap_element_attrs_close(ctx, nullptr);
}

int soap_element_out_begin(soap *ctx, const char *tag, int id, const char *type)
{
    if (stands_for_none(tag))
        return SOAP_OK;
    if (id <= 0 && (type == nullptr || *type == '\0'))
        return xml_open_plain(ctx, tag, std::strlen(tag));
    return xml_open_long(ctx, tag, id, type);
}

int xml_close_long(soap *ctx, const char *tag)
{
    if (has_mode(ctx, MODE_CANONICAL))
        soap_prefix_pop(ctx);
    if (has_mode(ctx, MODE_INDENT)) {
        if (!ctx->has_body && put_indent(ctx))
            return ctx->error;
        ctx->has_body = 0;
    }
    std::string_view name(tag);
    if (drops_prefix(ctx, name)) {
        name = xml_local_part(name);
        soap_prefix_pop(ctx);
    }
    if (xml_put(ctx, "</") || xml_put(ctx, name))
        return ctx->error;
    xml_leave(ctx);
    return xml_put(ctx, ">");
}

int soap_element_out_end(soap *ctx, const char *tag)
{
    return stands_for_none(tag) ? 0 : xml_close_plain(ctx, tag, std::strlen(tag));
}

int soap_element_empty_nil(soap *ctx, const char *tag)
{
    return write_empty(ctx, tag, 0, nullptr, "xsi:nil", "true");
}

int soap_element_null(soap *ctx, const char *tag, int id, const char *type)
{
    const bool has_attributes = ctx->attributes_set > 0;
    const bool has_position = ctx->soap_version == 2 && ctx->position_count > 0;
    if (!has_attributes && id <= 0 && !has_mode(ctx, MODE_NIL) && !has_position) {
        ctx->null_flag = 1;
        ctx->position_count = 0;
        ctx->must_understand = 0;
        return SOAP_OK;
    }
    if (!has_attributes)
        return write_empty(ctx, tag, id, type, "xsi:nil", "true");
    if (stands_for_none(tag))
        return SOAP_OK;
    return soap_element_open(ctx, tag, id, type) ? ctx->error : soap_element_attrs_close(ctx, tag);
}

int soap_element_empty_attr(soap *ctx, const char *tag, int id, const char *name, const char *value)
{
    return write_empty(ctx, tag, id, nullptr, name, value);
}

int soap_element_href(soap *ctx, const char *tag, int id, int target_id)
{
    char text[16];
    compose_reference(text, sizeof text, target_id);
    if (ctx->soap_version == 2)
        return soap_element_empty_attr(ctx, tag, id, "SOAP-ENC:ref", text + 1);
    return soap_element_empty_attr(ctx, tag, id, "href", text);
}
