// Parameter from coordinate: the innermost step of every read.
//
// One coordinate of a cubic, c0 to c3, is asked for the smallest t in 0 to 1 at which it reaches v on its way from c0
// to c3. The common case is inline: both handles end between c0 and c3, so the coordinate grows with t. Three Halley
// steps from t = u, the linear answer, arrive for nineteen questions of twenty; what they reach is checked, and
// whatever fails the check, and every other shape, goes to CRVp_ReachSlow.
#pragma once

#include <cmath>

// The power form of a cubic with value 0 at t = 0 and 1 at t = 1: ((a3 t + a2) t + a1) t.
struct CRVp_UnitCubic {
    double a3, a2, a1;

    // From the two handles' places a and b on the way from 0 to 1.
    static CRVp_UnitCubic FromHandles(double a, double b)
    {
        double const apart = b - a;
        return {1.0 - 3.0 * apart, 3.0 * (apart - a), 3.0 * a};
    }
    double Value(double t) const { return ((a3 * t + a2) * t + a1) * t; }
    double Slope(double t) const { return (3.0 * a3 * t + 2.0 * a2) * t + a1; }
};

// Three Halley steps towards cubic(t) = u. What a step costs is how long its operations wait for each other, so the value
// is summed in two halves.
inline double CRVp_HalleySteps(CRVp_UnitCubic const& cubic, double u, double t)
{
    for (int step = 0; step < 3; ++step) {
        double const at = cubic.a3 * t;
        double const f = (at + cubic.a2) * (t * t) + (cubic.a1 * t - u);
        double const slope = (3.0 * at + 2.0 * cubic.a2) * t + cubic.a1;
        double const halfCurvature = 3.0 * at + cubic.a2;
        t -= f * slope / (slope * slope - f * halfCurvature);
    }
    return t;
}

// Whether the steps have arrived. The bound is on t, not on the residual alone: on a plateau of the coordinate every t
// has a small residual. False for NaN.
inline bool CRVp_IsRoot(CRVp_UnitCubic const& cubic, double u, double t)
{
    double const residual = cubic.Value(t) - u;
    double const allowed = 4e-14 * cubic.Slope(t);
    return (residual <= allowed) & (-residual <= allowed) & (t >= 0.0) & (t <= 1.0);
}

// Any shape, any scale, slowly: by bracket and Newton steps. NaN if an argument is NaN or a coordinate infinite.
double CRVp_ReachSlow(double c0, double c1, double c2, double c3, double v);

// The parameters in the open interval 0 to 1 at which the coordinate turns back, ascending. Answers how many, 0 to 2.
// The curve must not be constant in this coordinate and its coordinates finite.
int CRVp_TurningPoints(double c0, double c1, double c2, double c3, double turns[2]);

// The coordinate at t, 0 to 1, without the limit to the hull: exact at both ends, never more than rounding outside.
// The weights are formed first, so that no product is larger than its coordinate.
inline double CRVp_Blend(double c0, double c1, double c2, double c3, double t)
{
    double const s = 1.0 - t;
    double const ss = s * s;
    double const tt = t * t;
    return (ss * s * c0 + 3.0 * ss * t * c1) + (3.0 * s * tt * c2 + tt * t * c3);
}

inline double CRVp_Min(double a, double b)
{
    return b < a ? b : a;
}
inline double CRVp_Max(double a, double b)
{
    return a < b ? b : a;
}

// NaN stays NaN.
inline double CRVp_LimitToUnit(double t)
{
    return t < 0.0 ? 0.0 : t > 1.0 ? 1.0 : t;
}

// Rounding may carry a blend an ulp past its control coordinates; a held coordinate must come back as it is.
inline double CRVp_LimitToHull(double c0, double c1, double c2, double c3, double value)
{
    double const low = CRVp_Min(CRVp_Min(c0, c1), CRVp_Min(c2, c3));
    double const high = CRVp_Max(CRVp_Max(c0, c1), CRVp_Max(c2, c3));
    return CRVp_Max(low, CRVp_Min(high, value));
}

