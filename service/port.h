// port.h - what a service port is: a table of operations, each a request element, a handler and a response
// element.
//
// Elsewhere: the handlers (profile_port.cpp and its like), who calls them (exchange.cpp).
#pragma once

#include <span>
#include <string>
#include <string_view>

#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/soap.h>

#include "document.h"
#include "enclosures.h"
#include "filter_work.h"
#include "make.h"
#include "settings.h"
#include "store.h"

namespace service {

// What a request may still make the service do, however small it is itself.
struct request_work {
    filter_work filters;
    std::uint64_t read = 256ULL << 20;    // bytes of documents that queries look through
    std::uint64_t answered = 16ULL << 20; // bytes of documents in their answers
};

// What a handler works with. Requests and answers belong to the context `ctx`, documents read from the store
// to the codec; both live until the answer is sent.
struct call {
    soap *ctx;
    store &documents;
    document_codec &codec;
    const settings &config;
    const protocol__Header *header; // null if the request has none
    std::string root;       // URL of this service as the client named it, "http://host:9080"; may be empty
    enclosures &enclosed;   // attachments that came with the request, and those to be sent with the answer
    document_codec &judged; // for documents that only a filter looks at; forgotten after each
    std::uint64_t bytes;    // of the request, framing and compression undone, without what went to files
    request_work work;
    bool keeps_names = false; // new documents keep the names that they are given
};

struct operation {
    const char *request_element;
    const char *response_element;
    void *(*read)(soap *ctx, const char *element);                      // null with ctx->error set
    const void *(*run)(call &c, void *request);                         // throws a refusal
    int (*write)(soap *ctx, const void *response, const char *element); // ctx->error
};

// The row of an operation whose handler is `Response *Handler(call &, Request &)`.
template <auto Handler> struct operation_of;
template <class Request, class Response, Response *(*Handler)(call &, Request &)>
struct operation_of<Handler> {
    static void *read(soap *ctx, const char *element)
    {
        auto *const request = make<Request>(ctx);
        return request->soap_in(ctx, element, nullptr) == nullptr ? nullptr : request;
    }
    static const void *run(call &c, void *request) { return Handler(c, *static_cast<Request *>(request)); }
    static int write(soap *ctx, const void *response, const char *element)
    {
        return static_cast<const Response *>(response)->soap_put(ctx, element, "");
    }
};

template <auto Handler> constexpr operation row(const char *request_element, const char *response_element)
{
    using entry = operation_of<Handler>;
    return {request_element, response_element, entry::read, entry::run, entry::write};
}

struct port {
    std::string_view name; // last part of its path
    bool by_type = false;  // a request is known by its type, whatever element holds it
    std::span<const operation> operations;
};

extern const port profile_port, status_report_port, inventory_report_port, update_order_port,
    problem_report_port, query_port;

constexpr std::string_view SERVICES_PATH = "/zuv/v1.0/services/";

// The port at a path, or null.
const port *find_port(std::string_view path);

// The operation whose request element's start tag was read; null if the port has none of that name.
const operation *find_operation(soap *ctx, const port &target);

// "create" of "protocolProfile:createRequest".
std::string_view name_of(const operation &op);

// All ports, for the page that lists them.
std::span<const port *const> all_ports();

} // namespace service
