// failing_malloc.cpp - the replaced allocation functions and the counters that arm them. Underneath lies the
// C library's allocator, or the sanitizer's where there is one.
#include "support/failing_malloc.h"

#include <cerrno>
#include <cstring>

#include "support/torture.h"

extern "C" {
void *__libc_malloc(std::size_t size);
void *__libc_calloc(std::size_t count, std::size_t size);
void *__libc_realloc(void *block, std::size_t size);
void __libc_free(void *block);
__attribute__((weak)) void *__interceptor_malloc(std::size_t size);
__attribute__((weak)) void *__interceptor_calloc(std::size_t count, std::size_t size);
__attribute__((weak)) void *__interceptor_realloc(void *block, std::size_t size);
__attribute__((weak)) void __interceptor_free(void *block);
}

// A request beyond the address space is refused by a sanitizer's allocator too, in place of ending the test.
extern "C" __attribute__((visibility("default"))) const char *__asan_default_options()
{
    return "allocator_may_return_null=1";
}

#define CALLER __builtin_return_address(0)

namespace {

using failing_malloc::state;

bool refuse_this_one(const void *caller)
{
    ++state.asked;
    if (torture::refuses(caller))
        return true;
    if (state.refuse_from == 0 || state.asked < state.refuse_from || state.asked > state.refuse_to)
        return false;
    ++state.refused;
    errno = ENOMEM;
    return true;
}

void *counted(void *block, const void *caller)
{
    state.held += block != nullptr;
    return torture::given(block, caller);
}

} // namespace

extern "C" __attribute__((visibility("default"))) void *malloc(std::size_t size)
{
    if (refuse_this_one(CALLER))
        return nullptr;
    return counted(__interceptor_malloc != nullptr ? __interceptor_malloc(size) : __libc_malloc(size),
                   CALLER);
}

extern "C" __attribute__((visibility("default"))) void *calloc(std::size_t count, std::size_t size)
{
    if (refuse_this_one(CALLER))
        return nullptr;
    return counted(__interceptor_calloc != nullptr ? __interceptor_calloc(count, size)
                                                   : __libc_calloc(count, size),
                   CALLER);
}

extern "C" __attribute__((visibility("default"))) void *realloc(void *block, std::size_t size)
{
    if (refuse_this_one(CALLER))
        return nullptr;
    void *const moved =
        __interceptor_realloc != nullptr ? __interceptor_realloc(block, size) : __libc_realloc(block, size);
    if (block == nullptr)
        return counted(moved, CALLER);
    state.held -= moved == nullptr && size == 0;
    if (moved != nullptr || size == 0)
        torture::taken_back(block);
    return torture::given(moved, CALLER);
}

extern "C" __attribute__((visibility("default"))) void free(void *block)
{
    state.held -= block != nullptr;
    torture::taken_back(block);
    if (block != nullptr && block == state.watched) {
        std::memcpy(state.last_sight, block, state.sight_length);
        state.watched = nullptr;
    }
    if (__interceptor_free != nullptr)
        __interceptor_free(block);
    else
        __libc_free(block);
}
