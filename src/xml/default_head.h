// default_head.h - the head of an element that declares its default namespace and nothing else, as toolkits write
// that have no prefixes: on every element the same few declarations.
//
// Elsewhere: reading attributes (xml_read_attributes.cpp), the prefix stack (namespace_prefix.cpp), the root element's
// declarations (root_head.h).
//
// Always: what is taken over is what reading the bytes would give. A head is remembered only if its namespace belongs
// to one row of the table whatever was received before.
#pragma once

#include <zuv_client_pro/soap.h>

// Takes what follows the name of a tag, a default namespace that was read before, up to and with the ">".
//   name  the tag's name, without a prefix, in the buffer
//   stop  its end
//   returns  true: it was consumed, the namespace is on the prefix stack for the element, and those of elements that
//            have ended are off it. False: nothing was consumed.
bool default_head_resume(soap *ctx, const char *name, const char *stop);

// Remembers the bytes from `start` on, which have just been read after a tag's name: one plain declaration and the
// end of the tag. Of others, and of what is too long, nothing is remembered.
void default_head_learn(soap *ctx, const char *start);
