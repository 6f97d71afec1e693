// operations.h - every operation of every port: names, documentation, types, and how it is called.
//
// Elsewhere: the rows, which the generator makes from the WSDL files (operation_list.h); the cycle of a call
// (soap_call.h).
#pragma once

#include <memory>
#include <span>

#include <zuv_client_pro/soap_call.h>

namespace cli {

struct port {
    const char *name;            // "Profile"
    const char *default_address; // null: the caller must give one
    const char *path;            // of the usual address, "/zuv/v1.0/services/Profile"
    const char *documentation;
};

struct operation {
    const char *port;
    const char *name;             // "set"
    const char *request_element;  // "protocolProfile:setRequest"
    const char *response_element; // "protocolProfile:setResponse"
    const char *documentation;
    int request_type; // type ids of the two classes
    int response_type;
    soap_operation records; // for soap_call

    // A context that can make the call, the port's proxy where there is one.
    std::unique_ptr<soap> (*make_context)();
    // Reads the element that comes next as the request's class, whatever its name. An object of the context,
    // or null.
    void *(*read_request)(soap *ctx);
    // Writes the response as an element of its own.
    int (*write_response)(soap *ctx, const void *response);
};

std::span<const port> all_ports();
std::span<const operation> all_operations();

// The operation one of whose elements has this name, or null. `is_request` says which.
const operation *operation_of_element(const char *element, bool &is_request);

} // namespace cli
