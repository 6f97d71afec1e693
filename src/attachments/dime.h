// dime.h - what the files of attachments share about DIME records.
#pragma once

#include <zuv_client_pro/soap_attachment.h>

// True if the message under way sends its attachments as DIME records. In the counting pass of an MTOM
// message the mode has both forms; MTOM wins.
inline bool dime_is_written(const soap *ctx)
{
    return (ctx->mode & MODE_DIME) != 0 && (ctx->mode & MODE_MTOM) == 0;
}

// Length of an options block, bytes; 0 for none and for the description of a MIME part in its place.
std::size_t dime_options_length(const char *options);

// Length of a record on the wire, header and padding included, bytes.
std::uint64_t dime_record_length(const soap_attachment &record);

// A message begins that is, or whose root part is, the first record: reads its header, and from there on the
// readers see the record's data alone. SOAP_OK, SOAP_EOF, SOAP_DIME_ERROR, SOAP_DIME_VERSION,
// SOAP_OUT_OF_MEMORY.
int dime_message_begin(soap *ctx);
