#pragma once

#include <span>

namespace kfshost {

// A file's key times are 32-bit floats; a stream's are whole numbers of 1/scale seconds. One scale serves all streams
// of a file. docs/host.md tells the rule at length.
struct TimeScale {
    unsigned int scale = 0;
    // Whether each time is the number that its float stands for: the float nearest to units / scale.
    bool exact = true;
    // The greatest distance of a key from the float in the file, in seconds; at most half a unit.
    double worstError = 0.0;
};

// Key times lie within this many units of 0, so that the distance of any two fits 32 bits and there is room to work
// after the last key.
inline constexpr int MaxKeyUnits = 1 << 30;

// The first of a list of well-known scales in which all times are exact; else the finest power of two in which they
// fit. The times are finite. Throws std::range_error when they fit no scale at all.
TimeScale ChooseTimeScale(std::span<float const> times);
// How well a given scale does. Throws std::range_error when the times don't fit it.
TimeScale JudgeTimeScale(std::span<float const> times, unsigned int scale);

// The nearest whole number of 1/scale seconds; `time` fits.
int ToUnits(float time, unsigned int scale);

}  // namespace kfshost
