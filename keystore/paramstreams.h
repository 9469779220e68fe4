#pragma once

#include "keystore/stream.h"

// A parameter whose value is a layer: a pointer of the host's in the parameter record, the same at all times, with no
// keys. An independent one (KFS_BaseFlag_Independent) holds the flat number of its layer instead, which means the same
// outside the project.
//
// What the pointers mean is the host's affair, which it settles in the layer functions of KFS_AppCallbacks; they must
// be set.
class KFS_API KFS_ParamLayerStream : public KFS_Stream {
public:
    // Throws an int, as the base's constructor does.
    KFS_ParamLayerStream(unsigned int timeScale, unsigned char noKeys, KFS_MatchName const* name,
                         KFS_StreamFactory* factory, bool canonical);
    KFS_ParamLayerStream(KFS_ParamLayerStream const& source, KFS_CloneStreamParams const& params);

    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const& params) const override;
    hearth::utility::Guid GetRenderGuid(KFS_RenderOptionsBase const& options,
                                        GetRenderGuidFilter* filter) const override;
    // Exchanges the pointer and the flat number.
    void MakeIndependent(bool independent) override;
    void FillInParamDef() const override;
    // Takes the default layer. The time isn't looked at.
    void InsertDefaultKey(T_Time const& time) override;

    // The flat form of the value, for a file: the value itself of an independent stream, null of a canonical one.
    void* GetFlattenedReserved0() const;
};
