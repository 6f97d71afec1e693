// trace_command.h - a trace file shown: as a table or one exchange in the terminal, or as a page.
#pragma once

#include <cstddef>
#include <string>

#include "exit_codes.h"

namespace cli {

struct trace_options {
    std::string file = "wsTrace.log";
    std::string page;     // file for the page; empty: the table
    std::size_t show = 0; // number of the exchange to be shown; 0: the table
    bool failed = false;  // only exchanges that failed
    bool show_secrets = false;
};

exit_code show_trace(const trace_options &options); // throws failure

} // namespace cli
