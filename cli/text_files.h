// text_files.h - reads and writes whole files, and makes text safe for a terminal.
#pragma once

#include <string>
#include <string_view>

namespace cli {

// The bytes of a file; "-" is standard input. failure with EXIT_FILE.
std::string read_file(const std::string &path);

// The first line of a file, without its end: a password. failure with EXIT_FILE.
std::string read_secret(const std::string &path);

// Writes a file, replacing one that exists once all is written; "-" is standard output. failure with EXIT_FILE.
void write_file(const std::string &path, std::string_view bytes);

// Foreign text without what could control a terminal: control characters become "?", broken UTF-8 too.
// Line ends and tabs stay if `lines`, else they become blanks.
std::string printable(std::string_view text, bool lines = false);

// Bytes in words: "17 B", "4.2 kB", "3.1 MB".
std::string size_words(unsigned long long bytes);

} // namespace cli
