#include "frame/boundary_private.h"
#include "frame/services/chunkfile.h"
#include "tree/factory.h"
#include "tree/indexedgroup.h"
#include "tree/namedgroup.h"

#include <memory>

namespace {

constexpr unsigned int NewStreamScale = 600;  // a leaf takes the file's

// The child's own class knows which list it expects; a leaf enters it itself.
void ReadChild(KFS_StreamBase* child, CKF_File* file, CKF_ChunkInfo const* list)
{
    child->Read(file, child->IsLeaf() ? nullptr : list);
}

void ReadGroup(KFS_StreamGroup* group, CKF_File* file, CKF_ChunkInfo const* parent)
{
    bool found = false;
    CKF_ScDescendList const list(file, CKF_Id("kfgp"), parent, &found);
    if (!found) return;
    group->KFS_StreamBase::Read(file, list.GetChunkInfo());
    for (;;) {
        KFS_MatchName name;
        name.Read(file, list.GetChunkInfo());  // steps over what nobody has taken
        if (name.IsEndOfGroupMarker()) return;
        group->ReadAndStore(name, file, list.GetChunkInfo());
    }
}

}  // namespace

void KFS_StreamGroup::Read(CKF_File* file, CKF_ChunkInfo const* parent)
{
    KFSp_ThrowIf(KFSp_Boundary([&] { ReadGroup(this, file, parent); }));
}

void KFS_NamedStreamGroup::ReadAndStore(KFS_MatchName const& name, CKF_File* file, CKF_ChunkInfo const* chunk)
{
    Q_ScAutoPtr<KFS_StreamBase> stream(CreateStream(name, true, NewStreamScale, false, false));
    KFS_StreamBase* const child = stream.get();
    if (!child) return;
    if (!GetStream(name, false)) {
        ReadChild(child, file, chunk);
        UpgradeChildStream(child);
        return;
    }
    // In its place before it reads, because what it takes from the file depends on its parent. What was there goes once
    // it has read.
    std::unique_ptr<KFS_StreamBase> const old(SwapStream(&stream));
    if (GetStream(name, false) == child) ReadChild(child, file, chunk);  // else a listener has taken it
}

void KFS_IndexedStreamGroup::ReadAndStore(KFS_MatchName const& name, CKF_File* file, CKF_ChunkInfo const* chunk)
{
    Q_ScAutoPtr<KFS_StreamBase> stream(CreateStream(name, true, NewStreamScale, true, false));
    KFS_StreamBase* const child = stream.get();
    if (!child) return;
    unsigned int const place = AppendStream(&stream);
    if (place < GetNumStreams()) ReadChild(child, file, chunk);  // else a listener has taken it
}
