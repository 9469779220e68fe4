#pragma once

#include "cli/selection.h"
#include "cli/svg.h"
#include "host/scene.h"

#include <array>
#include <vector>

// A place in space: x, y, z. Paths in two dimensions stay at z 0.
using Place = std::array<double, 3>;

struct MotionKey {
    double seconds;
    Place place;
    Place inEnd;  // where the tangents end; on the key itself where it has none
    Place outEnd;
    bool floats;
    bool isEnd;  // the first or the last key of all
};

// The route between two keys as points, or a jump from the one to the other.
struct MotionSegment {
    std::vector<Place> route;
    bool isJump;
};

struct MotionSamples {
    std::vector<MotionKey> keys;
    std::vector<MotionSegment> segments;
    std::vector<Point> speed;  // distance a second over seconds; a change at a key is two points at one time
};

// A spatial stream with keys, seen as a motion, from the first to the last time of `part`. Throws StoreError.
MotionSamples SampleMotion(kfshost::StreamItem const& item, TimeSpan const& part, double pointsPerSecond);

// Where it is at these times.
std::vector<Place> PlacesAt(kfshost::StreamItem const& item, std::vector<kfshost::Rational> const& times);

double DistanceBetween(Place const& a, Place const& b);
