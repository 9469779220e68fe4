// Measuring a path: from control points to the pieces of its table.

#include "services/curvekernel/arctable_private.h"
#include "services/curvekernel/curve_private.h"

#include <limits>

namespace {

// Speed may be off by this share inside a piece, whatever the accuracy asked for.
constexpr double kSpeedTolerance = 3e-4;

// A stretch shorter than this share of the control polygon is a step that nobody sees: it isn't cut further, and a
// place whose slow surroundings are that short counts as standing still.
constexpr double kNegligible = 1e-7;

// The smallest accuracy that is worth pieces, as a share of the control polygon.
constexpr double kFinestAccuracy = 1e-9;

// Positions between two samples of the speed error stay below this share of its maximum times the piece's length: the
// error of a Hermite quintic, v^3 (1-v)^3, stands at 0.29 of its steepest slope.
constexpr double kErrorShare = 0.35;

// How a path leaves a parameter: speed and its first two derivatives by t. At a standstill the speed is 0 and the
// derivatives are those to the right; to the left they have the other sign.
struct Knot {
    double t;
    double speed, first, second;
    bool standstill;
};

// Speed of a path of up to N dimensions. The unused coordinates are 0.
template <int N>
class Path {
public:
    Path(CRV_Curve const* curve, double scale)
    {
        double polygon = 0.0;
        double steps[3][N] = {};
        double const* points[] = {curve->p0, curve->p1, curve->p2, curve->p3};
        for (int k = 0; k < 3; ++k) {
            double squares = 0.0;
            for (int i = 0; i < curve->dimension; ++i) {
                steps[k][i] = scale * points[k + 1][i] - scale * points[k][i];
                squares += steps[k][i] * steps[k][i];
            }
            polygon += std::sqrt(squares);
        }
        for (int i = 0; i < N; ++i) {
            g0_[i] = 3.0 * steps[0][i];
            g1_[i] = 6.0 * (steps[1][i] - steps[0][i]);
            g2_[i] = 3.0 * ((steps[2][i] - steps[1][i]) - (steps[1][i] - steps[0][i]));
        }
        polygon_ = polygon;
    }

    double Polygon() const { return polygon_; }

    double Speed(double t) const
    {
        double squares = 0.0;
        for (int i = 0; i < N; ++i) {
            const double d = (g2_[i] * t + g1_[i]) * t + g0_[i];
            squares += d * d;
        }
        return std::sqrt(squares);
    }

    // Half the derivative of the squared speed; 0 where the speed is smallest.
    double SlowingAt(double t) const
    {
        double sum = 0.0;
        for (int i = 0; i < N; ++i) sum += ((g2_[i] * t + g1_[i]) * t + g0_[i]) * (2.0 * g2_[i] * t + g1_[i]);
        return sum;
    }

    Knot KnotAt(double t, double negligible) const
    {
        double squares = 0.0;      // D D
        double firstDot = 0.0;     // D D'
        double secondDot = 0.0;    // D D''
        double bendSquares = 0.0;  // D' D'
        double bendDot = 0.0;      // D' D''
        for (int i = 0; i < N; ++i) {
            const double d = (g2_[i] * t + g1_[i]) * t + g0_[i];
            const double bend = 2.0 * g2_[i] * t + g1_[i];
            const double change = 2.0 * g2_[i];
            squares += d * d;
            firstDot += d * bend;
            secondDot += d * change;
            bendSquares += bend * bend;
            bendDot += bend * change;
        }
        // Near its minimum the speed is sqrt(squares + bendSquares tau^2), which is slow over squares / bend.
        const double bend = std::sqrt(bendSquares);
        if (squares <= 0.25 * negligible * bend && bend > 0.0) return {t, 0.0, bend, bendDot / bend, true};
        const double speed = std::sqrt(squares);
        const double first = firstDot / speed;
        return {t, speed, first, (bendSquares + secondDot - first * first) / speed, false};
    }

