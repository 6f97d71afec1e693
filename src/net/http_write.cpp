// http_write.cpp - heads of requests and responses, line by line through on_header_line.
//
// Elsewhere: when a head is due (endpoint.cpp, soap_io.h), reading heads (http_read.cpp, http_headers.cpp).
// Always: values are composed in ctx->scratch_text or on the stack, so a value given to on_header_line is
// good only during that call; no line feed or carriage return of a value reaches the wire.
#include <charconv>
#include <cstdio>
#include <cstring>
#include <iterator>

#include <openssl/crypto.h>
#include <openssl/evp.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/failure.h"
#include "core/tracking.h"
#include "net/head_memory.h"
#include "net/tcp_socket.h"
#include "net/tls_connection.h"

namespace {

constexpr const char *PRODUCT = "zuv_client_pro/1.5.1";
constexpr const char *DEFAULT_REALM = "zuv Web Service";
constexpr std::size_t HEAD_TEXT_LIMIT = 944; // characters; longer parts of a head are refused or left out
constexpr std::size_t CREDENTIALS_LIMIT =
    761; // user and password together; what base64 can carry in one scratch text
constexpr std::size_t ACTION_LIMIT = 1021; // characters; more don't fit between the two quotes
constexpr std::size_t REALM_LIMIT = 1010;  // characters
constexpr std::size_t VERSION_LIMIT = 5;   // characters of http_version

std::size_t length_of(const char *text)
{
    return text == nullptr ? 0 : std::strlen(text);
}

// A text composed in a buffer of fixed size; once something didn't fit, it stays marked as not fitting.
struct bounded_text {
    char text[2 * SOAP_TEXT_SIZE];
    std::size_t length = 0;
    bool fits = true;

