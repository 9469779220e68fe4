// Measuring a path: from control points to the knots of its table.
//
// The squared speed of a cubic is a polynomial of degree 4, so nothing below depends on the dimension. A piece may be
// about as long as the distance, in the complex plane, to the next place where that polynomial is 0: steps go from the
// slow end of a stretch to its fast end, and each step's error says how long the next one may be.

#include "services/curvekernel/arctable_private.h"
#include "services/curvekernel/curve_private.h"

#include <algorithm>
#include <bit>
#include <cstdint>
#include <iterator>
#include <utility>

namespace {

// Speed may be off by this share inside a piece, whatever the accuracy asked for.
constexpr double SpeedTolerance = 3e-4;

// A stretch shorter than this share of the control polygon is a step that nobody sees: it isn't cut further, and a
// place whose slow surroundings are that short counts as standing still.
constexpr double Negligible = 1e-7;

// The smallest accuracy that is worth pieces, as a share of the control polygon.
constexpr double FinestAccuracy = 1e-9;

// Positions between two samples of the speed error stay below this share of its maximum times the piece's length: the
// error of a Hermite quintic, v^3 (1-v)^3, stands at 0.29 of its steepest slope. What a piece may use of the accuracy
// leaves the rest to the errors that the samples don't see, and to those of the lengths.
constexpr double ErrorShare = 0.35;
constexpr double Steepest = 0.276;
constexpr double AccuracyShare = 0.4;

// What differs by less than this share differs by rounding. A line that doesn't turn back is as long as its chord, so
// that whole numbers stay whole.
constexpr double RoundingShare = 1e-14;

// The squared speed q0 + q1 t + ... + q4 t^4. Rounding is 1e-16 of the largest coefficient, in the speed less than what
// makes a standstill.
class SquaredSpeed {
public:
    explicit SquaredSpeed(double const* q) : q_{q[0], q[1], q[2], q[3], q[4]} {}

    double At(double t) const
    {
        double const square = (((q_[4] * t + q_[3]) * t + q_[2]) * t + q_[1]) * t + q_[0];
        return square > 0.0 ? square : 0.0;
    }
    // The derivatives by t, the first and second halved, the third by 6.
    double HalfSlope(double t) const { return ((2.0 * q_[4] * t + 1.5 * q_[3]) * t + q_[2]) * t + 0.5 * q_[1]; }
    double HalfBend(double t) const { return (6.0 * q_[4] * t + 3.0 * q_[3]) * t + q_[2]; }
    double SixthJerk(double t) const { return 4.0 * q_[4] * t + q_[3]; }

    // The length from one parameter to another, by Gauss and Legendre's five points.
    double Length(double from, double to) const
    {
        constexpr double Inner = 0.53846931010568309104, Outer = 0.90617984593866399280;
        constexpr double InnerWeight = 0.47862867049936646804, OuterWeight = 0.23692688505618908751;
        constexpr double MiddleWeight = 0.56888888888888888889;
        double const half = 0.5 * (to - from);
        double const middle = from + half;
        double const outer = std::sqrt(At(middle - Outer * half)) + std::sqrt(At(middle + Outer * half));
        double const inner = std::sqrt(At(middle - Inner * half)) + std::sqrt(At(middle + Inner * half));
        return half * (MiddleWeight * std::sqrt(At(middle)) + (InnerWeight * inner + OuterWeight * outer));
    }

