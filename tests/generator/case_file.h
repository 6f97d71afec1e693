// case_file.h - small contracts in text files, translated for the tests of the generator.
//
// A case file holds sections, each opened by a line "== kind argument":
//   case NAME: ...   in a file of several cases: opens one; its first section follows in the same line
//   types            rows of type_ids.txt; those of BASE_TYPE_IDS follow them
//   schema PREFIX    what is inside xsd:schema in PREFIX.xsd, whose first line is the section's
//   members XML      schema t with the one class Thing, id 20, of these elements, all in its first line
//   port             what is inside the portType of Port.wsdl, with a message m; the first line is the section's
//   file NAME        any other input file, as it is
//   contract FOLDER  all of it in place of the above: a folder of tests/generator
//   expect PATH      lines that come together in this output; "model": in the dump of the model
//   error MESSAGE    what refuses the contract
// A schema, a port or types of one line are in the line of their section. Lines before the first section say what the
// case is about.
#pragma once

#include <filesystem>
#include <string>
#include <vector>

#include "emit.h"
#include "reader.h"

struct case_section {
    std::string kind, argument, text;
    std::size_t line = 0; // in the case file
};

struct contract_case {
    std::string name;
    std::vector<case_section> sections;
};

// All cases of a file; a file without "== case" is one, of the file's name.
std::vector<contract_case> read_cases(const std::filesystem::path &path);

// What became of a contract.
struct translation {
    std::string error; // empty when it was translated
    std::string model; // as dumped
    std::vector<emitted_file> files;

    // Text of an output, "model" included; empty for none.
    std::string output(const std::string &path) const;
};

translation translate(const contract_case &contract);
translation translate(const std::filesystem::path &directory);
