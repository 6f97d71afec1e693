// data_files.cpp - see data_files.h.
#include "data_files.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <system_error>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace service {

namespace {

constexpr std::string_view ARRIVING = "arriving-";

std::string path_of(const std::string &directory, std::string_view name)
{
    return directory + "/" + std::string(name);
}

[[noreturn]] void fail(const std::string &path)
{
    throw std::system_error(errno, std::generic_category(), path);
}

// A file's name is part of its directory, which must be written to the disk as well.
void flush_directory(const std::string &directory)
{
    const int descriptor = open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    const bool flushed = descriptor >= 0 && fsync(descriptor) == 0;
    const int error = errno;
    if (descriptor >= 0)
        close(descriptor);
    errno = error;
    if (!flushed)
        fail(directory);
}

} // namespace

arriving_file::arriving_file(const std::string &directory)
    : directory_(directory), path_(path_of(directory, std::string(ARRIVING) + "XXXXXX"))
{
    descriptor_ = mkostemp(path_.data(), O_CLOEXEC);
    if (descriptor_ < 0)
        fail(path_);
}

arriving_file::~arriving_file()
{
    close_descriptor();
    if (!path_.empty())
        unlink(path_.c_str());
}

void arriving_file::write(const char *data, std::size_t length)
{
    while (length != 0) {
        const ssize_t written = ::write(descriptor_, data, length);
        if (written < 0 && errno == EINTR)
            continue;
        if (written < 0)
            fail(path_);
        data += written;
        length -= static_cast<std::size_t>(written);
        size_ += static_cast<std::size_t>(written);
    }
}

void arriving_file::close_descriptor()
{
    if (descriptor_ >= 0)
        close(descriptor_);
    descriptor_ = -1;
}

void arriving_file::flush()
{
    if (descriptor_ < 0)
        return;
    if (fdatasync(descriptor_) != 0)
        fail(path_);
    close_descriptor();
}

void arriving_file::keep_as(std::string_view name)
{
    flush();
    if (rename(path_.c_str(), path_of(directory_, name).c_str()) != 0)
        fail(path_);
    path_.clear();
    flush_directory(directory_);
}

kept_file::kept_file(const std::string &directory, std::string_view name)
    : descriptor_(open(path_of(directory, name).c_str(), O_RDONLY | O_CLOEXEC))
{
    struct stat about = {};
    if (descriptor_ < 0 || fstat(descriptor_, &about) != 0)
        fail(path_of(directory, name));
    size_ = static_cast<std::uint64_t>(about.st_size);
}

kept_file::~kept_file()
{
    close(descriptor_);
}

std::size_t kept_file::read(char *buffer, std::size_t length)
{
    ssize_t count;
    do
        count = pread(descriptor_, buffer, length, static_cast<off_t>(position_));
    while (count < 0 && errno == EINTR);
    if (count < 0)
        return 0;
    position_ += static_cast<std::uint64_t>(count);
    return static_cast<std::size_t>(count);
}

void open_data_directory(const std::string &directory)
{
    if (mkdir(directory.c_str(), S_IRWXU) == 0 ? chmod(directory.c_str(), S_IRWXU) != 0 : errno != EEXIST)
        fail(directory);
}

void remove_data(const std::string &directory, std::string_view name)
{
    unlink(path_of(directory, name).c_str());
}

void sweep_data(const std::string &directory, const std::function<bool(std::string_view name)> &known)
{
    for (const auto &entry : std::filesystem::directory_iterator(directory)) {
        const std::string name = entry.path().filename();
        if (name.starts_with(ARRIVING) || !known(name))
            remove_data(directory, name);
    }
}

} // namespace service
