// new_command.h - an empty document of a class, its members explained; and the list of classes.
#pragma once

#include <string>

#include "contract.h"
#include "exit_codes.h"

namespace cli {

// Both print to standard output.
exit_code
print_new_document(const std::string &class_name); // throws failure for an unknown or ambiguous name
exit_code print_classes();

// The class that the user means. failure with EXIT_USAGE if there is none or several.
const contract::data_class &class_named(const std::string &name);

} // namespace cli
