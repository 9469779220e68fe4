// The plain, slow side of the curve kernel's tests: curves that own their points, random numbers that are the same
// everywhere, and cubics in long double.
#pragma once

#include "frame/services/curvekernel.h"

#include <array>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <ostream>

namespace truth {

using Real = long double;

// splitmix64: the standard library's distributions differ from one library to the next.
class Dice {
public:
    explicit Dice(std::uint64_t seed) : state_(seed) {}
    std::uint64_t Bits()
    {
        std::uint64_t z = (state_ += 0x9e3779b97f4a7c15u);
        z = (z ^ (z >> 30)) * 0xbf58476d1ce4e5b9u;
        z = (z ^ (z >> 27)) * 0x94d049bb133111ebu;
        return z ^ (z >> 31);
    }
    double Between(double low, double high)
    {
        return low + (high - low) * (static_cast<double>(Bits() >> 11) * 0x1p-53);
    }
    int Below(int count) { return static_cast<int>(Bits() % static_cast<std::uint64_t>(count)); }
    // Any size: sign, and 10 to a power within the given exponents.
    double Wild(int exponent)
    {
        double const value = std::pow(10.0, Between(-exponent, exponent));
        return Below(2) ? value : -value;
    }

private:
    std::uint64_t state_;
};

// A number for the bits of many doubles in their order.
class BitHash {
public:
    void Mix(double value)
    {
        std::uint64_t bits = 0;
        std::memcpy(&bits, &value, sizeof bits);
        hash_ = (hash_ ^ bits) * 0x100000001b3u;
        hash_ ^= hash_ >> 29;
    }
    std::uint64_t Get() const { return hash_; }

private:
    std::uint64_t hash_ = 0xcbf29ce484222325u;
};

// Four points of up to four coordinates and the record that points at them.
struct Curve {
    std::array<std::array<double, 4>, 4> p{};
    short dimension = 2;

    CRV_Curve Get() { return {dimension, p[0].data(), p[1].data(), p[2].data(), p[3].data()}; }
    bool operator==(Curve const&) const = default;
};

// A segment as the interpolators make it: x from 0 to dt, handles as shares of it, heights as they are.
inline Curve Graph(double dt, double outInfluence, double inInfluence, double y0, double y1, double y2, double y3)
{
    Curve curve;
    curve.p = {{{0.0, y0}, {outInfluence * dt, y1}, {dt - inInfluence * dt, y2}, {dt, y3}}};
    return curve;
}

inline std::ostream& operator<<(std::ostream& out, Curve const& curve)
{
    out.precision(17);
    for (auto const& point : curve.p) {
        out << "(";
        for (int i = 0; i < curve.dimension; ++i) out << (i ? ", " : "") << point[static_cast<std::size_t>(i)];
        out << ") ";
    }
    return out;
}

// One coordinate by de Casteljau.
inline Real At(Curve const& curve, std::size_t i, Real t)
{
    Real c[4] = {curve.p[0][i], curve.p[1][i], curve.p[2][i], curve.p[3][i]};
    for (int level = 3; level > 0; --level)
        for (int k = 0; k < level; ++k) c[k] = (1 - t) * c[k] + t * c[k + 1];
    return c[0];
}

// Its derivatives by t.
inline Real FirstAt(Curve const& curve, std::size_t i, Real t)
{
    Real const s = 1 - t;
    Real const a = Real(curve.p[1][i]) - curve.p[0][i];
    Real const b = Real(curve.p[2][i]) - curve.p[1][i];
    Real const c = Real(curve.p[3][i]) - curve.p[2][i];
    return 3 * (s * s * a + 2 * s * t * b + t * t * c);
}
inline Real SecondAt(Curve const& curve, std::size_t i, Real t)
{
    Real const a = Real(curve.p[1][i]) - curve.p[0][i];
    Real const b = Real(curve.p[2][i]) - curve.p[1][i];
    Real const c = Real(curve.p[3][i]) - curve.p[2][i];
    return 6 * ((1 - t) * (b - a) + t * (c - b));
}

// The smallest t at which coordinate i, which rises from p0 to p3, reaches the value: the first of `steps` stretches
// whose end does, halved until nothing is left of it.
inline Real FirstReach(Curve const& curve, std::size_t i, Real value, int steps)
{
    if (value <= curve.p[0][i]) return 0;
    if (value >= curve.p[3][i]) return 1;
    int step = 1;
    while (step < steps && At(curve, i, Real(step) / steps) < value) ++step;
    Real low = Real(step - 1) / steps;
    Real high = Real(step) / steps;
    for (int half = 0; half < 80; ++half) {
        Real const middle = (low + high) / 2;
        (At(curve, i, middle) < value ? low : high) = middle;
    }
    return high;
}

}  // namespace truth
