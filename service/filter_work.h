// filter_work.h - how much the filters of one request may look at.
//
// A filter may be named many times in a request, compare long texts, and be judged for each of many items, so
// the work it causes is unrelated to the size of the request. All of it is counted in one place.
#pragma once

#include <cstdint>
#include <stdexcept>

struct soap;

namespace service {

// A filter that can't be evaluated: it is meaningless or too complex.
struct filter_error : std::runtime_error {
    filter_error(const char *text, bool complex) : std::runtime_error(text), too_complex(complex) {}
    bool too_complex;
};

constexpr unsigned FILTER_DEPTH_MAX = 100;        // operators within each other
constexpr std::size_t FILTER_TEXT_MAX = 64 << 10; // bytes that one comparison compares with
constexpr std::uint64_t FILTER_WORK_MAX =
    100'000'000; // for one request: bytes compared; a node counts NODE_WORK
constexpr std::uint64_t NODE_WORK = 100,
                        VALUE_WORK = 100; // of a node, and of a value in addition to its bytes

struct filter_work {
    soap *ctx; // whose parser reads points in time
    std::uint64_t left = FILTER_WORK_MAX;

    // Throws filter_error when less is left.
    void spend(std::uint64_t work)
    {
        if (work > left)
            throw filter_error("the filters of the request are too complex", true);
        left -= work;
    }
};

} // namespace service
