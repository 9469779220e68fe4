#pragma once

#include "host/scene.h"

#include <cstddef>
#include <vector>

namespace kfshost {

// The frames that the keys of some streams lie on.
struct FrameGrid {
    Rational rate{24, 1};     // frames a second; 24 where most keys lie on no usual rate
    std::size_t times = 0;    // key times, each counted once
    std::size_t offGrid = 0;  // those that aren't exactly where a stream has that frame
    double worst = 0.0;       // how far those are off at most, in frames
};

// Finds the first of the usual rates to which the fewest key times are strangers. Frame 0 is at 0 s. A time within a
// thousandth of a frame speaks for a rate, though only one at the unit nearest to the frame is on it. Throws StoreError.
FrameGrid FindFrameGrid(std::vector<StreamItem const*> const& items);

}  // namespace kfshost
