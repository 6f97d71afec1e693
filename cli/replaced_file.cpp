// replaced_file.cpp - see replaced_file.h.
#include "replaced_file.h"

#include <array>
#include <atomic>
#include <cerrno>
#include <climits>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <system_error>
#include <utility>

#include <sys/stat.h>
#include <unistd.h>

#include "failure.h"

namespace cli {

namespace {

// The temporary files that a signal removes. More than these are not removed.
struct pending_file {
    std::atomic<bool> used{false};
    char path[PATH_MAX] = "";
};
std::array<pending_file, 8> pending;
static_assert(std::atomic<bool>::is_always_lock_free, "a signal handler reads it");

constexpr int ENDING_SIGNALS[] = {SIGINT, SIGTERM, SIGHUP};

extern "C" void remove_pending(int signal)
{
    for (const pending_file &one : pending)
        if (one.used)
            unlink(one.path);
    std::signal(signal, SIG_DFL);
    std::raise(signal);
}

void enter(const std::string &path)
{
    for (const int signal : ENDING_SIGNALS)
        if (std::signal(signal, remove_pending) == SIG_IGN) // as under nohup
            std::signal(signal, SIG_IGN);
    for (pending_file &one : pending)
        if (!one.used && path.size() < sizeof one.path) {
            path.copy(one.path, path.size());
            one.path[path.size()] = '\0';
            one.used = true;
            return;
        }
}

void leave(const std::string &path)
{
    for (pending_file &one : pending)
        if (one.used && path == one.path)
            one.used = false;
}

mode_t usual_mode()
{
    const mode_t mask = umask(0);
    umask(mask);
    return 0666 & ~mask;
}

} // namespace

replaced_file::replaced_file(std::string path) : path_(std::move(path))
{
    std::error_code error;
    const bool system = path_.starts_with("/dev/") ||
                        path_.starts_with("/proc/"); // such as /dev/stdout, which may lead to a file
    const std::filesystem::path target = std::filesystem::canonical(path_, error); // through links
    if (!error && !system)
        path_ = target.string();
    if (system ||
        (std::filesystem::exists(path_, error) && !std::filesystem::is_regular_file(path_, error))) {
        file_ = std::fopen(path_.c_str(), "wb");
        if (file_ == nullptr)
            fail("can't be opened");
        return;
    }
    open_beside();
}

void replaced_file::open_beside()
{
    struct stat existing {};
    const bool exists = stat(path_.c_str(), &existing) == 0;
    if (exists && access(path_.c_str(), W_OK) != 0)
        fail("can't be opened");
    temporary_ = path_ + ".XXXXXX";
    const int descriptor = mkstemp(temporary_.data());
    if (descriptor < 0) {
        temporary_.clear();
        fail("can't be opened");
    }
    enter(temporary_);
    if (fchmod(descriptor, exists ? existing.st_mode & 07777 : usual_mode()) != 0)
        fail("can't be opened");
    file_ = fdopen(descriptor, "wb");
    if (file_ == nullptr) {
        close(descriptor);
        fail("can't be opened");
    }
}

replaced_file::~replaced_file()
{
    discard();
}

void replaced_file::commit()
{
    std::FILE *const file = std::exchange(file_, nullptr);
    if (std::fclose(file) != 0 ||
        (!temporary_.empty() && std::rename(temporary_.c_str(), path_.c_str()) != 0))
        fail("can't be written");
    leave(temporary_);
    temporary_.clear();
}

void replaced_file::fail(const char *what)
{
    const int reason = errno;
    discard();
    throw failure(EXIT_FILE, path_ + ": " + what + ": " + std::generic_category().message(reason));
}

void replaced_file::discard()
{
    if (file_ != nullptr)
        std::fclose(std::exchange(file_, nullptr));
    if (temporary_.empty())
        return;
    unlink(temporary_.c_str());
    leave(temporary_);
    temporary_.clear();
}

} // namespace cli
