#pragma once

#include "curves/segment_private.h"
#include "curves/spacetangents.h"
#include "curves/update.h"
#include "frame/errors.h"
#include "tests/support/streams.h"

#include <algorithm>
#include <cmath>
#include <tuple>
#include <utility>
#include <vector>

// The handles of one component, or of a spatial key.
struct Handle {
    double inSpeed = 0.0;
    double inInfluence = 0.0;
    double outSpeed = 0.0;
    double outInfluence = 0.0;
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

using Vector = std::vector<double>;

// A spatial stream: dimension 2 or 3 is parametrised by arc length; `automatic` asks for automatic tangents.
inline StreamOptions PathOptions(short dimension = 2, bool automatic = true)
{
    unsigned short const spInterpMask = automatic ? KFS_InterpMask_Negative : 0;
    return {.dimension = dimension, .spatial = true, .spInterpMask = spInterpMask};
}

// A stream whose keys stand on a path, up to date.
class PathStream : public KeyedStream {
public:
    struct Stop {
        int time;
        Vector place;
    };

    explicit PathStream(std::vector<Stop> const& stops, char interp = KFS_Interp_Linear,
                        StreamOptions const& options = PathOptions())
        : KeyedStream(options)
    {
        for (Stop const& stop : stops) Key(stop.time, stop.place, interp);
        EXPECT_EQ(0, get()->UpdateStream());
    }

    // Gives a key its tangents; from then on they stay.
    PathStream& Tangents(int index, Vector const& in, Vector const& out)
    {
        EXPECT_EQ(0, KFS_SetKeySpaceTangentsF(get(), index, -1, in.data(), out.data()));
        return *this;
    }

    PathStream& Straighten()
    {
        Vector const zero(static_cast<std::size_t>(get()->GetDimension()), 0.0);
        for (int i = 0; i < Count(); ++i) Tangents(i, zero, zero);
        EXPECT_EQ(0, get()->UpdateStream());
        return *this;
    }

    // Lets the update pass bend the path through the keys; a new key's tangents aren't automatic by themselves.
    PathStream& Bend()
    {
        for (int i = 0; i < Count(); ++i) EXPECT_EQ(0, KFS_SetKeySpModifiable(get(), 1, i));
        EXPECT_EQ(0, get()->UpdateStream());
        return *this;
    }

    double Arc(int index) const { return Record(index)->arcLength; }
};

inline double Distance(Vector const& a, Vector const& b)
{
    double sum = 0.0;
    for (std::size_t i = 0; i < a.size(); ++i) sum += (a[i] - b[i]) * (a[i] - b[i]);
    return std::sqrt(sum);
}

// A point of a cubic by de Casteljau, with more digits than the library has.
inline long double CubicAt(long double const (&p)[4], long double t)
{
    long double const u = 1.0L - t;
    return u * u * u * p[0] + 3.0L * u * u * t * p[1] + 3.0L * u * t * t * p[2] + t * t * t * p[3];
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
