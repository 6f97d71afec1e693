// data_port.cpp - see data_port.h.
#include "data_port.h"

#include <algorithm>
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
#include "data_files.h"

namespace service {

namespace {

constexpr int BAD_REQUEST = 400, NOT_FOUND = 404;
constexpr char MEDIA_TYPE[] = "application/octet-stream";

bool keep(store &documents, std::string_view name, arriving_file &file)
{
    store::writing transaction(documents);
    if (!documents.note_data(name, file.size()))
        return false;
    file.keep_as(name);
    transaction.commit();
    return true;
}

} // namespace

bool read_body(soap *ctx, const std::function<void(const char *data, std::size_t length)> &take)
{
    const bool length_known =
        ctx->content_length_given && (ctx->mode & MODE_IO_MASK) != MODE_CHUNKED && ctx->zlib_in == 0;
    std::uint64_t left = length_known ? ctx->content_length : std::numeric_limits<std::uint64_t>::max();
    if (ctx->look_ahead > 0) {
        const char first = static_cast<char>(std::exchange(ctx->look_ahead, 0));
        take(&first, 1);
        --left;
    }
    while (left != 0 && ctx->look_ahead == 0) {
        if (ctx->buffer_index >= ctx->buffer_length && soap_recv_more(ctx) != SOAP_OK)
            break;
        const std::size_t part =
            static_cast<std::size_t>(std::min<std::uint64_t>(left, ctx->buffer_length - ctx->buffer_index));
        take(ctx->buffer + ctx->buffer_index, part);
        ctx->buffer_index += part;
        left -= part;
    }
    return ctx->error == SOAP_OK && (!length_known || left == 0) && soap_receive_finish(ctx) == SOAP_OK &&
           (length_known || !ctx->response_unfinished);
}

int send_data(soap *ctx, store &documents, std::string_view name)
{
    if (name.starts_with(UPDATE_DATA)) {
        const update_record *const update = the_catalogue().find(name.substr(UPDATE_DATA.size()));
        return update == nullptr ? ctx->error = NOT_FOUND : send_file(ctx, MEDIA_TYPE, update_data(*update));
    }
    const std::optional<std::uint64_t> size = documents.data_size(name);
    if (!size)
        return ctx->error = NOT_FOUND;
    if (*size == 0)
        return send_file(ctx, MEDIA_TYPE, "");
    kept_file file(documents.data_directory(), name);
    return send_file(ctx, MEDIA_TYPE, file.size(),
                     [&file](char *buffer, std::size_t length) { return file.read(buffer, length); });
}

int receive_data(soap *ctx, store &documents, std::string_view name)
{
    if (!documents.data_size(name))
        return ctx->error = NOT_FOUND;
    arriving_file file(documents.data_directory());
    if (!read_body(ctx, [&file](const char *data, std::size_t length) { file.write(data, length); }))
        return ctx->error != SOAP_OK ? ctx->error : ctx->error = BAD_REQUEST;
    file.flush();
    if (!keep(documents, name, file))
        return ctx->error = NOT_FOUND;
    if (ctx->response_unfinished)
        ctx->keep_alive = 0;
    return http_method_default(ctx);
}

} // namespace service
