#pragma once

#include "frame/services/reports.h"

// A broken invariant of the tree: reports it, with the line of the caller, and throws the int 3.
[[noreturn]] inline void KFSp_FailVerification(char const* text, int line = __builtin_LINE())
{
    Q_ReportFailedVerification(0x1D0000, line, 0, text);
    throw int{3};
}
