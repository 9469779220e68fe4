#pragma once

#include "frame/services/scoped.h"
#include "tree/listener_private.h"
#include "tree/streamgroup.h"
#include "tree/verify_private.h"

#include <algorithm>

// What the named and the indexed group have in common.

// The real children cloned, without a parent; the canonical ones as they are.
KFS_GroupChildren KFSp_CloneChildren(KFS_GroupChildren const& source, KFS_CloneStreamParams const& params);
// Deletes the real children, with no word about their removal, and forgets them all.
void KFSp_DeleteChildren(KFS_GroupChildren* children) noexcept;

// A child on its way into a group. It is deleted if it doesn't arrive, unless it is canonical: then it is the factory's.
struct KFSp_ScIncoming {
    explicit KFSp_ScIncoming(KFS_StreamBase* child) noexcept : stream(child) {}
    ~KFSp_ScIncoming()
    {
        if (stream && stream->IsCanonical()) static_cast<void>(stream.release());
    }
    KFSp_ScIncoming(KFSp_ScIncoming const&) = delete;
    KFSp_ScIncoming& operator=(KFSp_ScIncoming const&) = delete;

    Q_ScAutoPtr<KFS_StreamBase> stream;
};

// An identifier that has both an index and a match name must agree with the child at that index.
inline void KFSp_ValidateMatchNames(KFS_StreamID const& id, KFS_StreamBase const* child)
{
    if (id.GetMatchName().IsValid() && id.GetMatchName() != child->GetMatchName())
        KFSp_FailVerification("stream at index has wrong matchname");
}

// One of the listener's operations that tell of a child's edit.
using KFSp_ChildNotification = void (KFS_StreamListener::*)(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int);

inline void KFSp_NotifyOfChild(KFSp_ChildNotification what, KFS_StreamGroup* group, KFS_StreamBase const* child,
                               unsigned int index)
{
    KFSp_Notify(
        group, [=](KFS_StreamListener* listener) { (listener->*what)(group, child, index); });
}

// Every notification may edit the group that sends it, so a place is looked for again behind each of them.
inline KFS_GroupChildren::iterator KFSp_FindChild(KFS_GroupChildren& children, KFS_StreamBase const* child)
{
    return std::find(children.begin(), children.end(), child);
}

inline unsigned int KFSp_PlaceOf(KFS_GroupChildren& children, KFS_StreamBase const* child)
{
    return static_cast<unsigned int>(KFSp_FindChild(children, child) - children.begin());
}

// Tells that `incoming` is in its place now; `child` is the one that listeners are told of. An independent newcomer is
// tied in while they look. What they make of another one stays.
void KFSp_NotifyOfSwap(KFS_StreamGroup* group, KFS_GroupChildren& children, KFS_StreamBase* incoming,
                       KFS_StreamBase const* child, unsigned int index);

// Takes a child from the list, where listeners see it until both notifications are told. False if it isn't there, or if
// a listener has taken it meanwhile.
bool KFSp_RemoveChild(KFS_StreamGroup* group, KFS_GroupChildren* children, KFS_StreamBase* child);