    // Gauss and Legendre's five points.
    double Length(double from, double to) const
    {
        constexpr double kInner = 0.53846931010568309104, kOuter = 0.90617984593866399280;
        constexpr double kInnerWeight = 0.47862867049936646804, kOuterWeight = 0.23692688505618908751;
        constexpr double kMiddleWeight = 0.56888888888888888889;
        const double half = 0.5 * (to - from);
        const double middle = from + half;
        const double outer = Speed(middle - kOuter * half) + Speed(middle + kOuter * half);
        const double inner = Speed(middle - kInner * half) + Speed(middle + kInner * half);
        return half * (kMiddleWeight * Speed(middle) + (kInnerWeight * inner + kOuterWeight * outer));
    }

private:
    double g0_[N], g1_[N], g2_[N];  // the derivative by t: g0 + g1 t + g2 t^2
    double polygon_;
};

// The quintic with these values, first and second derivatives at 0 and 1.
void SetHermite(double (&c)[6], double f0, double d0, double dd0, double f1, double d1, double dd1)
{
    c[0] = f0;
    c[1] = d0;
    c[2] = 0.5 * dd0;
    const double value = f1 - c[0] - c[1] - c[2];
    const double slope = d1 - c[1] - 2.0 * c[2];
    const double bend = dd1 - 2.0 * c[2];
    // The three have the same pattern of signs on purpose: where signs alternate, gcc 12 fuses multiplication and
    // addition on machines that can, also under -ffp-contract=off, and the bits would depend on the machine.
    const double third = 10.0 * value - 4.0 * slope + 0.5 * bend;
    const double fourth = 15.0 * value - 7.0 * slope + bend;
    const double fifth = 6.0 * value - 3.0 * slope + 0.5 * bend;
    c[3] = third;
    c[4] = -fourth;
    c[5] = fifth;
}

// Cuts a path into pieces from left to right.
template <int N>
class Cutter {
public:
    Cutter(Path<N> const& path, double accuracy, CRVp_ArcTable& table)
        : path_(path),
          table_(table),
          accuracy_(accuracy),
          negligible_(kNegligible * path.Polygon())
    {
        if (negligible_ > 0.1 * accuracy) negligible_ = 0.1 * accuracy;
    }

    // `unscale` takes the path's units back to the caller's.
    void Run(double unscale)
    {
        Knot from = path_.KnotAt(0.0, negligible_);
        Knot pending[kDeepest + 1];
        int waiting = 0;
        pending[waiting++] = path_.KnotAt(1.0, negligible_);
        while (waiting > 0) {
            const Knot to = pending[waiting - 1];
            const bool full = waiting >= kDeepest || table_.count + waiting >= CRVp_MostArcPieces - 1;
            if (AddPiece(from, to, full)) {
                from = to;
                --waiting;
            } else {
                pending[waiting] = path_.KnotAt(Cut(from.t, to.t), negligible_);
                ++waiting;
            }
        }
        Finish(unscale);
    }

private:
    static constexpr int kDeepest = 60;

    // The slowest place, where the trouble is, if it lies between; else the middle.
    double Cut(double from, double to) const
    {
        const double middle = 0.5 * (from + to);
        if (!(path_.SlowingAt(from) < 0.0 && path_.SlowingAt(to) > 0.0)) return middle;
        double low = from;
        double high = to;
        for (int step = 0; step < 54; ++step) {
            const double t = 0.5 * (low + high);
            if (path_.SlowingAt(t) < 0.0)
                low = t;
            else
                high = t;
        }
        // A cut close to an end leaves a sliver and no progress.
        const double margin = 0.02 * (to - from);
        return high > from + margin && high < to - margin ? high : middle;
    }

    // Adds the piece if it is good enough, or if `forced`.
    bool AddPiece(Knot const& from, Knot const& to, bool forced)
    {
        const double length = path_.Length(from.t, to.t);
        CRVp_ArcPiece& piece = table_.pieces[table_.count];
        piece.start = table_.length;
        if (length <= negligible_ || forced) {
            piece.offset = 0.0;
            piece.rate = length > 0.0 ? 1.0 / length : 0.0;
            piece.root = 0;
            SetHermite(piece.c, from.t, to.t - from.t, 0.0, to.t, to.t - from.t, 0.0);
        } else if (from.standstill && to.standstill) {
            return false;
        } else {
            SetCoefficients(piece, from, to, length);
            if (!IsGood(piece, from, to, length)) return false;
        }
        table_.length += length;
        ++table_.count;
        return true;
    }

    static void SetCoefficients(CRVp_ArcPiece& piece, Knot const& from, Knot const& to, double length)
    {
        piece.root = from.standstill || to.standstill;
        piece.offset = to.standstill ? 1.0 : 0.0;
        piece.rate = (to.standstill ? -1.0 : 1.0) / length;
        if (!piece.root) {
            const double fromRate = length / from.speed;
            const double toRate = length / to.speed;
            SetHermite(piece.c, from.t, fromRate, -from.first / from.speed * fromRate * fromRate, to.t, toRate,
                       -to.first / to.speed * toRate * toRate);
            return;
        }
        // Measured from the standstill, where speed = a tau + b tau^2 / 2, the distance is length r^2.
        const double side = from.standstill ? 1.0 : -1.0;
        Knot const& still = from.standstill ? from : to;
        Knot const& moving = from.standstill ? to : from;
        const double start = std::sqrt(2.0 * length / still.first);
        const double startBend = -(side * still.second / still.first) * start * start / 3.0;
        const double end = 2.0 * length / moving.speed;
        const double endBend = end - side * moving.first / moving.speed * end * end;
        SetHermite(piece.c, still.t, side * start, side * startBend, moving.t, side * end, side * endBend);
    }

