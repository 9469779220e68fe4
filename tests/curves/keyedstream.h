#pragma once

#include "curves/segment_private.h"
#include "frame/errors.h"
#include "tests/support/streams.h"

#include <algorithm>
#include <random>
#include <string>
#include <tuple>
#include <vector>

// The handles of one component, or of a spatial key.
struct Handle {
    double inSpeed = 0.0;
    double inInfluence = 0.0;
    double outSpeed = 0.0;
    double outInfluence = 0.0;
    bool operator==(Handle const&) const = default;
};

// A stream whose derived data is settled, so that a test can write records as it needs them and nothing recomputes
// them.
class KeyedStream : public TestStream {
public:
    using TestStream::TestStream;

    // To be called after the keys stand: repairs what is stale, then makes everything that is derived the user's.
    KeyedStream& Settle()
    {
        EXPECT_EQ(0, get()->UpdateStream());
        for (int i = 0; i < Count(); ++i) {
            Record(i)->flags &= static_cast<unsigned short>(~(KFS_KeyFlag_Modifiable | KFS_KeyFlag_Continuous));
            Record(i)->flags |= KFS_KeyFlag_TangentsSet;
            if (get()->IsSpatial()) Record(i)->spFlags = 0;
        }
        EXPECT_EQ(NotStale, Stale());
        return *this;
    }

    KeyedStream& Codes(int index, int inInterp, int outInterp)
    {
        Record(index)->inInterp = static_cast<signed char>(inInterp);
        Record(index)->outInterp = static_cast<signed char>(outInterp);
        return *this;
    }

    KeyedStream& Flag(int index, int flag, bool on = true)
    {
        unsigned short& flags = Record(index)->flags;
        flags = static_cast<unsigned short>(on ? flags | flag : flags & ~flag);
        return *this;
    }

    KeyedStream& StreamFlag(int flag, bool on = true)
    {
        unsigned short& flags = *get()->GetKFSFlagsForModify();
        flags = static_cast<unsigned short>(on ? flags | flag : flags & ~flag);
        return *this;
    }

    KeyedStream& SetHandle(int index, Handle const& handle, int component = 0)
    {
        if (get()->IsSpatial()) {
            KFS_KeyScalar* const key = Record(index);
            std::tie(key->inSpeed, key->inInfluence, key->outSpeed, key->outInfluence) =
                std::tie(handle.inSpeed, handle.inInfluence, handle.outSpeed, handle.outInfluence);
            return *this;
        }
        KFSp_TemporalRuns<double> const runs = KFSp_GetTemporalRuns(Record(index), get()->GetDimension());
        runs.inSpeed[component] = handle.inSpeed;
        runs.inInfluence[component] = handle.inInfluence;
        runs.outSpeed[component] = handle.outSpeed;
        runs.outInfluence[component] = handle.outInfluence;
        return *this;
    }

    Handle GetHandle(int index, int component = 0) const
    {
        KFS_KeyScalar const* const key = Record(index);
        if (get()->IsSpatial()) return {key->inSpeed, key->inInfluence, key->outSpeed, key->outInfluence};
        KFSp_TemporalRuns<double const> const runs = KFSp_GetTemporalRuns(key, get()->GetDimension());
        return {runs.inSpeed[component], runs.inInfluence[component], runs.outSpeed[component],
                runs.outInfluence[component]};
    }

    int Index(KFS_KeyScalar const* key) const
    {
        for (int i = 0; i < Count(); ++i)
            if (Record(i) == key) return i;
        return key ? -2 : -1;  // -1: no key
    }
};

// A one-dimensional stream with keys (time, value), all sides of one code, settled.
inline KeyedStream MakeKeyed(std::vector<std::pair<int, double>> const& keys, char interp,
                             StreamOptions const& options = {})
{
    KeyedStream stream(options);
    for (auto const& [time, value] : keys)
        stream.Key(time, std::vector<double>(static_cast<std::size_t>(options.dimension), value), interp);
    stream.Settle();
    return stream;
}

inline std::string NoKeysText(std::string const& action)
{
    return "attempt to " + action + " a time stream with no key values.";
}

// A point of a cubic by de Casteljau, with more digits than the library has.
inline long double CubicAt(long double const (&p)[4], long double t)
{
    long double const u = 1.0L - t;
    return u * u * u * p[0] + 3.0L * u * u * t * p[1] + 3.0L * u * t * t * p[2] + t * t * t * p[3];
}

inline long double CubicSlopeAt(long double const (&p)[4], long double t)
{
    long double const u = 1.0L - t;
    return 3.0L * (u * u * (p[1] - p[0]) + 2.0L * u * t * (p[2] - p[1]) + t * t * (p[3] - p[2]));
}

// The parameter at which a cubic that doesn't fall reaches `x`, by bisection.
inline long double SolveCubic(long double const (&p)[4], long double x)
{
    long double low = 0.0L;
    long double high = 1.0L;
    for (int i = 0; i < 120; ++i) {
        long double const middle = (low + high) / 2.0L;
        (CubicAt(p, middle) < x ? low : high) = middle;
    }
    return (low + high) / 2.0L;
}
