// identity_apart.h - the objects that encoded SOAP 1.1 writes behind the one that refers to them.
#pragma once

#include <zuv_client_pro/soap_identity.h>

// Calls `write` for each object of the pointer table that is to be written apart in this pass, in the order
// of their numbers, until none is left: writing one may set others apart. 0, the error of `write`, or 20.
int soap_pointer_each_apart(soap *ctx, int (*write)(soap *ctx, const soap_pointer_record &record));
