// faults.cpp - see faults.h.
#include "faults.h"

#include "filter.h"

namespace service {

void refuse_not_found(soap *ctx, const std::string &uri)
{
    auto *const fault =
        make_fault<protocol__Client_x002eObjectNotFound>(ctx, "No document has the name " + uri + ".");
    fault->uri.push_back(uri);
    refuse(fault);
}

using too_complex = protocol__Server_x002eUnsupportedRequest_x002eFilterExpressionTooComplex;

protocol__Fault *fault_of(soap *ctx, const filter_error &error)
{
    if (error.too_complex)
        return make_fault<too_complex>(ctx, error.what());
    return make_fault<protocol__Client_x002eMalformedRequest>(ctx, error.what());
}

void refuse_filter(soap *ctx, const filter_error &error)
{
    if (error.too_complex)
        refuse<too_complex>(ctx, error.what());
    refuse<protocol__Client_x002eMalformedRequest>(ctx, error.what());
}

} // namespace service
