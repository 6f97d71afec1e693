// soap.h - the engine context: one flat record on which a message exchange works.
//
// Here: sizes, mode flags, the callback table, the record with every field's meaning, and its life
// (construction, per-call reset, copying, end). Elsewhere: what works on the record, one header for
// each mechanism (soap_memory.h, soap_io.h, soap_error.h, soap_log.h, soap_plugin.h, soap_tcp.h,
// soap_tls.h, soap_http.h, soap_xml.h, soap_identity.h, soap_primitive.h, soap_attachment.h, soap_report.h).
//
// Always, in all public headers, unless a function says otherwise:
//
// - One context serves one thread and one exchange at a time; nothing takes a lock.
// - Arguments are needed only during the call. A text field marked "borrowed" keeps the caller's pointer: the
//   text must outlive its last use. A field marked "managed" belongs to the context (soap_memory.h).
// - An operation returns SOAP_OK or an error code of soap_error.h, which is also in soap::error.
// - Time limits: 0 is no limit, positive values are seconds, negative ones microseconds. They run on the
//   system's monotonic clock, whatever signals arrive.
// - ctx is a context that has not ended.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <iosfwd>

#include <zuv_client_pro/soap_export.h>

struct soap;
struct SOAP_ENV__Header;
struct SOAP_ENV__Fault;

struct soap_head_memory; // see soap::head_memory
struct soap_call_record; // see soap::call_record

// Handles of OpenSSL and zlib: named here so that a host program needs none of their headers.
struct bio_st;
struct ssl_st;
struct ssl_ctx_st;
struct ssl_session_st;
struct x509_store_ctx_st;
struct z_stream_s;

// --- fixed sizes ---
//
// They are part of the design: limits on the wire follow from them.

constexpr std::size_t SOAP_BUFFER_SIZE = 65536;      // bytes; send/receive buffer, compression buffer
constexpr std::size_t SOAP_TEXT_SIZE = 1024;         // bytes; each scratch text, terminator included
constexpr std::size_t SOAP_ID_HASH_SIZE = 1999;      // chains of the id table
constexpr std::size_t SOAP_POINTER_HASH_SIZE = 4096; // chains of the pointer table at its start
constexpr std::size_t SOAP_TRACK_HASH_SIZE = 4096;   // chains of the memory tracking table at its start
constexpr std::size_t SOAP_POINTER_BLOCK_SIZE = 32;  // pointer records in one block
constexpr std::size_t SOAP_POSITIONS_MAX = 16;       // array positions kept for SOAP-ENC:position
constexpr std::size_t SOAP_STORE_SIZE = 131072;      // bytes; longest message that a call writes but once
constexpr std::size_t SOAP_LOG_CHANNELS = 3;         // received, sent, third
constexpr std::uint32_t SOAP_MAX_DEPTH = 4096;       // default of soap::max_depth
constexpr std::uint64_t SOAP_MAX_MESSAGE = std::uint64_t{1} << 30;  // bytes; default of soap::max_message
constexpr std::uint64_t SOAP_MAX_MEMORY = std::uint64_t{512} << 20; // bytes; default of soap::max_memory
constexpr std::uint64_t SOAP_POOL_LIMIT = std::uint64_t{1} << 20;   // bytes; default of soap::pool_limit

// --- mode flags ---
//
// The same values serve soap::mode, soap::input_mode and soap::output_mode. The reader uses 0x100000 and
// 0x200000 for further encodings of received text; a host program leaves them alone.

constexpr std::uint32_t MODE_IO_MASK = 0x3;     // the two bits that choose how bytes are sent
constexpr std::uint32_t MODE_DIRECT = 0x0;      // no buffering: each write is sent at once
constexpr std::uint32_t MODE_BUFFERED = 0x1;    // through `buffer`, Content-Length from a counting pass
constexpr std::uint32_t MODE_STORE = 0x2;       // the whole message is stored, then sent
constexpr std::uint32_t MODE_CHUNKED = 0x3;     // HTTP chunked framing
constexpr std::uint32_t MODE_UDP = 0x4;         // datagrams
constexpr std::uint32_t MODE_COUNTING = 0x8;    // counting pass: bytes are counted, not sent
constexpr std::uint32_t MODE_KEEP_ALIVE = 0x10; // ask the peer to keep the connection
constexpr std::uint32_t MODE_LATIN1 = 0x20;     // received text is ISO-8859-1
constexpr std::uint32_t MODE_BARE_XML = 0x40;   // no HTTP, plain XML on the stream
constexpr std::uint32_t MODE_DIME = 0x80;       // DIME attachments
constexpr std::uint32_t MODE_MIME = 0x100;      // MIME attachments
constexpr std::uint32_t MODE_MTOM = 0x200;      // MTOM form of the attachments
constexpr std::uint32_t MODE_DEFLATE = 0x400;   // compression in force
constexpr std::uint32_t MODE_TLS = 0x800;       // set by a TLS connect, cleared by a plain one
constexpr std::uint32_t MODE_STRICT = 0x1000;   // strict validation on reading
constexpr std::uint32_t MODE_INDENT = 0x2000;   // indented output
constexpr std::uint32_t MODE_IGNORE_NAMESPACES = 0x4000; // namespaces are not compared
constexpr std::uint32_t MODE_DEFAULT_NAMESPACE = 0x8000; // xmlns on each element in place of prefixes
constexpr std::uint32_t MODE_CANONICAL = 0x10000;        // canonical XML
constexpr std::uint32_t SOAP_XML_TREE = 0x20000;         // no id and ref: the data is a tree
constexpr std::uint32_t MODE_NIL = 0x40000;              // absent values are written as nil elements
constexpr std::uint32_t MODE_NO_TYPE = 0x80000;          // no xsi:type
constexpr std::uint32_t MODE_UTF_STRINGS = 0x2000000;    // strings are UTF-8 in memory
constexpr std::uint32_t MODE_NULL_STRINGS = 0x8000000;   // an empty string is written as nil
constexpr std::uint32_t SOAP_XML_GRAPH = 0x20000000;     // id and ref in literal messages too
constexpr std::uint32_t MODE_MIME_AFTER = 0x40000000;    // the rest of the MIME parts is read after the call
constexpr std::uint32_t MODE_WSU_ID = 0x80000000;        // wsu:Id on the Body of the next message sent

