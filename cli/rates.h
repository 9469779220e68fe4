#pragma once

#include "keystore/stream.h"

#include <cstdint>
#include <vector>

// How fast a stream changes at a time, in value units a second, component by component.
class Rates {
public:
    // With `asRotation` those of the normalised quaternion; only for a rotation.
    explicit Rates(KFS_Stream const& stream, bool asRotation = false);

    // The rate at `time` as it is on the side of the segment between `start` and `end`, all in units of the stream's
    // scale: nothing beyond a key takes part, where the rate may be another. The answer stands until the next call.
    // Throws StoreError.
    std::vector<double> const& At(int time, int start, int end);

private:
    void Read(std::int64_t time, std::vector<double>& row) const;

    KFS_Stream const& stream_;
    bool asRotation_;
    std::vector<double> before_;
    std::vector<double> here_;
    std::vector<double> after_;
    std::vector<double> rate_;
};
