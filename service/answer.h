// answer.h - sends answers: a response, a fault, a file.
//
// Always: results are SOAP_OK, or an error code that ctx->error holds too. Whether the connection is kept is
// decided elsewhere (exchange.h).
#pragma once

#include <cstdint>
#include <functional>
#include <string>

#include <zuv_client_pro/soap.h>

#include "faults.h"
#include "port.h"
#include "recording.h"

namespace service {

// Sends the response of an operation in the SOAP version of the request, with ctx->header as its header, and
// the files that are attached to it.
int send_response(soap *ctx, const operation &op, const void *response, enclosures &enclosed);

// Sends a recorded answer, framed as others are. Its Content-Type is the caller's affair.
int send_recorded(soap *ctx, const recorded_answer &answer);

// Sends ctx->fault under an HTTP status, with ctx->header as its header.
int send_fault(soap *ctx, int http_status);

// Sends bytes of a media type as they are. SOAP_STOP: the request is answered.
int send_file(soap *ctx, const char *type, const std::string &bytes);

// The same for so many bytes that `read` gives piece by piece; it returns 0 at the end.
int send_file(soap *ctx, const char *type, std::uint64_t size,
              const std::function<std::size_t(char *buffer, std::size_t length)> &read);

// Makes ctx->fault from a refusal: code, text and typed detail in the SOAP version of the request.
// The HTTP status to send it under.
int fault_from_refusal(soap *ctx, const refusal &refused);

// The context can take a fault in some SOAP version: 1.1 if the request's isn't known.
void settle_version(soap *ctx);

} // namespace service
