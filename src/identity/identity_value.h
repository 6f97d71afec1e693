// identity_value.h - entries of the pointer table that are told apart by what they say and not by an address.
#pragma once

#include <zuv_client_pro/soap_identity.h>

// The entry of a type that `same` takes for the value, or null. Values that are the same have the same hash.
soap_pointer_record *soap_pointer_find_value(soap *ctx, std::uint32_t hash, int type,
                                             bool (*same)(soap *ctx, const void *one, const void *other),
                                             const void *value);

// Enters a value, which must stay as long as the table. Null with error 20.
soap_pointer_record *soap_pointer_add_value(soap *ctx, std::uint32_t hash, int type, const void *value);
