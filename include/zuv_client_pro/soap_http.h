// soap_http.h - HTTP: connecting to an endpoint, request and response heads written and read.
//
// Elsewhere: framing of bodies (soap_io.h), sockets (soap_tcp.h). Always: redirects are not followed: a
// status of the 300s is an error with that value, and soap::endpoint holds the target. "Errors of sending"
// are those of soap_send_bytes (soap_io.h).
#pragma once

#include <zuv_client_pro/soap.h>

// --- values of soap::status on the sending side: the kind of head to write ---

constexpr int STATUS_POST = 2000;      // POST with a SOAP message
constexpr int STATUS_POST_FILE = 2001; // POST with http_content as the Content-Type
constexpr int STATUS_GET = 2002;       // GET
constexpr int STATUS_CONNECT = 2003;   // CONNECT
constexpr int STATUS_HTML = 1002;      // response body is HTML
constexpr int STATUS_FILE = 1003;      // response body has the type in http_content
constexpr int STATUS_STOP = 1000;      // no head to write, end of this exchange

// --- connecting ---

// Whether a call may be sent to an endpoint. An endpoint has no scheme, or one of http, https (in any case),
// httpg and soap.udp followed by "://"; a host, which an IPv6 address is in brackets; a port from 1 to 65535
// or none; no user and no character below 33. Calls of proxy objects ask this first, unless
// LEGACY_ANY_ENDPOINT is set.
//   endpoints           one URL, or several with blanks between them
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY
//   SOAP_TCP_ERROR      refused; the fault's text quotes what is refused, without a user's part
ZUV_API int soap_endpoint_check(soap *ctx, const char *endpoints);

// Connects and writes the head of a POST. Called between exchanges or after soap_count_end. The time of
// call_timeout begins here, once for all endpoints.
//   endpoints  one URL, or several with blanks between them: the next is tried when a connection fails with
//              SOAP_TCP_ERROR
//   action     SOAPAction, copied; null for none
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY
//   SOAP_TCP_ERROR      no connection; with a fault record
//   SOAP_TLS_ERROR      with a fault record
//   SOAP_FD_EXCEEDED    the descriptor is 1024 or over
//   returns             otherwise a failure of an HTTP proxy (tcp_connect), an error of sending, or of a
//                       callback
ZUV_API int soap_server_connect(soap *ctx, const char *endpoints, const char *action);

// The same for one endpoint and a kind of request. A kept connection is used again if it leads to the same
// host and port with the same security, through the same HTTP proxy and under the same TLS rules (the last
// two don't count with LEGACY_ANY_ROUTE), is still alive, and its last response was read to the end.
// STATUS_GET ends the request.
//   status    STATUS_...
//   endpoint  null or empty: connects to nothing; what is sent takes the way of tcp_send without a socket
//   action    as above
//   SOAP_OK
//   returns   otherwise as above
ZUV_API int soap_connect_one(soap *ctx, int status, const char *endpoint, const char *action);

// Splits a URL into endpoint, host, port (80, or 443 for https) and path of the context. Parts over 1023
// bytes are cut.
//   url  may be soap::endpoint itself; null or empty: all are empty, path is "/"
ZUV_API void soap_parse_endpoint(soap *ctx, const char *url);

// --- heads out ---
//
// Used after soap_send_begin, before the body.

// Default of on_post. Nothing is written for a null endpoint or a scheme other than http, https and httpg.
// Authorization is for the service and not in a CONNECT (LEGACY_TUNNEL_CREDENTIALS: there too), and
// Proxy-Authorization for the HTTP proxy alone: in a CONNECT, and in what it forwards by plain HTTP.
//   endpoint  URL
//   host      of the URL
//   port      of the URL
//   path      one slash at its start is dropped, as the request line has its own; null is empty
//   action    SOAPAction; null for none; over 1020 bytes it is sent empty
//   count     Content-Length, bytes
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY  endpoint and version have more than 944 bytes together, or the request line is too
//                       long
//   returns             otherwise an error of sending
ZUV_API int http_write_request(soap *ctx, const char *endpoint, const char *host, int port, const char *path,
                               const char *action, std::uint64_t count);

