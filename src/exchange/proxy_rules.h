// proxy_rules.h - defines the members of a generated proxy class, over the shared functions of call.h.
#pragma once

#include <ostream>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_proxy.h>
#include <zuv_client_pro/soap_tcp.h>

#include "binding/traits.h"
#include "exchange/call.h"

// Everything of a proxy class P but its calls. `table`: the port's namespace table.
#define PROXY_DEFINE_MEMBERS(P, table)                                                                       \
    static_assert(sizeof(P) <= SOAP_CONTEXT_BYTES_MAX);                                                      \
    P::P()                                                                                                   \
    {                                                                                                        \
        P::P##_init(0, 0);                                                                                   \
    }                                                                                                        \
    P::P(int iomode)                                                                                         \
    {                                                                                                        \
        P::P##_init(iomode, iomode);                                                                         \
    }                                                                                                        \
    P::P(int imode, int omode)                                                                               \
    {                                                                                                        \
        P::P##_init(imode, omode);                                                                           \
    }                                                                                                        \
    P::P(const char *url)                                                                                    \
    {                                                                                                        \
        P::P##_init(0, 0);                                                                                   \
        endpoint = url;                                                                                      \
    }                                                                                                        \
    P::P(const char *url, int iomode)                                                                        \
    {                                                                                                        \
        P::P##_init(iomode, iomode);                                                                         \
        endpoint = url;                                                                                      \
    }                                                                                                        \
    P::P(const soap &other) : soap(other) {}                                                                 \
    P::P(const P &other) : soap(other) {}                                                                    \
    P::P(P &&other) noexcept : soap(static_cast<soap &&>(other)), endpoint(other.endpoint)                   \
    {                                                                                                        \
        if (other.state != 0) /* else it was no context any more */                                          \
            other.P::P##_init(0, 0);                                                                         \
    }                                                                                                        \
    P::~P() = default;                                                                                       \
    int P::P##_init(int imode, int omode)                                                                    \
    {                                                                                                        \
        endpoint = nullptr;                                                                                  \
        return proxies::init(this, imode, omode, table);                                                     \
    }                                                                                                        \
    void P::destroy()                                                                                        \
    {                                                                                                        \
        proxies::destroy(this);                                                                              \
    }                                                                                                        \
    void P::soap_noheader()                                                                                  \
    {                                                                                                        \
        header = nullptr;                                                                                    \
    }                                                                                                        \
    void P::soap_header(protocol__Header *block)                                                             \
    {                                                                                                        \
        proxies::set_header(this, block);                                                                    \
    }                                                                                                        \
    SOAP_ENV__Header *P::soap_header()                                                                       \
    {                                                                                                        \
        return header;                                                                                       \
    }                                                                                                        \
    SOAP_ENV__Fault *P::soap_fault()                                                                         \
    {                                                                                                        \
        return fault;                                                                                        \
    }                                                                                                        \
    const char *P::soap_fault_string()                                                                       \
    {                                                                                                        \
        return proxies::fault_string(this);                                                                  \
    }                                                                                                        \
    const char *P::soap_fault_detail()                                                                       \
    {                                                                                                        \
        return proxies::fault_detail(this);                                                                  \
    }                                                                                                        \
    int P::soap_close_socket()                                                                               \
    {                                                                                                        \
        return soap_socket_release(this);                                                                    \
    }                                                                                                        \
    int P::soap_force_close_socket()                                                                         \
    {                                                                                                        \
        return soap_force_close(this);                                                                       \
    }                                                                                                        \
    void P::soap_print_fault(std::FILE *file)                                                                \
    {                                                                                                        \
        soap_fault_print_file(this, file);                                                                   \
    }                                                                                                        \
    std::ostream &P::soap_stream_fault(std::ostream &stream)                                                 \
    {                                                                                                        \
        return soap_fault_print_stream(this, stream);                                                        \
    }                                                                                                        \
    char *P::soap_print_fault_buffer(char *text, std::size_t length)                                         \
    {                                                                                                        \
        return soap_fault_print_text(this, text, length);                                                    \
    }

// One operation: its name, the class of the request, the record of the response. The address of `response` is
// passed on unread: it may be null.
#define PROXY_DEFINE_CALL(P, name, Request, Record, request_id, record_id)                                   \
    int P::name(Request *request, Record &response)                                                          \
    {                                                                                                        \
        return _##name(nullptr, nullptr, request,                                                            \
                       *static_cast<Record *>(proxies::record_or(&response, &proxies::no_record<Record>)));  \
    }                                                                                                        \
    int P::_##name(const char *url, const char *soap_action, Request *request, Record &response)             \
    {                                                                                                        \
        static constexpr soap_operation operation = {request_id, record_id};                                 \
        const bool one_way = &response == &proxies::no_record<Record>;                                       \
        return proxies::call(this, endpoint, default_endpoint, operation, url, soap_action, request,         \
                             one_way ? nullptr : reinterpret_cast<void **>(&response));                      \
    }
