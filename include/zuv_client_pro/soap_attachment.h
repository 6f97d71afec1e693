// soap_attachment.h - binary data beside a message: DIME records, MIME parts, MTOM.
//
// Elsewhere: when they go out and come in (soap_io.h), the value that refers to one (soap_binary.h).
// Always: results are 0 or the code that also stands in ctx->error. What is received is managed memory and
// lives until the context lets go. Attachments that are to be sent are borrowed: content and texts must stay
// as they are until soap_send_finish has returned.
#pragma once

#include <zuv_client_pro/soap.h>

// Codes of Content-Transfer-Encoding; 0 none given.
enum soap_mime_encoding : int {
    MIME_NONE = 0,
    MIME_7BIT = 1,
    MIME_8BIT = 2,
    MIME_BINARY = 3,
    MIME_QUOTED_PRINTABLE = 4,
    MIME_BASE64 = 5,
    MIME_IETF_TOKEN = 6,
    MIME_X_TOKEN = 7
};

// One attachment, for DIME and MIME alike; the record is managed memory. Those received hang in
// ctx->dime.list and ctx->mime.list, in order. Contents are never decoded: `encoding` only tells what the
// sender says, and a host that wants them decoded does so in its write callback or afterwards.
struct soap_attachment {
    soap_attachment *next;
    char *content;        // the bytes (with a zero byte behind them on input), or a stream handle of the host
    std::size_t size;     // bytes; 0 with a handle to be sent: unknown
    const char *id;       // DIME id, or MIME Content-ID with its angle brackets
    const char *type;     // media type
    const char *options;  // DIME: type (2 bytes), length of the text (2 bytes), both big-endian, text of any
                          // bytes. Sent as they are up to that length
    int encoding;         // soap_mime_encoding
    const char *location; // Content-Location
    const char *description; // Content-Description
};

// --- callbacks of the host ---
//
// With dime_read_open or mime_read_open set, every attachment is asked about when it is sent, binary values
// of the message among them; with dime_write_open or mime_write_open, every one that is received. The open
// callback returns
//   a handle: the bytes go through the read or write callback, and `close` ends it, whatever happens then;
//   soap_attachment_in_memory(ctx): the attachment is left to the library, `content` holds the bytes to send,
//     or what is received is gathered in memory;
//   null: it failed, and the call ends with the code that it has put in ctx->error, or else with 10,
//     SOAP_USER_ERROR. Only an attachment to be sent that has neither content nor size is empty then.
// A read callback returns the number of bytes that it has stored, 0 at the end. The call ends with -1 if they
// are fewer than the size told, and with 21 if they are more than asked for. A write callback returns 0 or
// the code that ends the call. When mime_write_close is called, ctx->mime.last is the part: content and size
// that the callback puts there are those that its values get, and a code that it puts in ctx->error ends the
// call. The codes 10, 21 and -1 come with a fault text that names the attachment.

// No handle of a host has this address.
inline void *soap_attachment_in_memory(soap *ctx)
{
    return &ctx->dime;
}

// --- attachments to send ---

// Adds a DIME record to the next message sent; the host sets MODE_DIME in ctx->output_mode.
//   content, size  the bytes, or a handle for dime_read_open with the stream's length, 0 if that is unknown.
//                  In a message that is neither chunked nor stored an unknown length is error 10 when it is
//                  sent; an attachment without bytes has null content and size 0. What is longer than a
//                  record can be goes out in chunks
//   type, id       may be null; texts over 65535 bytes are cut on the wire. No two attachments of a message
//                  may have one id: see soap_dime_attachments_write
//   option_text    null for no options
//   0, 20
ZUV_API int soap_dime_attach(soap *ctx, char *content, std::size_t size, const char *type, const char *id,
                             unsigned short option_type, const char *option_text);

// Adds a MIME part to the next message sent; soap_mime_start makes that a MIME message. `encoding` is a
// soap_mime_encoding that tells how the content is encoded already. Null texts give no field. content, size
// and id as above. 0, 20.
ZUV_API int soap_mime_attach(soap *ctx, char *content, std::size_t size, int encoding, const char *type,
                             const char *id, const char *location, const char *description);

// Makes the messages sent from now on MIME messages, until the managed blocks are freed. Both texts are
// copied.
//   boundary  null: one is drawn at random
//   start     Content-ID of the part that holds the message; null: a fixed one
// Error 20 stands in ctx->error if a copy fails.
ZUV_API void soap_mime_start(soap *ctx, const char *boundary, const char *start);

// Appends a record to a list; its other fields are 0. `last` is not looked at while the list is empty. Null:
// error 20.
ZUV_API soap_attachment *soap_attachment_add(soap *ctx, soap_attachment **first, soap_attachment **last,
                                             char *content, std::size_t size);

