#pragma once

#include "tree/listener.h"

// Whether a notification from this stream would reach the listeners: not in silent run mode, not canonical, this thread not paused, and
// its root wants to be heard. A silent stream costs a load and a compare. Asked before a notification is put together.
bool KFSp_IsHeard(KFS_StreamBase* stream);

// The main manager's life, from KFS_StreamBase::Birth to Death.
void KFSp_MakeMainListenerManager();
void KFSp_DestroyMainListenerManager() noexcept;
