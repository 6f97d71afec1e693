// identity_write.cpp - the pointer table: which objects a message refers to, and in which form each is
// written.
//
// Here: the table, the mark pass, the choice between writing an object in place, with an id, or as a
// reference. Elsewhere: the text of ids and references (the XML writer), ids on input (identity_read.cpp).
//
// Always: records come from blocks and none is freed alone; a record's number follows the order of the mark
// pass; both passes of a message have marks of their own, so that they take the same decisions.

#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/failure.h"
#include "identity/multiref.h"

struct soap_pointer_block {
    soap_pointer_block *next;
    soap_pointer_record records[SOAP_POINTER_BLOCK_SIZE];
};

namespace {

constexpr std::size_t RECORDS_PER_CHAIN_MAX = 1; // the table doubles above this load
constexpr std::size_t RESET_BY_RECORD_MAX = 256; // up to here the heads are cleared one by one
constexpr std::int8_t MARK_ONCE = 0;
constexpr std::int8_t MARK_WRITTEN = 1;
constexpr std::int8_t MARK_SEVERAL = 2;

// --- table ---

inline std::uint32_t address_hash(const void *address)
{
    return static_cast<std::uint32_t>(reinterpret_cast<std::uintptr_t>(address) >> 3);
}

// Objects of one size lie at regular distances, which leaves most chains of a table unused. The first
// table is small enough for that; in larger ones the hash is mixed.
inline std::size_t chain_of(std::uint32_t hash, std::size_t mask)
{
    if (mask < SOAP_POINTER_HASH_SIZE)
        return hash & mask;
    const std::uint64_t mixed = hash * UINT64_C(0x9E3779B97F4A7C15);
    return static_cast<std::size_t>(mixed >> 20) & mask;
}

inline const void *array_content(const void *array)
{
    const void *content = nullptr;
    std::memcpy(&content, array, sizeof content);
    return content;
}

bool same_dimensions(const void *one, const void *other, int dimensions)
{
    if (one == other || dimensions <= 0)
        return true;
    const std::size_t bytes = static_cast<std::size_t>(dimensions) * sizeof(std::int32_t);
    return std::memcmp(static_cast<const char *>(one) + sizeof(void *),
                       static_cast<const char *>(other) + sizeof(void *), bytes) == 0;
}

inline soap_pointer_record *find_record(const soap *ctx, const void *address, int type)
{
    if (ctx->pointer_count == 0)
        return nullptr;
    soap_pointer_record *record =
        ctx->pointer_chains[chain_of(address_hash(address), ctx->pointer_chain_mask)];
    while (record != nullptr && (record->ptr != address || record->type != type))
        record = record->next;
    return record;
}

soap_pointer_record *find_array_record(const soap *ctx, const void *array, int dimensions, int type)
{
    if (ctx->pointer_count == 0)
        return nullptr;
    const void *content = array_content(array);
    soap_pointer_record *record =
        ctx->pointer_chains[chain_of(address_hash(content), ctx->pointer_chain_mask)];
    for (; record != nullptr; record = record->next)
        if (record->type == type && record->array != nullptr && array_content(record->array) == content &&
            same_dimensions(record->array, array, dimensions))
            return record;
    return nullptr;
}

inline soap_pointer_record *find_either(const soap *ctx, const void *address, const void *array,
                                        int dimensions, int type)
{
    return array != nullptr ? find_array_record(ctx, array, dimensions, type)
                            : find_record(ctx, address, type);
}

inline void link_record(soap *ctx, soap_pointer_record *record)
{
    soap_pointer_record **head = &ctx->pointer_chains[chain_of(record->hash, ctx->pointer_chain_mask)];
    record->next = *head;
    *head = record;
}

// Doubles the table. The first one is emptied when it is left, which a reset then relies on.
bool grow_table(soap *ctx)
{
    soap_pointer_record **const old_chains = ctx->pointer_chains;
    const std::size_t old_size = ctx->pointer_chain_mask + 1;
    const std::size_t bytes = old_size * 2 * sizeof *old_chains;
    auto **chains = static_cast<soap_pointer_record **>(SOAP_MALLOC(ctx, bytes));
    if (chains == nullptr)
        return false;
    std::memset(chains, 0, bytes);
    ctx->pointer_chains = chains;
    ctx->pointer_chain_mask = old_size * 2 - 1;
    for (std::size_t i = 0; i < old_size; i++)
        for (soap_pointer_record *record = old_chains[i], *next; record != nullptr; record = next) {
            next = record->next;
            link_record(ctx, record);
        }
    if (old_chains == ctx->pointer_table)
        std::memset(old_chains, 0, sizeof ctx->pointer_table);
    else
        SOAP_FREE(ctx, old_chains);
    return true;
}

bool add_block(soap *ctx)
{
    auto *block = static_cast<soap_pointer_block *>(SOAP_MALLOC(ctx, sizeof(soap_pointer_block)));
    if (block == nullptr)
        return false;
    block->next = ctx->pointer_blocks;
    ctx->pointer_blocks = block;
    ctx->pointer_block_used = 0;
    return true;
}

// A new record with both marks "met once", or null with SOAP_OUT_OF_MEMORY.
soap_pointer_record *add_record(soap *ctx, const void *address, const void *array, int type,
                                std::uint32_t hash)
{
    if (ctx->pointer_count == 0) {
        ctx->pointer_chains = ctx->pointer_table;
        ctx->pointer_chain_mask = SOAP_POINTER_HASH_SIZE - 1;
    }
    const bool table_full = ctx->pointer_count > RECORDS_PER_CHAIN_MAX * (ctx->pointer_chain_mask + 1);
    const bool block_full =
        ctx->pointer_blocks == nullptr || ctx->pointer_block_used == SOAP_POINTER_BLOCK_SIZE;
    if ((table_full && !grow_table(ctx)) || (block_full && !add_block(ctx)))
        return fail_null(ctx, SOAP_OUT_OF_MEMORY);
    soap_pointer_record *record = &ctx->pointer_blocks->records[ctx->pointer_block_used++];
    record->ptr = address;
    record->array = array;
    record->type = type;
    record->id = static_cast<std::int32_t>(++ctx->next_id);
    record->count_mark = MARK_ONCE;
    record->send_mark = MARK_ONCE;
    record->hash = hash;
    ctx->pointer_count++;
    link_record(ctx, record);
    return record;
}

soap_pointer_record *add_record(soap *ctx, const void *address, const void *array, int type)
{
    return add_record(ctx, address, array, type,
                      address_hash(array != nullptr ? array_content(array) : address));
}

void clear_heads_by_record(soap *ctx)
{
    std::size_t used = ctx->pointer_block_used;
    for (const soap_pointer_block *block = ctx->pointer_blocks; block != nullptr; block = block->next) {
        for (std::size_t i = 0; i < used; i++)
            ctx->pointer_table[chain_of(block->records[i].hash, SOAP_POINTER_HASH_SIZE - 1)] = nullptr;
        used = SOAP_POINTER_BLOCK_SIZE;
    }
}

inline int report(soap_pointer_record *found, soap_pointer_record **record)
{
    if (record != nullptr)
        *record = found;
    return found != nullptr ? found->id : 0;
}

// The mark that both forms of the mark pass leave: met for the second time, or as it was.
inline int mark_again(soap_pointer_record *record)
{
    if (record->count_mark == MARK_ONCE) {
        record->count_mark = MARK_SEVERAL;
        record->send_mark = MARK_SEVERAL;
    }
    return record->count_mark;
}

// --- the form that an object takes ---

inline bool counting(const soap *ctx)
{
    return (ctx->mode & MODE_COUNTING) != 0;
}

inline std::int8_t phase_mark(const soap *ctx, const soap_pointer_record *record)
{
    return counting(ctx) ? record->count_mark : record->send_mark;
}

inline void set_phase_mark(const soap *ctx, soap_pointer_record *record, std::int8_t mark)
{
    (counting(ctx) ? record->count_mark : record->send_mark) = mark;
}

// Literal messages have neither ids nor references unless graph mode asks for them.
inline bool literal(const soap *ctx)
{
    return ctx->encoding_style == nullptr && (ctx->mode & SOAP_XML_GRAPH) == 0;
}

// Encoded SOAP 1.1: objects met twice follow the Body's first element, and all that refer to them do
// so.
inline bool encoded_1_1(const soap *ctx)
{
    return ctx->soap_version == 1 && ctx->encoding_style != nullptr && (ctx->mode & SOAP_XML_GRAPH) == 0 &&
           ctx->message_part != PART_HEADER;
}

int element_id(soap *ctx, int id, const void *address, const void *array, int dimensions, int type)
{
    if ((ctx->mode & SOAP_XML_TREE) != 0)
        return id;
    if (literal(ctx))
        return 0;
    if (encoded_1_1(ctx)) {
        if (id >= 0)
            return id;
        if (soap_pointer_record *record = find_either(ctx, address, array, dimensions, type))
            set_phase_mark(ctx, record, MARK_SEVERAL);
        return -1;
    }
    if (id == 0)
        return 0;
    soap_pointer_record *record = find_either(ctx, address, array, dimensions, type);
    if (record == nullptr)
        return 0;
    set_phase_mark(ctx, record, MARK_WRITTEN);
    return id < 0 ? record->id : id;
}

} // namespace

