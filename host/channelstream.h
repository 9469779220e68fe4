#pragma once

#include "host/scene.h"
#include "keystore/derivedstream.h"

#include <atomic>
#include <cstdint>
#include <memory>
#include <vector>

namespace kfshost {

// What a stream's keys describe: a curve for each component, or a route with one speed graph for all of them.
enum class StreamForm { Curves, Path };

struct ChannelTraits {
    using ValueType = std::vector<double>;
};

// A leaf of a scene: as many doubles as its channel has components. What is known of it beside its value (default, limits,
// units, precision) is its kind's, and stands in its parameter record. Limits are for editors: a value of a file that lies
// beyond is held, and read, as it stands.
//
// A translation in two or three components is a separation leader (host/dimensions.h).
class ChannelStream final : public KFS_DerivedStream<ChannelTraits> {
public:
    // Without keys, or with `constant` at the kind's default. `dimension`: of a path 2 or 3. Throws an int.
    ChannelStream(StreamKind kind, short dimension, unsigned int timeScale, StreamForm form, bool constant,
                  KFS_StreamFactory* factory, bool canonical);
    ChannelStream(ChannelStream const& source, KFS_CloneStreamParams const& params);

    ~ChannelStream() override;

    StreamKind GetKind() const { return kind_; }

    // Changes whenever a leaf of this class comes or goes, so that who remembers some knows when to look again. Any thread.
    static std::uint64_t LivesStamp() { return lives_.load(std::memory_order_relaxed); }

    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const& params) const override;
    // True: a leaf that is real belongs to an animation, and is saved with what is known of it, at whatever value.
    bool IsStaticValueModified() const override { return true; }
    // Nothing is read of a leaf without a value.
    bool AffectsRendering(KFS_RenderOptionsBase const&) const override { return GetKeyCount() != 0; }
    bool HasMinValue() const override;
    bool HasMaxValue() const override;
    bool IsSeparationLeader() const override;
    void FillInParamDef() const override;
    void FillInDisplayName() const override;

    // Values have `dimension` components; SetValue throws KFS_Err_BadValueDesc for one of another size. Vectors show the
    // first four.
    std::vector<double> GetValueEx(KFS_EvalData const& eval) const override;
    void SetValue(T_Time const& time, std::vector<double> const& value) override;
    std::vector<double> GetDefaultValue() const override;
    M_Vector4T<double> GetVector4Ex(KFS_EvalData const& eval) const override;
    M_Vector4T<double> GetDefaultVector4() const override;
    void SetVector4(T_Time const& time, M_Vector4T<double> const& value) override;

private:
    StreamKind kind_;
    static inline std::atomic<std::uint64_t> lives_{0};
};

// The match name of a kind, and that of one of its followers. Files have their texts: they never change.
KFS_MatchName const& MatchNameOf(StreamKind kind);
KFS_MatchName FollowerNameOf(StreamKind kind, int dimension);

// The dimension that a kind's canonical instance has.
short UsualDimension(StreamKind kind);

// A leaf as its kind describes it with the content of any other of doubles: keys, value, expression and flags. `leaf` itself if
// it is one of that kind already. Throws an int.
std::unique_ptr<ChannelStream> AsChannel(StreamKind kind, std::unique_ptr<KFS_Stream> leaf);

}  // namespace kfshost
