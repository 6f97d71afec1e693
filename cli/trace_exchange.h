// trace_exchange.h - messages of a trace put together: a request and its answers, and what they are about.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "trace_reader.h"

namespace cli {

// One part of a body: the whole of it, or one of several MIME parts.
struct body_part {
    std::string type;       // media type, as stated
    std::string id;         // Content-ID; empty for none
    std::string_view bytes; // of the message
    bool xml = false;
};

struct exchange {
    std::vector<const trace_message *> messages; // the request first, if it is there
    std::string operation;                       // local name of the element in the Body, or the HTTP method
    std::string target;                          // path and query of the request
    std::string fault;                           // text of a fault
    int status = 0;                              // of the last answer; 0: none came
    bool soap12 = false;
    bool complete = true;
    std::size_t sent = 0, received = 0; // bytes in the trace

    bool failed() const { return !fault.empty() || status == 0 || status >= 300 || !complete; }
};

std::vector<exchange> exchanges_of(const std::vector<trace_message> &messages);

std::vector<body_part> parts_of(const trace_message &message);

} // namespace cli
