// http_read.cpp - a received HTTP head: start line, headers, and what the status means for the rest of the
// message.
//
// Elsewhere: what each header does (http_headers.cpp), reading lines (soap_recv_line), the body (soap_io.h).
// Always: a peer can't keep the reader busy for ever: lines, bytes and repeated heads of one message are
// limited, and so is an error body.
#include <algorithm>
#include <cstdlib>
#include <cstring>

#include <openssl/crypto.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/buffered_in.h"
#include "core/failure.h"

namespace {

constexpr std::size_t LINE_SIZE = 8192; // bytes of a header line, terminator included
constexpr unsigned LINES_MAX = 1024;    // header lines of one message
constexpr std::size_t HEAD_BYTES_MAX = std::size_t{1024} * 1024; // all header lines of one message
constexpr unsigned INTERIM_HEADS_MAX = 100;                      // interim heads before the one that counts
constexpr std::uint64_t ERROR_BODY_MAX = std::uint64_t{1024} * 1024; // bytes of an error body that are kept
constexpr int STATUS_SWITCHING = 101;                                // to a protocol that wasn't asked for
constexpr int STATUS_MIN = 100, STATUS_MAX = 999; // other numbers could pass for codes of the engine
constexpr int STATUS_URI_TOO_LARGE = 414;
constexpr int STATUS_NO_METHOD = 405;

// What is known of the head besides the context's fields.
struct head_state {
    unsigned lines = 0;
    std::size_t bytes = 0;
    bool is_retry = false;  // read on behalf of http_put_default
    int deferred = SOAP_OK; // informative result of a header, for the end
};

struct method_row {
    const char *name; // with its blank
    int (*soap::*hook)(soap *ctx);
};

constexpr method_row POST_METHOD = {"POST ", nullptr};
constexpr method_row OTHER_METHODS[] = {
    {"PUT ", &soap::on_put},         {"GET ", &soap::on_get},   {"DELETE ", &soap::on_delete},
    {"OPTIONS ", &soap::on_options}, {"HEAD ", &soap::on_head},
};

void reset_head_fields(soap *ctx)
{
    ctx->endpoint[0] = '\0';
    ctx->content_length = 0;
    ctx->content_length_given = false;
    ctx->auth_user = nullptr;
    ctx->auth_password = nullptr;
    ctx->auth_realm = nullptr;
    ctx->forwarded_for = nullptr;
    ctx->http_content = nullptr;
    ctx->action = nullptr;
    ctx->status = 0;
}

bool is_low(char c)
{
    return static_cast<unsigned char>(c) <= ' ';
}

bool is_digit(char c)
{
    return c >= '0' && c <= '9';
}

// The number after the first blank; 0 if there is none, which makes the line that of a request.
int status_of(const char *start_line)
{
    const char *const blank = std::strchr(start_line, ' ');
    if (blank == nullptr)
        return 0;
    if (is_digit(blank[1]) && is_digit(blank[2]) && is_digit(blank[3]) && is_low(blank[4]))
        return 100 * (blank[1] - '0') + 10 * (blank[2] - '0') + (blank[3] - '0');
    char *end = nullptr;
    const unsigned long number = std::strtoul(blank, &end, 10);
    return is_low(*end) ? static_cast<int>(number & 0xFFFF) : 0;
}

int read_start_line(soap *ctx)
{
    const int result = soap_recv_line(ctx, ctx->message_text, SOAP_TEXT_SIZE);
    if (result == SOAP_OK)
        ctx->status = status_of(ctx->message_text);
    else if (result != SOAP_EOF)
        fail(ctx, STATUS_URI_TOO_LARGE);
    return ctx->error;
}

// Cuts the quotes and the blanks around a value that ends at `end`, in place.
char *trimmed_value(char *value, const char *end)
{
    while (value != end && is_low(*value))
        ++value;
    if (*value == '"')
        ++value;
    auto length = static_cast<std::size_t>(end - value);
    while (length > 0 && is_low(value[length - 1]))
        --length;
    if (length > 0 && value[length - 1] == '"')
        --length;
    value[length] = '\0';
    return value;
}

int take_header(soap *ctx, head_state &head, char *line, std::size_t length)
{
    char *const colon = std::strchr(line, ':');
    if (colon == nullptr)
        return SOAP_OK;
    *colon = '\0';
    if (ctx->on_parse_header == nullptr)
        return SOAP_OK;
    char *const value = trimmed_value(colon + 1, line + length);
    const int result = ctx->on_parse_header(ctx, line, value);
    if (ctx->auth_password != nullptr) // it may have come with this line
        OPENSSL_cleanse(value, std::strlen(value));
    ctx->error = result < SOAP_STOP ? result : SOAP_OK;
    if (result >= SOAP_STOP)
        head.deferred = result;
    return ctx->error;
}

bool is_interim(int status)
{
    return status >= 100 && status < 200 && status != STATUS_SWITCHING;
}

int read_headers(soap *ctx, head_state &head)
{
    char line[LINE_SIZE];
    for (;;) {
        const int result = soap_recv_line(ctx, line, sizeof line);
        if (result == SOAP_EOF)
            return ctx->error = SOAP_OK;
        if (result != SOAP_OK || line[0] == '\0')
            return result;
        const std::size_t length = std::strlen(line);
        head.bytes += length;
        if (++head.lines > LINES_MAX || head.bytes > HEAD_BYTES_MAX)
            return fail(ctx, SOAP_HEADER_LINE);
        if (!is_interim(ctx->status) && take_header(ctx, head, line, length) != SOAP_OK)
            return ctx->error;
    }
}

// The final head follows informational ones.
int read_final_head(soap *ctx, head_state &head)
{
    for (unsigned heads = 0; heads <= INTERIM_HEADS_MAX; ++heads) {
        reset_head_fields(ctx);
        if (read_start_line(ctx) != SOAP_OK || read_headers(ctx, head) != SOAP_OK)
            return ctx->error;
        if (!is_interim(ctx->status))
            return SOAP_OK;
    }
    return fail(ctx, SOAP_HEADER_LINE);
}

// Where the protocol's name is in the start line; the last place, as a request's path may hold it too.
const char *find_version(const char *start_line)
{
    const char *found = nullptr;
    if (std::memcmp(start_line, "HTTP/", 5) == 0) // in message_text, which has as many bytes
        return start_line;
    for (const char *p = start_line; (p = std::strstr(p, "HTTP/")) != nullptr; p += 5)
        found = p;
    return found;
}

// A peer of HTTP/1.0 closes the connection unless it says otherwise, and can't read chunks.
void apply_version(soap *ctx, const char *version)
{
    const bool modern = version == nullptr || (std::strlen(version) > 7 && version[7] == '1');
    if (!modern) {
        if (ctx->keep_alive == 1)
            ctx->keep_alive = 0;
        if (ctx->status == 0 && (ctx->output_mode & MODE_IO_MASK) == MODE_CHUNKED)
            ctx->output_mode = (ctx->output_mode & ~MODE_IO_MASK) | MODE_STORE;
    }
    if (ctx->keep_alive < 0)
        ctx->keep_alive = 1;
}

// Adds the request's path to the endpoint that the Host header began; an absolute one takes its place.
void append_request_target(soap *ctx, const char *target, const char *version)
{
    const char *end = version > target ? version : target + std::strlen(target);
    while (target < end && is_low(*target))
        ++target;
    while (end > target && is_low(end[-1]))
        --end;
    if (*target != '/')
        ctx->endpoint[0] = '\0';
    const std::size_t used = std::strlen(ctx->endpoint);
    const std::size_t space = SOAP_TEXT_SIZE - 1 - used;
    const std::size_t length = static_cast<std::size_t>(end - target);
    const std::size_t copied = length < space ? length : space;
    std::memcpy(ctx->endpoint + used, target, copied);
    ctx->endpoint[used + copied] = '\0';
}

bool starts_with(const char *text, const char *prefix)
{
    return std::strncmp(text, prefix, std::strlen(prefix)) == 0;
}

int run_method_hook(soap *ctx, const head_state &head, const method_row &method)
{
    int (*const hook)(soap *) = ctx->*method.hook;
    if (hook == http_put_default && head.is_retry)
        return fail(ctx, SOAP_PUT_METHOD); // one PUT leads to one more head, not to any number of them
    const int result = hook == nullptr ? SOAP_OK : hook(ctx);
    return ctx->error = result == SOAP_OK ? static_cast<int>(SOAP_STOP) : result;
}

int take_request(soap *ctx, const head_state &head, const char *version)
{
    const char *const start_line = ctx->message_text;
    if (starts_with(start_line, POST_METHOD.name)) {
        append_request_target(ctx, start_line + std::strlen(POST_METHOD.name), version);
        return ctx->error = head.deferred;
    }
    for (const method_row &method : OTHER_METHODS) {
        if (starts_with(start_line, method.name)) {
            append_request_target(ctx, start_line + std::strlen(method.name), version);
            return run_method_hook(ctx, head, method);
        }
    }
    if (version == nullptr)
        return SOAP_OK;
    return ctx->error = head.deferred != SOAP_OK ? head.deferred : STATUS_NO_METHOD;
}

// The code, a status or one of the engine's, is the outcome: text and detail in managed memory, as
// message_text serves every later text too.
int fail_with(soap *ctx, int code, const char *body)
{
    const char *const start_line = soap_string_dup(ctx, ctx->message_text);
    if (start_line == nullptr)
        return ctx->error;
    if (body != nullptr)
        return fail_as_receiver(ctx, start_line, body, code);
    return fail_as_receiver(ctx, "HTTP Error", start_line, code);
}

bool is_chunked(const soap *ctx)
{
    return (ctx->input_mode & MODE_IO_MASK) == MODE_CHUNKED;
}

int take_response(soap *ctx)
{
    const int status = ctx->status;
    if (status == 200)
        return SOAP_OK;
    if (status < STATUS_MIN || status > STATUS_MAX || status == STATUS_SWITCHING) {
        ctx->keep_alive = 0;
        return fail_with(ctx, status == STATUS_SWITCHING ? status : SOAP_HTTP_ERROR, nullptr);
    }
    if (ctx->content_length == 0 && (ctx->http_content == nullptr || ctx->recv_timeout == 0) &&
        !is_chunked(ctx)) {
        ctx->response_unfinished = !ctx->content_length_given && status != 204 && status != 304;
        return fail_with(ctx, status, nullptr);
    }
    if ((status > 200 && status < 300) || status == 400 || status == 500)
        return SOAP_OK;
    ctx->keep_alive = 0;
    return fail_with(ctx, status, http_drain_body(ctx));
}

int read_head(soap *ctx, bool is_retry)
{
    head_state head;
    head.is_retry = is_retry;
    if (read_final_head(ctx, head) != SOAP_OK)
        return ctx->error;
    const char *const version = find_version(ctx->message_text);
    if (version != nullptr || ctx->keep_alive < 0)
        apply_version(ctx, version);
    return ctx->status != 0 ? take_response(ctx) : take_request(ctx, head, version);
}

// Appends up to `left` bytes of input to the growing text. 0 also at the end of input.
int gather(soap *ctx, std::uint64_t left)
{
    while (left > 0 && ctx->look_ahead == 0) {
        if (ctx->buffer_index >= ctx->buffer_length && soap_recv_more(ctx) != SOAP_OK)
            return SOAP_OK;
        const std::size_t unread = ctx->buffer_length - ctx->buffer_index;
        const std::size_t taken = unread < left ? unread : static_cast<std::size_t>(left);
        if (soap_text_buffer_put(ctx, ctx->buffer + ctx->buffer_index, taken) != SOAP_OK)
            return ctx->error;
        ctx->buffer_index += taken;
        left -= taken;
    }
    return SOAP_OK;
}

} // namespace

int http_read_head(soap *ctx)
{
    return read_head(ctx, false);
}

char *http_drain_body(soap *ctx)
{
    const bool open_end = is_chunked(ctx) || (ctx->mode & MODE_DEFLATE) != 0;
    if (!open_end && ctx->content_length == 0)
        return nullptr;
    if (!ctx->body_open && soap_body_open(ctx) != SOAP_OK)
        return nullptr;
    const bool length_known = !is_chunked(ctx) && (ctx->mode & MODE_DEFLATE) == 0;
    const std::uint64_t limit = length_known ? std::min(ctx->content_length, ERROR_BODY_MAX) : ERROR_BODY_MAX;
    if (soap_text_buffer_reset_put(ctx, "", 0) != SOAP_OK || gather(ctx, limit) != SOAP_OK)
        return nullptr;
    return soap_string_dup_n(ctx, ctx->label_buffer, ctx->label_index);
}

int http_get_default(soap *ctx)
{
    return fail(ctx, SOAP_GET_METHOD);
}

int http_put_default(soap *ctx)
{
    return read_head(ctx, true);
}

int http_delete_default(soap *ctx)
{
    return fail(ctx, STATUS_NO_METHOD);
}