// --- older behaviour that a host program may ask for ---
//
// Bits of soap::legacy. Each gives up a protection; none is set by default.

constexpr std::uint32_t LEGACY_ANY_ROUTE = 0x1; // a kept connection carries calls through another HTTP proxy
                                                // or under other TLS rules than it was made with
constexpr std::uint32_t LEGACY_TUNNEL_CREDENTIALS = 0x2; // a CONNECT head carries the service's credentials,
                                                         // where the HTTP proxy can read them
constexpr std::uint32_t LEGACY_ANSWER_CREDENTIALS = 0x4; // an Authorization header of a response replaces
                                                         // auth_user and auth_password
constexpr std::uint32_t LEGACY_FIRST_ADDRESS = 0x8;      // with connect_timeout, an address that is silent or
                                                         // refuses late ends the attempt
constexpr std::uint32_t LEGACY_ANY_ENDPOINT = 0x10; // a proxy object's call takes endpoints without a host,
                                                    // with any port and any scheme
constexpr std::uint32_t LEGACY_CLOSE_WAIT = 0x20;   // closing TLS waits for the peer's close_notify
constexpr std::uint32_t LEGACY_HOST_CHECK = 0x40;   // the default host check matches names as patterns

// --- stages of a message ---
//
// Values of soap::message_part.

constexpr std::int16_t PART_BEGIN = 0;          // sending has begun, nothing was written
constexpr std::int16_t PART_ENVELOPE = 2;       // inside the Envelope, before the Header
constexpr std::int16_t PART_HEADER = 3;         // inside the Header
constexpr std::int16_t PART_AFTER_HEADER = 4;   // after the Header
constexpr std::int16_t PART_EMPTY_BODY = 5;     // the received Body is empty and has no end tag
constexpr std::int16_t PART_BODY = 6;           // inside the Body
constexpr std::int16_t PART_AFTER_BODY = 7;     // after the Body
constexpr std::int16_t PART_AFTER_ENVELOPE = 8; // after the Envelope
constexpr std::int16_t PART_OUTSIDE = 9;        // no message is in progress

// --- records of the context ---
//
// They belong to the context unless a field says otherwise.

// One row of the namespace table; a table ends with a row whose prefix is null.
struct soap_namespace {
    const char *prefix;  // the prefix written on the wire and used in all tag comparisons
    const char *uri;     // the namespace's own URI
    const char *pattern; // further URIs accepted, under soap_tag_match; null for none
    // URI last received under the pattern; null for none. In soap::local_namespaces it belongs to the context
    // and goes with the table; in static tables always null.
    char *received;
};

// One prefix in scope, of the writer or the reader; see soap_xml.h. Only the prefix functions make and
// recycle these records.
struct soap_prefix {
    soap_prefix *next;      // next older record
    soap_prefix *chain;     // next older record of the same hash chain
    const char *uri;        // stored after the prefix, in the record itself; null: none, or bound to a row
    std::uint32_t level;    // element depth at which it was pushed
    std::uint32_t capacity; // bytes that the record has for its texts
    // Reader: row of the namespace table, or -1. Writer: 0 declared, 1 to be declared, 2 declared here.
    std::int16_t index;
    std::uint16_t hash;          // its chain
    std::uint16_t prefix_length; // bytes in `prefix`, terminator not included
    char prefix[1];              // the prefix's text, in the record itself
};

// Hash chains and spare records of the prefix stack, texts of the table; private to the XML layer.
struct soap_namespace_scope;

// One remembered result of the prefix look-up, private to the reader.
struct soap_prefix_cache {
    std::int16_t row;    // as soap::tag_row
    std::uint8_t length; // bytes of `text`
    char text[45];       // the prefix; longer ones are not remembered
};

// Attribute of the current element (writer and reader); records and value buffers are reused within a call.
// Each record is one block of SOAP_MALLOC (soap_memory.h).
struct soap_attribute {
    soap_attribute *next;      // in soap::attribute_list, which holds the visible ones
    soap_attribute *chain;     // next record of the same hash chain, visible or idle
    std::uint32_t hash;        // of the name
    std::int16_t escape;       // flag passed to soap_text_write for the value
    char *value;               // another block of SOAP_MALLOC, or null
    std::size_t size;          // capacity of `value`, bytes
    const char *uri;           // namespace of the name, for canonical order; borrowed
    std::int16_t visible;      // 0 idle, 1 present without a value, 2 present with a value
    std::uint32_t name_length; // bytes of `name`, terminator not included
    std::uint32_t name_size;   // capacity of `name`, bytes
    char name[1];              // in the record itself
};

