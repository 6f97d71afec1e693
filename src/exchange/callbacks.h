// callbacks.h - the defaults of the replaceable operations.
#pragma once

#include <zuv_client_pro/soap.h>

// Sets every callback of the context to its default, or to null where it has none.
void callbacks_set_defaults(soap *ctx);
