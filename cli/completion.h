// completion.h - what can come next on the command line, for the shell (completion/zuv.bash).
#pragma once

#include <string>
#include <vector>

#include <CLI/CLI.hpp>

namespace cli {

// Candidates for the last of the words after the program's name: commands, options, classes. None where a
// file or a text is expected.
std::vector<std::string> completions(const CLI::App &app, const std::vector<std::string> &words);

} // namespace cli
