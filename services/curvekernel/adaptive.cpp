// Polylines of graphs: points appended to a caller's list, as few as the caller's test allows.

#include "services/curvekernel/curve_private.h"

#include "frame/services/sequence.h"

namespace {

struct Sample {
    double x;
    double y;
};

// The list that is appended to, and the range of y in it.
struct Polyline {
    SEQ_Head** list;
    unsigned char* haveRange;
    double* minValue;
    double* maxValue;

    bool IsComplete() const { return list && haveRange && minValue && maxValue; }

    [[nodiscard]] int Append(Sample const& sample) const
    {
        if (!CRVp_IsFinite(sample.x) || !CRVp_IsFinite(sample.y)) return CRV_Err_NotFinite;
        void const* last = nullptr;
        bool const any = SEQ_GetConstAddress(list, -1, &last) == 0;
        // Where a piece begins is mostly where the one before ended.
        bool const stands =
            any && static_cast<Sample const*>(last)->x == sample.x && static_cast<Sample const*>(last)->y == sample.y;
        if (!stands)
            if (int const code = SEQ_Insert(&sample, -1, list)) return code;
        *minValue = *haveRange ? CRVp_Min(*minValue, sample.y) : sample.y;
        *maxValue = *haveRange ? CRVp_Max(*maxValue, sample.y) : sample.y;
        *haveRange = 1;
        return 0;
    }
};

// A stretch of a curve between two parameters, with its ends.
struct Stretch {
    double t0, t1;
    Sample start, end;
};

[[nodiscard]] int PointAt(CRV_Curve const* curve, double t, Sample* point)
{
    double coordinates[2];
    if (int const code = CRV_EvaluatePoint(curve, coordinates, t)) return code;
    *point = {coordinates[0], coordinates[1]};
    return 0;
}

// A curve on its way into a polyline. Where x turns back, what lies left of the farthest x so far isn't part of the graph,
// nor is what swings out beyond its end.
struct Piece {
    CRV_SampleFunc* test;
    void* refCon;
    CRV_Curve const* curve;
    Polyline const& out;
    double farthest;
    double end;

    [[nodiscard]] int Append(Sample const& sample)
    {
        if (sample.x < farthest || sample.x > end) return 0;
        farthest = sample.x;
        return out.Append(sample);
    }
};

// Appends what comes behind the stretch's start. Halving ends where no parameter is left between the ends.
[[nodiscard]] int AppendStretch(Piece& piece, Stretch const& stretch, unsigned int depth)
{
    double const middleT = 0.5 * (stretch.t0 + stretch.t1);
    bool const canDivide = depth < CRV_MostHalvings && middleT > stretch.t0 && middleT < stretch.t1;
    unsigned char divide = 0;
    if (canDivide) {
        double start[2] = {stretch.start.x, stretch.start.y};
        double end[2] = {stretch.end.x, stretch.end.y};
        if (int const code = piece.test(piece.refCon, depth, stretch.t0, stretch.t1, start, end, piece.curve, &divide))
            return code;
    }
    if (divide == 0) return piece.Append(stretch.end);
    Sample middle{};
    if (int const code = PointAt(piece.curve, middleT, &middle)) return code;
    if (int const code = AppendStretch(piece, {stretch.t0, middleT, stretch.start, middle}, depth + 1)) return code;
    return AppendStretch(piece, {middleT, stretch.t1, middle, stretch.end}, depth + 1);
}

// The parameter at a bound of the span, and the point there: an end of the curve where the bound lies outside.
[[nodiscard]] int FindBound(CRV_Curve const* curve, double x, double* t, Sample* point)
{
    if (int const code = CRV_TFromX(curve, t, x)) return code;
    if (int const code = PointAt(curve, *t, point)) return code;
    if (x > curve->p0[0] && x < curve->p3[0]) point->x = x;  // the solve's rounding isn't to be seen
    return 0;
}

}  // namespace

int CRV_LinearlyInterpolateLine(double const* a, double const* b, double const* point, unsigned char* haveRange,
                                SEQ_Head** list, double* minValue, double bound, double* maxValue)
{
    Polyline const out{list, haveRange, minValue, maxValue};
    if (!a || !b || (point != a && point != b) || !out.IsComplete()) return CRV_Err_NullArgument;
    if (bound != bound) return CRV_Err_NotFinite;
    bool const inside = point == a ? point[0] >= bound : point[0] <= bound;
    double const width = b[0] - a[0];
    if (inside || !(width > 0)) return out.Append({point[0], point[1]});
    double const x = CRVp_Max(a[0], CRVp_Min(b[0], bound));
    return out.Append({x, CRVp_Between(a[1], b[1], (x - a[0]) / width)});
}

int CRV_EvaluateAdaptively(CRV_SampleFunc* sampleFunc, void* refCon, double const* startX, double const* endX,
                           CRV_Curve const* curve, unsigned char* haveRange, double* minValue, double* maxValue,
                           SEQ_Head** list)
{
    Polyline const out{list, haveRange, minValue, maxValue};
    if (!sampleFunc || !startX || !endX || !out.IsComplete()) return CRV_Err_NullArgument;
    if (int const code = CRVp_CheckGraph(curve)) return code;
    Stretch stretch{};
    if (int const code = FindBound(curve, *startX, &stretch.t0, &stretch.start)) return code;
    if (int const code = FindBound(curve, *endX, &stretch.t1, &stretch.end)) return code;
    if (*endX < curve->p0[0] || *startX > curve->p3[0] || stretch.t1 < stretch.t0) return 0;
    if (int const code = out.Append(stretch.start)) return code;
    Piece piece{sampleFunc, refCon, curve, out, stretch.start.x, stretch.end.x};
    return AppendStretch(piece, stretch, 0);
}
