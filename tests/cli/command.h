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

// Runs the built command. The arguments need no quoting. `output`: where its standard output goes in place of the
// result.
Outcome RunKfs(std::vector<std::string> const& arguments, std::string const& output = "");

// The animation of a bouncing ball: three streams.
inline std::string const Sample = kfstest::SamplesFolder() / "bouncing_ball.gltf";

inline std::size_t Count(std::string const& text, std::string const& part)
{
    std::size_t count = 0;
    for (std::size_t at = 0; (at = text.find(part, at)) != std::string::npos; at += part.size()) ++count;
    return count;
}

// A joint that goes through these rows of "x y z", one a step.
inline std::string Motion(std::vector<std::string> const& rows, std::string const& step = "1")
{
    std::string text = "HIERARCHY\nROOT a\n{\nCHANNELS 3 Xposition Yposition Zposition\n}\nMOTION\nFrames: " +
                       std::to_string(rows.size()) + "\nFrame Time: " + step + '\n';
    for (std::string const& row : rows) text += row + '\n';
    return text;
}
