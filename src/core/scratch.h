// scratch.h - working state of one message that both directions clear when a message starts.
//
// Elsewhere: what a whole call leaves behind (soap_call_scratch_free), framing state (raw_in.h).
#pragma once

#include <zuv_client_pro/soap.h>

// Takes every prefix out of scope, whatever its depth.
void soap_prefix_list_free(soap *ctx);

// Flags of the element being written or read, as they stand ahead of a message; depth and ids start at 0.
void soap_element_state_reset(soap *ctx);
