#include "frame/services/time.h"

#include "frame/services/math.h"

#include <algorithm>
#include <climits>
#include <cstdint>
#include <numeric>

namespace {

// Products of a value and two scales need 96 bits.
__extension__ typedef __int128 Wide;

bool FitsValue(Wide value) noexcept
{
    return value >= INT_MIN && value <= INT_MAX;
}

Wide Gcd(Wide a, Wide b) noexcept
{
    while (b != 0) {
        Wide const rest = a % b;
        a = b;
        b = rest;
    }
    return a < 0 ? -a : a;
}

// Stores value/scale seconds as it stands if it fits, else in lowest terms.
int Store(Wide value, Wide scale, T_Time* time) noexcept
{
    if (!FitsValue(value) || scale > UINT_MAX) {
        Wide const divisor = Gcd(scale, value);
        value /= divisor;
        scale /= divisor;
        if (!FitsValue(value) || scale > UINT_MAX) return T_Err_Overflow;
    }
    *time = {static_cast<int>(value), static_cast<unsigned int>(scale)};
    return 0;
}

int Add(T_Time const& a, Wide bValue, unsigned int bScale, T_Time* sum) noexcept
{
    if (a.scale == 0 || bScale == 0) return T_Err_Scale;
    unsigned int const divisor = std::gcd(a.scale, bScale);
    Wide const aFactor = bScale / divisor;
    Wide const bFactor = a.scale / divisor;
    return Store(a.value * aFactor + bValue * bFactor, a.scale * aFactor, sum);
}

int Multiply(T_Time const& time, Wide numerator, Wide denominator, T_Time* product) noexcept
{
    if (time.scale == 0 || denominator == 0) return T_Err_Scale;
    Wide const value = time.value * numerator;
    if (value % denominator == 0 && FitsValue(value / denominator)) {
        *product = {static_cast<int>(value / denominator), time.scale};
        return 0;
    }
    return Store(value, time.scale * denominator, product);
}

T_Time ValueOrThrow(int code, T_Time const& time)
{
    if (code != 0) throw code;
    return time;
}

// Negative, 0 or positive. A value times a scale fits 64 bits: 2 to the 31st times less than 2 to the 32nd.
int CompareScaled(T_Time const& a, T_Time const& b) noexcept
{
    std::int64_t const left = static_cast<std::int64_t>(a.value) * b.scale;
    std::int64_t const right = static_cast<std::int64_t>(b.value) * a.scale;
    return (left > right) - (left < right);
}

bool HasSameFields(T_Time const& a, T_Time const& b) noexcept
{
    return a.value == b.value && a.scale == b.scale;
}

T_Time InLowestTerms(T_Time const& time) noexcept
{
    std::int64_t const divisor = std::gcd(static_cast<std::int64_t>(time.value), static_cast<std::int64_t>(time.scale));
    return {static_cast<int>(time.value / divisor), static_cast<unsigned int>(time.scale / divisor)};
}

// Both times of a span in the least common multiple of their scales. False if that doesn't fit.
bool MakeScaleCommon(T_TimeSpan* span) noexcept
{
    T_Time& start = span->start;
    T_Time& duration = span->duration;
    if (start.scale == duration.scale) return true;
    unsigned int const divisor = std::gcd(start.scale, duration.scale);
    std::int64_t const startFactor = duration.scale / divisor;
    std::int64_t const durationFactor = start.scale / divisor;
    Wide const scale = static_cast<Wide>(start.scale) * startFactor;
    Wide const startValue = static_cast<Wide>(start.value) * startFactor;
    Wide const durationValue = static_cast<Wide>(duration.value) * durationFactor;
    if (scale > UINT_MAX || !FitsValue(startValue) || !FitsValue(durationValue)) return false;
    start = {static_cast<int>(startValue), static_cast<unsigned int>(scale)};
    duration = {static_cast<int>(durationValue), static_cast<unsigned int>(scale)};
    return true;
}

}  // namespace