// One block of a block stack; its data follows this header.
struct soap_block {
    soap_block *next; // next block of the stack
    std::size_t size; // bytes of data
};
// A block stack: blocks in which a stored message or an array of unknown size is collected.
struct soap_block_stack {
    soap_block_stack *next_stack; // the stack below it
    soap_block *first_block;      // newest first until soap_block_stack_first reverses it
    std::size_t total_size;       // bytes of data in all blocks
};

// A managed object with a destructor; see soap_memory.h.
struct soap_instance {
    soap_instance *next;                         // next older record
    void *object;                                // the object, or the first of an array
    std::int32_t type_id;                        // may name a class derived from the one asked for
    std::int32_t array_size;                     // negative: a single object; otherwise the number of objects
    int (*delete_hook)(soap_instance *instance); // destroys `object`; returns 0 if it did
};

struct soap_block_trailer;  // trailer of a managed block, private to memory
struct soap_track_entry;    // one tracked allocation, private to memory
struct soap_pointer_record; // see soap_identity.h
struct soap_pointer_block;
struct soap_id_record;
struct soap_id_index;         // storage of the id records, and a look-up aid for very many ids; private
struct soap_attachment;       // see soap_attachment.h
struct soap_attachment_index; // private to attachments
struct soap_plugin_record;    // see soap_plugin.h

// A value that was read and waits for its attachment: the places to fill. Freed when the attachment has
// arrived, or with the call's scratch; see soap_attachment.h.
struct soap_attachment_ref {
    soap_attachment_ref *next;          // in soap::mtom_list
    soap_attachment_ref *previous;      // in soap::mtom_list
    soap_attachment_ref *next_in_chain; // in soap::mtom_index
    std::uint64_t hash;                 // of the id
    unsigned char **content;            // takes the bytes
    int *size;                          // takes their number
    char **type;                        // takes the media type
    char **options;                     // takes the DIME options or the MIME description
    const char *id;                     // as in the message, "cid:" included; managed
};

// DIME state of the message in progress.
struct soap_dime_state {
    std::uint8_t flags;            // low bits MB 4, ME 2, CF 1; high four bits the type format
    std::size_t size;              // data length of the current record, bytes
    std::size_t chunk_size;        // bytes left in the current chunk of the SOAP record, when it is chunked
    std::size_t buffer_length;     // bytes of `buffer` beyond the current chunk
    std::uint64_t count;           // length of all DIME attachments as counted for Content-Length
    char *id;                      // of the current record; managed
    char *type;                    // of the current record; managed
    char *options;                 // managed; first two bytes type, next two length, text
    soap_attachment *list;         // received records, in order
    soap_attachment *first, *last; // attachments to send; on input `last` is the newest received one
};

// MIME state of the message in progress.
struct soap_mime_state {
    soap_attachment *list; // received parts, in order
    soap_attachment *root; // the received part that holds the message, whose content the XML reader takes
    soap_attachment *first, *last; // parts to send; on input `last` is the part being read
    char *boundary;                // managed; null when none is known
    char *start;                   // Content-ID of the SOAP part; managed; null for the first part
};

// Where the connection of a client leads and under which rules it was made: the next call uses the connection
// only if it needs the same. Set when the connection is opened, private to the network layer.
struct soap_route {
    bool known;                // false: no connection, or one that was not opened for a call
    bool secure;               // TLS
    bool datagrams;            // UDP
    std::uint16_t rules;       // tls_flags when it was made
    int port, proxy_port;      // of the endpoint, of the HTTP proxy
    char host[SOAP_TEXT_SIZE]; // of the endpoint
    // Empty: direct. A copy, as the host program's text may change in place; a longer one is cut and so
    // equals none.
    char proxy_host[SOAP_TEXT_SIZE];
};

// --- the context ---

