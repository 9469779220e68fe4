// Values on a path: speed graph, arc table and path in sequence, where a plain stream has one curve a component.
#include "curves/spatial.h"

#include "curves/arcs_private.h"
#include "curves/neighbours_private.h"
#include "curves/solvesegment_private.h"
#include "curves/spatial_private.h"
#include "curves/update.h"
#include "frame/boundary_private.h"
#include "keystore/keylist_private.h"
#include "keystore/valuedata_private.h"

#include <algorithm>
#include <cstdint>

// A read is a chain of small steps that three functions share. Left to the compiler, the calls between them are a tenth
// of what a read costs, so the longer ones are inlined by force.

namespace {

// The two anchors around a time, and the way between them.
struct Run {
    KFS_KeyScalar const* a = nullptr;
    KFS_KeyScalar const* b = nullptr;
    int aIndex = -1;
    int bIndex = -1;
    double total = 0.0;  // from `a` to `b` along the path

    bool Adjacent() const { return bIndex - aIndex < 2; }
};

// A piece of the path between two keys of the list, and a distance from its first one.
struct PathPlace {
    KFS_KeyScalar const* first;
    KFS_KeyScalar const* second;
    double s;
};

// Whether the hint is right: the time lies strictly between the key at `keyIndex` and the one behind it.
[[gnu::always_inline]] inline bool TakeHint(KFS_StreamKeyData const* data, int time, int keyIndex, Run* run)
{
    if (keyIndex < 0 || keyIndex >= KFSp_ItemCount(data) - 1) return false;
    auto const [a, b] = KFSp_GetKeyPair(data, keyIndex);
    if (!KFSp_HasShortcuts && !a) return false;
    run->a = a;
    run->b = b;
    run->aIndex = keyIndex;
    run->bIndex = keyIndex + 1;
    return run->a->time < time && time < run->b->time;
}

// Which key of a pair is no anchor, if any. An end of the list is one, whatever its flags say.
[[gnu::always_inline]] inline int FindRoving(KFS_StreamKeyData const* data, Run const& run)
{
    if (KFSp_Roves(data, run.a, run.aIndex)) return run.aIndex;
    return KFSp_Roves(data, run.b, run.bIndex) ? run.bIndex : KFS_INVALID_INDEX;
}

[[gnu::always_inline]] inline int FindAnchors(KFS_Stream const* stream, KFS_StreamKeyData const* data, int time,
                                              int keyIndex, Run* run)
{
    bool const hinted = TakeHint(data, time, keyIndex, run);
    int const roving = hinted && stream->IsSParametrized() ? FindRoving(data, *run) : KFS_INVALID_INDEX;
    if (hinted && roving == KFS_INVALID_INDEX) return 0;

    // From a roving key of the pair the anchors on both sides are those of the time.
    KFS_KeyScalar* at = nullptr;
    KFS_KeyScalar* a = nullptr;
    KFS_KeyScalar* b = nullptr;
    int const code = roving != KFS_INVALID_INDEX
                         ? KFSp_GetNeighborsFromIndex(stream, roving, 0, &a, &b, &run->aIndex, &run->bIndex)
                         : KFSp_GetNeighborsFromTime(stream, time, 0, &at, &a, &b, &run->aIndex, &run->bIndex, nullptr);
    run->a = a;
    run->b = b;
    if (code != 0) return code;
    return a && b ? 0 : KFS_Err_TimeOutsideKeys;
}

double LinearFraction(KFS_KeyScalar const* a, KFS_KeyScalar const* b, int time)
{
    return static_cast<double>(KFSp_TimeDifference(time, a->time)) /
           static_cast<double>(KFSp_TimeDifference(b->time, a->time));
}

// Fills the speed graph, which never runs backwards, whatever KFS_StreamFlag_NonDecreasing says.
[[gnu::always_inline]] inline int BuildSpeedGraph(KFS_Stream const* stream, Run const& run, KFSp_SegmentCurve& graph)
{
    double const dt = KFSp_Seconds(run.b->time, run.a->time, stream->GetTimeScale());
    KFSp_FillSpeedGraph(run.a, run.b, run.total, dt, graph.curve);
    return CRV_CurveSetNonDecreasing(&graph.curve, nullptr);
}

// The distance where the graph doesn't run backwards as it is. False where it has to be built.
[[gnu::always_inline]] inline bool SolveSpeedGraph(KFS_Stream const* stream, Run const& run, int time, double* s)
{
    KFSp_SpeedGraphEnds const ends(run.a, run.b, run.total);
    double const dt = KFSp_Seconds(run.b->time, run.a->time, stream->GetTimeScale());
    KFSp_TemporalHandles const handles = KFSp_GetTemporalHandles(ends.a, ends.b, dt);
    return KFSp_IsKnownToRise(0.0, handles.y1, handles.y2, run.total) &&
           KFSp_SolveSegment(ends.a, ends.b, handles, LinearFraction(run.a, run.b, time), s);
}

// The distance from the first anchor. Codes that have no shape answer 0 and KFS_Err_InterpNotAllowed.
[[gnu::always_inline]] inline int GetDistance(KFS_Stream const* stream, Run const& run, int time,
                                              KFSp_SegmentCurve& graph, double* s)
{
    *s = 0.0;
    switch (KFSp_GetSegmentKind(run.a->outInterp, run.b->inInterp)) {
    case KFSp_SegmentKind::Hold: return 0;
    case KFSp_SegmentKind::Linear: *s = LinearFraction(run.a, run.b, time) * run.total; return 0;
    case KFSp_SegmentKind::Curved: break;
    case KFSp_SegmentKind::Other: return KFS_Err_InterpNotAllowed;
    }
    if (SolveSpeedGraph(stream, run, time, s)) [[likely]]
        return 0;
    if (int const code = BuildSpeedGraph(stream, run, graph); code != 0) return code;
    return CRV_EvaluateYFromX(&graph.curve, s, KFSp_Seconds(time, run.a->time, stream->GetTimeScale()));
}

// Walks from anchor to anchor to the piece on which the distance lies; a distance at a key belongs to the piece before
// it. The last piece takes what rounding has left over.
int FindPiece(KFS_StreamKeyData const* data, Run const& run, double s, PathPlace* place)
{
    *place = {run.a, run.b, s};
    if (run.Adjacent()) return 0;
    int next = run.aIndex + 1;
    if (int const code = KFSp_GetConstKey(data, next, &place->second); code != 0) return code;
    while (next < run.bIndex && !(place->first->arcLength >= place->s)) {
        place->s -= place->first->arcLength;
        place->first = place->second;
        if (int const code = KFSp_GetConstKey(data, ++next, &place->second); code != 0) return code;
    }
    return 0;
}

// The piece that begins at the first anchor, however far the distance goes.
int TakeFirstPiece(KFS_StreamKeyData const* data, Run const& run, PathPlace* place)
{
    return run.Adjacent() ? 0 : KFSp_GetConstKey(data, run.aIndex + 1, &place->second);
}

// The table of a key's arc; a record without the block has none.
SEQ_Head** TableOf(KFS_KeyScalar const* key)
{
    return KFSp_HasSpatialBlock(key) ? key->remapTable : nullptr;
}

// Asks for an arc's table ahead of its use. In a long path it is seldom in a cache, and finding the distance takes about
// as long as memory does. The kernel makes a table in one piece, of some 600 bytes, of which the far end isn't read.
void PrefetchTable(KFS_KeyScalar const* key)
{
    constexpr std::uintptr_t line = 64;
    constexpr std::uintptr_t lines = 8;
    auto const table = reinterpret_cast<std::uintptr_t>(TableOf(key));
    if (!table) return;
    for (std::uintptr_t i = 0; i < lines; ++i) __builtin_prefetch(reinterpret_cast<void const*>(table + i * line));
}

// The path's parameter at a place. `path` is filled here, with the piece's points in the value's coordinates, where
// `fill` asks for it or the table is missing.
[[gnu::always_inline]] inline int GetParameter(KFS_Stream const* stream, Run const& run, PathPlace const& place,
                                               bool fill, KFSp_SegmentCurve& path, double* t)
{
    if (!TableOf(place.first)) {
        if (int const code = KFS_ForceUpdateStream(stream); code != 0) return code;
    }
    SEQ_Head** table = TableOf(place.first);
    bool const measures = stream->IsSParametrized();
    if (fill || (measures && !table)) {
        path.curve.dimension = stream->GetDimension();
        KFSp_FillPathSegment(place.first, place.second, stream->GetDimension(), path.curve);
    }
    if (measures) return CRV_TFromSSpline(&path.curve, &table, t, place.s, 1.0);
    *t = run.total != 0.0 ? place.s / run.total : 0.0;
    return 0;
}

// The point of the straight line between the anchors. The parameter goes behind the in tangent here, where the path's
// point leaves it behind the value.
void WriteStraight(KFS_Stream const* stream, Run const& run, double t, double* result)
{
    int const dimension = stream->GetDimension();
    double const* const from = KFSp_Numbers(run.a);
    double const* const to = KFSp_Numbers(run.b);
    for (int i = 0; i < dimension; ++i) result[i] = from[i] + (to[i] - from[i]) * t;
    if (dimension > 0)  // the record of a value without components has no room for it
        result[2 * dimension] = t;
}

// What CRV_EvaluatePoint answers. Of a point that isn't finite it says itself what is wrong.
[[gnu::always_inline]] inline int EvaluatePoint(CRV_Curve const& curve, double t, double* result)
{
    double point[KFSp_SegmentCurve::MaxDimension];
    for (int i = 0; i < curve.dimension; ++i)
        if (!KFSp_EvaluateCoordinate(curve.p0[i], curve.p1[i], curve.p2[i], curve.p3[i], t, &point[i])) [[unlikely]]
            return CRV_EvaluatePoint(&curve, result, t);
    std::copy_n(point, curve.dimension, result);
    return 0;
}

[[gnu::always_inline]] inline int FindRun(KFS_Stream const* stream, KFS_StreamKeyData const* data, int time,
                                          int keyIndex, Run* run)
{
    if (int const code = KFSp_CheckPathDimension(stream); code != 0) return code;
    if (int const code = FindAnchors(stream, data, time, keyIndex, run); code != 0) return code;
    PrefetchTable(run->a);
    if (run->Adjacent()) {
        run->total = run->a->arcLength;
        return 0;
    }
    return KFSp_SumArcs(data, run->aIndex, run->bIndex, &run->total);
}

}  // namespace

