// connection.h - the life of one accepted connection.
#pragma once

#include <zuv_client_pro/soap.h>

#include "exchange.h"

namespace service {

// Serves the requests of a connection in turn until its end, then closes it. `ctx` holds the socket.
void serve_connection(soap *ctx, const settings &config, session &borrowed);

} // namespace service
