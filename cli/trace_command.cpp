// trace_command.cpp - see trace_command.h.
#include "trace_command.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <filesystem>
#include <vector>

#include "failure.h"
#include "mapped_file.h"
#include "text_files.h"
#include "trace_exchange.h"
#include "trace_page.h"
#include "trace_secrets.h"
#include "trace_text.h"

namespace cli {

namespace {

constexpr std::size_t COLUMNS = 9, CELL_MAX = 60; // characters
using row = std::array<std::string, COLUMNS>;

// Characters of UTF-8 text.
std::size_t width(const std::string &text)
{
    return static_cast<std::size_t>(std::count_if(
        text.begin(), text.end(), [](char c) { return (static_cast<unsigned char>(c) & 0xC0U) != 0x80; }));
}

std::string cell(std::string_view text)
{
    std::string clean = printable(text);
    if (width(clean) <= CELL_MAX)
        return clean;
    std::size_t end = 0;
    for (std::size_t characters = 0; characters < CELL_MAX - 3; ++end)
        characters += (static_cast<unsigned char>(clean[end + 1]) & 0xC0U) != 0x80 ? 1 : 0;
    return clean.substr(0, end) + "...";
}

row row_of(const exchange &one, bool show_secrets)
{
    std::string about = show_secrets ? one.fault : without_secrets(one.fault);
    if (about.empty() && !one.complete)
        about = "incomplete";
    if (about.empty())
        about = one.doubt;
    return {std::to_string(one.number),
            cell(one.operation.empty() ? "unknown" : one.operation),
            one.status == 0 ? "none" : std::to_string(one.status),
            one.soap12 ? "1.2" : "1.1",
            size_words(one.sent),
            size_words(one.received),
            moment_words(one.sent_first_us),
            elapsed_words(one.sent_first_us, one.last_us),
            cell(shown_start_line(one.target, show_secrets)) + (about.empty() ? "" : "  " + cell(about))};
}

// Columns without any content are left out.
std::string table(std::vector<row> rows)
{
    constexpr bool RIGHT[COLUMNS] = {true, false, false, false, true, true, false, true, false};
    row heads = {"#", "operation", "status", "SOAP", "sent", "received", "began", "took", "target"};
    for (std::size_t i = 0; i < COLUMNS && !rows.empty(); ++i)
        if (std::all_of(rows.begin(), rows.end(), [i](const row &one) { return one[i].empty(); }))
            heads[i].clear();
    rows.insert(rows.begin(), heads);
    std::array<std::size_t, COLUMNS> widths{};
    for (const row &one : rows)
        for (std::size_t i = 0; i < COLUMNS; ++i)
            widths[i] = std::max(widths[i], width(one[i]));
    std::string text;
    for (const row &one : rows) {
        for (std::size_t i = 0; i < COLUMNS; ++i) {
            if (widths[i] == 0)
                continue;
            const std::string gap(widths[i] - width(one[i]), ' ');
            text += RIGHT[i] ? gap + one[i] : i + 1 < COLUMNS ? one[i] + gap : one[i];
            text += i + 1 < COLUMNS ? "  " : "\n";
        }
    }
    return text;
}

// Read if the trace has them.
trace_times times_beside(const std::string &trace)
{
    const std::string path = trace + ".times";
    std::error_code error;
    if (trace == "-" || !std::filesystem::is_regular_file(path, error))
        return {};
    return trace_times(mapped_file(path).bytes());
}

} // namespace

exit_code show_trace(const trace_options &options)
{
    mapped_file file(options.file);
    const trace_times times = times_beside(options.file);
    exchange_reader exchanges(file.bytes(), times);
    const auto next = [&](exchange &one) {
        bool found = exchanges.next(one);
        while (found && options.failed && !one.failed())
            found = exchanges.next(one);
        file.release_before(exchanges.position());
        return found;
    };
    if (!options.page.empty()) {
        const std::string title =
            options.file == "-" ? "trace" : std::filesystem::path(options.file).filename().string();
        write_file(options.page,
                   [&](std::FILE *page) { write_trace_page(page, title, options.show_secrets, next); });
        return EXIT_DONE;
    }
    std::vector<row> rows;
    for (exchange one; next(one);) {
        if (options.show == 0)
            rows.push_back(row_of(one, options.show_secrets));
        else if (one.number == options.show) {
            write_file("-", exchange_text(one, options.show_secrets));
            return EXIT_DONE;
        }
    }
    if (options.show != 0)
        throw failure(EXIT_USAGE,
                      "--show: there is no exchange " + std::to_string(options.show) + " in the trace");
    write_file("-", table(std::move(rows)));
    return EXIT_DONE;
}

} // namespace cli
