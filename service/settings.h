// settings.h - how a service was started. Filled by the command line, constant afterwards.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <utility>
#include <vector>

namespace service {

struct settings {
    std::string host = "127.0.0.1";
    int port = 9080;            // 0: any free port
    std::string database;       // file; empty: one that ends with the program
    std::string user, password; // HTTP Basic credentials asked of clients; empty user: none
    std::vector<std::pair<std::string, std::string>>
        accounts;                           // further users and passwords that authenticate
    bool indent = false;                    // answers are indented
    bool chunked = false;                   // answers go out in chunks in place of a Content-Length
    std::string trace;                      // file that takes a copy of all bytes; empty: none
    std::uint64_t body_limit = 64ULL << 20; // bytes of a request, framing and compression undone; 413 beyond
    std::uint64_t attachment_limit =
        4ULL << 30;                  // bytes of its attachments that go to files, or of data for a port
    std::uint32_t depth_limit = 512; // open elements of a message or document; protects the stack
    std::size_t connections = 64;    // served at a time; further ones wait to be accepted
    int idle_seconds = 30;           // silence that ends a connection, when receiving and when sending
    int request_seconds = 120;       // time that a request may take to arrive
};

} // namespace service
