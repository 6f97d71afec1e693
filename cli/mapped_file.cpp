// mapped_file.cpp - see mapped_file.h.
#include "mapped_file.h"

#include <cerrno>
#include <csignal>
#include <cstdio>

#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include "exit_codes.h"
#include "text_files.h"

namespace cli {

namespace {

constexpr std::size_t STRETCH = 65536, RELEASED_AT_ONCE = 1U << 20; // bytes

bool is_regular(std::FILE *file, struct stat &status)
{
    return fstat(fileno(file), &status) == 0 && S_ISREG(status.st_mode);
}

file_handle copy_of(std::FILE *source, const std::string &path)
{
    file_handle copy(std::tmpfile());
    if (!copy)
        fail_file(path, "there is no temporary file for it");
    char stretch[STRETCH];
    for (std::size_t got; (got = std::fread(stretch, 1, sizeof stretch, source)) != 0;)
        if (std::fwrite(stretch, 1, got, copy.get()) != got)
            fail_file(path, "can't be copied");
    if (std::ferror(source) != 0 || std::fflush(copy.get()) != 0)
        fail_file(path, "can't be read");
    return copy;
}

// A trace may be cut short by what rotates it: its bytes are gone then, and there is nothing left to show.
[[noreturn]] void end_without_bytes(int)
{
    constexpr std::string_view text = "zuv: the file became shorter while it was read\n";
    static_cast<void>(!write(STDERR_FILENO, text.data(), text.size()));
    _exit(EXIT_FILE);
}

} // namespace

mapped_file::mapped_file(const std::string &path)
{
    file_handle opened = path == "-" ? nullptr : open_to_read(path);
    struct stat status {};
    std::FILE *file = opened ? opened.get() : stdin;
    if (!is_regular(file, status) || lseek(fileno(file), 0, SEEK_CUR) != 0) {
        opened = copy_of(file, path);
        file = opened.get();
        is_regular(file, status);
    }
    size_ = static_cast<std::size_t>(status.st_size);
    if (static_cast<off_t>(size_) != status.st_size) { // more than addresses reach
        errno = EFBIG;
        fail_file(path, "can't be read");
    }
    if (size_ == 0)
        return;
    void *const mapped = mmap(nullptr, size_, PROT_READ, MAP_PRIVATE, fileno(file), 0);
    if (mapped == MAP_FAILED)
        fail_file(path, "can't be read");
    madvise(mapped, size_, MADV_SEQUENTIAL);
    data_ = static_cast<const char *>(mapped);
    std::signal(SIGBUS, end_without_bytes);
}

mapped_file::~mapped_file()
{
    if (data_ != nullptr)
        munmap(const_cast<char *>(data_), size_);
}

void mapped_file::release_before(std::size_t offset)
{
    const std::size_t end = offset / RELEASED_AT_ONCE * RELEASED_AT_ONCE; // of whole pages
    if (end <= released_)
        return;
    madvise(const_cast<char *>(data_) + released_, end - released_, MADV_DONTNEED);
    released_ = end;
}

} // namespace cli
