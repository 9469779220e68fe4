// Values between two keys of a plain stream: what a read spends its time in.
#include "curves/interpolate_private.h"

#include "curves/neighbours_private.h"
#include "curves/solvesegment_private.h"
#include "keystore/keylist_private.h"

#include <algorithm>

namespace {

// The two keys between which a read happens.
struct Segment {
    KFS_KeyScalar const* a = nullptr;
    KFS_KeyScalar const* b = nullptr;
};

// Whether the hint names the key right before the time; `segment` is the answer then.
bool TakeHint(KFS_Stream const* stream, KFS_StreamKeyData const* data, int time, int keyIndex, Segment* segment)
{
    if (keyIndex < 0 || keyIndex >= KFSp_ItemCount(data) - 1 || stream->HasNoKeys()) return false;
    if (stream->IsSpatial() && stream->IsSParametrized()) return false;  // a neighbour may be a float key
    auto const [a, b] = KFSp_GetKeyPair(data, keyIndex);
    if (!KFSp_HasShortcuts && !a) return false;
    *segment = {a, b};
    return a->time < time && time < b->time;
}

int FindSegment(KFS_Stream const* stream, KFS_StreamKeyData const* data, int time, int keyIndex, Segment* segment)
{
    if (TakeHint(stream, data, time, keyIndex, segment)) [[likely]]
        return 0;
    KFS_KeyScalar* at = nullptr;
    KFS_KeyScalar* prev = nullptr;
    KFS_KeyScalar* next = nullptr;
    int const code = KFSp_GetNeighborsFromTime(stream, time, 0, &at, &prev, &next, nullptr, nullptr, nullptr);
    *segment = {prev, next};
    return code;
}

// The share of the segment that lies before the time.
double Fraction(Segment segment, int time)
{
    return static_cast<double>(KFSp_TimeDifference(time, segment.a->time)) /
           static_cast<double>(KFSp_TimeDifference(segment.b->time, segment.a->time));
}

void InterpolateLinear(int dimension, Segment segment, int time, double* result)
{
    double const* const from = KFSp_Numbers(segment.a);
    double const* const to = KFSp_Numbers(segment.b);
    double const fraction = Fraction(segment, time);
    for (int i = 0; i < dimension; ++i) result[i] = from[i] + (to[i] - from[i]) * fraction;
}

// What the components of a curved segment share.
struct CurvedSegment {
    KFSp_TemporalRuns<double const> from;
    KFSp_TemporalRuns<double const> to;
    bool fromSpline;
    bool toSpline;
    double dt;  // seconds from key to key
    double x;   // seconds from the first key to the time

