// Dragging a curve by one of its points: which handles carry it there.
//
// The point at t is the sum of the control points with the weights of Bernstein. Of all ways to move it by `way` with the
// two handles the shortest goes along the handles' own weights: each moves by its weight times `way` over the sum of the
// two weights' squares.

#include "services/curvekernel/curve_private.h"

#include <cmath>

namespace {

// What a graph's handle keeps from its own end point, as a share of the segment.
constexpr double ShortestHandle = 1e-4;
// Where x by t is less than this share of the segment, a place in x says too little of the place in t.
constexpr double Upright = 0.01;
// A rising graph may miss what it can reach by this share of its height, so that rounding doesn't refuse its edges.
constexpr double RoundingShare = 1e-12;

struct Weights {
    double first;   // of p1
    double second;  // of p2

    explicit Weights(double t) : first(3.0 * (1.0 - t) * (1.0 - t) * t), second(3.0 * (1.0 - t) * t * t) {}
};

// How far each handle moves for a way of 1. Infinite at the ends, where handles move nothing.
struct Shares {
    double first;
    double second;

    explicit Shares(double t)
    {
        double const s = 1.0 - t;
        double const both = 3.0 * (s * s + t * t);
        first = 1.0 / (t * both);
        second = 1.0 / (s * both);
    }
};

// The handles' places on the x axis as shares of the way from p0 to p3.
struct Lengths {
    double a;
    double b;