// The context of a message exchange; every proxy object is one. Fields that a host program sets are described
// in the host guide; it reads error, status, fault and header, and leaves all others to the library.
struct ZUV_CLASS soap {
    std::int16_t state;         // 0 ended, 1 initialised, 2 copy of another context
    std::int16_t soap_version;  // 0 not yet known, 1 SOAP 1.1, 2 SOAP 1.2
    std::uint32_t mode;         // effective mode of the message now in progress
    std::uint32_t input_mode;   // requested for input; a received head also changes it
    std::uint32_t output_mode;  // requested for output
    const char *float_format;   // borrowed; printf format of float values
    const char *double_format;  // borrowed; printf format of double values
    const char *dime_id_format; // borrowed; printf format of generated attachment ids, from an int
    const char *http_version;   // borrowed; version in request lines, "1.1" by default
    // Received Content-Type (managed), or the host program's override for a sent one.
    const char *http_content;
    const char *encoding_style; // null: literal; "" : the encoding namespace of the table's second row
    const char *actor;          // borrowed; actor or role to send, and the one this receiver plays
    const char *language;       // borrowed; xml:lang of fault texts
    int recv_timeout, send_timeout, connect_timeout, accept_timeout; // time limits; 0 by default
    int call_timeout;           // time limit of a whole exchange, from connecting to the response's last byte
    std::int64_t call_deadline; // when call_timeout ends the exchange in progress; microseconds of the
                                // monotonic clock; 0 none
    bool call_expired;          // call_timeout or soap_cancel has ended the exchange, which error texts name
    std::uint32_t legacy;       // LEGACY_...
    // Most bytes of one message's XML, both ways, as plain text: framing and compression undone, attachments
    // not counted; 0 no limit. Beyond it: SOAP_LENGTH, and the connection is closed.
    std::uint64_t max_message;
    // Most bytes held for one received message in objects, texts, blocks and attachments, and for one to be
    // sent that is stored; 0 no limit. Beyond it: SOAP_LENGTH, and the connection is closed. Checked after
    // each buffer of input and at the message's end.
    std::uint64_t max_memory;
    int socket_flags;                 // flags for send and recv
    int connect_flags;                // SOL_SOCKET option to set on a client socket, or SO_LINGER; 0 none
    int bind_flags, accept_flags;     // the same for a listening and an accepted socket
    std::uint16_t linger_seconds;     // l_linger when the option above is SO_LINGER
    const soap_namespace *namespaces; // borrowed; static table
    soap_namespace *local_namespaces; // owned copy, made by the first message
    soap_prefix *prefix_list;         // innermost first
    soap_namespace_scope *namespace_scope;       // owned; null until first use; kept from call to call
    soap_block_stack *block_stack;               // the top one
    soap_instance *instance_list;                // newest first
    soap_block_trailer *allocation_list;         // newest first
    soap_id_record *id_table[SOAP_ID_HASH_SIZE]; // hash chains
    std::size_t id_count;                        // records in id_table
    soap_id_index *id_index;                     // storage of the id table; null until a message has an id
    soap_pointer_record *pointer_table[SOAP_POINTER_HASH_SIZE]; // hash chains
    // The table in use: pointer_table, or a larger one for huge messages.
    soap_pointer_record **pointer_chains;
    std::size_t pointer_chain_mask;     // chains of the table in use, less one
    std::size_t pointer_count;          // records in the table
    soap_pointer_block *pointer_blocks; // newest first
    std::uint16_t pointer_block_used;   // records used in the newest block
    SOAP_ENV__Header *header;           // received or to be sent; managed
    SOAP_ENV__Fault *fault;             // managed
    std::uint32_t next_id;              // last number given to a marked object
    void *user;                         // free for the host program
    soap_plugin_record *plugin_list;    // newest first
    // HTTP Basic credentials; managed memory, which is wiped when it is freed, or the host program's.
    const char *auth_user, *auth_password;
    // Credentials are in `buffer` and the scratch texts; soap_block_free with null wipes them.
    bool credentials_passed;
    const char *auth_realm; // from a received challenge; managed

    // --- callbacks ---
    //
    // Each takes the context first. A null entry is skipped. An int result other than SOAP_OK ends the
    // operation with that code, unless set otherwise.

