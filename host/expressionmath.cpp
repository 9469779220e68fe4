#include "host/expressionmath_private.h"

#include <bit>
#include <cmath>
#include <cstdint>
#include <limits>

namespace kfshost::exprmath {

namespace {

// A quarter turn and the logarithm of two in parts whose products with a whole number of up to 20 bits are exact, but
// for the last.
constexpr double QuarterTurn[] = {0x1.921fb544p+0, 0x1.0b4611a6p-34, 0x1.3198a2e037073p-69};
constexpr double Log2[] = {0x1.62e42feep-1, 0x1.a39ef35793c76p-33};

constexpr double HalfPi = 0x1.921fb54442d18p+0;
constexpr double TwoPi = 0x1.921fb54442d18p+2;
constexpr double FarAngle = 1e6;
constexpr double NotANumber = std::numeric_limits<double>::quiet_NaN();
constexpr double Infinity = std::numeric_limits<double>::infinity();

// The sum of x^n / n! over every second n from `first`, with alternating signs, for |x| up to half a quarter turn.
double AlternatingSeries(double x, int first)
{
    double const square = x * x;
    double sum = 0.0;
    for (int n = first + 18; n > first; n -= 2) sum = (1.0 - sum) * square / (n * (n - 1));
    return 1.0 - sum;
}

struct Turned {
    double rest;   // within half a quarter turn of 0
    int quarters;  // 0 to 3
};

Turned Reduce(double x)
{
    if (std::abs(x) > FarAngle) x = std::fmod(x, TwoPi);
    double const n = std::floor(x / HalfPi + 0.5);
    double const rest = ((x - n * QuarterTurn[0]) - n * QuarterTurn[1]) - n * QuarterTurn[2];
    return {rest, static_cast<int>(static_cast<std::int64_t>(n) & 3)};
}

double SinOfTurned(Turned const& turned, int ahead)
{
    if (!std::isfinite(turned.rest)) return NotANumber;
    int const quarter = (turned.quarters + ahead) & 3;
    double const value =
        quarter % 2 == 0 ? turned.rest * AlternatingSeries(turned.rest, 1) : AlternatingSeries(turned.rest, 0);
    return quarter < 2 ? value : -value;
}

Turned ReduceFinite(double x)
{
    return std::isfinite(x) ? Reduce(x) : Turned{NotANumber, 0};
}

// For |x| up to 1: two halvings of the angle, then the series.
double AtanOfSmall(double x)
{
    double const half = x / (1.0 + std::sqrt(1.0 + x * x));
    double const quarter = half / (1.0 + std::sqrt(1.0 + half * half));
    double const square = quarter * quarter;
    double sum = 0.0;
    for (int n = 23; n >= 3; n -= 2) sum = square * (1.0 / n - sum);
    return 4.0 * (quarter * (1.0 - sum));
}

double Atan(double x)
{
    if (std::abs(x) <= 1.0) return AtanOfSmall(x);
    double const angle = HalfPi - AtanOfSmall(1.0 / std::abs(x));
    return x < 0.0 ? -angle : angle;
}

double Multiplied(double x, unsigned int times)
{
    double power = 1.0;
    for (; times != 0; times >>= 1) {
        if (times & 1) power *= x;
        x *= x;
    }
    return power;
}

// What is too small for a reciprocal of its own is multiplied from that of the base.
double WholePower(double x, int n)
{
    auto const times = static_cast<unsigned int>(std::abs(n));
    double const power = Multiplied(x, times);
    if (n >= 0) return power;
    return std::isinf(power) ? Multiplied(1.0 / x, times) : 1.0 / power;
}

// ---- drawn numbers

// Each bit of the result depends on each of the argument.
std::uint64_t Scramble(std::uint64_t bits)
{
    bits ^= bits >> 31;
    bits *= 0xd6e8feb86659fd93U;
    bits ^= bits >> 29;
    bits *= 0xa0761d6478bd642fU;
    bits ^= bits >> 32;
    return bits;
}

// 0 and -0 are one number, and so are all that are none.
std::uint64_t BitsOf(double number)
{
    return number != number ? 1 : std::bit_cast<std::uint64_t>(number + 0.0);
}

}  // namespace

double Sin(double x)
{
    return SinOfTurned(ReduceFinite(x), 0);
}

double Cos(double x)
{
    return SinOfTurned(ReduceFinite(x), 1);
}

double Tan(double x)
{
    Turned const turned = ReduceFinite(x);
    return SinOfTurned(turned, 0) / SinOfTurned(turned, 1);
}

double Asin(double x)
{
    return std::abs(x) <= 1.0 ? Atan2(x, std::sqrt((1.0 - x) * (1.0 + x))) : NotANumber;
}

double Acos(double x)
{
    return std::abs(x) <= 1.0 ? Atan2(std::sqrt((1.0 - x) * (1.0 + x)), x) : NotANumber;
}

double Atan2(double y, double x)
{
    if (y != y || x != x) return NotANumber;
    if (x == 0.0 && y == 0.0) return 0.0;
    if (std::isinf(x) && std::isinf(y)) return Atan2(std::copysign(1.0, y), std::copysign(1.0, x));
    if (std::abs(y) > std::abs(x)) return (y < 0.0 ? -HalfPi : HalfPi) - Atan(x / y);
    double const angle = Atan(y / x);
    if (x > 0.0) return angle;
    return std::signbit(y) ? angle - 2.0 * HalfPi : angle + 2.0 * HalfPi;  // -0 lies below
}

double Exp(double x)
{
    if (x != x) return x;
    if (x > 710.0) return Infinity;
    if (x < -746.0) return 0.0;
    double const n = std::floor(x / (Log2[0] + Log2[1]) + 0.5);
    double const rest = (x - n * Log2[0]) - n * Log2[1];
    double sum = 1.0;
    for (int i = 15; i >= 1; --i) sum = 1.0 + sum * rest / i;
    return std::ldexp(sum, static_cast<int>(n));
}

double Log(double x)
{
    if (x != x || x < 0.0) return NotANumber;
    if (x == 0.0) return -Infinity;
    if (std::isinf(x)) return x;
    int exponent = 0;
    double mantissa = std::frexp(x, &exponent);
    if (mantissa < 0x1.6a09e667f3bcdp-1) {  // below the root of 1/2
        mantissa *= 2.0;
        --exponent;
    }
    double const s = (mantissa - 1.0) / (mantissa + 1.0);
    double const square = s * s;
    double sum = 0.0;
    for (int n = 23; n >= 3; n -= 2) sum = square * (1.0 / n + sum);
    return exponent * Log2[0] + (2.0 * s * (1.0 + sum) + exponent * Log2[1]);
}

double Pow(double x, double y)
{
    constexpr double mostMultiplied = 1024.0;
    if (std::abs(y) <= mostMultiplied && std::floor(y) == y) return WholePower(x, static_cast<int>(y));
    if (x == 0.0) return y > 0.0 ? 0.0 : y < 0.0 ? Infinity : NotANumber;
    return x == 1.0 ? 1.0 : Exp(y * Log(x));
}

double Random(double seed, double time)
{
    std::uint64_t const bits = Scramble(Scramble(BitsOf(seed) + 0x9e3779b97f4a7c15U) ^ BitsOf(time));
    return static_cast<double>(bits >> 11) * 0x1p-53;
}

double Noise(double x, double seed)
{
    double const left = std::floor(x);
    double const t = x - left;
    double const ease = t * t * t * (t * (t * 6.0 - 15.0) + 10.0);  // flat to the second derivative at both ends
    double const from = 2.0 * Random(seed, left) - 1.0;
    double const to = 2.0 * Random(seed, left + 1.0) - 1.0;
    return from + (to - from) * ease;
}

}  // namespace kfshost::exprmath
