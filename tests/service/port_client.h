// port_client.h - a host's proxy for one port of a service: it keeps its connection and writes no trace.
#pragma once

#include <string>

#include <zuv_client_pro/soap_log.h>

#include "service/service_process.h"

namespace service_test {

template <class Proxy> class port_client {
public:
    // `form`: modes of what is sent, besides.
    port_client(const service_process &service, const char *port, std::uint32_t form = 0)
        : url_(service.url(port)), proxy(static_cast<int>(MODE_KEEP_ALIVE | MODE_UTF_STRINGS),
                                         static_cast<int>(MODE_KEEP_ALIVE | MODE_UTF_STRINGS | form))
    {
        proxy.endpoint = url_.c_str();
        soap_log_set_received(&proxy, nullptr);
        soap_log_set_sent(&proxy, nullptr);
    }

    // Calls an operation on a document, or on none: then no header is sent.
    template <class Request, class Response>
    auto call(int (Proxy::*operation)(Request *, Response &), Request &request,
              const std::string &target = {})
    {
        target_ = target;
        header.targetURI = &target_;
        if (target.empty())
            proxy.soap_noheader();
        else
            proxy.soap_header(&header);
        Response response{};
        error = (proxy.*operation)(&request, response);
        return response.result;
    }

    const SOAP_ENV__Detail &detail() { return *proxy.soap_fault()->detail; }

private:
    std::string url_, target_;

public:
    protocol__Header header;
    Proxy proxy;
    int error = 0; // of the last call
};

} // namespace service_test