    // The slowest places inside, ascending: at most two.
    int Slowest(double (&places)[2]) const
    {
        // Between the turns of the slope it has one root at most.
        double bounds[4] = {0.0, 0.0, 0.0, 0.0};
        int count = 1;
        double const a = 6.0 * q_[4], b = 1.5 * q_[3], c = q_[2];  // a t^2 + 2 b t + c
        double const discriminant = b * b - a * c;
        if (discriminant > 0.0) {
            double const root = std::sqrt(discriminant);
            double const q = b < 0.0 ? root - b : -(root + b);
            double first = q / a;
            double second = c / q;
            if (second < first) std::swap(first, second);
            if (first > 0.0 && first < 1.0) bounds[count++] = first;
            if (second > 0.0 && second < 1.0) bounds[count++] = second;
        }
        bounds[count] = 1.0;
        int found = 0;
        for (int i = 0; i < count && found < 2; ++i)
            if (HalfSlope(bounds[i]) < 0.0 && HalfSlope(bounds[i + 1]) > 0.0)
                places[found++] = SlopeRoot(bounds[i], bounds[i + 1]);
        return found;
    }

private:
    // Newton steps, bisection where one leaves the bracket; a root of multiplicity 3 takes the most.
    double SlopeRoot(double low, double high) const
    {
        double t = low + 0.5 * (high - low);
        for (int step = 0; step < 60; ++step) {
            double const f = HalfSlope(t);
            if (f < 0.0)
                low = t;
            else
                high = t;
            double next = t - f / HalfBend(t);
            if (!(next >= low && next <= high)) next = low + 0.5 * (high - low);
            if (std::fabs(next - t) <= 0x1p-52) return next;
            t = next;
        }
        return t;
    }

    double q_[5];
};

// A place, and how the path leaves it: speed and its first two derivatives by t. At a standstill the speed is 0 and the
// derivatives are those to the right; to the left they have the other sign.
struct Place {
    CRVp_ArcKnot knot;
    double square;
    double speed, first, second;
    double reach;  // about how far away, by t, the path could stand still for all that is known here

    bool IsStill() const { return knot.slope < 0.0; }
};

// The N-th root, a few per cent off: an N-th of the exponent and, near enough, of the rest. For x >= 0; what comes of 0
// or infinity is very small or very large.
template <unsigned N>
double RoughRoot(double x)
{
    constexpr std::uint64_t one = std::bit_cast<std::uint64_t>(1.0);
    return std::bit_cast<double>(std::bit_cast<std::uint64_t>(x) / N + (one - one / N));
}

// Cuts a path into pieces.
class Cutter {
public:
    explicit Cutter(double const (&inputs)[CRVp_ArcInputs])
        : speed_(inputs),
          loadByShift_(ErrorShare / (AccuracyShare * inputs[6])),
          polygon_(inputs[5]),
          negligible_(CRVp_Min(Negligible * inputs[5], 0.1 * inputs[6]))
    {}

    void Run()
    {
        Place const start = PlaceAt(0.0);
        Place const end = PlaceAt(1.0);
        double slow[2];
        int const count = speed_.Slowest(slow);
        knots_[0] = start.knot;
        Place from = start;
        for (int i = 0; i < count; ++i) {
            Place const at = PlaceAt(slow[i]);
            // A gentle minimum needs no cut.
            if (at.square > Sharp * CRVp_Max(start.square, end.square)) continue;
            CutStretch(from, at);
            from = at;
        }
        CutStretch(from, end);
    }

    void Write(CRVp_ArcTable& table) const
    {
        int count = count_ + 1;
        for (int i = 1; i < count_; ++i) count += IsKeptTwice(i);
        table.items = count + CRVp_ArcItemsBesideKnots;
        double* const starts = table.words + 1;
        double* word = starts + count;
        double s = 0.0;
        int at = 0;
        auto const put = [&](CRVp_ArcKnot const& knot) {
            starts[at++] = s;
            *word++ = knot.t;
            *word++ = knot.slope;
            *word++ = knot.bend;
        };
        for (int i = 0; i < count_; ++i) {
            if (i > 0 && IsKeptTwice(i)) put(knots_[i]);
            put(straight_[i] ? CRVp_ArcKnot{knots_[i].t, 0.0, 0.0} : knots_[i]);
            s += lengths_[i];
        }
        // Next to the polygon's length the path is a line that doesn't turn back, up to far less than any accuracy.
        if (std::fabs(polygon_ - s) <= 0.1 * FinestAccuracy * polygon_) s = polygon_;
        put(straight_[count_ - 1] ? CRVp_ArcKnot{1.0, 0.0, 0.0} : knots_[count_]);
    }

private:
    static constexpr int MostPieces = CRVp_MostArcKnots / 3 * 2 - 1;  // each second knot may be kept twice
    static constexpr int KeptBack = 8;                                // pieces for the stretches that come
    static constexpr int MostTrials = 4 * MostPieces;
    static constexpr double Sharp = 0.05;
    static constexpr double Aside = 1e-3;  // 3e-4 of the speed from some ten-thousandth of the path on

