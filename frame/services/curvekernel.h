// The curve kernel: arithmetic of one cubic Bezier segment.
//
// A curve is four control points in the caller's storage. Two kinds are passed:
//
//   temporal   dimension 2. Coordinate 0 (x) is seconds, coordinate 1 (y) a value or a distance along a path.
//              y is read as a function of x; every operation with X or Y in its name wants this kind.
//   spatial    dimension 1 to 4, the coordinates are the components of the value.
//
// The parameter t runs from 0 at p0 to 1 at p3.
//
// Results. 0, or one of the codes below; CRV_BuildArcSpline may also answer 4, out of memory. Nothing is reported.
// On a non-zero result the outputs are untouched unless said otherwise. Finite input never gives a NaN, and no loop
// runs without a fixed bound.
//
// Threads. All operations are pure functions of their arguments, except that CRV_BuildArcSpline writes the table and
// CRV_CurveSetNonDecreasing the curve. Many threads may read one table.
//
// Bits. Only + - * / sqrt and comparisons are used: the same input gives the same bits with every compiler that
// follows IEEE 754 and doesn't fuse multiplications and additions.
//
// Cost. No operation allocates, except CRV_BuildArcSpline.
//
// How y is a function of x. The x axis is taken from p0.x to p3.x, whichever is larger. As long as both handles end
// between the two (influences 0 to 1) x grows with t and each x has one parameter. A handle that reaches beyond the
// segment can make x turn back; then the smallest t whose x reaches the asked x counts, so y may jump, but it is
// always one of the curve's points:
//
//      x   |      __ reached first here, at the smallest t
//          |    /x \       .
//          |   /    \     /
//          |  /      \__ /   never visited: everything below what was reached before
//          |_/___________________ t
//
// An x outside the segment answers as the nearer end, also where the curve swings out. At the x of p3 the answer is p3.
// A segment without extent (p0.x == p3.x) answers p0 at and before its x, and p3 after it.
#pragma once

#include "frame/services/export.h"

struct SEQ_Head;

// Codes of this service; 4, out of memory, is common to all services.
inline constexpr int CRV_Err_NullArgument = 0x1801;  // a pointer that must not be null is null
inline constexpr int CRV_Err_Dimension = 0x1802;     // the operation doesn't take a curve of this dimension
inline constexpr int CRV_Err_NotFinite = 0x1803;     // NaN or infinity came in, or the answer doesn't fit a double
inline constexpr int CRV_Err_OutOfReach = 0x1804;    // no handles carry the curve through the point

// One segment. The points are arrays of `dimension` doubles that the curve doesn't own; p1 and p2 are the handle ends
// as absolute positions. A const curve's points are only read.
struct CRV_Curve {
    short dimension;
    double* p0;
    double* p1;
    double* p2;
    double* p3;
};

// The curve's y at abscissa x. Never leaves the range of the four y. The residual in x is within 1e-13 of the segment's
// length; where x is linear in t (both influences one third) t is computed directly.
// x may be infinite (an end), not NaN.
[[nodiscard]] KFS_SERVICE_API int CRV_EvaluateYFromX(CRV_Curve const* curve, double* y, double x);

// dy/dx at x; x outside the segment gives the slope at that end.
// Where dx/dt and dy/dt vanish together (a handle of length zero, a cusp) the answer is the slope's limit on the curve:
// the quotient of the second derivatives, else of the third, else 0. Where only dx/dt vanishes the tangent is vertical;
// it is answered as if dx/dt were 1e-12 of the segment, a large finite number of the right sign.
// A segment without extent in x has slope 0. A result too large for a double is the largest double.
[[nodiscard]] KFS_SERVICE_API int CRV_Evaluate1dDerivFromX(CRV_Curve const* curve, double* dydx, double x);

// The second derivative of y by x at x, limited at vertical tangents like the first; 0 where the curve has no
// direction (dx/dt and dy/dt vanish together) and on a segment without extent in x.
[[nodiscard]] KFS_SERVICE_API int CRV_Evaluate1dDeriv2FromX(CRV_Curve const* curve, double* d2ydx2, double x);

// The smallest x at which y is reached. The curve must be non-decreasing (see CRV_CurveSetNonDecreasing).
// y at or below p0's answers p0.x, also when all y are equal; y at or above p3's answers p3.x.
[[nodiscard]] KFS_SERVICE_API int CRV_EvaluateXFromY(CRV_Curve const* curve, double* x, double y);

