// soap_attachment.h - binary data sent with a message: DIME records, MIME parts, MTOM.
//
// Elsewhere: when they are sent and received (soap_io.h), the value that refers to one (soap_binary.h).
// Always: what is received is managed memory and lives until the managed blocks are freed. Attachments to be
// sent are borrowed: content and texts must stay as they are until soap_send_finish has returned. "Errors of
// sending" and "of receiving" are those of soap_io.h; errors of a callback are those under "callbacks of the
// host program".
#pragma once

#include <zuv_client_pro/soap.h>

// Codes of Content-Transfer-Encoding.
enum soap_mime_encoding : int {
    MIME_NONE = 0,             // none given
    MIME_7BIT = 1,             // 7bit
    MIME_8BIT = 2,             // 8bit
    MIME_BINARY = 3,           // binary
    MIME_QUOTED_PRINTABLE = 4, // quoted-printable
    MIME_BASE64 = 5,           // base64
    MIME_IETF_TOKEN = 6,       // ietf-token
    MIME_X_TOKEN = 7           // x-token
};

// One attachment, for DIME and MIME alike; the record is managed memory. Those received are in ctx->dime.list
// and ctx->mime.list, in order. Contents are never decoded: `encoding` only gives what the sender says, and a
// host program that wants them decoded does so in its write callback or afterwards.
struct soap_attachment {
    soap_attachment *next; // in its list
    char *content; // the bytes (on input followed by a zero byte), or a stream handle of the host program
    std::uint64_t size;   // bytes, of a stream any number on any machine; 0 with a handle to be sent: unknown
    const char *id;       // DIME id, or MIME Content-ID with its angle brackets
    const char *type;     // media type
    const char *options;  // DIME: type (2 bytes), length of the text (2 bytes), both big-endian, text of any
                          // bytes. Sent as they are up to that length
    int encoding;         // soap_mime_encoding
    const char *location; // Content-Location
    const char *description; // Content-Description
};

// --- callbacks of the host program ---
//
// With dime_read_open or mime_read_open set, it is called for every attachment that is sent, binary values of
// the message included; with dime_write_open or mime_write_open, for every one that is received. The open
// callback returns one of these:
//   handle
//       the bytes pass through the read or write callback, and the close callback ends it, whatever happens
//       then
//   soap_attachment_in_memory(ctx)
//       the attachment is left to the library: `content` holds the bytes to send, or what is received is
//       collected in memory
//   null
//       it failed, and the call ends with the code that it has put in ctx->error, or else with
//       SOAP_USER_ERROR. Only an attachment to be sent that has neither content nor size is empty then
// A read callback returns the number of bytes that it has stored, 0 at the end. The call ends with SOAP_EOF
// if they are fewer than the size given, and with SOAP_CORRUPTION if they are more than asked for. A write
// callback returns SOAP_OK or the code that ends the call. When mime_write_close is called, ctx->mime.last is
// the part: content and size that the callback stores there are those that its values get, and a code that it
// puts in ctx->error ends the call. SOAP_USER_ERROR, SOAP_CORRUPTION and SOAP_EOF come with a fault text that
// names the attachment.

// A value for open callbacks that no handle of a host program has.
//   returns  an address in the context
inline void *soap_attachment_in_memory(soap *ctx)
{
    return &ctx->dime;
}

// --- attachments to send ---
//
// Called between exchanges, before the call that sends them.

// Adds a DIME record to the next message sent; the host program sets MODE_DIME in ctx->output_mode.
//   content      the bytes, or a handle for dime_read_open; null with size 0: an attachment without bytes
//   size         bytes; with a handle the stream's length, 0 if that is unknown: sending it ends with
//                SOAP_USER_ERROR in a message that is neither chunked nor stored. What exceeds the size of a
//                record is sent in chunks
//   type         media type; may be null; over 65535 bytes it is cut on the wire
//   id           may be null; cut likewise. No two attachments of a message may have one id: see
//                soap_dime_attachments_write
//   option_type  type of the options
//   option_text  null for no options
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY
ZUV_API int soap_dime_attach(soap *ctx, char *content, std::uint64_t size, const char *type, const char *id,
                             unsigned short option_type, const char *option_text);

