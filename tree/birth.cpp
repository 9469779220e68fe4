// Start and stop: what they make and destroy is the tree's.
#include "frame/boundary_private.h"
#include "frame/frame.h"
#include "services/stamp_private.h"
#include "tree/factory.h"
#include "tree/streambase.h"

static KFS_StreamFactory* S_KFS_DefaultFactory = nullptr;

#ifndef KFS_FOREIGN_SERVICES
// Weak, so that other services can be loaded and told about instead of ending the process.
[[gnu::weak]] extern unsigned const Qp_ServicesStamp;
#endif

// Whether the services that were loaded are those whose insides the library knows.
static int CheckServices()
{
#ifndef KFS_FOREIGN_SERVICES
    unsigned const* const volatile stamp = &Qp_ServicesStamp;  // a compiler knows better than that it may be null
    if (!stamp || *stamp != Qp_ServicesStampValue) {
        Q_ReportFailedVerification(0x1D0000, 0, 0, "libkfs was built for other services than those that are loaded");
        return KFS_Err_ForeignServices;
    }
#endif
    return 0;
}

int KFS_Birth()
{
    XLOG_Log(10, "KFS", "Birth", "KFS Birth");
    if (int const code = CheckServices()) return code;
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
