// reception.cpp - see reception.h.
#include "reception.h"

#include <algorithm>
#include <cstdio>
#include <exception>
#include <new>
#include <string_view>
#include <utility>

#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_tcp.h>

#include "answer.h"
#include "attachments.h"
#include "contract_files.h"
#include "data_port.h"
#include "secrets.h"

namespace service {

namespace {

constexpr int BAD_REQUEST = 400, UNAUTHORIZED = 401, FORBIDDEN = 403, NOT_FOUND = 404,
              METHOD_NOT_ALLOWED = 405, TOO_LARGE = 413, INTERNAL_ERROR = 500;
constexpr std::int16_t GZIP = 2; // of zlib_out
char REALM[] = "zuv";
// Attachments may be long, and at this pace their bytes don't count in the time that a request may take.
constexpr std::chrono::microseconds ATTACHED_BYTE_TIME(10);

// For the journal; what there is no memory for is left out, since the library's hooks must not throw.
void keep_some(std::string &text, const char *data, std::size_t length)
{
    try {
        text.append(data, std::min(length, NOTED_BYTES - text.size()));
    } catch (const std::bad_alloc &) {
        text.clear();
    }
}

// For a recording, which is incomplete with a body that is too large.
void keep_all(recorded_exchange &exchange, std::string &body, const char *data, std::size_t length)
{
    try {
        exchange.complete = exchange.complete && length <= RECORDED_MAX - body.size();
        if (exchange.complete)
            body.append(data, length);
        else
            body = {};
    } catch (const std::bad_alloc &) {
        exchange.complete = false;
    }
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

// A request that tells no length has no body. SOAP messages of old peers may all the same end with the connection.
void settle_length(soap *ctx)
{
    if ((ctx->input_mode & MODE_IO_MASK) != MODE_CHUNKED)
        ctx->content_length_given = true;
}

// Chunks are only for peers that know them: those whose start line says HTTP/1.1.
void settle_framing(soap *ctx, bool chunks_wanted)
{
    const bool old = std::string_view(ctx->message_text).ends_with("HTTP/1.0");
    ctx->output_mode = (ctx->output_mode & ~(MODE_IO_MASK | MODE_DEFLATE)) |
                       (chunks_wanted && !old ? MODE_CHUNKED : MODE_BUFFERED);
}

} // namespace

reception::reception(soap *ctx, const settings &config, session &borrowed)
    : config_(config), borrowed_(borrowed), peer_(peer_of(ctx->socket)),
      enclosures_(config, borrowed.documents.data_directory())
{
    ctx->user = this;
    ctx->on_read_head = read_head;
    ctx->on_recv_prepare = count_body;
    ctx->on_recv = receive;
    ctx->on_send = send;
    ctx->on_response = send_head;
    ctx->on_header_line = write_line;
    ctx->on_get = get;
    ctx->on_head = ctx->on_options = option_or_head;
    ctx->on_put = refuse_method;
    ctx->on_delete = erase;
    if (borrowed_.shared.recorded.is_on())
        ctx->on_parse_header = keep_line;
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
    distortion_ = {};
    note_ = {};
    exchange_ = {};
    played_type_ = nullptr;
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
        ctx->recv_timeout = static_cast<int>(std::min<std::int64_t>(left, ctx->recv_timeout));
    }
    const std::size_t received = tcp_recv(ctx, buffer, length);
    const auto end = steady_clock::now();
    self.note_.received += received;
    if (received == 0)
        self.too_slow_ = self.started_ && end - start >= seconds(ctx->recv_timeout);
    else if (!std::exchange(self.started_, true)) {
        self.begun_ = end;
        self.note_.begun = system_clock::now();
        self.deadline_ = end + seconds(self.config_.request_seconds);
    }
    return received;
}

// Sends what a rule leaves of the answer, and notes its beginning.
int reception::send(soap *ctx, const char *data, std::size_t length)
{
    reception &self = of(ctx);
    exchange_note &note = self.note_;
    const std::uint64_t end = self.distortion_.cut_after.value_or(note.sent + length);
    const std::size_t part =
        static_cast<std::size_t>(std::min<std::uint64_t>(length, end - std::min(end, note.sent)));
    keep_some(note.answer, data, part);
    note.sent += part;
    const int result = part == 0 ? 0 : tcp_send(ctx, data, part);
    return result == 0 && part != length ? static_cast<int>(SOAP_EOF) : result;
}

int reception::send_head(soap *ctx, int status, std::uint64_t length)
{
    reception &self = of(ctx);
    const std::uint64_t error = static_cast<std::uint64_t>(self.distortion_.length_error);
    self.note_.answer.clear(); // an interim head
    self.writes_head_ = true;
    const int result =
        http_write_response(ctx, self.distortion_.status == 0 ? status : self.distortion_.status,
                            self.distortion_.length_error < 0 && length < -error ? 0 : length + error);
    self.writes_head_ = false;
    return result;
}

void reception::distort(soap *ctx, const rule &how)
{
    distortion_ = how;
    if (how.chunked)
        ctx->output_mode |= MODE_CHUNKED;
    if (how.length_error != 0)
        ctx->output_mode = (ctx->output_mode & ~MODE_IO_MASK) | MODE_BUFFERED;
    if (how.gzip) {
        ctx->output_mode |= MODE_DEFLATE;
        ctx->zlib_out = GZIP;
    }
    if (how.length_error != 0 || how.cut_after)
        ctx->keep_alive = 0; // the peer can't know where the next answer begins
}

// The request has been read, and its answer begins.
void reception::note_operation(soap *ctx, std::string_view name)
{
    note_.target.append("/").append(name);
    if (!borrowed_.shared.recorded.is_on())
        return;
    exchange_.begun = note_.begun;
    exchange_.port = target_->name;
    exchange_.operation = name;
    exchange_.start_line = note_.method + " " + loggable_path(where_.path) + " HTTP/1.1";
    ctx->on_send_filter = keep_answer;
}

// Sees the answer before it is compressed and framed; its head is written after a body whose size has to be known.
// NOLINTNEXTLINE(readability-non-const-parameter): the callback's type
int reception::keep_answer(soap *ctx, const char **data, std::size_t *length)
{
    recorded_exchange &kept = of(ctx).exchange_;
    if ((ctx->mode & MODE_COUNTING) == 0)
        keep_all(kept, of(ctx).writes_head_ ? kept.answer_head : kept.answer, *data, *length);
    return SOAP_OK;
}

int reception::keep_line(soap *ctx, const char *key, const char *value)
{
    recorded_exchange &kept = of(ctx).exchange_;
    try {
        kept.request_head.push_back(std::string(key) + ": " + (names_secret(key) ? "***" : value));
    } catch (const std::bad_alloc &) {
        kept.complete = false;
    }
    return http_parse_header(ctx, key, value);
}

void reception::record_exchange(const soap *ctx)
{
    const bool was_sent = ctx->error == SOAP_OK || ctx->error == SOAP_STOP;
    if (was_sent && !exchange_.operation.empty())
        borrowed_.shared.recorded.add(exchange_);
    exchange_ = {}; // which may be large
}

void reception::note_exchange()
{
    if (!started_)
        return;
    note_.peer = peer_.name;
    note_.lasted = std::chrono::steady_clock::now() - begun_;
    if (const std::string_view head = note_.answer; head.starts_with("HTTP/1.") && head.size() > 12)
        note_.status = std::atoi(head.substr(9, 3).data());
    borrowed_.shared.notes.add(std::move(note_));
}

// Without what follows a body whose length is known, and belongs to nobody.
std::size_t reception::length_in_body(const soap *ctx, std::size_t length) const
{
    const bool chunked = (ctx->mode & MODE_IO_MASK) == MODE_CHUNKED;
    if (!ctx->content_length_given || chunked || ctx->zlib_in != 0)
        return length;
    const std::uint64_t kept = exchange_.request.size();
    return static_cast<std::size_t>(
        std::min<std::uint64_t>(length, ctx->content_length - std::min(ctx->content_length, kept)));
}

int reception::count_body(soap *ctx, const char *data, std::size_t length)
{
    reception &self = of(ctx);
    if (self.target_ != nullptr) {
        keep_some(self.note_.request, data, length);
        if (self.borrowed_.shared.recorded.is_on() || self.borrowed_.shared.played.is_on())
            keep_all(self.exchange_, self.exchange_.request, data, self.length_in_body(ctx, length));
    }
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
        if (known.at_control()) {
            settle_length(ctx);
            return known.is_local() ? 0 : ctx->error = FORBIDDEN;
        }
        return known.target_ == nullptr && known.data_name().empty() ? ctx->error = NOT_FOUND : 0;
    });
}

