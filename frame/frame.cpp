#include "frame/frame.h"

#include "frame/frame_private.h"

static KFS_AppCallbacks S_KFS_Callbacks;

void KFS_SetCallbacks(KFS_AppCallbacks& callbacks)
{
    S_KFS_Callbacks = callbacks;
}

void KFS_ClearCallbacks()
{
    S_KFS_Callbacks = KFS_AppCallbacks();
}

KFS_AppCallbacks const& KFSp_GetCallbacks()
{
    return S_KFS_Callbacks;
}
