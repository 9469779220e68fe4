#include "frame/boundary_private.h"
#include "frame/services/chunkfile.h"
#include "keystore/stream.h"
#include "persist/longs_private.h"
#include "persist/versions_private.h"
#include "tree/factory.h"
#include "tree/streamgroup.h"

// What every node writes first: its flags, "kfsb", and its display name, "kfsn". A name that the reader will know
// without being told is left out, and a marker stands in its place.

using hearth::threads::ScRecursiveLock;

namespace {

constexpr int FlagsId = CKF_Id("kfsb");
constexpr int NameId = CKF_Id("kfsn");

// Facts about this run or about the kind of stream, not about the project: bits of a file that say such a thing have no
// effect.
constexpr unsigned int UnsavedFlags = KFS_BaseFlag_Canonical | KFS_BaseFlag_ShowActiveSwitch | KFS_BaseFlag_Elided |
                                      KFS_BaseFlag_Independent | KFS_BaseFlag_SkipLeafRead |
                                      KFS_BaseFlag_AffectsRenderingWhenHidden | KFS_BaseFlag_Boolean3Way |
                                      KFS_BaseFlag_DisplayNameIncludesParent | KFS_BaseFlag_SkipReveal;
static_assert(UnsavedFlags == 0x1D0EC && ~UnsavedFlags == 0xFFFE2F13);

// As long as a string keeps its characters in itself, so that it costs a node no more than a comparison.
u16str const& NoNameMarker()
{
    static u16str const marker = Q_AsciiToUTF16String("-_0_/-");
    return marker;
}

// Whether a reader gets the node's name from elsewhere: in an indexed group from the canonical stream, in others from
// the group's type.
bool IsNameKnownToReaders(KFS_StreamBase const* node, u16str const& name)
{
    KFS_StreamGroup const* const parent = node->GetParent();
    if (node->IsCanonical() || !parent) return false;
    if (!parent->IsIndexedGroup()) return !parent->CouldGoMissing();
    // A node that no factory made is of no kind, and so has no canonical stream.
    KFS_StreamBase const* const canonical =
        node->GetFactory() ? node->GetCanonicalStream(node->GetMatchName()) : nullptr;
    return !canonical || canonical->GetDisplayName() == name;
}

bool TakesNameFromFile(KFS_StreamBase const* node)
{
    KFS_StreamGroup const* const parent = node->GetParent();
    return !parent || parent->IsIndexedGroup() || (parent->CouldGoMissing() && node->GetDisplayName().empty());
}

void ReadName(KFS_StreamBase* node, CKF_File* file, CKF_ChunkInfo const* chunk)
{
    u16str name;
    bool const found = CKF_ReadString(file, chunk, NameId, &name, u16str(), 0);
    if (found && name != NoNameMarker() && TakesNameFromFile(node)) node->SetDisplayName(name);
}

// Files up to that version have no notion of a follower that isn't active.
void ActivateOldFollower(KFS_StreamBase* node, CKF_File const* file)
{
    if (file->majorVersion > KFSp_LastVersion_ImplicitFollowers) return;
    KFS_Stream const* const leaf = node->GetAsLeaf();
    if (leaf && leaf->IsSeparationFollower()) node->SetStreamBaseFlags(KFS_BaseFlag_Active, KFS_BaseFlag_Active);
}

}  // namespace

void KFS_StreamBase::Write(CKF_File* file) const
{
    KFSp_WriteLong(file, FlagsId, static_cast<int>(flags_ & ~UnsavedFlags));
    u16str name;
    {
        ScRecursiveLock const guard(lock_);
        name = GetDisplayName();
    }
    if (IsNameKnownToReaders(this, name)) name = NoNameMarker();
    KFSp_ThrowIf(CKF_WriteString(file, NameId, name, 0));
}

void KFS_StreamBase::Read(CKF_File* file, CKF_ChunkInfo const* chunk)
{
    if (file->majorVersion >= KFSp_FirstVersion_BaseFlags) {
        SetStreamBaseFlags(static_cast<unsigned int>(KFSp_ReadLong(file, chunk, FlagsId)), ~UnsavedFlags);
        if (file->majorVersion >= KFSp_FirstVersion_DisplayName) ReadName(this, file, chunk);
    }
    ActivateOldFollower(this, file);
}
