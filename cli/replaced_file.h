// replaced_file.h - a file that is written whole or not at all: what was in its place stays until then.
//
// Here: the temporary file next to it, also when a signal ends the program. Elsewhere: what is written.
#pragma once

#include <cstdio>
#include <string>

namespace cli {

class replaced_file {
public:
    // Devices and pipes are written directly. failure with EXIT_FILE.
    explicit replaced_file(std::string path);
    // Without `commit` the place is as it was.
    ~replaced_file();
    replaced_file(const replaced_file &) = delete;
    replaced_file &operator=(const replaced_file &) = delete;

    std::FILE *stream() const { return file_; }
    // Puts the file in its place. failure with EXIT_FILE.
    void commit();

private:
    void open_beside();
    [[noreturn]] void fail(const char *what);
    void discard();

    std::string path_, temporary_; // without a temporary file it is empty
    std::FILE *file_ = nullptr;
};

} // namespace cli
