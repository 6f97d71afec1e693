// tcp_tunnel.h - private: the way through an HTTP proxy to a TLS endpoint.
#pragma once

#include <zuv_client_pro/soap.h>

// Asks the proxy on ctx->socket for a connection to host and port. 0, or non-zero with ctx->error: the
// failure, or the status of the proxy's refusal. The socket stays open then.
int tcp_open_tunnel(soap *ctx, const char *endpoint, const char *host, int port);
