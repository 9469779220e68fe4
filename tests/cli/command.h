#pragma once

#include "tests/support/places.h"
#include "tests/support/scratchfolder.h"

#include <string>
#include <vector>

// What a run of the command left behind.
struct Outcome {
    int code = -1;  // its exit code; -1 if it ended by a signal
    std::string output;
    std::string errors;
};

// Where a run gets its standard input from, and where its standard output goes in place of the result.
struct Streams {
    std::string input = "/dev/null";
    std::string output;
};

// Runs the built command. The arguments need no quoting.
Outcome RunKfs(std::vector<std::string> const& arguments, Streams const& streams = {});

// The animation of a bouncing ball: three streams.
inline std::string const Sample = kfstest::SamplesFolder() / "bouncing_ball.gltf";

// A joint that goes through these rows of "x y z", one a step.
inline std::string Motion(std::vector<std::string> const& rows, std::string const& step = "1",
                          std::string const& channels = "3 Xposition Yposition Zposition")
{
    std::string text = "HIERARCHY\nROOT a\n{\nCHANNELS " + channels +
                       "\n}\nMOTION\nFrames: " + std::to_string(rows.size()) + "\nFrame Time: " + step + '\n';
    for (std::string const& row : rows) text += row + '\n';
    return text;
}

// Holds a text against the file tests/cli/golden/NAME, or writes the file where KFS_WRITE_GOLDEN is set.
void ExpectGolden(std::string const& name, std::string const& text);
