#pragma once

#include "host/rational.h"

#include <cstdint>
#include <optional>
#include <span>
#include <string_view>

namespace kfshost {

// Frames a second, as a fraction: 30000/1001.
struct FrameRate {
    int numerator = 0;
    int denominator = 1;

    Rational ToRational() const { return {numerator, denominator}; }
    friend bool operator==(FrameRate const&, FrameRate const&) = default;
};

// The rates that keys are looked for at, the likeliest first.
inline constexpr FrameRate UsualRates[] = {{24, 1},        {25, 1},  {30, 1},       {48, 1},       {50, 1},
                                           {60, 1},        {120, 1}, {24000, 1001}, {30000, 1001}, {60000, 1001},
                                           {120000, 1001}, {72, 1},  {90, 1},       {144, 1}};

// A file's key times are 32-bit floats; a stream's are whole numbers of 1/scale seconds. One scale serves all streams
// of a file. docs/host.md tells the rule at length.
struct TimeScale {
    unsigned int scale = 0;
    // The rate on whose frames most keys lie. A key within FrameTolerance of a frame is that frame. Nothing where keys
    // lie on no usual rate, and in a scale that somebody asked for.
    std::optional<FrameRate> rate;
    // Whether each time is the frame that it is meant for, or the number that its float stands for: the float nearest to
    // units / scale.
    bool exact = true;
    // The greatest distance of a key from the float in the file, in seconds.
    double worstError = 0.0;

    // Where a time stands in this scale; it fits.
    int ToUnits(float time) const;
};

// How far a float may be from the one nearest to the frame that it is meant for, in units in its last place: programs that step from frame
// to frame, or that multiply by a rounded frame time, are off by one or two.
inline constexpr int FrameTolerance = 2;

// Key times lie within this many units of 0, so that the distance of any two fits 32 bits and there is room to work
// after the last key.
inline constexpr int MaxKeyUnits = 1 << 30;

// The first of a list of well-known scales in which all times are exact; else the finest in which they and the frames of
// all usual rates fit. The times are finite. Throws std::range_error when they fit no scale at all.
TimeScale ChooseTimeScale(std::span<float const> times);
// How well a given scale does, in which each time becomes the nearest unit. Throws std::range_error when the times don't
// fit it.
TimeScale JudgeTimeScale(std::span<float const> times, unsigned int scale);

// A scale for frames of exactly `frameTime` seconds up to the time `last`: one in which they are whole, and so are the
// frames of all usual rates if that fits; else the finest. 0 where nothing fits.
unsigned int ChooseScaleForFrames(Rational const& frameTime, Rational const& last);

// A frame time as motion capture files write it. A decimal to which a frame of a usual rate is rounded (two digits), or
// cut (three digits or more), or whose 32-bit float is as near to such a frame as FrameTolerance, is that fraction:
// 0.0083, .0083333 and 0.0083333333333333332 are 1/120. Any other is what its first twelve digits say. Nothing for what
// isn't a time above 0.
std::optional<Rational> ParseFrameTime(std::string_view text);

}  // namespace kfshost
