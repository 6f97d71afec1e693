// binary.cpp - xsd__base64Binary: bytes inline as base64, or referred to as an attachment.
#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_binary.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_primitive.h>
#include <zuv_client_pro/soap_xml.h>

#include "attachments/attachment_list.h"
#include "binding/class_rules.h"
#include "binding/traits_binary.h"

namespace binding {

namespace {

constexpr int BINARY_ID = traits<xsd__base64Binary>::type_id;

int write_bytes(soap *ctx, const void *object, const char *)
{
    const auto *binary = static_cast<const xsd__base64Binary *>(object);
    return soap_base64_write(
        ctx, binary->content,
        (binary->content != nullptr) && binary->size > 0 ? static_cast<std::size_t>(binary->size) : 0);
}

bool read_bytes(soap *ctx, xsd__base64Binary &binary)
{
    if (ctx->mode & MODE_MTOM) {
        if (soap_xop_include_in(ctx, &binary.content, &binary.size, &binary.id, &binary.type,
                                &binary.options) == 0)
            return true;
        if (ctx->error)
            return false;
    }
    binary.content = soap_base64_inline_read(ctx, &binary.size);
    return binary.content != nullptr || ctx->error == 0;
}

// Absent bytes and no bytes differ in the pointer alone.
bool take_nothing(soap *ctx, xsd__base64Binary &binary)
{
    binary.content = static_cast<unsigned char *>(soap_block_alloc(ctx, 1));
    if (binary.content == nullptr)
        return false;
    *binary.content = '\0';
    binary.size = 0;
    return true;
}

bool refer_to_attachment(soap *ctx, xsd__base64Binary &binary)
{
    return soap_attachment_ref_in(ctx, &binary.content, &binary.size, &binary.id, &binary.type,
                                  &binary.options) == 0;
}

void *read_binary(soap *ctx, const class_ops &ops, const char *tag, void *object)
{
    auto &binary = *static_cast<xsd__base64Binary *>(object);
    const bool body = ctx->has_body != 0;
    if (ctx->element_id[0] && soap_object_register(ctx, ctx->element_id, object, BINARY_ID, ops.size, 0,
                                                   nullptr, nullptr, nullptr) == nullptr)
        return nullptr;
    const bool taken = ctx->element_href[0] ? refer_to_attachment(ctx, binary)
                       : body               ? read_bytes(ctx, binary)
                                            : ctx->null_flag != 0 || take_nothing(ctx, binary);
    if (!taken || (body && soap_element_in_end(ctx, tag)))
        return nullptr;
    return object;
}

constexpr class_ops make_binary_ops()
{
    class_ops ops = make_ops<xsd__base64Binary>();
    ops.write_content = &write_bytes;
    ops.read = &read_binary;
    return ops;
}

} // namespace

constinit const class_ops traits<xsd__base64Binary>::ops = make_binary_ops();

} // namespace binding

using namespace binding;

xsd__base64Binary::xsd__base64Binary() = default;
xsd__base64Binary::~xsd__base64Binary() = default;

int xsd__base64Binary::soap_type() const
{
    return BINARY_ID;
}

void xsd__base64Binary::soap_default(struct soap *ctx)
{
    soap = ctx;
    content = nullptr;
    size = 0;
    id = type = options = nullptr;
}

void xsd__base64Binary::soap_serialize(struct soap *ctx) const
{
    if (!attachment_value_mark(ctx, &content, id, type, options))
        soap_array_mark_pointer(ctx, content, &content, 1, BINARY_ID);
}

int xsd__base64Binary::soap_put(struct soap *ctx, const char *tag, const char *xml_type) const
{
    return class_put(ctx, ops_of<xsd__base64Binary>, this, tag, xml_type);
}

int xsd__base64Binary::soap_out(struct soap *ctx, const char *tag, int element_id, const char *xml_type) const
{
    element_id = soap_attachment_ref_out(ctx, tag, element_id, content, &content, id, type, options, 1,
                                         xml_type, BINARY_ID);
    if (element_id < 0)
        return ctx->error;
    if (soap_element_out_begin(ctx, tag, element_id, xml_type) || write_bytes(ctx, this, tag))
        return ctx->error;
    return soap_element_out_end(ctx, tag);
}

void *xsd__base64Binary::soap_get(struct soap *ctx, const char *tag, const char *)
{
    return class_get(ctx, ops_of<xsd__base64Binary>, tag, this);
}

void *xsd__base64Binary::soap_in(struct soap *ctx, const char *tag, const char *)
{
    return class_in(ctx, ops_of<xsd__base64Binary>, tag, this);
}
