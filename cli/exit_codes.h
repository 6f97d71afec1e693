// exit_codes.h - exit codes of the program. Scripts rely on these numbers; docs/man/zuv.1 lists them.
#pragma once

namespace cli {

enum exit_code : int {
    EXIT_DONE = 0,
    EXIT_OTHER = 1,    // memory, or what should not happen
    EXIT_USAGE = 2,    // the command line makes no sense
    EXIT_DOCUMENT = 3, // a document is not what the contract allows
    EXIT_NETWORK = 4,  // no connection, or it broke or fell silent
    EXIT_TLS = 5,      // no trust, or no agreement on how to encrypt
    EXIT_HTTP = 6,     // an HTTP status instead of an answer
    EXIT_ANSWER = 7,   // an answer that can't be read
    EXIT_SENDER = 8,   // a fault that blames the request
    EXIT_RECEIVER = 9, // a fault that blames the service
    EXIT_FAULT = 10,   // another fault
    EXIT_FILE = 11     // a file can't be read or written
};

} // namespace cli
