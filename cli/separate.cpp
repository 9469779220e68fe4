#include "cli/movekeys.h"

namespace {

Work Prepare(CLI::App& command)
{
    return PrepareMove(command, {kfshost::SeparateDimensions, false,
                                 "streams to be separated, whose paths match this pattern, with * and ? (quote it)",
                                 "separated"});
}

}  // namespace

Command const SeparateCommand{"Make and check projects", "separate",
                              "Give each component of a position a stream of its own", Prepare};