    void put(const char *part) { put(part, std::strlen(part)); }
    [[gnu::noinline]] void put(const char *part,
                               std::size_t part_length) // inlined it would be most of this file
    {
        fits = fits && part_length < sizeof text - length;
        if (!fits)
            return;
        std::memcpy(text + length, part, part_length);
        length += part_length;
        text[length] = '\0';
    }
    void put_number(int number)
    {
        char digits[16] = {};
        put(digits, static_cast<std::size_t>(std::to_chars(std::begin(digits), std::end(digits), number).ptr -
                                             digits));
    }
    // For a place between double quotes.
    void put_quoted(const char *part)
    {
        for (; *part != '\0'; ++part) {
            if (*part == '"' || *part == '\\')
                put("\\", 1);
            put(part, 1);
        }
    }
};

int line(soap *ctx, const char *key, const char *value)
{
    if (ctx->on_header_line == nullptr)
        return SOAP_OK;
    ctx->error = ctx->on_header_line(ctx, key, value);
    return ctx->error;
}

// Sends a text without the line breaks in it: what follows one must not become a header of its own.
int send_without_breaks(soap *ctx, const char *text)
{
    for (;;) {
        const std::size_t length = std::strcspn(text, "\r\n");
        if (soap_send_bytes(ctx, text, length) != SOAP_OK)
            return ctx->error;
        text += length;
        if (*text == '\0')
            return SOAP_OK;
        text += std::strspn(text, "\r\n");
    }
}

bool output_is_chunked(const soap *ctx)
{
    return (ctx->output_mode & MODE_IO_MASK) == MODE_CHUNKED;
}

// --- the entity's headers, common to requests and responses ---

bool uses_file_type(const soap *ctx, int status)
{
    return (status == STATUS_FILE || ctx->status == STATUS_POST_FILE) && ctx->http_content != nullptr;
}

const char *plain_type(const soap *ctx, int status, std::uint64_t count)
{
    if (uses_file_type(ctx, status))
        return ctx->http_content;
    if (status == STATUS_HTML)
        return "text/html; charset=utf-8";
    if (ctx->soap_version == 2 && (count != 0 || output_is_chunked(ctx)))
        return "application/soap+xml; charset=utf-8";
    return "text/xml; charset=utf-8";
}

// The type around a MIME message: multipart/related with the type of its first part.
void put_multipart_type(const soap *ctx, const char *type, const char *start_info, bounded_text &out)
{
    out.put("multipart/related; charset=utf-8; boundary=\"");
    out.put_quoted(ctx->mime.boundary);
    out.put("\"; type=\"");
    out.put(type, std::strcspn(type, ";"));
    if (ctx->mime.start != nullptr) {
        out.put("\"; start=\"");
        out.put_quoted(ctx->mime.start);
    }
    out.put("\"");
    if (start_info != nullptr) {
        out.put("; start-info=\"");
        out.put(start_info);
        out.put("\"");
    }
}

// SOAP 1.2 names its action in the request's Content-Type.
void put_action(const soap *ctx, int status, bounded_text &out)
{
    if (status != 0 || ctx->soap_version != 2 || ctx->action == nullptr)
        return;
    if (out.length + std::strlen(ctx->action) + std::strlen("; action=\"\"") >= HEAD_TEXT_LIMIT)
        return;
    out.put("; action=\"");
    out.put(ctx->action);
    out.put("\"");
}

int write_content_type(soap *ctx, int status, std::uint64_t count)
{
    const char *type = plain_type(ctx, status, count);
    const char *start_info = nullptr;
    bounded_text value;
    if ((ctx->mode & MODE_MTOM) != 0) {
        type = "application/xop+xml";
        start_info = ctx->soap_version == 2 ? "application/soap+xml" : "text/xml";
    } else if ((ctx->mode & MODE_DIME) != 0) {
        type = "application/dime";
    }
    if ((ctx->mode & MODE_MIME) != 0 && ctx->mime.boundary != nullptr &&
        length_of(ctx->mime.boundary) + length_of(ctx->mime.start) < HEAD_TEXT_LIMIT)
        put_multipart_type(ctx, type, start_info, value);
    else
        value.put(type);
    put_action(ctx, status, value);
    return line(ctx, "Content-Type", value.fits ? value.text : type);
}

int write_framing(soap *ctx, std::uint64_t count)
{
    if (output_is_chunked(ctx))
        return line(ctx, "Transfer-Encoding", "chunked");
    *std::to_chars(ctx->scratch_text, ctx->scratch_text + SOAP_TEXT_SIZE - 1, count).ptr = '\0';
    return line(ctx, "Content-Length", ctx->scratch_text);
}

int write_encoding(soap *ctx)
{
    if ((ctx->output_mode & MODE_DEFLATE) == 0)
        return SOAP_OK;
    return line(ctx, "Content-Encoding", ctx->zlib_out == 1 ? "deflate" : "gzip");
}

// --- the request's own lines ---

const char *method_text(int status)
{
    if (status == STATUS_GET)
        return "GET";
    return status == STATUS_CONNECT ? "CONNECT" : "POST";
}

bool is_http_scheme(const char *endpoint)
{
    return soap_tag_match(endpoint, "http:*") == 0 || soap_tag_match(endpoint, "https:*") == 0 ||
           std::strncmp(endpoint, "httpg:", 6) == 0;
}

// A host as URLs have it: an IPv6 address in brackets.
void put_host(bounded_text &out, const char *host)
{
    const bool needs_brackets = *host != '[' && std::strchr(host, ':') != nullptr;
    out.put(needs_brackets ? "[" : "");
    out.put(host);
    out.put(needs_brackets ? "]" : "");
}

int write_request_line(soap *ctx, const char *endpoint, const char *host, int port, const char *path)
{
    bounded_text text;
    text.put(method_text(ctx->status));
    text.put(" ");
    if (ctx->status == STATUS_CONNECT) {
        put_host(text, host);
        text.put(":");
        text.put_number(port);
    } else if (ctx->proxy_host != nullptr) {
        text.put(endpoint);
    } else {
        text.put("/");
        text.put(path == nullptr ? "" : path + static_cast<int>(*path == '/'));
    }
    text.put(" HTTP/");
    text.put(ctx->http_version);
    return text.fits ? line(ctx, text.text, nullptr) : fail(ctx, SOAP_OUT_OF_MEMORY);
}

int write_host(soap *ctx, const char *host, int port)
{
    const int default_port = tls_active(ctx) ? 443 : 80;
    bounded_text value;
    put_host(value, host);
    if (port != default_port) {
        value.put(":");
        value.put_number(port);
    }
    return line(ctx, "Host", value.text);
}

// Credentials that don't fit are left out; the only copy of them that remains is in the buffer, about to be sent.
int write_credentials(soap *ctx, const char *key, const char *user, const char *password)
{
    track_secret(ctx, user);
    track_secret(ctx, password);
    if (user == nullptr || password == nullptr ||
        std::strlen(user) + std::strlen(password) >= CREDENTIALS_LIMIT)
        return SOAP_OK;
    char pair[CREDENTIALS_LIMIT + 1];
    char value[SOAP_TEXT_SIZE] = "Basic ";
    const int length = std::snprintf(pair, sizeof pair, "%s:%s", user, password);
    EVP_EncodeBlock(reinterpret_cast<unsigned char *>(value + std::strlen(value)),
                    reinterpret_cast<const unsigned char *>(pair), length);
    const int result = line(ctx, key, value);
    OPENSSL_cleanse(pair, sizeof pair);
    OPENSSL_cleanse(value, sizeof value);
    ctx->credentials_passed = true;
    return result;
}

// They are for the service alone: the head of a CONNECT is read by the HTTP proxy.
int write_service_credentials(soap *ctx)
{
    if (ctx->status == STATUS_CONNECT && (ctx->legacy & LEGACY_TUNNEL_CREDENTIALS) == 0)
        return SOAP_OK;
    return write_credentials(ctx, "Authorization", ctx->auth_user, ctx->auth_password);
}

// True if an HTTP proxy reads the head: not if the connection goes past it, or through it to an https
// endpoint.
bool is_read_by_proxy(const soap *ctx, const char *endpoint)
{
    if (ctx->proxy_host == nullptr || ctx->status == STATUS_CONNECT)
        return ctx->proxy_host != nullptr;
    return soap_tag_match(endpoint, "https:*") != 0 &&
           (!ctx->route.known || ctx->route.proxy_host[0] != '\0');
}

int write_proxy_credentials(soap *ctx, const char *endpoint)
{
    if (!is_read_by_proxy(ctx, endpoint))
        return SOAP_OK;
    return write_credentials(ctx, "Proxy-Authorization", ctx->proxy_user, ctx->proxy_password);
}

int write_action(soap *ctx, const char *action)
{
    if (action == nullptr || ctx->status == STATUS_GET)
        return SOAP_OK;
    bounded_text value;
    value.put("\"");
    if (std::strlen(action) < ACTION_LIMIT)
        value.put(action);
    value.put("\"");
    return line(ctx, "SOAPAction", value.text);
}

int write_request_head(soap *ctx, const char *endpoint, const char *host, int port, const char *path,
                       const char *action, std::uint64_t count)
{
    if (write_request_line(ctx, endpoint, host, port, path) != SOAP_OK ||
        write_host(ctx, host, port) != SOAP_OK || line(ctx, "User-Agent", PRODUCT) != SOAP_OK ||
        http_write_entity_headers(ctx, 0, count) != SOAP_OK ||
        line(ctx, "Accept-Encoding", "deflate") != SOAP_OK || write_service_credentials(ctx) != SOAP_OK ||
        write_proxy_credentials(ctx, endpoint) != SOAP_OK || write_action(ctx, action) != SOAP_OK)
        return ctx->error;
    return line(ctx, nullptr, nullptr);
}

// --- the last request's head again ---

// True if the head may be remembered, and sent again: it is a plain POST's, written by this file alone into the
// buffer, and holds no credentials.
bool is_memorable(const soap *ctx)
{
    constexpr std::uint32_t OTHER_TYPES = MODE_DIME | MODE_MIME | MODE_MTOM;
    const bool proxied = ctx->proxy_host != nullptr;
    return ctx->status == STATUS_POST && (ctx->mode & (OTHER_TYPES | MODE_COUNTING)) == 0 &&
           (ctx->mode & MODE_IO_MASK) == MODE_BUFFERED && ctx->on_send_filter == nullptr &&
           ctx->on_header_line == http_write_line && ctx->auth_user == nullptr &&
           ctx->auth_password == nullptr &&
           (!proxied || (ctx->proxy_user == nullptr && ctx->proxy_password == nullptr));
}

// All that the lines above look at in such a head.
head_source source_of_head(const soap *ctx, const char *endpoint, const char *host, int port,
                           const char *path, const char *action, std::uint64_t count)
{
    const bool chunked = output_is_chunked(ctx);
    const std::uint32_t deflate = (ctx->output_mode & MODE_DEFLATE) == 0 ? 0U : ctx->zlib_out == 1 ? 1U : 2U;
    const bool soap12 = ctx->soap_version == 2;
    const std::uint32_t flags = deflate | (chunked ? 4U : 0U) | (soap12 ? 8U : 0U) |
                                (soap12 && count != 0 ? 16U : 0U) | (ctx->keep_alive != 0 ? 32U : 0U) |
                                (tls_active(ctx) ? 64U : 0U) | (ctx->proxy_host != nullptr ? 128U : 0U);
    return {{endpoint, host, path, action, soap12 ? ctx->action : nullptr, ctx->http_version}, port, flags};
}

// --- the response's own lines ---

const char *engine_error_status(soap *ctx, int status)
{
    if (status >= SOAP_GET_METHOD && status <= SOAP_HTTP_METHOD)
        return "405 Method Not Allowed";
    if (ctx->soap_version == 2) {
        const char *const code = ctx->upcalls->read_fault(ctx).code;
        if (code == nullptr || std::strcmp(code, "SOAP-ENV:Sender") == 0)
            return "400 Bad Request";
    }
    return "500 Internal Server Error";
}

// With no socket at all the process is run by a web server, which wants the status as a header.
int write_own_status(soap *ctx, const char *status)
{
    if (ctx->master_socket == -1 && !soap_socket_open(ctx))
        return line(ctx, "Status", status);
    std::snprintf(ctx->scratch_text, SOAP_TEXT_SIZE, "HTTP/%s %s", ctx->http_version, status);
    return line(ctx, ctx->scratch_text, nullptr);
}

int write_challenge(soap *ctx)
{
    const bool own_realm = ctx->auth_realm != nullptr && std::strlen(ctx->auth_realm) < REALM_LIMIT;
    std::snprintf(ctx->scratch_text, SOAP_TEXT_SIZE, "Basic realm=\"%s\"",
                  own_realm ? ctx->auth_realm : DEFAULT_REALM);
    return line(ctx, "WWW-Authenticate", ctx->scratch_text);
}

int write_http_status(soap *ctx, int status)
{
    std::snprintf(ctx->scratch_text, SOAP_TEXT_SIZE, "HTTP/%s %d %s", ctx->http_version, status,
                  http_reason(status));
    if (line(ctx, ctx->scratch_text, nullptr) != SOAP_OK)
        return ctx->error;
    if (status == 401)
        return write_challenge(ctx);
    if ((status >= 301 && status <= 303) || status == 307)
        return line(ctx, "Location", ctx->endpoint);
    return SOAP_OK;
}

int write_status(soap *ctx, int status, std::uint64_t count)
{
    if (status >= 200 && status < 600)
        return write_http_status(ctx, status);
    if (status == 0 || status == STATUS_HTML || status == STATUS_FILE)
        return write_own_status(ctx, count == 0 && !output_is_chunked(ctx) ? "202 ACCEPTED" : "200 OK");
    return write_own_status(ctx, engine_error_status(ctx, status));
}

} // namespace

