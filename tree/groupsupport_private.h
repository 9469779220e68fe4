#pragma once

#include "tree/listener_private.h"
#include "tree/streamgroup.h"
#include "tree/verify_private.h"

// What the named and the indexed group have in common.

// An identifier that has both an index and a match name must agree with the child at that index.
inline void KFSp_ValidateMatchNames(KFS_StreamID const& id, KFS_StreamBase const* child)
{
    if (id.GetMatchName().IsValid() && id.GetMatchName() != child->GetMatchName()) {
        KFSp_FailVerification("stream at index has wrong matchname");
    }
}

// One of the listener's operations that tell of a child's edit.
using KFSp_ChildNotification = void (KFS_StreamListener::*)(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int);

inline void KFSp_NotifyOfChild(KFSp_ChildNotification what, KFS_StreamGroup* group, KFS_StreamBase const* child,
                               unsigned int index)
{
    KFSp_Notify(group, [=](KFS_StreamListener* listener) { (listener->*what)(group, child, index); });
}
