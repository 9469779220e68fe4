#include "tree/groupsupport_private.h"

namespace {

// Keeps an independent newcomer tied in for a scope, at whose end it may have been taken away.
class TiedIn {
public:
    TiedIn(KFS_GroupChildren& children, KFS_StreamBase* stream)
        : children_(children),
          stream_(stream->IsIndependent() ? stream : nullptr)
    {
        if (stream_) stream_->MakeIndependent(false);
    }
    ~TiedIn()
    {
        if (!stream_ || KFSp_FindChild(children_, stream_) == children_.end() || stream_->IsIndependent()) return;
        try {
            stream_->MakeIndependent(true);
        } catch (...) {
            // A destructor has nobody to tell.
        }
    }
    TiedIn(TiedIn const&) = delete;
    TiedIn& operator=(TiedIn const&) = delete;

private:
    KFS_GroupChildren& children_;
    KFS_StreamBase* stream_;
};

}  // namespace

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

void KFSp_NotifyOfSwap(KFS_StreamGroup* group, KFS_GroupChildren& children, KFS_StreamBase* incoming,
                       KFS_StreamBase const* child, unsigned int index)
{
    TiedIn const tiedIn(children, incoming);
    KFSp_NotifyOfChild(&KFS_StreamListener::StreamSwapped, group, child, index);
}

bool KFSp_RemoveChild(KFS_StreamGroup* group, KFS_GroupChildren* children, KFS_StreamBase* child)
{
    if (KFSp_FindChild(*children, child) == children->end()) return false;
    KFSp_NotifyOfChild(&KFS_StreamListener::StreamAboutToBeRemoved, group, child, KFSp_PlaceOf(*children, child));
    unsigned int const index = KFSp_PlaceOf(*children, child);
    if (index == children->size()) return false;
    child->SetParent(nullptr);
    KFSp_NotifyOfChild(&KFS_StreamListener::StreamRemoved, group, child, index);
    auto const found = KFSp_FindChild(*children, child);
    if (found == children->end()) return false;
    children->erase(found);
    return true;
}
