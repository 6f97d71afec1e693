// trace_times.h - when the bytes of a trace were sent and received, from the file beside it.
//
// Elsewhere: who writes it (the library's trace log, with soap_log_set).
// Always: any bytes may be read; a line that says nothing is passed over.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace cli {

class trace_times {
public:
    trace_times() = default;
    // Lines of an offset in the trace, microseconds since 1970, and "s" or "r".
    explicit trace_times(std::string_view lines);

    struct span {
        std::int64_t first_us = 0, last_us = 0; // since 1970; 0: not known
    };
    // Of the bytes from `begin` on, of a request or an answer.
    span of(bool request, std::size_t begin, std::size_t size) const;

private:
    struct entry {
        std::size_t begin;
        std::int64_t time_us;
    };
    std::vector<entry> sent_, received_; // by offset
};

// "2026-11-22T17:03:01.123Z"; empty for 0.
std::string moment_words(std::int64_t time_us);

// "35.1 ms" from one time to the other; empty where one isn't known.
std::string elapsed_words(std::int64_t from_us, std::int64_t to_us);

} // namespace cli
