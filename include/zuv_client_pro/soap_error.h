// soap_error.h - error codes, their texts, and faults made from them.
//
// Elsewhere: the fault record itself (soap_envelope.h), socket texts (soap_tcp.h).
// Always: a code stays until the next call begins; a text is composed only when it is asked for. Composed texts
// are in soap::message_text and last until its next use.
#pragma once

#include <zuv_client_pro/soap.h>

// Every engine code: name, value, text. This list is the one source of the texts. soap_fault_text_fill puts
// an argument in the place of "%s" and after texts that end in a blank, and "Validation constraint violation"
// before those that say what an element violates. A code with an empty text is described by its number, or
// by another module.
#define SOAP_ERRORS(X)                                                                                       \
    X(SOAP_EOF, -1, "End of file or no input: ")                                                             \
    X(SOAP_OK, 0, "")                                                                                        \
    X(SOAP_CLIENT_FAULT, 1, "Client fault")                                                                  \
    X(SOAP_SERVER_FAULT, 2, "Server fault")                                                                  \
    X(SOAP_TAG_MISMATCH, 3, "tag name or namespace mismatch")                                                \
    X(SOAP_TYPE_MISMATCH, 4, "data type mismatch ")                                                          \
    X(SOAP_SYNTAX_ERROR, 5, "Well-formedness violation")                                                     \
    X(SOAP_NO_TAG, 6, "No XML root element")                                                                 \
    X(SOAP_ARRAY_INDEX, 7, "Array index out of bounds")                                                      \
    X(SOAP_MUST_UNDERSTAND, 8, "The data in element '%s' must be understood but cannot be handled")          \
    X(SOAP_NAMESPACE_ERROR, 9, "namespace error")                                                            \
    X(SOAP_USER_ERROR, 10, "User data error")                                                                \
    X(SOAP_FATAL_ERROR, 11, "Fatal error")                                                                   \
    X(SOAP_FAULT, 12, "")                                                                                    \
    X(SOAP_NO_METHOD, 13, "Method '%s' not implemented: method name or namespace not recognized")            \
    X(SOAP_NO_DATA, 14, "Data required for operation")                                                       \
    X(SOAP_GET_METHOD, 15, "HTTP GET method not implemented")                                                \
    X(SOAP_PUT_METHOD, 16, "HTTP PUT method not implemented")                                                \
    X(SOAP_HTTP_METHOD, 19, "HTTP method not implemented")                                                   \
    X(SOAP_OUT_OF_MEMORY, 20, "Out of memory")                                                               \
    X(SOAP_CORRUPTION, 21, "Memory overflow or memory corruption error")                                     \
    X(SOAP_HEADER_LINE, 22, "Header line too long")                                                          \
    X(SOAP_NIL, 23, "nil not allowed")                                                                       \
    X(SOAP_DUPLICATE_ID, 24, "multiple definitions (use the SOAP_XML_TREE flag) of the same id ")            \
    X(SOAP_MISSING_ID, 25, "missing id for ref ")                                                            \
    X(SOAP_ID_CONFLICT, 26, "incompatible object type ref/id pair ")                                         \
    X(SOAP_UDP_ERROR, 27, "Message too large for UDP packet")                                                \
    X(SOAP_TCP_ERROR, 28, "")                                                                                \
    X(SOAP_HTTP_ERROR, 29, "An HTTP processing error occurred")                                              \
    X(SOAP_TLS_ERROR, 30, "SSL/TLS error")                                                                   \
    X(SOAP_ZLIB_ERROR, 31, "Zlib/gzip error: '%s'")                                                          \
    X(SOAP_DIME_ERROR, 32, "DIME format error")                                                              \
    X(SOAP_DIME_HREF, 33, "DIME href to missing attachment")                                                 \
    X(SOAP_DIME_VERSION, 34, "DIME version/transmission error")                                              \
    X(SOAP_DIME_END, 35, "End of DIME error")                                                                \
    X(SOAP_MIME_ERROR, 36, "MIME format error")                                                              \
    X(SOAP_MIME_HREF, 37, "MIME href to missing attachment")                                                 \
    X(SOAP_MIME_END, 38, "End of MIME error")                                                                \
    X(SOAP_VERSION_MISMATCH, 39, "Invalid SOAP message or SOAP version mismatch")                            \
    X(SOAP_PLUGIN_ERROR, 40, "Plugin registry error")                                                        \
    X(SOAP_DATA_ENCODING, 41, "Unsupported SOAP data encoding")                                              \
    X(SOAP_REQUIRED, 42, "missing required attribute")                                                       \
    X(SOAP_PROHIBITED, 43, "prohibited attribute present")                                                   \
    X(SOAP_OCCURS, 44, "occurrence violation")                                                               \
    X(SOAP_LENGTH, 45, "content range or length violation")                                                  \
    X(SOAP_FD_EXCEEDED, 46,                                                                                  \
      "Maximum number of open connections was reached (no define HAVE_POLL): increase FD_SETSIZE")           \
    X(SOAP_UTF_ERROR, 47, "UTF content encoding error")                                                      \
    X(SOAP_NTLM_ERROR, 48, "An HTTP NTLM authentication error occurred")                                     \
    X(SOAP_STOP, 1000, "Stopped: no response to be sent or received (informative)")                          \
    X(SOAP_FORM, 1001, "")

