// mapped_file.h - a file's bytes without a copy of them in memory, for files of any size.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace cli {

// What is appended meanwhile is not seen. A file that becomes shorter ends the program with EXIT_FILE.
class mapped_file {
public:
    // "-" for standard input, which is copied to a temporary file if it is a pipe. failure with EXIT_FILE.
    explicit mapped_file(const std::string &path);
    ~mapped_file();
    mapped_file(const mapped_file &) = delete;
    mapped_file &operator=(const mapped_file &) = delete;

    std::string_view bytes() const { return {data_, size_}; }
    // Gives the memory of the bytes before `offset` back. They may still be read, from the file again.
    void release_before(std::size_t offset);

private:
    const char *data_ = nullptr;
    std::size_t size_ = 0, released_ = 0;
};

} // namespace cli
