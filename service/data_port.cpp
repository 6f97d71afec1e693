// data_port.cpp - see data_port.h.
#include "data_port.h"

#include <algorithm>
#include <cstdio>
#include <limits>
#include <optional>
#include <string>
#include <utility>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>

#include "answer.h"
#include "attachments.h"
#include "catalogue.h"

namespace service {

namespace {

constexpr int BAD_REQUEST = 400, NOT_FOUND = 404;

std::optional<std::string> find_data(store &documents, std::string_view name)
{
    if (!name.starts_with(UPDATE_DATA))
        return documents.find_data(name);
    const update_record *const update = the_catalogue().find(name.substr(UPDATE_DATA.size()));
    return update == nullptr ? std::nullopt : std::optional(update_data(*update));
}

// The body, framing and compression undone. False if less came than was announced; the size is reception's to
// limit.
bool read_body(soap *ctx, std::string &bytes)
{
    const bool length_known =
        ctx->content_length_given && (ctx->mode & MODE_IO_MASK) != MODE_CHUNKED && ctx->zlib_in == 0;
    std::uint64_t left = length_known ? ctx->content_length : std::numeric_limits<std::uint64_t>::max();
    if (ctx->look_ahead > 0)
        bytes.push_back(static_cast<char>(std::exchange(ctx->look_ahead, 0)));
    while (bytes.size() < left && ctx->look_ahead == 0) {
        if (ctx->buffer_index >= ctx->buffer_length && soap_recv_more(ctx) != SOAP_OK)
            break;
        const std::size_t taken = static_cast<std::size_t>(
            std::min<std::uint64_t>(left - bytes.size(), ctx->buffer_length - ctx->buffer_index));
        bytes.append(ctx->buffer + ctx->buffer_index, taken);
        ctx->buffer_index += taken;
    }
    return ctx->error == SOAP_OK && (!length_known || bytes.size() == left) &&
           soap_receive_finish(ctx) == SOAP_OK && (length_known || !ctx->response_unfinished);
}

bool keep(store &documents, std::string_view name, const std::string &bytes)
{
    store::writing transaction(documents);
    const bool known = documents.keep_data(name, bytes);
    transaction.commit();
    return known;
}

} // namespace

int send_data(soap *ctx, store &documents, std::string_view name)
{
    const std::optional<std::string> data = find_data(documents, name);
    if (!data)
        return ctx->error = NOT_FOUND;
    return send_file(ctx, "application/octet-stream", *data);
}

int receive_data(soap *ctx, store &documents, std::string_view name)
{
    std::string bytes;
    if (!read_body(ctx, bytes))
        return ctx->error != SOAP_OK ? ctx->error : ctx->error = BAD_REQUEST;
    if (!keep(documents, name, bytes))
        return ctx->error = NOT_FOUND;
    if (ctx->response_unfinished)
        ctx->keep_alive = 0;
    return http_method_default(ctx);
}

} // namespace service
