#include "services/curvekernel/solve_private.h"

#include <cmath>
#include <limits>

namespace {

// Handles further away than this many segments answer like those at this distance; more would overflow.
constexpr double FarthestHandle = 1e100;

// Coordinates beyond these bounds are brought nearer by a power of two, which changes no digit of the quotients.
constexpr double Huge = 0x1p1000;
constexpr double Tiny = 0x1p-900;

double Limited(double value, double bound)
{
    return value > bound ? bound : value < -bound ? -bound : value;
}

// The turning points of a unit cubic with handles a and b. Its slope is 3 (a3 t^2 + 2 m t + a) with m = b - 2a.
int UnitTurningPoints(double a, double b, double turns[2])
{
    double const a3 = 1.0 - 3.0 * (b - a);
    double const m = b - 2.0 * a;
    double const discriminant = m * m - a3 * a;
    if (!(discriminant > 0.0)) return 0;

    // The two roots by the sum that doesn't cancel, and by their product.
    double const q = m < 0.0 ? std::sqrt(discriminant) - m : -(std::sqrt(discriminant) + m);
    double first = q / a3;
    double second = a / q;
    if (second < first) {
        double const swap = first;
        first = second;
        second = swap;
    }
    int count = 0;
    if (first > 0.0 && first < 1.0) turns[count++] = first;
    if (second > 0.0 && second < 1.0 && second != first) turns[count++] = second;
    return count;
}

// The root of cubic(t) = u between low, where it is below u, and high, where it isn't; it grows in between.
// Newton steps, bisection where a step leaves the bracket or doesn't halve the one before. The bracket test is closed:
// at convergence the step lands on an end of the bracket, and bisecting from there would start all over.
double BracketedRoot(CRVp_UnitCubic const& cubic, double u, double low, double high)
{
    // Bisection alone halves 1 down to the smallest number in this many steps.
    constexpr int MostSteps = 1100;

    double t = cubic.a1 > 3.0 ? u / cubic.a1 : u;
    if (!(t >= low && t <= high)) t = low + 0.5 * (high - low);
    double previous = high - low;
    for (int step = 0; step < MostSteps; ++step) {
        double const f = cubic.Value(t) - u;
        if (f == 0.0) return t;
        if (f < 0.0)
            low = t;
        else
            high = t;

        double const slope = cubic.Slope(t);
        double next = t - f / slope;
        if (!(next >= low && next <= high) || !(2.0 * std::fabs(f) <= std::fabs(previous * slope)))
            next = low + 0.5 * (high - low);
        previous = next - t;
        if (std::fabs(previous) <= 0x1p-53 * t) return next;
        t = next;
    }
    return t;
}

}  // namespace

int CRVp_TurningPoints(double c0, double c1, double c2, double c3, double turns[2])
{
    double const span = 0.25 * c3 - 0.25 * c0;
    if (span == 0.0) {
        // 0 to 0: the slope is 3 (h1 (1-t)^2 + 2 (h2-h1) t (1-t) - h2 t^2); scaled by h1 - h2 or h1 it is a unit's.
        double const h1 = 0.25 * c1 - 0.25 * c0;
        double const h2 = 0.25 * c2 - 0.25 * c0;
        double const largest = std::fabs(h1) > std::fabs(h2) ? h1 : h2;
        if (largest == 0.0) return 0;
        // A unit cubic whose handles are this far away differs from the closed one by rounding only.
        return UnitTurningPoints(0x1p60 * (h1 / largest), 0x1p60 * (h2 / largest), turns);
    }
    return UnitTurningPoints(Limited((0.25 * c1 - 0.25 * c0) / span, FarthestHandle),
                             Limited((0.25 * c2 - 0.25 * c0) / span, FarthestHandle), turns);
}

double CRVp_ReachSlow(double c0, double c1, double c2, double c3, double v)
{
    bool const finite = CRVp_IsFinite(c0) && CRVp_IsFinite(c1) && CRVp_IsFinite(c2) && CRVp_IsFinite(c3);
    if (!finite || v != v) return std::numeric_limits<double>::quiet_NaN();

    // Outside the ends, and the coordinate without extent.
    if (c0 <= c3) {
        if (v <= c0) return 0.0;
        if (v >= c3) return 1.0;
    } else {
        if (v >= c0) return 0.0;
        if (v <= c3) return 1.0;
    }

    double const extent = CRVp_Max(std::fabs(c0), std::fabs(c3));
    double const scale = extent > Huge ? 0.25 : extent < Tiny ? 0x1p120 : 1.0;
    double const origin = scale * c0;
    double const span = scale * c3 - origin;
    double const u = (scale * v - origin) / span;
    double const a = Limited((scale * c1 - origin) / span, FarthestHandle);
    double const b = Limited((scale * c2 - origin) / span, FarthestHandle);

    bool const ordered = a >= 0.0 && a <= 1.0 && b >= 0.0 && b <= 1.0;
    double root = 0.0;
    if (ordered && CRVp_SteepRoot(a, b, u, root)) return root;

    CRVp_UnitCubic const cubic = CRVp_UnitCubic::FromHandles(a, b);
    double low = 0.0;
    double high = 1.0;
    double turns[2];
    int const count = ordered ? 0 : UnitTurningPoints(a, b, turns);
    for (int i = 0; i < count; ++i) {
        if (cubic.Value(turns[i]) >= u) {
            high = turns[i];
            break;
        }
        low = turns[i];
    }
    return BracketedRoot(cubic, u, low, high);
}
