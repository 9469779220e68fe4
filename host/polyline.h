#pragma once

#include "host/rational.h"
#include "keystore/stream.h"

#include <stdexcept>
#include <vector>

// A component of a stream as a line through as few points as a tolerance allows.

namespace kfshost {

struct PolylinePoint {
    double seconds;
    double value;
};

// A tolerance so small that a line would have more points than anybody draws.
class PolylineError : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

// From one time to a later one, both rounded to the stream's units, as far as it has keys; before the first point and behind the
// last one their values hold. A jump is two points at one time; a read at that very time answers one of them. Between points the line is
// never farther from the curve than `tolerance`, which is in units of the value and above 0, but for rounding. An expression has
// 30 points a second whatever the tolerance. A constant has one point; a stream without a key has none.
//
// Of a path there are only the keys: what is between them follows from its distance. Separated dimensions have streams of
// their own. Rotations show their components as they are stored. Throws PolylineError and StoreError.
std::vector<PolylinePoint> SamplePolyline(KFS_Stream const& stream, int component, Rational const& from,
                                          Rational const& to, double tolerance);

}  // namespace kfshost