    // Writes the head of a request with `count` bytes of body. Default: http_write_request.
    int (*on_post)(soap *ctx, const char *endpoint, const char *host, int port, const char *path,
                   const char *action, std::uint64_t count);
    // Serves a received request of the method. After SOAP_OK the exchange ends with SOAP_STOP. Defaults:
    // http_get_default, http_put_default, http_delete_default, http_method_default for the last two.
    int (*on_get)(soap *ctx);
    int (*on_put)(soap *ctx);
    int (*on_delete)(soap *ctx);
    int (*on_options)(soap *ctx);
    int (*on_head)(soap *ctx);
    // Serves a request for which on_parse_header gave SOAP_FORM. After SOAP_OK the exchange ends with
    // SOAP_STOP. Default: none, which leaves SOAP_FORM as the result.
    int (*on_form)(soap *ctx);
    // Writes one line of a head. A null value writes the key alone, a null key an empty line. Default:
    // http_write_line.
    int (*on_header_line)(soap *ctx, const char *key, const char *value);
    // Writes the head of a response with `count` bytes of body. Default: http_write_response.
    int (*on_response)(soap *ctx, int status, std::uint64_t count);
    // Reads the head of a received message. Default: http_read_head.
    int (*on_read_head)(soap *ctx);
    // Takes one header of a received head. A result of 1000 or more is kept until the head has been read.
    // Default: http_parse_header.
    int (*on_parse_header)(soap *ctx, const char *key, const char *value);
    // Runs when the SOAP header of a received message has been read into soap::header. Default: none.
    int (*on_soap_header)(soap *ctx);
    // Runs before a request's connection is chosen. When it is set, soap::action is its affair. Default:
    // none.
    int (*on_connect)(soap *ctx, const char *endpoint, const char *host, int port);
    // Runs when an exchange ends, before the connection is kept or closed. Default: none.
    int (*on_disconnect)(soap *ctx);
    // Closes a descriptor; returns the result of close. Default: tcp_close_socket.
    int (*on_close_socket)(soap *ctx, int socket);
    // Shuts a connection down, `how` as of shutdown; the result is ignored. Default: tcp_shutdown_socket.
    int (*on_shutdown_socket)(soap *ctx, int socket, int how);
    // Opens a connection; returns the descriptor, or -1 with soap::error. Default: tcp_connect.
    int (*on_open)(soap *ctx, const char *endpoint, const char *host, int port);
    // Accepts a client; returns the descriptor, or -1 with errno. Default: tcp_accept_socket.
    int (*on_accept)(soap *ctx, int socket, void *address, int *length);
    // Closes the connection. Default: tcp_disconnect.
    int (*on_close)(soap *ctx);
    // Sends all bytes. Default: tcp_send.
    int (*on_send)(soap *ctx, const char *data, std::size_t length);
    // Receives at most `length` bytes; returns their number, 0 at the end or on failure. Default: tcp_recv.
    std::size_t (*on_recv)(soap *ctx, char *buffer, std::size_t length);
    // Whether a kept connection can carry another call: 0 if it can. Default: tcp_peek.
    int (*on_poll)(soap *ctx);
    // May store the code and the text of the fault that describes soap::error; texts must live as long as the
    // fault. Default: none.
    void (*on_error_text)(soap *ctx, const char **code, const char **text);
    // Data of the plug-in with this id, or null. Default: soap_plugin_find.
    void *(*on_find_plugin)(soap *ctx, const char *id);
    // Allocates in place of a managed block; the result is the host program's to free. Default: none.
    void *(*on_malloc)(soap *ctx, std::size_t size);
    // For plug-ins that work on whole messages, such as signatures: the start of a message, its bytes in
    // stretches, and its end. A message to be sent is shown before its first byte is sent: while it is
    // counted, or when a stored one leaves the buffer. Of a received message the body is shown, decompressed
    // and without framing. Default: none.
    int (*on_send_prepare_begin)(soap *ctx);
    int (*on_recv_prepare_begin)(soap *ctx);
    int (*on_send_prepare)(soap *ctx, const char *data, std::size_t length);
    int (*on_recv_prepare)(soap *ctx, const char *data, std::size_t length);
    int (*on_send_prepare_end)(soap *ctx);
    int (*on_recv_prepare_end)(soap *ctx);
    // May replace the bytes to be sent by others, which must live until the next call of it; length 0 sends
    // nothing. Default: none.
    int (*on_send_filter)(soap *ctx, const char **data, std::size_t *length);
    // May change the received bytes in place: `*length` of them, at most `size`; 0 asks for more input.
    // Called at the end of input too. Cleared at the end of the message. Default: none.
    int (*on_recv_filter)(soap *ctx, char *buffer, std::size_t *length, std::size_t size);
    // Attachments as streams, DIME and MIME, to be sent (read) and received (write): see soap_attachment.h.
    // Default: none.
    void *(*dime_read_open)(soap *ctx, void *handle, const char *id, const char *type, const char *options);
    void (*dime_read_close)(soap *ctx, void *handle);
    std::size_t (*dime_read)(soap *ctx, void *handle, char *buffer, std::size_t length);
    void *(*dime_write_open)(soap *ctx, const char *id, const char *type, const char *options);
    void (*dime_write_close)(soap *ctx, void *handle);
    int (*dime_write)(soap *ctx, void *handle, const char *data, std::size_t length);
    void *(*mime_read_open)(soap *ctx, void *handle, const char *id, const char *type,
                            const char *description);
    void (*mime_read_close)(soap *ctx, void *handle);
    std::size_t (*mime_read)(soap *ctx, void *handle, char *buffer, std::size_t length);
    void *(*mime_write_open)(soap *ctx, void *handle, const char *id, const char *type,
                             const char *description, int encoding);
    void (*mime_write_close)(soap *ctx, void *handle);
    int (*mime_write)(soap *ctx, void *handle, const char *data, std::size_t length);

    // --- working state and further settings ---

