// type_check.cpp - does a received type fit the one asked for?

#include "values/type_check.h"

#include <initializer_list>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_primitive.h>
#include <zuv_client_pro/soap_xml.h>

#include "xml/namespace.h"

bool type_says_nothing(soap *ctx)
{
    const char *const type = ctx->element_type;
    if (*type == '\0')
        return false;
    const std::size_t prefix = xml_prefix_of(type).size(); // 0: the default namespace
    const int error_before = ctx->error;
    const bool known = soap_prefix_compare(ctx, type, "xsd", prefix, 3) == 0 ||
                       soap_prefix_compare(ctx, type, "SOAP-ENC", prefix, 8) == 0;
    ctx->error = error_before;
    return known;
}

int type_accept(soap *ctx, const char *type, const char *const *also)
{
    const char *received = ctx->element_type;
    if (*received == '\0' || type == nullptr)
        return 0;
    const int error_before = ctx->error;
    bool accepted = soap_tag_compare(ctx, received, type) == 0;
    for (; !accepted && also != nullptr && *also != nullptr; also++)
        accepted = soap_tag_compare(ctx, received, *also) == 0;
    if (accepted) {
        ctx->error = error_before;
        return 0;
    }
    soap_tag_unread(ctx);
    ctx->error = SOAP_TYPE_MISMATCH;
    return -1;
}

int soap_float_type_check(soap *ctx, const char *type)
{
    static constexpr const char *ALSO[] = {":float",
                                           ":double",
                                           ":decimal",
                                           ":integer",
                                           ":positiveInteger",
                                           ":negativeInteger",
                                           ":nonPositiveInteger",
                                           ":nonNegativeInteger",
                                           ":long",
                                           ":int",
                                           ":short",
                                           ":byte",
                                           ":unsignedLong",
                                           ":unsignedInt",
                                           ":unsignedShort",
                                           ":unsignedByte",
                                           nullptr};
    return type_accept(ctx, type, ALSO);
}

int soap_array_type_check(soap *ctx, const char *type)
{
    if (ctx->array_type[0] == '\0')
        return 0;
    const int error_before = ctx->error;
    for (const char *accepted : {type, "xsd:anyType", "xsd:ur-type"}) {
        if (soap_tag_compare(ctx, ctx->array_type, accepted) == 0) {
            ctx->error = error_before;
            return 0;
        }
    }
    return ctx->error = SOAP_TAG_MISMATCH;
}
