// trace_reader.h - a trace file as messages: requests and answers in their order in the file.
//
// Elsewhere: framing and compression (trace_body.h), what belongs together and what it means
// (trace_exchange.h).
//
// Always: any bytes may be read. What can't be parsed is kept as a message without a start line. Time grows
// with the file's size.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "trace_body.h"

namespace cli {

struct trace_message {
    bool request = false;
    std::string start_line; // empty for bytes without an HTTP head before them
    std::vector<std::pair<std::string, std::string>> headers;
    std::string body;                     // framing and compression undone
    std::size_t begin = 0, wire_size = 0; // offset and bytes in the trace
    bool complete = true;                 // false: it is cut off, or its body can't be decoded

    int status() const; // of an answer; 0 for none
    // Value of a header by its name, any case; empty for none.
    std::string_view header(std::string_view name) const;
};

// One message after the other.
class trace_reader {
public:
    explicit trace_reader(std::string_view trace);
    bool next(trace_message &message);           // false at the end
    std::size_t position() const { return at_; } // of the bytes that are still to be read

private:
    std::string_view trace_;
    std::size_t at_ = 0;
    trace_budget budget_;
};

bool same_name(std::string_view a, std::string_view b); // ignoring case

} // namespace cli