// Both handles between the two end values, which ascend: the curve doesn't run backwards. The case of nearly every curve.
inline bool CRVp_IsInside(double c0, double c1, double c2, double c3)
{
    return (c0 <= c1) & (c1 <= c3) & (c0 <= c2) & (c2 <= c3);
}

// False for NaN and the infinities.
inline bool CRVp_IsFinite(double value)
{
    return value - value == 0.0;
}

// The root of cubic(t) = u for handles a and b between 0 and 1. The curve is turned around where that brings the root
// into the first half; there the cubic is near a parabola, whose root is a good start also where the slope at the end
// is 0. False where three steps weren't enough, next to a plateau.
inline bool CRVp_SteepRoot(double a, double b, double u, double& root)
{
    bool const turned = 8.0 * u > 1.0 + 3.0 * (a + b);
    CRVp_UnitCubic const cubic =
        turned ? CRVp_UnitCubic::FromHandles(1.0 - b, 1.0 - a) : CRVp_UnitCubic::FromHandles(a, b);
    double const target = turned ? 1.0 - u : u;

    // 0.3 t^2 stands for t^3: the choice that fails least often over random handles.
    double const discriminant = cubic.a1 * cubic.a1 + 4.0 * (cubic.a2 + 0.3 * cubic.a3) * target;
    double const start = 2.0 * target / (cubic.a1 + (discriminant > 0.0 ? std::sqrt(discriminant) : 0.0));
    double const t = CRVp_HalleySteps(cubic, target, start);
    root = turned ? 1.0 - t : t;
    return CRVp_IsRoot(cubic, target, t);
}

// Handles from 0 to 1 and a u in the segment. A NaN passes no comparison.
inline bool CRVp_IsOrdered(double a, double b, double u)
{
    double const least = CRVp_Min(CRVp_Min(a, b), u);
    double const most = CRVp_Max(a, b);
    return (least >= 0.0) & (most <= 1.0) & (u < 1.0);
}

// Both influences one third, up to the rounding of the handles: the coordinate is linear in t.
inline bool CRVp_IsStraight(CRVp_UnitCubic const& cubic)
{
    return std::fabs(cubic.a3) + std::fabs(cubic.a2) <= 4e-15;
}

// The root of cubic(t) = u for the handles a and b of a unit cubic, in all but the rare cases. False where only
// CRVp_ReachSlow can tell: `t` has no meaning then.
inline bool CRVp_UnitRoot(double a, double b, double u, double& t)
{
    if (!CRVp_IsOrdered(a, b, u)) return false;
    CRVp_UnitCubic const cubic = CRVp_UnitCubic::FromHandles(a, b);

    if (CRVp_IsStraight(cubic)) {
        t = u;
        return true;
    }
    t = CRVp_HalleySteps(cubic, u, u);
    return CRVp_IsRoot(cubic, u, t) || CRVp_SteepRoot(a, b, u, t);
}

// CRVp_UnitRoot for code that mustn't branch: `isRoot` is 1.0, or 0.0 where CRVp_UnitRoot has to be asked. It finds fewer
// roots, and the same.
struct CRVp_UnitAnswer {
    double t, isRoot;
};
inline CRVp_UnitAnswer CRVp_UnitRootInLane(double a, double b, double u)
{
    bool const ordered = CRVp_IsOrdered(a, b, u);
    CRVp_UnitCubic const cubic = CRVp_UnitCubic::FromHandles(a, b);
    bool const straight = CRVp_IsStraight(cubic);
    double const stepped = CRVp_HalleySteps(cubic, u, u);
    return {straight ? u : stepped, ordered & (straight | CRVp_IsRoot(cubic, u, stepped)) ? 1.0 : 0.0};
}

// An extent of 0 and one that overflows end in a NaN here, and so at CRVp_ReachSlow.
inline double CRVp_Reach(double c0, double c1, double c2, double c3, double v)
{
    double const inverse = 1.0 / (c3 - c0);
    double t = 0.0;
    return CRVp_UnitRoot((c1 - c0) * inverse, (c2 - c0) * inverse, (v - c0) * inverse, t)
               ? t
               : CRVp_ReachSlow(c0, c1, c2, c3, v);
}
