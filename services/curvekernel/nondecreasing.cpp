// The treatment that keeps a curve from running backwards.
//
// With the handles' heights as shares of the rise, A = (y1 - y0) / (y3 - y0) and D = (y3 - y2) / (y3 - y0), the slope
// by t is A (1-t)^2 + 2 (1 - A - D) t (1-t) + D t^2, up to a factor. It is nowhere negative exactly if A and D aren't
// and A + D - 1 <= sqrt(A D): the unit square, and the part of an ellipse around it that touches the axes at 4/3.

#include "services/curvekernel/curve_private.h"

#include <cmath>

namespace {

// One handle seen from its own end point: the coordinates are written through, the rest is read.
struct Handle {
    double* point;
    double const* own;
    double const* opposite;
};

bool IsMonotone(double a, double d)
{
    constexpr double BeyondEllipse = 1.5;
    return a >= 0.0 && d >= 0.0 && a < BeyondEllipse && d < BeyondEllipse && a + d - 1.0 <= std::sqrt(a * d);
}

// The largest A that goes with D, for D from 0 to 1: the bigger root of A - sqrt(D) sqrt(A) + D - 1.
double LargestBeside(double d)
{
    double const root = 0.5 * (std::sqrt(d) + std::sqrt(4.0 - 3.0 * d));
    return root * root;
}

// The handle's height as a share of the rise. Infinite where that doesn't fit.
double Share(Handle const& handle)
{
    double const rise = handle.opposite[1] - handle.own[1];
    if (CRVp_IsFinite(rise)) return (handle.point[1] - handle.own[1]) / rise;
    double const origin = 0.25 * handle.own[1];
    return (0.25 * handle.point[1] - origin) / (0.25 * handle.opposite[1] - origin);
}

void Flatten(Handle const& handle)
{
    handle.point[1] = handle.own[1];
}

// Takes the handle back along its own direction to `share` of the rise; 1 is the opposite value to the bit.
void Shorten(Handle const& handle, double share)
{
    handle.point[0] = CRVp_Between(handle.own[0], handle.point[0], share / Share(handle));
    handle.point[1] = (1.0 - share) * handle.own[1] + share * handle.opposite[1];
}

// Shortens the one handle that is too long beside the other. The share is taken back by a few units of rounding until
// the result is one that a second treatment leaves alone; the opposite value is always such a result, and the one that
// is left where a height past it doesn't fit a double.
void ShortenBeside(Handle const& handle, Handle const& other)
{
    double const x = handle.point[0];
    double const y = handle.point[1];
    double const d = Share(other);
    double share = LargestBeside(d);
    for (double back = 0x1p-52; back < 0x1p-40; back *= 2.0) {
        Shorten(handle, share);
        if (IsMonotone(Share(handle), d)) return;
        handle.point[0] = x;
        handle.point[1] = y;
        share -= back;
    }
    Shorten(handle, 1.0);
}

bool MoveHandles(CRV_Curve* curve)
{
    Handle const out{curve->p1, curve->p0, curve->p3};
    Handle const in{curve->p2, curve->p3, curve->p0};
    if (curve->p0[1] == curve->p3[1]) {
        Flatten(out);
        Flatten(in);
        return true;
    }
    if (IsMonotone(Share(out), Share(in))) return false;

    if (Share(out) < 0.0) Flatten(out);
    if (Share(in) < 0.0) Flatten(in);
    bool const outIsLong = Share(out) > 1.0;
    bool const inIsLong = Share(in) > 1.0;
    if (outIsLong && inIsLong) {
        Shorten(out, 1.0);
        Shorten(in, 1.0);
    } else if (outIsLong && !IsMonotone(Share(out), Share(in))) {
        ShortenBeside(out, in);
    } else if (inIsLong && !IsMonotone(Share(out), Share(in))) {
        ShortenBeside(in, out);
    }
    return true;
}

}  // namespace

int CRV_CurveSetNonDecreasing(CRV_Curve* curve, unsigned char* changed)
{
    if (int const code = CRVp_CheckGraph(curve)) return code;
    double const y0 = curve->p0[1];
    double const y1 = curve->p1[1];
    double const y2 = curve->p2[1];
    double const y3 = curve->p3[1];
    if (CRVp_IsInside(y0, y1, y2, y3) || CRVp_IsInside(y3, y2, y1, y0)) return 0;
    if (!CRVp_AllFinite(curve)) return CRV_Err_NotFinite;
    if (MoveHandles(curve) && changed) *changed = 1;
    return 0;
}
