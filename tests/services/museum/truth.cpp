#include "tests/services/museum/truth.h"

#include <boost/multiprecision/cpp_bin_float.hpp>

#include <algorithm>
#include <cmath>

namespace truth {

namespace {

using Big = boost::multiprecision::number<boost::multiprecision::cpp_bin_float<50>, boost::multiprecision::et_off>;

template <class R>
using Cubic = std::array<R, 4>;

template <class R = Big>
Cubic<R> Coordinate(Curve const& curve, std::size_t i)
{
    return {R(curve.p[0][i]), R(curve.p[1][i]), R(curve.p[2][i]), R(curve.p[3][i])};
}

template <class R>
R Value(Cubic<R> c, R const& t)
{
    for (std::size_t level = 3; level > 0; --level)
        for (std::size_t k = 0; k < level; ++k) c[k] += t * (c[k + 1] - c[k]);
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
std::vector<Big> Turns(Cubic<Big> const& c, Big* apart = nullptr)
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
Cubic<Big> Upwards(Curve const& curve, std::size_t i, int& direction)
{
    direction = curve.p[3][i] < curve.p[0][i] ? -1 : 1;
    Cubic<Big> c = Coordinate(curve, i);
    for (Big& value : c) value *= direction;
    return c;
}

// The path's speed and where it is slowest, in either precision.
template <class R>
struct Path {
    std::vector<Cubic<R>> coordinates;
    std::vector<R> slowest;
    R tolerance;

    Path(Curve const& curve, R const& polygon, R const& relative) : tolerance(polygon * relative)
    {
        for (std::size_t i = 0; i < curve.Size(); ++i) coordinates.push_back(Coordinate<R>(curve, i));
        for (int i = 0; i < 200; ++i) {
            R low = R(i) / 200, high = R(i + 1) / 200;
            if (!(Slowing(low) < 0 && Slowing(high) >= 0)) continue;
            for (int half = 0; half < 70; ++half) (Slowing((low + high) / 2) < 0 ? low : high) = (low + high) / 2;
            slowest.push_back(low);
        }
    }
    R Slowing(R const& t) const
    {
        R sum = 0;
        for (Cubic<R> const& c : coordinates) sum += First(c, t) * Second(c, t);
        return sum;
    }
    R Speed(R const& t) const
    {
        using std::sqrt;
        R squares = 0;
        for (Cubic<R> const& c : coordinates) squares += First(c, t) * First(c, t);
        return sqrt(squares);
    }
    R Rule(R const& from, R const& to) const
    {
        using std::sqrt;
        static R const tenSevenths = sqrt(R(10) / 7);
        static R const inner = sqrt(5 - 2 * tenSevenths) / 3, outer = sqrt(5 + 2 * tenSevenths) / 3;
        static R const root70 = 13 * sqrt(R(70));
        R const half = (to - from) / 2, middle = (to + from) / 2;
        R const sum = R(512) / 900 * Speed(middle) +
                      (322 + root70) / 900 * (Speed(middle - inner * half) + Speed(middle + inner * half)) +
                      (322 - root70) / 900 * (Speed(middle - outer * half) + Speed(middle + outer * half));
        return half * sum;
    }
    R Refined(R const& from, R const& to, R const& whole, int depth) const
    {
        R const middle = (from + to) / 2, left = Rule(from, middle), right = Rule(middle, to);
        R const error = left + right - whole;
        if (depth > 45 || (error < 0 ? -error : error) <= tolerance) return left + right;
        return Refined(from, middle, left, depth + 1) + Refined(middle, to, right, depth + 1);
    }
    R Length(R from, R const& to) const
    {
        R sum = 0;
        for (R const& cut : slowest)
            if (cut > from && cut < to) {
                sum += Refined(from, cut, Rule(from, cut), 0);
                from = cut;
            }
        return sum + Refined(from, to, Rule(from, to), 0);
    }
};

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
        Cubic<Big> c = Coordinate(curve, i);
        auto const step = [&](std::size_t count) {
            for (std::size_t k = 0; k < count; ++k) c[k] += t * (c[k + 1] - c[k]);
        };
        step(3);
        rows[0][i] = Round(c[0]);
        rows[4][i] = Round(c[2]);
        step(2);
        rows[1][i] = Round(c[0]);
        rows[3][i] = Round(c[1]);
        step(1);
        rows[2][i] = Round(c[0]);
    }
    return rows;
}

Real FirstReach(Curve const& curve, std::size_t i, Real value)
{
    int direction;
    Cubic<Big> const c = Upwards(curve, i, direction);
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
    Cubic<Big> const c = Upwards(curve, 0, direction);
    Big furthest = std::max(c[0], Value(c, Big(t)));
    for (Big const& turn : Turns(c))
        if (turn < t) furthest = std::max(furthest, Value(c, turn));
    return Round(std::min(furthest, c[3]) * direction);
}

Real FallsBack(Curve const& curve)
{
    int direction;
    Cubic<Big> const c = Upwards(curve, 1, direction);
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
    Cubic<Big> excess = Coordinate(curve, 1);
    Cubic<Big> const x = Coordinate(curve, 0);
    for (std::size_t k = 0; k < 4; ++k) excess[k] -= slope * x[k];
    SlopePlaces places;
    Big apart;
    for (Big const& t : Turns(excess, &apart)) places.ts.push_back(Round(t));
    places.apart = Round(apart);
    return places;
}

struct Ruler::Impl {
    Real polygon;
    Path<Real> quick;
    Curve curve;
};

Ruler::Ruler(Curve const& curve)
{
    Real polygon = 0;
    for (std::size_t k = 0; k < 3; ++k) {
        Real squares = 0;
        for (std::size_t i = 0; i < curve.Size(); ++i) {
            Real const step = Real(curve.p[k + 1][i]) - curve.p[k][i];
            squares += step * step;
        }
        polygon += std::sqrt(squares);
    }
    impl_.reset(new Impl{polygon, {curve, polygon, 1e-13L}, curve});
}

Ruler::~Ruler() = default;

Real Ruler::Polygon() const
{
    return impl_->polygon;
}

Real Ruler::Length(Real from, Real to) const
{
    return from <= to ? impl_->quick.Length(from, to) : -impl_->quick.Length(to, from);
}

Real Ruler::ExactLength() const
{
    return Round(Path<Big>(impl_->curve, Big(impl_->polygon), Big(1e-16L)).Length(0, 1));
}

}  // namespace truth