    // The end of a curved piece and the start of a straight one are two knots.
    bool IsKeptTwice(int i) const { return straight_[i] && !straight_[i - 1]; }

    Place PlaceAt(double t) const
    {
        double const square = speed_.At(t);
        double const halfSlope = speed_.HalfSlope(t);
        double const halfBend = speed_.HalfBend(t);
        // Near its minimum the speed is sqrt(square + halfBend tau^2), which is slow over square / sqrt(halfBend). At an
        // end of the path the minimum may lie aside, twice the way to it being halfSlope^2 / halfBend^1.5. What the
        // standstill is off by that way falls only with the distance's square root, so it has to be far shorter.
        double const slow = 0.25 * negligible_;
        double const aside = Aside * slow;
        double const squaredSlope = halfSlope * halfSlope;
        if (halfBend > 0.0 && square * square <= slow * slow * halfBend &&
            squaredSlope * squaredSlope <= aside * aside * halfBend * halfBend * halfBend) {
            double const first = std::sqrt(halfBend);
            double const sixthJerk = speed_.SixthJerk(t);
            double const second = sixthJerk / first;
            CRVp_ArcKnot const knot{t, -std::sqrt(2.0 / first), -(second / first) * (2.0 / first) / 3.0};
            return {knot, 0.0, 0.0, first, second, halfBend / CRVp_Max(std::fabs(sixthJerk), halfBend / Farthest)};
        }
        double const speed = std::sqrt(square);
        double const inverse = 1.0 / speed;
        double const first = halfSlope * inverse;
        double const way = std::fabs(first) + RoughRoot<2>(first * first + std::fabs(halfBend));
        // 0 over 0 where the speed vanishes like the square of t, or more; nothing is known there.
        double const reach = speed > Farthest * way ? Farthest : square > 0.0 ? speed / way : 0.25;
        CRVp_ArcKnot const knot{t, inverse, -(first * inverse) * inverse * inverse};
        return {knot, square, speed, first, (halfBend - first * first) * inverse, reach};
    }

    // From a slow end towards a fast one; from both ends where the middle is faster than either.
    void CutStretch(Place const& from, Place const& to)
    {
        double const middle = from.knot.t + 0.5 * (to.knot.t - from.knot.t);
        if (CRVp_Max(from.square, to.square) <= Sharp * speed_.At(middle)) {
            Place const between = PlaceAt(middle);
            Walk<true>(from, between);
            WalkBack(between, to);
        } else if (from.square <= to.square) {
            Walk<true>(from, to);
        } else {
            WalkBack(from, to);
        }
    }

    // The pieces from `from` to `to`, found from `to` on.
    void WalkBack(Place const& from, Place const& to)
    {
        int const first = count_;
        Walk<false>(to, from);
        std::reverse(lengths_ + first, lengths_ + count_);
        std::reverse(straight_ + first, straight_ + count_);
        std::reverse(knots_ + first + 1, knots_ + count_);
        knots_[first] = from.knot;
        knots_[count_] = to.knot;
    }

