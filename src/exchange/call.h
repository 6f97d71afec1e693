// call.h - what all proxies have in common.
//
// Here: declarations that the generated proxies are written against. Elsewhere: the cycle of a call
// (soap_call.h), the operations' names and types (generated from the contract).
#pragma once

#include <iosfwd>

#include <zuv_client_pro/soap_call.h>

class protocol__Header;

namespace proxies {

// One call. `proxy_endpoint` is the proxy's own endpoint, set by the call when `endpoint` or the default
// fills it. `request` may be null; `result` is the response record's pointer, null for a call that reads no
// answer. 0, or the error, as in the context.
int call(soap *ctx, const char *&proxy_endpoint, const char *default_endpoint,
         const soap_operation &operation, const char *endpoint, const char *action, const void *request,
         void **result);

// Stands for the response record of a call that has none: a null reference, which the host's one-way call is
// told by, can't be handed on as a reference. Never written.
template <class Record> inline Record no_record{};

// The address of a record, or of its stand-in if that is null. Not in a header, as a compiler takes it for
// granted that what is referred to has an address.
void *record_or(void *record, void *stand_in);

// Operations of all proxies other than calls. `init` replaces the modes and installs the port's namespaces: 0
// or 20.
int init(soap *ctx, int input_mode, int output_mode, const soap_namespace *namespaces);
void destroy(soap *ctx);
void set_header(soap *ctx, protocol__Header *header);
const char *fault_string(soap *ctx);
const char *fault_detail(soap *ctx);

} // namespace proxies
