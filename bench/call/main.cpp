// main.cpp - call_bench: calls per second and latency of a call with an answer of 2 KB, compared with other
// ways to make it. All ways take turns in short rounds, so a busy machine slows all of them; the ratios are
// medians over rounds.
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <string>
#include <vector>

#include <CLI/CLI.hpp>
#include <curl/curl.h>

#include "message.h"
#include "server.h"
#include "support/certificates.h"
#include "ways.h"

namespace {

using namespace call_bench;

// Where client and server run; -1 is any processor.
constexpr struct place {
    const char *title;
    int client_core, server_core;
} PLACES[] = {{", one core", 0, 0}, {", two cores", 0, 1}, {", free", -1, -1}};

double seconds_between(std::chrono::steady_clock::time_point from, std::chrono::steady_clock::time_point to)
{
    return std::chrono::duration<double>(to - from).count();
}

double at_part(std::vector<double> values, double part)
{
    const auto place =
        values.begin() + static_cast<std::ptrdiff_t>(part * static_cast<double>(values.size() - 1));
    std::nth_element(values.begin(), place, values.end());
    return *place;
}

struct measured {
    std::vector<double> latencies; // seconds, of all calls
    std::vector<double> rounds;    // seconds
};

void run_round(const way &one, int calls, measured &into)
{
    const auto began = std::chrono::steady_clock::now();
    auto last = began;
    for (int i = 0; i < calls; ++i) {
        one.call();
        const auto now = std::chrono::steady_clock::now();
        into.latencies.push_back(seconds_between(last, now));
        last = now;
    }
    into.rounds.push_back(seconds_between(began, last));
}

void measure(const char *title, const std::vector<way> &ways, int rounds, int calls)
{
    std::vector<measured> found(ways.size());
    for (const way &one : ways)
        for (int i = 0; i < 20; ++i)
            one.call();
    for (int round = 0; round < rounds; ++round)
        for (std::size_t i = 0; i < ways.size(); ++i)
            run_round(ways[i], calls, found[i]);
    std::printf("\n%-40s %10s %10s %10s %14s\n", title, "calls/s", "median us", "p99 us",
                (std::string("of ") + ways[0].name).c_str());
    for (std::size_t i = 0; i < ways.size(); ++i) {
        std::vector<double> ratios;
        for (std::size_t round = 0; round < found[i].rounds.size(); ++round)
            ratios.push_back(found[0].rounds[round] / found[i].rounds[round]);
        std::printf("%-40s %10.0f %10.1f %10.1f %14.2f\n", ways[i].name,
                    calls / at_part(found[i].rounds, 0.5), at_part(found[i].latencies, 0.5) * 1e6,
                    at_part(found[i].latencies, 0.99) * 1e6, at_part(ratios, 0.5));
    }
}

} // namespace

int main(int argc, char **argv)
{
    int rounds = 40, calls = 250;
    std::string only;
    CLI::App app("Measures calls, and other ways to make them");
    app.add_option("--rounds", rounds, "Rounds in which all ways take their turn")->capture_default_str();
    app.add_option("--calls", calls, "Calls of a way in a round, a tenth of them with new connections")
        ->capture_default_str();
    app.add_option("--only", only, "One way alone, plain and on a kept connection, for a profiler: its name");
    CLI11_PARSE(app, argc, argv);
    curl_global_init(CURL_GLOBAL_DEFAULT);
    certificates::authority authority;
    const certificates::key key = certificates::make_key();
    const std::string pair = authority.write_pair(
        "server.pem", authority.issue({"127.0.0.1", "IP:127.0.0.1"}, key.get()).get(), key.get());
    std::printf("an answer of %zu bytes, %d rounds of %d calls\n", answer().size(), rounds, calls);
    for (const bool tls : {false, true}) {
        if (tls && !only.empty())
            break;
        for (const place &where : PLACES) {
            const server peer(answer(), where.server_core, tls ? pair : "");
            bind_to_core(where.client_core);
            const target to{peer.port(), tls ? authority.ca_file() : ""};
            const std::string title = std::string(tls ? "TLS" : "TCP") + where.title;
            std::vector<way> kept = kept_ways(to);
            if (!only.empty())
                std::erase_if(kept, [&](const way &one) { return one.name != only; });
            if (!kept.empty())
                measure((title + ", kept connection").c_str(), kept, rounds, calls);
            if (only.empty())
                measure((title + ", new connections").c_str(), fresh_ways(to), rounds,
                        std::max(calls / 10, 1));
            bind_to_core(-1);
        }
    }
    curl_global_cleanup();
}
