// Rational time: a count of units, and how many units make a second.
//
// All results here are exact unless rounding is mentioned; an exact result that doesn't fit a 32-bit value and a 32-bit
// scale is an error. Scale 0 is no scale: the operations refuse it with T_Err_Scale, the comparison operators order it.
// A failed operation leaves its destination untouched. Destinations may be the same object as a source.
//
// Threads: pure functions.
#pragma once

#include "frame/services/export.h"

inline constexpr int T_Err_Scale = 0x1601;     // a scale or a denominator of 0, or a division by 0
inline constexpr int T_Err_Overflow = 0x1602;  // the result doesn't fit

struct T_Time {
    int value;           // in 1/scale seconds
    unsigned int scale;  // units a second; 0 with value 0x80000000 stands for no time at all
};

struct T_TimeSpan {
    T_Time start;
    T_Time duration;

    // Whether start <= time < start + duration, exactly, whatever the scales. A duration of 0 or less contains nothing,
    // and a span or a time with a scale of 0 neither contains nor is contained.
    KFS_SERVICE_API bool Contains(T_Time const& time) const noexcept;
};

// The rational number numerator / denominator.
struct M_Ratio {
    int numerator;
    unsigned int denominator;
};

// The general case of T_ShortConvTime, which is what to call.
[[nodiscard]] KFS_SERVICE_API int T_ShortConvTimeGeneral(int value, unsigned int scale, unsigned int newScale,
                                                         int* out) noexcept;

// Expresses `value` units of `scale` in units of `newScale`, rounded to the nearest, halves away from zero.
// `out` may be the variable that `value` was read from.
[[nodiscard]] inline int T_ShortConvTime(int value, unsigned int scale, unsigned int newScale, int* out) noexcept
{
    if (scale == newScale && scale != 0) {
        *out = value;
        return 0;
    }
    return T_ShortConvTimeGeneral(value, scale, newScale, out);
}

// The same for a whole time, scale included. The last argument has no meaning; callers pass 0.
[[nodiscard]] KFS_SERVICE_API int T_ConvTime(T_Time const* source, unsigned int newScale, T_Time* destination,
                                             int reserved) noexcept;

// The exact sum: in the common scale, else in the least common multiple of the scales, else in lowest terms.
[[nodiscard]] KFS_SERVICE_API int T_AddTime(T_Time const* a, T_Time const* b, T_Time* sum) noexcept;

// The exact product: in the scale of `time`, else in that scale times the denominator, else in lowest terms.
[[nodiscard]] KFS_SERVICE_API int T_MulTime(T_Time const* time, M_Ratio const* ratio, T_Time* product) noexcept;

// `result` becomes -1, 0 or 1 as `a` is earlier than, equal to or later than `b`. Two times with the same two fields
// are equal even if their scale is 0.
[[nodiscard]] KFS_SERVICE_API int T_CompareTime(T_Time const* a, T_Time const* b, int* result) noexcept;

// The same instant in lowest terms; no time at all of any scale, 0 units, becomes 0 units of scale 1.
//   changed  out or null: 1 if the fields differ from the source's, else 0
[[nodiscard]] KFS_SERVICE_API int T_ReduceTime(T_Time const* source, T_Time* reduced, unsigned char* changed) noexcept;

// Seconds as a count of units, rounded to the nearest, halves away from zero. This one can't fail: what is out of range
// saturates at the greatest or least 32-bit value, and a NaN gives 0.
[[nodiscard]] KFS_SERVICE_API int T_FpLong2TimeValue(unsigned int scale, double seconds) noexcept;

// The same span with start and duration in one scale: the common one, else the least common multiple of the two scales,
// else of the two scales in lowest terms. Throws T_Err_Scale or T_Err_Overflow as an int.
KFS_SERVICE_API T_TimeSpan T_NormalizeSpan(T_TimeSpan const& span);

// Comparison by instant, across scales: {1, 2} == {2, 4}. A total order that never throws, so times can be keys of a
// map: a time of scale 0 equals only itself, and comes before all others, by value among its kind.
KFS_SERVICE_API bool operator==(T_Time const& a, T_Time const& b) noexcept;
KFS_SERVICE_API bool operator<(T_Time const& a, T_Time const& b) noexcept;
inline bool operator!=(T_Time const& a, T_Time const& b) noexcept
{
    return !(a == b);
}
inline bool operator>(T_Time const& a, T_Time const& b) noexcept
{
    return b < a;
}
inline bool operator<=(T_Time const& a, T_Time const& b) noexcept
{
    return !(b < a);
}
inline bool operator>=(T_Time const& a, T_Time const& b) noexcept
{
    return !(a < b);
}

// Exact arithmetic with the scales of T_AddTime and T_MulTime. They throw T_Err_Scale or T_Err_Overflow as an int.
KFS_SERVICE_API T_Time operator+(T_Time const& a, T_Time const& b);
KFS_SERVICE_API T_Time operator-(T_Time const& a, T_Time const& b);
KFS_SERVICE_API T_Time& operator+=(T_Time& a, T_Time const& b);
KFS_SERVICE_API T_Time operator/(T_Time const& time, int divisor);
