#include "frame/boundary_private.h"
#include "frame/services/chunkfile.h"
#include "keystore/paramstreams.h"
#include "keystore/stream.h"
#include "persist/leafchunks_private.h"
#include "tree/factory.h"
#include "tree/streamgroup.h"

// A group in a file:
//
//   LIST kfgp
//     kfsb, kfsn         what every node has
//     kfmn  LIST         of each child that is written: its match name, and then the child
//     kfmn               the end marker
//
// A reader's group is built with canonical children, so those that a reader has anyway aren't written.

namespace {

// A NaN is unlike everything.
bool HasSameRange(KFS_Stream const* a, KFS_Stream const* b)
{
    return a->GetUIMinValue() == b->GetUIMinValue() && a->GetUIMaxValue() == b->GetUIMaxValue();
}

// What is said of a stream beside its value.
bool IsDescribedLike(KFS_StreamBase const* child, KFS_StreamBase const* canonical)
{
    KFS_Stream const* const leaf = child->GetAsLeaf();
    KFS_Stream const* const canonicalLeaf = canonical->GetAsLeaf();
    if (leaf && KFSp_HasSliderRange(child->GetParamDef().paramType) &&
        (!canonicalLeaf || !HasSameRange(leaf, canonicalLeaf)))
        return false;
    if (((child->GetStreamBaseFlags() ^ canonical->GetStreamBaseFlags()) &
         ~static_cast<unsigned int>(KFS_BaseFlag_Canonical)) != 0)
        return false;
    return child->GetDisplayName() == canonical->GetDisplayName() &&
           FX_ParamDef_GetName(&child->GetParamDef()) == FX_ParamDef_GetName(&canonical->GetParamDef());
}

bool IsWritten(KFS_StreamGroup const* group, KFS_StreamBase const* child, CKF_File const* file)
{
    if (child->IsCanonical() || !child->ShouldWriteForVersion(file)) return false;
    if (group->IsIndexedGroup() || child->IsNamedGroup() || child->IsModified() ||
        dynamic_cast<KFS_ParamLayerStream const*>(child) || child->GetParamDef().paramType == FX_Param_ALWAYS_SAVED)
        return true;
    KFS_StreamBase const* const canonical = child->GetCanonicalStream(child->GetMatchName());
    return !canonical || !IsDescribedLike(child, canonical);
}

void WriteGroup(KFS_StreamGroup const* group, CKF_File* file)
{
    CKF_ChunkInfo chunk{};
    KFSp_ThrowIf(CKF_BeginChunkWrite(file, CKF_ListId, 0, CKF_Id("kfgp"), &chunk));
    group->KFS_StreamBase::Write(file);
    for (unsigned int i = 0; i < group->GetNumStreams(); ++i) {
        KFS_StreamBase const* const child = group->GetStream(i);
        if (IsWritten(group, child, file)) {
            child->GetMatchNameOverrideForSave(file).Write(file);
            child->Write(file);
        }
    }
    KFS_MatchName::WriteEndOfGroupMarker(file);
    KFSp_ThrowIf(CKF_EndChunkWrite(file, &chunk));
}

}  // namespace

void KFS_StreamGroup::Write(CKF_File* file) const
{
    KFSp_ThrowIf(KFSp_Boundary([&] { WriteGroup(this, file); }));
}
