// layout.h - how the output is cut into files: what the build has to know before the generator runs.
//
// cmake/generate.cmake lists the same files; both count the classes of a prefix by the rows of type_ids.txt.
#pragma once

#include <cstddef>
#include <string_view>

constexpr std::size_t CLASSES_PER_UNIT = 40; // classes that one source file defines at most

// Ports that get their records alone, and no proxy class.
constexpr std::string_view PORTS_WITHOUT_PROXY[] = {"ProblemReport"};