// Adds a MIME part to the next message sent; soap_mime_start makes that a MIME message. Null texts give no
// field.
//   content      as above, with mime_read_open
//   size         as above
//   encoding     a soap_mime_encoding that says how the content is encoded already
//   type         media type
//   id           Content-ID; no two parts of a message may have one id: see soap_mime_attachments_write
//   location     Content-Location
//   description  Content-Description
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY
ZUV_API int soap_mime_attach(soap *ctx, char *content, std::uint64_t size, int encoding, const char *type,
                             const char *id, const char *location, const char *description);

// Makes the messages sent from now on MIME messages, until the managed blocks are freed. SOAP_OUT_OF_MEMORY
// in ctx->error if a copy fails.
//   boundary  copied; null: one is drawn at random
//   start     Content-ID of the part that holds the message, copied; null: a fixed one
ZUV_API void soap_mime_start(soap *ctx, const char *boundary, const char *start);

// Appends a record to a list; its other fields are 0.
//   first    start of the list
//   last     end of the list; not used while the list is empty
//   content  borrowed
//   size     bytes
//   returns  the record
//   null     SOAP_OUT_OF_MEMORY in ctx->error
ZUV_API soap_attachment *soap_attachment_add(soap *ctx, soap_attachment **first, soap_attachment **last,
                                             char *content, std::uint64_t size);

// Makes an options block, as soap_attachment::options.
//   type     type of the options
//   text     cut at 65531 bytes; null is empty
//   returns  the block, in managed memory
//   null     SOAP_OUT_OF_MEMORY in ctx->error
ZUV_API char *soap_dime_options_make(soap *ctx, unsigned short type, const char *text);

// Gives the message in progress a boundary of 192 random bits and a start id, where it has none.
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY
//   SOAP_FATAL_ERROR    the system has no randomness
ZUV_API int soap_mime_boundary_make(soap *ctx);

// Length of the MIME framing and DIME records that are sent with the message (part of soap_message_length).
//   returns  bytes
ZUV_API std::uint64_t soap_attachments_length(soap *ctx);

// --- values sent as attachments ---

// Writes the reference in place of a value's bytes, and adds the bytes to the attachments. Values that are
// alike in bytes (their address and number), id, type and options are one attachment. Called during sending.
//   tag         name of the value's element
//   id          number of the element; above 0 it becomes part of a generated attachment id
//   address     the bytes; null writes a null value
//   holder      the record that begins with their address and their number (an int)
//   id_text     attachment id ("cid:..."); null or empty: one is generated
//   type        media type; null, without an id: the value is no attachment
//   options     DIME options; null for none
//   dimensions  sizes in the holder, for a value that is no attachment
//   type_text   XML type of the element
//   type_id     type id of the value
//   -1          the element is written, or writing it failed: see ctx->error
//   returns     otherwise the value is to be written in place under this element id, 0 for none
ZUV_API int soap_attachment_ref_out(soap *ctx, const char *tag, int id, const void *address,
                                    const void *holder, const char *id_text, const char *type,
                                    const char *options, int dimensions, const char *type_text, int type_id);

// Reads a reference: that of the element just begun (ctx->element_href), or of an xop:Include child. The
// places are filled when the attachment arrives, which may be at the end of the message. A reference without
// an attachment ends soap_receive_finish with SOAP_DIME_HREF or, in MTOM, SOAP_MIME_HREF. Called during
// receiving.
//   content  takes the bytes; null until then
//   size     takes their number; 0 until then
//   id       takes a copy of the reference at once
//   type     takes the media type; null until then
//   options  takes the DIME options or the MIME description; null until then
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY
//   SOAP_TAG_MISMATCH   soap_xop_include_in: another child comes next; ctx->error is SOAP_OK
//   SOAP_NO_TAG         soap_xop_include_in: no child comes next, only blanks were read; ctx->error is
//                       SOAP_OK
//   SOAP_MIME_HREF      soap_xop_include_in: the child refers to nothing
//   returns             soap_xop_include_in: otherwise an error of reading (soap_xml.h)
ZUV_API int soap_attachment_ref_in(soap *ctx, unsigned char **content, int *size, char **id, char **type,
                                   char **options);
ZUV_API int soap_xop_include_in(soap *ctx, unsigned char **content, int *size, char **id, char **type,
                                char **options);

