#pragma once

#include "frame/services/curvekernel.h"
#include "keystore/valuedata_private.h"

// The one place that turns two keys into the control points of a segment.

// Storage for a segment's four control points and the curve that points to them. 2 coordinates are a temporal segment;
// the path of a spatial stream has the stream's dimension, 4 at most. The points aren't set here.
struct KFSp_SegmentCurve {
    static constexpr int MaxDimension = 4;

    double p0[MaxDimension];
    double p1[MaxDimension];
    double p2[MaxDimension];
    double p3[MaxDimension];
    CRV_Curve curve;

    explicit KFSp_SegmentCurve(short dimension) : curve{dimension, p0, p1, p2, p3} {}
    KFSp_SegmentCurve(KFSp_SegmentCurve const&) = delete;
    KFSp_SegmentCurve& operator=(KFSp_SegmentCurve const&) = delete;
};

// What the codes on both sides of a segment make of it.
enum class KFSp_SegmentKind {
    Hold,    // at least one side is a hold
    Linear,  // both sides are linear
    Curved,  // linear and spline sides, at least one spline: a cubic
    Other,   // any other pair has no shape
};

inline KFSp_SegmentKind KFSp_GetSegmentKind(signed char outInterp, signed char inInterp)
{
    if (outInterp == KFS_Interp_Hold || inInterp == KFS_Interp_Hold) return KFSp_SegmentKind::Hold;
    bool const outSpline = outInterp == KFS_Interp_Spline;
    bool const inSpline = inInterp == KFS_Interp_Spline;
    bool const outLinear = outInterp == KFS_Interp_Linear;
    bool const inLinear = inInterp == KFS_Interp_Linear;
    if (outLinear && inLinear) return KFSp_SegmentKind::Linear;
    if ((outSpline || outLinear) && (inSpline || inLinear)) return KFSp_SegmentKind::Curved;
    return KFSp_SegmentKind::Other;
}

// One end of a temporal segment: the value there, and the handle on the segment's side. The handle counts on a spline
// side only; any other side has its handle on the chord.
struct KFSp_TemporalEnd {
    double value;
    double speed;
    double influence;
    bool spline;
};

// The two inner control points of a temporal segment, in seconds since its begin and in units of the value.
struct KFSp_TemporalHandles {
    double x1, y1, x2, y2;
};

// The handles of a temporal segment of `dt` seconds that begins at x = 0.
inline KFSp_TemporalHandles KFSp_GetTemporalHandles(KFSp_TemporalEnd const& a, KFSp_TemporalEnd const& b, double dt)
{
    KFSp_TemporalHandles handles;
    if (a.spline) {
        double const h = a.influence * dt;
        handles.x1 = h;
        handles.y1 = a.value + h * a.speed;
    } else {
        handles.x1 = dt * KFSp_OneSixth;
        handles.y1 = a.value + (b.value - a.value) * KFSp_OneSixth;
    }
    if (b.spline) {
        double const h = -b.influence * dt;
        handles.x2 = dt + h;
        handles.y2 = b.value + h * b.speed;
    } else {
        handles.x2 = dt - dt * KFSp_OneSixth;
        handles.y2 = b.value - (b.value - a.value) * KFSp_OneSixth;
    }
    return handles;
}

// Fills the same segment's curve, which has 2 coordinates.
inline void KFSp_FillTemporalSegment(KFSp_TemporalEnd const& a, KFSp_TemporalEnd const& b, double dt,
                                     CRV_Curve const& curve)
{
    KFSp_TemporalHandles const handles = KFSp_GetTemporalHandles(a, b, dt);
    curve.p0[0] = 0.0;
    curve.p0[1] = a.value;
    curve.p1[0] = handles.x1;
    curve.p1[1] = handles.y1;
    curve.p2[0] = handles.x2;
    curve.p2[1] = handles.y2;
    curve.p3[0] = dt;
    curve.p3[1] = b.value;
}

// The ends of the speed graph between two anchors of a spatial stream: distance along the path, 0 to `total`.
struct KFSp_SpeedGraphEnds {
    KFSp_TemporalEnd a;
    KFSp_TemporalEnd b;

    KFSp_SpeedGraphEnds(KFS_KeyScalar const* from, KFS_KeyScalar const* to, double total)
        : a{0.0, from->outSpeed, from->outInfluence, from->outInterp == KFS_Interp_Spline},
          b{total, to->inSpeed, to->inInfluence, to->inInterp == KFS_Interp_Spline}
    {}
};

// Fills that graph's curve, over `dt` seconds.
inline void KFSp_FillSpeedGraph(KFS_KeyScalar const* a, KFS_KeyScalar const* b, double total, double dt,
                                CRV_Curve const& curve)
{
    KFSp_SpeedGraphEnds const ends(a, b, total);
    KFSp_FillTemporalSegment(ends.a, ends.b, dt, curve);
}

// Fills the path from spatial key `a` to spatial key `b`, in the coordinates of the value.
inline void KFSp_FillPathSegment(KFS_KeyScalar const* a, KFS_KeyScalar const* b, int dimension, CRV_Curve const& curve)
{
    KFSp_SpatialRuns<double const> const from = KFSp_GetSpatialRuns(a, dimension);
    KFSp_SpatialRuns<double const> const to = KFSp_GetSpatialRuns(b, dimension);
    for (int i = 0; i < dimension; ++i) {
        curve.p0[i] = from.value[i];
        curve.p1[i] = from.value[i] + from.outTangent[i];
        curve.p2[i] = to.value[i] + to.inTangent[i];
        curve.p3[i] = to.value[i];
    }
}
