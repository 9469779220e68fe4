#pragma once

#include "host/scene.h"

#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

// Rotations as unit quaternions x y z w. A stream holds their components as four curves, so what it answers between keys
// has another length than 1 and is a little beside the arc (docs/host.md says how much).

namespace kfshost {

// Whether a stream holds quaternions.
bool IsRotation(StreamItem const& item);

// The rotation that four components stand for. Zeros stay zeros.
void Normalise(double* quaternion);

// q and -q are the same rotation, but the straight way from a key to one of the opposite sign is the long way round,
// past zero. Turns each quaternion's sign so that it agrees with the one before it; the first stays.
void AlignSigns(std::span<double> quaternions);

// The greatest angle, in degrees, between the arc and the chord of two unit quaternions whose rotations are so many
// degrees apart: at most 8.15 for the widest, 180, and with the cube of the angle below.
double ArcDeviationBound(double degrees);

// One key of a rotation; time in units of its stream.
struct RotationKey {
    int time = 0;
    double value[4] = {};
};

// Puts keys on the arcs between such keys, so that no chord is farther than `tolerance` degrees from its arc by
// ArcDeviationBound, and no further than one unit of time allows. The signs agree. Halves arcs, so the numbers are the
// same on every machine.
std::vector<RotationKey> WithArcKeys(std::vector<RotationKey> const& keys, double tolerance);

// The order of three turns about the axes 0, 1 and 2: the rotation is the product of their matrices in this order.
struct EulerOrder {
    int axes[3] = {0, 1, 2};

    // "XYZ", "zyx": each axis once.
    static std::optional<EulerOrder> Parse(std::string_view text);
    // "Xrotation" and so on, as motion capture files name them.
    std::vector<std::string> Components() const;
};

// The angles in degrees, in the order of the turns; the second is within -90 to 90. Where it is at an end only the sum or
// the difference of the others is known: then the third is 0.
void ToEuler(double const* quaternion, EulerOrder const& order, double* degrees);

}  // namespace kfshost
