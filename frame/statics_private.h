#pragma once

#include "frame/services/threads.h"

#include <boost/thread/tss.hpp>

// Objects that are made when the library loads and outlive KFS_Birth .. KFS_Death. They stand in one file, because their
// order counts, in the highest folder that has some (keystore/statics.cpp).

// Non-zero while a look-up on this thread is inside an update pass; null until first used.
boost::thread_specific_ptr<int>& KFSp_GetTimeToIndexCheck();
// True while this thread tells ancestors of a stored stream; null until first used.
boost::thread_specific_ptr<bool>& KFSp_GetNotifyParentsCheck();
// This thread's pause flag of the main listener manager; null until first used.
boost::thread_specific_ptr<bool>& KFSp_GetMainListenerPauseState();
// Ends a thread's flag, whoever takes it away (tree/listener.cpp, which knows where the flag stands).
void KFSp_FreeMainListenerPauseState(bool* state);
// Guards the lazy fill of canonical groups.
hearth::threads::RecursiveMutex& KFSp_GetCanonicalLock();
