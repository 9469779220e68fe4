// The table from distance to parameter of one path segment.
//
// The path is cut into pieces so short that t is a quintic of the distance on each, joined so that t, dt/ds and d2t/ds2
// agree: the speed along the path then has no corners. Where the path stands still (a handle of length zero, a cusp)
// the distance starts like the square of t; a piece next to such a place is a quintic of the distance's square root.
#pragma once

#include "frame/services/curvekernel.h"

#include <cmath>

// An item of the table. A piece answers for distances from `start` up to the next one's start.
struct CRVp_ArcPiece {
    double start;  // distance from p0
    double offset,
        rate;        // v = offset + rate (s - start): 0 to 1 along the piece, or 1 to 0 where it ends standing still
    double c[6];     // t = c[0] + c[1] r + ... + c[5] r^5
    long long root;  // r is v, or its square root if not 0

    double TAt(double s) const
    {
        double r = offset + rate * (s - start);
        if (root != 0) r = std::sqrt(r > 0.0 ? r : 0.0);
        return ((((c[5] * r + c[4]) * r + c[3]) * r + c[2]) * r + c[1]) * r + c[0];
    }
};

// What a table can hold. At a tolerance of 1e-4 of the control polygon a gentle segment needs 5 items, a random one 20,
// and the worst of a hundred thousand had 123; at the finest tolerance the worst of five thousand
// had 233. The last item is the end, where t is 1.
inline constexpr int CRVp_MostArcPieces = 384;

// A table in the making, small enough for any thread's stack.
struct CRVp_ArcTable {
    int count = 0;
    double length = 0.0;
    CRVp_ArcPiece pieces[CRVp_MostArcPieces];
};

// Measures the curve: CRV_BuildArcSpline without the list. 0, or what CRVp_CheckPath or the coordinates object to.
int CRVp_MeasureArc(CRV_Curve const* curve, double accuracy, CRVp_ArcTable& table);

// The parameter at s in a table of at least one piece. Any s that isn't NaN.
inline double CRVp_TAtDistance(CRVp_ArcPiece const* pieces, int count, double s)
{
    const double end = pieces[count - 1].start;
    s = s < 0.0 ? 0.0 : s > end ? end : s;

    // The last piece that starts at or before s, without branches.
    CRVp_ArcPiece const* piece = pieces;
    while (count > 1) {
        const int half = count / 2;
        piece += piece[half].start <= s ? half : 0;
        count -= half;
    }
    const double t = piece->TAt(s);
    return t < 0.0 ? 0.0 : t > 1.0 ? 1.0 : t;
}
