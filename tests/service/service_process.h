// service_process.h - a zuv-service started for a test on a free port, and a directory for what it keeps.
//
// Always: whatever the test does, the process is gone and the directory removed at the end.
#pragma once

#include <filesystem>
#include <string>
#include <vector>

#include <sys/types.h>

namespace service_test {

class scratch_directory {
public:
    scratch_directory();
    ~scratch_directory();
    scratch_directory(const scratch_directory &) = delete;
    scratch_directory &operator=(const scratch_directory &) = delete;
    std::string file(const char *name) const { return path_ / name; }

private:
    std::filesystem::path path_;
};

// Whether the memory of a process tells what it holds.
#if defined(__SANITIZE_ADDRESS__)
constexpr bool MEMORY_IS_MEASURED = false; // the sanitizer keeps freed blocks
#elif defined(__has_feature)
constexpr bool MEMORY_IS_MEASURED = !__has_feature(address_sanitizer);
#else
constexpr bool MEMORY_IS_MEASURED = true;
#endif

class service_process {
public:
    // Starts the service and waits until it listens, at most START_LIMIT_MS. Its documents go when it goes,
    // however it ends, unless the options name a database.
    explicit service_process(std::vector<std::string> options = {});
    ~service_process();
    service_process(const service_process &) = delete;
    service_process &operator=(const service_process &) = delete;

    int port() const { return port_; } // 0: it did not start
    pid_t pid() const { return pid_; }
    std::string url(const char *port_name) const;
    bool running();
    long peak_memory() const; // kilobytes that it held at most so far

    // Ends it in an orderly way. Its exit status, or minus the signal that ended it.
    int stop();
    // Ends it at once.
    void kill();

private:
    int wait_for_end();

    scratch_directory scratch_;
    pid_t pid_ = -1;
    int output_ = -1;
    int port_ = 0;
};

} // namespace service_test
