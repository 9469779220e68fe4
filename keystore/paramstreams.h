#pragma once

#include "keystore/derivedstream.h"

// Parameters whose value is a layer or a path of the host's. The value stands in the parameter record, not in keys: it is
// the same at all times, and such a stream can't be animated.
//
// An independent stream (KFS_BaseFlag_Independent) holds a flat number instead, which means the same outside the project.
// What pointers, identifiers and flat numbers mean is the host's affair, which it settles in the functions of
// KFS_AppCallbacks: the layer and path functions must be set while there are such streams.
//
// Threads: as KFS_DerivedStream; MakeIndependent is an edit.

struct KFS_ParamLayerStreamTraits {
    using ValueType = void*;
};
template <>
inline constexpr std::optional<KFS_ParamDetails> KFS_ParamDetailsOf<KFS_ParamLayerStreamTraits> =
    KFS_ParamDetails{.paramType = FX_Param_LAYER, .sliderMin = KFS_NoSlider, .sliderMax = KFS_NoSlider};

struct KFS_ParamPathStreamTraits {
    using ValueType = unsigned int;
};
template <>
inline constexpr std::optional<KFS_ParamDetails> KFS_ParamDetailsOf<KFS_ParamPathStreamTraits> =
    KFS_ParamDetails{.paramType = FX_Param_PATH, .sliderMin = KFS_NoSlider, .sliderMax = KFS_NoSlider};

// A layer: a pointer, never followed and not owned.
class KFS_API KFS_ParamLayerStream
    : public KFS_DynamicEnglishDisplayNameNonLeaf<KFS_DerivedStream<KFS_ParamLayerStreamTraits>> {
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

    using KFS_DerivedStream::ExtractCapsuleOverrideValue;
    // The time isn't looked at.
    void* GetValueEx(KFS_EvalData const& eval) const override;
    void ExtractCapsuleOverrideValue(void**& value, KFS_EvalData const& eval) const override;
    void SetValue(T_Time const& time, void* const& value) override;
    // The application's: layerDefaultValueFunc.
    void* GetDefaultValue() const override;

    // The flat form of the value, for a file: the value itself of an independent stream, null of a canonical one.
    void* GetFlattenedReserved0() const;
};

// A mask or another path: its identifier. The values are described as KFS_Type_U32.
class KFS_API KFS_ParamPathStream
    : public KFS_DynamicEnglishDisplayNameNonLeaf<KFS_DerivedStream<KFS_ParamPathStreamTraits>> {
public:
    // Throws an int, as the base's constructor does.
    KFS_ParamPathStream(unsigned int timeScale, unsigned char noKeys, KFS_MatchName const* name,
                        KFS_StreamFactory* factory, bool canonical);
    KFS_ParamPathStream(KFS_ParamPathStream const& source, KFS_CloneStreamParams const& params);

    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const& params) const override;
    hearth::utility::Guid GetRenderGuid(KFS_RenderOptionsBase const& options,
                                        GetRenderGuidFilter* filter) const override;
    // Exchanges the identifier and the flat number.
    void MakeIndependent(bool independent) override;

    using KFS_DerivedStream::ExtractCapsuleOverrideValue;
    // The time isn't looked at.
    unsigned int GetValueEx(KFS_EvalData const& eval) const override;
    void ExtractCapsuleOverrideValue(unsigned int*& value, KFS_EvalData const& eval) const override;
    void SetValue(T_Time const& time, unsigned int const& value) override;
    // The record's default identifier.
    unsigned int GetDefaultValue() const override;
};
