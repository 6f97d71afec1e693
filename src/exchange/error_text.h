// error_text.h - the text of the context's error as a fault record gets it.
#pragma once

#include <zuv_client_pro/soap.h>

// Text for ctx->error: constant, or composed in message_text and valid until the next composed text.
const char *error_text(soap *ctx);
