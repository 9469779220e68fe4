#pragma once

#include "tests/support/scratchfolder.h"

#include <string>
#include <vector>

// What a run of the command left behind.
struct Outcome {
    int code = -1;  // its exit code; -1 if it ended by a signal
    std::string output;
    std::string errors;
};

// Runs the built command. The arguments need no quoting. `output`: where its standard output goes in place of the
// result.
Outcome RunKfs(std::vector<std::string> const& arguments, std::string const& output = "");