    double X(double t) const { return CRVp_Blend(0.0, a, b, 1.0, t); }
    double Slope(double t) const
    {
        double const s = 1.0 - t;
        return 3.0 * (s * s * a + 2.0 * s * t * (b - a) + t * t * (1.0 - b));
    }
    bool operator==(Lengths const&) const = default;
};

double Limited(double low, double value, double high)
{
    return CRVp_Max(low, CRVp_Min(value, high));
}

// The lengths that the handles get. Both one third, x grows evenly with t: towards that they go from an upright point.
Lengths Storable(Lengths const& wanted, double x)
{
    Lengths lengths{Limited(ShortestHandle, wanted.a, 1.0), Limited(0.0, wanted.b, 1.0 - ShortestHandle)};
    if (lengths.b >= lengths.a) return lengths;  // no S that leans over
    Lengths const upright = lengths;
    for (double share = 0x1p-6; share <= 1.0; share *= 2.0) {
        if (lengths.Slope(CRVp_Reach(0.0, lengths.a, lengths.b, 1.0, x)) >= Upright) break;
        lengths = {CRVp_Between(upright.a, 1.0 / 3.0, share), CRVp_Between(upright.b, 2.0 / 3.0, share)};
    }
    return lengths;
}

struct Heights {
    double first;
    double second;
};

// Moves the heights as little as possible so that their weighted sum stays and both lie between the heights of the ends,
// where a graph doesn't turn back. False where the sum can't be had so.
bool KeepBetweenEnds(CRV_Curve const& curve, Weights const& weights, Heights& heights)
{
    double const low = CRVp_Min(curve.p0[1], curve.p3[1]);
    double const high = CRVp_Max(curve.p0[1], curve.p3[1]);
    double const sum = weights.first * heights.first + weights.second * heights.second;
    double const most = weights.first + weights.second;
    double const rounding = RoundingShare * CRVp_Max(std::fabs(low), std::fabs(high));
    if (!(sum >= most * low - rounding && sum <= most * high + rounding)) return false;
    double const least = (sum - weights.second * high) / weights.first;
    double const largest = (sum - weights.second * low) / weights.first;
    heights.first = Limited(low, Limited(least, heights.first, largest), high);
    heights.second = Limited(low, (sum - weights.first * heights.first) / weights.second, high);
    return true;
}

// Whether a graph with these handles turns back in y.
bool TurnsBack(CRV_Curve const& curve, double x1, double x2, Heights const& heights)
{
    double p1[] = {x1, heights.first};
    double p2[] = {x2, heights.second};
    CRV_Curve tried{2, curve.p0, p1, p2, curve.p3};
    unsigned char changed = 0;
    return CRV_CurveSetNonDecreasing(&tried, &changed) != 0 || changed != 0;
}

double HeightAt(CRV_Curve const& curve, double t)
{
    return CRVp_Blend(curve.p0[1], curve.p1[1], curve.p2[1], curve.p3[1], t);
}

int DragGraph(CRV_Curve* curve, double const* way, CRV_DirectManipState const& state)
{
    double const x0 = curve->p0[0];
    double const extent = curve->p3[0] - x0;
    if (extent == 0.0) return CRV_Err_OutOfReach;
    if (!CRVp_IsFinite(extent)) return CRV_Err_NotFinite;
    Lengths const present{(curve->p1[0] - x0) / extent, (curve->p2[0] - x0) / extent};
    double const x = present.X(state.t) + way[0] / extent;
    Lengths const lengths = Storable(present, x);
    bool const sameT = lengths == present && way[0] == 0.0;
    double const t = sameT ? state.t : CRVp_Reach(0.0, lengths.a, lengths.b, 1.0, x);
    if (t != t) return CRV_Err_NotFinite;

    double const height = HeightAt(*curve, state.t) + way[1];
    double const rest = height - HeightAt(*curve, t);
    if (!CRVp_IsFinite(rest)) return CRV_Err_NotFinite;
    bool const outside = !(x >= 0.0 && x <= 1.0) || !(t > 0.0 && t < 1.0);
    if (outside && (rest != 0.0 || way[0] != 0.0)) return CRV_Err_OutOfReach;

    Heights heights{curve->p1[1], curve->p2[1]};
    double const x1 = lengths.a == present.a ? curve->p1[0] : x0 + extent * lengths.a;
    double const x2 = lengths.b == present.b ? curve->p2[0] : x0 + extent * lengths.b;
    if (rest != 0.0) {
        Shares const shares(t);
        heights = {heights.first + rest * shares.first, heights.second + rest * shares.second};
        if (state.kind == CRV_Drag_RisingGraph && TurnsBack(*curve, x1, x2, heights) &&
            !KeepBetweenEnds(*curve, Weights(t), heights))
            return CRV_Err_OutOfReach;
    }
    double const y1 = heights.first - curve->p0[1];
    double const y2 = heights.second - curve->p3[1];
    if (!CRVp_IsFinite(y1 / (x1 - x0)) || !CRVp_IsFinite(y2 / (x2 - curve->p3[0]))) return CRV_Err_NotFinite;
    curve->p1[0] = x1 - x0;
    curve->p1[1] = y1;
    curve->p2[0] = x2;
    curve->p2[1] = y2;
    return 0;
}

int DragPath(CRV_Curve* curve, double const* target, CRV_DirectManipState const& state)
{
    double first[CRVp_MostCurveDimensions] = {};
    double second[CRVp_MostCurveDimensions] = {};
    bool const inside = state.t > 0.0 && state.t < 1.0;
    Shares const shares(state.t);
    for (int i = 0; i < curve->dimension; ++i) {
        double const way = target[i] - CRVp_Blend(curve->p0[i], curve->p1[i], curve->p2[i], curve->p3[i], state.t);
        if (way != 0.0 && !inside) return CRV_Err_OutOfReach;
        first[i] = curve->p1[i] + (way != 0.0 ? way * shares.first : 0.0) - curve->p0[i];
        second[i] = curve->p2[i] + (way != 0.0 ? way * shares.second : 0.0) - curve->p3[i];
        if (!CRVp_IsFinite(first[i]) || !CRVp_IsFinite(second[i])) return CRV_Err_NotFinite;
    }
    for (int i = 0; i < curve->dimension; ++i) {
        curve->p1[i] = second[i];
        curve->p2[i] = first[i];
    }
    return 0;
}

}  // namespace

int CRV_DirectManipSetup(CRV_DirectManipState* state, double t)
{
    if (!state) return CRV_Err_NullArgument;
    double const at = CRVp_LimitToUnit(t);
    if (at != at) return CRV_Err_NotFinite;
    state->t = at;
    return 0;
}

int CRV_DirectManipCurve(CRV_Curve* curve, double const* target, CRV_DirectManipState const* state)
{
    if (!state || !target) return CRV_Err_NullArgument;
    bool const path = state->kind == CRV_Drag_Path;
    if (int const code = path ? CRVp_CheckPath(curve) : CRVp_CheckGraph(curve)) return code;
    if (!CRVp_AllFinite(curve)) return CRV_Err_NotFinite;
    return path ? DragPath(curve, target, *state) : DragGraph(curve, target, *state);
}
