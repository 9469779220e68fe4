// The table from distance to parameter of one path segment.
//
// The path is cut into pieces so short that t is a quintic of the distance on each, joined so that t, dt/ds and d2t/ds2
// agree: the speed along the path then has no corners. Where the path stands still (a handle of length zero, a cusp)
// the distance starts like the square of t; a piece next to such a place is a quintic of the distance's square root.
//
// What a table costs a read is the cache lines that it touches, so a place between two pieces is kept once, and the
// distances that are searched lie together at the front:
//
//      scale | start of knot 0 .. n-1 | t, slope, bend of knot 0 .. n-1 | what was measured: 7 doubles
#pragma once

#include "frame/services/curvekernel.h"

#include <cmath>

// A place on the path.
//   slope > 0   dt/ds there; `bend` is d2t/ds2
//   slope < 0   the path stands still: at a distance of s from there t has moved on by -slope sqrt(s) + bend s / 2, or
//               back by -slope sqrt(s) - bend s / 2
//   slope == 0  t is a straight line of the distance up to the next knot, which says nothing about the piece before
struct CRVp_ArcKnot {
    double t;
    double slope;
    double bend;
};

// The list's item: four doubles are what a knot takes. The items are one run of doubles; which double lies in which
// item means nothing.
struct CRVp_ArcItem {
    double words[4];
};

// The squared speed, a polynomial of degree 4 in t, the length of the control polygon, and the accuracy asked for, all
// scaled: a table is a function of these, so that a curve with the same ones needs no new table.
inline constexpr int CRVp_ArcInputs = 7;
inline constexpr int CRVp_ArcItemsBesideKnots = 2;
static_assert(1 + CRVp_ArcInputs == 4 * CRVp_ArcItemsBesideKnots);

// Two knots at least: the start and the end.
inline constexpr int CRVp_FewestArcItems = CRVp_ArcItemsBesideKnots + 2;

// What a table can hold: twice what the worst of 30,000 segments needs at the finest tolerance.
inline constexpr int CRVp_MostArcKnots = 512;

// The piece in which `s` lies, 0 to `count` - 1: the last one that starts at or before it, without branches that depend
// on `s`.
inline int CRVp_ArcPieceAt(double const* starts, int count, double s)
{
    constexpr int Counted = 16;
    int first = 0;
    while (count > Counted) {
        int const half = count / 2;
        first += starts[first + half] <= s ? half : 0;
        count -= half;
    }
    int piece = first;
    for (int i = 1; i < count; ++i) piece += starts[first + i] <= s;
    return piece;
}

// The quintic with these values, first and second derivatives at 0 and 1.
struct CRVp_ArcQuintic {
    double value, slope, halfBend, third, fourth, fifth;  // the coefficients, the fourth with the other sign

    CRVp_ArcQuintic(double f0, double d0, double dd0, double f1, double d1, double dd1)
        : value(f0),
          slope(d0),
          halfBend(0.5 * dd0)
    {
        double const rise = f1 - f0 - d0 - halfBend;
        double const change = d1 - d0 - dd0;
        double const bend = dd1 - dd0;
        // The three have the same pattern of signs on purpose: where signs alternate, gcc 12 fuses multiplication and
        // addition on machines that can, also under -ffp-contract=off, and the bits would depend on the machine.
        third = 10.0 * rise - 4.0 * change + 0.5 * bend;
        fourth = 15.0 * rise - 7.0 * change + bend;
        fifth = 6.0 * rise - 3.0 * change + 0.5 * bend;
    }
    double At(double r) const
    {
        double const rr = r * r;
        return (value + slope * r) + rr * (halfBend + r * (third + r * (fifth * r - fourth)));
    }
    double SlopeAt(double r) const
    {
        double const rr = r * r;
        return (slope + 2.0 * halfBend * r) + rr * (3.0 * third + r * (5.0 * fifth * r - 4.0 * fourth));
    }
};

// t between two moving knots, by the share of the length.
inline CRVp_ArcQuintic CRVp_EvenQuintic(CRVp_ArcKnot const& from, CRVp_ArcKnot const& to, double length)
{
    return {from.t, from.slope * length, from.bend * length * length,
            to.t,   to.slope * length,   to.bend * length * length};
}

// t between a standstill and a moving knot, by the square root of the share of the length, measured from the
// standstill. `side` is 1 where the standstill comes first, else -1.
inline CRVp_ArcQuintic CRVp_RootQuintic(CRVp_ArcKnot const& still, CRVp_ArcKnot const& moving, double length,
                                        double side)
{
    double const end = side * 2.0 * length * moving.slope;
    return {still.t, -side * still.slope * std::sqrt(length),    still.bend * length, moving.t,
            end,     end + 4.0 * (moving.bend * length * length)};
}

// The parameter on the piece next to a standstill, at share `r` of its length.
double CRVp_TNextToStandstill(CRVp_ArcKnot const& from, CRVp_ArcKnot const& to, double length, double r);

// The length that a table's items measured.
inline double CRVp_ArcLength(double const* words, int items)
{
    return words[items - CRVp_ArcItemsBesideKnots] / words[0];
}

// The parameter at s in a table's items: any s that isn't NaN.
inline double CRVp_TAtDistance(double const* words, int items, double s)
{
    int const count = items - CRVp_ArcItemsBesideKnots;
    double const* const starts = words + 1;
    auto const* const knots = reinterpret_cast<CRVp_ArcKnot const*>(starts + count);

    s *= words[0];
    if (s >= starts[count - 1]) return knots[count - 1].t;
    if (s <= 0.0) return 0.0;
    int const piece = CRVp_ArcPieceAt(starts, count - 1, s);
    CRVp_ArcKnot const& from = knots[piece];
    CRVp_ArcKnot const& to = knots[piece + 1];
    double const length = starts[piece + 1] - starts[piece];
    double const r = (s - starts[piece]) / length;  // a piece without length is never found

    double t = 0.0;
    if ((from.slope > 0.0) & (to.slope > 0.0)) [[likely]]
        t = CRVp_EvenQuintic(from, to, length).At(r);
    else if (from.slope == 0.0)
        t = from.t + (to.t - from.t) * r;
    else
        t = CRVp_TNextToStandstill(from, to, length, r);
    return t < from.t ? from.t : t > to.t ? to.t : t;
}

// A table in the making, small enough for any thread's stack.
struct CRVp_ArcTable {
    int items = 0;
    double length = 0.0;
    double words[4 * (CRVp_MostArcKnots + CRVp_ArcItemsBesideKnots)];
};

// What a curve's table follows from, with the scale that makes it safe to square coordinates (a power of two, 1 for
// nearly all curves).
struct CRVp_ArcMeasured {
    double scale;
    double inputs[CRVp_ArcInputs];
};

// 0, or what CRVp_CheckPath or the coordinates object to.
[[nodiscard]] int CRVp_PrepareArc(CRV_Curve const* curve, double accuracy, CRVp_ArcMeasured& measured);

// Makes the table. 0, or CRV_Err_NotFinite where the length doesn't fit a double.
[[nodiscard]] int CRVp_MeasureArc(CRVp_ArcMeasured const& measured, CRVp_ArcTable& table);
