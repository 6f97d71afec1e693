// attachment_stream.cpp - see attachment_stream.h.
#include "codec/attachment_stream.h"

#include <algorithm>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_io.h>

std::size_t attachment_stream::next(soap *ctx, char *data, std::size_t most) const
{
    const std::size_t length = read == nullptr ? 0 : read(ctx, handle, data, most);
    if (ctx->error != SOAP_OK)
        return 0;
    return std::min(length, most);
}

int attachment_stream::read_full(soap *ctx, char (&data)[ATTACHMENT_PIECE], std::size_t &length) const
{
    length = 0;
    while (length < sizeof data) {
        const std::size_t part = next(ctx, data + length, sizeof data - length);
        if (part == 0)
            break;
        length += part;
    }
    return ctx->error;
}

int attachment_stream::copy(soap *ctx, std::size_t size) const
{
    char data[ATTACHMENT_PIECE];
    while (size > 0) {
        const std::size_t part = next(ctx, data, std::min(size, sizeof data));
        if (part == 0)
            return ctx->error = ctx->error == SOAP_OK ? SOAP_EOF : ctx->error;
        if (soap_send_bytes(ctx, data, part) != SOAP_OK)
            return ctx->error;
        size -= part;
    }
    return SOAP_OK;
}

int attachment_stream::copy_to_end(soap *ctx) const
{
    char data[ATTACHMENT_PIECE];
    for (;;) {
        const std::size_t part = next(ctx, data, sizeof data);
        if (part == 0)
            return ctx->error;
        if (soap_send_bytes(ctx, data, part) != SOAP_OK)
            return ctx->error;
    }
}

void attachment_stream::end(soap *ctx) const
{
    if (close != nullptr)
        close(ctx, handle);
}
