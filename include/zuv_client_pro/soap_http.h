// soap_http.h - HTTP: connecting to an endpoint, request and response heads written and read.
//
// Elsewhere: framing of bodies (soap_io.h), sockets (soap_tcp.h).
// Always: results are 0 or the code that also stands in ctx->error. Redirects are not followed: a status of
// the 300s is an error with that value, and ctx->endpoint holds the target.
#pragma once

#include <zuv_client_pro/soap.h>

// Values of ctx->status on the sending side: the kind of head to write.
constexpr int STATUS_POST = 2000;
constexpr int STATUS_POST_FILE = 2001; // POST with http_content as the Content-Type
constexpr int STATUS_GET = 2002;
constexpr int STATUS_CONNECT = 2003;
constexpr int STATUS_HTML = 1002; // response body is HTML
constexpr int STATUS_FILE = 1003; // response body has the type in http_content
constexpr int STATUS_STOP = 1000; // no head to write, end of this exchange

// --- connecting ---

// Looks whether a call may go to an endpoint: one URL, or several with blanks between. Each has no scheme, or
// one of http, https (in any case), httpg and soap.udp followed by "://"; a host, which an IPv6 address is in
// brackets; a port from 1 to 65535 or none; no user and no character below 33. Calls of proxies ask this
// first, unless LEGACY_ANY_ENDPOINT is set. 0, 20, or 28 with a fault whose text quotes what is refused,
// without a user's part.
ZUV_API int soap_endpoint_check(soap *ctx, const char *endpoints);

// Connects and writes the head of a POST. The time of call_timeout begins here, once for all endpoints.
//   endpoints  one URL, or several with blanks between them: the next is tried when a connection fails with
//   error 28 action     SOAPAction, copied; null for none
// Returns ctx->error: 0, 20, 28 or 30 with a fault, an HTTP status from a proxy, or an error of sending.
ZUV_API int soap_server_connect(soap *ctx, const char *endpoints, const char *action);

// The same for one endpoint and the kind of request in `status` (STATUS_...). A kept connection is used again
// if it goes to the same host and port with the same security, through the same HTTP proxy and under the same
// TLS rules (the last two don't count with LEGACY_ANY_ROUTE), still lives, and its last response was read to
// the end. A null or empty endpoint connects to nothing: what is sent goes where tcp_send sends it without a
// socket. STATUS_GET ends the request.
ZUV_API int soap_connect_one(soap *ctx, int status, const char *endpoint, const char *action);

// Splits a URL into endpoint, host, port (80, or 443 for https) and path of the context. Parts over 1023
// bytes are cut. `url` may be ctx->endpoint itself; null or empty: all are empty, path is "/".
ZUV_API void soap_parse_endpoint(soap *ctx, const char *url);

// --- heads out ---

// Default of on_post. Nothing is written for a null endpoint or a scheme other than http, https and httpg.
//   path    one slash at its head is dropped, as the request line has its own; null is empty
//   action  SOAPAction; null for none; over 1020 bytes it goes out empty
//   count   Content-Length, bytes
// Authorization is for the service and not in a CONNECT (LEGACY_TUNNEL_CREDENTIALS: there too), and
// Proxy-Authorization for the HTTP proxy alone: in a CONNECT, and in what it passes on by plain HTTP.
// 0, 20 for an endpoint and version of more than 944 bytes, or an error of sending.
ZUV_API int http_write_request(soap *ctx, const char *endpoint, const char *host, int port, const char *path,
                               const char *action, std::uint64_t count);

// The headers that a request (status 0) and a response share: type, encoding and framing of the body,
// Connection.
ZUV_API int http_write_entity_headers(soap *ctx, int status, std::uint64_t count);

// Default of on_header_line: "key: value" and a line end; key alone for a null value; an empty line for a
// null key. Line breaks within either are left out.
ZUV_API int http_write_line(soap *ctx, const char *key, const char *value);

// Default of on_response. `status`: an HTTP status; 0, STATUS_HTML or STATUS_FILE for success; or an engine
// error. 0, 20 for an http_version of 5 bytes or more, or an error of sending.
ZUV_API int http_write_response(soap *ctx, int status, std::uint64_t count);

// Reason phrase of a status; the empty text if it has none. Constant.
ZUV_API const char *http_reason(int status);

// --- heads in ---

// Default of on_read_head. Leaves the context's fields as the head says, and the start line in message_text.
// 0: a body follows that is to be parsed (200, other 2xx, 400, 500 with a body, or a request). 1000: the
// request was dealt with. -1: end of input. 414: start line over 1023 bytes. 22: a line over 8191 bytes, more
// than 1024 lines, 1 MB, or 100 interim heads (1xx but 101, whose headers are not looked at). 15, 16, 405: a
// request that nobody serves. Any other status, with a fault: text "HTTP Error" and the start line as detail,
// or the start line and the error body.
ZUV_API int http_read_head(soap *ctx);

// Default of on_parse_header: takes one header over into the context. Unknown ones are dropped, and so is
// Authorization in a response, unless LEGACY_ANSWER_CREDENTIALS is set. 0, 20, or an error of sending the
// answer to "Expect".
ZUV_API int http_parse_header(soap *ctx, const char *key, const char *value);

ZUV_API int http_get_default(soap *ctx); // default of on_get: error 15
ZUV_API int http_put_default(soap *ctx); // default of on_put: reads one more head; 16 if that is a PUT again
ZUV_API int http_delete_default(soap *ctx); // default of on_delete: 405
ZUV_API int
http_method_default(soap *ctx); // default of on_options, on_head: answers 200 with no body, then 1000

// Reads an error body, decompressed, at most 1 MB of it, as managed text. Null if there is none or memory
// runs out.
ZUV_API char *http_drain_body(soap *ctx);

// Value of the item `key` (a pattern of soap_tag_match) in a list such as `a/b; boundary="x"`; empty for an
// item without a value, null if there is no such item. It lies in scratch_text (cut at 1023 bytes) until that
// is used again.
ZUV_API const char *soap_attr_value(soap *ctx, const char *text, const char *key);
