// All objects that are made when the library loads. The order of these definitions is the order in which they are made,
// so they stand in one file, which belongs to the highest folder that has such objects.

#include "frame/statics_private.h"

#include "frame/project.h"
#include "keystore/cachestate.h"
#include "keystore/expstate.h"
#include "tree/matchnamepool_private.h"

using hearth::utility::ImmutableString;

ImmutableString const KFS_ExpState::S_StateName = ImmutableString::Create("ExpState");
ImmutableString const KFS_RenderState::S_StateName = ImmutableString::Create("RenderState");
ImmutableString const KFS_CapsuleOverrides::S_StateName = ImmutableString::Create("KFS_CapsuleOverrides");
ImmutableString const KFS_StreamCacheState::S_StateName = ImmutableString::Create("KFS_StreamCacheState");

static boost::thread_specific_ptr<int> S_TimeToIndex_reentrancy_check;

static KFSp_MatchNamePool S_KFS_MatchNamePool;

static boost::thread_specific_ptr<bool> S_KFS_NotifyParents_reentrancy_check;
static boost::thread_specific_ptr<bool> S_KFS_MainListenerManagerPauseState(KFSp_FreeMainListenerPauseState);
static hearth::threads::RecursiveMutex S_canonical_lock;

boost::thread_specific_ptr<int>& KFSp_GetTimeToIndexCheck()
{
    return S_TimeToIndex_reentrancy_check;
}

KFSp_MatchNamePool& KFSp_GetMatchNamePool()
{
    return S_KFS_MatchNamePool;
}

boost::thread_specific_ptr<bool>& KFSp_GetNotifyParentsCheck()
{
    return S_KFS_NotifyParents_reentrancy_check;
}

boost::thread_specific_ptr<bool>& KFSp_GetMainListenerPauseState()
{
    return S_KFS_MainListenerManagerPauseState;
}

hearth::threads::RecursiveMutex& KFSp_GetCanonicalLock()
{
    return S_canonical_lock;
}
