#pragma once

#include "frame/services/reports.h"

#include <source_location>

// A broken invariant of the tree: reports it and throws the int 3.
[[noreturn]] inline void KFSp_FailVerification(char const* text,
                                               std::source_location where = std::source_location::current())
{
    Q_ReportFailedVerification(0x1D0000, static_cast<int>(where.line()), 0, text);
    throw int{3};
}
