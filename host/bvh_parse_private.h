#pragma once

#include "host/rational.h"

#include <string>
#include <string_view>
#include <vector>

namespace kfshost {

struct BvhJoint {
    std::string name;
    std::vector<std::string> channels;  // "Xposition", "Zrotation" and so on, in the file's order
};

// A motion capture file: its joints in the order in which the file opens them, and a row of numbers a frame in that
// same order.
struct BvhMotion {
    std::vector<BvhJoint> joints;
    std::size_t channelCount = 0;
    std::size_t frames = 0;
    Rational frameTime;           // as ParseFrameTime understands it
    std::vector<double> numbers;  // frames x channelCount
};

// Throws ImportError, with the line as the place.
BvhMotion ParseBvh(std::string_view text);

}  // namespace kfshost
