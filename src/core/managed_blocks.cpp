// managed_blocks.cpp - blocks that belong to a context and go together: text, arrays, records read from a
// message.
//
// A block is one tracked allocation: the user's bytes, padding, a 16-bit canary, a trailer. The user's bytes
// and the canary span a multiple of 8, so the trailer is aligned and an overrun meets the canary before the
// trailer. Elsewhere: objects with a destructor (instances.cpp), the tracking below (tracking.cpp).
#include <algorithm>
#include <cstdio>
#include <cstring>

#include <openssl/crypto.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>

#include "core/context_state.h"
#include "core/failure.h"
#include "core/instance_pool.h"
#include "core/limits.h"
#include "core/memory.h"
#include "core/tracking.h"

struct soap_block_trailer {
    soap_block_trailer *next; // next older block
    std::size_t span;         // bytes from the block's start to this record
    soap_track_entry *entry;  // spares the release of a block the look-up
};

namespace {

constexpr std::uint16_t CANARY = 0xC0DE;
constexpr std::size_t BLOCK_OVERHEAD = sizeof CANARY + 7 + sizeof(soap_block_trailer);

char *block_start(soap_block_trailer *trailer)
{
    return reinterpret_cast<char *>(trailer) - trailer->span;
}

char *canary_place(soap_block_trailer *trailer)
{
    return reinterpret_cast<char *>(trailer) - sizeof CANARY;
}

int corruption(soap *ctx)
{
    std::fprintf(stderr, "Data corruption in dynamic allocation (see logs)\n");
    return fail(ctx, SOAP_CORRUPTION);
}

// SOAP_OK or SOAP_CORRUPTION for a block whose end was overwritten.
int check_canary(soap *ctx, soap_block_trailer *trailer)
{
    std::uint16_t found;
    std::memcpy(&found, canary_place(trailer), sizeof found);
    return found == CANARY ? SOAP_OK : corruption(ctx);
}

// False for a block that was given to tracked_free without the list's knowledge.
bool entry_is_live(soap_block_trailer *trailer)
{
    return trailer->entry->address == block_start(trailer) && track_is_live(trailer->entry);
}

// The list of idle blocks of this span, or null if there is none.
idle_list<soap_block_trailer> *idle_blocks(soap *ctx, std::size_t span)
{
    const std::size_t place = span / 8 - 1;
    return ctx->pools != nullptr && place < IDLE_BLOCK_SPANS ? &ctx->pools->idle.blocks[place] : nullptr;
}

std::size_t idle_bytes(const soap_block_trailer *trailer)
{
    return trailer->span + sizeof *trailer;
}

// True if the block waits for its next use.
bool keep_block(soap *ctx, soap_block_trailer *trailer)
{
    idle_list<soap_block_trailer> *list = idle_blocks(ctx, trailer->span);
    if (list == nullptr || !idle_has_space(ctx->pools->idle, *list, idle_bytes(trailer)))
        return false;
    track_rest(ctx, trailer->entry);
    std::memset(block_start(trailer), 0,
                trailer->span - sizeof CANARY); // keys and the like don't wait with it
    list->push(trailer, ctx->pools->idle.large);
    ctx->pools->idle.bytes += idle_bytes(trailer);
    return true;
}

soap_track_entry *reuse_block(soap *ctx, std::size_t span)
{
    idle_list<soap_block_trailer> *list = idle_blocks(ctx, span);
    if (list == nullptr || list->first == nullptr)
        return nullptr;
    soap_block_trailer *trailer = list->pop();
    ctx->pools->idle.bytes -= idle_bytes(trailer);
    track_wake(ctx, trailer->entry, idle_bytes(trailer));
    return trailer->entry;
}

void free_idle_blocks(soap *ctx, soap_block_trailer *first)
{
    while (first != nullptr) {
        soap_block_trailer *trailer = first;
        first = trailer->next;
        ctx->pools->idle.bytes -= idle_bytes(trailer);
        track_free_resting(ctx, trailer->entry);
    }
}

} // namespace

void idle_blocks_drop(soap *ctx)
{
    for (idle_list<soap_block_trailer> &list : ctx->pools->idle.blocks) {
        soap_block_trailer *first = list.first;
        list = {};
        free_idle_blocks(ctx, first);
    }
}

