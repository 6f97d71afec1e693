// faults.cpp - see faults.h.
#include "faults.h"

#include <algorithm>
#include <cstdlib>
#include <iterator>
#include <vector>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_xml.h>

#include "contract_files.h"
#include "filter.h"

namespace service {

namespace {

struct fault_row {
    std::string_view name; // "Client_x002eObjectNotFound"
    void (*refuse)(soap *ctx, std::string description);
};

constexpr fault_row FAULTS[] = {
#define SERVICE_FAULT_ROW(name)                                                                              \
    {#name, [](soap *ctx, std::string text) { refuse<protocol__##name>(ctx, std::move(text)); }},
    SOAP_DETAIL_FAULTS(SERVICE_FAULT_ROW)
#undef SERVICE_FAULT_ROW
};

const fault_row *find_fault(std::string_view name)
{
    std::string encoded;
    for (const char c : name)
        encoded += c == '.' ? "_x002e" : std::string(1, c);
    const auto *const found = std::find_if(std::begin(FAULTS), std::end(FAULTS),
                                           [&](const fault_row &row) { return row.name == encoded; });
    return found == std::end(FAULTS) ? nullptr : found;
}

} // namespace

bool is_fault_name(std::string_view name)
{
    return find_fault(name) != nullptr;
}

void refuse_by_name(soap *ctx, std::string_view name, std::string description)
{
    if (const fault_row *const row = find_fault(name))
        row->refuse(ctx, std::move(description));
    else
        refuse<protocol__Server_x002eProcessing>(ctx, std::move(description));
    std::abort(); // not reached: a refusal throws
}

void refuse_not_found(soap *ctx, const std::string &uri)
{
    auto *const fault =
        make_fault<protocol__Client_x002eObjectNotFound>(ctx, "No document has the name " + uri + ".");
    fault->uri.push_back(uri);
    refuse(fault);
}

void refuse_unexpected(soap *ctx)
{
    ctx->error = SOAP_OK;
    const std::string_view tag = ctx->tag;
    const std::string local(tag.substr(tag.find(':') + 1));
    const char *const bound = soap_namespace_of(ctx, ctx->tag);
    ctx->error = SOAP_OK; // of a prefix without a declaration
    const std::string_view found = bound == nullptr ? std::string_view() : bound;
    std::vector<std::string_view> others = namespaces_of_element(local);
    const bool is_known = std::erase(others, found) != 0;
    std::string text = "Element '" + local + "' of ";
    text += found.empty() ? "no namespace" : "the namespace '" + std::string(found) + "'";
    text += is_known         ? " is not expected in this place, or not once more"
            : others.empty() ? ": the contract has no element of this name"
                             : ": wrong namespace";
    for (const std::string_view one : others)
        text.append(one == others.front() ? "; expected '" : " or '").append(one).append("'");
    refuse<protocol__Client_x002eMalformedRequest>(ctx, text + ".");
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
