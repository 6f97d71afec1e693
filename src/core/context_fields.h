// context_fields.h - the record's bytes as a whole: emptied for a start, copied for a copy.
#pragma once

#include <zuv_client_pro/soap.h>

// Zeroes all fields and sets the few whose empty value is not zero: no sockets, tables inside the record. The
// virtual table and the members of derived classes are left alone.
void context_fields_clear(soap *ctx);

// Sets the pointer and id tables to empty, without freeing what they held.
void context_tables_clear(soap *ctx);

// Wipes what credentials left in `buffer` and the scratch texts, if any passed; unread input and unsent
// output stay.
void context_credentials_wipe(soap *ctx);

// Gives the context a fresh zlib stream; null if memory runs out, which compression finds out when it starts.
void context_zlib_make(soap *ctx);