int KFSp_InterpolateSpatial(KFS_Stream const* stream, long, int time, int keyIndex)
{
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    Run run;
    if (int const code = FindRun(stream, data, time, keyIndex, &run); code != 0) return code;

    KFSp_SegmentCurve curve(2);
    double s = 0.0;
    if (int const code = GetDistance(stream, run, time, curve, &s); code != 0) return code;

    bool const onPath = stream->GetSpInterp() == KFS_SpInterp_Auto;
    if (onPath && !KFSp_HasPathDimension(stream)) return KFSp_RefusePathDimension();
    PathPlace place{run.a, run.b, s};
    if (int const code = onPath ? FindPiece(data, run, s, &place) : TakeFirstPiece(data, run, &place); code != 0)
        return code;
    double t = 0.0;
    if (int const code = GetParameter(stream, run, place, onPath, curve, &t); code != 0) return code;

    double* const result = KFSp_Numbers(data->cache);
    if (!onPath) {
        WriteStraight(stream, run, t, result);
        return 0;
    }
    if (int const code = EvaluatePoint(curve.curve, t, result); code != 0) return code;
    result[stream->GetDimension()] = t;
    return 0;
}

int KFSp_FindOnPath(KFS_Stream const* stream, int time, KFSp_PathPoint* point)
{
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    Run run;
    if (int const code = FindRun(stream, data, time, KFS_INVALID_INDEX, &run); code != 0) return code;

    KFSp_SegmentCurve curve(2);
    double s = 0.0;
    if (int const code = GetDistance(stream, run, time, curve, &s); code != 0) return code;
    if (!KFSp_HasPathDimension(stream)) return KFSp_RefusePathDimension();
    PathPlace place{};
    if (int const code = FindPiece(data, run, s, &place); code != 0) return code;
    point->first = place.first;
    point->second = place.second;
    return GetParameter(stream, run, place, false, curve, &point->t);
}