void soap_pointer_table_reset(soap *ctx)
{
    if (ctx->pointer_count == 0)
        return;
    if (ctx->pointer_chains != ctx->pointer_table)
        SOAP_FREE(ctx, ctx->pointer_chains);
    else if (ctx->pointer_count <= RESET_BY_RECORD_MAX)
        clear_heads_by_record(ctx);
    else
        std::memset(ctx->pointer_table, 0, sizeof ctx->pointer_table);
    // One block stays for the next message, which nearly always needs one.
    while (ctx->pointer_blocks != nullptr && ctx->pointer_blocks->next != nullptr) {
        soap_pointer_block *block = ctx->pointer_blocks;
        ctx->pointer_blocks = block->next;
        SOAP_FREE(ctx, block);
    }
    ctx->pointer_block_used = 0;
    ctx->pointer_count = 0;
    ctx->pointer_chains = ctx->pointer_table;
    ctx->pointer_chain_mask = SOAP_POINTER_HASH_SIZE - 1;
}

int soap_pointer_find(soap *ctx, const void *address, int type, soap_pointer_record **record)
{
    return report(find_record(ctx, address, type), record);
}

int soap_array_pointer_find(soap *ctx, const void *, const void *array, int dimensions, int type,
                            soap_pointer_record **record)
{
    return report(array != nullptr ? find_array_record(ctx, array, dimensions, type) : nullptr, record);
}

