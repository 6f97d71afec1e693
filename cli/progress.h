// progress.h - how far long work has come, on the terminal's last line. Silent when standard error is no
// terminal.
#pragma once

#include <chrono>
#include <string>

namespace cli {

class progress {
public:
    // `total` 0: unknown. Nothing is shown if `quiet`.
    progress(std::string what, unsigned long long total, bool bytes, bool quiet);
    progress(const progress &) = delete;
    progress &operator=(const progress &) = delete;
    ~progress(); // wipes the line

    void advance(unsigned long long by);

private:
    void show();
    std::string what_;
    unsigned long long total_, done_ = 0;
    bool bytes_, shown_;
    std::chrono::steady_clock::time_point began_, last_;
};

} // namespace cli
