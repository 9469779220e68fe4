#include "tree/streamid.h"

#include "frame/services/chunkfile.h"
#include "persist/longs_private.h"

namespace {

constexpr int ListType = CKF_Id("kfsi");
constexpr int IndexId = CKF_Id("kfix");

}  // namespace

void KFS_StreamID::Read(CKF_File* file, CKF_ChunkInfo const* parent)
{
    CKF_ScDescendList const list(file, ListType, parent, nullptr);
    auto const index = static_cast<unsigned int>(KFSp_ReadLong(file, list.GetChunkInfo(), IndexId));
    KFS_MatchName name;
    name.Read(file, list.GetChunkInfo());
    *this = KFS_StreamID(index, name);
}

void KFS_StreamID::Write(CKF_File* file) const
{
    CKF_ScWriteList const list(file, ListType, 0);
    KFSp_WriteLong(file, IndexId, static_cast<int>(index_));
    matchName_.Write(file);
}