void idle_blocks_thin(soap *ctx)
{
    for (idle_list<soap_block_trailer> &list : ctx->pools->idle.blocks)
        free_idle_blocks(ctx, list.thin());
}

namespace {

void free_block(soap *ctx, soap_block_trailer *trailer)
{
    if (entry_is_live(trailer)) {
        if (track_is_secret(trailer->entry))
            OPENSSL_cleanse(block_start(trailer), trailer->span - sizeof CANARY);
        if (!keep_block(ctx, trailer))
            track_free(ctx, trailer->entry);
    } else // damaged: tracking reports the address
        SOAP_FREE(ctx, block_start(trailer));
}

void *out_of_memory(soap *ctx)
{
    return fail_null(ctx, SOAP_OUT_OF_MEMORY);
}

} // namespace

void *soap_block_alloc(soap *ctx, std::size_t size)
{
    if (size == 0)
        return const_cast<char *>("");
    if (ctx == nullptr)
        return SOAP_MALLOC(ctx, size);
    if (ctx->on_malloc != nullptr) {
        memory_charge(ctx, size);
        void *block = ctx->on_malloc(ctx, size);
        return block != nullptr ? block : out_of_memory(ctx);
    }
    if (size > SIZE_MAX - BLOCK_OVERHEAD)
        return out_of_memory(ctx);
    const std::size_t span = (size + sizeof CANARY + 7) & ~std::size_t{7};
    soap_track_entry *entry = reuse_block(ctx, span);
    if (entry == nullptr)
        entry = track_alloc(ctx, __FILE__, __LINE__, span + sizeof(soap_block_trailer));
    if (entry == nullptr)
        return out_of_memory(ctx);
    char *start = static_cast<char *>(entry->address);
    auto *trailer = reinterpret_cast<soap_block_trailer *>(start + span);
    *trailer = {ctx->allocation_list, span, entry};
    std::memcpy(canary_place(trailer), &CANARY, sizeof CANARY);
    ctx->allocation_list = trailer;
    ctx->allocated = 1;
    return start;
}

void credentials_wipe(soap *ctx)
{
    if (!ctx->credentials_passed)
        return;
    ctx->credentials_passed = false;
    OPENSSL_cleanse(ctx->scratch_text, sizeof ctx->scratch_text);
    const bool sending = ctx->buffer_index > ctx->buffer_length;
    const std::size_t kept_from = sending ? 0 : ctx->buffer_index;
    const std::size_t filled = sending ? ctx->buffer_index : ctx->buffer_length;
    const std::size_t kept_to = std::max(filled, ctx->chunk_buffer_length);
    OPENSSL_cleanse(ctx->buffer, kept_from);
    OPENSSL_cleanse(ctx->buffer + kept_to, sizeof ctx->buffer - kept_to);
}

namespace {

// The fields whose values live in managed blocks.
void forget_managed_fields(soap *ctx)
{
#define FIELD_FORGOTTEN(name) ctx->name = nullptr;
    CONTEXT_MANAGED_FIELDS(FIELD_FORGOTTEN)
#undef FIELD_FORGOTTEN
    ctx->output_mode &= ~MODE_MIME;
    ctx->dime.id = ctx->dime.type = ctx->dime.options = nullptr;
    ctx->dime.list = ctx->dime.first = ctx->dime.last = nullptr;
    ctx->mime = {};
}

void free_all_blocks(soap *ctx, bool large)
{
    idle_release_each(large, [ctx] {
        soap_block_trailer *trailer = ctx->allocation_list;
        if (trailer == nullptr || check_canary(ctx, trailer) != SOAP_OK)
            return false;
        ctx->allocation_list = trailer->next;
        __builtin_prefetch(trailer->next); // blocks are scattered: the next one comes while this one goes
        free_block(ctx, trailer);
        return true;
    });
    credentials_wipe(ctx);
    forget_managed_fields(ctx); // after a damaged block too: what they point to may be gone
}

} // namespace

