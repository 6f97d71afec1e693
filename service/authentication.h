// authentication.h - the answer to requests that ask whether credentials are good.
#pragma once

#include <zuv_client_pro/protocolUpdateOrder.h>

#include "port.h"

namespace service {

// Checks the user names and passwords of a request and of those nested in it against the accounts of the
// service.
protocolUpdateOrder__AuthenticateResponse *authenticate(call &c,
                                                        protocolUpdateOrder__AuthenticateRequest &request);

} // namespace service
