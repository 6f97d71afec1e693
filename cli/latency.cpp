// latency.cpp - see latency.h.
#include "latency.h"

#include <algorithm>
#include <cstdio>
#include <numeric>

namespace cli {

namespace {

double milliseconds(std::chrono::nanoseconds time)
{
    return std::chrono::duration<double, std::milli>(time).count();
}

} // namespace

std::string latency_summary(durations calls, std::chrono::nanoseconds whole)
{
    if (calls.empty())
        return "";
    std::sort(calls.begin(), calls.end());
    const auto share = [&](std::size_t percent) { // nearest rank
        return milliseconds(calls[(calls.size() * percent + 99) / 100 - 1]);
    };
    const double seconds = std::chrono::duration<double>(whole).count();
    const auto sum = std::accumulate(calls.begin(), calls.end(), std::chrono::nanoseconds(0));
    char text[256];
    std::snprintf(
        text, sizeof text,
        "%zu calls in %.2f s, %.1f/s; ms: min %.2f, median %.2f, 90 %% %.2f, 99 %% %.2f, max %.2f, mean %.2f",
        calls.size(), seconds, seconds > 0 ? static_cast<double>(calls.size()) / seconds : 0,
        milliseconds(calls.front()), share(50), share(90), share(99), milliseconds(calls.back()),
        milliseconds(sum) / static_cast<double>(calls.size()));
    return text;
}

} // namespace cli
