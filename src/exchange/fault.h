// fault.h - faults as the layers below exchange reach them, and the text that a fault record gets.
#pragma once

#include <zuv_client_pro/soap.h>

#include "core/failure.h"

// Makes faults of failures, and reads them. Set in every context with the defaults of its callbacks.
extern const soap_upcalls fault_upcalls;

// Text for ctx->error: constant, or composed in message_text and valid until the next composed text.
const char *error_text(soap *ctx);
