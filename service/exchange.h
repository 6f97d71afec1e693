// exchange.h - one HTTP exchange: a request read, given to its handler and answered.
#pragma once

#include <zuv_client_pro/soap.h>

#include "reception.h"
#include "session.h"

namespace service {

// Waits for a request and serves it, whatever it is. True if the connection may carry another. What the
// exchange made is freed.
bool serve_exchange(soap *ctx, reception &received);

} // namespace service
