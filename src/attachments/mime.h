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

// Length of a part on the wire, its head and the delimiter ahead of it included, bytes.
std::uint64_t mime_part_length(soap *ctx, const soap_attachment &part);

// Length of the delimiter that ends the message, bytes.
std::uint64_t mime_end_length(soap *ctx);
