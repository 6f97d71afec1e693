// simple_types.h - values of simple types as text: what the contract allows.
#pragma once

#include <string>
#include <string_view>

namespace cli {

// Empty if `value` without blanks around it is one of the XML type; else what it should be: "a whole number".
std::string value_problem(std::string_view type, std::string_view value);

// How a value of the type looks, for the user to read: "text", "date and time, 2024-05-01T12:00:00Z".
std::string value_words(std::string_view type);

// A value of the type, to begin with; empty for texts.
std::string sample_value(std::string_view type);

// Types whose values JSON holds as numbers.
bool is_number(std::string_view type);
bool is_whole_number(std::string_view type);

} // namespace cli
