// tracking.cpp - tracked allocation: every block that the library allocates is in a hash table, so that leaks
// and double frees can be named with the place in the source where the block came from.
//
// Elsewhere: blocks that are released together (managed_blocks.cpp), records in slabs (record_pool.h).
// Always: one look-up costs a constant on average, however many blocks live; the table doubles with its load.
#include "core/tracking.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <new>

#include <zuv_client_pro/soap_memory.h>

#include "core/instance_pool.h"
#include "core/limits.h"

namespace {

constexpr std::size_t LOAD_MAX = 1; // entries for each chain before the table doubles
// Book-keeping of a block: its entry, and its part of the table.
constexpr std::size_t BOOK_UNITS =
    (sizeof(soap_track_entry) + 2 * sizeof(void *) + ALLOCATION_UNIT - 1) / ALLOCATION_UNIT;

std::int64_t bytes_held(const soap_track_entry *entry)
{
    return static_cast<std::int64_t>(entry->life & ~TRACK_SECRET) *
           static_cast<std::int64_t>(ALLOCATION_UNIT);
}

void set_live(soap *ctx, soap_track_entry *entry, std::size_t size)
{
    const std::size_t units = allocation_size(size) / ALLOCATION_UNIT + BOOK_UNITS;
    entry->life = static_cast<std::uint32_t>(std::min<std::size_t>(units, TRACK_SECRET - 1));
    ctx->memory_held += bytes_held(entry);
}

} // namespace

soap_memory_pools *memory_pools_make(soap *ctx)
{
    ctx->pools = new (std::nothrow) soap_memory_pools;
    return ctx->pools;
}

void track_table_clear(soap *ctx)
{
    for (soap_track_entry *&chain : ctx->track_table)
        chain = nullptr;
    ctx->track_chains = ctx->track_table;
    ctx->track_chain_mask = SOAP_TRACK_HASH_SIZE - 1;
    ctx->pools = nullptr;
}

namespace {

// Blocks of malloc lie at multiples of 16, so that only half of the first table's chains are used; in
// larger tables all are. Neighbours stay neighbours, which the caches like.
soap_track_entry **chain_of(soap *ctx, const void *address)
{
    const int shift = ctx->track_chain_mask < SOAP_TRACK_HASH_SIZE ? 3 : 4;
    return &ctx->track_chains[(reinterpret_cast<std::uintptr_t>(address) >> shift) & ctx->track_chain_mask];
}

soap_track_entry *find_entry(soap *ctx, const void *address)
{
    soap_track_entry *entry = *chain_of(ctx, address);
    while (entry != nullptr && entry->address != address)
        entry = entry->next;
    return entry;
}

void link_entry(soap *ctx, soap_track_entry *entry)
{
    soap_track_entry **chain = chain_of(ctx, entry->address);
    entry->next = *chain;
    *chain = entry;
}

void unlink_entry(soap *ctx, const soap_track_entry *entry)
{
    soap_track_entry **link = chain_of(ctx, entry->address);
    while (*link != entry)
        link = &(*link)->next;
    *link = entry->next;
}

// Takes an entry out of the table and back into the pool.
void drop_entry(soap *ctx, soap_track_entry *entry)
{
    unlink_entry(ctx, entry);
    ctx->pools->entries.give(entry);
    --ctx->pools->entry_count;
}

// Doubles the table. Without memory the old one serves on, only slower.
void grow_table(soap *ctx)
{
    const std::size_t old_count = ctx->track_chain_mask + 1;
    soap_track_entry **old_chains = ctx->track_chains;
    auto **chains = static_cast<soap_track_entry **>(std::calloc(old_count * 2, sizeof(soap_track_entry *)));
    if (chains == nullptr)
        return;
    ctx->track_chains = chains;
    ctx->track_chain_mask = old_count * 2 - 1;
    for (std::size_t i = 0; i < old_count; ++i) {
        while (old_chains[i] != nullptr) {
            soap_track_entry *entry = old_chains[i];
            old_chains[i] = entry->next;
            link_entry(ctx, entry);
        }
    }
    if (old_chains != ctx->track_table)
        std::free(old_chains);
}

// An entry in the chains for this address: the one that remembers a freed block there, or a new one.
soap_track_entry *entry_for(soap *ctx, void *address)
{
    soap_memory_pools *pools = ctx->pools;
    soap_track_entry *entry = find_entry(ctx, address);
    if (entry != nullptr) {
        if (entry->life == TRACK_IDLE)
            return nullptr; // malloc gives no block that it has given already
        if (!track_is_live(entry))
            pools->dead[entry->life - TRACK_DEAD] = nullptr;
        else // freed elsewhere
            ctx->memory_held -= bytes_held(entry);
        return entry;
    }
    entry = pools->entries.take();
    if (entry == nullptr)
        return nullptr;
    entry->address = address;
    link_entry(ctx, entry);
    if (++pools->entry_count > LOAD_MAX * (ctx->track_chain_mask + 1))
        grow_table(ctx);
    return entry;
}

soap_track_entry *enter(soap *ctx, const char *source_file, int source_line, void *address)
{
    soap_track_entry *entry = entry_for(ctx, address);
    if (entry != nullptr) {
        entry->source_file = source_file;
        entry->source_line = source_line;
    }
    return entry;
}

} // namespace

