// identity_read.cpp - the id table: objects that have an id, and the places that wait for one.
//
// Here: the table, registering an object, entering references. Elsewhere: filling the places (forward.cpp).
//
// Always: what waits for an id agrees with it in type. Records and forward records come from blocks that the
// reset frees as a whole. Past a few thousand ids a keyed index finds them, so that texts chosen to collide
// cost no more than others.

#include "core/failure.h"
#include "identity/identity.h"

#include <bit>
#include <ctime>
#include <sys/random.h>

#include <zuv_client_pro/soap_memory.h>

namespace {

constexpr std::size_t STORE_BLOCK_SIZE = 8192; // bytes; longer records get a block of their own
constexpr std::size_t INDEX_FROM = 2048;       // ids from which on the index is used
constexpr std::size_t INDEX_START = 8192;      // its first size, a power of two

struct store_block {
    store_block *next;
    std::size_t size; // bytes after this header
    std::size_t used;
};

struct index_slot {
    std::uint64_t hash;
    soap_id_record *record; // null: free
};

} // namespace

struct soap_id_index {
    store_block *blocks; // newest first
    index_slot *slots;   // null until there are INDEX_FROM ids; at most half of them in use
    std::size_t slot_mask;
    std::uint64_t key[2];
};

namespace {

// --- storage ---

bool add_store_block(soap *ctx, soap_id_index *index, std::size_t bytes)
{
    const std::size_t size = bytes > STORE_BLOCK_SIZE ? bytes : STORE_BLOCK_SIZE;
    auto *block = static_cast<store_block *>(SOAP_MALLOC(ctx, sizeof(store_block) + size));
    if (block == nullptr)
        return false;
    *block = {index->blocks, size, 0};
    index->blocks = block;
    return true;
}

// Zeroed memory until the reset; null with SOAP_OUT_OF_MEMORY.
void *store_alloc(soap *ctx, std::size_t bytes)
{
    if (ctx->id_index == nullptr) {
        ctx->id_index = static_cast<soap_id_index *>(SOAP_MALLOC(ctx, sizeof(soap_id_index)));
        if (ctx->id_index != nullptr)
            *ctx->id_index = {};
    }
    soap_id_index *index = ctx->id_index;
    bytes = (bytes + 7) & ~static_cast<std::size_t>(7);
    if (index == nullptr ||
        ((index->blocks == nullptr || index->blocks->size - index->blocks->used < bytes) &&
         !add_store_block(ctx, index, bytes)))
        return fail_null(ctx, SOAP_OUT_OF_MEMORY);
    store_block *block = index->blocks;
    char *area = reinterpret_cast<char *>(block + 1) + block->used;
    block->used += bytes;
    std::memset(area, 0, bytes);
    return area;
}

// --- hashes ---

// The table's own hash: h * 65599 + byte over the bytes taken as signed.
std::uint64_t text_hash(const char *text)
{
    std::uint64_t hash = 0;
    for (; *text != '\0'; text++)
        hash = hash * 65599 +
               static_cast<std::uint64_t>(static_cast<std::int64_t>(static_cast<signed char>(*text)));
    return hash;
}

inline std::uint64_t rotate(std::uint64_t value, unsigned count)
{
    return value << count | value >> (64 - count);
}

struct sip_state {
    std::uint64_t a, b, c, d;

