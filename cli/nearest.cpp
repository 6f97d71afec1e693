// nearest.cpp - see nearest.h.
#include "nearest.h"

#include <algorithm>

#include <CLI/CLI.hpp>

#include "text_files.h"

namespace cli {

namespace {

// Letters to change, insert, drop or swap with their neighbour.
std::size_t distance(const std::string &one, const std::string &other)
{
    std::vector<std::size_t> before, last, row(other.size() + 1);
    for (std::size_t j = 0; j <= other.size(); ++j)
        row[j] = j;
    for (std::size_t i = 1; i <= one.size(); ++i) {
        before = std::move(last);
        last = row;
        row[0] = i;
        for (std::size_t j = 1; j <= other.size(); ++j) {
            const bool same = one[i - 1] == other[j - 1];
            row[j] = std::min({last[j] + 1, row[j - 1] + 1, last[j - 1] + (same ? 0 : 1)});
            if (i > 1 && j > 1 && one[i - 1] == other[j - 2] && one[i - 2] == other[j - 1])
                row[j] = std::min(row[j], before[j - 2] + 1);
        }
    }
    return row.back();
}

std::vector<std::string> commands_of(const CLI::App &app)
{
    std::vector<std::string> names;
    for (const CLI::App *one : app.get_subcommands([](const CLI::App *) { return true; }))
        names.push_back(one->get_name());
    return names;
}

std::vector<std::string> options_of(const CLI::App &app)
{
    std::vector<std::string> names;
    for (const CLI::Option *one : app.get_options())
        for (const std::string &name : one->get_lnames())
            names.push_back("--" + name);
    return names;
}

std::string suggested(const std::string &what, const std::string &word,
                      const std::vector<std::string> &candidates)
{
    const std::string meant = nearest(word, candidates);
    return what + " \"" + printable(word) + "\"" + (meant.empty() ? "" : "; did you mean \"" + meant + "\"?");
}

std::string choice(const std::vector<std::string> &names)
{
    std::string text;
    for (const std::string &name : names)
        text += (text.empty() ? "" : ", ") + name;
    return text;
}

} // namespace

std::string nearest(const std::string &word, const std::vector<std::string> &candidates)
{
    std::string found;
    std::size_t least = std::max<std::size_t>(word.size() / 3, 1) + 1;
    for (const std::string &candidate : candidates)
        if (const std::size_t one = distance(word, candidate); one < least) {
            least = one;
            found = candidate;
        }
    return found;
}

std::string misspelled(const CLI::App &app, const std::vector<std::string> &words)
{
    const CLI::App *command = &app;
    for (const std::string &word : words) {
        if (word.starts_with("--")) {
            const std::string name = word.substr(0, word.find('='));
            if (command->get_option_no_throw(name) == nullptr)
                return suggested("there is no option", name, options_of(*command));
            continue;
        }
        const std::vector<std::string> names = commands_of(*command);
        if (names.empty() || word.starts_with('-'))
            continue;
        const auto known = std::find(names.begin(), names.end(), word);
        if (known == names.end())
            return suggested("there is no command", word, names) +
                   (nearest(word, names).empty() ? "; there are " + choice(names) : "");
        command = command->get_subcommand(word);
    }
    const std::vector<std::string> names = commands_of(*command);
    return names.empty() ? "" : "a command is missing: " + choice(names);
}

} // namespace cli
