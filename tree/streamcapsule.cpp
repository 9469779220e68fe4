#include "tree/capsulehash_private.h"
#include "tree/streambase.h"
#include "tree/streamgroup.h"

#include <utility>

namespace {

// The way up from a node, head first; answers the topmost node.
KFS_StreamBase const* CollectPath(KFS_StreamBase const* node, KFS_StreamIDPath* path)
{
    path->Clear();
    while (KFS_StreamGroup const* const parent = node->GetParent()) {
        path->AddHead(parent->SlowGetIDOfChild(node));
        node = parent;
    }
    return node;
}

}  // namespace

void KFS_StreamBase::SlowGetPathFromRootToMe(KFS_StreamGroup** root, KFS_StreamIDPath* path)
{
    *root = const_cast<KFS_StreamGroup*>(CollectPath(this, path)->GetAsGroup());
}

void KFS_StreamBase::SlowGetPathFromRootToMe(KFS_StreamGroup const** root, KFS_StreamIDPath* path) const
{
    *root = CollectPath(this, path)->GetAsGroup();
}

KFS_StreamCapsuleData const& KFS_StreamBase::GetStreamCapsuleData() const
{
    if (capsuleHash_.load(std::memory_order_acquire) != 0) return capsuleData_;
    hearth::threads::ScRecursiveLock const guard(lock_);
    if (!capsuleData_.id.empty()) return capsuleData_;
    if (IsCanonical()) {
        capsuleData_.id = GetMatchName16Str();
        return capsuleData_;
    }
    KFS_StreamCapsuleData found;
    KFS_StreamGroup const* root = nullptr;
    SlowGetPathFromRootToMe(&root, &found.path);
    found.id = (root ? root->GetCapsuleStreamID() : u16str()) + found.path.GetAs_JSON();
    capsuleData_ = std::move(found);
    return capsuleData_;
}

unsigned int KFS_StreamBase::ComputeCapsuleHash() const
{
    u16str const& id = GetStreamCapsuleData().id;
    unsigned int const hash = KFSp_CapsuleHash(id);
    // An empty identifier is looked up anew each time, as it may have become another by then.
    if (!id.empty()) capsuleHash_.store(hash, std::memory_order_release);
    return hash;
}
