#pragma once

#include "tests/curves/keyedstream.h"

#include <array>

using Range = std::array<int, 2>;

inline constexpr int L = KFS_Interp_Linear;
inline constexpr int S = KFS_Interp_Spline;
inline constexpr int H = KFS_Interp_Hold;
inline constexpr double Unanswered = 77.0;

// Keys after 0, 1 and 3 seconds; values 0, 10, 40; on a spatial stream arcs of 5 and 20.
inline KeyedStream MakeThree(bool spatial = false, char interp = S)
{
    StreamOptions options;
    options.dimension = spatial ? 2 : 1;
    options.spatial = spatial;
    KeyedStream stream = MakeKeyed({{0, 0.0}, {600, 10.0}, {1800, 40.0}}, interp, options);
    for (int i = 0; i < 3; ++i) stream.SetHandle(i, {3, 0.25, 2, 0.5});
    if (spatial) {
        stream.Record(0)->arcLength = 5.0;
        stream.Record(1)->arcLength = 20.0;
        stream.Record(2)->arcLength = 0.0;
    }
    return stream;
}