int soap_pointer_add(soap *ctx, const void *address, const void *array, int, int type,
                     soap_pointer_record **record)
{
    return report(add_record(ctx, address, array, type), record);
}

soap_pointer_record *soap_pointer_find_value(soap *ctx, std::uint32_t hash, int type,
                                             bool (*same)(soap *ctx, const void *one, const void *other),
                                             const void *value)
{
    if (ctx->pointer_count == 0)
        return nullptr;
    soap_pointer_record *record = ctx->pointer_chains[chain_of(hash, ctx->pointer_chain_mask)];
    while (record != nullptr &&
           (record->hash != hash || record->type != type || !same(ctx, record->ptr, value)))
        record = record->next;
    return record;
}

soap_pointer_record *soap_pointer_add_value(soap *ctx, std::uint32_t hash, int type, const void *value)
{
    return add_record(ctx, value, nullptr, type, hash);
}

int soap_mark_pointer(soap *ctx, const void *address, int type)
{
    if (address == nullptr || (ctx->mode & SOAP_XML_TREE) != 0)
        return 1;
    if (soap_pointer_record *record = find_record(ctx, address, type))
        return mark_again(record);
    // Without a record a cycle would not be seen, so the walk ends where memory does.
    return add_record(ctx, address, nullptr, type) != nullptr ? MARK_ONCE : 1;
}

int soap_array_mark_pointer(soap *ctx, const void *address, const void *array, int dimensions, int type)
{
    if (array == nullptr || array_content(array) == nullptr)
        return 1;
    if (soap_pointer_record *record = find_array_record(ctx, array, dimensions, type))
        return mark_again(record);
    return add_record(ctx, address, array, type) != nullptr ? MARK_ONCE : 1;
}

int soap_pointer_is_multi(soap *ctx, const soap_pointer_record *record)
{
    if (record == nullptr)
        return 0;
    const std::int8_t mark = phase_mark(ctx, record);
    return static_cast<int>(encoded_1_1(ctx) ? mark != MARK_ONCE : mark == MARK_WRITTEN);
}

int soap_pointer_is_single(soap *ctx, const soap_pointer_record *record)
{
    if (ctx->message_part == PART_HEADER)
        return 1;
    return static_cast<int>(record != nullptr && phase_mark(ctx, record) == MARK_ONCE);
}

