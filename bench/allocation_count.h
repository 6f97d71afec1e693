// allocation_count.h - counts what a piece of work takes from malloc: blocks, and the most bytes held at one
// time.
//
// The whole program's malloc goes through the counter; outside of a measurement it costs one branch.
#pragma once

#include <cstddef>

struct allocation_count {
    std::size_t blocks = 0; // calls that gave a block
    std::size_t peak = 0;   // bytes, beyond what was held when the measurement began
};

// One measurement at a time, on one thread.
void allocation_count_begin();
allocation_count allocation_count_end();