    // Whether the speed along the piece is 1 within tolerance, and its length trustworthy.
    bool IsGood(CRVp_ArcPiece const& piece, Knot const& from, Knot const& to, double length) const
    {
        // The integral by the end values is of the order of the quintic, Gauss's far better: where they agree this well
        // there is nothing between the samples that either has missed.
        const double h = to.t - from.t;
        const double toSign = to.standstill ? -1.0 : 1.0;
        const double byEnds =
            h * (0.5 * (from.speed + to.speed) +
                 h * (0.1 * (from.first - toSign * to.first) + h * (from.second + toSign * to.second) / 120.0));
        if (!(std::fabs(byEnds - length) <= kSpeedTolerance * length)) return false;

        double worst = 0.0;
        for (const double r : {0.25, 0.5, 0.75}) {
            double const* c = piece.c;
            const double t = ((((c[5] * r + c[4]) * r + c[3]) * r + c[2]) * r + c[1]) * r + c[0];
            const double slope = (((5.0 * c[5] * r + 4.0 * c[4]) * r + 3.0 * c[3]) * r + 2.0 * c[2]) * r + c[1];
            const double distanceSlope = length * (piece.root ? 2.0 * r : 1.0);
            const double error = std::fabs(std::fabs(slope) * path_.Speed(t) - distanceSlope) / distanceSlope;
            if (!(error <= kSpeedTolerance)) return false;
            worst = CRVp_Max(worst, error);
        }
        return kErrorShare * worst * length <= 0.25 * accuracy_;
    }

    void Finish(double unscale)
    {
        CRVp_ArcPiece& end = table_.pieces[table_.count++];
        end = {table_.length, 0.0, 0.0, {1.0, 0.0, 0.0, 0.0, 0.0, 0.0}, 0};
        if (unscale == 1.0) return;
        for (int i = 0; i < table_.count; ++i) {
            table_.pieces[i].start *= unscale;
            // A path as short as the smallest numbers wants more than the largest; infinity would be a NaN at s = 0.
            constexpr double largest = std::numeric_limits<double>::max();
            const double rate = table_.pieces[i].rate / unscale;
            table_.pieces[i].rate = CRVp_Max(-largest, CRVp_Min(largest, rate));
        }
        table_.length *= unscale;
    }

    Path<N> const& path_;
    CRVp_ArcTable& table_;
    double accuracy_;
    double negligible_;
};

template <int N>
void Measure(CRV_Curve const* curve, double accuracy, double scale, CRVp_ArcTable& table)
{
    const Path<N> path(curve, scale);
    table.count = 0;
    table.length = 0.0;
    if (path.Polygon() == 0.0) {
        table.pieces[table.count++] = {0.0, 0.0, 0.0, {}, 0};
        return;
    }
    const double finest = kFinestAccuracy * path.Polygon();
    const double asked = accuracy * scale;
    Cutter<N>(path, asked > finest ? asked : finest, table).Run(1.0 / scale);
}

// A power of two that brings the coordinates to where their squares neither overflow nor vanish; 1 for nearly all.
double ScaleFor(CRV_Curve const* curve)
{
    double step = 0.0;
    for (int i = 0; i < curve->dimension; ++i) {
        const double low = CRVp_Min(CRVp_Min(curve->p0[i], curve->p1[i]), CRVp_Min(curve->p2[i], curve->p3[i]));
        const double high = CRVp_Max(CRVp_Max(curve->p0[i], curve->p1[i]), CRVp_Max(curve->p2[i], curve->p3[i]));
        step = CRVp_Max(step, 0.5 * high - 0.5 * low);
    }
    if (step > 0x1p400) return 0x1p-700;
    return step < 0x1p-300 ? 0x1p700 : 1.0;
}

}  // namespace

int CRVp_MeasureArc(CRV_Curve const* curve, double accuracy, CRVp_ArcTable& table)
{
    if (const int code = CRVp_CheckPath(curve)) return code;
    if (!CRVp_AllFinite(curve)) return CRV_Err_NotFinite;

    const double scale = ScaleFor(curve);
    if (curve->dimension <= 2)
        Measure<2>(curve, accuracy, scale, table);
    else
        Measure<4>(curve, accuracy, scale, table);
    return CRVp_IsFinite(table.length) ? 0 : CRV_Err_NotFinite;
}
