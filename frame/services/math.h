// Rounding and the four-component vector.
#pragma once

#include <limits>

// The nearest integer, halves away from zero. Saturates at the limits of long; a NaN gives 0.
inline long M_RoundDouble(double number) noexcept
{
    constexpr double beyond = 9223372036854775808.0;  // 2 to the 63rd, the first double that a long can't hold
    static_assert(std::numeric_limits<long>::digits == 63);
    if (number >= beyond) return std::numeric_limits<long>::max();
    if (number < -beyond) return std::numeric_limits<long>::min();
    if (number != number) return 0;
    // Adding a half first would round 0.49999999999999994 up; the rest behind the point is exact.
    long const whole = static_cast<long>(number);
    double const rest = number - static_cast<double>(whole);
    return whole + (rest >= 0.5 ? 1 : 0) - (rest <= -0.5 ? 1 : 0);
}

template <class T>
struct M_Vector4T {
    T v[4];

    T& operator[](int component) noexcept { return v[component]; }
    T const& operator[](int component) const noexcept { return v[component]; }
    bool operator==(M_Vector4T const&) const = default;
};
