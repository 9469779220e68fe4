#include "tree/groupsupport_private.h"

#include <optional>

KFS_GroupChildren KFSp_CloneChildren(KFS_GroupChildren const& source, KFS_CloneStreamParams const& params)
{
    KFS_GroupChildren clones;
    clones.reserve(source.size());
    try {
        for (KFS_StreamBase* const child : source)
            clones.push_back(child->IsCanonical() ? child : child->CloneStream(params));
    } catch (...) {
        KFSp_DeleteChildren(&clones);
        throw;
    }
    return clones;
}

void KFSp_DeleteChildren(KFS_GroupChildren* children) noexcept
{
    for (KFS_StreamBase* const child : *children)
        if (!child->IsCanonical()) delete child;
    children->clear();
}

void KFSp_NotifyOfSwap(KFS_StreamGroup* group, KFS_StreamBase* incoming, KFS_StreamBase const* child,
                       unsigned int index)
{
    std::optional<KFS_ScSetResetIndependent> tiedIn;
    if (incoming->IsIndependent()) tiedIn.emplace(incoming, false);
    KFSp_NotifyOfChild(&KFS_StreamListener::StreamSwapped, group, child, index);
}