soap_track_entry *track_alloc(soap *ctx, const char *source_file, int source_line, std::size_t size)
{
    if (memory_pools(ctx) == nullptr)
        return nullptr;
    void *address = std::malloc(size);
    if (address == nullptr)
        return nullptr;
    soap_track_entry *entry = enter(ctx, source_file, source_line, address);
    if (entry == nullptr)
        std::free(address);
    else
        set_live(ctx, entry, size);
    return entry;
}

void track_forget(soap *ctx, soap_track_entry *entry)
{
    soap_memory_pools *pools = ctx->pools;
    soap_track_entry *&slot = pools->dead[pools->dead_next];
    if (slot != nullptr)
        drop_entry(ctx, slot);
    slot = entry;
    ctx->memory_held -= bytes_held(entry);
    entry->life = TRACK_DEAD | static_cast<std::uint32_t>(pools->dead_next);
    pools->dead_next = (pools->dead_next + 1) % TRACK_DEAD_MAX;
}

void track_free(soap *ctx, soap_track_entry *entry)
{
    void *address = entry->address;
    track_forget(ctx, entry);
    std::free(address);
}

void track_rest(soap *ctx, soap_track_entry *entry)
{
    ctx->memory_held -= bytes_held(entry);
    entry->life = TRACK_IDLE;
}

void track_wake(soap *ctx, soap_track_entry *entry, std::size_t size)
{
    set_live(ctx, entry, size);
}

void track_free_resting(soap *ctx, soap_track_entry *entry)
{
    void *address = entry->address;
    drop_entry(ctx, entry);
    std::free(address);
}

void track_secret(soap *ctx, const void *address)
{
    soap_track_entry *entry = find_entry(ctx, address);
    if (entry != nullptr && track_is_live(entry))
        entry->life |= TRACK_SECRET;
}

soap_track_entry *track_move(soap *source, soap *target, soap_track_entry *entry)
{
    soap_track_entry *moved = enter(target, entry->source_file, entry->source_line, entry->address);
    moved->life = entry->life;
    source->memory_held -= bytes_held(entry);
    target->memory_held += bytes_held(entry);
    drop_entry(source, entry);
    return moved;
}

void *tracked_malloc(soap *ctx, const char *source_file, int source_line, std::size_t size)
{
    if (ctx == nullptr)
        return std::malloc(size);
    const soap_track_entry *entry = track_alloc(ctx, source_file, source_line, size);
    return entry == nullptr ? nullptr : entry->address;
}

void tracked_free(soap *ctx, const char *source_file, int source_line, void *address)
{
    if (ctx == nullptr || address == nullptr) {
        std::free(address);
        return;
    }
    soap_track_entry *entry = find_entry(ctx, address);
    if (entry == nullptr)
        std::fprintf(stderr, "%s(%d): free(%p) pointer not malloced\n", source_file, source_line, address);
    else if (!track_is_live(entry))
        std::fprintf(stderr, "%s(%d): free(%p) double free of pointer malloced at %s(%d)\n", source_file,
                     source_line, address, entry->source_file, entry->source_line);
    else
        track_free(ctx, entry);
}

void track_end(soap *ctx)
{
    idle_drop(ctx);
    for (std::size_t i = 0; i <= ctx->track_chain_mask; ++i) {
        for (const soap_track_entry *entry = ctx->track_chains[i]; entry != nullptr; entry = entry->next) {
            if (track_is_live(entry))
                std::fprintf(stderr,
                             "%s(%d): malloc() = %p not freed (memory leak or forgot to call soap_end()?)\n",
                             entry->source_file, entry->source_line, entry->address);
        }
    }
    if (ctx->track_chains != ctx->track_table)
        std::free(ctx->track_chains);
    delete ctx->pools;
    track_table_clear(ctx);
}