int KFSp_InterpTangentSpatial(KFS_Stream const* stream, long, int time, int keyIndex)
{
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    Run run;
    if (int const code = FindRun(stream, data, time, keyIndex, &run); code != 0) return code;

    KFSp_SegmentCurve curve(2);
    double s = 0.0;
    // Codes without a shape stand still at the first anchor.
    if (int const code = GetDistance(stream, run, time, curve, &s); code != 0 && code != KFS_Err_InterpNotAllowed)
        return code;

    int const dimension = stream->GetDimension();
    bool const onPath = stream->IsSParametrized() || (stream->GetSpInterp() == KFS_SpInterp_Auto && dimension == 2);
    PathPlace place{};
    if (int const code = FindPiece(data, run, s, &place); code != 0) return code;
    double t = 0.0;
    if (int const code = GetParameter(stream, run, place, onPath, curve, &t); code != 0) return code;

    double* const result = KFSp_Numbers(data->cache);
    if (!onPath) {
        WriteStraight(stream, run, t, result);
        return 0;
    }
    if (int const code = CRV_EvaluateDeriv(&curve.curve, result, t); code != 0) return code;
    for (int i = 0; i < dimension; ++i) result[i] /= 3.0;
    result[dimension] = t;
    return 0;
}

int KFSp_InterpDerivSpatial(KFS_Stream const* stream, long, int time, int keyIndex)
{
    if (int const code = KFSp_CheckPathDimension(stream); code != 0) return code;
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    Run run;
    if (int const code = FindAnchors(stream, data, time, keyIndex, &run); code != 0) return code;
    // Between two splines the sum may be a partial one.
    bool const bothSpline = run.a->outInterp == KFS_Interp_Spline && run.b->inInterp == KFS_Interp_Spline;
    if (int const code = KFSp_SumArcs(data, run.aIndex, run.bIndex, &run.total); code != 0 && !bothSpline) return code;
    if (KFSp_GetSegmentKind(run.a->outInterp, run.b->inInterp) != KFSp_SegmentKind::Curved) return 0;
    if (stream->GetDimension() < 1) return 0;  // as in WriteStraight

    KFSp_SegmentCurve graph(2);
    if (int const code = BuildSpeedGraph(stream, run, graph); code != 0) return code;
    double const x = KFSp_Seconds(time, run.a->time, stream->GetTimeScale());
    return CRV_Evaluate1dDerivFromX(&graph.curve, KFSp_Numbers(data->cache), x);
}

