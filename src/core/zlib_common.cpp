// zlib_common.cpp - see zlib_common.h.
#include "core/zlib_common.h"

#include "core/failure.h"

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>

int soap_zlib_prepare(soap *ctx)
{
    soap_zlib_drop(ctx);
    if (ctx->zlib_buffer == nullptr)
        ctx->zlib_buffer = static_cast<char *>(SOAP_MALLOC(ctx, SOAP_BUFFER_SIZE));
    if (ctx->zlib_stream == nullptr || ctx->zlib_buffer == nullptr)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    return SOAP_OK;
}

int soap_zlib_drop(soap *ctx)
{
    int result = Z_OK;
    if (ctx->zlib_state == ZLIB_DEFLATING)
        result = deflateEnd(ctx->zlib_stream);
    else if (ctx->zlib_state == ZLIB_INFLATING)
        result = inflateEnd(ctx->zlib_stream);
    ctx->zlib_state = ZLIB_IDLE;
    ctx->mode &= ~MODE_DEFLATE;
    return result;
}

int soap_zlib_fail(soap *ctx)
{
    if (ctx->zlib_stream != nullptr)
        ctx->zlib_stream->next_out = nullptr;
    return fail(ctx, SOAP_ZLIB_ERROR);
}
