// attachment_value.h - the mark pass of a binary value that goes out as an attachment.
//
// Elsewhere: writing and reading its reference (soap_attachment.h).
#pragma once

#include <zuv_client_pro/soap.h>

// Enters the attachment that the value goes out as, in the order of its number, and makes the message one
// with attachments. `holder` begins with the address of the bytes and their number (an int). False: the value
// stands in place. Error 20 in ctx->error if memory runs out.
bool attachment_value_mark(soap *ctx, const void *holder, const char *id_text, const char *type,
                           const char *options);
