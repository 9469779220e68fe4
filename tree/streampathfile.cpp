#include "frame/frame_private.h"
#include "frame/services/chunkfile.h"
#include "persist/longs_private.h"
#include "tree/streambase_private.h"
#include "tree/streampath.h"

namespace {

constexpr int ListType = CKF_Id("kfsp");
constexpr int OldTypeId = CKF_Id("kfot");
constexpr int LengthId = CKF_Id("kfpl");

constexpr int NoOldType = -1;

}  // namespace

void KFS_StreamIDPath::Read(CKF_File* file, CKF_ChunkInfo const* parent)
{
    CKF_ScDescendList const list(file, ListType, parent, nullptr);
    Clear();
    int const oldType = KFSp_ReadLong(file, list.GetChunkInfo(), OldTypeId);
    int const length = KFSp_ReadLong(file, list.GetChunkInfo(), LengthId);
    // The length is only a claim: the first component that isn't there ends the loop, and nothing is reserved for it.
    for (int i = 0; i < length; ++i) {
        KFS_StreamID id;
        id.Read(file, list.GetChunkInfo());
        AddTail(id);
    }
    // Whether there is a type number is for the file to say, so a host without the callback keeps the path as it is.
    if (auto const fixUp = KFSp_GetCallbacks().oldPathFixupFunc; fixUp && oldType >= 0) fixUp(oldType, this);
}

void KFS_StreamIDPath::Write(CKF_File* file) const
{
    CKF_ScWriteList const list(file, ListType, 0);
    KFSp_WriteLong(file, OldTypeId, NoOldType);
    KFSp_WriteLong(file, LengthId, static_cast<int>(GetLength()));
    for (KFS_StreamID const& id : components_) id.Write(file);
}

void KFS_StreamIDPath::WriteSentinel(CKF_File* file)
{
    KFS_StreamIDPath(KFSp_GetEndOfIDPathSentinelMatchName()).Write(file);
}

bool KFS_StreamIDPath::IsSentinel() const
{
    return GetLength() == 1 && GetHead().GetMatchName() == KFSp_GetEndOfIDPathSentinelMatchName();
}
