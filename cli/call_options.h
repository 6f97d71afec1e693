// call_options.h - the options of a call, as the command line gives them.
//
// Elsewhere: what they do to a context (connection.h), to the header block (request_header.h), to attachments
// (attachments.h).
#pragma once

#include <string>
#include <vector>

#include <CLI/CLI.hpp>

namespace cli {

// How to reach a service; also for data ports.
struct connection_options {
    std::string user, password_file; // HTTP Basic; the password may also come from ZUV_PASSWORD
    std::string ca_file, ca_path, crl_file, key_file, key_password_file; // ... in ZUV_KEY_PASSWORD
    bool no_host_check = false, allow_expired = false;
    std::string proxy, proxy_user, proxy_password_file; // ... in ZUV_PROXY_PASSWORD
    double connect_limit = 30, silence_limit = 300;     // seconds; 0: none
    std::string trace_file;
    bool trace_times = false; // in a file beside it
    bool quiet = false, verbose = false;
    std::string password, key_password, proxy_password; // of the configuration file, the last resort

    void declare(CLI::App &app);
};

// Adds -e: addresses of the service.
void declare_endpoints(CLI::App &app, std::vector<std::string> &endpoints);

struct header_options {
    std::string file;                     // a protocol:Header document
    std::vector<std::string> credentials; // files, each a protocol:Credentials document
    std::string target, transaction, sequence, correlation, priority;
    std::vector<std::string> notes;

    void declare(CLI::App &app);
};

struct message_options {
    bool soap12 = false, gzip = false, chunked = false, keep_alive = false;
    unsigned repeat = 1;
    std::string action;
    std::vector<std::string> attach;               // FILE[,type=TYPE][,id=ID]
    bool mime = false, mtom = false, dime = false; // at most one; none: MIME if something is attached
    std::string save_folder;

    void declare(CLI::App &app);
};

struct call_options {
    std::vector<std::string> endpoints;
    connection_options connection;
    header_options header;
    message_options message;
    std::string request_file; // empty: an empty document
    std::string output_file = "-";
    bool json = false;

    void declare(CLI::App &app);
};

} // namespace cli