    // Adds the pieces from a place to the goal, on either side of it.
    //
    // A step is a share of the place's reach. What a step's load says of the share counts for the step after the next:
    // the next one then doesn't wait for it.
    template <bool forward>
    void Walk(Place near, Place const& goal)
    {
        double share = FirstShare;
        double laterShare = FirstShare;
        for (bool arrived = false; !arrived;) {
            double const rest = std::fabs(goal.knot.t - near.knot.t);
            double const step = share * near.reach;
            bool const forced = count_ >= MostPieces - KeptBack || trials_ >= MostTrials;
            bool const last = forced || rest <= step;
            // The last steps are equal, so that none is a sliver.
            double const h = last ? rest : rest < 4.0 * step ? rest / (1 + static_cast<int>(rest / step)) : step;
            Place const far = last ? goal : PlaceAt(forward ? near.knot.t + h : near.knot.t - h);
            ++trials_;
            Place const& from = forward ? near : far;
            Place const& to = forward ? far : near;
            double const length = speed_.Length(from.knot.t, to.knot.t);
            bool const straight = forced || length <= negligible_;
            double const load = straight ? 0.0 : Load(from, to, length);
            double const taken = h / near.reach;
            if (load <= 1.0) {
                straight_[count_] = straight;
                lengths_[count_] = length;
                knots_[++count_] = far.knot;
                near = far;
                arrived = last;
                share = straight ? FirstShare : laterShare;
                laterShare =
                    straight ? FirstShare : taken * CRVp_Min(MostGrowth, Caution * RoughRoot<6>(1.0 / (load + 1e-6)));
            } else if (load < Unknown) {
                share = taken * CRVp_Min(0.8, Caution * RoughRoot<6>(1.0 / load));
                laterShare = share;
            } else {
                near.reach *= 0.25 * CRVp_Min(1.0, taken);  // less is known there than it seemed
            }
        }
    }

    // What a piece uses of what it may be off by; above 1 it is too long. Unknown where it isn't known at all.
    double Load(Place const& from, Place const& to, double length) const
    {
        constexpr double OneIn120 = 1.0 / 120.0;
        if (from.IsStill() && to.IsStill()) return Unknown;

        // The integral by the end values is of the order of the quintic, Gauss's far better: where they agree this well
        // there is nothing between the samples that either has missed.
        double const h = to.knot.t - from.knot.t;
        double const toSign = to.IsStill() ? -1.0 : 1.0;
        double const byEnds =
            h * (0.5 * (from.speed + to.speed) +
                 h * (0.1 * (from.first - toSign * to.first) + h * OneIn120 * (from.second + toSign * to.second)));
        if (!(std::fabs(byEnds - length) <= SpeedTolerance * length)) return Unknown;

        bool const root = from.IsStill() || to.IsStill();
        CRVp_ArcQuintic const t = !root            ? CRVp_EvenQuintic(from.knot, to.knot, length)
                                  : from.IsStill() ? CRVp_RootQuintic(from.knot, to.knot, length, 1.0)
                                                   : CRVp_RootQuintic(to.knot, from.knot, length, -1.0);
        double const inverse = 1.0 / (length * length);
        double worst = 0.0;
        for (double const r : {Steepest, 1.0 - Steepest}) {
            double const slope = t.SlopeAt(r);
            double const even = root ? inverse / (4.0 * r * r) : inverse;
            double const error = 0.5 * std::fabs(slope * slope * speed_.At(t.At(r)) * even - 1.0);
            if (!(error < 1.0)) return Unknown;
            worst = CRVp_Max(worst, error);
        }
        return CRVp_Min(0.5 * Unknown, worst * CRVp_Max(1.0 / SpeedTolerance, length * loadByShift_));
    }

    static constexpr double Unknown = 1e5;
    static constexpr double Farthest = 4.0;  // more is as good as everywhere
    static constexpr double FirstShare = 0.6;
    static constexpr double MostGrowth = 3.0;
    static constexpr double Caution = 0.9;

    SquaredSpeed speed_;
    double loadByShift_;  // of a speed error along the piece's length
    double polygon_;
    double negligible_;
    int count_ = 0;
    int trials_ = 0;
    CRVp_ArcKnot knots_[MostPieces + 1];
    double lengths_[MostPieces];
    bool straight_[MostPieces];
};

// A power of two that brings the coordinates to where no product of squares overflows or vanishes; 1 for nearly all.
// Even, so that the square root of the scale is one too.
double ScaleFor(CRV_Curve const* curve)
{
    double step = 0.0;
    for (int i = 0; i < curve->dimension; ++i) {
        double const low = CRVp_Min(CRVp_Min(curve->p0[i], curve->p1[i]), CRVp_Min(curve->p2[i], curve->p3[i]));
        double const high = CRVp_Max(CRVp_Max(curve->p0[i], curve->p1[i]), CRVp_Max(curve->p2[i], curve->p3[i]));
        step = CRVp_Max(step, 0.5 * high - 0.5 * low);
    }
    if (step == 0.0 || (step > 0x1p-100 && step < 0x1p100)) return 1.0;
    int const exponent = std::ilogb(step) / 2 * 2;
    return std::ldexp(1.0, -std::clamp(exponent, -1000, 1000));
}

double SquaredChord(CRV_Curve const* curve, double scale)
{
    double squares = 0.0;
    for (int i = 0; i < curve->dimension; ++i) {
        double const step = scale * curve->p3[i] - scale * curve->p0[i];
        squares += step * step;
    }
    return squares;
}

}  // namespace

