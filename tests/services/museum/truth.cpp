#include "tests/services/museum/truth.h"

#include <boost/multiprecision/cpp_bin_float.hpp>

#include <algorithm>
#include <cmath>

namespace truth {

namespace {

using Big = boost::multiprecision::number<boost::multiprecision::cpp_bin_float<50>, boost::multiprecision::et_off>;

template <class R = Big>
using Cubic = std::array<R, 4>;

template <class R = Big>
Cubic<R> Coordinate(Curve const& curve, std::size_t i)
{
    return {R(curve.p[0][i]), R(curve.p[1][i]), R(curve.p[2][i]), R(curve.p[3][i])};
}

// One step of de Casteljau for the first `count` points.
void Halve(Cubic<>& c, Big const& t, std::size_t count)
{
    for (std::size_t k = 0; k < count; ++k) c[k] += t * (c[k + 1] - c[k]);
}

Big Value(Cubic<> c, Big const& t)
{
    for (std::size_t count = 3; count > 0; --count) Halve(c, t, count);
    return c[0];
}

template <class R>
R First(Cubic<R> const& c, R const& t)
{
    R const s = 1 - t;
    return 3 * (s * s * (c[1] - c[0]) + 2 * s * t * (c[2] - c[1]) + t * t * (c[3] - c[2]));
}

template <class R>
R Second(Cubic<R> const& c, R const& t)
{
    return 6 * ((1 - t) * (c[2] - 2 * c[1] + c[0]) + t * (c[3] - 2 * c[2] + c[1]));
}

// The parameters in [0, 1] at which the derivative vanishes, ascending; none where it vanishes everywhere.
std::vector<Big> Turns(Cubic<> const& c, Big* apart = nullptr)
{
    Big const u = c[1] - c[0], v = c[2] - c[1], w = c[3] - c[2];
    Big const a = u - 2 * v + w, b = v - u;  // a t^2 + 2 b t + u
    Big const root = b * b - a * u;
    std::vector<Big> ts;
    if (a == 0) {
        if (b != 0) ts = {-u / (2 * b)};
    } else if (root >= 0) {
        Big const q = b < 0 ? Big(sqrt(root) - b) : Big(-(sqrt(root) + b));
        ts = {q / a};
        if (root > 0) ts.push_back(q == 0 ? Big(0) : Big(u / q));
    }
    if (apart) *apart = a == 0 ? Big(1) : Big(2 * sqrt(abs(root)) / abs(a));
    std::erase_if(ts, [](Big const& t) { return t < 0 || t > 1; });
    std::sort(ts.begin(), ts.end());
    return ts;
}

// Coordinate i turned so that it runs upwards from p0 to p3.
Cubic<> Upwards(Curve const& curve, std::size_t i, int& direction)
{
    direction = curve.p[3][i] < curve.p[0][i] ? -1 : 1;
    Cubic<> c = Coordinate(curve, i);
    for (Big& value : c) value *= direction;
    return c;
}

Real Round(Big const& value)
{
    return static_cast<Real>(value);
}

}  // namespace

Real At(Curve const& curve, std::size_t i, Real t)
{
    return Round(Value(Coordinate(curve, i), Big(t)));
}

Real FirstAt(Curve const& curve, std::size_t i, Real t)
{
    return Round(First(Coordinate(curve, i), Big(t)));
}

Real SecondAt(Curve const& curve, std::size_t i, Real t)
{
    return Round(Second(Coordinate(curve, i), Big(t)));
}

std::array<std::array<Real, 4>, 5> Split(Curve const& curve, Real t)
{
    std::array<std::array<Real, 4>, 5> rows{};
    for (std::size_t i = 0; i < curve.Size(); ++i) {
        Cubic<> c = Coordinate(curve, i);
        Halve(c, t, 3);
        rows[0][i] = Round(c[0]);
        rows[4][i] = Round(c[2]);
        Halve(c, t, 2);
        rows[1][i] = Round(c[0]);
        rows[3][i] = Round(c[1]);
        Halve(c, t, 1);
        rows[2][i] = Round(c[0]);
    }
    return rows;
}

Real FirstReach(Curve const& curve, std::size_t i, Real value)
{
    int direction;
    Cubic<> const c = Upwards(curve, i, direction);
    Big const wanted = Big(value) * direction;
    if (wanted <= c[0]) return 0;
    if (wanted >= c[3]) return 1;
    std::vector<Big> ends = Turns(c);
    ends.push_back(1);
    Big low = 0, high = 1;
    for (Big const& end : ends) {
        high = end;
        if (Value(c, end) >= wanted) break;
        low = end;
    }
    for (int half = 0; half < 70; ++half) {
        Big const middle = (low + high) / 2;
        (Value(c, middle) < wanted ? low : high) = middle;
    }
    return Round(high);
}

Real FurthestX(Curve const& curve, Real t)
{
    int direction;
    Cubic<> const c = Upwards(curve, 0, direction);
    Big furthest = std::max(c[0], Value(c, Big(t)));
    for (Big const& turn : Turns(c))
        if (turn < t) furthest = std::max(furthest, Value(c, turn));
    return Round(std::min(furthest, c[3]) * direction);
}

Real FallsBack(Curve const& curve)
{
    int direction;
    Cubic<> const c = Upwards(curve, 1, direction);
    std::vector<Big> places = Turns(c);
    places.push_back(1);
    Big top = c[0], worst = 0;
    for (Big const& place : places) {
        Big const y = Value(c, place);
        worst = std::max(worst, Big(top - y));
        top = std::max(top, y);
    }
    return Round(worst);
}

SlopePlaces PlacesOfSlope(Curve const& curve, Real slope)
{
    Cubic<> excess = Coordinate(curve, 1);
    Cubic<> const x = Coordinate(curve, 0);
    for (std::size_t k = 0; k < 4; ++k) excess[k] -= slope * x[k];
    SlopePlaces places;
    Big apart;
    for (Big const& t : Turns(excess, &apart)) places.ts.push_back(Round(t));
    places.apart = Round(apart);
    return places;
}

Ruler::Ruler(Curve const& curve)
{
    for (std::size_t k = 0; k < 3; ++k) {
        Real squares = 0;
        for (std::size_t i = 0; i < curve.Size(); ++i) squares += std::pow(Real(curve.p[k + 1][i]) - curve.p[k][i], 2);
        polygon += std::sqrt(squares);
    }
    for (std::size_t i = 0; i < curve.Size(); ++i) coordinates_.push_back(Coordinate<Real>(curve, i));
    auto const slowing = [this](Real t) {
        Real sum = 0;
        for (Cubic<Real> const& c : coordinates_) sum += First(c, t) * Second(c, t);
        return sum;
    };
    for (int i = 0; i < 200; ++i) {
        Real low = i / 200.0L, high = (i + 1) / 200.0L;
        if (!(slowing(low) < 0 && slowing(high) >= 0)) continue;
        for (int half = 0; half < 70; ++half) (slowing((low + high) / 2) < 0 ? low : high) = (low + high) / 2;
        slowest_.push_back(low);
    }
}

Real Ruler::Rule(Real from, Real to) const
{
    static Real const root = 2 * std::sqrt(10.0L / 7), root70 = 13 * std::sqrt(70.0L);
    static Real const inner = std::sqrt(5 - root) / 3, outer = std::sqrt(5 + root) / 3;
    Real const half = (to - from) / 2, middle = (to + from) / 2;
    auto const speeds = [&](Real offset) {
        Real sum = 0;
        for (Real const t : {middle - offset * half, middle + offset * half}) {
            Real squares = 0;
            for (Cubic<Real> const& c : coordinates_) squares += First(c, t) * First(c, t);
            sum += std::sqrt(squares);
        }
        return sum;
    };
    return half * (256 * speeds(0) + (322 + root70) * speeds(inner) + (322 - root70) * speeds(outer)) / 900;
}

Real Ruler::Refined(Real from, Real to, Real whole, int depth) const
{
    Real const middle = (from + to) / 2, left = Rule(from, middle), right = Rule(middle, to);
    if (depth > 45 || std::fabs(left + right - whole) <= 1e-13L * polygon) return left + right;
    return Refined(from, middle, left, depth + 1) + Refined(middle, to, right, depth + 1);
}

Real Ruler::Length(Real from, Real to) const
{
    if (from > to) return -Length(to, from);
    Real sum = 0;
    for (Real const cut : slowest_)
        if (cut > from && cut < to) {
            sum += Refined(from, cut, Rule(from, cut), 0);
            from = cut;
        }
    return sum + Refined(from, to, Rule(from, to), 0);
}

}  // namespace truth