namespace {

// Shortens the handles of a speed graph along their own direction until they end between the two distances.
void HoldInsideBox(CRV_Curve const& graph)
{
    double const dt = graph.p3[0];
    double const length = graph.p3[1];
    if (graph.p2[1] < 0.0) {
        double const k = length / (length - graph.p2[1]);
        graph.p2[1] = 0.0;
        graph.p2[0] = (graph.p2[0] - dt) * k + dt;
    }
    if (graph.p1[1] > length) {
        double const k = length / graph.p1[1];
        graph.p1[1] = length;
        graph.p1[0] *= k;
    }
}

// The distance covered of one key's arc.
int GetArcDistance(KFS_Stream const* stream, KFS_KeyScalar const* a, KFS_KeyScalar const* b, int time, double* s)
{
    *s = 0.0;
    switch (KFSp_GetSegmentKind(a->outInterp, b->inInterp)) {
    case KFSp_SegmentKind::Hold: return 0;
    case KFSp_SegmentKind::Linear: *s = LinearFraction(a, b, time) * a->arcLength; return 0;
    case KFSp_SegmentKind::Curved: break;
    case KFSp_SegmentKind::Other: return KFS_Err_InterpNotAllowed;
    }
    KFSp_SegmentCurve graph(2);
    KFSp_FillSpeedGraph(a, b, a->arcLength, KFSp_Seconds(b->time, a->time, stream->GetTimeScale()), graph.curve);
    if (a->outInterp == KFS_Interp_Spline && b->inInterp == KFS_Interp_Spline) HoldInsideBox(graph.curve);
    return CRV_EvaluateYFromX(&graph.curve, s, KFSp_Seconds(time, a->time, stream->GetTimeScale()));
}

int CalculateT(KFS_Stream const* stream, int time, int keyIndex, KFS_KeyScalar** first, KFS_KeyScalar** second,
               double* t)
{
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    stream = data->stream;
    if (KFSp_IsStale(data)) {
        if (int const code = stream->UpdateStream(); code != 0) return code;
    }
    KFS_KeyScalar const* a = nullptr;
    KFS_KeyScalar const* b = nullptr;
    if (int const code = KFSp_GetConstKey(data, keyIndex, &a); code != 0) return code;
    if (int const code = KFSp_GetConstKey(data, keyIndex + 1, &b); code != 0) return code;
    *first = const_cast<KFS_KeyScalar*>(a);
    *second = const_cast<KFS_KeyScalar*>(b);
    double s = 0.0;
    if (int const code = GetArcDistance(stream, a, b, time, &s); code != 0) return code;
    *t = s / a->arcLength;
    return 0;
}

}  // namespace

int KFS_CalculateTFromStream(KFS_Stream const* stream, long, int time, int keyIndex, KFS_KeyScalar** first,
                             KFS_KeyScalar** second, double* t)
{
    return KFSp_Boundary([&] { return CalculateT(stream, time, keyIndex, first, second, t); });
}
