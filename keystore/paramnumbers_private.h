#pragma once

#include <limits>

// Numbers as parameter records hold them.

inline constexpr double KFSp_FixedToDouble = 1.52587890625e-5;  // 1 / 65536

// Truncated to an int; what doesn't fit, the nearest end of the range, and NaN is 0.
inline int KFSp_Truncate(double number) noexcept
{
    if (number >= 2147483648.0) return std::numeric_limits<int>::max();
    if (number <= -2147483649.0) return std::numeric_limits<int>::min();
    return number == number ? static_cast<int>(number) : 0;
}

// 16.16, halves away from zero.
inline int KFSp_ToFixed(double number) noexcept
{
    return KFSp_Truncate(number * 65536.0 + (number < 0.0 ? -0.5 : 0.5));
}

inline double KFSp_FromFixed(int fixed) noexcept
{
    return fixed * KFSp_FixedToDouble;
}
