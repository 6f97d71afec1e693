// call_command.h - one operation called from the command line: the request is read, the calls are made, the
// answer is printed.
#pragma once

#include "call_options.h"
#include "exit_codes.h"
#include "operations.h"

namespace cli {

exit_code call_operation(const operation &op, const call_options &options); // throws failure

} // namespace cli
