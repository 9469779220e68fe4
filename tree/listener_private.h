#pragma once

#include "tree/listener.h"

// Whether a notification from this stream would reach the listeners: not in silent run mode, not canonical, this thread
// not paused, and its root wants to be heard. A silent stream costs a load and a compare.
bool KFSp_IsHeard(KFS_StreamBase* stream);

// Null outside KFS_StreamBase::Birth .. Death.
KFS_StreamListenerManager* KFSp_GetMainListenerManager();

// Tells all listeners, if anybody hears this stream. Nothing is put together for a stream that nobody hears.
template <class Call>
void KFSp_Notify(KFS_StreamBase* stream, Call const& call)
{
    if (KFSp_IsHeard(stream)) KFSp_GetMainListenerManager()->NotifyAllListeners(call);
}

// The main manager's life, from KFS_StreamBase::Birth to Death.
void KFSp_MakeMainListenerManager();
void KFSp_DestroyMainListenerManager() noexcept;