// The engine's codes. Besides these, an operation can return an HTTP status or the code of a callback.
enum soap_error_code : int {
#define SOAP_ERROR_ENUMERATOR(name, value, text) name = value,
    SOAP_ERRORS(SOAP_ERROR_ENUMERATOR)
#undef SOAP_ERROR_ENUMERATOR
};

// Fills the fault record's code and text from ctx->error. The host program's on_error_text is asked first.
// What is set stays; a missing code becomes that of the sender, and a missing text that of the error, with
// the code and, in SOAP 1.2, the subcode that the error calls for. SOAP_LENGTH from a limit on bytes gives
// the limit's name and value, such as "max_memory: more than 536870912 bytes". SOAP_FAULT (a fault that was
// received or set) gets no text.
ZUV_API void soap_fault_text_fill(soap *ctx);

// Store a fault in the context's record and its error in ctx->error, replacing what was there. The forms
// without a code take that of the sender (client) or the receiver (server) in the current SOAP version. If
// memory runs out for the record, only the error is stored.
//   code     a QName with a prefix of the namespace table, such as "SOAP-ENV:Client"; borrowed while the
//            fault record is used
//   subcode  null: none; ignored unless the version is 1.2; borrowed likewise
//   text     the fault's reason; borrowed likewise
//   detail   raw XML, borrowed likewise; null or empty: the detail stays as it is
//   error    the error to store
//   returns  `error`, always
ZUV_API int soap_fault_set(soap *ctx, const char *code, const char *subcode, const char *text,
                           const char *detail, int error);
ZUV_API int soap_fault_sender(soap *ctx, const char *text, const char *detail, int error);
ZUV_API int soap_fault_receiver(soap *ctx, const char *text, const char *detail, int error);

// The same with managed copies of the texts.
//   code     as above
//   subcode  as above
//   text     the fault's reason
//   detail   as above
//   SOAP_FAULT          the fault is stored
//   SOAP_OUT_OF_MEMORY  the fault is as it was
ZUV_API int soap_fault_set_copied(soap *ctx, const char *code, const char *subcode, const char *text,
                                  const char *detail);
ZUV_API int soap_fault_sender_copied(soap *ctx, const char *subcode, const char *text, const char *detail);
ZUV_API int soap_fault_receiver_copied(soap *ctx, const char *subcode, const char *text, const char *detail);

// Print the context's error as
//     SOAP 1.1 fault: SOAP-ENV:Client [no subcode]
//     "text"
//     Detail: [no detail]
// filling the fault record first if it has no code. Without a SOAP version the line begins "Error " and the
// number. Nothing is printed for SOAP_OK.
//   ctx      null or ended: the output says that it is not initialised
//   buffer   takes the text, cut to its size and terminated; untouched for SOAP_OK, unless `length` is 1
//   length   bytes in `buffer`, terminator included
//   stream   takes the text
//   file     takes the text
//   returns  `buffer`, `stream`
ZUV_API char *soap_fault_print_text(soap *ctx, char *buffer, std::size_t length);
ZUV_API std::ostream &soap_fault_print_stream(soap *ctx, std::ostream &stream);
ZUV_API void soap_fault_print_file(soap *ctx, std::FILE *file);

// Prints the input in ctx->buffer up to the place where reading stopped, a mark, and at most 1022 bytes from
// there on. Nothing for SOAP_OK or SOAP_STOP, or when the buffer holds no input.
//   file  takes the text
ZUV_API void soap_fault_location_print(soap *ctx, std::FILE *file);

// Composes "Validation constraint violation: ", the text, the argument and the element in ctx->tag, if there
// is one.
//   text      must not be in message_text
//   argument  likewise; null: none
//   returns   the text, cut to SOAP_TEXT_SIZE - 1 bytes
ZUV_API const char *soap_constraint_text(soap *ctx, const char *text, const char *argument);

// Text for an end of input: that of ctx->errno_value; or that soap_cancel ended the call or the peer closed
// the connection, where that is known (soap_report.h); or of a timeout with the time limits that are set, with
// call_timeout alone if that has passed.
//   returns  the text
ZUV_API const char *soap_eof_text(soap *ctx);

// Reads a fault from a response that did not read as expected, ends the message and releases the connection;
// see soap_envelope.h for the record. Called during receiving, with the error of the response in ctx->error.
//   check  0: only if the error may stem from a fault in the place of the response; otherwise a fault is
//          looked for whatever the error, and its absence is no error
//   SOAP_OK                with `check`: there is no fault, and the message is still to be read
//   SOAP_CLIENT_FAULT      a fault with the code Client or Sender, alone or with detail after a dot
//   SOAP_SERVER_FAULT      Server or Receiver
//   SOAP_MUST_UNDERSTAND   MustUnderstand
//   SOAP_VERSION_MISMATCH  VersionMismatch
//   SOAP_FAULT             any other code
//   SOAP_OUT_OF_MEMORY     the fault could not be stored
//   SOAP_LENGTH            a limit of the context was exceeded
//   returns                otherwise the error of the response, or of soap_socket_release
ZUV_API int soap_fault_receive(soap *ctx, int check);
