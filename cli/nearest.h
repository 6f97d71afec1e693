// nearest.h - finds the word that a mistyped one was probably meant to be.
#pragma once

#include <string>
#include <vector>

namespace CLI {
class App;
}

namespace cli {

// The first of the candidates with the fewest letters to change, insert, drop or swap; empty if that takes more
// than a third of the word's letters.
std::string nearest(const std::string &word, const std::vector<std::string> &candidates);

// What is wrong with a command line that `app` could not parse, as far as a word of it is unknown or a command is
// missing, with the nearest word or the choice. Empty where nothing of that is found.
std::string misspelled(const CLI::App &app, const std::vector<std::string> &words);

} // namespace cli
