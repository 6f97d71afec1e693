// failing_malloc.h - refuses chosen allocations, to see what a function does when memory runs out.
//
// Linking failing_malloc.cpp replaces malloc, calloc, realloc and free of the whole executable; they behave
// as usual until a scope is armed. operator new goes through malloc and throws std::bad_alloc, except in
// builds with AddressSanitizer, where new has an allocator of its own that is never refused.
//
// Only the thread that arms is concerned. Run nothing but the call under test while armed: GoogleTest's own
// checks allocate too.
#pragma once

#include <cstddef>

namespace failing_malloc {

enum class refuse { one, all_from };

struct thread_state {
    std::size_t asked = 0;
    std::size_t refuse_from = 0; // number of the first allocation to refuse; 0 none
    std::size_t refuse_to = 0;   // number of the last one
    std::size_t refused = 0;
    std::ptrdiff_t held = 0; // blocks handed out and not freed
    const void *watched = nullptr;
    char *last_sight = nullptr;
    std::size_t sight_length = 0;
};

inline constinit thread_local thread_state state;

// While it lives, allocation number `nth` (counted from 1) of this thread is refused, or every one from there on.
class scope {
public:
    explicit scope(std::size_t nth, refuse how = refuse::one)
    {
        state.refused = 0;
        state.refuse_from = state.asked + nth;
        state.refuse_to = how == refuse::one ? state.refuse_from : static_cast<std::size_t>(-1);
    }
    ~scope() { state.refuse_from = 0; }
    scope(const scope &) = delete;
    scope &operator=(const scope &) = delete;

    std::size_t refused() const { return state.refused; } // allocations refused so far
};

// Allocations asked for by this thread since its start.
inline std::size_t allocations()
{
    return state.asked;
}

// Blocks that this thread was handed out, less those that it has freed. It may be negative where others'
// blocks are freed: only a difference says something.
inline std::ptrdiff_t held()
{
    return state.held;
}

// When this thread frees `block`, its first `length` bytes are copied to `copy` as they are then.
inline void watch_free(const void *block, char *copy, std::size_t length)
{
    state.watched = block;
    state.last_sight = copy;
    state.sight_length = length;
}

// Runs `call` with allocation 1, 2, 3... refused, each followed by `check`, which may assert, until a run
// needs no more allocations. `check` takes whether an allocation was refused. Returns the number of runs in
// which one was refused.
template <class Call, class Check> std::size_t at_each_allocation(refuse how, Call call, Check check)
{
    for (std::size_t nth = 1;; ++nth) {
        bool refused = false;
        {
            const scope armed(nth, how);
            call();
            refused = armed.refused() > 0;
        }
        check(refused);
        if (!refused)
            return nth - 1;
    }
}

} // namespace failing_malloc
