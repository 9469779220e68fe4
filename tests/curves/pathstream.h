#pragma once

#include "curves/spacetangents.h"
#include "curves/update.h"
#include "tests/curves/keyedstream.h"

#include <cmath>

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

    std::vector<double> Arcs() const
    {
        std::vector<double> arcs;
        for (int i = 0; i < Count(); ++i) arcs.push_back(Arc(i));
        return arcs;
    }
};

inline double Distance(Vector const& a, Vector const& b)
{
    double sum = 0.0;
    for (std::size_t i = 0; i < a.size(); ++i) sum += (a[i] - b[i]) * (a[i] - b[i]);
    return std::sqrt(sum);
}
