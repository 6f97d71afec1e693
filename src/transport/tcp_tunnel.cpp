// tcp_tunnel.cpp - CONNECT to an HTTP proxy, in the midst of another message's beginning.
//
// Always: the request that is about to be sent finds the context as it left it. The proxy's answer has a head
// only; bytes behind it that came before anything was said to the host behind are nobody's answer and are
// dropped.
#include "transport/tcp_tunnel.h"

#include <cstdio>

#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>

namespace {

constexpr std::uint32_t MESSAGE_BITS =
    0xFFF; // mode bits that belong to one message: how it leaves, framing, TLS

// What the request under way has settled, and the CONNECT exchange would overwrite.
class request_state {
public:
    explicit request_state(soap *ctx)
        : ctx_(ctx), mode_(ctx->mode), input_mode_(ctx->input_mode), output_mode_(ctx->output_mode),
          status_(ctx->status), keep_alive_(ctx->keep_alive), message_count_(ctx->message_count),
          action_(ctx->action), http_content_(ctx->http_content), auth_user_(ctx->auth_user),
          auth_password_(ctx->auth_password)
    {}
    request_state(const request_state &) = delete;
    request_state &operator=(const request_state &) = delete;

    // The head is written; the rest of the exchange sees what the host asked for.
    void restore_output()
    {
        ctx_->status = status_;
        ctx_->keep_alive = keep_alive_;
        ctx_->output_mode = output_mode_;
    }
    void restore_input()
    {
        ctx_->input_mode = input_mode_;
        ctx_->auth_user = auth_user_;
        ctx_->auth_password = auth_password_;
        ctx_->action = action_;
        ctx_->http_content = http_content_;
        ctx_->message_count = message_count_;
    }
    void restore_mode() { ctx_->mode = mode_; }

private:
    soap *ctx_;
    std::uint32_t mode_, input_mode_, output_mode_;
    int status_;
    std::int16_t keep_alive_;
    std::uint64_t message_count_;
    const char *action_, *http_content_, *auth_user_, *auth_password_;
};

int send_connect(soap *ctx, const char *endpoint, const char *host, int port)
{
    ctx->output_mode = (ctx->output_mode & ~MESSAGE_BITS) | MODE_BUFFERED;
    if (const int error = soap_send_begin(ctx))
        return error;
    ctx->status = STATUS_CONNECT;
    ctx->keep_alive = 1;
    if (ctx->on_post)
        if (const int error = ctx->on_post(ctx, endpoint, host, port, nullptr, nullptr, 0))
            return error;
    return soap_send_finish(ctx);
}

void forget_input(soap *ctx)
{
    ctx->buffer_index = 0;
    ctx->buffer_length = 0;
    ctx->look_ahead = 0;
}

int read_answer(soap *ctx)
{
    ctx->input_mode &= ~MESSAGE_BITS;
    ctx->mode = ctx->input_mode;
    forget_input(ctx);
    const int error = ctx->on_read_head ? ctx->on_read_head(ctx) : 0;
    forget_input(ctx);
    return error;
}

} // namespace

int tcp_open_tunnel(soap *ctx, const char *endpoint, const char *host, int port)
{
    request_state state(ctx);
    int error = send_connect(ctx, endpoint, host, port);
    state.restore_output();
    if (error == 0)
        error = read_answer(ctx);
    if (error == 0)
        state.restore_output(); // the head's status and persistence are the proxy's, not the request's
    state.restore_input();
    if (error == 0) {
        error = soap_send_begin(ctx);
        std::snprintf(ctx->endpoint, sizeof ctx->endpoint, "%s", endpoint);
    }
    state.restore_mode();
    if (error != 0)
        ctx->error = error;
    return error;
}
