// service_process.h - a zuv-service started for a test on a free port.
//
// Always: whatever the test does, the process is gone and what it kept removed at the end.
#pragma once

#include <string>

#include <sys/types.h>

class service_process {
public:
    // Starts the service and waits until it listens, at most START_LIMIT_MS.
    service_process();
    ~service_process();
    service_process(const service_process &) = delete;
    service_process &operator=(const service_process &) = delete;

    int port() const { return port_; } // 0: it did not start
    pid_t pid() const { return pid_; }
    std::string url(const char *port_name) const;

    // Ends it in an orderly way. Its exit status, or minus the signal that ended it.
    int stop();

private:
    int end(int signal);

    std::string folder_;
    pid_t pid_ = -1;
    int output_ = -1;
    int port_ = 0;
};
