// tcp_tunnel.cpp - CONNECT to an HTTP proxy, while another message begins.
//
// Always: the request that is about to be sent finds the context as it left it, whatever the proxy answers.
// An answer that opens the tunnel has a head only; bytes after it that came before anything was said to the
// host after answer nothing and are dropped.
#include "net/tcp_socket.h"

#include <cstdio>
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>

#include "core/buffered_out.h"
#include "core/failure.h"
#include "core/zlib_common.h"

namespace {

constexpr std::uint32_t MESSAGE_BITS =
    0xFFF; // mode bits that belong to one message: how it leaves, framing, TLS
constexpr int STATUS_OK = 200, STATUS_MIN = 100, STATUS_MAX = 999;

// What the request under way has settled, and the CONNECT exchange overwrites.
class request_state {
public:
    explicit request_state(soap *ctx)
        : ctx_(ctx), mode_(ctx->mode), input_mode_(ctx->input_mode), output_mode_(ctx->output_mode),
          status_(ctx->status), keep_alive_(ctx->keep_alive), zlib_in_(ctx->zlib_in),
          zlib_out_(ctx->zlib_out), message_count_(ctx->message_count), action_(ctx->action),
          http_content_(ctx->http_content), auth_user_(ctx->auth_user), auth_password_(ctx->auth_password),
          auth_realm_(ctx->auth_realm), forwarded_for_(ctx->forwarded_for), dime_(ctx->dime), mime_(ctx->mime)
    {
        std::memcpy(endpoint_, ctx->endpoint, sizeof endpoint_);
    }
    request_state(const request_state &) = delete;
    request_state &operator=(const request_state &) = delete;

    // The head is written; the rest of the exchange sees what the host asked for.
    void restore_output()
    {
        ctx_->status = status_;
        ctx_->keep_alive = keep_alive_;
        ctx_->output_mode = output_mode_;
    }
    void restore_mode() { ctx_->mode = mode_; }
    void restore()
    {
        restore_output();
        restore_mode();
        ctx_->input_mode = input_mode_;
        ctx_->zlib_in = zlib_in_;
        ctx_->zlib_out = zlib_out_;
        ctx_->message_count = message_count_;
        ctx_->action = action_;
        ctx_->http_content = http_content_;
        ctx_->auth_user = auth_user_;
        ctx_->auth_password = auth_password_;
        ctx_->auth_realm = auth_realm_;
        ctx_->forwarded_for = forwarded_for_;
        ctx_->dime = dime_;
        ctx_->mime = mime_;
        std::memcpy(ctx_->endpoint, endpoint_, sizeof endpoint_);
    }

private:
    soap *ctx_;
    std::uint32_t mode_, input_mode_, output_mode_;
    int status_;
    std::int16_t keep_alive_, zlib_in_, zlib_out_;
    std::uint64_t message_count_;
    const char *action_, *http_content_, *auth_user_, *auth_password_, *auth_realm_, *forwarded_for_;
    soap_dime_state dime_;
    soap_mime_state mime_;
    char endpoint_[SOAP_TEXT_SIZE];
};

int send_connect(soap *ctx, const char *endpoint, const char *host, int port)
{
    ctx->output_mode = (ctx->output_mode & ~MESSAGE_BITS) | MODE_BUFFERED;
    ctx->mode = ctx->output_mode; // without attachments, which are not the proxy's
    ctx->error = SOAP_OK;
    if (const int error = output_begin(ctx))
        return error;
    ctx->status = STATUS_CONNECT;
    ctx->keep_alive = 1;
    if (ctx->on_post != nullptr)
        if (const int error = ctx->on_post(ctx, endpoint, host, port, nullptr, nullptr, 0))
            return error;
    return output_close(ctx);
}

void forget_input(soap *ctx)
{
    soap_zlib_drop(ctx);
    ctx->buffer_index = 0;
    ctx->buffer_length = 0;
    ctx->look_ahead = 0;
}

// What a proxy said to a CONNECT. The texts lie in the context.
struct answer {
    int result; // of the head reader
    int status; // 0: it was no HTTP response
    bool has_body;
    char line[SOAP_TEXT_SIZE]; // the first one, or what came in its place
    const char *body;          // null: not known

    bool opens_tunnel() const { return result == 0 && status == STATUS_OK && !has_body; }
    bool is_response() const { return status >= STATUS_MIN && status <= STATUS_MAX; }

    // What a refusal ends with: the status, or what kept it from being read.
    int error() const
    {
        if (is_response())
            return result == 0 ? status : result;
        return result == SOAP_EOF || result == SOAP_OUT_OF_MEMORY || result == SOAP_HEADER_LINE
                   ? result
                   : static_cast<int>(SOAP_HTTP_ERROR);
    }
};

// The head reader has made a fault of its own from most refusals: the line and the body, if it could be read.
const char *body_in_fault(soap *ctx, const answer &got)
{
    const fault_texts fault = ctx->upcalls->read_fault(ctx);
    return fault.text != nullptr && std::strcmp(fault.text, got.line) == 0 ? fault.detail : nullptr;
}

void read_answer(soap *ctx, answer &got)
{
    ctx->input_mode &= ~MESSAGE_BITS;
    ctx->mode = ctx->input_mode;
    forget_input(ctx);
    ctx->message_text[0] = '\0';
    ctx->status = STATUS_OK; // of a host that reads no heads
    got.result = ctx->on_read_head != nullptr ? ctx->on_read_head(ctx) : 0;
    got.status = ctx->status;
    got.has_body = ctx->content_length != 0 || (ctx->input_mode & MODE_IO_MASK) == MODE_CHUNKED;
    got.body = nullptr;
    if (got.result == SOAP_EOF)
        std::snprintf(got.line, sizeof got.line, "no answer (%.900s)", soap_eof_text(ctx));
    else
        std::memcpy(got.line, ctx->message_text, sizeof got.line);
    if (got.is_response() && got.has_body)
        got.body = got.result == 0 ? http_drain_body(ctx) : body_in_fault(ctx, got);
    forget_input(ctx);
}

int refuse(soap *ctx, const char *host, int port, const answer &got)
{
    char text[3 * SOAP_TEXT_SIZE];
    std::snprintf(text, sizeof text, "The HTTP proxy refused CONNECT %.1023s:%d: %s", host, port, got.line);
    const char *const own = soap_string_dup(ctx, text);
    if (own == nullptr)
        return ctx->error;
    const bool has_text = got.body != nullptr && got.body[0] != '\0';
    return fail_as_sender(ctx, own, has_text ? got.body : "CONNECT failed in tcp_connect()", got.error());
}

} // namespace

int tcp_open_tunnel(soap *ctx, const char *endpoint, const char *host, int port)
{
    request_state state(ctx);
    int error = send_connect(ctx, endpoint, host, port);
    state.restore_output();
    if (error == 0) {
        answer got;
        read_answer(ctx, got);
        if (!got.opens_tunnel())
            error = refuse(ctx, host, port, got);
    }
    state.restore();
    if (error != 0)
        return fail(ctx, error);
    ctx->buffer_index = ctx->buffer_length = 0; // as before the request
    std::snprintf(ctx->endpoint, sizeof ctx->endpoint, "%s", endpoint);
    return SOAP_OK;
}
