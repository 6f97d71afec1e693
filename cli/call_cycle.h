// call_cycle.h - the cycle of a call on a context of one's own, for ports without a proxy class.
#pragma once

#include <zuv_client_pro/soap.h>

namespace cli {

// What an operation puts into the Body and expects there.
struct message_parts {
    const char *request_element;
    void (*mark)(soap *ctx, const void *request);
    int (*write)(soap *ctx, const void *request, const char *tag);
    const char *response_element;
    void *(*read)(soap *ctx, const char *tag); // null with ctx->error set
};

// Sends the request and reads the answer, which is the context's. 0, or the error that stands in the context;
// a received fault gives 1, 2, 8, 12 or 39.
int call(soap *ctx, const char *endpoints, const char *action, const message_parts &parts,
         const void *request, void **response);

} // namespace cli
