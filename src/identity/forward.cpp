// forward.cpp - filling what waited for an id, and keeping it found when memory moves.
//
// Here: late resolution at the end of a message, places that still wait, moved addresses.
// Elsewhere: the id table and how places come to wait (identity_read.cpp).
//
// Always: addresses are filled first, as they need no object to be complete. A value is copied once no place
// within the object waits for a copy. That order comes from a list of waiting places sorted by address: an
// object watches the first place within it that waits, and looks on from there when that place is filled.

#include "core/failure.h"
#include "core/memory.h"
#include "identity/identity.h"

#include <algorithm>

#include <zuv_client_pro/soap_memory.h>

#include "core/limits.h"

namespace {

// --- records ---

// Calls visit(record) for each record, bucket after bucket, until it returns an error; returns that error.
template <class Visit> int for_each_record(soap *ctx, Visit visit)
{
    for (soap_id_record *record : ctx->id_table)
        for (; record != nullptr; record = record->next)
            if (const int error = visit(record))
                return error;
    return SOAP_OK;
}

void fill_link_chain(soap_id_record *record)
{
    for (void *place = record->link, *next = nullptr; place != nullptr; place = next) {
        next = load_place(place);
        store_place(place, record->ptr);
    }
    record->link = nullptr;
}

// Fills pointer places. An id without "#" stands for something outside the message: what waits for it stays
// null. So does what waits for an id that is missing, and all else is filled none the less.
int fill_addresses(soap *ctx)
{
    int error = SOAP_OK;
    for_each_record(ctx, [ctx, &error](soap_id_record *record) {
        if (record->ptr != nullptr)
            fill_link_chain(record);
        else
            clear_place_chain(&record->link);
        if (record->ptr == nullptr && record->id[0] == '#' && error == SOAP_OK)
            error = id_failure(ctx, record->id + 1, SOAP_MISSING_ID);
        return static_cast<int>(SOAP_OK);
    });
    return error;
}

// --- forward records ---

int run_hook(soap *ctx, const soap_id_record *record, const soap_forward_record *forward, const void *source,
             std::size_t available)
{
    const bool bytes = forward->hook == soap_copy_bytes;
    const std::size_t size = bytes ? std::min(forward->size, available) : record->size;
    if (bytes && copy_charge(ctx, size) != SOAP_OK)
        return ctx->error;
    const int error_before = ctx->error;
    ctx->error = SOAP_OK;
    forward->hook(ctx, record->type, forward->type, forward->place, forward->length, source, size);
    const int error = ctx->error;
    if (error == SOAP_OK)
        ctx->error = error_before;
    return error;
}

// Hands the place the object's address through as many cells as it asks for. The place takes over what the
// outermost cell holds, so that one need not outlive the call.
int forward_address(soap *ctx, const soap_id_record *record, const soap_forward_record *forward)
{
    const void *target = record->ptr;
    for (unsigned level = record->level + 1; level < forward->level; level++) {
        void *cell = soap_block_alloc(ctx, sizeof(void *));
        if (cell == nullptr)
            return fail(ctx, SOAP_OUT_OF_MEMORY);
        store_place(cell, target);
        target = cell;
    }
    return run_hook(ctx, record, forward, &target, sizeof target);
}

bool wants_address(const soap_id_record *record, const soap_forward_record *forward)
{
    return forward->level > record->level;
}

// Serves the forward records that take an address; those that take a copy stay on the list.
int forward_addresses(soap *ctx)
{
    return for_each_record(ctx, [ctx](soap_id_record *record) {
        soap_forward_record **link = &record->forward;
        while (soap_forward_record *forward = record->ptr != nullptr ? *link : nullptr) {
            if (!wants_address(record, forward)) {
                link = &forward->next;
                continue;
            }
            *link = forward->next;
            if (const int error = forward_address(ctx, record, forward))
                return error;
        }
        return static_cast<int>(SOAP_OK);
    });
}

// --- copies in the order of their dependence ---

// A place that waits for a copy.
struct waiting_place {
    std::uintptr_t address;
    std::size_t copies;       // still to come
    std::size_t next;         // itself while it waits, else one nearer to the next that does
    soap_id_record *watchers; // objects that look at this place, linked by next_held
};

class copy_order {
public:
    explicit copy_order(soap *context) : ctx(context) {}
    copy_order(const copy_order &) = delete;
    copy_order &operator=(const copy_order &) = delete;
    ~copy_order() { SOAP_FREE(ctx, places); }