void soap_pointer_set_written(soap *ctx, soap_pointer_record *record)
{
    if (record != nullptr)
        set_phase_mark(ctx, record, MARK_WRITTEN);
}

void soap_pointer_set_seen(soap *ctx, const void *address, int type)
{
    if (soap_pointer_record *record = find_record(ctx, address, type)) {
        record->count_mark = MARK_WRITTEN;
        record->send_mark = MARK_WRITTEN;
    }
}

int soap_element_id(soap *ctx, int id, const void *address, int type)
{
    return element_id(ctx, id, address, nullptr, 0, type);
}

int soap_array_element_id(soap *ctx, int id, const void *address, const void *array, int dimensions, int type)
{
    return element_id(ctx, id, address, array, dimensions, type);
}

int soap_element_ref(soap *ctx, const char *tag, int id, const void *address, const void *array,
                     int dimensions, const char *type_text, int type)
{
    if (address == nullptr) {
        soap_element_null(ctx, tag, id, type_text);
        return -1;
    }
    if ((ctx->mode & SOAP_XML_TREE) != 0 || literal(ctx))
        return 0;
    if (id >= 0)
        return id;
    soap_pointer_record *record = find_either(ctx, address, array, dimensions, type);
    if (record == nullptr)
        return 0;
    if (soap_pointer_is_multi(ctx, record)) {
        soap_element_href(ctx, tag, id, record->id);
        return -1;
    }
    if (soap_pointer_is_single(ctx, record))
        return 0;
    soap_pointer_set_written(ctx, record);
    return record->id;
}

int soap_multiref_begin(soap *ctx, const void *address, const void *array, int dimensions, const char *,
                        int type)
{
    if (ctx->soap_version == 2)
        ctx->encoding_flag = 1;
    if (literal(ctx))
        return 0;
    soap_pointer_record *record = find_either(ctx, address, array, dimensions, type);
    if (record == nullptr || soap_pointer_is_multi(ctx, record) || soap_pointer_is_single(ctx, record))
        return 0;
    soap_pointer_set_written(ctx, record);
    return record->id;
}

namespace {

// The blocks of the table, oldest first, in an array of their number. Null with SOAP_OUT_OF_MEMORY.
soap_pointer_block **blocks_in_order(soap *ctx, std::size_t *count)
{
    *count = 0;
    for (const soap_pointer_block *block = ctx->pointer_blocks; block != nullptr; block = block->next)
        ++*count;
    auto **blocks =
        static_cast<soap_pointer_block **>(SOAP_MALLOC(ctx, (*count + 1) * sizeof(soap_pointer_block *)));
    if (blocks == nullptr)
        return fail_null(ctx, SOAP_OUT_OF_MEMORY);
    std::size_t place = *count;
    for (soap_pointer_block *block = ctx->pointer_blocks; block != nullptr; block = block->next)
        blocks[--place] = block;
    return blocks;
}

bool wanted_apart(const soap *ctx, const soap_pointer_record &record)
{
    return ((ctx->mode & MODE_COUNTING) != 0 ? record.count_mark : record.send_mark) == MARK_SEVERAL;
}

// One walk over the records that were there when it began. -1 on a failure, else the number written.
int write_round(soap *ctx, soap_pointer_block **blocks, std::size_t count, std::size_t newest_used,
                int (*write)(soap *, const soap_pointer_record &))
{
    int written = 0;
    for (std::size_t b = 0; b < count; b++) {
        const std::size_t used = b + 1 == count ? newest_used : SOAP_POINTER_BLOCK_SIZE;
        for (std::size_t i = 0; i < used; i++) {
            soap_pointer_record &record = blocks[b]->records[i];
            if (!wanted_apart(ctx, record))
                continue;
            soap_pointer_set_written(ctx, &record);
            if (write(ctx, record) != 0)
                return -1;
            written++;
        }
    }
    return written;
}

} // namespace

int soap_multiref_each(soap *ctx, int (*write)(soap *, const soap_pointer_record &))
{
    std::size_t count = 0;
    const std::size_t newest_used = ctx->pointer_block_used;
    soap_pointer_block **blocks = blocks_in_order(ctx, &count);
    if (blocks == nullptr)
        return ctx->error;
    int written = 0;
    do
        written = write_round(ctx, blocks, count, newest_used, write);
    while (written > 0);
    SOAP_FREE(ctx, blocks);
    return written < 0 ? ctx->error : 0;
}