int CRVp_PrepareArc(CRV_Curve const* curve, double accuracy, CRVp_ArcMeasured& measured)
{
    if (int const code = CRVp_CheckPath(curve)) return code;
    if (!CRVp_AllFinite(curve)) return CRV_Err_NotFinite;

    double const scale = ScaleFor(curve);
    double const* const points[] = {curve->p0, curve->p1, curve->p2, curve->p3};
    double steps[3][CRVp_MostCurveDimensions];
    double polygon = 0.0;
    for (int k = 0; k < 3; ++k) {
        double squares = 0.0;
        for (int i = 0; i < curve->dimension; ++i) {
            steps[k][i] = scale * points[k + 1][i] - scale * points[k][i];
            squares += steps[k][i] * steps[k][i];
        }
        polygon += std::sqrt(squares);
    }
    // The derivative by t is g0 + g1 t + g2 t^2.
    double q0 = 0.0, q1 = 0.0, q2 = 0.0, q3 = 0.0, q4 = 0.0;
    for (int i = 0; i < curve->dimension; ++i) {
        double const g0 = 3.0 * steps[0][i];
        double const g1 = 6.0 * (steps[1][i] - steps[0][i]);
        double const g2 = 3.0 * ((steps[2][i] - steps[1][i]) - (steps[1][i] - steps[0][i]));
        q0 += g0 * g0;
        q1 += g0 * g1;
        q2 += g1 * g1 + 2.0 * g0 * g2;
        q3 += g1 * g2;
        q4 += g2 * g2;
    }
    q1 *= 2.0;
    q3 *= 2.0;
    double const squaredChord = SquaredChord(curve, scale);
    double const chord = std::sqrt(squaredChord);
    if (polygon - chord <= RoundingShare * polygon) polygon = chord;
    if (std::fabs(q1) + std::fabs(q2) + std::fabs(q3) + std::fabs(q4) <= RoundingShare * q0) {
        q0 = squaredChord;
        q1 = q2 = q3 = q4 = 0.0;
    }
    double const finest = FinestAccuracy * polygon;
    double const asked = accuracy * scale;
    measured = {scale, {q0, q1, q2, q3, q4, polygon, asked > finest ? asked : finest}};
    return 0;
}

int CRVp_MeasureArc(CRVp_ArcMeasured const& measured, CRVp_ArcTable& table)
{
    double const* const q = measured.inputs;
    if (q[1] == 0.0 && q[2] == 0.0 && q[3] == 0.0 && q[4] == 0.0) {
        // One straight piece; of a path without length only its end is ever asked for, which is its start then.
        double const length = std::sqrt(q[0]);
        double const even[] = {0.0, length, 0.0, 0.0, 0.0, length > 0.0 ? 1.0 : 0.0, 0.0, 0.0};
        std::copy(std::begin(even), std::end(even), table.words + 1);
        table.items = CRVp_FewestArcItems;
    } else {
        Cutter cutter(measured.inputs);
        cutter.Run();
        cutter.Write(table);
    }
    table.words[0] = measured.scale;
    table.length = CRVp_ArcLength(table.words, table.items);
    std::copy_n(measured.inputs, CRVp_ArcInputs, table.words + 4 * table.items - CRVp_ArcInputs);
    return CRVp_IsFinite(table.length) ? 0 : CRV_Err_NotFinite;
}
