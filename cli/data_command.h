// data_command.h - data ports: the data of an attachment or an update fetched by GET, delivered by POST.
#pragma once

#include <string>
#include <vector>

#include <CLI/CLI.hpp>

#include "call_options.h"
#include "exit_codes.h"

namespace cli {

struct data_options {
    connection_options connection;
    std::string address;                           // dataURI of a data port
    std::string file = "-";                        // where the data goes, or comes from
    std::string type = "application/octet-stream"; // of what is delivered

    void declare(CLI::App &app, bool delivers);
};

// Both throw failure.
exit_code fetch_data(const data_options &options);
exit_code deliver_data(const data_options &options);

} // namespace cli
