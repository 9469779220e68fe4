#pragma once

#include "keystore/derivedstream.h"

// Separated dimensions. A kind that is a separation leader (KFS_Stream::IsSeparationLeader) has followers, one a dimension,
// which stand directly behind it in the layout of every named group that has it, dimension 0 first: all that finds a follower
// or a leader goes by that place. Registering the leader's kind makes their canonical instances, named after the leader with
// "_0", "_1" ... behind its match name.
//
// While KFS_BaseFlag_DimensionsSeparated of the leader is clear its own keys count; while it is set its value is put together
// from the followers. Moving keys from one side to the other is the host's affair.
//
// Trap: the look-ups from leader to follower and back upgrade canonical slots, in spite of their const forms, and a read of a
// separated leader uses them. So a host makes the followers of a separated leader real (GetSeparationFollowers) before other
// threads evaluate.

struct KFS_SeparationFollowerStreamTraits {
    using ValueType = double;
};
template <>
inline constexpr std::optional<KFS_ParamDetails> KFS_ParamDetailsOf<KFS_SeparationFollowerStreamTraits> =
    KFS_ParamDetails{.paramType = FX_Param_FLOAT_SLIDER, .precision = 1};

// One dimension of a leader as a stream of its own. Hidden from users until the host shows it.
class KFS_API KFS_SeparationFollowerStream final : public KFS_FloatStream<KFS_SeparationFollowerStreamTraits> {
public:
    // A canonical follower to be, of the leader's kind in dimension `dimension`: as the factory registers it. Not canonical
    // yet. Throws an int.
    KFS_SeparationFollowerStream(KFS_Stream const& leader, int dimension, KFS_StreamFactory* factory);
    // Without an explicit leader: a clone finds its leader by its place.
    KFS_SeparationFollowerStream(KFS_SeparationFollowerStream const& source, KFS_CloneStreamParams const& params);

    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const& params) const override;
    u16str GetEnglishDisplayName() const override;
    bool IsSeparationFollower() const override;
    // The explicit leader, else the nearest leader before its place in its group; null on a canonical follower and outside
    // a named group.
    KFS_Stream* GetSeparationLeader() override;
    KFS_Stream const* GetSeparationLeader() const override;
    // The leader's component; 0.0 without a leader. Trap: the factory asks a follower that it makes before that has a place,
    // so a follower just made real starts at 0.0, whatever its leader's default is. A host that wants the default sets it.
    double GetDefaultValue() const override;

    KFS_Stream* GetExplicitSeparationLeader() const;
    // Not owned. Null takes the explicit leader away.
    void SetExplicitSeparationLeader(KFS_Stream* leader);

private:
    KFS_SeparationFollowerStream(KFS_MatchName const& name, unsigned int timeScale, KFS_StreamFactory* factory);

    std::unique_ptr<KFS_Stream*> explicitLeader_;
};
