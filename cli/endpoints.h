// endpoints.h - addresses of a service: those that are given, completed by the paths of its ports.
#pragma once

#include <string>
#include <vector>

#include "operations.h"

namespace cli {

// An address, with the port's usual path if it has none. failure with EXIT_USAGE if it is none.
std::string full_address(const std::string &address, const port &of);

// All addresses for a call, separated by blanks as the library expects them: each is tried when the one before
// can't be reached. failure with EXIT_USAGE.
std::string call_addresses(const std::vector<std::string> &given, const port &of);

} // namespace cli
