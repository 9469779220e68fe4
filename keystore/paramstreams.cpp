// The layer stream: a leaf whose value is in its parameter record.

#include "keystore/paramstreams.h"

#include "frame/frame.h"
#include "frame/frame_private.h"
#include "frame/services/byteorder.h"

namespace {

KFS_ValueDesc LayerValueDesc()
{
    KFS_ValueDesc desc;
    desc.dataType = KFS_Type_S32;
    return desc;
}

}  // namespace

KFS_ParamLayerStream::KFS_ParamLayerStream(unsigned int timeScale, unsigned char noKeys, KFS_MatchName const* name,
                                           KFS_StreamFactory* factory, bool canonical)
    : KFS_Stream(1, timeScale, noKeys, 0, 0, KFS_InterpMask_Linear, LayerValueDesc(), name, factory, canonical)
{
    KFS_Stream::SetStreamBaseFlags(KFS_BaseFlag_Active, ~static_cast<unsigned int>(KFS_BaseFlag_Canonical));
}

KFS_ParamLayerStream::KFS_ParamLayerStream(KFS_ParamLayerStream const& source, KFS_CloneStreamParams const& params)
    : KFS_Stream(source, params)
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
    SetStreamBaseFlags(independent ? KFS_BaseFlag_Independent : 0U, KFS_BaseFlag_Independent);
}

void KFS_ParamLayerStream::FillInParamDef() const
{
    FX_ParamDef def{};
    def.paramType = FX_Param_LAYER;
    pSetParamDef(def);
}

void KFS_ParamLayerStream::InsertDefaultKey(T_Time const&)
{
    GetParamDef().value.layer.reservedPointer = KFSp_GetCallbacks().layerDefaultValueFunc(this);
}

void* KFS_ParamLayerStream::GetFlattenedReserved0() const
{
    if (IsIndependent()) return GetParamDef().value.layer.reservedPointer;
    return IsCanonical() ? nullptr : Q_IntPtrToPointer(KFSp_GetCallbacks().layerIndependentFunc(this, true));
}