int T_ShortConvTimeGeneral(int value, unsigned int scale, unsigned int newScale, int* out) noexcept
{
    if (scale == 0 || newScale == 0) return T_Err_Scale;
    // Rounding works on the magnitude, at most 2 to the 63rd: halves then go away from zero by themselves.
    std::uint64_t const magnitude = static_cast<std::uint64_t>(value < 0 ? -static_cast<std::int64_t>(value) : value);
    std::uint64_t const units = (magnitude * newScale + scale / 2) / scale;
    std::uint64_t const limit = value < 0 ? std::uint64_t{1} << 31 : INT_MAX;
    if (units > limit) return T_Err_Overflow;
    std::int64_t const converted = static_cast<std::int64_t>(units);
    *out = static_cast<int>(value < 0 ? -converted : converted);
    return 0;
}

int T_ConvTime(T_Time const* source, unsigned int newScale, T_Time* destination, int) noexcept
{
    int value = 0;
    if (int const code = T_ShortConvTime(source->value, source->scale, newScale, &value)) return code;
    *destination = {value, newScale};
    return 0;
}

int T_AddTime(T_Time const* a, T_Time const* b, T_Time* sum) noexcept
{
    return Add(*a, b->value, b->scale, sum);
}

int T_MulTime(T_Time const* time, M_Ratio const* ratio, T_Time* product) noexcept
{
    return Multiply(*time, ratio->numerator, ratio->denominator, product);
}

int T_CompareTime(T_Time const* a, T_Time const* b, int* result) noexcept
{
    if (!HasSameFields(*a, *b) && (a->scale == 0 || b->scale == 0)) return T_Err_Scale;
    *result = CompareScaled(*a, *b);
    return 0;
}

int T_ReduceTime(T_Time const* source, T_Time* reduced, unsigned char* changed) noexcept
{
    if (source->scale == 0) return T_Err_Scale;
    T_Time const lowest = InLowestTerms(*source);
    if (changed) *changed = HasSameFields(lowest, *source) ? 0 : 1;
    *reduced = lowest;
    return 0;
}

int T_FpLong2TimeValue(unsigned int scale, double seconds) noexcept
{
    long const units = M_RoundDouble(seconds * scale);
    return static_cast<int>(std::clamp<long>(units, INT_MIN, INT_MAX));
}

T_TimeSpan T_NormalizeSpan(T_TimeSpan const& span)
{
    if (span.start.scale == 0 || span.duration.scale == 0) throw T_Err_Scale;
    T_TimeSpan normal = span;
    if (MakeScaleCommon(&normal)) return normal;
    normal = {InLowestTerms(span.start), InLowestTerms(span.duration)};
    if (!MakeScaleCommon(&normal)) throw T_Err_Overflow;
    return normal;
}

bool T_TimeSpan::Contains(T_Time const& time) const noexcept
{
    if (time.scale == 0 || start.scale == 0 || duration.scale == 0) return false;
    // The distance from the start in units of 1 / (time.scale * start.scale) seconds, against the duration.
    Wide const distance = static_cast<Wide>(time.value) * start.scale - static_cast<Wide>(start.value) * time.scale;
    Wide const unit = static_cast<Wide>(time.scale) * start.scale;
    return distance >= 0 && distance * duration.scale < duration.value * unit;
}

bool operator==(T_Time const& a, T_Time const& b) noexcept
{
    if (a.scale == 0 || b.scale == 0) return HasSameFields(a, b);
    return CompareScaled(a, b) == 0;
}

bool operator<(T_Time const& a, T_Time const& b) noexcept
{
    if (a.scale == 0 || b.scale == 0) return a.scale == b.scale ? a.value < b.value : a.scale == 0;
    return CompareScaled(a, b) < 0;
}

T_Time operator+(T_Time const& a, T_Time const& b)
{
    T_Time sum{};
    int const code = Add(a, b.value, b.scale, &sum);
    return ValueOrThrow(code, sum);
}

T_Time operator-(T_Time const& a, T_Time const& b)
{
    T_Time difference{};
    int const code = Add(a, -static_cast<Wide>(b.value), b.scale, &difference);
    return ValueOrThrow(code, difference);
}

T_Time& operator+=(T_Time& a, T_Time const& b)
{
    return a = a + b;
}

T_Time operator/(T_Time const& time, int divisor)
{
    T_Time quotient{};
    Wide const size = divisor < 0 ? -static_cast<Wide>(divisor) : divisor;
    int const code = Multiply(time, divisor < 0 ? -1 : 1, size, &quotient);
    return ValueOrThrow(code, quotient);
}
