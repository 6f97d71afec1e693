// growing_text.cpp - the context's one text of unbounded length: label_buffer, label_size, label_index.
//
// Always: the capacity starts at 256 and doubles, so appending costs a constant per byte; a failed growth
// leaves the text as it was. The area goes with soap_call_scratch_free; a
// small one waits, wiped, for the next message.
#include <cstring>
#include <utility>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>

#include "core/failure.h"
#include "core/memory.h"
#include "core/tracking.h"

namespace {

constexpr std::size_t CAPACITY_AT_START = 256; // bytes
constexpr std::size_t SPARE_TEXT_MAX = 4096;   // bytes of an area that waits for the next message

std::size_t capacity_for(const soap *ctx, std::size_t needed)
{
    std::size_t capacity = ctx->label_size == 0 ? CAPACITY_AT_START : ctx->label_size;
    while (capacity < needed)
        capacity = capacity > SIZE_MAX / 2 ? needed : capacity * 2;
    return capacity;
}

// The area of an earlier message becomes the text's first one if `needed` bytes fit it.
bool reuse_area(soap *ctx, std::size_t needed)
{
    if (ctx->label_buffer != nullptr || ctx->pools == nullptr || ctx->pools->spare_text_size < needed)
        return false;
    ctx->label_buffer = std::exchange(ctx->pools->spare_text, nullptr);
    ctx->label_size = std::exchange(ctx->pools->spare_text_size, 0);
    return true;
}

} // namespace

void growing_text_free(soap *ctx)
{
    ctx->label_index = 0;
    if (ctx->label_buffer == nullptr)
        return;
    soap_memory_pools *pools = ctx->pools;
    const std::size_t size = ctx->label_size;
    if (size != 0 && pools != nullptr && size > pools->spare_text_size && size <= SPARE_TEXT_MAX &&
        size <= ctx->pool_limit) {
        std::memset(ctx->label_buffer, 0, size);
        std::swap(ctx->label_buffer, pools->spare_text);
        pools->spare_text_size = size;
    }
    SOAP_FREE(ctx, ctx->label_buffer);
    ctx->label_buffer = nullptr;
    ctx->label_size = 0;
}

int soap_text_buffer_reserve(soap *ctx, std::size_t bytes)
{
    if (bytes > SIZE_MAX - ctx->label_index)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    const std::size_t needed = ctx->label_index + bytes;
    if (needed <= ctx->label_size || reuse_area(ctx, needed))
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
