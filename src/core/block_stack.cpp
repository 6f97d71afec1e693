// block_stack.cpp - stacks of block lists, in which a stored message or an array of unknown size gathers.
//
// Always: a stack's total is the sum of the sizes of the blocks that it still has. Blocks and headers are
// tracked allocations; what is left of them at the end of a call goes with soap_call_scratch_free.
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>

#include "core/failure.h"
#include "core/memory.h"

static_assert(sizeof(soap_block) % 8 == 0, "data areas are aligned to 8");

namespace {

void *out_of_memory(soap *ctx)
{
    return fail_null(ctx, SOAP_OUT_OF_MEMORY);
}

char *block_data(soap_block *block)
{
    return block == nullptr ? nullptr : reinterpret_cast<char *>(block + 1);
}

soap_block_stack *stack_or_top(soap *ctx, soap_block_stack *stack)
{
    return stack != nullptr ? stack : ctx->block_stack;
}

} // namespace

soap_block_stack *soap_block_stack_push(soap *ctx)
{
    auto *stack = static_cast<soap_block_stack *>(SOAP_MALLOC(ctx, sizeof(soap_block_stack)));
    if (stack == nullptr)
        return static_cast<soap_block_stack *>(out_of_memory(ctx));
    *stack = {ctx->block_stack, nullptr, 0};
    ctx->block_stack = stack;
    return stack;
}

void *soap_block_stack_grow(soap *ctx, soap_block_stack *stack, std::size_t size)
{
    stack = stack_or_top(ctx, stack);
    if (stack == nullptr)
        return nullptr;
    if (size > SIZE_MAX - sizeof(soap_block) - stack->total_size)
        return out_of_memory(ctx);
    auto *block = static_cast<soap_block *>(SOAP_MALLOC(ctx, sizeof(soap_block) + size));
    if (block == nullptr)
        return out_of_memory(ctx);
    *block = {stack->first_block, size};
    stack->first_block = block;
    stack->total_size += size;
    return block_data(block);
}

char *soap_block_stack_first(soap *ctx, soap_block_stack *stack)
{
    stack = stack_or_top(ctx, stack);
    if (stack == nullptr)
        return nullptr;
    soap_block *reversed = nullptr;
    for (soap_block *block = stack->first_block; block != nullptr;) {
        soap_block *next = block->next;
        block->next = reversed;
        reversed = block;
        block = next;
    }
    stack->first_block = reversed;
    return block_data(reversed);
}

char *soap_block_stack_next(soap *ctx, soap_block_stack *stack)
{
    stack = stack_or_top(ctx, stack);
    if (stack == nullptr || stack->first_block == nullptr)
        return nullptr;
    soap_block *passed = stack->first_block;
    stack->first_block = passed->next;
    stack->total_size -= passed->size;
    SOAP_FREE(ctx, passed);
    return block_data(stack->first_block);
}

std::size_t soap_block_stack_size(soap *ctx, soap_block_stack *stack)
{
    stack = stack_or_top(ctx, stack);
    return stack == nullptr || stack->first_block == nullptr ? 0 : stack->first_block->size;
}

std::size_t soap_block_stack_trim(soap *ctx, soap_block_stack *stack, std::size_t size)
{
    stack = stack_or_top(ctx, stack);
    if (stack == nullptr)
        return 0;
    soap_block *newest = stack->first_block;
    if (newest != nullptr && size < newest->size) {
        stack->total_size -= newest->size - size;
        newest->size = size;
    }
    return stack->total_size;
}

namespace {

// Copies the blocks in order of age to `place`, freeing each as it goes.
void gather(soap *ctx, soap_block_stack *stack, char *place, block_moved moved)
{
    char *data = soap_block_stack_first(ctx, stack);
    while (data != nullptr) {
        const std::size_t size = stack->first_block->size;
        std::memcpy(place, data, size);
        if (moved != nullptr)
            moved(ctx, data, data + size, place, data);
        place += size;
        data = soap_block_stack_next(ctx, stack);
    }
}

} // namespace

void *block_stack_gather(soap *ctx, soap_block_stack *stack, void *target, block_moved moved)
{
    stack = stack_or_top(ctx, stack);
    if (stack == nullptr)
        return target;
    if (target == nullptr)
        target = soap_block_alloc(ctx, stack->total_size);
    if (target == nullptr)
        fail(ctx, SOAP_OUT_OF_MEMORY);
    else if (stack->total_size > 0)
        gather(ctx, stack, static_cast<char *>(target), moved);
    soap_block_stack_drop(ctx, stack);
    return target;
}

void soap_block_stack_drop(soap *ctx, soap_block_stack *stack)
{
    stack = stack_or_top(ctx, stack);
    soap_block_stack **link = &ctx->block_stack;
    while (*link != nullptr && *link != stack)
        link = &(*link)->next_stack;
    if (*link == nullptr)
        return;
    *link = stack->next_stack;
    while (stack->first_block != nullptr)
        soap_block_stack_next(ctx, stack);
    SOAP_FREE(ctx, stack);
}
