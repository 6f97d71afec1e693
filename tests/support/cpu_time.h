// cpu_time.h - the time that this thread has computed: what a busy machine doesn't change.
#pragma once

#include <ctime>

// Seconds.
inline double cpu_time()
{
    std::timespec now{};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
    return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) / 1e9;
}
