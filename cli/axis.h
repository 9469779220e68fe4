#pragma once

#include <string>
#include <vector>

// A range of numbers with round ticks on it: steps of 1, 2 or 5 times a power of ten.
class Axis {
public:
    // `low` <= `high`, finite. About `ticks` ticks; a step is never below `leastStep`.
    Axis(double low, double high, int ticks, double leastStep = 0.0);

    double Low() const { return low_; }
    double High() const { return high_; }
    double Step() const { return step_; }
    // The ticks inside the range.
    std::vector<double> Ticks() const;
    // As many places as the step needs, and no "-0".
    std::string Label(double tick) const;

private:
    double low_;
    double high_;
    double step_;
};

struct Range {
    double low;
    double high;
};
// A range of at least `leastExtent`, above 0, with a share of its extent as air at both ends.
Range WithAir(Range range, double share, double leastExtent);
