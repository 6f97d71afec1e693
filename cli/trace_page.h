// trace_page.h - exchanges of a trace as one HTML page that needs no other file.
//
// Here: the page, written while the trace is read. Elsewhere: how it looks (trace_style.h), search, filter and
// colours (trace_script.h), without which all of it can be read too.
#pragma once

#include <cstdio>
#include <functional>
#include <string>

#include "trace_exchange.h"

namespace cli {

// Whatever the messages hold is shown as text. The file's error flag shows failures.
//   title  the trace's file name
//   next   gives the exchanges; false at the end
void write_trace_page(std::FILE *file, const std::string &title, bool show_secrets,
                      const std::function<bool(exchange &)> &next);

} // namespace cli
