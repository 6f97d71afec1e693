// trace_command.h - a trace file shown: as a table in the terminal, or as a page.
#pragma once

#include <string>

#include "exit_codes.h"

namespace cli {

struct trace_options {
    std::string file = "wsTrace.log";
    std::string page; // file for the page; empty: the table
    bool show_secrets = false;
};

exit_code show_trace(const trace_options &options); // throws failure

} // namespace cli
