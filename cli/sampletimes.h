#pragma once

#include "cli/selection.h"

#include <CLI/CLI.hpp>

#include <optional>
#include <string>
#include <vector>

// Regular times at which a command asks.

struct SampleWords {
    std::string from;  // empty: the frame at or before the first key
    std::string to;    // empty: the frame at or after the last key
    std::string fps;   // empty: the rate of the keys
    std::string step;  // empty: a frame
};

// --from, --to and --fps; and --step, for commands that have it.
void AddSampleWords(CLI::App& command, SampleWords& words);
void AddStepWord(CLI::App& command, SampleWords& words);

// The rate that is asked for. Throws UserError.
std::optional<kfshost::Rational> AskedFps(SampleWords const& words);
// The rate of the keys. Tells of those that aren't on its frames.
kfshost::Rational FindFps(std::vector<kfshost::StreamItem const*> const& items, Selection const& selection);
// From one time to the next. Throws UserError.
kfshost::Rational StepOf(SampleWords const& words, kfshost::Rational const& fps);

// Steps from the frame at or before the first key to the one at or after the last, so that both poses are in; what is
// asked for begins at the time that is asked for. Throws UserError, for more times than anybody reads too.
std::vector<kfshost::Rational> SampleTimes(SampleWords const& words, kfshost::Rational const& fps,
                                           std::optional<TimeSpan> const& span);
