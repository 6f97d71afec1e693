// trace_page.h - exchanges of a trace as one HTML page that needs no other file and runs no script.
#pragma once

#include <string>
#include <vector>

#include "trace_exchange.h"

namespace cli {

// `title`: the trace's file name. Whatever the messages hold is shown as text.
std::string trace_page(const std::string &title, const std::vector<exchange> &exchanges, bool show_secrets);

} // namespace cli
