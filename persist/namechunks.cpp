// Match names, identifiers and paths in files. The tree that they belong to knows nothing of files.
#include "frame/boundary_private.h"
#include "frame/frame_private.h"
#include "frame/services/chunkfile.h"
#include "persist/longs_private.h"
#include "tree/streambase_private.h"
#include "tree/streampath.h"
#include "tree/verify_private.h"

#include <cstring>

namespace {

// Ends the children of a group in a file. Asked of each child, so it is hashed once.
KFS_MatchName const& EndOfGroup()
{
    static KFS_MatchName const name("ZQVM Group End", true);
    return name;
}

constexpr int NameId = CKF_Id("kfmn");
constexpr int NameSize = 40;

constexpr int IdListType = CKF_Id("kfsi");
constexpr int IndexId = CKF_Id("kfix");

constexpr int PathListType = CKF_Id("kfsp");
constexpr int OldTypeId = CKF_Id("kfot");
constexpr int LengthId = CKF_Id("kfpl");

constexpr int NoOldType = -1;

}  // namespace

void KFS_MatchName::Read(CKF_File* file, CKF_ChunkInfo const* parent)
{
    unsigned char text[NameSize + 1] = {};  // an atom without a NUL ends somewhere too
    KFSp_ThrowIf(CKF_ReadAtom(file, NameId, parent, NameSize, text));
    SetName(text);
}

void KFS_MatchName::Write(CKF_File* file) const
{
    unsigned char atom[NameSize] = {};
    if (unsigned char const* const text = GetName())
        std::memcpy(atom, text, std::strlen(reinterpret_cast<char const*>(text)));
    else if (IsValid())
        KFSp_FailVerification("asked to write a match name without a text");
    KFSp_ThrowIf(CKF_WriteAtom(file, NameId, NameSize, atom));
}

void KFS_MatchName::WriteEndOfGroupMarker(CKF_File* file)
{
    EndOfGroup().Write(file);
}

bool KFS_MatchName::IsEndOfGroupMarker() const
{
    return *this == EndOfGroup();
}

void KFS_StreamID::Read(CKF_File* file, CKF_ChunkInfo const* parent)
{
    CKF_ScDescendList const list(file, IdListType, parent, nullptr);
    auto const index = static_cast<unsigned int>(KFSp_ReadLong(file, list.GetChunkInfo(), IndexId));
    KFS_MatchName name;
    name.Read(file, list.GetChunkInfo());
    *this = KFS_StreamID(index, name);
}

void KFS_StreamID::Write(CKF_File* file) const
{
    CKF_ScWriteList const list(file, IdListType, 0);
    KFSp_WriteLong(file, IndexId, static_cast<int>(index_));
    matchName_.Write(file);
}

void KFS_StreamIDPath::Read(CKF_File* file, CKF_ChunkInfo const* parent)
{
    CKF_ScDescendList const list(file, PathListType, parent, nullptr);
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
    CKF_ScWriteList const list(file, PathListType, 0);
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
