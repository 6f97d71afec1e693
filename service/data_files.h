// data_files.h - the bytes of attachments, each in a file of its own in one directory.
//
// Elsewhere: which of them are known, and their sizes (store.h); how they travel (enclosures.h, data_port.h).
// Always: a file has its name only once all of it is on the disk; what was not kept is removed. Failures of
// the system throw std::system_error.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <string_view>

namespace service {

// A file that is being written, under a temporary name.
class arriving_file {
public:
    explicit arriving_file(const std::string &directory);
    ~arriving_file(); // removes it unless it was kept
    arriving_file(const arriving_file &) = delete;
    arriving_file &operator=(const arriving_file &) = delete;

    void write(const char *data, std::size_t length);
    void
    flush(); // no more bytes follow: writes them to the disk, which may take long, and closes the descriptor
    std::uint64_t size() const { return size_; }

    // Renames it, flushed or not; replaces the file that had the name.
    void keep_as(std::string_view name);

private:
    void close_descriptor();

    std::string directory_, path_; // empty path: it was kept
    int descriptor_ = -1;
    std::uint64_t size_ = 0;
};

// A kept file, for reading; it can be read to its end even if it is renamed or removed meanwhile.
class kept_file {
public:
    kept_file(const std::string &directory, std::string_view name);
    ~kept_file();
    kept_file(const kept_file &) = delete;
    kept_file &operator=(const kept_file &) = delete;

    std::uint64_t size() const { return size_; }

    // Bytes read, at most `length`; 0 at the end.
    std::size_t read(char *buffer, std::size_t length);

private:
    int descriptor_;
    std::uint64_t size_ = 0, position_ = 0;
};

// Creates the directory unless it exists, for its owner alone (mode 0700) whatever the umask is.
void open_data_directory(const std::string &directory);

// Removes a file, if it exists.
void remove_data(const std::string &directory, std::string_view name);

// Removes what a killed process has left: files that were arriving, and those for which `known` is false.
void sweep_data(const std::string &directory, const std::function<bool(std::string_view name)> &known);

} // namespace service