    void round()
    {
        a += b, c += d;
        b = rotate(b, 13) ^ a, d = rotate(d, 16) ^ c;
        a = rotate(a, 32);
        c += b, a += d;
        b = rotate(b, 17) ^ c, d = rotate(d, 21) ^ a;
        c = rotate(c, 32);
    }
    void take(std::uint64_t word)
    {
        d ^= word;
        round();
        a ^= word;
    }
};

// SipHash-1-3 of a text: the hash of the index, which a sender can't aim at without the key.
std::uint64_t keyed_hash(const std::uint64_t key[2], const char *text)
{
    std::size_t length = std::strlen(text);
    sip_state state = {key[0] ^ UINT64_C(0x736f6d6570736575), key[1] ^ UINT64_C(0x646f72616e646f6d),
                       key[0] ^ UINT64_C(0x6c7967656e657261), key[1] ^ UINT64_C(0x7465646279746573)};
    std::uint64_t last = static_cast<std::uint64_t>(length) << 56;
    for (; length >= 8; text += 8, length -= 8) {
        std::uint64_t word = 0;
        std::memcpy(&word, text, 8);
        state.take(word);
    }
    std::uint64_t rest = 0;
    std::memcpy(&rest, text, length);
    if constexpr (std::endian::native == std::endian::big)
        rest >>= 8; // out of the byte that the length is in
    state.take(last | rest);
    state.c ^= 0xff;
    for (int i = 0; i < 3; i++)
        state.round();
    return state.a ^ state.b ^ state.c ^ state.d;
}

void draw_key(const soap *ctx, std::uint64_t key[2])
{
    if (getrandom(key, 2 * sizeof key[0], GRND_NONBLOCK) == 2 * static_cast<ssize_t>(sizeof key[0]))
        return;
    std::timespec now = {};
    std::timespec_get(&now, TIME_UTC);
    key[0] ^= reinterpret_cast<std::uintptr_t>(ctx) ^ rotate(static_cast<std::uint64_t>(now.tv_nsec), 32);
    key[1] ^= reinterpret_cast<std::uintptr_t>(&now) ^ static_cast<std::uint64_t>(now.tv_sec);
}

// --- index ---

void index_put(soap_id_index *index, std::uint64_t hash, soap_id_record *record)
{
    std::size_t at = static_cast<std::size_t>(hash) & index->slot_mask;
    while (index->slots[at].record != nullptr)
        at = (at + 1) & index->slot_mask;
    index->slots[at] = {hash, record};
}

soap_id_record *index_find(const soap_id_index *index, const char *text)
{
    const std::uint64_t hash = keyed_hash(index->key, text);
    for (std::size_t at = static_cast<std::size_t>(hash) & index->slot_mask;
         index->slots[at].record != nullptr; at = (at + 1) & index->slot_mask)
        if (index->slots[at].hash == hash && std::strcmp(index->slots[at].record->id, text) == 0)
            return index->slots[at].record;
    return nullptr;
}

index_slot *new_slots(soap *ctx, std::size_t count)
{
    auto *slots = static_cast<index_slot *>(SOAP_MALLOC(ctx, count * sizeof(index_slot)));
    if (slots == nullptr)
        fail(ctx, SOAP_OUT_OF_MEMORY);
    else
        std::memset(slots, 0, count * sizeof(index_slot));
    return slots;
}

bool index_start(soap *ctx, soap_id_index *index)
{
    index->slots = new_slots(ctx, INDEX_START);
    if (index->slots == nullptr)
        return false;
    index->slot_mask = INDEX_START - 1;
    draw_key(ctx, index->key);
    for (soap_id_record *record : ctx->id_table)
        for (; record != nullptr; record = record->next)
            index_put(index, keyed_hash(index->key, record->id), record);
    return true;
}

bool index_grow(soap *ctx, soap_id_index *index)
{
    const soap_id_index old = *index;
    index_slot *slots = new_slots(ctx, (old.slot_mask + 1) * 2);
    if (slots == nullptr)
        return false;
    index->slots = slots;
    index->slot_mask = old.slot_mask * 2 + 1;
    for (std::size_t i = 0; i <= old.slot_mask; i++)
        if (old.slots[i].record != nullptr)
            index_put(index, old.slots[i].hash, old.slots[i].record);
    SOAP_FREE(ctx, old.slots);
    return true;
}

// Grows the index for one more record, when there is an index or the table calls for one.
bool index_reserve(soap *ctx)
{
    soap_id_index *index = ctx->id_index;
    if (index->slots == nullptr)
        return ctx->id_count < INDEX_FROM || index_start(ctx, index);
    return (ctx->id_count + 1) * 2 <= index->slot_mask || index_grow(ctx, index);
}

// --- what registering and references share ---

// Brings the places of a link chain, which hold the object at the record's level, down to `level`.
bool lower_link_chain(soap *ctx, soap_id_record *record, unsigned level)
{
    for (; record->level > level; record->level--) {
        void *cells = nullptr;
        for (void *place = record->link, *next = nullptr; place != nullptr; place = next) {
            next = load_place(place);
            void *cell = add_indirections(ctx, place, 1);
            if (cell == nullptr)
                return false;
            store_place(cell, cells);
            cells = cell;
        }
        record->link = cells;
    }
    return true;
}

bool reference_agrees(const soap_id_record *record, int type, std::size_t size, unsigned level)
{
    return record->type == type && (record->level != level || record->size == size);
}

// True if the object now met is not what the references that came before it expect.
bool contradicts_references(const soap_id_record *record, int type, std::size_t size, unsigned level)
{
    const bool type_differs = record->type != type;
    if (record->ptr == nullptr && record->link != nullptr && type_differs)
        return true;
    if (record->copy != nullptr && (type_differs || record->size != size))
        return true;
    return record->forward != nullptr && !reference_agrees(record, type, size, level);
}

soap_id_record *add_reference_record(soap *ctx, const char *id, int type, std::size_t size, unsigned level)
{
    soap_id_record *record = soap_id_add(ctx, id);
    if (record != nullptr) {
        record->type = type;
        record->size = size;
        record->level = level;
    }
    return record;
}

void *make_object(soap *ctx, int type, std::size_t *size, const char *type_text, const char *array_type,
                  soap_instantiate_function instantiate)
{
    void *made = instantiate != nullptr ? instantiate(ctx, type, type_text, array_type, size)
                                        : soap_block_alloc(ctx, *size);
    if (made != nullptr)
        ctx->allocated = 1;
    return made;
}

// A reference from a pointer place to an id that has no object yet.
void **wait_for_address(soap *ctx, soap_id_record *record, void **place, std::size_t size, unsigned level)
{
    if (record->level > level) {
        if (!lower_link_chain(ctx, record, level))
            return nullptr;
        clear_place_chain(&record->copy);
        record->size = size;
    }
    void *end = add_indirections(ctx, place, level - record->level);
    if (end == nullptr)
        return nullptr;
    store_place(end, record->link);
    record->link = end;
    return static_cast<void **>(end);
}

} // namespace

