// pointer_table.h - the pointer table beyond soap_identity.h: entries known by value, and objects written
// after the one that refers to them (encoded SOAP 1.1).
#pragma once

#include <zuv_client_pro/soap_identity.h>

// The entry of a type that `same` takes for the value, or null. Values that are the same have the same hash.
soap_pointer_record *soap_pointer_find_value(soap *ctx, std::uint32_t hash, int type,
                                             bool (*same)(soap *ctx, const void *one, const void *other),
                                             const void *value);

// Enters a value, which must stay as long as the table. Null with error 20.
soap_pointer_record *soap_pointer_add_value(soap *ctx, std::uint32_t hash, int type, const void *value);

// Calls `write` for each object of the pointer table that is to be written apart in this pass, in the order
// of their numbers, until none is left: writing one may set others apart. 0, the error of `write`, or 20.
int soap_pointer_each_apart(soap *ctx, int (*write)(soap *ctx, const soap_pointer_record &record));
