// Start and stop: what they make and destroy is the tree's.
#include "frame/boundary_private.h"
#include "frame/frame.h"
#include "tree/factory.h"
#include "tree/streambase.h"

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
    delete S_KFS_DefaultFactory;  // streams that die with it may still ask for it
    S_KFS_DefaultFactory = nullptr;
    return code;
}

KFS_StreamFactory* Get_VX_StreamFactory()
{
    return S_KFS_DefaultFactory;
}
