// host_options.h - the command line that the example hosts share: where the service is, and how its messages
// look.
//
// Elsewhere: what a host does with them (*_host.cpp). profile_host.cpp uses none of it.
#pragma once

#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

#include <zuv_client_pro/soap.h>

// The library's namespaces with the envelope and encoding of SOAP 1.2. The first row is what a context
// writes; answers are read in either version. A context borrows its rows, so these live as long as the
// program.
inline const soap_namespace *soap12_namespaces()
{
    static const std::vector<soap_namespace> rows = [] {
        const soap_namespace *end = soap_program_namespaces;
        while (end->prefix != nullptr)
            ++end;
        std::vector<soap_namespace> copy(static_cast<const soap_namespace *>(soap_program_namespaces),
                                         end + 1);
        copy.at(0).uri = "http://www.w3.org/2003/05/soap-envelope";
        copy.at(1).uri = "http://www.w3.org/2003/05/soap-encoding";
        return copy;
    }();
    return rows.data();
}

// [--readable] [--soap12] [SERVICE]
struct host_options {
    std::string service = "http://127.0.0.1:9080";
    bool readable = false, soap12 = false;

    host_options(int argc, char **argv)
    {
        for (int i = 1; i < argc; ++i) {
            if (std::strcmp(argv[i], "--readable") == 0)
                readable = true;
            else if (std::strcmp(argv[i], "--soap12") == 0)
                soap12 = true;
            else
                service = argv[i];
        }
    }

    std::string endpoint(const char *port) const { return service + "/zuv/v1.0/services/" + port; }

    // One connection for all calls of a context, and text in UTF-8.
    std::uint32_t mode() const
    {
        return MODE_KEEP_ALIVE | MODE_UTF_STRINGS | (readable ? MODE_INDENT : MODE_DIRECT);
    }
    const soap_namespace *namespaces() const
    {
        return soap12 ? soap12_namespaces() : soap_program_namespaces;
    }
};
