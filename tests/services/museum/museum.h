// Odd curves that keys can make. Every operation of the kernel is held against the truth on all of them; the program
// draw_museum draws them.
#pragma once

#include "frame/services/curvekernel.h"

#include <array>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <ostream>
#include <vector>

// Four points of up to four coordinates and the record that points at them.
struct Curve {
    std::array<std::array<double, 4>, 4> p{};
    short dimension = 2;

    CRV_Curve Get() { return {dimension, p[0].data(), p[1].data(), p[2].data(), p[3].data()}; }
    std::size_t Size() const { return static_cast<std::size_t>(dimension); }
    bool operator==(Curve const&) const = default;
};

// A segment as the interpolators make it: x from 0 to dt, handles as shares of it, heights as they are.
inline Curve Graph(double dt, double outInfluence, double inInfluence, double y0, double y1, double y2, double y3)
{
    return {{{{0.0, y0}, {outInfluence * dt, y1}, {dt - inInfluence * dt, y2}, {dt, y3}}}};
}

inline std::ostream& operator<<(std::ostream& out, Curve const& curve)
{
    out.precision(17);
    for (auto const& point : curve.p)
        for (std::size_t i = 0; i < curve.Size(); ++i)
            out << (i ? ", " : "(") << point[i] << (i + 1 < curve.Size() ? "" : ") ");
    return out;
}

// Hashes the bits of answers. The pinned numbers are those of every build so far, with gcc and clang, with and without
// optimisation. A change means that saved render identities no longer match: it needs a reason.
struct BitHash {
    void Mix(double value)
    {
        hash = (hash ^ std::bit_cast<std::uint64_t>(value)) * 0x100000001b3u;
        hash ^= hash >> 29;
    }
    std::uint64_t hash = 0xcbf29ce484222325u;
};

struct Exhibit {
    char const* name;
    Curve curve;
    int mostKnots = 100;  // of its arc-length table at an accuracy of 1e-4 of its size
};

