// mime.h - what the files of attachments share about MIME parts.
#pragma once

#include <zuv_client_pro/soap_attachment.h>

// True if the message under way is a MIME message.
inline bool mime_is_written(const soap *ctx)
{
    return (ctx->mode & MODE_MIME) != 0 && ctx->mime.boundary != nullptr;
}

// True for the description of a received part, which a value has in place of DIME options; `length` bytes
// are what it has if it is a block of options.
bool mime_is_description(const char *options, std::size_t length);

// Length of a part on the wire, its head and the delimiter before it included, bytes.
std::uint64_t mime_part_length(soap *ctx, const soap_attachment &part);

// Length of the delimiter that ends the message, bytes.
std::uint64_t mime_end_length(soap *ctx);

// A multipart message begins: reads on to the header of the part that holds the message; the parts before it
// are kept in ctx->mime. SOAP_OK, SOAP_EOF, SOAP_MIME_ERROR, SOAP_OUT_OF_MEMORY, or the result of a hook.
int mime_message_begin(soap *ctx);