    int filter_stop;          // result of the read that a receive filter is holding back
    int master_socket;        // listening socket; -1 none
    int socket;               // connected socket; -1 none
    std::uint16_t opened_by;  // which process of a forking host program opened `socket`; 0: not for a call
    bool socket_abandoned;    // soap_force_close closed `socket`: the number is neither used nor closed again
    bool response_unfinished; // the last response was not read to its end: the connection carries no other
                              // call
    bool socket_accepted;     // soap_accept opened `socket`
    bool master_shared;       // master_socket belongs to the context that this is a copy of: not closed here
    soap_route route;         // of `socket`
    std::ostream *output_stream; // borrowed; in place of the socket
    std::istream *input_stream;  // borrowed; in place of the socket
    int send_fd;                 // used for output when there is no socket
    int recv_fd;                 // used for input when there is no socket
    std::size_t buffer_index;    // input: read position in `buffer`; output: its fill
    std::size_t buffer_length;   // input: fill of `buffer`
    std::int32_t look_ahead;     // one byte or token pushed back; 0 none; -1 end of input, which stays
    std::int16_t in_cdata;       // reader: inside a CDATA section
    // Reader: the held element has content; writer: the element has text or children.
    std::int16_t has_body;
    std::uint32_t nesting_level;         // open elements
    std::uint32_t max_depth;             // most open elements, both ways; 0 no limit
    std::uint64_t message_count;         // bytes counted on output, received on input
    std::uint64_t content_length;        // received Content-Length
    char *label_buffer;                  // growing text; owned; null until first use
    std::size_t label_size, label_index; // capacity and fill, bytes
    char buffer[SOAP_BUFFER_SIZE];       // the one send and receive buffer
    char message_text[SOAP_TEXT_SIZE];   // text of the last error; start line of a received head
    char scratch_text[SOAP_TEXT_SIZE];   // request line, header values, attributes, number texts
    char tag[SOAP_TEXT_SIZE];            // name of the last start tag read, or of the last end tag
    char element_id[SOAP_TEXT_SIZE];     // "#" and the id of the held element
    char element_href[SOAP_TEXT_SIZE];   // its reference
    char element_type[SOAP_TEXT_SIZE];   // its xsi:type
    char array_type[SOAP_TEXT_SIZE];     // its array type
    char array_size[SOAP_TEXT_SIZE];     // its array size
    char array_offset[SOAP_TEXT_SIZE];   // its array offset
    std::uint16_t tag_length;            // bytes in `tag`
    std::uint16_t tag_local;             // reader: offset of the local name in `tag`; valid with tag_resolved
    std::int16_t tag_row; // reader: namespace row of `tag`, negative for none; valid with tag_resolved
    bool tag_resolved;    // reader: the two fields above belong to the present `tag`
    std::uint8_t prefix_cache_valid; // reader: bit n: prefix_cache[n] holds a prefix of the present stack
    const soap_prefix *prefix_cache_list;       // reader: prefix_list when the cache was filled
    soap_prefix_cache prefix_cache[8];          // reader: rows of the prefixes last looked up
    std::int16_t position_count;                // numbers in `positions`
    std::int32_t positions[SOAP_POSITIONS_MAX]; // SOAP-ENC:position of an array item
    soap_attribute *attribute_list;             // visible attributes of the current element
    std::int16_t encoding_flag;                 // the next start tag carries SOAP-ENV:encodingStyle
    std::int16_t must_understand; // the next start tag carries mustUnderstand; on input: the held tag had it
    std::int16_t null_flag;       // xsi:nil was set; writer: an array element was left out
    std::int16_t namespace_state; // writer: 0 before the first start tag of a message, 1 after it
    std::int16_t attributes_set;  // writer: attributes that wait in attribute_list
    std::int16_t peeked;          // a start tag is held and has not been consumed
    std::int16_t other_flag;      // the held element is for another actor
    std::int16_t root_flag;       // SOAP-ENC:root of the held element; -1 absent
    std::int16_t allocated;       // the last soap_object_register made the object
    std::int16_t wsu_id_flag;     // a wsu:Id attribute is waiting
    std::int16_t message_part;    // PART_...
    std::uint64_t chunk_size;     // input: bytes left in the chunk; output: total sent in chunks
    std::size_t chunk_buffer_length; // bytes of `buffer` that the chunk parser owns
    std::uint64_t body_received;     // input: raw bytes received since the head, or with none the start
    std::size_t raw_index;           // input: next raw byte in zlib_buffer while raw_aside is set
    bool raw_aside;            // input: raw bytes are in zlib_buffer, and `buffer` holds what is made of them
    bool content_length_given; // input: the head held a Content-Length; set by the head reader
    bool body_open;            // input: the head was read and its framing is in force
    bool body_ended;           // input: the last chunk and what follows it were read, or framing broke
    bool prepare_held;         // input: on_recv_prepare sees nothing yet, as the body has not been found
    bool framing_doubtful;     // input: framing was broken, or something followed the message
    std::uint64_t plain_received;    // input: bytes of the body, framing and compression undone
    std::uint64_t attached_received; // input: those of them that belong to attachments
    std::uint64_t bytes_copied;      // input: what references and QNames have added by copying
    std::int64_t memory_held;      // bytes taken since the received message began, less bytes freed; below 0
                                   // when blocks from before it are freed
    std::uint64_t plain_sent;      // output: bytes of the message that have left the buffer
    std::uint64_t xml_end_max;     // output: place in the message where its XML meets max_message; 0: none
    const char *exceeded;          // name of the limit that the message exceeded; null: none
    std::uint64_t exceeded_value;  // that limit, bytes
    char endpoint[SOAP_TEXT_SIZE]; // URL of the exchange; after a redirect its target
    char path[SOAP_TEXT_SIZE];     // of the endpoint, from its first slash on
    char host[SOAP_TEXT_SIZE];     // an IPv6 literal without its brackets
    const char *action;            // SOAPAction of the exchange; managed
    const char *xml_prolog;        // borrowed; overrides the XML declaration
    std::uint64_t peer_address;    // IPv4 address of an accepted client
    int port;                      // of the endpoint, or of an accepted client
    std::int16_t keep_alive;       // 0 no, 1 keep, negative: asked by the peer and not yet confirmed
    std::uint16_t tcp_keep_alive;  // not 0: set SO_KEEPALIVE
    // Seconds, seconds, probes; 0 leaves the system's value.
    unsigned tcp_keep_idle, tcp_keep_interval, tcp_keep_count;
    unsigned keep_alive_limit;      // kept and copied for host programs; the engine does not count requests
    const char *proxy_http_version; // borrowed; kept and copied
    const char *proxy_host;         // borrowed; HTTP proxy, null: direct
    int proxy_port;                 // of the HTTP proxy; 8080 by default
    const char *proxy_user, *proxy_password; // borrowed; credentials for the HTTP proxy
    const char *forwarded_for;               // received X-Forwarded-For; managed
    int status;                              // kind of head to write (STATUS_...), or received HTTP status
    int error;                               // SOAP_OK or the code of the last operation
    int error_mode;                          // 0 system error, 1 TCP start-up, 2 name resolution
    int errno_value;                         // saved system error
    soap_dime_state dime;                    // DIME state
    soap_mime_state mime;                    // MIME state
    soap_attachment_ref *mtom_list;          // references that wait for their attachment
    // Look-up aid for the former, managed; meaningless while mtom_list is null.
    soap_attachment_index *mtom_index;
    char *log_paths[SOAP_LOG_CHANNELS];                  // owned copies; null: no log
    std::FILE *log_streams[SOAP_LOG_CHANNELS];           // open files; null: not open
    soap_track_entry *track_table[SOAP_TRACK_HASH_SIZE]; // hash chains
    soap_track_entry **track_chains;                     // the table in use: track_table, or a larger one
    std::size_t track_chain_mask;                        // chains of the table in use, less one
    struct soap_memory_pools *pools; // tracking entries and instance records, taken from blocks
    // Borrowed; blank-separated prefixes declared on the root in canonical output.
    const char *canonical_include;
    const char *canonical_exclude; // borrowed; blank-separated prefixes never declared in canonical output
    unsigned ipv6_multicast_scope; // scope id of IPv6 multicast; 0 none
    const char *ipv4_multicast_interface; // borrowed; four bytes, an in_addr
    std::uint8_t ipv4_multicast_ttl;      // 0 leaves the system's value
    alignas(8) char peer[128];            // socket address of the last UDP or accepted peer
    std::size_t peer_length;              // bytes of `peer`
    bool peer_fixed;                      // UDP: datagrams from any other address than `peer` are dropped
    int (*tls_setup)(soap *ctx);          // builds tls_context; default tls_context_setup
    int (*tls_verify)(int result, x509_store_ctx_st *store); // OpenSSL's verify callback
    bio_st *tls_bio;                                         // under TLS on the socket
    ssl_st *tls_connection;                                  // kept for the next connection
    ssl_ctx_st *tls_context;     // one reference, the context's own; a copy gets another to the same
    ssl_session_st *tls_session; // of the last connection, to be resumed
    const char *tls_dh_file, *tls_random_file; // borrowed; see soap_ssl_server_context
    std::uint16_t tls_flags;                   // TLS_... of soap_tls.h
    // Borrowed; see soap_ssl_client_context.
    const char *tls_key_file, *tls_password, *tls_ca_file, *tls_ca_path, *tls_crl;
    ssl_ctx_st *session_rules;           // one reference to the TLS context that tls_session was made under
    char session_host[SOAP_TEXT_SIZE];   // host that tls_session was made with
    int session_port;                    // its port
    z_stream_s *zlib_stream;             // owned
    unsigned long zlib_crc;              // of the gzip stream in progress
    const char *zlib_dictionary;         // borrowed; preset dictionary
    unsigned zlib_dictionary_length;     // bytes
    std::int16_t zlib_state;             // 0 idle, 1 deflating, 2 inflating
    std::int16_t zlib_in, zlib_out;      // coding of input and of output: 0 none, 1 deflate, 2 gzip
    char *zlib_buffer;                   // owned; SOAP_BUFFER_SIZE bytes, allocated on first use
    std::size_t zlib_buffer_length;      // fill of zlib_buffer
    std::int16_t zlib_level;             // 1 to 9; 6 by default
    float zlib_ratio_in, zlib_ratio_out; // compressed by plain size of the last message
    const struct soap_upcalls *upcalls;  // what lower layers ask of the exchange of messages; private
    int (*attachment_stage)(soap *ctx); // input: where soap_recv_more gets bytes from while the message comes
                                        // in chunks of DIME records; null otherwise; private
    std::uint32_t bare_declarations;    // reader: declarations of the held element, the innermost ones in
                                        // scope, that have no attribute record yet; private
    // Most bytes of released objects, texts and blocks that are kept for messages to come, so that a steady
    // caller's call allocates nothing; 0 none. See soap_memory.h.
    std::uint64_t pool_limit;
    // Output: the bytes of a call's message as they are counted, to be sent without being written again;
    // private. The store is owned, of SOAP_STORE_SIZE bytes, made by the first call that can use it.
    char *store;
    char *store_end;               // where its next byte goes
    std::size_t store_space;       // bytes that it still takes; 0 unless a message is being stored
    std::int16_t mark_state;       // output: whether the message's objects were marked; private
    soap_head_memory *head_memory; // owned; the last request head, to be sent again; private
    soap_call_record *call_record; // owned; what happened in the last exchange (soap_report.h); private
    // 0: waits use select, so a descriptor of 1024 (FD_SETSIZE) and over is refused with SOAP_FD_EXCEEDED.
    // Otherwise they use poll, which takes any. Set before soap_cancel_arm and before the first call.
    int wait_with_poll;

