// latency.h - how long calls took, as a summary.
#pragma once

#include <chrono>
#include <string>
#include <vector>

namespace cli {

using durations = std::vector<std::chrono::nanoseconds>;

// "20 calls in 1.31 s, 15.3/s; ms: min 0.41, median 0.52, 90 % 0.77, 99 % 2.10, max 2.10, mean 0.60"; nothing
// for no calls.
std::string latency_summary(durations calls, std::chrono::nanoseconds whole);

} // namespace cli
