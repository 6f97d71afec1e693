// instance_pool.h - released objects and blocks that wait for the next message, so that a steady caller takes
// nothing from malloc.
//
// Here: what waits, its bound, their slow decay. Elsewhere: which objects can wait and how they are emptied
// (soap_upcalls::recycle), managed blocks (managed_blocks.cpp).
//
// Always: what waits is a single object or block of malloc of its own, as it was made, so that a host may
// take it out again and end it by the ordinary means. All that waits holds at most soap::pool_limit bytes and
// belongs to one context. A message that holds more than that gives the pool back what it took, and no more.
#pragma once

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstdint>

#include <zuv_client_pro/soap.h>

#include "core/limits.h"
#include "core/tracking.h"

// A place for empty texts, whose memory has gone to a text in a vector: no object has this type.
constexpr int IDLE_SHELLS = 0;

// Texts wait by the characters that they have space for: under 16, under 64 and so on by fours. Else those of a
// steady caller would all become as large as its longest one.
constexpr int IDLE_TEXTS = IDLE_TYPES - 8;
inline int idle_texts(std::size_t length)
{
    return length < 16
               ? IDLE_TEXTS
               : std::min(IDLE_TEXTS + static_cast<int>(std::bit_width(length) - 3) / 2, IDLE_TYPES - 1);
}

// Before objects or blocks are released: settles how much of them may wait. True if they are a large message's, of which most
// don't.
bool idle_release_begin(soap *ctx);
// After all objects were released.
void idle_release_end(soap *ctx);

// Has malloc merge the small blocks that it was given back. glibc merges them only when it is asked for a larger one, and then
// all: those of a large message would have left the processor's caches by then.
void merge_freed_blocks();

// Releases one record after another, until `release_next` finds no more. `large`: what idle_release_begin returned.
template <class ReleaseNext> void idle_release_each(bool large, ReleaseNext release_next)
{
    if (!large) {
        while (release_next()) {
        }
        return;
    }
    for (std::uint32_t released = 1; release_next(); ++released) {
        if (released % RELEASED_TO_MERGE == 0)
            merge_freed_blocks();
    }
}

// True if an object of the type that holds so many bytes may wait.
inline bool idle_has_space(const soap *ctx, int type_id, std::size_t bytes)
{
    return ctx->pools != nullptr &&
           idle_has_space(ctx->pools->idle, ctx->pools->idle.objects[type_id], bytes);
}

// Keeps an emptied object with those of its type, after idle_has_space gave true.
inline void idle_give(soap *ctx, int type_id, soap_instance *instance, std::size_t bytes)
{
    idle_pool &idle = ctx->pools->idle;
    const auto type = static_cast<unsigned>(type_id);
    instance->array_size = static_cast<std::int32_t>(bytes);
    idle.objects[type].push(instance, idle.large);
    idle.used[type / 64] |= std::uint64_t{1} << type % 64;
    idle.bytes += bytes;
}

// The object that was released last to the list of this type, or to one of texts; null if none waits. It is in
// no list of the context.
inline soap_instance *idle_take(soap *ctx, int type_id)
{
    soap_memory_pools *pools = ctx->pools; // NOLINT(clang-analyzer-core.NullDereference): no call lacks one
    if (pools == nullptr || pools->idle.objects[type_id].first == nullptr)
        return nullptr;
    idle_list<soap_instance> &list = pools->idle.objects[type_id];
    soap_instance *instance = list.pop();
    if (list.count > IDLE_MANY) { // the next one comes from memory while this one is filled
        __builtin_prefetch(list.first->object, 1);
        __builtin_prefetch(list.first->next, 1);
    }
    pools->idle.bytes -= static_cast<std::size_t>(instance->array_size);
    instance->array_size = -1;
    return instance;
}

// A record in no list, with undefined contents; null if memory runs out.
soap_instance *idle_record(soap *ctx);

// idle_take, and the object is entered in the context's list of instances.
inline soap_instance *instance_reuse(soap *ctx, int type_id)
{
    soap_instance *instance = idle_take(ctx, type_id);
    if (instance == nullptr)
        return nullptr;
    instance->next = ctx->instance_list;
    ctx->instance_list = instance;
    memory_charge(ctx, sizeof *instance);
    return instance;
}

// Destroys and frees all that waits.
void idle_drop(soap *ctx);

// In managed_blocks.cpp: the same for blocks alone, and half of those unused lately.
void idle_blocks_drop(soap *ctx);
void idle_blocks_thin(soap *ctx);
