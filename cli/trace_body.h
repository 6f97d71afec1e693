// trace_body.h - bodies of traced messages: framing and compression undone.
//
// A trace holds a compressed received message twice: each piece of raw bytes is followed by the plain text
// decoded from it. What was sent is there as it was sent.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace cli {

struct body_framing {
    bool chunked = false;
    bool length_known = false;
    std::uint64_t length = 0;
    bool compressed = false;
    bool received = false;
};

struct trace_body {
    std::string bytes;
    std::size_t end = 0;  // after the body and its plain copies
    bool complete = true; // framing and compression were intact to the end
};

// What reading may cost in total; bounds the work that a file can cause.
struct trace_budget {
    std::uint64_t inflated = 256U << 20;  // bytes
    std::uint64_t compared = 1024U << 20; // bytes
};

// The body that begins at `begin` of a trace.
trace_body read_trace_body(std::string_view trace, std::size_t begin, const body_framing &framing,
                           trace_budget &budget);

} // namespace cli
