// contract_error.h - how the generator refuses a contract: one place in one file, and the reason.
#pragma once

#include <stdexcept>
#include <string>

// A line of a contract file, named as below the schema directory.
struct place {
    std::string file;
    std::size_t line = 0; // from 1; 0: the file as a whole
};

// what() reads "file:line: reason".
class contract_error : public std::runtime_error {
public:
    contract_error(const place &at, const std::string &reason)
        : std::runtime_error(at.file + ":" + (at.line ? std::to_string(at.line) + ": " : " ") + reason)
    {}
};