// An options block in managed memory; the text is cut at 65531 bytes. Null: error 20.
ZUV_API char *soap_dime_options_make(soap *ctx, unsigned short type, const char *text);

// Gives the message under way a boundary of 192 random bits and a start id, where it has none. 0, 20, or 11
// if the system has no randomness.
ZUV_API int soap_mime_boundary_make(soap *ctx);

// Length of the MIME framing and DIME records that ride with the message, bytes (part of
// soap_message_length).
ZUV_API std::uint64_t soap_attachments_length(soap *ctx);

// --- values that stand beside the message ---

// Writes the reference in place of a value's bytes, and adds the bytes to the attachments.
//   id                   number of the element; above 0 it goes into a generated attachment id
//   address, holder      the bytes; the record that begins with their address and their number (an int)
//   id_text, type        attachment id ("cid:...") and media type; both null, or an empty id alone: no
//                        attachment. Values that are alike in bytes (their address and number), id, type and
//                        options are one attachment
//   type_text, type_id   XML type and type id of the element
// Result: -1 if the element stands (or failed: ctx->error). Otherwise the value is to be written in place
// under the element id returned, 0 for none.
ZUV_API int soap_attachment_ref_out(soap *ctx, const char *tag, int id, const void *address,
                                    const void *holder, const char *id_text, const char *type,
                                    const char *options, int dimensions, const char *type_text, int type_id);

// Reads the reference of the element just begun (ctx->element_href): clears the places, stores a copy of it
// in *id, and leaves the rest to the attachment, which may come at the end of the message. A reference that
// stays unanswered is error 33 or, in MTOM, 37 at the end of the message. 0, 20.
ZUV_API int soap_attachment_ref_in(soap *ctx, unsigned char **content, int *size, char **id, char **type,
                                   char **options);

// Reads an xop:Include child as above. A result of 3 or 6 with ctx->error 0: there is no such child, and
// nothing but blanks was used. 37 if the child refers to nothing.
ZUV_API int soap_xop_include_in(soap *ctx, unsigned char **content, int *size, char **id, char **type,
                                char **options);

// Gives a received attachment to all values that wait for its id. More than 2^31-1 bytes for one that does:
// error 45 in ctx->error. Attachments that no value waits for may have any size.
ZUV_API void soap_attachment_bind(soap *ctx, soap_attachment *attachment);

// 0 if the reference (with or without "cid:", percent-encoded or not) means the id (with or without angle
// brackets).
ZUV_API int soap_cid_compare(soap *ctx, const char *href, const char *id);

// --- records and parts, for the engine ---

// The header, options, id and type of the record described by ctx->dime. 0, 32, or an error of sending.
ZUV_API int soap_dime_header_write(soap *ctx);
// Reads the same into ctx->dime (managed texts, null for an empty one). The record that ends the message
// takes MODE_DIME out of ctx->mode. 0; 35 if the message has ended; 34; 32 if the options' length is not
// theirs; 20; -1.
ZUV_API int soap_dime_header_read(soap *ctx);
// All DIME records of a message in DIME mode; nothing otherwise. 0, an error of sending or of a callback, or
// 32 for two attachments of one id, which a message that is counted tells before anything is sent.
ZUV_API int soap_dime_attachments_write(soap *ctx);
// The rest of the message's record and all records behind it. 0, 20, 34, -1, the error of a callback, or 32:
// a record where it can't stand, a chunk without its record, two records of one id.
ZUV_API int soap_dime_attachments_read(soap *ctx);
// Delimiter and head of a part.
ZUV_API int soap_mime_part_header_write(soap *ctx, const soap_attachment *part);
// The same at the start of a message: empty lines, the delimiter unless it was read already, and the fields
// into a new record, ctx->mime.last. 0, 20, 22 for a line over 1023 characters, 36 if the boundary isn't the
// announced one, -1.
ZUV_API int soap_mime_part_header_read(soap *ctx);
// All MIME parts and the end of a message in MIME mode; nothing otherwise. As above, with 36 for two parts of
// one id, that of the message's own part included; ids that differ in angle brackets or percent-encoding
// alone are one.
ZUV_API int soap_mime_attachments_write(soap *ctx);
// Reads the content of the part whose head was read, and the head of the next. `handle` goes to
// mime_write_open, which is asked about all parts but the one that holds the message. The rest of that one is
// dropped. The part; null at the end (ctx->error 0) or on error: 20, 36 (also for two parts of one id), -1,
// or that of a callback.
ZUV_API soap_attachment *soap_mime_part_read(soap *ctx, void *handle);
// All parts that remain.
ZUV_API int soap_mime_parts_read_all(soap *ctx);

// Lazy reading (MODE_MIME_AFTER): one more part after the call has returned. With the last one the message
// ends and the connection is released. Null at the end or on an error, which stands in ctx->error.
ZUV_API soap_attachment *soap_mime_next_part(soap *ctx);
