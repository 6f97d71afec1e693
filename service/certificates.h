// certificates.h - TLS for the service: its context, and a test authority made on request.
//
// Elsewhere: handshakes (server.cpp).
#pragma once

#include <string>

#include <zuv_client_pro/soap.h>

#include "settings.h"

namespace service {

// Makes DIRECTORY/ca.pem, the certificate of a new authority; server.pem, a key and a certificate of it for
// localhost, 127.0.0.1 and ::1; client.pem, a key and a certificate for a client. All are valid for 30 days;
// files with keys are for their owner alone (mode 0600), and the authority's own key is not kept. Nothing is
// done if server.pem is there. Throws std::runtime_error or std::system_error.
void make_authority(const std::string &directory);

// Sets the context up as a TLS server. Throws std::runtime_error that says what can't be used.
void set_up_tls(soap *ctx, const settings &config);

} // namespace service
