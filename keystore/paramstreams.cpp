// The streams whose value stands in the parameter record, and what they ask of the application.

#include "keystore/paramstreams.h"

#include "frame/frame.h"
#include "frame/frame_private.h"
#include "frame/services/byteorder.h"

namespace {

KFS_ValueDesc Described(KFS_Type type)
{
    KFS_ValueDesc desc;
    desc.dataType = type;
    return desc;
}

constexpr unsigned short NeverAnimated = 0;  // the interpolation mask of a value without keys
constexpr unsigned int AllButCanonical = ~static_cast<unsigned int>(KFS_BaseFlag_Canonical);

unsigned int IndependentFlag(bool independent)
{
    return independent ? KFS_BaseFlag_Independent : 0U;
}

}  // namespace

// ---- layers

KFS_ParamLayerStream::KFS_ParamLayerStream(unsigned int timeScale, unsigned char noKeys, KFS_MatchName const* name,
                                           KFS_StreamFactory* factory, bool canonical)
    : KFS_DynamicEnglishDisplayNameNonLeaf(1, timeScale, noKeys, 0, NeverAnimated, KFS_InterpMask_Linear,
                                           Described(KFS_Type_S32), name, factory, canonical)
{
    KFS_Stream::SetStreamBaseFlags(KFS_BaseFlag_Active, AllButCanonical);
}

KFS_ParamLayerStream::KFS_ParamLayerStream(KFS_ParamLayerStream const& source, KFS_CloneStreamParams const& params)
    : KFS_DynamicEnglishDisplayNameNonLeaf(source, params)
{}

KFS_StreamBase* KFS_ParamLayerStream::CloneStream(KFS_CloneStreamParams const& params) const
{
    return new KFS_ParamLayerStream(*this, params);
}

hearth::utility::Guid KFS_ParamLayerStream::GetRenderGuid(KFS_RenderOptionsBase const& options,
                                                          GetRenderGuidFilter* filter) const
{
    return KFSp_GetCallbacks().layerRenderGuidFunc(this, options, filter);
}

void KFS_ParamLayerStream::MakeIndependent(bool independent)
{
    GetParamDef().value.layer.reservedPointer =
        Q_IntPtrToPointer(KFSp_GetCallbacks().layerIndependentFunc(this, independent));
    SetStreamBaseFlags(IndependentFlag(independent), KFS_BaseFlag_Independent);
}

void* KFS_ParamLayerStream::GetValueEx(KFS_EvalData const&) const
{
    return GetParamDef().value.layer.reservedPointer;
}

void KFS_ParamLayerStream::ExtractCapsuleOverrideValue(void**&, KFS_EvalData const&) const {}

void KFS_ParamLayerStream::SetValue(T_Time const&, void* const& value)
{
    GetParamDef().value.layer.reservedPointer = value;
}

void* KFS_ParamLayerStream::GetDefaultValue() const
{
    return KFSp_GetCallbacks().layerDefaultValueFunc(this);
}

void* KFS_ParamLayerStream::GetFlattenedReserved0() const
{
    if (IsIndependent()) return GetParamDef().value.layer.reservedPointer;
    return IsCanonical() ? nullptr : Q_IntPtrToPointer(KFSp_GetCallbacks().layerIndependentFunc(this, true));
}

// ---- paths

KFS_ParamPathStream::KFS_ParamPathStream(unsigned int timeScale, unsigned char noKeys, KFS_MatchName const* name,
                                         KFS_StreamFactory* factory, bool canonical)
    : KFS_DynamicEnglishDisplayNameNonLeaf(1, timeScale, noKeys, 0, NeverAnimated, KFS_InterpMask_Linear,
                                           Described(KFS_Type_U32), name, factory, canonical)
{
    KFS_Stream::SetStreamBaseFlags(KFS_BaseFlag_Active, AllButCanonical);
}

KFS_ParamPathStream::KFS_ParamPathStream(KFS_ParamPathStream const& source, KFS_CloneStreamParams const& params)
    : KFS_DynamicEnglishDisplayNameNonLeaf(source, params)
{}

KFS_StreamBase* KFS_ParamPathStream::CloneStream(KFS_CloneStreamParams const& params) const
{
    return new KFS_ParamPathStream(*this, params);
}

hearth::utility::Guid KFS_ParamPathStream::GetRenderGuid(KFS_RenderOptionsBase const& options,
                                                         GetRenderGuidFilter* filter) const
{
    return KFSp_GetCallbacks().pathRenderGuidFunc(this, options, filter);
}

void KFS_ParamPathStream::MakeIndependent(bool independent)
{
    GetParamDef().value.path.pathIdentifier =
        static_cast<unsigned int>(KFSp_GetCallbacks().pathIndependentFunc(this, independent));
    SetStreamBaseFlags(IndependentFlag(independent), KFS_BaseFlag_Independent);
}

unsigned int KFS_ParamPathStream::GetValueEx(KFS_EvalData const&) const
{
    return GetParamDef().value.path.pathIdentifier;
}

void KFS_ParamPathStream::ExtractCapsuleOverrideValue(unsigned int*&, KFS_EvalData const&) const {}

void KFS_ParamPathStream::SetValue(T_Time const&, unsigned int const& value)
{
    GetParamDef().value.path.pathIdentifier = value;
}

unsigned int KFS_ParamPathStream::GetDefaultValue() const
{
    return GetParamDef().value.path.defaultPathIdentifier;
}
