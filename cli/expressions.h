#pragma once

#include "cli/command.h"
#include "cli/selection.h"

#include <optional>
#include <string>

// Expressions of streams on the command line: a failed one is told once, its stream counts as without a value from then on, and
// the exit code is ExitFailed in the end, while the other streams are answered.

void AddNoExpressions(CLI::App& command, Selection& selection);

// Whether an expression computes a stream's value, or that of one of its components.
bool HasActiveExpression(kfshost::StreamItem const& item);

// Tells which expressions have failed in reads so far, a line each on the standard error; whether any has.
bool TellFailedExpressions(Selection const& selection);

struct FailedExpression {
    std::string text;  // "line 2: ..."
    int line;          // -1 where there is none
};
// Of a stream whose failure was told.
std::optional<FailedExpression> FailureOf(kfshost::StreamItem const& item);

// The exit code of a command that ended with `code`; tells what nobody has told.
int EndWithExpressions(int code);