// Every x where dy/dx equals yPrime: `count` of them, 0 to 2, in ascending order in `xs`, which has room for two.
// The ends count: an eased key has slope 0 there. A stretch whose slope is yPrime everywhere (a straight segment) has
// no distinct point and answers 0 points, as does a curve that never has that slope; both are success.
// Points at which the curve has no slope (vertical tangents) and points on a part that turns back in x don't count.
// On failure `count` is 0 where it isn't null.
[[nodiscard]] KFS_SERVICE_API int CRV_EvaluateXFromYPrime(CRV_Curve const* curve, int* count, double* xs,
                                                          double yPrime);

// The parameter, 0 to 1, at which the curve's x coordinate is x. Only x is looked at; dimension 1 and up.
[[nodiscard]] KFS_SERVICE_API int CRV_TFromX(CRV_Curve const* curve, double* t, double x);

// The position at t: `dimension` doubles. t is limited to 0 to 1; at the two the result is p0 and p3 to the bit.
// Each coordinate stays in the range of its four control coordinates. Dimension 1 to 4.
[[nodiscard]] KFS_SERVICE_API int CRV_EvaluatePoint(CRV_Curve const* curve, double* point, double t);

// The derivative by t at full size: at t = 0 it is 3 (p1 - p0). `dimension` doubles; t is limited to 0 to 1.
[[nodiscard]] KFS_SERVICE_API int CRV_EvaluateDeriv(CRV_Curve const* curve, double* vector, double t);

// Splits the curve at t, which is limited to 0 to 1. Dimension 1 to 4. `rows` receives five points of `dimension`
// doubles:
//
//   row 0   left p1       p0 ---- row 0 ---- row 1 ---- row 2 ---- row 3 ---- row 4 ---- p3
//   row 1   left p2       |___________ left ____________|___________ right ___________|
//   row 2   the split
//   row 3   right p1      `rows` may not overlap the curve's points.
//   row 4   right p2
[[nodiscard]] KFS_SERVICE_API int CRV_SubdivideCurve(CRV_Curve const* curve, double* rows, double t);

// Moves p1 and p2 so that y doesn't decrease from p0 to p3. `changed`, which may be null, is set to 1 if a handle was
// moved and left alone otherwise.
//
//   A curve that doesn't decrease in t stays as it is, bit for bit; so does a result of this operation.
//   A handle that starts in the wrong direction becomes flat: it keeps its x and takes its end point's y.
//   A handle that reaches too far is shortened along its own direction, no more than needed: its slope stays and its x
//   moves towards its end point. Two that both reach beyond the opposite value end at that value.
//   Handles between two equal values become flat.
//
// No curve from a high p0 to a low p3 can be non-decreasing: it is treated upside down, so that it falls steadily and
// doesn't swing out. Coordinates are looked at only where a handle has to move: that is when CRV_Err_NotFinite is
// found.
[[nodiscard]] KFS_SERVICE_API int CRV_CurveSetNonDecreasing(CRV_Curve* curve, unsigned char* changed);

// Measures a spatial curve and makes its table from distance to parameter.
//
//   remapTable   in and out, not null. Holds null or a table of an earlier call, which is replaced: left as it is where
//                the curve and the accuracy are the same, else in the same memory where it fits. The table is a list
//                for SEQ_Dispose; its items are private. On failure the older table is gone and null is left.
//   arcLength    out, not null. In the units of the curve's coordinates. On failure 0.
//   accuracy     absolute, in the same units. `arcLength` is that close to the true length, and the point that the
//                table finds for a distance that close to the true one; up to twice as far from it on one curve in some
//                hundred thousand, which all but stands still at an end. Anything smaller than 1e-9 of the control
//                polygon's length, negative or NaN counts as that.
//
// Whatever the accuracy, the table keeps the speed along the path even, so that equal distances stay equal steps: of a
// thousand, each is as long as the others to 1e-3. A curve whose points coincide has length 0 and a table that answers 0.
// Dimension 1 to 4.
//
// Cost: 0.5 to 2 microseconds and 400 to 900 bytes, one allocation; 32 bytes for each place at which the path is cut.
// At an accuracy of 1e-6 of the path's size a gentle segment needs some 13 of them, the median of a hundred thousand
// segments of all kinds 22 and the worst 100; the finest accuracy needs three times as many.
[[nodiscard]] KFS_SERVICE_API int CRV_BuildArcSpline(CRV_Curve const* curve, SEQ_Head*** remapTable, double* arcLength,
                                                     double accuracy);

