// dime_chunks.h - a SOAP message that comes as a DIME record in several chunks, read as one text.
//
// Elsewhere: records and attachments (codec's dime files).
// While a chunked record is read, dime.size is the data length of the chunk under way, buffer_length ends
// with the chunk, and message_count - (buffer_length - buffer_index) bytes of its data were used.
#pragma once

#include <zuv_client_pro/soap.h>

// A record's header was read and its data begins at buffer_index.
void soap_dime_data_begin(soap *ctx);

// True if the reader has used up what it may see of a chunked record.
inline bool soap_dime_chunk_pending(const soap *ctx)
{
    return (ctx->dime.chunk_size | ctx->dime.buffer_length) != 0;
}

// The next bytes of a chunked record, from this chunk or the next. 0, 1 or -1 at the end of input, 34, or a
// result of soap_recv_filtered.
int soap_dime_chunk_more(soap *ctx);
