// progress.cpp - see progress.h.
#include "progress.h"

#include <cstdio>
#include <unistd.h>
#include <utility>

#include "text_files.h"

namespace cli {

namespace {

constexpr std::chrono::milliseconds BETWEEN(100);
constexpr int BAR = 30; // characters

} // namespace

progress::progress(std::string what, unsigned long long total, bool bytes, bool quiet)
    : what_(std::move(what)), total_(total), bytes_(bytes), shown_(!quiet && isatty(STDERR_FILENO) != 0),
      began_(std::chrono::steady_clock::now()), last_(began_)
{}

progress::~progress()
{
    if (shown_)
        std::fprintf(stderr, "\r\033[K");
}

void progress::advance(unsigned long long by)
{
    done_ += by;
    const auto now = std::chrono::steady_clock::now();
    if (!shown_ || (now - last_ < BETWEEN && done_ != total_))
        return;
    last_ = now;
    show();
}

void progress::show()
{
    const auto words = [&](unsigned long long n) { return bytes_ ? size_words(n) : std::to_string(n); };
    const double seconds = std::chrono::duration<double>(last_ - began_).count();
    const auto rate = static_cast<unsigned long long>(seconds > 0 ? static_cast<double>(done_) / seconds : 0);
    std::string line = printable(what_) + "  ";
    if (total_ != 0) {
        const double part = done_ < total_ ? static_cast<double>(done_) / static_cast<double>(total_) : 1;
        const int filled = static_cast<int>(part * BAR);
        line += "[" + std::string(static_cast<std::size_t>(filled), '#') +
                std::string(static_cast<std::size_t>(BAR - filled), '.') + "] " +
                std::to_string(static_cast<int>(part * 100)) + " %  ";
    }
    line += words(done_) + (total_ != 0 ? " of " + words(total_) : "") + "  " + words(rate) + "/s";
    std::fprintf(stderr, "\r%s\033[K", line.c_str());
    std::fflush(stderr);
}

} // namespace cli
