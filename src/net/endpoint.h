// endpoint.h - the connection that a request to an endpoint goes out on.
//
// Elsewhere: the parts of a URL (soap_parse_endpoint in soap_http.h), what is sent (exchange/connect.cpp).
#pragma once

#include <zuv_client_pro/soap.h>

// Keeps the connection of an earlier exchange if it serves this endpoint too; otherwise closes it and opens
// another through on_open. ctx->host, port and path hold the parts of the endpoint, which may be null.
// SOAP_OK or the error of on_open or of closing.
int connection_provide(soap *ctx, const char *endpoint);
