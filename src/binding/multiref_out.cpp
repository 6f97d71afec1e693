// multiref_out.cpp - encoded SOAP 1.1: multi-reference elements, the objects that others refer to.
#include <zuv_client_pro/soap_binary.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_registry.h>

#include "binding/registry.h"
#include "identity/multiref.h"

namespace binding {

namespace {

// The object of a record. Bytes are entered by their content; the object is what holds it.
void *object_of(const soap_pointer_record &record)
{
    if (record.array == nullptr)
        return const_cast<void *>(record.ptr);
    static const xsd__base64Binary model;
    const auto offset =
        reinterpret_cast<const char *>(&model.content) - reinterpret_cast<const char *>(&model);
    return const_cast<char *>(static_cast<const char *>(record.array) - offset);
}

int write_multiref(soap *ctx, const soap_pointer_record &record)
{
    return soap_write_element(ctx, object_of(record), nullptr, record.id, record.type);
}

} // namespace

} // namespace binding

int soap_put_finish(soap *ctx)
{
    const bool encoded = ctx->soap_version == 1 && ctx->encoding_style != nullptr;
    if (!encoded || (ctx->mode & (SOAP_XML_TREE | SOAP_XML_GRAPH)))
        return SOAP_OK;
    return soap_multiref_each(ctx, &binding::write_multiref);
}
