#include "frame/frame.h"

#include "frame/boundary_private.h"
#include "frame/frame_private.h"
#include "tree/factory.h"
#include "tree/streambase.h"

#include <utility>

static KFS_AppCallbacks S_KFS_Callbacks;
static KFS_StreamFactory* S_KFS_DefaultFactory = nullptr;

int KFS_Birth()
{
    XLOG_Log(10, "KFS", "Birth", "KFS Birth");
    return KFSp_Boundary([] {
        S_KFS_DefaultFactory = new KFS_StreamFactory;
        return KFS_StreamBase::Birth();
    });
}

int KFS_Death()
{
    XLOG_Log(10, "KFS", "Death", "KFS Death");
    int const code = KFS_StreamBase::Death();
    delete std::exchange(S_KFS_DefaultFactory, nullptr);
    return code;
}

void KFS_SetCallbacks(KFS_AppCallbacks& callbacks)
{
    S_KFS_Callbacks = callbacks;
}

void KFS_ClearCallbacks()
{
    S_KFS_Callbacks = KFS_AppCallbacks();
}

KFS_StreamFactory* Get_VX_StreamFactory()
{
    return S_KFS_DefaultFactory;
}

KFS_AppCallbacks const& KFSp_GetCallbacks()
{
    return S_KFS_Callbacks;
}
