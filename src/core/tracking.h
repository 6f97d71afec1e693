// tracking.h - the table of tracked allocations, as the rest of memory sees it.
//
// Always: an address has at most one entry. A live entry is a block in use; a dead one remembers a freed
// block, so that a second free of it can be named. A bounded number of dead entries is kept.
#pragma once

#include <zuv_client_pro/soap.h>

#include "core/idle_list.h"
#include "core/record_pool.h"

struct soap_track_entry {
    soap_track_entry *next; // in its chain, or among the idle entries of the pool
    void *address;
    const char *source_file; // borrowed
    std::int32_t source_line;
    std::uint32_t life; // live: what the block counts in soap::memory_held, in units of ALLOCATION_UNIT, and
                        // TRACK_SECRET; dead: TRACK_DEAD and its place in soap_memory_pools::dead; of a
                        // block that waits for its next use: TRACK_IDLE
};

constexpr std::uint32_t TRACK_DEAD = 0x80000000;
constexpr std::uint32_t TRACK_SECRET = 0x40000000; // a managed block of it is wiped when it is freed
constexpr std::uint32_t TRACK_IDLE = TRACK_DEAD | (TRACK_DEAD - 1); // freed as far as its owner knows
constexpr std::size_t TRACK_DEAD_MAX = 4096;                        // freed blocks that a context remembers

inline bool track_is_live(const soap_track_entry *entry)
{
    return (entry->life & TRACK_DEAD) == 0;
}
inline bool track_is_secret(const soap_track_entry *entry)
{
    return track_is_live(entry) && (entry->life & TRACK_SECRET) != 0;
}

// Made at the first allocation, gone with soap_engine_done.
struct soap_memory_pools {
    record_pool<soap_track_entry> entries;
    record_pool<soap_instance> instances;
    idle_pool idle;
    char *spare_text = nullptr;      // area for the growing text; a tracked block
    std::size_t spare_text_size = 0; // bytes
    std::size_t entry_count = 0;     // entries in the chains, live and dead
    std::size_t dead_next = 0;       // the slot that the next freed block takes
    soap_track_entry *dead[TRACK_DEAD_MAX] =
        {}; // a ring in order of freeing; null where an address came back into use
};

// The context's pools, made now if need be; null if memory runs out.
soap_memory_pools *memory_pools_make(soap *ctx);
inline soap_memory_pools *memory_pools(soap *ctx)
{
    return ctx->pools != nullptr ? ctx->pools : memory_pools_make(ctx);
}

// Sets the table to the one inside the context, with no entries.
void track_table_clear(soap *ctx);

// Allocates and enters a block; null if memory runs out.
soap_track_entry *track_alloc(soap *ctx, const char *source_file, int source_line, std::size_t size);

// Ends an entry that the caller knows to be live: the block is freed, or with track_forget left to someone else
// else.
void track_free(soap *ctx, soap_track_entry *entry);
void track_forget(soap *ctx, soap_track_entry *entry);

// The block of a live entry waits for its next use, and is there again, with `size` bytes as before; or goes
// back to malloc with its entry.
void track_rest(soap *ctx, soap_track_entry *entry);
void track_wake(soap *ctx, soap_track_entry *entry, std::size_t size);
void track_free_resting(soap *ctx, soap_track_entry *entry);

// Makes the live block that starts at `address` a secret. Other addresses, such as a text of the host's, are
// ignored.
void track_secret(soap *ctx, const void *address);

// Moves a live entry to the table of another context, whose pool must have an idle entry; returns the new
// one.
soap_track_entry *track_move(soap *source, soap *target, soap_track_entry *entry);

// Names each live entry on standard error, then frees all entries, the pools and the table. Blocks stay
// allocated.
void track_end(soap *ctx);
