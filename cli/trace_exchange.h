// trace_exchange.h - messages of a trace put together: a request and its answers, and what they are about.
#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <string>
#include <string_view>
#include <vector>

#include "trace_reader.h"
#include "trace_times.h"

namespace cli {

// One part of a body: the whole of it, or one of several MIME parts or DIME records.
struct body_part {
    std::string type;       // media type, as stated
    std::string id;         // Content-ID; empty for none
    std::string name;       // of a file, as stated
    std::string_view bytes; // of the message
    bool xml = false;
    bool attached = false; // it came beside the SOAP message
};

std::vector<body_part> parts_of(const trace_message &message);

struct exchange {
    std::size_t number = 0;              // from 1, by the places of the first messages in the file
    std::vector<trace_message> messages; // the request first, if it is there
    std::string operation; // name of the element in the Body without "Request", or the HTTP method
    std::string target;    // path and query of the request
    std::string fault;     // text of a fault
    std::string doubt;     // why request and answer may not belong together; empty: they do
    int status = 0;        // of the last answer; 0: none came
    bool soap12 = false;
    bool complete = true;
    std::size_t sent = 0, received = 0; // bytes in the trace
    // When the first and last bytes of request and answer went over the wire; 0: not known.
    std::int64_t sent_first_us = 0, received_first_us = 0, last_us = 0; // since 1970

    bool failed() const { return !fault.empty() || status == 0 || status >= 300 || !complete; }
};

// One exchange after the other, in the order of their requests. Messages of several contexts may be mixed: an
// answer goes to the request that waits for it. Where several do, it is the one for the operation that the answer
// is of, or else the last of them, and `doubt` says so.
class exchange_reader {
public:
    exchange_reader(std::string_view trace, const trace_times &times) : messages_(trace), times_(times) {}
    bool next(exchange &found); // false at the end
    std::size_t position() const { return messages_.position(); }

private:
    // Whether an answer came that was perhaps its own: one that names no operation, or one for its operation.
    enum class contest { none, by_any, by_operation };
    struct entry {
        exchange content;
        bool waits = false; // for an answer
        int overtaken = 0;  // by answers to later requests
        contest contested = contest::none;
        std::size_t size = 0; // bytes in memory
    };
    void take(trace_message &&message);
    entry *asked_by(const trace_message &answer, const std::string &operation);
    bool is_ready() const;

    trace_reader messages_;
    const trace_times &times_;
    std::deque<entry> entries_;
    std::size_t count_ = 0;
    bool ended_ = false;
};

} // namespace cli