// The headers that a request and a response share: type, encoding and framing of the body, Connection.
//   status  0 for a request; otherwise as for http_write_response
//   count   Content-Length, bytes
//   SOAP_OK
//   returns  otherwise an error of sending
ZUV_API int http_write_entity_headers(soap *ctx, int status, std::uint64_t count);

// Default of on_header_line: "key: value" and a line end. Line breaks within either are left out.
//   key    null: an empty line
//   value  null: the key alone
//   SOAP_OK
//   returns  otherwise an error of sending
ZUV_API int http_write_line(soap *ctx, const char *key, const char *value);

// Default of on_response.
//   status  an HTTP status; SOAP_OK, STATUS_HTML or STATUS_FILE for success; or an engine error
//   count   Content-Length, bytes
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY  http_version has 5 bytes or more
//   returns             otherwise an error of sending
ZUV_API int http_write_response(soap *ctx, int status, std::uint64_t count);

// Reason phrase of a status.
//   status   an HTTP status
//   returns  a constant text, empty if it has none
ZUV_API const char *http_reason(int status);

// --- heads in ---
//
// Used by soap_receive_begin.

// Default of on_read_head. Sets the context's fields as the head says, and puts the start line in
// message_text.
//   SOAP_OK             a body follows that is to be parsed: 200, another 2xx, 400, 500 with a body, or a
//                       request
//   SOAP_STOP           the request was served by a callback
//   SOAP_FORM           a callback of on_parse_header gave this
//   SOAP_EOF            end of input
//   SOAP_HEADER_LINE    a line over 8191 bytes, more than 1024 lines or 1 MB, or more than 100 interim heads
//                       (1xx but 101, whose headers are ignored)
//   SOAP_OUT_OF_MEMORY
//   SOAP_GET_METHOD     a GET without a handler
//   SOAP_PUT_METHOD     a PUT without a handler
//   SOAP_HTTP_ERROR     a status below 100 or above 999; with a fault
//   405                 a request with a method without a handler
//   414                 start line over 1023 bytes
//   returns             otherwise the HTTP status, with a fault: text "HTTP Error" and the start line as
//                       detail, or the start line and the error body; or the error of a callback
ZUV_API int http_read_head(soap *ctx);

// Default of on_parse_header: stores what one header says in the context. Unknown ones are ignored, and so is
// Authorization in a response, unless LEGACY_ANSWER_CREDENTIALS is set.
//   key    name, in any case
//   value  without blanks around it
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY
//   returns             otherwise an error of sending the answer to "Expect"
ZUV_API int http_parse_header(soap *ctx, const char *key, const char *value);

// Default of on_get.
//   SOAP_GET_METHOD  always
ZUV_API int http_get_default(soap *ctx);
// Default of on_put: reads one more head.
//   SOAP_PUT_METHOD  the second head is a PUT again
//   returns          otherwise as http_read_head
ZUV_API int http_put_default(soap *ctx);
// Default of on_delete.
//   405  always
ZUV_API int http_delete_default(soap *ctx);
// Default of on_options and on_head: answers with status 200 and no body.
//   SOAP_STOP  the answer was sent
//   returns    otherwise an error of sending
ZUV_API int http_method_default(soap *ctx);

// Reads an error body, decompressed, at most 1 MB of it. Called after the head was read.
//   returns  managed text
//   null     there is no body, or memory ran out
ZUV_API char *http_drain_body(soap *ctx);

// Value of an item in a list such as `a/b; boundary="x"`.
//   text     the list
//   key      the item's name, a pattern of soap_tag_match
//   returns  its value, empty for an item without one; in scratch_text (cut at 1023 bytes) until its next use
//   null     there is no such item
ZUV_API const char *soap_attr_value(soap *ctx, const char *text, const char *key);