void soap_block_free(soap *ctx, void *address)
{
    if (!context_is_alive(ctx))
        return;
    track_secret(ctx, ctx->auth_user); // also what was set and never sent
    track_secret(ctx, ctx->auth_password);
    const bool large = idle_release_begin(ctx);
    if (address == nullptr) {
        free_all_blocks(ctx, large);
        return;
    }
    for (soap_block_trailer **link = &ctx->allocation_list; *link != nullptr; link = &(*link)->next) {
        soap_block_trailer *trailer = *link;
        if (check_canary(ctx, trailer) != SOAP_OK)
            return;
        if (block_start(trailer) == address) {
            *link = trailer->next;
            free_block(ctx, trailer);
            return;
        }
    }
    soap_discard_objects(ctx, address);
}

namespace {

// True if a block starts at the address: it is then out of the list, and its bytes stay.
bool unlink_block(soap *ctx, const void *address)
{
    for (soap_block_trailer **link = &ctx->allocation_list; *link != nullptr; link = &(*link)->next) {
        soap_block_trailer *trailer = *link;
        if (block_start(trailer) == address) {
            *link = trailer->next;
            if (entry_is_live(trailer))
                track_forget(ctx, trailer->entry);
            return true;
        }
    }
    return false;
}

} // namespace

int soap_block_unlink(soap *ctx, const void *address)
{
    if (ctx == nullptr || address == nullptr)
        return -1;
    if (unlink_block(ctx, address))
        return 0;
    for (soap_instance **link = &ctx->instance_list; *link != nullptr; link = &(*link)->next) {
        soap_instance *instance = *link;
        if (instance->object == address) {
            *link = instance->next;
            ctx->pools->instances.give(instance);
            return 0;
        }
    }
    return -1;
}

namespace {

// Space in the target's pools for all that the source holds, so that the move itself cannot fail half way.
int prepare_move(soap *source, soap *target)
{
    std::size_t blocks = 0, instances = 0;
    for (soap_block_trailer *trailer = source->allocation_list; trailer != nullptr; trailer = trailer->next) {
        if (check_canary(source, trailer) != SOAP_OK)
            return source->error;
        if (!entry_is_live(trailer))
            return corruption(source);
        ++blocks;
    }
    for (const soap_instance *instance = source->instance_list; instance != nullptr;
         instance = instance->next)
        ++instances;
    soap_memory_pools *pools = memory_pools(target);
    if (pools == nullptr || !pools->entries.reserve(blocks) || !pools->instances.reserve(instances))
        return source->error = SOAP_OUT_OF_MEMORY;
    return SOAP_OK;
}

void move_instances(soap *source, soap *target)
{
    soap_instance **tail = &target->instance_list;
    while (*tail != nullptr)
        tail = &(*tail)->next;
    while (source->instance_list != nullptr) {
        soap_instance *old = source->instance_list;
        source->instance_list = old->next;
        soap_instance *moved = target->pools->instances.take();
        *moved = *old;
        moved->next = nullptr;
        *tail = moved;
        tail = &moved->next;
        source->pools->instances.give(old);
    }
}

} // namespace

void soap_blocks_move(soap *source, soap *target)
{
    if (source == target || prepare_move(source, target) != SOAP_OK)
        return;
    soap_block_trailer **link = &source->allocation_list;
    for (; *link != nullptr; link = &(*link)->next)
        (*link)->entry = track_move(source, target, (*link)->entry);
    *link = target->allocation_list;
    target->allocation_list = source->allocation_list;
    source->allocation_list = nullptr;
    move_instances(source, target);
}

char *soap_string_dup_n(soap *ctx, const char *text, std::size_t length)
{
    if (text == nullptr)
        return nullptr;
    auto *copy = static_cast<char *>(soap_block_alloc(ctx, length == SIZE_MAX ? length : length + 1));
    if (copy == nullptr)
        return nullptr;
    std::memcpy(copy, text, length);
    copy[length] = '\0';
    return copy;
}

char *soap_string_dup(soap *ctx, const char *text)
{
    return text == nullptr ? nullptr : soap_string_dup_n(ctx, text, std::strlen(text));
}

char32_t *soap_wide_string_dup(soap *ctx, const char32_t *text)
{
    if (text == nullptr)
        return nullptr;
    std::size_t length = 0;
    while (text[length] != 0)
        ++length;
    const std::size_t size = (length + 1) * sizeof *text;
    auto *copy = static_cast<char32_t *>(soap_block_alloc(ctx, size));
    if (copy != nullptr)
        std::memcpy(copy, text, size);
    return copy;
}
