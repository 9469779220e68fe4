#pragma once

#include <CLI/CLI.hpp>

#include <functional>

// What kfs answers to whoever started it.
enum ExitCode : int {
    ExitDone = 0,
    ExitFound = 1,   // the command looked at its files and found what it tells
    ExitFailed = 2,  // nothing came of it; one line on the standard error says why
};

// Does what the words of a command line ask for. Answers an exit code, or throws what RunTold tells.
using Work = std::function<int()>;

// A command of kfs. Each stands in a file of its own, with what it parses and what it does.
struct Command {
    char const* task;  // under which heading the help lists it
    char const* name;
    char const* summary;
    // Gives the command its options. The work looks at them once the words are parsed.
    Work (*prepare)(CLI::App& command);
};

extern Command const InfoCommand;
extern Command const EvalCommand;
extern Command const PlotCommand;
extern Command const ImportCommand;
extern Command const SaveAsCommand;
extern Command const DragCommand;
extern Command const DumpCommand;
extern Command const DiffCommand;
extern Command const IdentityCommand;
extern Command const SampleCommand;
extern Command const SeparateCommand;
extern Command const JoinCommand;
extern Command const SetCommand;
