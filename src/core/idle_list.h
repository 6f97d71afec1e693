// idle_list.h - lists of released objects and blocks that wait for the next message, as a context keeps them.
//
// Elsewhere: what waits and how long (instance_pool.h).
#pragma once

#include <cstddef>
#include <cstdint>

#include <zuv_client_pro/soap.h>

constexpr int IDLE_TYPES = 1024;             // objects of higher type ids are not kept
constexpr std::size_t IDLE_BLOCK_SPANS = 64; // blocks of up to 8 times as many bytes are kept
constexpr std::uint32_t RELEASES_TO_THIN = 64;
constexpr std::uint32_t RELEASED_TO_MERGE = 2048; // records of a large message
constexpr std::uint32_t IDLE_MANY = 2048;         // records: more than the near caches of a processor hold

// The records of one kind, newest first.
template <class Record> struct idle_list {
    Record *first = nullptr;
    std::uint32_t count = 0;
    std::uint32_t least = 0; // fewest since the pool was last thinned out
    std::uint32_t usual = 0; // after the last release of a message that wasn't large

    void push(Record *record, bool large)
    {
        record->next = first;
        first = record;
        ++count;
        if (!large)
            usual = count;
    }
    Record *pop()
    {
        Record *record = first;
        first = record->next;
        if (--count < least)
            least = count;
        return record;
    }
    // Takes half of those unused lately, the oldest ones, out of the list: linked by next.
    Record *thin()
    {
        std::uint32_t keep = count - (least + 1) / 2;
        Record **link = &first;
        for (std::uint32_t i = 0; i < keep; ++i)
            link = &(*link)->next;
        Record *cut = *link;
        *link = nullptr;
        count = least = usual = keep;
        return cut;
    }
};

// The lists of a context; in soap_memory_pools.
struct idle_pool {
    idle_list<soap_instance> objects[IDLE_TYPES];           // by type id; idle in array_size: their bytes
    idle_list<soap_block_trailer> blocks[IDLE_BLOCK_SPANS]; // by span
    std::size_t bytes = 0;                                  // of all that waits
    std::size_t bytes_max = 0;                              // that the release under way may leave
    std::uint64_t used[IDLE_TYPES / 64] = {}; // bit n of word m: objects[64 * m + n] has been used
    std::uint32_t releases = 0;               // of all objects, since the pool was last thinned out
    bool large = false;                       // the message that is released holds more than pool_limit
};

// True if so many more bytes may wait.
inline bool idle_has_bytes(const idle_pool &idle, std::size_t bytes)
{
    return bytes <= idle.bytes_max && idle.bytes <= idle.bytes_max - bytes;
}

// True if one more record that holds so many bytes may wait.
template <class Record>
bool idle_has_space(const idle_pool &idle, const idle_list<Record> &list, std::size_t bytes)
{
    return idle_has_bytes(idle, bytes) && (!idle.large || list.count < list.usual);
}
