// operations.cpp - see operations.h. A new operation of the contract gets its row when the generator runs.
#include "operations.h"

#include <cstring>

#include <zuv_client_pro/type_ids.h>

#include "call_cycle.h"
#include "operation_list.h"

namespace cli {

namespace {

template <class Request> void *read_request(soap *ctx)
{
    auto *const request =
        static_cast<Request *>(soap_instantiate(ctx, Request().soap_type(), nullptr, nullptr, nullptr));
    return request == nullptr ? nullptr : request->soap_get(ctx, nullptr, nullptr);
}

template <class Response> int write_element(soap *ctx, const void *object, const char *tag)
{
    return static_cast<const Response *>(object)->soap_put(ctx, tag, "");
}

// --- ports with a proxy class ---

template <class Proxy> std::unique_ptr<soap> make_proxy()
{
    return std::make_unique<Proxy>();
}

template <class Proxy, class Request, class Record,
          int (Proxy::*method)(const char *, const char *, Request *, Record &)>
int call_proxy(soap *ctx, const char *endpoints, const char *action, void *request, void **response)
{
    Record record{};
    const int result =
        (static_cast<Proxy *>(ctx)->*method)(endpoints, action, static_cast<Request *>(request), record);
    *response = record.result;
    return result;
}

// --- ports without ---

std::unique_ptr<soap> make_plain_context()
{
    return std::make_unique<soap>();
}

template <class Request> void mark(soap *ctx, const void *object)
{
    static_cast<const Request *>(object)->soap_serialize(ctx);
}

template <class Request> int write_part(soap *ctx, const void *object, const char *tag)
{
    return static_cast<const Request *>(object)->soap_out(ctx, tag, -1, "");
}

template <class Response> void *read_part(soap *ctx, const char *tag)
{
    auto *const response =
        static_cast<Response *>(soap_instantiate(ctx, Response().soap_type(), nullptr, nullptr, nullptr));
    return response == nullptr ? nullptr : response->soap_get(ctx, tag, nullptr);
}

} // namespace

std::span<const port> all_ports()
{
#define PORT_PATH(address) std::strchr(std::strstr(address, "://") + 3, '/')
#define PORT_ROW(name, address, proxy, documentation)                                                        \
    {#name, proxy ? address : nullptr, PORT_PATH(address), documentation},
    static const port rows[] = {PORTS(PORT_ROW)};
    return rows;
}

std::span<const operation> all_operations()
{
#define PROXY_ROW(port, name, Request, RequestRecord, request_element, Response, Record, response_element,   \
                  about)                                                                                     \
    {#port,                                                                                                  \
     #name,                                                                                                  \
     request_element,                                                                                        \
     response_element,                                                                                       \
     about,                                                                                                  \
     SOAP_TYPE_##Request,                                                                                    \
     SOAP_TYPE_##Response,                                                                                   \
     make_proxy<port##SoapBindingProxy>,                                                                     \
     read_request<Request>,                                                                                  \
     call_proxy<port##SoapBindingProxy, Request, Record, &port##SoapBindingProxy::_##name>,                  \
     [](soap *ctx, const void *object) { return write_element<Response>(ctx, object, response_element); }},
#define PLAIN_ROW(port, name, Request, RequestRecord, request_element, Response, Record, response_element,   \
                  about)                                                                                     \
    {#port,                                                                                                  \
     #name,                                                                                                  \
     request_element,                                                                                        \
     response_element,                                                                                       \
     about,                                                                                                  \
     SOAP_TYPE_##Request,                                                                                    \
     SOAP_TYPE_##Response,                                                                                   \
     make_plain_context,                                                                                     \
     read_request<Request>,                                                                                  \
     [](soap *ctx, const char *endpoints, const char *action, void *request, void **response) {              \
         static constexpr message_parts parts = {request_element, mark<Request>, write_part<Request>,        \
                                                 response_element, read_part<Response>};                     \
         return call(ctx, endpoints, action, parts, request, response);                                      \
     },                                                                                                      \
     [](soap *ctx, const void *object) { return write_element<Response>(ctx, object, response_element); }},
    static const operation rows[] = {OPERATIONS_WITH_PROXY(PROXY_ROW) OPERATIONS_WITHOUT_PROXY(PLAIN_ROW)};
    return rows;
}

const operation *operation_of_element(const char *element, bool &is_request)
{
    for (const operation &one : all_operations()) {
        is_request = std::strcmp(one.request_element, element) == 0;
        if (is_request || std::strcmp(one.response_element, element) == 0)
            return &one;
    }
    return nullptr;
}

} // namespace cli
