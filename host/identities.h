#pragma once

#include "host/rational.h"
#include "identity/renderoptions.h"
#include "keystore/stream.h"
#include "overrides/parambag.h"

#include <string>

// Render identities of this host's streams (docs/identity.md).

namespace kfshost {

// What a render asks for: a span of time, and overrides. Without motion blur of its own: whoever blurs asks for the span
// that the shutter is open for.
class Render final : public KFS_RenderOptionsBase {
public:
    // The bag must live longer. `timeScale`: the units a second of the scene, to which spans are rounded as reads are.
    Render(KFS_ParamBag const& bag, unsigned int timeScale);

    // A moment where both are the same. Throws std::length_error for a span longer than 32 bits of units.
    void SetSpan(Rational const& from, Rational const& to);

    T_Time const* GetTimeSpanStart() const override { return &start_; }
    void SetTimeSpanStart(T_Time const* start) override { start_ = *start; }
    T_Time const* GetTimeSpanDuration() const override { return &duration_; }
    void SetTimeSpanDuration(T_Time const* duration) override { duration_ = *duration; }
    T_Time const* GetShutterDuration() const override { return &shutter_; }
    void GetShutterSpan(int, T_Time* start, T_Time* duration) const override
    {
        *start = start_;
        *duration = duration_;
    }
    KFS_ParamBag const* GetParamBag() const override { return &bag_; }

private:
    KFS_ParamBag const& bag_;
    T_Time start_;
    T_Time duration_;
    T_Time shutter_;
};

// Of a tree, or of a leaf with what it is put together from: of separated dimensions the leader's and the followers'.
// Throws StoreError.
hearth::utility::Guid IdentityOf(KFS_StreamBase const& stream, Render const& render);

// As 32 hexadecimal digits.
std::string TextOf(hearth::utility::Guid const& identity);

}  // namespace kfshost
