#pragma once

#include "host/rational.h"
#include "keystore/stream.h"

#include <cstddef>
#include <limits>
#include <memory>
#include <stdexcept>

// Moving the keys of a vector to one stream for each of its components, and back. It works on the leaders and followers of any
// host (keystore/separation.h); here a translation in two or three components is a leader.
//
// A curve of several components has a value, codes and handles for each of them, so either move keeps the curves as they
// are: at each key time both sides have the same value, to the bit, and between them the same to rounding. What has no form
// on the other side comes as near as it can, and is told with how far that is off:
//
//   separating a path      on a bent arc a component gets a spline with the velocity that it has at both ends
//                          float keys become keys at the times that they have now
//   joining into a path    handles that differ between the components become one for all of them
//
// and these cost keys:
//
//   a key that not all followers have   the others get one there, which leaves their curve as it is
//   a hold beside a component that moves   the jump gets a key one unit beside it, so that all is right at every time that
//                                          there is
//
// Automatic handles stay automatic, unless keys were added or a path is on either side.

namespace kfshost {

// Why dimensions can't be separated or joined, as what is said of the stream: "isn't ...".
class DimensionsError : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

// What a move couldn't carry over.
struct MoveNotes {
    // The greatest distance of a component from where it was, as sampled between the keys, and where that is.
    double worstError = 0.0;
    Rational worstTime;  // seconds
    int worstComponent = 0;
    double greatest = 0.0;  // the greatest magnitude that was compared

    std::size_t bentArcs = 0;
    std::size_t floatKeys = 0;  // that don't float any more
    std::size_t addedKeys = 0;  // times of keys that not all followers had
    std::size_t heldKeys = 0;   // keys one unit beside a jump

    // Whether the curves are others, by more than rounding.
    bool IsOff() const { return worstError > 1e-12 * greatest; }
};

inline constexpr double AnyError = std::numeric_limits<double>::infinity();

// The keys of a leader go to its followers, which are shown; the leader becomes a constant, hidden, and answers their values.
// Throws DimensionsError, also where the curves would be off by more than `tolerance`, and StoreError; then nothing has
// happened, but that followers may have become real.
MoveNotes SeparateDimensions(KFS_Stream& leader, double tolerance = AnyError);

// The keys of a leader's followers go back to it. The followers stay, hidden, at their defaults. Throws as
// SeparateDimensions.
MoveNotes JoinDimensions(KFS_Stream& leader, double tolerance = AnyError);

// What JoinDimensions would make of the leader, as a stream of its own; the leader stays separated. Throws as it does.
std::unique_ptr<KFS_Stream> JoinedCopy(KFS_Stream const& leader, MoveNotes* notes = nullptr);

}  // namespace kfshost
