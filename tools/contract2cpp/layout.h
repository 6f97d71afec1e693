// layout.h - how the output is cut into files. Which files that gives is in outputs.txt next to the
// contract, for the build to know before the generator runs.
#pragma once

#include <cstddef>
#include <string_view>

constexpr std::size_t CLASSES_PER_UNIT = 40; // classes that one source file defines at most

// Ports that get their records alone, and no proxy class.
constexpr std::string_view PORTS_WITHOUT_PROXY[] = {"ProblemReport"};