inline std::vector<Exhibit> const Museum = {
    // Paths. The pinned bits of arc lengths are of these first eighteen.
    {"a line at even speed", {{{{0, 0}, {1, 2}, {2, 4}, {3, 6}}}}, 2},
    {"a line without handles", {{{{0, 0}, {0, 0}, {3, 6}, {3, 6}}}}, 9},
    {"a line that turns back twice", {{{{0, 0}, {30, 0}, {-20, 0}, {10, 0}}}}, 20},
    {"a gentle arc", {{{{0, 0}, {30, 20}, {70, 20}, {100, 0}}}}, 4},
    {"a cusp in the middle", {{{{0, 0}, {100, 100}, {0, 100}, {100, 0}}}}, 20},
    {"almost a cusp", {{{{0, 0}, {100, 100}, {0.01, 100}, {100, 0}}}}, 20},
    {"a stop without a turn", {{{{0, 0}, {80, 40}, {0, 0}, {80, 40}}}}},
    {"a loop", {{{{0, 0}, {150, 100}, {-50, 100}, {100, 0}}}}, 20},
    {"a loop back to its start", {{{{0, 0}, {100, 50}, {-100, 50}, {0, 0}}}}, 21},
    {"no out handle", {{{{0, 0}, {0, 0}, {50, 80}, {100, 0}}}}, 11},
    {"a short out handle", {{{{0, 0}, {0.0025, 0.00125}, {70, 30}, {100, 0}}}}, 41},
    {"no in handle", {{{{0, 0}, {50, 80}, {100, 0}, {100, 0}}}}, 11},
    {"three points in one", {{{{0, 0}, {0, 0}, {0, 0}, {100, 40}}}}, 40},
    {"both handles at the end", {{{{0, 0}, {100, 40}, {100, 40}, {100, 40}}}}, 40},
    {"one dimension", {{{{0}, {5}, {7}, {10}}}, 1}, 6},
    {"one dimension, overshooting", {{{{0}, {50}, {-30}, {10}}}, 1}, 20},
    {"a turn through space", {{{{0, 0, 0}, {10, 0, 30}, {0, 40, 30}, {5, 5, -20}}}, 3}, 14},
    {"handles a thousand chords long", {{{{0, 0, 0}, {1000, 20, 3}, {-40, 900, 300}, {1, 0, 0}}}, 3}, 15},
    // Graphs: x runs over 2 seconds, y mostly from 10 to 20.
    {"both influences one third", Graph(2, 1.0 / 3, 1.0 / 3, 10, 12, 21, 20)},
    {"sixths, as mixed linear sides have", Graph(2, 1.0 / 6, 1.0 / 6, 10, 11.6666666667, 18, 20)},
    {"eased on both sides", Graph(2, 0.5, 0.5, 10, 10, 20, 20)},
    {"eased at the end, downwards", Graph(2, 0.4, 0.4, 20, 16, 10, 10)},
    {"influence 0 before", Graph(2, 0, 0.4, 10, 10, 22, 20)},
    {"influence 0 behind", Graph(2, 0.4, 0, 10, 7, 20, 20)},
    {"influence 0 on both sides", Graph(2, 0, 0, 10, 10, 20, 20)},
    {"influence 1 before", Graph(2, 1, 0.2, 10, 10, 20, 20)},
    {"influence 1 behind", Graph(2, 0.2, 1, 10, 10, 20, 20)},
    {"influence 1 on both sides: vertical in the middle", Graph(2, 1, 1, 10, 10, 20, 20)},
    {"nearly vertical in the middle", Graph(2, 0.999999, 1, 20, 20, 10, 10)},
    {"vertical at the start", Graph(2, 0, 0.3, 10, 25, 20, 20)},
    {"vertical at the start, downwards", Graph(2, 0, 0.3, 10, 5, 20, 20)},
    {"vertical at the end", Graph(2, 0.3, 0, 10, 10, -5, 20)},
    {"nearly vertical at both ends", Graph(2, 1e-9, 1e-7, 10, 15, 12, 20)},
    {"triple root: influence 0 and 1", Graph(2, 0, 1, 10, 11, 12, 20)},
    {"no out handle, flat all the same", Graph(2, 0, 0.5, 10, 10, 10, 20)},
    {"no in handle, flat all the same", Graph(2, 0.5, 0, 10, 20, 20, 20)},
    {"overshoot", Graph(2, 0.4, 0.4, 10, 40, -20, 20)},
    {"nearly straight", Graph(2, 0.3, 0.3, 10, 13.000000001, 17, 20)},
    {"an inflection", Graph(3, 1.0 / 3, 1.0 / 3, 0, 1, 0, 1)},
    {"hill and valley", Graph(3, 1.0 / 3, 1.0 / 3, 0, 2, -2, 0)},
    {"both handles at the middle of a line", Graph(2, 0.5, 0.5, 10, 15, 15, 20)},
    {"constant", Graph(2, 0.3, 0.8, 0.1, 0.1, 0.1, 0.1)},
    {"S on its side: x turns back once on the way", Graph(2, 1.6, 1.6, 10, 12, 18, 20)},
    {"out handle far beyond the end", Graph(2, 5, 0.3, 10, 12, 18, 20)},
    {"in handle far before the start", Graph(2, 0.3, 5, 10, 12, 18, 20)},
    {"out handle backwards", Graph(2, -1, 0.3, 10, 12, 18, 20)},
    {"both handles backwards", Graph(2, -0.5, -0.5, 10, 12, 18, 20)},
    {"both handles a thousand segments out", Graph(2, 1000, 1000, 10, 12, 18, 20)},
    {"from right to left", {{{{5, 10}, {4, 12}, {4.5, 21}, {3, 20}}}}},
    {"without extent in x", {{{{3, 10}, {4, 11}, {2, 12}, {3, 20}}}}},
    {"one point", {{{{7, -3, 2}, {7, -3, 2}, {7, -3, 2}, {7, -3, 2}}}, 3}},
    {"four dimensions", {{{{1, 2, 3, 4}, {9, -2, 4, 4}, {-1, 0, 8, 4}, {0, 5, 3, 4}}}, 4}},
};
