// faults.h - how a handler refuses a request: a fault of the contract, thrown.
//
// Elsewhere: how a refusal becomes a message (answer.cpp).
#pragma once

#include <string>
#include <string_view>
#include <utility>

#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/soap_envelope.h>

#include "make.h"

namespace service {

struct filter_error; // filter.h

// Sets the member of a detail that is of the fault's class.
#define SERVICE_FAULT_PLACE(name)                                                                            \
    inline void place_fault(SOAP_ENV__Detail &detail, protocol__##name *fault)                               \
    {                                                                                                        \
        detail.name = fault;                                                                                 \
    }
SOAP_DETAIL_FAULTS(SERVICE_FAULT_PLACE)
#undef SERVICE_FAULT_PLACE

// The request is answered with a fault. The fault object belongs to the context of the exchange.
struct refusal {
    protocol__Fault *fault;
    void (*place)(SOAP_ENV__Detail &detail, protocol__Fault *fault);

    bool is_client_fault() const { return dynamic_cast<const protocol__Client *>(fault) != nullptr; }
};

// A fault of a class of the tree, with the class's own name as its subcode.
template <class F> F *make_fault(soap *ctx, std::string description)
{
    F *const fault = make<F>(ctx);
    const std::string type = soap_type_name(fault->soap_type());
    fault->subcode = make_text(ctx, type.substr(type.find(':') + 1));
    fault->description = make_text(ctx, std::move(description));
    return fault;
}

template <class F> [[noreturn]] void refuse(F *fault)
{
    throw refusal{fault, [](SOAP_ENV__Detail &detail, protocol__Fault *placed) {
                      place_fault(detail, static_cast<F *>(placed));
                  }};
}

template <class F> [[noreturn]] void refuse(soap *ctx, std::string description)
{
    refuse(make_fault<F>(ctx, std::move(description)));
}

// The same for a class by its name, such as "Client.ObjectNotFound"; an unknown one is a Server.Processing.
[[noreturn]] void refuse_by_name(soap *ctx, std::string_view name, std::string description);
bool is_fault_name(std::string_view name);

// No document has the name.
[[noreturn]] void refuse_not_found(soap *ctx, const std::string &uri);

// Strict reading has stopped at an element, which the fault names, with its namespace and the one that the contract
// has for such a name.
[[noreturn]] void refuse_unexpected(soap *ctx);

// The fault for a filter that can't be evaluated, and the refusal of a request because of it.
protocol__Fault *fault_of(soap *ctx, const filter_error &error);
[[noreturn]] void refuse_filter(soap *ctx, const filter_error &error);

} // namespace service
