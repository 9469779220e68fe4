#include "cli/movekeys.h"

namespace {

Work Prepare(CLI::App& command)
{
    return PrepareMove(
        command, {kfshost::JoinDimensions, true,
                  "separated streams to be joined, whose paths match this pattern, with * and ? (quote it)", "joined"});
}

}  // namespace

Command const JoinCommand{"Make and check projects", "join",
                          "Put the components of a separated position together again", Prepare};
