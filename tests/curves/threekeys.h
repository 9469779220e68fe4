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
    short const dimension = spatial ? 2 : 1;
    KeyedStream stream =
        MakeKeyed({{0, 0.0}, {600, 10.0}, {1800, 40.0}}, interp, {.dimension = dimension, .spatial = spatial});
    for (int i = 0; i < 3; ++i) {
        stream.SetHandle(i, {3, 0.25, 2, 0.5});
        if (spatial) stream.Record(i)->arcLength = std::array{5.0, 20.0, 0.0}[static_cast<std::size_t>(i)];
    }
    return stream;
}