    // --- construction ---

    // With both modes 0, one mode for both ways, or two; as soap_context_init_modes.
    //   mode         MODE_..., for both ways
    //   input_mode   MODE_...
    //   output_mode  MODE_...
    soap();
    explicit soap(std::uint32_t mode);
    soap(std::uint32_t input_mode, std::uint32_t output_mode);
    // As soap_context_copy, and never with a connection. A failure shows as state 0 or as an error.
    //   other  the context to copy
    soap(const soap &other);
    // Takes over all that `other` has but its connection, which is closed by the rules of
    // soap_socket_release: settings, managed memory, plug-ins, log channels, a listening socket. `other` is
    // left as `soap()` makes it. Addresses of the context that host programs keep elsewhere (data of a
    // plug-in, `soap` of a data object) still name `other`. Does nothing if `other` has ended: state is 0.
    //   other  the context to move
    soap(soap &&other) noexcept;
    // Contexts are not assigned; see soap_context_copy.
    soap &operator=(const soap &) = delete;
    // Discards all managed objects and ends the engine.
    virtual ~soap();
};

// --- life of a context ---

// Sets all fields to their defaults. The first context of a process also starts OpenSSL, which is not guarded
// against racing threads. Starting can't fail: without memory the trace is off, and compression ends with an
// error when it is asked for.
//   ctx  must hold nothing: a new record, or one that has ended
ZUV_API void soap_context_init(soap *ctx);

