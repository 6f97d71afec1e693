// check_command.h - documents checked from the command line.
#pragma once

#include <string>
#include <vector>

#include "exit_codes.h"

namespace cli {

// Prints what is wrong with each file to standard error as "FILE:LINE:COLUMN: reason", the valid ones to
// standard output. `class_name` empty: the root element determines the class. EXIT_DOCUMENT if something is
// wrong.
exit_code check_files(const std::vector<std::string> &files, const std::string &class_name);

} // namespace cli
