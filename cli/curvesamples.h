#pragma once

#include "cli/selection.h"
#include "cli/svg.h"
#include "host/scene.h"

#include <vector>

// The curve of one component as points: x in seconds, y in value units, or value units a second for the speed.
struct ComponentCurve {
    std::vector<Point> value;
    std::vector<Point> speed;  // a jump is two points at one time
    std::vector<Point> keys;
};

// A handle of a key on a curved side.
struct Handle {
    std::size_t component;  // its place among those that are sampled
    Point key;
    Point end;
};

struct StreamCurves {
    std::vector<ComponentCurve> components;
    std::vector<Handle> handles;
};

// Samples these components of a stream from the first to the last time of `part`: values of plain streams as lines with as
// few points as can't be told from the curve (host/polyline.h), all else with some `pointsPerSecond` points. The values of
// two components need not have points at the same times. Throws StoreError.
StreamCurves SampleCurves(kfshost::StreamItem const& item, std::vector<std::size_t> const& components,
                          TimeSpan const& part, double pointsPerSecond);