// The parameter at distance s from p0, by the table of CRV_BuildArcSpline.
//
//   curve        the same segment, in coordinates that may be scaled otherwise than those that were measured.
//   remapTable   address of the table, only read. Where the table is null (an update was held off) `curve` itself is
//                measured, at the cost of building a table.
//   s            in the units of the measured curve; limited to 0 to the arc length, whose answer is exactly `one`.
//   one          the parameter at p3: the answer runs from 0 to this. Callers pass 1.0.
//
// SEQ_Err_BadList for a list that isn't such a table.
[[nodiscard]] KFS_SERVICE_API int CRV_TFromSSpline(CRV_Curve const* curve, SEQ_Head*** remapTable, double* t, double s,
                                                   double one);

// ---- polylines
//
// Both append points (x, y), two doubles each, to a caller's list of 16-byte items, in the order of x; a point that the
// list already ends in isn't repeated. `minValue` and `maxValue` follow the y of the points once `haveRange` isn't 0,
// which the first point makes it. What was appended before a failure stays. Errors: the first three codes above; SEQ_Insert's.

// Whether a stretch of a curve is to be halved, which the caller decides: `divide` comes in as 0.
//
//   depth       how often it has been halved so far; at CRV_MostHalvings nobody asks any more
//   t0, t1      the parameters of its ends
//   start, end  its ends (x, y)
//
// Another result than 0 ends the work and is its result.
using CRV_SampleFunc = int(void* refCon, unsigned int depth, double t0, double t1, double* start, double* end,
                           CRV_Curve const* curve, unsigned char* divide);
inline constexpr unsigned int CRV_MostHalvings = 40;

// One point of the line from `a` to `b`, which isn't right of it: `point`, one of the two, or where it lies beyond the
// bound the line's point there. `bound` limits `a` from the left and `b` from the right.
[[nodiscard]] KFS_SERVICE_API int CRV_LinearlyInterpolateLine(double const* a, double const* b, double const* point,
                                                              unsigned char* haveRange, SEQ_Head** list,
                                                              double* minValue, double bound, double* maxValue);

// The part of a graph from `*startX` to `*endX`, its ends included; nothing where the two don't meet.
[[nodiscard]] KFS_SERVICE_API int CRV_EvaluateAdaptively(CRV_SampleFunc* sampleFunc, void* refCon, double const* startX,
                                                         double const* endX, CRV_Curve const* curve,
                                                         unsigned char* haveRange, double* minValue, double* maxValue,
                                                         SEQ_Head** list);

// ---- drags

// What is dragged by one of its points.
enum CRV_Drag : unsigned char {
    CRV_Drag_Path,        // a spatial curve, dimension 1 to 4
    CRV_Drag_Graph,       // a temporal curve
    CRV_Drag_RisingGraph  // a temporal curve that may not turn back in y, see CRV_CurveSetNonDecreasing
};

// A drag. The caller provides it and says in `kind` what is dragged, before the setup.
struct CRV_DirectManipState {
    CRV_Drag kind;
    double t;  // of the point that is held
};

// Prepares a drag by the point at t, which is limited to 0 to 1. The state serves any number of curves and targets.
[[nodiscard]] KFS_SERVICE_API int CRV_DirectManipSetup(CRV_DirectManipState* state, double t);

// Moves the handles, together as little as possible, so that the curve passes through a point. p0 and p3 stay.
//
//   target   of a path: the point, `dimension` doubles. The path has it at t.
//            Of a graph: how far in x and in y the point at t goes. The graph has it at its new x, at another t than
//            before if it went in x or if a handle changed its length.
//   p1, p2   out: the handles as whoever stores them wants them, no curve any more:
//              a path     p2 is the first handle seen from p0, p1 the second one seen from p3
//              a graph    p1 is the first handle seen from p0; p2.y is the second one's height over p3, and p2.x stays a
//                         place on the x axis
//
// A graph's handles keep their x, but for two cases. They come to end between 1e-4 of the segment from their own end point
// and the opposite one, so that x grows with t and a handle can be stored as a slope and a length. And where the graph
// all but stands upright at the point they become shorter, since no x is exact enough to find a point there.
//
// On failure the curve stays as it was. CRV_Err_OutOfReach: the point is at an end of the curve and isn't to stay there, or
// leaves the segment in x, or a rising graph would have to turn back. CRV_Err_NotFinite: also where a handle or its slope
// wouldn't be finite.
[[nodiscard]] KFS_SERVICE_API int CRV_DirectManipCurve(CRV_Curve* curve, double const* target,
                                                       CRV_DirectManipState const* state);
