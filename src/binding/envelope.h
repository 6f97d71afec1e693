// envelope.h - the envelope's records as dispatch by type id sees them.
#pragma once

#include <cstddef>

#include <zuv_client_pro/soap.h>

namespace binding {

// By type id of the record; count < 0: one record. Null if memory runs out.
std::size_t envelope_size(int type_id);
void *envelope_create(int type_id, int count);
void envelope_destroy(int type_id, void *record, int count);

// Reading and writing by type id, tag included.
void *envelope_in(soap *ctx, int type_id, const char *tag, void *record);
int envelope_out(soap *ctx, int type_id, const char *tag, int id, const void *record, const char *type);
void envelope_mark(soap *ctx, int type_id, const void *record);

// After a failure within an element whose content is at nesting level `level`: if a value was to blame,
// and not the XML, drops what is left of it, and the reader goes on at that level, or above it if the element
// has ended. False: the error is in the context.
bool drop_bad_value(soap *ctx, std::uint32_t level);

} // namespace binding
