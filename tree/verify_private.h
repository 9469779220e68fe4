#pragma once

#include "frame/report_private.h"
#include "frame/services/reports.h"

// A broken invariant of the tree: reports it, with the line of the caller, and throws the int 3.
[[noreturn]] inline void KFSp_FailVerification(char const* text, int line = __builtin_LINE())
{
    Q_ReportFailedVerification(KFSp_ModuleId, line, 0, text);
    throw int{KFS_Err_LegacyMismatch};
}
