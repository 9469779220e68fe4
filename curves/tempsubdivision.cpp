// The arithmetic of a temporal split. It knows no stream, and serves components and speed graphs alike.
#include "curves/segment_private.h"
#include "curves/subdivide_private.h"

#include <cmath>

namespace {

// Where a linear side's handle ends before the later key. Not the same number as 1 - KFSp_OneSixth, from which reads
// take it: the split has its own literal.
constexpr double FiveSixths = 0.83333333333;

using Runs = KFSp_TemporalRuns<double>;

struct Point {
    double x;
    double y;
};

// What is to be split: one component between two keys.
struct Split {
    double x;
    double dt;
    bool prevLinear;
    bool nextLinear;
};

void FillCurve(Split const& split, Runs const& prev, Runs const& next, int i, CRV_Curve const& curve)
{
    KFSp_TemporalEnd const a{prev.value[i], prev.outSpeed[i], prev.outInfluence[i], !split.prevLinear};
    KFSp_TemporalEnd const b{next.value[i], next.inSpeed[i], next.inInfluence[i], !split.nextLinear};
    KFSp_FillTemporalSegment(a, b, split.dt, curve);
    if (split.nextLinear) curve.p2[0] = FiveSixths * split.dt;
}

double Slope(Point const& a, Point const& b)
{
    return a.x == b.x ? 0.0 : (b.y - a.y) / (b.x - a.x);
}

// The halves' handles as speeds and influences. `rows` is the kernel's: left p1, left p2, the split, right p1, right
// p2.
void StoreHalves(Split const& split, CRV_Curve const& curve, Point const (&rows)[5], int i, Runs const& prev,
                 Runs const& next, Runs const& out)
{
    double const x = split.x;
    Point const at{x, rows[2].y};
    Point const start{curve.p0[0], curve.p0[1]};
    Point const end{curve.p3[0], curve.p3[1]};
    out.value[i] = at.y;
    out.inSpeed[i] = Slope(rows[1], at);
    out.inInfluence[i] = std::fabs((rows[1].x - x) / x);
    out.outSpeed[i] = Slope(at, rows[3]);
    out.outInfluence[i] = std::fabs((rows[3].x - x) / (split.dt - x));
    prev.outSpeed[i] = Slope(start, rows[0]);
    prev.outInfluence[i] = std::fabs((rows[0].x - start.x) / x);
    next.inSpeed[i] = Slope(rows[4], end);
    next.inInfluence[i] = std::fabs((rows[4].x - end.x) / (x - split.dt));
}

int SplitComponent(Split const& split, CRV_Curve const& curve, int i, Runs const& prev, Runs const& next,
                   Runs const& out)
{
    double t = 0.0;
    if (int const code = CRV_TFromX(&curve, &t, split.x); code != 0) return code;
    double rows[10];
    if (int const code = CRV_SubdivideCurve(&curve, rows, t); code != 0) return code;
    Point const points[5] = {
        {rows[0], rows[1]}, {rows[2], rows[3]}, {rows[4], rows[5]}, {rows[6], rows[7]}, {rows[8], rows[9]}};
    StoreHalves(split, curve, points, i, prev, next, out);
    return 0;
}

// A key with no curve on one side or on both stands still.
void Rest(int dimension, double const* neighbour, Runs const& out)
{
    for (int i = 0; i < dimension; ++i) {
        out.value[i] = neighbour ? neighbour[i] : 0.0;
        out.inSpeed[i] = 0.0;
        out.outSpeed[i] = 0.0;
        out.inInfluence[i] = KFSp_OneSixth;
        out.outInfluence[i] = KFSp_OneSixth;
    }
}

}  // namespace

int KFSp_ComputeTempSubdivision(short dimension, double x, double dt, unsigned char nonDecreasing, bool prevLinear,
                                bool nextLinear, double* prev, double* next, double* out)
{
    Runs const outRuns(out, dimension);
    if (!prev || !next) {
        Rest(dimension, prev ? prev : next, outRuns);
        return 0;
    }
    Split const split{x, dt, prevLinear, nextLinear};
    Runs const prevRuns(prev, dimension);
    Runs const nextRuns(next, dimension);
    int result = 0;
    unsigned char changed = 0;
    for (int i = 0; i < dimension; ++i) {
        KFSp_SegmentCurve segment(2);
        FillCurve(split, prevRuns, nextRuns, i, segment.curve);
        // A component that is made non-decreasing forgets the failure of the one before.
        if (nonDecreasing != 0) result = CRV_CurveSetNonDecreasing(&segment.curve, &changed);
        // Set for good by the first component that had to be changed.
        if (changed != 0) {
            prevRuns.outInfluence[i] = std::fabs((segment.p1[0] - segment.p0[0]) / dt);
            nextRuns.inInfluence[i] = std::fabs((segment.p2[0] - segment.p3[0]) / dt);
        }
        if (result == 0) result = SplitComponent(split, segment.curve, i, prevRuns, nextRuns, outRuns);
    }
    return result;
}
