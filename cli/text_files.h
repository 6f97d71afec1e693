// text_files.h - reads and writes whole files, and makes text safe for a terminal.
#pragma once

#include <cstdio>
#include <functional>
#include <memory>
#include <string>
#include <string_view>

namespace cli {

struct file_closer {
    void operator()(std::FILE *file) const { std::fclose(file); }
};
using file_handle = std::unique_ptr<std::FILE, file_closer>;

// A failure with EXIT_FILE, by errno; "-" is standard input.
[[noreturn]] void fail_file(const std::string &path, const char *what);

file_handle open_to_read(const std::string &path); // failure with EXIT_FILE

// The bytes of a file; "-" is standard input. failure with EXIT_FILE.
std::string read_file(const std::string &path);

// The first line of a file, without its end: a password. failure with EXIT_FILE.
std::string read_secret(const std::string &path);

// Writes a file, replacing one that exists once all is written; "-" is standard output. failure with EXIT_FILE.
void write_file(const std::string &path, std::string_view bytes);

// The same for what `write` writes.
void write_file(const std::string &path, const std::function<void(std::FILE *)> &write);

// Foreign text without what could control a terminal: control characters become "?", broken UTF-8 too.
// Line ends and tabs stay if `lines`, else they become blanks.
std::string printable(std::string_view text, bool lines = false);

// Bytes in words: "17 B", "4.2 kB", "3.1 MB".
std::string size_words(unsigned long long bytes);

// The text with ASCII letters in lower case.
std::string lower(std::string text);

} // namespace cli
