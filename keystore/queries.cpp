// What a leaf answers about itself, and what it does when asked for things that only typed streams can do.

#include "frame/boundary_private.h"
#include "frame/services/identifiers.h"
#include "keystore/edit.h"
#include "keystore/keylist_private.h"
#include "keystore/lookup.h"
#include "keystore/renderstates_private.h"
#include "keystore/stream.h"
#include "tree/streamgroup.h"

#include <utility>

namespace {

bool IsAnyFollowerAnimated(KFS_Stream const* leader)
{
    for (int i = 0; i < leader->GetEffectiveDimension(); ++i) {
        KFS_Stream const* const follower = leader->GetSeparationFollower(i);
        if (follower && follower->IsAnimated(false)) return true;
    }
    return false;
}

// The key whose hold covers the time; before the first key that is the first one.
int HoldingKey(KFS_Stream const* stream, T_Time const& time)
{
    int index = KFS_INVALID_INDEX;
    KFSp_ThrowIf(KFS_GetKeyIndex(stream, &time, &index, nullptr));
    return index == KFS_INVALID_INDEX ? 0 : index;
}

}  // namespace

bool KFS_Stream::IsModified() const
{
    return !IsCanonical() && (IsAnimated(true) || IsStaticValueModified());
}

bool KFS_Stream::IsAnimated(bool evenIfDisabled) const
{
    if (GetParent() && !IsCanonical() && AreDimensionsSeparated()) return IsAnyFollowerAnimated(this);
    KFS_Stream const* const seen = KFSp_Seen(this);  // a render's answers don't move with the main thread's edits
    if (seen->HasKeys()) return true;
    return evenIfDisabled ? seen->HasExpression() : seen->HasActiveExpression();
}

bool KFS_Stream::CanBeAnimated() const
{
    return GetInterpMask() != 0 && (GetParamDef().paramFlags & FX_ParamFlag_CannotAnimate) == 0;
}

bool KFS_Stream::IsHoldOnly() const
{
    return GetInterpMask() == KFS_InterpMask_Hold || (GetParamDef().paramFlags & FX_ParamFlag_HoldOnly) != 0;
}

bool KFS_Stream::SameValueAtTimes(T_Time const& a, T_Time const& b, KFS_ParamBag const*) const
{
    if (!IsAnimated(false) || a == b) return true;
    KFS_Stream const* const seen = KFSp_Seen(this);
    if (seen->GetInterpMask() != KFS_InterpMask_Hold || seen->HasActiveExpression()) return false;
    return HoldingKey(this, a) == HoldingKey(this, b);
}

void KFS_Stream::PrepareSetValue(T_Time const& time)
{
    if (HasNoKeys()) return;
    if (KFSp_ItemCount(GetKeyData()) > 0) {
        int index = KFS_INVALID_INDEX;
        KFSp_ThrowIf(KFS_TimeToIndex(this, &time, &index));
        if (index != KFS_INVALID_INDEX) return;
    }
    KFSp_ThrowIf(KFS_InsertKeyF(this, &time, 1, nullptr, KFS_Interp_None, KFS_Interp_None));
}

void KFS_Stream::SetStreamBaseFlags(unsigned int value, unsigned int mask)
{
    KFS_StreamBase::SetStreamBaseFlags(value, mask);
}

bool KFS_Stream::AreDimensionsSeparated() const
{
    return (GetStreamBaseFlags() & KFS_BaseFlag_DimensionsSeparated) != 0;
}

void KFS_Stream::SetDimensionsSeparated(bool separated)
{
    SetStreamBaseFlags(separated ? KFS_BaseFlag_DimensionsSeparated : 0U, KFS_BaseFlag_DimensionsSeparated);
}

bool KFS_Stream::AffectsRendering(KFS_RenderOptionsBase const&) const
{
    return true;
}

bool KFS_Stream::NeedsResetAfterStored() const
{
    return false;
}

bool KFS_Stream::IsStaticValueModified() const
{
    return true;
}

short KFS_Stream::GetEffectiveDimension() const
{
    return GetDimension();
}

bool KFS_Stream::IsCustomValuePointer() const
{
    return false;
}

M_Vector4T<double> KFS_Stream::GetVector4(T_Time const& time, int flags) const
{
    return GetVector4Ex(KFS_EvalData{time, flags, nullptr});
}

M_Vector4T<double> KFS_Stream::GetVector4(T_Time const& time, KFS_ParamBag const* bag, int flags) const
{
    return GetVector4Ex(KFS_EvalData{time, flags, bag});
}

M_Vector4T<double> KFS_Stream::GetVector4Ex(KFS_EvalData const&) const
{
    return {};
}

M_Vector4T<double> KFS_Stream::GetDefaultVector4() const
{
    return {};
}

void KFS_Stream::InsertDefaultKey(T_Time const&) {}

void KFS_Stream::CopyDefaultKey(T_Time const&, KFS_Stream const*) {}

void KFS_Stream::PrepareForInsertOfForeignValue(KFS_Stream const*) {}

void KFS_Stream::ForceKeyAtTime(T_Time const&) {}

void KFS_Stream::SetVector4(T_Time const&, M_Vector4T<double> const&) {}

void KFS_Stream::ExtractCapsuleOverrideValue(void*&, KFS_EvalData const&) const {}

void KFS_Stream::DisposeCapsuleOverrideValue(void*&) const {}

// Expressions.

bool KFS_Stream::CanHaveExpression() const
{
    if (!CanBeAnimated()) return false;
    if (!GetMatchName().IsValid()) return true;
    switch (GetParamDef().paramType) {
    case FX_Param_LAYER:
    case FX_Param_GROUP:
    case FX_Param_PATH:
    case 8:
    case 13:
    case 14: return false;
    default: return true;
    }
}

// The numbers of the streams that an expression has read aren't recorded yet.
void KFS_Stream::GetExpressionDependencyIds(std::set<int>& ids) const
{
    ids = exprInfo_.GetDependencyIds();
}

u16str KFS_Stream::GetExprPreEvalString() const
{
    return {};
}

int KFS_Stream::EvaluateExpression(T_Time const* time, double* values, void** customValue,
                                   KFS_ParamBag const* bag) const
{
    auto* const root = const_cast<KFS_StreamGroup*>(GetRoot());
    return root ? root->EvaluateExpression(this, time, values, customValue, bag) : 1;
}