void *add_indirections(soap *ctx, void *place, unsigned count)
{
    for (; count > 0; count--) {
        void *cell = soap_block_alloc(ctx, sizeof(void *));
        if (cell == nullptr)
            return fail_null(ctx, SOAP_OUT_OF_MEMORY);
        store_place(place, cell);
        place = cell;
    }
    return place;
}

void clear_place_chain(void **head)
{
    for (void *place = *head, *next = nullptr; place != nullptr; place = next) {
        next = load_place(place);
        store_place(place, nullptr);
    }
    *head = nullptr;
}

int id_failure(soap *ctx, const char *id, int error)
{
    const std::size_t length = strnlen(id, sizeof ctx->element_id - 1);
    std::memmove(ctx->element_id, id, length);
    ctx->element_id[length] = '\0';
    return fail(ctx, error);
}

std::size_t soap_id_hash(const char *text)
{
    return static_cast<std::size_t>(text_hash(text) % SOAP_ID_HASH_SIZE);
}

soap_id_record *soap_id_lookup(soap *ctx, const char *text)
{
    if (ctx->id_count == 0)
        return nullptr;
    if (ctx->id_index->slots != nullptr)
        return index_find(ctx->id_index, text);
    const std::uint64_t hash = text_hash(text);
    soap_id_record *record = ctx->id_table[hash % SOAP_ID_HASH_SIZE];
    while (record != nullptr && (record->hash != hash || std::strcmp(record->id, text) != 0))
        record = record->next;
    return record;
}

soap_id_record *soap_id_add(soap *ctx, const char *text)
{
    const std::size_t length = std::strlen(text);
    auto *record = static_cast<soap_id_record *>(store_alloc(ctx, offsetof(soap_id_record, id) + length + 1));
    if (record == nullptr || !index_reserve(ctx))
        return nullptr;
    std::memcpy(reinterpret_cast<char *>(record) + offsetof(soap_id_record, id), text, length + 1);
    record->hash = text_hash(text);
    if (ctx->id_index->slots != nullptr)
        index_put(ctx->id_index, keyed_hash(ctx->id_index->key, text), record);
    soap_id_record **head = &ctx->id_table[record->hash % SOAP_ID_HASH_SIZE];
    record->next = *head;
    *head = record;
    ctx->id_count++;
    return record;
}

