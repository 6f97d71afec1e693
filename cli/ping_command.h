// ping_command.h - whether a service is there: connection, certificate, and which of its ports answer.
#pragma once

#include <string>
#include <vector>

#include <CLI/CLI.hpp>

#include "call_options.h"
#include "exit_codes.h"

namespace cli {

struct ping_options {
    connection_options connection;
    std::vector<std::string> endpoints; // each is asked
    bool json = false;

    void declare(CLI::App &app);
};

// Sends an empty `get` to each port, all over one connection where the service keeps it. A port answers if a
// SOAP message comes back, a fault included. EXIT_DONE if all do, else the code of the first failure. Throws
// failure.
exit_code ping_services(const ping_options &options);

} // namespace cli