// As soap_context_init, then stores the modes; soap::mode takes the output mode.
//   ctx                      must hold nothing
//   input_mode, output_mode  MODE_...
ZUV_API void soap_context_init_modes(soap *ctx, std::uint32_t input_mode, std::uint32_t output_mode);

// A new context from plain memory, with both modes 0, one mode for both ways, or two.
//   mode                     MODE_..., for both ways
//   input_mode, output_mode  MODE_...
//   returns                  the context, which the caller ends by soap_context_free
//   null                     out of memory
ZUV_API soap *soap_context_create();
ZUV_API soap *soap_context_create(std::uint32_t mode);
ZUV_API soap *soap_context_create(std::uint32_t input_mode, std::uint32_t output_mode);

// Copies every field unchanged, scratch buffers included; owned pointers are then shared. Only a part of
// soap_context_copy, which corrects that; the virtual table of the target stays.
//   target  takes the fields; its own are overwritten, not released
//   source  nothing happens if it is the target
ZUV_API void soap_context_assign(soap *target, const soap *source);

// Makes `target` an independent copy of `source`, with state 2. All settings and callbacks are copied, and
// scratch texts unchanged. Everything that is freed with a call or a context starts anew: managed memory
// and the fields that point into it, received namespaces, attachments, trace files (on the same paths),
// compression. Shared: `user`, the streams, data of plug-ins without a copy hook, the listening socket, which
// only the source closes, and the TLS context, which lives as long as the last of them.
//
// A copy starts without a connection: `socket` -1, keep_alive 0, no MODE_TLS. The one exception serves a
// service with a thread for each client: a connection that the source has from soap_accept, before a TLS
// handshake on it, is the copy's, and the source sets its own `socket` to -1. Constructors make no exception.
//   target  a context, which is ended first, or memory of zeros only
//   source  nothing happens if it is the target
//   returns  target, also when both are the same
//   null    an argument is null or `source` has ended: target is untouched. Or a plug-in refused (the code of
//           its copy hook is in target->error) or memory ran out (SOAP_OUT_OF_MEMORY): what was built stays
//           in target until its end, without a connection
ZUV_API soap *soap_context_copy(soap *target, const soap *source);

// The same into a record from plain memory.
//   source   the context to copy
//   returns  the copy, which the caller ends by soap_context_free
//   null     as above; nothing remains
ZUV_API soap *soap_context_copy(const soap *source);

// Clears the per-message state before an exchange, the error and the fault included. Managed objects, the
// header, soap_version and a kept connection with its unread bytes stay. Called between exchanges.
ZUV_API void soap_reset_call(soap *ctx);

// Frees what a message left in the working tables: prefixes, attributes, block stacks, namespaces, pending
// references, pointer and id tables. Part of soap_reset_call and soap_discard_all. Does nothing on a context
// that has ended.
ZUV_API void soap_call_scratch_free(soap *ctx);

// Frees all managed blocks and the remaining instance records, releases the connection by the rules of
// soap_socket_release and closes the trace files; the context stays usable. Run soap_discard_objects first:
// instances that remain are forgotten without being destroyed. Does nothing on a context that has ended.
ZUV_API void soap_discard_all(soap *ctx);

// Ends the context: connection, plug-ins, TLS, compression, logs, tracking. To be called by the thread that
// used the context, whose OpenSSL error queue is emptied. Blocks still live, managed ones included, are
// reported on standard error as leaks: run soap_discard_objects and soap_discard_all first, as the destructor
// does. Callbacks return to their defaults, `state` becomes 0; a second call does nothing.
ZUV_API void soap_engine_done(soap *ctx);

// soap_engine_done, then frees the record.
//   ctx  from soap_context_create or soap_context_copy; null is allowed
ZUV_API void soap_context_free(soap *ctx);

// The program's own namespace table, which every new context starts from.
ZUV_API extern soap_namespace soap_program_namespaces[];

// Installs a namespace table, drops the working copy and makes a new one. Called between exchanges.
//   table  borrowed: it must outlive the context
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY
ZUV_API int soap_set_namespaces(soap *ctx, const soap_namespace *table);
