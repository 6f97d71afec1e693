// attachment_refs.cpp - references that wait for their attachment, and how an id answers one.
//
// Elsewhere: who queues them (attachment_value.cpp), who reads the attachments (dime.cpp, mime.cpp).
// Always: a message with many references and many attachments costs no more than the sum of both: from a
// number of references on they are in hash chains, keyed with a random number that no peer knows.
#include <climits>
#include <cstring>

#include <sys/random.h>

#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>

#include "attachments/attachment_id.h"
#include "attachments/attachment_list.h"

#include "core/failure.h"

struct soap_attachment_index {
    std::size_t count; // references in the list
    std::size_t size;  // chains, a power of two; 0 as long as the list itself is short enough
    std::uint64_t seed;
    soap_attachment_ref **chains;
};

namespace {

constexpr std::size_t SHORT_LIST = 32; // references that are simply walked through
constexpr std::size_t FIRST_CHAINS = 256;

bool equal(const id_view &one, const id_view &other)
{
    return id_compare(one, other) == 0;
}

const char *without_scheme(const char *href)
{
    return std::strncmp(href, "cid:", 4) == 0 ? href + 4 : href;
}

id_view whole(const char *text, bool decodes)
{
    return {text, std::strlen(text), decodes};
}

void insert(soap_attachment_index &index, soap_attachment_ref *reference)
{
    soap_attachment_ref *&chain = index.chains[reference->hash & (index.size - 1)];
    reference->next_in_chain = chain;
    chain = reference;
}

// Makes the chains, or twice as many; all references are inserted anew. If memory is short, the chains grow
// longer or the list is walked through: slower and right all the same.
void grow(soap *ctx, soap_attachment_index &index)
{
    const std::size_t size = index.size == 0 ? FIRST_CHAINS : index.size * 2;
    auto **chains = static_cast<soap_attachment_ref **>(soap_block_alloc(ctx, size * sizeof *index.chains));
    if (chains == nullptr) {
        ctx->error = SOAP_OK;
        return;
    }
    std::memset(chains, 0, size * sizeof *chains);
    index.chains = chains;
    index.size = size;
    for (soap_attachment_ref *reference = ctx->mtom_list; reference != nullptr; reference = reference->next)
        insert(index, reference);
}

soap_attachment_index *index_of_list(soap *ctx)
{
    if (ctx->mtom_list != nullptr)
        return ctx->mtom_index;
    auto *index = static_cast<soap_attachment_index *>(soap_block_alloc(ctx, sizeof(soap_attachment_index)));
    if (index == nullptr)
        return nullptr;
    *index = {};
    if (getrandom(&index->seed, sizeof index->seed, 0) != static_cast<ssize_t>(sizeof index->seed))
        index->seed = reinterpret_cast<std::uintptr_t>(index);
    return ctx->mtom_index = index;
}

void unhang(soap_attachment_index &index, soap_attachment_ref *reference)
{
    if (index.size == 0)
        return;
    soap_attachment_ref **link = &index.chains[reference->hash & (index.size - 1)];
    while (*link != reference)
        link = &(*link)->next_in_chain;
    *link = reference->next_in_chain;
}

void forget(soap *ctx, soap_attachment_ref *reference)
{
    unhang(*ctx->mtom_index, reference);
    ctx->mtom_index->count--;
    (reference->previous != nullptr ? reference->previous->next : ctx->mtom_list) = reference->next;
    if (reference->next != nullptr)
        reference->next->previous = reference->previous;
    SOAP_FREE(ctx, reference);
}

void answer(soap *ctx, soap_attachment_ref *reference, const soap_attachment *attachment)
{
    if (attachment->size > INT_MAX) { // a value's size is an int
        fail(ctx, SOAP_LENGTH);
        return;
    }
    *reference->content = reinterpret_cast<unsigned char *>(attachment->content);
    *reference->size = static_cast<int>(attachment->size);
    *reference->type = const_cast<char *>(attachment->type);
    *reference->options =
        const_cast<char *>(attachment->options != nullptr ? attachment->options : attachment->description);
    forget(ctx, reference);
}

void answer_in_list(soap *ctx, const soap_attachment *attachment)
{
    for (soap_attachment_ref *reference = ctx->mtom_list; reference != nullptr;) {
        soap_attachment_ref *const next = reference->next;
        if (soap_cid_compare(ctx, reference->id, attachment->id) == 0)
            answer(ctx, reference, attachment);
        reference = next;
    }
}

void answer_in_chain(soap *ctx, const soap_attachment *attachment, std::uint64_t key)
{
    const soap_attachment_index &index = *ctx->mtom_index;
    for (soap_attachment_ref *reference = index.chains[key & (index.size - 1)]; reference != nullptr;) {
        soap_attachment_ref *const next = reference->next_in_chain;
        if (reference->hash == key && soap_cid_compare(ctx, reference->id, attachment->id) == 0)
            answer(ctx, reference, attachment);
        reference = next;
    }
}

} // namespace

int attachment_ref_queue(soap *ctx, const soap_attachment_ref &wanted)
{
    soap_attachment_index *const index = index_of_list(ctx);
    auto *reference = static_cast<soap_attachment_ref *>(SOAP_MALLOC(ctx, sizeof(soap_attachment_ref)));
    if (index == nullptr || reference == nullptr) {
        SOAP_FREE(ctx, reference);
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    }
    *reference = wanted;
    reference->hash = id_hash(whole(without_scheme(wanted.id), true), index->seed);
    reference->previous = nullptr;
    reference->next = ctx->mtom_list;
    if (reference->next != nullptr)
        reference->next->previous = reference;
    ctx->mtom_list = reference;
    if (++index->count > SHORT_LIST && index->count > index->size)
        grow(ctx, *index);
    else if (index->size != 0)
        insert(*index, reference);
    return SOAP_OK;
}

int soap_cid_compare(soap *, const char *href, const char *id)
{
    if (href == nullptr || id == nullptr)
        return 1;
    if (std::strcmp(href, id) == 0)
        return 0;
    const char *const wanted = without_scheme(href);
    if (equal(whole(wanted, false), bare_id(id, false)) || equal(whole(wanted, true), bare_id(id, false)))
        return 0;
    return 1;
}

void soap_attachment_bind(soap *ctx, soap_attachment *attachment)
{
    if (attachment->id == nullptr || ctx->mtom_list == nullptr)
        return;
    if (ctx->mtom_index->size == 0) {
        answer_in_list(ctx, attachment);
        return;
    }
    // References are indexed by their decoded text without scheme; an id matches literally, without brackets,
    // or decoded.
    const std::uint64_t seed = ctx->mtom_index->seed;
    const std::uint64_t keys[] = {id_hash(bare_id(attachment->id, false), seed),
                                  id_hash(bare_id(attachment->id, true), seed),
                                  id_hash(whole(without_scheme(attachment->id), true), seed)};
    for (const std::uint64_t key : keys)
        answer_in_chain(ctx, attachment, key);
}
