// python_batch.h - Python 3 as a second implementation: one run of a script over many lines.
#pragma once

#include <unistd.h>

#include "support/testing.h"

// Runs `script`, in which `lines` is the list of `input`, and returns what it printed, one entry for each
// line. Empty, with a failure of the test, if Python can't be run.
inline std::vector<std::string> python_batch(const std::string &script, const std::vector<std::string> &input)
{
    std::string path = testing::TempDir() + "/python_batch_XXXXXX";
    const int descriptor = mkstemp(path.data());
    std::FILE *file = descriptor >= 0 ? fdopen(descriptor, "w") : nullptr;
    if (file == nullptr) {
        ADD_FAILURE() << "no temporary file " << path;
        return {};
    }
    std::string program = "lines = [\n";
    for (const std::string &line : input)
        program += "r'''" + line + "''',\n";
    program += "]\n" + script;
    std::fwrite(program.data(), 1, program.size(), file);
    std::fclose(file);
    std::vector<std::string> output;
    std::FILE *pipe = popen(("/usr/bin/env python3 " + path).c_str(), "r");
    char buffer[65536];
    while (pipe != nullptr && std::fgets(buffer, sizeof buffer, pipe) != nullptr) {
        output.emplace_back(buffer);
        if (output.back().back() == '\n')
            output.back().pop_back();
    }
    EXPECT_TRUE(pipe != nullptr && pclose(pipe) == 0) << "python3 failed";
    unlink(path.c_str());
    return output;
}
