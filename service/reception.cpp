// reception.cpp - see reception.h.
#include "reception.h"

#include <algorithm>
#include <cstdio>
#include <exception>
#include <string_view>
#include <utility>

#include <openssl/crypto.h>

#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_tcp.h>

#include "answer.h"
#include "attachments.h"
#include "contract_files.h"
#include "data_port.h"

namespace service {

namespace {

constexpr int BAD_REQUEST = 400, UNAUTHORIZED = 401, NOT_FOUND = 404, METHOD_NOT_ALLOWED = 405,
              TOO_LARGE = 413, INTERNAL_ERROR = 500;
char REALM[] = "zuv";
// Attachments may be long, and at this pace their bytes don't count in the time that a request may take.
constexpr std::chrono::microseconds ATTACHED_BYTE_TIME(10);

// Compares in a time that does not reveal where the texts differ.
bool same_secret(const char *given, const std::string &expected)
{
    const std::string_view text = given == nullptr ? std::string_view() : given;
    return text.size() == expected.size() && CRYPTO_memcmp(text.data(), expected.data(), text.size()) == 0;
}

// A request that should have no body is at its end. A body that it has all the same, or bytes after it,
// would be taken for the next request.
void end_without_body(soap *ctx)
{
    const bool chunked = (ctx->input_mode & MODE_IO_MASK) == MODE_CHUNKED;
    if (chunked || ctx->content_length != 0 || ctx->buffer_index < ctx->buffer_length)
        ctx->keep_alive = 0;
    else
        ctx->response_unfinished = false;
}

// Chunks are only for peers that know them: those whose start line says HTTP/1.1.
void settle_framing(soap *ctx, bool chunks_wanted)
{
    const bool old = std::string_view(ctx->message_text).ends_with("HTTP/1.0");
    ctx->output_mode =
        (ctx->output_mode & ~MODE_IO_MASK) | (chunks_wanted && !old ? MODE_CHUNKED : MODE_BUFFERED);
}

} // namespace

reception::reception(soap *ctx, const settings &config, session &borrowed)
    : config_(config), borrowed_(borrowed), enclosures_(config, borrowed.documents.data_directory())
{
    ctx->user = this;
    ctx->on_read_head = read_head;
    ctx->on_recv_prepare = count_body;
    ctx->on_recv = receive;
    ctx->on_header_line = write_line;
    ctx->on_get = get;
    ctx->on_head = ctx->on_options = option_or_head;
    ctx->on_put = ctx->on_delete = refuse_method;
    install_attachment_hooks(ctx);
}

void reception::install_attachment_hooks(soap *ctx)
{
    ctx->dime_write_open = [](soap *c, const char *id, const char *, const char *) {
        return of(c).enclosures_.open(c, id, MIME_NONE);
    };
    ctx->mime_write_open = [](soap *c, void *, const char *id, const char *, const char *, int encoding) {
        return of(c).enclosures_.open(c, id, encoding);
    };
    ctx->dime_write = ctx->mime_write = [](soap *c, void *handle, const char *data, std::size_t length) {
        reception &self = of(c);
        if (enclosures::is_in_file(handle)) {
            self.body_bytes_ -= std::min<std::uint64_t>(length, self.body_bytes_); // it is not kept in memory
            self.deadline_ += ATTACHED_BYTE_TIME * static_cast<long>(length);
        }
        return self.enclosures_.write(c, handle, data, length);
    };
    ctx->dime_write_close = ctx->mime_write_close = enclosures::close;
    ctx->dime_read_open =
        ctx->mime_read_open = [](soap *c, void *handle, const char *, const char *, const char *) {
            return of(c).enclosures_.reopen(c, handle);
        };
    ctx->dime_read = ctx->mime_read = [](soap *, void *handle, char *buffer, std::size_t length) {
        return enclosures::read(handle, buffer, length);
    };
}

void reception::reset()
{
    started_ = too_slow_ = false;
    body_bytes_ = 0;
    target_ = nullptr;
    where_ = {};
    enclosures_.reset();
}

// ---------------------------------------------------------------------------------------------
// Bytes.

// The silence before a request is bounded by the idle limit, the request itself by its own as well.
std::size_t reception::receive(soap *ctx, char *buffer, std::size_t length)
{
    using namespace std::chrono;
    reception &self = of(ctx);
    const auto start = steady_clock::now();
    ctx->recv_timeout = self.config_.idle_seconds;
    if (self.started_) {
        const auto left = duration_cast<seconds>(self.deadline_ - start).count();
        self.too_slow_ = left <= 0;
        if (self.too_slow_)
            return 0;
        ctx->recv_timeout = static_cast<int>(std::min<long>(left, ctx->recv_timeout));
    }
    const std::size_t received = tcp_recv(ctx, buffer, length);
    const auto end = steady_clock::now();
    if (received == 0)
        self.too_slow_ = self.started_ && end - start >= seconds(ctx->recv_timeout);
    else if (!std::exchange(self.started_, true))
        self.deadline_ = end + seconds(self.config_.request_seconds);
    return received;
}

int reception::count_body(soap *ctx, const char *, std::size_t length)
{
    reception &self = of(ctx);
    self.body_bytes_ += length;
    if (!self.data_name().empty())
        self.deadline_ += ATTACHED_BYTE_TIME * static_cast<long>(length);
    return self.too_large() ? TOO_LARGE : 0;
}

// ---------------------------------------------------------------------------------------------
// Heads.

// Determines the target of the request, then answers it. The library calls the hooks; they must not throw.
template <class Answer> int reception::answered(soap *ctx, Answer answer)
{
    reception &self = of(ctx);
    try {
        if (const int refused = self.settle_request(ctx))
            return ctx->error = refused;
        return answer(self);
    } catch (const std::exception &failure) {
        std::fprintf(stderr, "zuv-service: %s\n", failure.what());
        return ctx->error = INTERNAL_ERROR;
    }
}

int reception::read_head(soap *ctx)
{
    reception &self = of(ctx);
    const int result = http_read_head(ctx);
    self.enclosures_.set_form(ctx->input_mode & (MODE_DIME | MODE_MIME));
    settle_framing(ctx, self.config_.chunked);
    if (result != 0)
        return result;
    if (std::string_view(ctx->message_text).find(" HTTP/1.") == std::string_view::npos)
        return ctx->error = BAD_REQUEST; // the library leaves what isn't HTTP to its caller
    return answered(ctx, [ctx](const reception &known) {
        return known.target_ == nullptr && known.data_name().empty() ? ctx->error = NOT_FOUND : 0;
    });
}

bool reception::knows_sender(const soap *ctx) const
{
    if (config_.user.empty())
        return true;
    const bool user = same_secret(ctx->auth_user, config_.user);
    const bool password = same_secret(ctx->auth_password, config_.password);
    return user && password;
}

// Takes the URL that the request is for, and says why the request can't be handled: 0 or an HTTP
// status.
int reception::settle_request(soap *ctx)
{
    where_ = parse_target(ctx->endpoint, ctx->socket);
    target_ = find_port(where_.path);
    ctx->max_message = data_name().empty() ? config_.message_limit() : 0; // data is written to a file
    if (!knows_sender(ctx)) {
        ctx->auth_realm = REALM;
        return UNAUTHORIZED;
    }
    const std::uint64_t attached = enclosures_.has_form() ? config_.attachment_limit : 0;
    return ctx->content_length > body_limit() + attached ? TOO_LARGE : 0;
}

std::string_view reception::data_name() const
{
    return where_.path.starts_with(DATA_PATH) ? std::string_view(where_.path).substr(DATA_PATH.size())
                                              : std::string_view();
}

// An answer that refuses the method names the one that is served.
int reception::write_line(soap *ctx, const char *key, const char *value)
{
    const bool end = key == nullptr;
    if (end && ctx->status == METHOD_NOT_ALLOWED && http_write_line(ctx, "Allow", "POST"))
        return ctx->error;
    return http_write_line(ctx, key, value);
}

// ---------------------------------------------------------------------------------------------
// Methods other than POST, answered as soon as the head is read.

int reception::answer_get(soap *ctx)
{
    if (!data_name().empty())
        return send_data(ctx, borrowed_.documents, data_name());
    const std::string contract = contract_document(where_);
    if (!contract.empty())
        return send_file(ctx, "text/xml; charset=utf-8", contract);
    if (target_ != nullptr)
        return ctx->error = METHOD_NOT_ALLOWED; // a port has nothing to fetch
    if (where_.path != "/" && where_.path != SERVICES_PATH && where_.path != CONTRACT_PATH)
        return ctx->error = NOT_FOUND;
    return send_file(ctx, "text/html; charset=utf-8", contract_page(where_));
}

int reception::get(soap *ctx)
{
    end_without_body(ctx);
    return answered(ctx, [ctx](reception &self) { return self.answer_get(ctx); });
}

int reception::option_or_head(soap *ctx)
{
    end_without_body(ctx);
    return answered(ctx, [ctx](reception &) { return http_method_default(ctx); });
}

int reception::refuse_method(soap *ctx)
{
    return answered(ctx, [ctx](reception &) { return ctx->error = METHOD_NOT_ALLOWED; });
}

} // namespace service
