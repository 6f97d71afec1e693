// failure.h - what stops a command early: an exit code and words for standard error.
#pragma once

#include <stdexcept>
#include <string>

#include "exit_codes.h"

namespace cli {

struct failure : std::runtime_error {
    failure(exit_code ends_with, const std::string &words) : std::runtime_error(words), code(ends_with) {}
    exit_code code;
};

} // namespace cli
