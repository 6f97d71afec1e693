// settings.h - how a service was started. Filled by the command line, constant afterwards.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <string>
#include <utility>
#include <vector>

namespace service {

struct settings {
    std::string host = "127.0.0.1";
    int port = 9080;              // 0: any free port
    bool tls = false;             // HTTPS
    std::string certificate, key; // PEM files of the service; an empty key is in the other file
    std::string client_ca;        // PEM file: clients need a certificate that it vouches for; empty: none
    std::string database;         // file; empty: one that ends with the program
    std::string user, password;   // HTTP Basic credentials that clients need; empty user: none
    std::vector<std::pair<std::string, std::string>>
        accounts;           // further users and passwords that authenticate
    bool strict = false;    // requests that hold what the contract doesn't know, or lack what it demands, are
                            // refused
    bool indent = false;    // answers are indented
    bool chunked = false;   // answers are sent in chunks instead of with a Content-Length
    std::string access_log; // file that takes a line for each exchange; "-": standard output, empty: none
    std::string rules;      // file of rules that hold from the start (rules.h); empty: none
    bool control = false;   // rules are taken from clients on this machine too
    std::string seed;       // file or folder of requests that the store begins with (seed.h); empty: none
    std::string record;     // file that takes all calls (recording.h); empty: none
    std::string replay;     // such a file, whose answers calls get in place of being carried out; empty: none
    std::string trace;      // file that takes a copy of all bytes; empty: none
    std::uint64_t body_limit = 64ULL << 20; // bytes of a request, framing and compression undone; 413 beyond
    std::uint64_t attachment_limit =
        4ULL << 30; // bytes of its attachments that go to files, or of data for a port
    // Bytes of the XML of a message. Requests meet body_limit first; an answer holds at most what is kept of
    // one request, or parts of several.
    std::uint64_t message_limit() const { return at_least(16ULL << 20, body_limit, 2); }
    // Bytes of the objects of a request, and of the documents that it is answered from. What is written in
    // the usual way takes less than three times its size; empty elements take up to a hundred times theirs.
    std::uint64_t memory_limit() const { return at_least(64ULL << 20, body_limit, 4); }
    std::uint32_t depth_limit = 512; // open elements of a message or document; protects the stack
    std::size_t connections = 64;    // served at a time; further ones wait to be accepted
    int idle_seconds = 30;           // silence that ends a connection, when receiving and when sending
    int request_seconds = 120;       // time that a request may take to arrive

private:
    // `value` times `factor`, or `least` if that is more; 0, which is no limit, if the result overflows.
    static std::uint64_t at_least(std::uint64_t least, std::uint64_t value, std::uint64_t factor)
    {
        if (value > std::numeric_limits<std::uint64_t>::max() / factor)
            return 0;
        return std::max(least, value * factor);
    }
};

} // namespace service
