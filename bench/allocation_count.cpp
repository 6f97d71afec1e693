// allocation_count.cpp - malloc and its family, in front of the C library's own.
#include "allocation_count.h"

#include <malloc.h>

extern "C" {
void *__libc_malloc(std::size_t size);
void *__libc_calloc(std::size_t count, std::size_t size);
void *__libc_realloc(void *block, std::size_t size);
void __libc_free(void *block);
}

namespace {

bool counting = false;
allocation_count counted;
std::ptrdiff_t held = 0; // bytes; negative while blocks from before the measurement are freed

void *taken(void *block)
{
    if (block == nullptr)
        return block;
    ++counted.blocks;
    held += static_cast<std::ptrdiff_t>(malloc_usable_size(block));
    if (held > static_cast<std::ptrdiff_t>(counted.peak))
        counted.peak = static_cast<std::size_t>(held);
    return block;
}

void given_back(void *block)
{
    if (block != nullptr)
        held -= static_cast<std::ptrdiff_t>(malloc_usable_size(block));
}

} // namespace

extern "C" void *malloc(std::size_t size)
{
    if (!counting) [[likely]]
        return __libc_malloc(size);
    return taken(__libc_malloc(size));
}

extern "C" void *calloc(std::size_t count, std::size_t size)
{
    if (!counting) [[likely]]
        return __libc_calloc(count, size);
    return taken(__libc_calloc(count, size));
}

extern "C" void *realloc(void *block, std::size_t size)
{
    if (!counting) [[likely]]
        return __libc_realloc(block, size);
    given_back(block);
    return taken(__libc_realloc(block, size));
}

extern "C" void free(void *block)
{
    if (counting) [[unlikely]]
        given_back(block);
    __libc_free(block);
}

void allocation_count_begin()
{
    counted = {};
    held = 0;
    counting = true;
}

allocation_count allocation_count_end()
{
    counting = false;
    return counted;
}
