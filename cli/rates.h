#pragma once

#include "cli/axis.h"
#include "cli/svg.h"
#include "keystore/stream.h"

#include <vector>

// Rates as the library answers them, in units of the value a second: `dimension` doubles, or of a path its one speed.
// Times are in units of the stream's scale. Throw StoreError.
void ReadRate(KFS_Stream const& stream, int time, double* rate);  // at a key the rate behind it
// The rate with which a key is reached; of the first key 0.
void ReadRateInto(KFS_Stream const& stream, int index, double* rate);

// How fast what is shown of a stream changes, component by component. Answers stand until the next call.
class Rates {
public:
    // With `asRotation` those of the normalised quaternion; only for a rotation.
    explicit Rates(KFS_Stream const& stream, bool asRotation = false);

    std::vector<double> const& At(int time);
    std::vector<double> const& Into(int index);

private:
    void FinishRotation(T_Time const& at);
    void GoAlong(std::vector<double> const& way);
    std::vector<double> WayInto(int index) const;

    KFS_Stream const& stream_;
    bool asRotation_;
    std::vector<double> rate_;
};

// Which rates of a graph are to be drawn: all, but for peaks that are over at once and so high that nothing else could be
// seen beside them, as at a vertical tangent.
Range RatesInSight(std::vector<Point> const& graph);
