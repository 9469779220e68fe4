#pragma once

#include <optional>
#include <string>
#include <vector>

// A range of numbers with round ticks on it: steps of 1, 2 or 5 times a power of ten.
class Axis {
public:
    // `low` <= `high`, finite. About `ticks` ticks; a step is never below `leastStep`.
    Axis(double low, double high, int ticks, double leastStep = 0.0);
    // For what never changes: one tick at the number, in the middle.
    static Axis Around(double number);

    double Low() const { return low_; }
    double High() const { return high_; }
    double Step() const { return step_; }
    // Whether it is one of a number that never changes.
    bool IsConstant() const { return number_.has_value(); }
    // The ticks inside the range.
    std::vector<double> Ticks() const;
    bool IsZero(double tick) const;
    // All labels of an axis have the same number of places, as many as the step needs, and no "-0". Where numbers are
    // huge or tiny they stand for multiples of Factor().
    std::string Label(double tick) const;
    // A power of ten as text, like "1e6", or "" for 1.
    std::string Factor() const;

private:
    double low_;
    double high_;
    double step_;
    int exponent_ = 0;
    std::optional<double> number_;
};

struct Range {
    double low;
    double high;
};
// A range of at least `leastExtent`, above 0, with a share of its extent as air at both ends.
Range WithAir(Range range, double share, double leastExtent);
