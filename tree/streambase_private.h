#pragma once

#include "tree/matchname.h"

// The name of the one component of the path that ends a run of paths in a file. Between KFS_StreamBase::Birth and
// Death.
KFS_MatchName const& KFSp_GetEndOfIDPathSentinelMatchName();
