// operations.cpp - see operations.h. A new operation of the contract gets its row when the generator runs.
#include "operations.h"

#include <cstring>

#include <zuv_client_pro/type_ids.h>

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

template <class Context> std::unique_ptr<soap> make_context()
{
    return std::make_unique<Context>();
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
#define ROW(port, name, Context, Request, RequestRecord, request_element, Response, Record,                  \
            response_element, about)                                                                         \
    {#port,                                                                                                  \
     #name,                                                                                                  \
     request_element,                                                                                        \
     response_element,                                                                                       \
     about,                                                                                                  \
     SOAP_TYPE_##Request,                                                                                    \
     SOAP_TYPE_##Response,                                                                                   \
     {SOAP_TYPE_##RequestRecord, SOAP_TYPE_##Record},                                                        \
     make_context<Context>,                                                                                  \
     read_request<Request>,                                                                                  \
     [](soap *ctx, const void *object) { return write_element<Response>(ctx, object, response_element); }},
#define PROXY_ROW(port, name, ...) ROW(port, name, port##SoapBindingProxy, __VA_ARGS__)
#define PLAIN_ROW(port, name, ...) ROW(port, name, soap, __VA_ARGS__)
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
