// completion.cpp - see completion.h.
#include "completion.h"

#include "contract.h"

namespace cli {

namespace {

// The command that the words before the last one lead to.
const CLI::App *command_of(const CLI::App *app, const std::vector<std::string> &words)
{
    for (std::size_t i = 0; i + 1 < words.size(); ++i)
        for (const CLI::App *one : app->get_subcommands([](const CLI::App *) { return true; }))
            if (one->get_name() == words[i]) {
                app = one;
                break;
            }
    return app;
}

void add_if_begun(std::vector<std::string> &found, const std::string &candidate, const std::string &begun)
{
    if (candidate.starts_with(begun))
        found.push_back(candidate);
}

bool takes_value(const CLI::App &command, const std::string &option)
{
    if (!option.starts_with('-'))
        return false;
    const CLI::Option *const known = command.get_option_no_throw(option);
    return known != nullptr && known->get_items_expected_min() > 0;
}

} // namespace

std::vector<std::string> completions(const CLI::App &app, const std::vector<std::string> &words)
{
    const std::string begun = words.empty() ? "" : words.back(),
                      before = words.size() < 2 ? "" : words[words.size() - 2];
    const CLI::App &command = *command_of(&app, words);
    std::vector<std::string> found;
    const bool class_wanted = before == "--class" || (command.get_name() == "new" && !begun.starts_with('-'));
    if (class_wanted) {
        const bool prefixed = begun.find(':') != std::string::npos;
        for (const contract::data_class &one : contract::classes)
            add_if_begun(found, prefixed ? one.name : std::string(contract::local_name(one.name)), begun);
        return found;
    }
    if (takes_value(command, before))
        return found;
    for (const CLI::App *one : command.get_subcommands([](const CLI::App *) { return true; }))
        add_if_begun(found, one->get_name(), begun);
    if (begun.starts_with('-'))
        for (const CLI::Option *one : command.get_options())
            for (const std::string &name : one->get_lnames())
                add_if_begun(found, "--" + name, begun);
    return found;
}

} // namespace cli
