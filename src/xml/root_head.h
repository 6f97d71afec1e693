// root_head.h - the declarations of a root element, which one service sends the same in each message: taken
// over from the message before if their bytes are equal.
//
// Elsewhere: reading them (xml_read_attributes.cpp), the prefix stack (namespace_prefix.cpp), which keeps the
// records of the last root element in their chains while no message has them in scope.
//
// Always: what is taken over is what reading the bytes would give. Only declarations that were whole and
// plain in the buffer are remembered, as what they mean then depends on the namespace table alone; only at
// the root, with nothing in scope and no URI received for a row.
#pragma once

#include <zuv_client_pro/soap.h>

// Nothing comes before the element whose tag is being read: no prefix in scope, no URI received for a row.
bool root_head_stands_alone(const soap *ctx);

// What follows the tag's name is what followed that of the last root element: true, and it was consumed up to
// and with the ">". Call only where root_head_stands_alone. Without memory for a received URI false; nothing
// was consumed.
bool root_head_resume(soap *ctx);

// Remembers the bytes from `start` on, which have just been read, all plain declarations, in an element that
// alone. What is too long is not remembered.
void root_head_learn(soap *ctx, const char *start);
