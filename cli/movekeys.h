#pragma once

#include "cli/command.h"
#include "host/dimensions.h"

// What `kfs separate` and `kfs join` have in common: the keys of the chosen streams move, and a project is saved.

struct Move {
    kfshost::MoveNotes (*run)(KFS_Stream& leader, double tolerance);
    bool skipsDimensions;  // a dimension that is chosen together with its leader moves with it
    char const* what;      // of the chosen streams
    char const* done;
};

Work PrepareMove(CLI::App& command, Move const& move);
