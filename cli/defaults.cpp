// defaults.cpp - see defaults.h.
#include "defaults.h"

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <sstream>

#include <sys/stat.h>

#include "failure.h"
#include "nearest.h"
#include "text_files.h"

namespace cli {

namespace {

using names = std::vector<std::string>;

struct password_place {
    const char *key;
    std::string connection_options::*member;
};
constexpr password_place PASSWORDS[] = {{"password", &connection_options::password},
                                        {"key-password", &connection_options::key_password},
                                        {"proxy-password", &connection_options::proxy_password}};
constexpr const char *NO_DEFAULTS[] = {"help", "output"}; // of a single call

std::string config_path()
{
    const char *const folder = std::getenv("XDG_CONFIG_HOME"), *const home = std::getenv("HOME");
    if (folder != nullptr && *folder == '/') // others don't count, by the rules for that variable
        return std::string(folder) + "/zuv/config";
    return home == nullptr || *home == '\0' ? "" : std::string(home) + "/.config/zuv/config";
}

std::string variable_of(const std::string &option)
{
    std::string name = "ZUV_" + option;
    std::transform(name.begin(), name.end(), name.begin(),
                   [](unsigned char c) { return c == '-' ? '_' : static_cast<char>(std::toupper(c)); });
    return name;
}

const char *variable(const std::string &option)
{
    const char *const value = std::getenv(variable_of(option).c_str());
    return value == nullptr || *value == '\0' ? nullptr : value;
}

bool takes_default(const std::string &option)
{
    return std::find(std::begin(NO_DEFAULTS), std::end(NO_DEFAULTS), option) == std::end(NO_DEFAULTS);
}

const password_place *password_of(const std::string &key)
{
    const auto *const found = std::find_if(std::begin(PASSWORDS), std::end(PASSWORDS),
                                           [&](const password_place &one) { return key == one.key; });
    return found == std::end(PASSWORDS) ? nullptr : found;
}

// "profile", "get" of that command; empty for the program.
names path_of(const CLI::App *command)
{
    names path;
    for (; command->get_parent() != nullptr; command = command->get_parent())
        path.insert(path.begin(), command->get_name());
    return path;
}

void add_options(const CLI::App &command, names &all)
{
    for (const CLI::Option *option : command.get_options())
        for (const std::string &name : option->get_lnames())
            if (takes_default(name))
                all.push_back(name);
    for (const CLI::App *one : command.get_subcommands([](const CLI::App *) { return true; }))
        add_options(*one, all);
}

class config_file {
public:
    explicit config_file(const CLI::App &command) : path_(config_path()), command_(path_of(&command))
    {
        std::error_code error;
        if (path_.empty() || !std::filesystem::exists(path_, error))
            return;
        std::istringstream text(read_file(path_));
        try {
            for (const CLI::ConfigItem &item : CLI::ConfigBase().from_config(text))
                if (item.name != "++" && item.name != "--") // begin and end of a section
                    items_.push_back(item);
        } catch (const CLI::Error &problem) {
            throw failure(EXIT_USAGE, path_ + ": " + printable(problem.what()));
        }
        const CLI::App *root = &command;
        while (root->get_parent() != nullptr)
            root = root->get_parent();
        for (const CLI::ConfigItem &item : items_)
            require_known(item, *root);
        warn();
    }

    const std::string &path() const { return path_; }

    // The values of a key for the command: of the section that is nearest to it. Null if there are none.
    const names *find(const std::string &key) const
    {
        const CLI::ConfigItem *found = nullptr;
        for (const CLI::ConfigItem &item : items_) {
            const bool applies = item.name == key && item.parents.size() <= command_.size() &&
                                 std::equal(item.parents.begin(), item.parents.end(), command_.begin());
            if (applies && (found == nullptr || item.parents.size() >= found->parents.size()))
                found = &item;
        }
        return found == nullptr ? nullptr : &found->inputs;
    }

private:
    void require_known(const CLI::ConfigItem &item, const CLI::App &root) const
    {
        const CLI::App *section = &root;
        for (const std::string &name : item.parents) {
            const auto found =
                section->get_subcommands([&](const CLI::App *one) { return one->get_name() == name; });
            section = found.empty() ? nullptr : found.front();
            if (section == nullptr)
                throw failure(EXIT_USAGE,
                              path_ + ": no command has the name of the section [" + printable(name) + "]");
        }
        names known;
        add_options(*section, known);
        for (const password_place &one : PASSWORDS)
            known.emplace_back(one.key);
        if (std::find(known.begin(), known.end(), item.name) != known.end())
            return;
        const std::string meant = nearest(item.name, known);
        throw failure(EXIT_USAGE, path_ + ": there is no option \"" + printable(item.name) + "\"" +
                                      (meant.empty() ? "" : "; did you mean \"" + meant + "\"?"));
    }

    void warn() const
    {
        struct stat status {};
        const bool holds_password =
            std::any_of(items_.begin(), items_.end(),
                        [](const CLI::ConfigItem &item) { return password_of(item.name) != nullptr; });
        if (holds_password && stat(path_.c_str(), &status) == 0 &&
            (status.st_mode & (S_IRWXG | S_IRWXO)) != 0)
            std::fprintf(
                stderr, "zuv: %s holds a password, and others may read it: chmod 600 takes that right away\n",
                printable(path_).c_str());
    }

    std::string path_;
    names command_;
    std::vector<CLI::ConfigItem> items_;
};

void set(CLI::Option &option, const names &values, const std::string &source)
{
    try {
        for (const std::string &value : values)
            option.add_result(value);
        option.run_callback();
    } catch (const CLI::Error &problem) {
        throw failure(EXIT_USAGE, source + ": " + printable(problem.what()));
    }
}

// Addresses are separated by blanks.
names values_of(const std::string &option, const char *text)
{
    if (option != "endpoint")
        return {text};
    std::istringstream words(text);
    names values;
    for (std::string word; words >> word;)
        values.push_back(word);
    return values;
}

bool is_given(const CLI::Option &option)
{
    const auto &excluded = option.get_excludes();
    return option.count() != 0 || std::any_of(excluded.begin(), excluded.end(),
                                              [](const CLI::Option *other) { return other->count() != 0; });
}

// A password in the environment comes before a file with one that the configuration names.
bool is_overridden(const std::string &option)
{
    constexpr std::string_view FILE_OF = "-file";
    const std::string secret =
        option.ends_with(FILE_OF) ? option.substr(0, option.size() - FILE_OF.size()) : "";
    return password_of(secret) != nullptr && variable(secret) != nullptr;
}

} // namespace

void apply_defaults(CLI::App &command, connection_options &connection)
{
    const config_file file(command);
    for (CLI::Option *option : command.get_options()) {
        if (option->get_lnames().empty() || is_given(*option))
            continue;
        const std::string &name = option->get_lnames().front();
        if (!takes_default(name))
            continue;
        if (const char *const value = variable(name))
            set(*option, values_of(name, value), variable_of(name));
        else if (const names *const values = file.find(name); values != nullptr && !is_overridden(name))
            set(*option, *values, file.path());
    }
    for (const password_place &one : PASSWORDS)
        if (const names *const values = file.find(one.key); values != nullptr && !values->empty())
            connection.*one.member = values->front();
}

} // namespace cli