    // Fills every place that can be filled. 0 or an error.
    int run()
    {
        std::size_t total = 0;
        each_place([&total](const void *) { total++; });
        if (total == 0)
            return SOAP_OK;
        places = static_cast<waiting_place *>(SOAP_MALLOC(ctx, (total + 1) * sizeof *places));
        if (places == nullptr)
            return fail(ctx, SOAP_OUT_OF_MEMORY);
        sort_places();
        for_each_record(ctx, [this](soap_id_record *record) {
            if (waits_on(record))
                watch(record, first_at(record->ptr));
            return static_cast<int>(SOAP_OK);
        });
        while (ready != nullptr)
            if (const int error = serve(take_ready()))
                return error;
        return SOAP_OK;
    }

private:
    soap *ctx;
    waiting_place *places = nullptr; // sorted by address, each address once, with a sentinel after the last
    std::size_t count = 0;
    soap_id_record *ready = nullptr; // a queue, linked by next_held
    soap_id_record **ready_end = &ready;

    static bool waits_on(const soap_id_record *record)
    {
        return record->ptr != nullptr && (record->copy != nullptr || record->forward != nullptr);
    }

    template <class Visit> void each_place(Visit visit)
    {
        for_each_record(ctx, [&visit](const soap_id_record *record) {
            if (!waits_on(record))
                return static_cast<int>(SOAP_OK);
            for (const void *place = record->copy; place != nullptr; place = load_place(place))
                visit(place);
            for (const soap_forward_record *forward = record->forward; forward != nullptr;
                 forward = forward->next)
                visit(forward->place);
            return static_cast<int>(SOAP_OK);
        });
    }

    void sort_places()
    {
        std::size_t filled = 0;
        each_place([&](const void *place) {
            places[filled++] = {reinterpret_cast<std::uintptr_t>(place), 1, 0, nullptr};
        });
        std::sort(places, places + filled, [](const waiting_place &one, const waiting_place &other) {
            return one.address < other.address;
        });
        for (std::size_t i = 0; i < filled; i++) {
            if (count > 0 && places[count - 1].address == places[i].address) {
                places[count - 1].copies++;
                continue;
            }
            places[count] = places[i];
            places[count].next = count;
            count++;
        }
        places[count] = {UINTPTR_MAX, 1, count, nullptr};
    }

    std::size_t position(const void *address) const
    {
        const waiting_place *found = std::lower_bound(
            places, places + count, reinterpret_cast<std::uintptr_t>(address),
            [](const waiting_place &place, std::uintptr_t wanted) { return place.address < wanted; });
        return static_cast<std::size_t>(found - places);
    }

    // The first place from `index` on that still waits; `count` if none does.
    std::size_t waiting_from(std::size_t index)
    {
        while (places[index].next != index) {
            places[index].next = places[places[index].next].next;
            index = places[index].next;
        }
        return index;
    }

    std::size_t first_at(const void *address) { return waiting_from(position(address)); }

    // Puts an object on watch at the place with this index, or in the queue if that lies after the object.
    void watch(soap_id_record *record, std::size_t index)
    {
        const auto start = reinterpret_cast<std::uintptr_t>(record->ptr);
        if (index < count && places[index].address - start < record->size) {
            record->next_held = places[index].watchers;
            places[index].watchers = record;
            return;
        }
        record->next_held = nullptr;
        *ready_end = record;
        ready_end = &record->next_held;
    }

    soap_id_record *take_ready()
    {
        soap_id_record *record = ready;
        ready = record->next_held;
        if (ready == nullptr)
            ready_end = &ready;
        return record;
    }

    void filled(const void *place)
    {
        const std::size_t index = position(place);
        if (--places[index].copies > 0)
            return;
        places[index].next = index + 1;
        soap_id_record *watcher = places[index].watchers;
        places[index].watchers = nullptr;
        while (watcher != nullptr) {
            soap_id_record *const next = watcher->next_held;
            watch(watcher, waiting_from(index));
            watcher = next;
        }
    }

