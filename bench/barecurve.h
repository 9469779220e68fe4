// What a read of a curve costs at least: a search and a solve written for speed alone, over the same keys. It shares no
// code with the library, knows no other kind of segment, repairs nothing and may be off by rounding.
#pragma once

#include <cmath>
#include <cstddef>
#include <vector>

// Both coordinates as power forms that run from 0 to 1 in the parameter; one cache line.
struct alignas(64) BareSegment {
    double x3, x2, x1;
    double y3, y2, y1, y0;
    double perUnit;  // share of the segment that a unit of time is

    // `y`: the four control points' heights; `out` and `in`: the handles' influences; `units`: from key to key.
    static BareSegment Make(double const (&y)[4], double out, double in, int units)
    {
        double const from = out, to = 1.0 - in;
        return {
            1.0 + 3.0 * (from - to),          3.0 * (to - 2.0 * from), 3.0 * from, y[3] - y[0] + 3.0 * (y[1] - y[2]),
            3.0 * (y[0] - 2.0 * y[1] + y[2]), 3.0 * (y[1] - y[0]),     y[0],       1.0 / units};
    }

    double X(double s) const { return ((x3 * s + x2) * s + x1) * s; }
    double Y(double s) const { return ((y3 * s + y2) * s + y1) * s + y0; }

    // Three steps of third order from the straight line's answer arrive nearly always.
    double Parameter(double x) const
    {
        double s = x;
        for (int step = 0; step < 3; ++step) {
            double const f = X(s) - x;
            double const slope = (3.0 * x3 * s + 2.0 * x2) * s + x1;
            s -= f * slope / (slope * slope - f * (3.0 * x3 * s + x2));
        }
        if (std::fabs(X(s) - x) <= 1e-13 && s >= 0.0 && s <= 1.0) [[likely]]
            return s;
        return Bracketed(x);
    }
    // Newton's steps where they stay between what is known to be below and above, else halves.
    double Bracketed(double x) const
    {
        double low = 0.0, high = 1.0, s = x;
        for (int step = 0; step < 100; ++step) {
            double const f = X(s) - x;
            if (std::fabs(f) <= 1e-13) break;
            (f < 0.0 ? low : high) = s;
            double const next = s - f / ((3.0 * x3 * s + 2.0 * x2) * s + x1);
            s = next > low && next < high ? next : 0.5 * (low + high);
        }
        return s;
    }
};

struct BareCurve {
    std::vector<int> times;
    std::vector<BareSegment> segments;  // one less

    // The segment that a time between the first and the last key lies in.
    std::size_t Find(int time) const
    {
        int const* base = times.data();
        for (std::size_t count = segments.size(); count > 1;) {
            std::size_t const half = count / 2;
            int const* const middle = base + half;
            base = *middle <= time ? middle : base;
            count -= half;
        }
        return static_cast<std::size_t>(base - times.data());
    }
    // The same for times that mostly go on from the last one.
    std::size_t Walk(std::size_t at, int time) const
    {
        if (time < times[at]) at = 0;
        while (at + 1 < segments.size() && times[at + 1] <= time) ++at;
        return at;
    }

    double Share(std::size_t at, int time) const { return (time - times[at]) * segments[at].perUnit; }
    double Spline(std::size_t at, int time) const { return segments[at].Y(segments[at].Parameter(Share(at, time))); }
    double Line(std::size_t at, int time) const
    {
        BareSegment const& segment = segments[at];
        return segment.y0 + (segment.y3 + segment.y2 + segment.y1) * Share(at, time);
    }
    double Held(std::size_t at) const { return segments[at].y0; }
};
