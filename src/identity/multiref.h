// multiref.h - the pointer table beyond soap_identity.h: entries known by value, and objects written
// after the one that refers to them (encoded SOAP 1.1).
#pragma once

#include <zuv_client_pro/soap_identity.h>

// The entry of a type that `same` takes for the value, or null. Values that are the same have the same hash.
soap_pointer_record *soap_pointer_find_value(soap *ctx, std::uint32_t hash, int type,
                                             bool (*same)(soap *ctx, const void *one, const void *other),
                                             const void *value);

// Enters a value, which must stay as long as the table. Null with SOAP_OUT_OF_MEMORY.
soap_pointer_record *soap_pointer_add_value(soap *ctx, std::uint32_t hash, int type, const void *value);

// Calls `write` for each object of the pointer table that this pass writes as a multi-reference element, in the
// order of their numbers, until none is left: writing one may add others. SOAP_OK, the error of `write`, or
// SOAP_OUT_OF_MEMORY.
int soap_multiref_each(soap *ctx, int (*write)(soap *ctx, const soap_pointer_record &record));