bool reception::knows_sender(const soap *ctx) const
{
    if (config_.user.empty())
        return true;
    const auto given = [](const char *text) { return std::string_view(text == nullptr ? "" : text); };
    const bool user = same_secret(given(ctx->auth_user), config_.user);
    const bool password = same_secret(given(ctx->auth_password), config_.password);
    return user && password;
}

// A page of elsewhere, shown by a browser on this machine, would name another host.
bool reception::is_local() const
{
    return peer_.is_local && is_loopback_root(where_.root);
}

// Takes the URL that the request is for, and says why the request can't be handled: 0 or an HTTP
// status.
int reception::settle_request(soap *ctx)
{
    where_ = parse_target(ctx->endpoint, ctx->socket, config_.tls);
    target_ = find_port(where_.path);
    const std::string_view line = ctx->message_text;
    note_.method = loggable_path(line.substr(0, line.find(' ')));
    note_.target = target_ == nullptr ? loggable_path(where_.path) : target_->name;
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

// An answer that refuses the method names the one that is served; a browser takes what is sent for what it is.
int reception::write_line(soap *ctx, const char *key, const char *value)
{
    const bool end = key == nullptr;
    if (end && ctx->status == STATUS_FILE &&
        (http_write_line(ctx, "Content-Security-Policy", page_policy()) ||
         http_write_line(ctx, "X-Content-Type-Options", "nosniff")))
        return ctx->error;
    if (end && ctx->status == METHOD_NOT_ALLOWED && http_write_line(ctx, "Allow", "POST"))
        return ctx->error;
    if (!end && of(ctx).played_type_ != nullptr && std::string_view(key) == "Content-Type")
        value = of(ctx).played_type_;
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
    if (where_.path == RECENT_PATH || at_control())
        return answer_local(ctx);
    if (target_ != nullptr)
        return ctx->error = METHOD_NOT_ALLOWED; // a port has nothing to fetch
    if (where_.path != "/" && where_.path != SERVICES_PATH && where_.path != CONTRACT_PATH)
        return ctx->error = NOT_FOUND;
    note_.shown = false;
    return send_file(ctx, "text/html; charset=utf-8", front_page(where_));
}

// What is for clients on this machine alone.
int reception::answer_local(soap *ctx)
{
    if (!is_local())
        return ctx->error = FORBIDDEN;
    if (at_reset())
        return ctx->error = METHOD_NOT_ALLOWED;
    note_.shown = false;
    return send_file(ctx, JSON_TYPE,
                     at_control() ? borrowed_.shared.rules.waiting()
                                  : borrowed_.shared.notes.recent(number_after(where_)));
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

int reception::erase(soap *ctx)
{
    return answered(ctx, [ctx](reception &self) {
        if (!self.at_control() || self.at_reset())
            return ctx->error = METHOD_NOT_ALLOWED;
        if (!self.is_local())
            return ctx->error = FORBIDDEN;
        end_without_body(ctx);
        self.borrowed_.shared.rules.clear();
        return http_method_default(ctx);
    });
}

int reception::refuse_method(soap *ctx)
{
    return answered(ctx, [ctx](reception &) { return ctx->error = METHOD_NOT_ALLOWED; });
}

} // namespace service
