#pragma once

#include "frame/frame.h"

// The application's callbacks; all null outside KFS_SetCallbacks .. KFS_ClearCallbacks.
KFS_AppCallbacks const& KFSp_GetCallbacks();
