// defaults.h - options that the command line doesn't give: from the environment, else from the configuration
// file.
#pragma once

#include <CLI/CLI.hpp>

#include "call_options.h"

namespace cli {

// Sets them, after the command line was read. An option --ca-file is ZUV_CA_FILE in the environment and ca-file
// in the file, $XDG_CONFIG_HOME/zuv/config or ~/.config/zuv/config, where it is for all commands or, in a section
// such as [profile] or [profile.get], for those. Passwords are in the file only, for `connection`; others' right
// to read it is warned of on standard error. Values are never shown.
// failure: EXIT_USAGE for a name that no option has or a value that it doesn't take, EXIT_FILE for a file that
// can't be read.
void apply_defaults(CLI::App &command, connection_options &connection);

} // namespace cli
