// trace_command.cpp - see trace_command.h.
#include "trace_command.h"

#include <algorithm>
#include <array>
#include <filesystem>
#include <vector>

#include "text_files.h"
#include "trace_exchange.h"
#include "trace_page.h"
#include "trace_secrets.h"

namespace cli {

namespace {

constexpr std::size_t COLUMNS = 7, CELL_MAX = 60; // characters
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

row row_of(const exchange &one, std::size_t number, bool show_secrets)
{
    std::string about = one.fault;
    if (about.empty() && !one.complete)
        about = "incomplete";
    return {std::to_string(number),
            cell(one.operation.empty() ? "unknown" : one.operation),
            one.status == 0 ? "none" : std::to_string(one.status),
            one.soap12 ? "1.2" : "1.1",
            size_words(one.sent),
            size_words(one.received),
            cell(shown_start_line(one.target, show_secrets)) + (about.empty() ? "" : "  " + cell(about))};
}

std::string table(const std::vector<exchange> &exchanges, bool show_secrets)
{
    constexpr bool RIGHT[COLUMNS] = {true, false, false, false, true, true, false};
    std::vector<row> rows = {{"#", "operation", "status", "SOAP", "sent", "received", "target"}};
    for (std::size_t i = 0; i < exchanges.size(); ++i)
        rows.push_back(row_of(exchanges[i], i + 1, show_secrets));
    std::array<std::size_t, COLUMNS> widths{};
    for (const row &one : rows)
        for (std::size_t i = 0; i < COLUMNS; ++i)
            widths[i] = std::max(widths[i], width(one[i]));
    std::string text;
    for (const row &one : rows) {
        for (std::size_t i = 0; i < COLUMNS; ++i) {
            const std::string gap(widths[i] - width(one[i]), ' ');
            text += RIGHT[i] ? gap + one[i] : i + 1 < COLUMNS ? one[i] + gap : one[i];
            text += i + 1 < COLUMNS ? "  " : "\n";
        }
    }
    return text;
}

} // namespace

exit_code show_trace(const trace_options &options)
{
    const std::string bytes = read_file(options.file);
    const std::vector<trace_message> messages = read_trace(bytes);
    const std::vector<exchange> exchanges = exchanges_of(messages);
    if (options.page.empty())
        write_file("-", table(exchanges, options.show_secrets));
    else
        write_file(options.page,
                   trace_page(options.file == "-" ? "trace"
                                                  : std::filesystem::path(options.file).filename().string(),
                              exchanges, options.show_secrets));
    return EXIT_DONE;
}

} // namespace cli
