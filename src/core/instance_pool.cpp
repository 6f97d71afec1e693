// instance_pool.cpp - see instance_pool.h.
#include "core/instance_pool.h"

#include <algorithm>
#include <iterator>
#include <new>

#include <zuv_client_pro/soap_memory.h>

#include "core/failure.h"
#include "core/limits.h"
#include "core/tracking.h"

namespace {

void destroy_idle(soap *ctx, soap_instance *instance)
{
    ctx->pools->idle.bytes -= static_cast<std::size_t>(instance->array_size);
    instance->array_size = -1;
    instance->delete_hook(instance);
    ctx->pools->instances.give(instance);
}

void destroy_list(soap *ctx, soap_instance *first)
{
    while (first != nullptr) {
        soap_instance *instance = first;
        first = instance->next;
        destroy_idle(ctx, instance);
    }
}

void thin_out(soap *ctx)
{
    idle_pool &idle = ctx->pools->idle;
    for (std::size_t word = 0; word < std::size(idle.used); ++word) {
        for (std::uint64_t left = idle.used[word]; left != 0; left &= left - 1) {
            const auto bit = static_cast<std::size_t>(__builtin_ctzll(left));
            destroy_list(ctx, idle.objects[64 * word + bit].thin());
        }
    }
    idle_blocks_thin(ctx);
}

} // namespace

bool idle_release_begin(soap *ctx)
{
    if (ctx->pools == nullptr)
        return false;
    idle_pool &idle = ctx->pools->idle;
    if (idle.bytes > ctx->pool_limit)
        idle_drop(ctx);
    idle.large = ctx->memory_held > 0 && static_cast<std::uint64_t>(ctx->memory_held) > ctx->pool_limit;
    idle.bytes_max = static_cast<std::size_t>(std::min<std::uint64_t>(ctx->pool_limit, INT32_MAX));
    return idle.large;
}

void merge_freed_blocks()
{
    constexpr std::size_t LARGER = 4096;                         // bytes
    void *volatile block = ::operator new(LARGER, std::nothrow); // volatile, or the two would be left out
    ::operator delete(block);
}

void idle_release_end(soap *ctx)
{
    if (ctx->pools == nullptr || ++ctx->pools->idle.releases < RELEASES_TO_THIN)
        return;
    ctx->pools->idle.releases = 0;
    thin_out(ctx);
}

soap_instance *idle_record(soap *ctx)
{
    soap_memory_pools *pools = memory_pools(ctx);
    return pools != nullptr ? pools->instances.take() : nullptr;
}

void idle_drop(soap *ctx)
{
    if (ctx->pools == nullptr)
        return;
    for (idle_list<soap_instance> &list : ctx->pools->idle.objects) {
        soap_instance *first = list.first;
        list = {};
        destroy_list(ctx, first);
    }
    idle_blocks_drop(ctx);
    SOAP_FREE(ctx, ctx->pools->spare_text);
    ctx->pools->spare_text = nullptr;
    ctx->pools->spare_text_size = 0;
}
