// growing_text.cpp - the context's one text of unbounded length: label_buffer, label_size, label_index.
//
// Always: the capacity starts at 256 and doubles, so appending costs a constant per byte; a failed growth
// leaves the text as it was. The area goes with soap_call_scratch_free.
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>

#include "core/failure.h"

static constexpr std::size_t CAPACITY_AT_START = 256; // bytes

static std::size_t capacity_for(const soap *ctx, std::size_t needed)
{
    std::size_t capacity = ctx->label_size == 0 ? CAPACITY_AT_START : ctx->label_size;
    while (capacity < needed)
        capacity = capacity > SIZE_MAX / 2 ? needed : capacity * 2;
    return capacity;
}

int soap_text_buffer_reserve(soap *ctx, std::size_t bytes)
{
    if (bytes > SIZE_MAX - ctx->label_index)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    const std::size_t needed = ctx->label_index + bytes;
    if (needed <= ctx->label_size)
        return SOAP_OK;
    const std::size_t capacity = capacity_for(ctx, needed);
    auto *area = static_cast<char *>(SOAP_MALLOC(ctx, capacity));
    if (area == nullptr)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    if (ctx->label_index > 0)
        std::memcpy(area, ctx->label_buffer, ctx->label_index);
    SOAP_FREE(ctx, ctx->label_buffer);
    ctx->label_buffer = area;
    ctx->label_size = capacity;
    return SOAP_OK;
}

int soap_text_buffer_put(soap *ctx, const char *text, std::size_t length)
{
    if (length == 0)
        return SOAP_OK;
    if (soap_text_buffer_reserve(ctx, length) != SOAP_OK)
        return ctx->error;
    std::memcpy(ctx->label_buffer + ctx->label_index, text, length);
    ctx->label_index += length;
    return SOAP_OK;
}

int soap_text_buffer_reset_put(soap *ctx, const char *text, std::size_t length)
{
    ctx->label_index = 0;
    return soap_text_buffer_put(ctx, text, length);
}
