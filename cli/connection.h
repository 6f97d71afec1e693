// connection.h - a context set up as the options say: modes, time limits, proxy, credentials, TLS, trace.
#pragma once

#include <string>
#include <vector>

#include <zuv_client_pro/soap.h>

#include "call_options.h"

namespace cli {

// Holds the texts that a context borrows: it must outlive the context's use.
class connection {
public:
    // Reads passwords and trust. failure if that can't be done.
    explicit connection(const connection_options &options);
    connection(const connection &) = delete;
    connection &operator=(const connection &) = delete;

    // Settings that stay.
    void prepare(soap *ctx) const;
    // HTTP credentials, which a received head clears: to be called before each call.
    void renew(soap *ctx) const;
    // Prints on standard error what happened in the exchange that has ended, if that was asked for.
    void report(soap *ctx) const;

    bool quiet() const { return options_.quiet; }

private:
    void prepare_tls(soap *ctx) const;
    connection_options options_;
    std::string password_, key_password_, proxy_host_, proxy_password_;
    int proxy_port_ = 0;
};

// Throws a failure for an address with a user in it: its password would be visible in process lists.
void refuse_user(const std::string &address);

// The modes of a message. `rows` takes the namespaces of SOAP 1.2, which the context borrows.
void prepare_message(soap *ctx, const message_options &options, std::vector<soap_namespace> &rows);

} // namespace cli
