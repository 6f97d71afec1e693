// record_pool.h - small records handed out from slabs and taken back for reuse.
//
// A pool never shrinks before its end, so its size follows the largest number of records in use at one time
// and not the number of calls made. Records must have a member `next` of their own pointer type, which links
// the idle ones.
#pragma once

#include <cstddef>
#include <cstdlib>

template <class Record> class record_pool {
public:
    record_pool() = default;
    record_pool(const record_pool &) = delete;
    record_pool &operator=(const record_pool &) = delete;
    ~record_pool()
    {
        while (slabs != nullptr) {
            slab *gone = slabs;
            slabs = gone->next;
            std::free(gone);
        }
    }

    // An idle record with undefined contents; null if memory runs out, which can't be while holds_idle().
    Record *take()
    {
        if (idle == nullptr && !add_slab())
            return nullptr;
        Record *record = idle;
        idle = record->next;
        --idle_count;
        return record;
    }

    void give(Record *record)
    {
        record->next = idle;
        idle = record;
        ++idle_count;
    }

    bool holds_idle() const { return idle != nullptr; }

    // Makes sure that the next `count` takes succeed. False if memory runs out.
    bool reserve(std::size_t count)
    {
        while (idle_count < count) {
            if (!add_slab())
                return false;
        }
        return true;
    }

private:
    static constexpr std::size_t SLAB_RECORDS = 8176 / sizeof(Record); // a slab is a little less than 8 KB
    struct slab {
        slab *next;
        Record records[SLAB_RECORDS];
    };

    bool add_slab()
    {
        auto *fresh = static_cast<slab *>(std::malloc(sizeof(slab)));
        if (fresh == nullptr)
            return false;
        fresh->next = slabs;
        slabs = fresh;
        for (std::size_t i = SLAB_RECORDS; i > 0; --i)
            give(&fresh->records[i - 1]);
        return true;
    }

    slab *slabs = nullptr;
    Record *idle = nullptr;
    std::size_t idle_count = 0;
};
