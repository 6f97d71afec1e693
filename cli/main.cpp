// main.cpp - zuv, the command line: its commands, and how failures are reported.
//
// Elsewhere: what the commands do, one file each (call_command.h, data_command.h, new_command.h,
// check_command.h, ping_command.h, trace_command.h).
#include <cstdio>
#include <functional>
#include <list>
#include <new>
#include <string>

#include <CLI/CLI.hpp>
#include <zuv_client_pro/soap_log.h>

#include "call_command.h"
#include "check_command.h"
#include "completion.h"
#include "data_command.h"
#include "defaults.h"
#include "failure.h"
#include "nearest.h"
#include "new_command.h"
#include "ping_command.h"
#include "text_files.h"
#include "trace_command.h"

namespace {

using namespace cli;

using action = std::function<exit_code()>;

// The first sentence of a documentation.
std::string summary(const std::string &text)
{
    return text.substr(0, text.find(". ")) + (text.find(". ") == std::string::npos ? "" : ".");
}

void declare_calls(CLI::App &app, std::list<call_options> &options, action &chosen)
{
    for (const port &one : all_ports()) {
        CLI::App *const group =
            app.add_subcommand(lower(one.name), summary(one.documentation))->group("Ports");
        group->require_subcommand(1);
        for (const operation &op : all_operations()) {
            if (std::string_view(op.port) != one.name)
                continue;
            CLI::App *const command = group->add_subcommand(op.name, summary(op.documentation));
            call_options &own = options.emplace_back();
            own.declare(*command);
            command->callback([&own, &op, &chosen, command] {
                chosen = [&own, &op, command] {
                    apply_defaults(*command, own.connection);
                    return call_operation(op, own);
                };
            });
        }
    }
}

void declare_data(CLI::App &app, std::list<data_options> &options, action &chosen)
{
    CLI::App *const group =
        app.add_subcommand("data", "Fetches data of attachments and updates, or delivers it.")->group("Data");
    group->require_subcommand(1);
    const auto add = [&](const char *name, const char *about, bool delivers,
                         exit_code (*perform)(const data_options &)) {
        CLI::App *const command = group->add_subcommand(name, about);
        data_options &own = options.emplace_back();
        own.declare(*command, delivers);
        command->callback([&own, &chosen, perform, command] {
            chosen = [&own, perform, command] {
                apply_defaults(*command, own.connection);
                return perform(own);
            };
        });
    };
    add("get", "Fetches the data at an address.", false, fetch_data);
    add("put", "Delivers a file to an address.", true, deliver_data);
}

void declare_ping(CLI::App &app, ping_options &options, action &chosen)
{
    CLI::App *const command =
        app.add_subcommand("ping",
                           "Says whether a service is there, its certificate, and which ports answer.")
            ->group("Ports");
    options.declare(*command);
    command->callback([&options, &chosen, command] {
        chosen = [&options, command] {
            apply_defaults(*command, options.connection);
            return ping_services(options);
        };
    });
}

// Options of the commands that work on documents and traces.
struct tool_options {
    std::string class_name;
    bool list = false;
    std::vector<std::string> files;
};

void declare_documents(CLI::App &app, tool_options &options, action &chosen)
{
    CLI::App *const make =
        app.add_subcommand("new", "Prints an empty document of a class, its members explained.")
            ->group("Documents");
    CLI::Option *const name =
        make->add_option("CLASS", options.class_name, "ProfileContent, protocolProfile:ProfileContent");
    make->add_flag("--list", options.list, "List all classes with their documentation")->excludes(name);
    make->callback([&] {
        if (options.list == !options.class_name.empty())
            throw CLI::RequiredError("CLASS or --list");
        chosen = [&] { return options.list ? print_classes() : print_new_document(options.class_name); };
    });
    CLI::App *const check =
        app.add_subcommand("check", "Says whether documents are what the contract allows.")
            ->group("Documents");
    check->add_option("FILE", options.files, "Documents or SOAP messages; \"-\" for standard input")
        ->required();
    check
        ->add_option("--class", options.class_name,
                     "Take the root element for one of this class, whatever its name")
        ->type_name("CLASS");
    check->callback([&] { chosen = [&] { return check_files(options.files, options.class_name); }; });
}

void declare_trace(CLI::App &app, trace_options &options, action &chosen)
{
    CLI::App *const command =
        app.add_subcommand("trace", "Shows a trace file: a table of its exchanges, one of them, or a page.")
            ->group("Documents");
    command->add_option("FILE", options.file, "Trace; \"-\" for standard input")->capture_default_str();
    command->add_option("--html", options.page, "Write a page on which each exchange can be opened")
        ->type_name("FILE");
    command->add_option("--show", options.show, "Show the exchange of this number")
        ->check(CLI::PositiveNumber)
        ->type_name("N")
        ->excludes("--html");
    command->add_flag("--failed", options.failed, "Show only exchanges that failed")->excludes("--show");
    command->add_flag("--show-secrets", options.show_secrets,
                      "Show certificates, keys, passwords and tokens too");
    command->callback([&] { chosen = [&] { return show_trace(options); }; });
}

int run(int argc, char **argv)
{
    CLI::App app("Calls the services of the contract, and works with their documents and traces.", "zuv");
    app.set_version_flag("--version", "zuv " ZUV_VERSION);
    app.require_subcommand(1);
    app.footer("Exit: 0 done, 1 other, 2 usage, 3 document, 4 network, 5 TLS, 6 HTTP, 7 answer, 8 fault of "
               "the request,\n"
               "9 fault of the service, 10 other fault, 11 file. More: man zuv");
    std::list<call_options> calls;
    std::list<data_options> transfers;
    ping_options ping;
    tool_options tools;
    trace_options trace;
    action chosen;
    declare_calls(app, calls, chosen);
    declare_ping(app, ping, chosen);
    declare_data(app, transfers, chosen);
    declare_documents(app, tools, chosen);
    declare_trace(app, trace, chosen);
    if (argc > 1 && std::string_view(argv[1]) == "complete-words") { // for the shell
        for (const std::string &word : completions(app, std::vector<std::string>(argv + 2, argv + argc)))
            std::printf("%s\n", word.c_str());
        return EXIT_DONE;
    }
    try {
        app.parse(argc, argv);
    } catch (const CLI::Success &asked_for_help) {
        return app.exit(asked_for_help);
    } catch (const CLI::ParseError &error) {
        const std::string unknown = misspelled(app, std::vector<std::string>(argv + 1, argv + argc));
        if (unknown.empty())
            app.exit(error);
        else
            std::fprintf(stderr, "zuv: %s\nRun with --help for more information.\n", unknown.c_str());
        return EXIT_USAGE;
    }
    return chosen();
}

} // namespace

int main(int argc, char **argv)
{
    g_TraceLogFile[0] = '\0'; // a trace is written where --trace asks for one
    try {
        return run(argc, argv);
    } catch (const failure &problem) {
        std::fprintf(stderr, "zuv: %s\n", problem.what());
        return problem.code;
    } catch (const std::bad_alloc &) {
        std::fprintf(stderr, "zuv: out of memory\n");
        return EXIT_OTHER;
    } catch (const std::exception &problem) {
        std::fprintf(stderr, "zuv: %s\n", problem.what());
        return EXIT_OTHER;
    }
}
