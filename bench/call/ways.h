// ways.h - the ways to make the call that are measured.
#pragma once

#include <functional>
#include <string>
#include <vector>

namespace call_bench {

struct way {
    const char *name;
    std::function<void()> call; // makes one call; throws if its answer isn't the one expected
};

struct target {
    int port;
    std::string ca; // file of certificates to trust; empty: plain
    std::string url() const
    {
        return (ca.empty() ? "http://127.0.0.1:" : "https://127.0.0.1:") + std::to_string(port) + "/profile";
    }
};

// On one kept connection each. Bare exchange first (plain only), the library second.
std::vector<way> kept_ways(const target &to);

// A connection anew for each call, TLS with and without the session of the last.
std::vector<way> fresh_ways(const target &to);

} // namespace call_bench