// Gives a received attachment to all values that wait for its id. SOAP_LENGTH in ctx->error if a value waits
// for one of more than 2^31-1 bytes; attachments that no value waits for may have any size.
//   attachment  from ctx->dime.list or ctx->mime.list
ZUV_API void soap_attachment_bind(soap *ctx, soap_attachment *attachment);

// Compares a reference with an id.
//   href  with or without "cid:", percent-encoded or not
//   id    with or without angle brackets
//   0     the reference means the id
//   1     it does not, or an argument is null
ZUV_API int soap_cid_compare(soap *ctx, const char *href, const char *id);

// --- records and parts, for the engine ---

// Writes the header, options, id and type of the record described by ctx->dime.
//   SOAP_OK
//   SOAP_DIME_ERROR  the data or the options are too long for a record
//   returns          otherwise an error of sending
ZUV_API int soap_dime_header_write(soap *ctx);
// Reads the same into ctx->dime (managed texts, null for an empty one). The record that ends the message
// removes MODE_DIME from ctx->mode.
//   SOAP_OK
//   SOAP_DIME_END       the message has ended
//   SOAP_DIME_VERSION   another version of the format
//   SOAP_DIME_ERROR     the options' length is not theirs, or data follows where padding is due
//   SOAP_OUT_OF_MEMORY
//   returns             otherwise an error of receiving
ZUV_API int soap_dime_header_read(soap *ctx);
// Writes all DIME records of a message in DIME mode; nothing otherwise.
//   SOAP_OK
//   SOAP_DIME_ERROR     two attachments have one id; a message that is counted finds that before anything is
//                       sent
//   SOAP_OUT_OF_MEMORY
//   returns             otherwise an error of sending or of a callback
ZUV_API int soap_dime_attachments_write(soap *ctx);
// Reads the rest of the message's record and all records after it.
//   SOAP_OK
//   SOAP_DIME_ERROR     a record where it is not allowed, a chunk without its record, two records of one id
//   SOAP_DIME_VERSION   another version of the format
//   SOAP_OUT_OF_MEMORY
//   returns             otherwise an error of receiving, of soap_attachment_bind or of a callback
ZUV_API int soap_dime_attachments_read(soap *ctx);
// Writes delimiter and head of a part.
//   part     its fields
//   SOAP_OK
//   returns  otherwise an error of sending
ZUV_API int soap_mime_part_header_write(soap *ctx, const soap_attachment *part);
// Reads the same at the start of a message: empty lines, the delimiter unless it was read already, and the
// fields into a new record, ctx->mime.last.
//   SOAP_OK
//   SOAP_MIME_ERROR     the boundary isn't the announced one, or there are more than 1024 fields
//   SOAP_HEADER_LINE    a line over 1023 characters
//   SOAP_OUT_OF_MEMORY
//   returns             otherwise an error of receiving
ZUV_API int soap_mime_part_header_read(soap *ctx);
// Writes all MIME parts and the end of a message in MIME mode; nothing otherwise.
//   SOAP_OK
//   SOAP_MIME_ERROR     two parts have one id, that of the message's own part included; ids that differ in
//                       angle brackets or percent-encoding alone are one
//   SOAP_OUT_OF_MEMORY
//   returns             otherwise an error of sending or of a callback
ZUV_API int soap_mime_attachments_write(soap *ctx);
// Reads the content of the part whose head was read, and the head of the next. The rest of the part that
// holds the message is dropped.
//   handle   passed to mime_write_open, which is called for all parts but the one that holds the message
//   returns  the part
//   null     at the end with ctx->error SOAP_OK; or SOAP_OUT_OF_MEMORY, SOAP_MIME_ERROR (a broken delimiter,
//            two parts of one id), an error of receiving, of soap_attachment_bind or of a callback
ZUV_API soap_attachment *soap_mime_part_read(soap *ctx, void *handle);
// Reads all parts that remain.
//   SOAP_OK
//   returns  otherwise as soap_mime_part_read
ZUV_API int soap_mime_parts_read_all(soap *ctx);

// --- reading parts after the call ---

// Reads one more part after a call with MODE_MIME_AFTER has returned. With the last one the message ends and
// the connection is released.
//   returns  the part
//   null     at the end with ctx->error SOAP_OK; or an error of soap_mime_part_read or soap_receive_finish
ZUV_API soap_attachment *soap_mime_next_part(soap *ctx);
