// trace_times.cpp - see trace_times.h.
#include "trace_times.h"

#include <algorithm>
#include <charconv>
#include <cstdio>

#include "call_report.h"

namespace cli {

namespace {

constexpr std::int64_t MICROSECONDS = 1000000, LAST_SECOND = 253402300799; // in the year 9999

template <class Number> bool take_number(std::string_view &line, Number &number)
{
    const auto [end, error] = std::from_chars(line.data(), line.data() + line.size(), number);
    if (error != std::errc() || end == line.data() + line.size() || *end != ' ')
        return false;
    line.remove_prefix(static_cast<std::size_t>(end - line.data()) + 1);
    return true;
}

} // namespace

trace_times::trace_times(std::string_view lines)
{
    while (!lines.empty()) {
        const std::size_t end = std::min(lines.find('\n'), lines.size());
        std::string_view line = lines.substr(0, end);
        lines.remove_prefix(std::min(end + 1, lines.size()));
        entry one{};
        if (!take_number(line, one.begin) || !take_number(line, one.time_us) || one.time_us <= 0 ||
            one.time_us / MICROSECONDS > LAST_SECOND)
            continue;
        if (line == "s")
            sent_.push_back(one);
        if (line == "r")
            received_.push_back(one);
    }
    const auto by_offset = [](const entry &a, const entry &b) { return a.begin < b.begin; };
    std::stable_sort(sent_.begin(), sent_.end(), by_offset);
    std::stable_sort(received_.begin(), received_.end(), by_offset);
}

trace_times::span trace_times::of(bool request, std::size_t begin, std::size_t size) const
{
    const std::vector<entry> &entries = request ? sent_ : received_;
    const auto after = [&](std::size_t offset) {
        return std::partition_point(entries.begin(), entries.end(),
                                    [=](const entry &one) { return one.begin <= offset; });
    };
    const auto first = after(begin), last = after(begin + std::max<std::size_t>(size, 1) - 1);
    if (first == entries.begin())
        return {};
    return {(first - 1)->time_us, (last - 1)->time_us};
}

std::string moment_words(std::int64_t time_us)
{
    if (time_us == 0)
        return "";
    std::string text = utc_time(time_us / MICROSECONDS);
    char part[8];
    std::snprintf(part, sizeof part, ".%03dZ", static_cast<int>(time_us % MICROSECONDS / 1000));
    return text.replace(text.size() - 1, 1, part);
}

std::string elapsed_words(std::int64_t from_us, std::int64_t to_us)
{
    if (from_us == 0 || to_us == 0)
        return "";
    char text[40];
    std::snprintf(text, sizeof text, "%.1f ms", milliseconds(to_us - from_us));
    return text;
}

} // namespace cli