    int serve(soap_id_record *record)
    {
        for (void *place = record->copy, *next = nullptr; place != nullptr; place = next) {
            next = load_place(place);
            if (copy_charge(ctx, record->size) != SOAP_OK)
                return ctx->error;
            std::memmove(place, record->ptr, record->size);
            filled(place);
        }
        record->copy = nullptr;
        while (const soap_forward_record *forward = record->forward) {
            record->forward = forward->next;
            if (const int error = run_hook(ctx, record, forward, record->ptr, record->size))
                return error;
            filled(forward->place);
        }
        return SOAP_OK;
    }
};

int copy_values(soap *ctx)
{
    copy_order order(ctx);
    return order.run();
}

// What can't be filled is left empty, and no place keeps the address of another.
void clear_what_waits(soap *ctx)
{
    for_each_record(ctx, [](soap_id_record *record) {
        clear_place_chain(&record->link);
        clear_place_chain(&record->copy);
        record->forward = nullptr;
        return static_cast<int>(SOAP_OK);
    });
}

// --- moved memory ---

struct move_range {
    const void *start, *end;
    std::uintptr_t distance; // modulo the address space

    template <class Target> Target *moved(Target *address) const
    {
        if (!within(address, start, end))
            return address;
        // NOLINTNEXTLINE(performance-no-int-to-ptr): from one object into another, which no pointer sum may
        return reinterpret_cast<Target *>(reinterpret_cast<std::uintptr_t>(address) + distance);
    }
};

// Corrects a chain. A place that moves is written where it was and where it goes, so that it does not matter
// which of both the caller copies from and when.
void move_chain(void **head, const move_range &range)
{
    void *place = *head;
    *head = range.moved(place);
    while (place != nullptr) {
        void *next = load_place(place);
        store_place(place, range.moved(next));
        store_place(range.moved(place), range.moved(next));
        place = next;
    }
}

bool chain_waits_within(const void *place, const void *start, const void *end)
{
    while (place != nullptr && !within(place, start, end))
        place = load_place(place);
    return place != nullptr;
}

} // namespace

void soap_copy_bytes(soap *, int, int, void *place, std::size_t, const void *source, std::size_t size)
{
    std::memmove(place, source, size);
}

int soap_forward_resolve(soap *ctx)
{
    if (ctx->id_count == 0)
        return SOAP_OK;
    int error = fill_addresses(ctx);
    if (error == SOAP_OK)
        error = forward_addresses(ctx);
    if (error == SOAP_OK)
        error = copy_values(ctx);
    clear_what_waits(ctx);
    return error;
}

int soap_forward_has_pending(soap *ctx, const void *start, const void *end)
{
    if (ctx->id_count == 0)
        return 0;
    return for_each_record(ctx, [start, end](const soap_id_record *record) {
        if (chain_waits_within(record->link, start, end) || chain_waits_within(record->copy, start, end))
            return -1;
        const soap_forward_record *forward = record->forward;
        while (forward != nullptr && !within(forward->place, start, end))
            forward = forward->next;
        return forward != nullptr ? -1 : 0;
    });
}

// NOLINTNEXTLINE(readability-non-const-parameter): objects at the new address are written
void soap_forward_relocate(soap *ctx, const void *start, const void *end, char *new_address,
                           const char *old_address)
{
    const move_range range = {start, end,
                              reinterpret_cast<std::uintptr_t>(new_address) -
                                  reinterpret_cast<std::uintptr_t>(old_address)};
    if (ctx->id_count > 0)
        for_each_record(ctx, [&range](soap_id_record *record) {
            record->ptr = range.moved(record->ptr);
            move_chain(&record->link, range);
            move_chain(&record->copy, range);
            for (soap_forward_record *forward = record->forward; forward != nullptr; forward = forward->next)
                forward->place = range.moved(forward->place);
            return static_cast<int>(SOAP_OK);
        });
    for (soap_attachment_ref *reference = ctx->mtom_list; reference != nullptr; reference = reference->next) {
        reference->content = range.moved(reference->content);
        reference->size = range.moved(reference->size);
        reference->type = range.moved(reference->type);
        reference->options = range.moved(reference->options);
    }
}

void *soap_block_stack_save(soap *ctx, soap_block_stack *stack, void *target, int fix_references)
{
    return block_stack_gather(ctx, stack, target, fix_references != 0 ? soap_forward_relocate : nullptr);
}
