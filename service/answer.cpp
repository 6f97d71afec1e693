// answer.cpp - see answer.h.
#include "answer.h"

#include <algorithm>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_xml.h>

namespace service {

namespace {

constexpr std::size_t FILE_PIECE = 32768; // bytes
constexpr int OK = 200, BAD_REQUEST = 400, INTERNAL_ERROR = 500;

// The Body's content, or in place of the whole message its bytes.
struct content {
    int (*put)(soap *ctx, const content &self);
    const operation *op = nullptr;
    const void *response = nullptr;
    const std::string *message = nullptr;
};

int put_response(soap *ctx, const content &self)
{
    return self.op->write(ctx, self.response, self.op->response_element);
}

int put_fault(soap *ctx, const content &)
{
    return soap_fault_put(ctx);
}

int write_message(soap *ctx, const content &body)
{
    if (body.message != nullptr)
        return soap_send_bytes(ctx, body.message->data(), body.message->size());
    if (soap_envelope_out_begin(ctx) || soap_header_put(ctx) || soap_body_out_begin(ctx) ||
        body.put(ctx, body) || soap_body_out_end(ctx) || soap_envelope_out_end(ctx))
        return ctx->error;
    return 0;
}

// Resets what the request set in the context, so that it does not affect the answer.
void forget_request_framing(soap *ctx)
{
    ctx->error = SOAP_OK;
    ctx->encoding_style = nullptr;
    ctx->mode &= ~(MODE_DIME | MODE_MIME | MODE_MTOM);
    ctx->dime = {};
    ctx->mime = {};
}

// The head, neither chunked nor compressed; that of a stored message is written when its size is known.
int write_head(soap *ctx, std::uint64_t length)
{
    const std::uint32_t mode = ctx->mode;
    if ((mode & MODE_IO_MASK) == MODE_STORE)
        return 0;
    ctx->mode = (mode & ~(MODE_IO_MASK | MODE_DEFLATE)) | MODE_BUFFERED;
    if (ctx->on_response(ctx, ctx->status, length))
        return ctx->error;
    if ((mode & MODE_IO_MASK) == MODE_CHUNKED && soap_send_flush(ctx))
        return ctx->error;
    ctx->mode = mode;
    return 0;
}

int send_counted(soap *ctx, const content &body, enclosures *enclosed)
{
    if ((enclosed != nullptr && enclosed->attach_all(ctx)) || soap_count_begin(ctx))
        return ctx->error;
    if ((ctx->mode & MODE_COUNTING) && write_message(ctx, body))
        return ctx->error;
    if (soap_count_end(ctx))
        return ctx->error;
    const std::uint64_t length = soap_message_length(ctx);
    if (soap_send_begin(ctx) || write_head(ctx, length) || write_message(ctx, body))
        return ctx->error;
    return soap_send_finish(ctx);
}

int send_message(soap *ctx, int http_status, const content &body, enclosures *enclosed)
{
    forget_request_framing(ctx);
    ctx->status = http_status;
    const std::uint32_t output_mode = ctx->output_mode;
    if (enclosed != nullptr)
        ctx->output_mode |= enclosed->answer_form();
    const int result = send_counted(ctx, body, enclosed);
    ctx->output_mode = output_mode;
    return result;
}

} // namespace

int send_response(soap *ctx, const operation &op, const void *response, enclosures &enclosed)
{
    return send_message(ctx, OK, {put_response, &op, response}, &enclosed);
}

int send_recorded(soap *ctx, const recorded_answer &answer)
{
    if (answer.body.empty()) // no chunk can hold that
        ctx->output_mode = (ctx->output_mode & ~MODE_IO_MASK) | MODE_BUFFERED;
    return send_message(ctx, answer.status, {nullptr, nullptr, nullptr, &answer.body}, nullptr);
}

int send_fault(soap *ctx, int http_status)
{
    return send_message(ctx, http_status, {put_fault}, nullptr);
}

int send_file(soap *ctx, const char *type, const std::string &bytes)
{
    std::size_t sent = 0;
    return send_file(ctx, type, bytes.size(), [&](char *buffer, std::size_t length) {
        const std::size_t part = bytes.copy(buffer, length, sent);
        sent += part;
        return part;
    });
}

int send_file(soap *ctx, const char *type, std::uint64_t size,
              const std::function<std::size_t(char *buffer, std::size_t length)> &read)
{
    forget_request_framing(ctx);
    const std::uint32_t output_mode = ctx->output_mode;
    ctx->output_mode = (output_mode & ~MODE_IO_MASK) | MODE_BUFFERED;
    ctx->status = STATUS_FILE;
    ctx->http_content = type;
    int result = soap_send_begin(ctx);
    if (result == 0)
        result = ctx->on_response(ctx, size == 0 ? OK : STATUS_FILE, size);
    char piece[FILE_PIECE];
    for (std::uint64_t left = size; result == 0 && left != 0;) {
        const std::size_t length =
            read(piece, static_cast<std::size_t>(std::min<std::uint64_t>(left, sizeof piece)));
        result = length != 0 ? soap_send_bytes(ctx, piece, length) : static_cast<int>(SOAP_EOF);
        left -= length;
    }
    if (result == 0)
        result = soap_send_finish(ctx);
    ctx->output_mode = output_mode;
    return ctx->error = result != 0 ? result : static_cast<int>(SOAP_STOP);
}

void settle_version(soap *ctx)
{
    if (ctx->soap_version != 0)
        return;
    soap_namespace_table_drop(ctx);
    soap_namespace_table_copy(ctx); // takes the version of the table's own envelope namespace
}

int fault_from_refusal(soap *ctx, const refusal &refused)
{
    settle_version(ctx);
    const bool is_client_fault = refused.is_client_fault();
    ctx->fault = nullptr;
    const char *const text = text_of(refused.fault->description).c_str();
    if (is_client_fault)
        soap_fault_sender(ctx, text, nullptr, SOAP_FAULT);
    else
        soap_fault_receiver(ctx, text, nullptr, SOAP_FAULT);
    soap_fault_detail_field(ctx); // makes the detail record
    if (ctx->fault == nullptr)
        return INTERNAL_ERROR;
    SOAP_ENV__Detail *const detail = ctx->soap_version == 1 ? ctx->fault->detail : ctx->fault->Detail;
    if (detail != nullptr)
        refused.place(*detail, refused.fault);
    return is_client_fault && ctx->soap_version == 2 ? BAD_REQUEST : INTERNAL_ERROR;
}

} // namespace service