    CurvedSegment(KFS_Stream const* stream, Segment segment, int time)
        : from(KFSp_GetTemporalRuns(segment.a, stream->GetDimension())),
          to(KFSp_GetTemporalRuns(segment.b, stream->GetDimension())),
          fromSpline(segment.a->outInterp == KFS_Interp_Spline),
          toSpline(segment.b->inInterp == KFS_Interp_Spline),
          dt(KFSp_Seconds(segment.b->time, segment.a->time, stream->GetTimeScale())),
          x(KFSp_Seconds(time, segment.a->time, stream->GetTimeScale()))
    {}
    KFSp_TemporalEnd First(int i) const { return {from.value[i], from.outSpeed[i], from.outInfluence[i], fromSpline}; }
    KFSp_TemporalEnd Last(int i) const { return {to.value[i], to.inSpeed[i], to.inInfluence[i], toSpline}; }
};

// Builds each component's cubic and hands it to `kernel`, which evaluates it at an x.
template <class Kernel>
int EvaluateCurves(KFS_Stream const* stream, CurvedSegment const& segment, int first, double* result, Kernel kernel)
{
    bool const nonDecreasing = (stream->GetKFSFlags() & KFS_StreamFlag_NonDecreasing) != 0;
    KFSp_SegmentCurve cubic(2);
    for (int i = first; i < stream->GetDimension(); ++i) {
        KFSp_FillTemporalSegment(segment.First(i), segment.Last(i), segment.dt, cubic.curve);
        if (nonDecreasing) {
            if (int const code = CRV_CurveSetNonDecreasing(&cubic.curve, nullptr)) return code;
        }
        if (int const code = kernel(&cubic.curve, &result[i], segment.x)) return code;
    }
    return 0;
}

[[gnu::noinline, gnu::cold]] int EvaluateCurvedSlow(KFS_Stream const* stream, Segment keys, int time, int first,
                                                    double* result)
{
    return EvaluateCurves(
        stream, CurvedSegment(stream, keys, time), first, result,
        [](CRV_Curve const* curve, double* y, double x) { return CRV_EvaluateYFromX(curve, y, x); });
}

// What isn't ordinary takes the long way, from the component on that isn't; so does what a treatment would change.
int EvaluateCurved(KFS_Stream const* stream, Segment keys, int time, double* result)
{
    bool const mayNotFall = (stream->GetKFSFlags() & KFS_StreamFlag_NonDecreasing) != 0;
    CurvedSegment const segment(stream, keys, time);
    double const u = Fraction(keys, time);
    int const dimension = stream->GetDimension();
    for (int i = 0; i < dimension; ++i) {
        KFSp_TemporalEnd const a = segment.First(i);
        KFSp_TemporalEnd const b = segment.Last(i);
        KFSp_TemporalHandles const handles = KFSp_GetTemporalHandles(a, b, segment.dt);
        bool const stands = !mayNotFall || KFSp_IsKnownToRise(a.value, handles.y1, handles.y2, b.value) ||
                            KFSp_IsKnownToRise(b.value, handles.y2, handles.y1, a.value);
        if (!stands || !KFSp_SolveSegment(a, b, handles, u, &result[i])) [[unlikely]]
            return EvaluateCurvedSlow(stream, keys, time, i, result);
    }
    return 0;
}

[[gnu::noinline]] int InterpolateAny(KFS_Stream const* stream, Segment segment, int time, double* result)
{
    switch (KFSp_GetSegmentKind(segment.a->outInterp, segment.b->inInterp)) {
    case KFSp_SegmentKind::Linear: InterpolateLinear(stream->GetDimension(), segment, time, result); return 0;
    case KFSp_SegmentKind::Curved: return EvaluateCurved(stream, segment, time, result);
    // Codes without a shape hold, so that no read answers what the record held before.
    case KFSp_SegmentKind::Other:
    case KFSp_SegmentKind::Hold: break;
    }
    std::copy_n(KFSp_Numbers(segment.a), std::max<int>(stream->GetDimension(), 0), result);
    return 0;
}

// EvaluateCurved with all that is known put in. False, and `result` untouched, where that has to look.
[[gnu::always_inline]] inline bool EvaluateOneSpline(KFS_Stream const* stream, Segment keys, int time, double* result)
{
    KFSp_TemporalRuns<double const> const from = KFSp_GetTemporalRuns(keys.a, 1);
    KFSp_TemporalRuns<double const> const to = KFSp_GetTemporalRuns(keys.b, 1);
    KFSp_TemporalEnd const a{*from.value, *from.outSpeed, *from.outInfluence, true};
    KFSp_TemporalEnd const b{*to.value, *to.inSpeed, *to.inInfluence, true};
    double const dt = KFSp_Seconds(keys.b->time, keys.a->time, stream->GetTimeScale());
    return KFSp_SolveSegment(a, b, KFSp_GetTemporalHandles(a, b, dt), Fraction(keys, time), result);
}

}  // namespace

// What nearly every read asks is first, without a frame: one component, two linear or two spline sides.
int KFSp_InterpolateBetween(KFS_Stream const* stream, KFS_KeyScalar const* a, KFS_KeyScalar const* b, int time,
                            double* result)
{
    Segment const segment{a, b};
    if (stream->GetDimension() == 1 && a->outInterp == b->inInterp) [[likely]] {
        bool const mayFall = (stream->GetKFSFlags() & KFS_StreamFlag_NonDecreasing) == 0;
        if (a->outInterp == KFS_Interp_Spline && mayFall && EvaluateOneSpline(stream, segment, time, result)) return 0;
        if (a->outInterp == KFS_Interp_Linear) {
            InterpolateLinear(1, segment, time, result);
            return 0;
        }
    }
    return InterpolateAny(stream, segment, time, result);
}

int KFSp_Interpolate(KFS_Stream const* stream, long, int time, int keyIndex)
{
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    Segment segment;
    if (int const code = FindSegment(stream, data, time, keyIndex, &segment)) return code;
    KFSp_SegmentKind const kind = KFSp_GetSegmentKind(segment.a->outInterp, segment.b->inInterp);
    if (kind == KFSp_SegmentKind::Hold || kind == KFSp_SegmentKind::Other) return 0;
    return KFSp_InterpolateBetween(stream, segment.a, segment.b, time, KFSp_Numbers(data->cache));
}

int KFSp_InterpDeriv(KFS_Stream const* stream, long, int time, int keyIndex)
{
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    Segment segment;
    if (int const code = FindSegment(stream, data, time, keyIndex, &segment)) return code;
    if (KFSp_GetSegmentKind(segment.a->outInterp, segment.b->inInterp) != KFSp_SegmentKind::Curved) return 0;
    return EvaluateCurves(
        stream, CurvedSegment(stream, segment, time), 0, KFSp_Numbers(data->cache),
        [](CRV_Curve const* curve, double* dydx, double x) { return CRV_Evaluate1dDerivFromX(curve, dydx, x); });
}