int http_write_line(soap *ctx, const char *key, const char *value)
{
    if (key != nullptr) {
        if (send_without_breaks(ctx, key) != SOAP_OK)
            return ctx->error;
        if (value != nullptr &&
            (soap_send_bytes(ctx, ": ", 2) != SOAP_OK || send_without_breaks(ctx, value) != SOAP_OK))
            return ctx->error;
    }
    return soap_send_bytes(ctx, "\r\n", 2);
}

int http_write_entity_headers(soap *ctx, int status, std::uint64_t count)
{
    if (ctx->status != STATUS_GET && ctx->status != STATUS_CONNECT) {
        if (write_content_type(ctx, status, count) != SOAP_OK || write_encoding(ctx) != SOAP_OK ||
            write_framing(ctx, count) != SOAP_OK)
            return ctx->error;
    }
    return line(ctx, "Connection", ctx->keep_alive != 0 ? "keep-alive" : "close");
}

int http_write_request(soap *ctx, const char *endpoint, const char *host, int port, const char *path,
                       const char *action, std::uint64_t count)
{
    const head_source source = source_of_head(ctx, endpoint, host, port, path, action, count);
    const bool keeps = is_memorable(ctx);
    int result = SOAP_OK;
    if (keeps && head_memory_send(ctx, source, count, &result))
        return result;
    if (endpoint == nullptr || !is_http_scheme(endpoint))
        return SOAP_OK;
    if (std::strlen(endpoint) + std::strlen(ctx->http_version) > HEAD_TEXT_LIMIT)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    const std::size_t start = ctx->buffer_index;
    const std::uint64_t before = ctx->plain_sent;
    if (write_request_head(ctx, endpoint, host, port, path, action, count) != SOAP_OK)
        return ctx->error;
    if (keeps && ctx->plain_sent == before) // all of it is in the buffer
        head_memory_keep(ctx, source, count, ctx->buffer + start, ctx->buffer_index - start);
    return SOAP_OK;
}

int http_write_response(soap *ctx, int status, std::uint64_t count)
{
    if (std::strlen(ctx->http_version) >= VERSION_LIMIT)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    if (write_status(ctx, status, count) != SOAP_OK || line(ctx, "Server", PRODUCT) != SOAP_OK ||
        http_write_entity_headers(ctx, status, count) != SOAP_OK)
        return ctx->error;
    return line(ctx, nullptr, nullptr);
}
