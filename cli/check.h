// check.h - checks a document against the contract: what is wrong, where, and why.
//
// Elsewhere: the command that prints it (check_command.cpp), the library's own reader (documents.h).
//
// Always: any bytes may be checked; time and memory grow with their number. Members may be in any order,
// as the reader takes them in any order.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "contract.h"

namespace cli {

struct finding {
    std::size_t line, column; // from 1; the column counts characters
    std::string text;
};

constexpr std::size_t FINDINGS_MAX = 100; // further ones are not reported

struct checked_document {
    std::string root;                           // name of the root element, with the contract's prefix
    const contract::data_class *type = nullptr; // of the root element; null if it is unknown
    std::vector<finding> findings;
};

// Checks a document. Its root element may be named by a class, or as the request or answer of an operation;
// with `expected` it may have any name. A SOAP message is checked by what its header block and Body hold.
checked_document check_document(std::string_view xml, const contract::data_class *expected);

// Findings as lines, "file:line:column: text".
std::string finding_lines(const std::string &file, const std::vector<finding> &findings);

} // namespace cli