int soap_id_type(soap *ctx, const char *text)
{
    const soap_id_record *record = soap_id_lookup(ctx, text);
    return record != nullptr ? record->type : 0;
}

void soap_id_table_reset(soap *ctx)
{
    if (ctx->id_index == nullptr)
        return;
    while (store_block *block = ctx->id_index->blocks) {
        ctx->id_index->blocks = block->next;
        SOAP_FREE(ctx, block);
    }
    if (ctx->id_index->slots != nullptr)
        SOAP_FREE(ctx, ctx->id_index->slots);
    SOAP_FREE(ctx, ctx->id_index);
    ctx->id_index = nullptr;
    ctx->id_count = 0;
    std::memset(ctx->id_table, 0, sizeof ctx->id_table);
}

void *soap_object_register(soap *ctx, const char *id, void *address, int type, std::size_t size,
                           unsigned level, const char *type_text, const char *array_type,
                           soap_instantiate_function instantiate)
{
    ctx->allocated = 0;
    if (address == nullptr)
        address = make_object(ctx, type, &size, type_text, array_type, instantiate);
    if (address == nullptr || id == nullptr || *id == '\0')
        return address;
    soap_id_record *record = soap_id_lookup(ctx, id);
    if (record == nullptr) {
        record = add_reference_record(ctx, id, type, size, level);
        if (record == nullptr)
            return nullptr;
    } else if (contradicts_references(record, type, size, level)) {
        id_failure(ctx, id, SOAP_ID_CONFLICT);
        return nullptr;
    } else if (record->ptr != nullptr) {
        id_failure(ctx, id, SOAP_DUPLICATE_ID);
        return nullptr;
    } else if (!lower_link_chain(ctx, record, level)) {
        return nullptr;
    }
    record->ptr = address;
    record->type = type;
    record->level = level;
    record->size = size;
    return address;
}

void **soap_object_forward_ptr(soap *ctx, const char *id, void **place, int type, std::size_t size,
                               unsigned level)
{
    if (place == nullptr || id == nullptr || *id == '\0')
        return place;
    soap_id_record *record = soap_id_lookup(ctx, id);
    if (record == nullptr) {
        record = add_reference_record(ctx, id, type, size, level);
        return record != nullptr ? wait_for_address(ctx, record, place, size, level) : nullptr;
    }
    if (record->type != type) {
        id_failure(ctx, id, SOAP_ID_CONFLICT);
        return nullptr;
    }
    if (record->ptr == nullptr)
        return wait_for_address(ctx, record, place, size, level);
    void *end = add_indirections(ctx, place, level > record->level ? level - record->level : 0);
    if (end != nullptr)
        store_place(end, record->ptr);
    return static_cast<void **>(end);
}

void *soap_object_forward(soap *ctx, const char *href, void *place, std::size_t length, int type,
                          int place_type, std::size_t size, unsigned level, soap_copy_hook hook)
{
    if (place == nullptr || href == nullptr || *href == '\0')
        return place;
    const bool byte_copy = hook == nullptr && level == 0 && size >= sizeof(void *) && *href == '#';
    soap_id_record *record = soap_id_lookup(ctx, href);
    if (record == nullptr) {
        record = add_reference_record(ctx, href, type, size, level);
        if (record == nullptr)
            return nullptr;
    } else if (!reference_agrees(record, type, size, level) || (byte_copy && record->size != size)) {
        id_failure(ctx, href, SOAP_ID_CONFLICT);
        return nullptr;
    }
    if (byte_copy) {
        store_place(place, record->copy);
        record->copy = place;
        return place;
    }
    auto *forward = static_cast<soap_forward_record *>(store_alloc(ctx, sizeof(soap_forward_record)));
    if (forward == nullptr)
        return nullptr;
    *forward = {
        record->forward, place_type, level, place, length, size, hook != nullptr ? hook : soap_copy_bytes};
    record->forward = forward;
    return place;
}
