// Times against exact arithmetic of 128 bits.
#include "tests/support/dice.h"

#include "frame/services/math.h"
#include "frame/services/time.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <cmath>
#include <functional>
#include <limits>
#include <numeric>
#include <utility>
#include <vector>

// Beside the type, where gtest's printer looks for it.
static std::ostream& operator<<(std::ostream& out, T_Time const& time)
{
    return out << time.value << "/" << time.scale;
}

namespace {

__extension__ typedef __int128 Wide;

// Random times that mix what is usual with the ends of the ranges.
struct Times : Dice {
    using Dice::Dice;
    unsigned Scale()
    {
        static unsigned const usual[] = {0,     1,     24,    25,    30,       600,        1001,
                                         24000, 44100, 48000, 90000, UINT_MAX, 0x80000000u};
        return Below(2) ? usual[Below(static_cast<int>(std::size(usual)))] : static_cast<unsigned>(Bits()) | 1u;
    }
    int Value()
    {
        static int const ends[] = {INT_MIN, INT_MIN + 1, -1, 0, 1, INT_MAX - 1, INT_MAX};
        int const kind = Below(4);
        return kind == 0 ? ends[Below(7)] : kind == 1 ? static_cast<int>(Bits()) : Below(200001) - 100000;
    }
    T_Time Time() { return {Value(), Scale()}; }
};

Wide Gcd(Wide a, Wide b)
{
    while (b != 0) std::swap(a %= b, b);
    return a < 0 ? -a : a;
}

bool IsSame(T_Time const& a, T_Time const& b)  // field by field
{
    return a.value == b.value && a.scale == b.scale;
}

bool FitsIn(Wide value, Wide scale = 1)
{
    return value >= INT_MIN && value <= INT_MAX && scale <= UINT_MAX;
}

// Runs an operation that gives a time or throws.
int Try(std::function<T_Time()> const& operation, T_Time* result)
{
    try {
        *result = operation();
        return 0;
    } catch (int code) {
        return code;
    }
}

constexpr T_Time Untouched{77, 78};

// Holds what an operation gave against value/scale: in the first of the preferred scales in which it is a whole number
// that fits, else in lowest terms, else an overflow; and a scale of 0 is refused.
void ExpectExact(int code, T_Time& result, Wide value, Wide scale, std::vector<Wide> scales)
{
    T_Time const given = std::exchange(result, Untouched);
    if (scale != 0) scales.push_back(scale / Gcd(value, scale));
    for (Wide const chosen : scales) {
        if (scale == 0) break;
        Wide const divisor = Gcd(value, scale);
        Wide units = 0;
        bool const isWhole = chosen % (scale / divisor) == 0;
        if (isWhole && !__builtin_mul_overflow(value / divisor, chosen / (scale / divisor), &units) &&
            FitsIn(units, chosen)) {
            ASSERT_EQ(0, code);
            ASSERT_TRUE(IsSame(given, {static_cast<int>(units), static_cast<unsigned>(chosen)})) << "gave " << given;
            return;
        }
    }
    ASSERT_EQ(scale == 0 ? T_Err_Scale : T_Err_Overflow, code);
    ASSERT_TRUE(IsSame(Untouched, given)) << "gave " << given;
}

// Whether both times are in this scale now, if they fit there.
bool AreIn(Wide scale, T_Time const& a, T_Time const& b, int code, T_TimeSpan const& span)
{
    Wide const start = a.value * scale / a.scale, duration = b.value * scale / b.scale;
    if (!FitsIn(start, scale) || !FitsIn(duration, scale)) return false;
    EXPECT_EQ(0, code);
    EXPECT_TRUE(span.start.value == start && span.duration.value == duration);
    EXPECT_TRUE(span.start.scale == scale && span.duration.scale == scale);
    return true;
}

TEST(Time, EveryOperationIsExactOrSaysWhyNot)
{
    Times times(2);
    int fitted = 0;
    for (int i = 0; i < Rounds(10000) && !testing::Test::HasFatalFailure(); ++i) {
        T_Time const a = times.Time();
        T_Time b = times.Time(), result = Untouched;
        if (i % 3 == 0) b.scale = a.scale;
        if (i % 5 == 0 && T_ConvTime(&a, times.Scale(), &b, 0) != 0) b = a;  // near or equal
        SCOPED_TRACE(testing::Message() << a << " and " << b);
        Wide const scale = static_cast<Wide>(a.scale) * b.scale;
        Wide const left = static_cast<Wide>(a.value) * b.scale, right = static_cast<Wide>(b.value) * a.scale;
        Wide const multiple = std::lcm<unsigned long, unsigned long>(a.scale, b.scale);
        Wide const divisor = b.value < 0 ? -static_cast<Wide>(b.value) : b.value;
        M_Ratio const ratio{b.value, b.scale};
        T_Time sum = a;
        unsigned char changed = 77;
        ExpectExact(T_AddTime(&a, &b, &result), result, left + right, scale, {multiple});
        ExpectExact(Try([&] { return a + b; }, &result), result, left + right, scale, {multiple});
        ExpectExact(Try([&] { return a - b; }, &result), result, left - right, scale, {multiple});
        ExpectExact(Try([&] { return sum += b; }, &result), result, left + right, scale, {multiple});
        ExpectExact(T_MulTime(&a, &ratio, &result), result, static_cast<Wide>(a.value) * b.value, scale,
                    {a.scale, scale});
        ExpectExact(Try([&] { return a / b.value; }, &result), result,
                    b.value < 0 ? -static_cast<Wide>(a.value) : a.value, a.scale * divisor,
                    {a.scale, a.scale * divisor});
        ExpectExact(T_ReduceTime(&a, &result, &changed), result, a.value, a.scale, {});
        ASSERT_EQ(a.scale == 0 ? 77 : Gcd(a.value, a.scale) != 1, changed);
        T_TimeSpan normal{a, b};
        int const normalized = Try([&] { return (normal = T_NormalizeSpan(normal)).start; }, &sum);
        auto const lowest = [](T_Time const& time) { return time.scale / Gcd(time.value, time.scale); };
        bool const isNormal =
            scale != 0 && (AreIn(multiple, a, b, normalized, normal) ||
                           AreIn(lowest(a) / Gcd(lowest(a), lowest(b)) * lowest(b), a, b, normalized, normal));
        ASSERT_EQ(scale == 0 ? T_Err_Scale : isNormal ? 0 : T_Err_Overflow, normalized);

        // What has no scale is refused, or comes before what has one, by value.
        int const wanted = scale != 0 || a.scale != b.scale ? (left > right) - (left < right)
                                                            : (a.value > b.value) - (a.value < b.value);
        int const order = scale != 0 || a.scale == b.scale ? wanted : a.scale == 0 ? -1 : 1;
        int compared = 77;
        ASSERT_EQ(scale != 0 || order == 0 ? 0 : T_Err_Scale, T_CompareTime(&a, &b, &compared));
        ASSERT_EQ(scale != 0 || order == 0 ? order : 77, compared);
        ASSERT_TRUE((a == b) == (order == 0) && (a != b) == (order != 0) && (a < b) == (order < 0));
        ASSERT_TRUE((a <= b) == (order <= 0) && (a > b) == (order > 0) && (a >= b) == (order >= 0));

        // Conversion: never more than half a unit off, and a refusal only where the nearest doesn't fit.
        int value = 12345;
        int const code = T_ShortConvTime(a.value, a.scale, b.scale, &value);
        Wide const twice = 2 * (left < 0 ? -left : left) + a.scale;
        Wide const nearest = scale == 0 ? 0 : twice / (2 * static_cast<Wide>(a.scale)) * (left < 0 ? -1 : 1);
        ASSERT_EQ(scale == 0 ? T_Err_Scale : FitsIn(nearest) ? 0 : T_Err_Overflow, code);
        ASSERT_TRUE(value == (code == 0 ? nearest : 12345)) << "a failure leaves the destination alone";
        T_Time whole = a;
        ASSERT_EQ(code, T_ConvTime(&whole, b.scale, &whole, 0)) << "in place";
        ASSERT_TRUE(IsSame(whole, code == 0 ? T_Time{value, b.scale} : a));
        fitted += code == 0;

        // A span: half open, whatever the scales.
        T_Time asked = i % 2 ? a : times.Time();
        if (i % 4 == 1 && T_AddTime(&a, &b, &asked) == 0)
            asked.value -= i % 8 == 1 && asked.value > INT_MIN;  // its end, and just before it
        Wide const at = static_cast<Wide>(asked.value) * a.scale - static_cast<Wide>(a.value) * asked.scale;
        bool const isBefore = at * b.scale < static_cast<Wide>(b.value) * a.scale * asked.scale;
        ASSERT_EQ(scale != 0 && asked.scale != 0 && b.value > 0 && at >= 0 && isBefore,
                  (T_TimeSpan{a, b}.Contains(asked)))
            << asked;
    }
    EXPECT_GT(fitted, Rounds(2000));
}

TEST(Time, DoublesAreRoundedToTheNearestAtEverySize)
{
    constexpr double infinity = std::numeric_limits<double>::infinity(), nan = std::numeric_limits<double>::quiet_NaN();
    double const odd[] = {0.49999999999999994,
                          4503599627370497.5,
                          9007199254740993.0,
                          9223372036854774784.0,
                          9223372036854775808.0,
                          1e300,
                          infinity,
                          nan,
                          5e-324,
                          0.5,
                          2.5,
                          0.25,
                          0.2499,
                          2147483647.4,
                          2147483647.5,
                          2147483648.0};
    auto const round = [](double number) {
        if (number != number) return 0L;
        return number >= 0x1p63 ? LONG_MAX : number < -0x1p63 ? LONG_MIN : std::lround(number);
    };
    Times random(6);
    for (int i = 0; i < Rounds(20000); ++i) {
        double number = std::ldexp(static_cast<double>(static_cast<long>(random.Bits())), -random.Below(70));
        if (i % 4 == 0) number = (i % 8 ? 1 : -1) * odd[random.Below(std::size(odd))];
        ASSERT_EQ(round(number), M_RoundDouble(number)) << number;
        unsigned const scale = i % 3 ? random.Scale() : static_cast<unsigned>(random.Below(3));
        double const second = i % 4 ? random.Between(-2e9, 2e9) / std::max(scale, 1u) : number;
        ASSERT_EQ(std::clamp<long>(round(second * scale), INT_MIN, INT_MAX), T_FpLong2TimeValue(scale, second))
            << second;
    }
}

}  // namespace
