// Times against exact arithmetic of 128 bits.
#include "tests/support/codes.h"
#include "tests/support/dice.h"

#include "frame/services/math.h"
#include "frame/services/time.h"

#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <functional>
#include <limits>
#include <numeric>
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
        static unsigned const usual[] = {1, 24, 25, 30, 600, 1001, 24000, 44100, 48000, 90000, UINT_MAX, 0x80000000u};
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

// Holds the code and the result against value/scale: in the first of the preferred scales in which it is a whole number
// that fits, else in lowest terms, else an overflow.
void ExpectExact(int code, T_Time const& result, Wide value, Wide scale, std::initializer_list<Wide> preferred)
{
    Wide const divisor = Gcd(value, scale);
    std::vector<Wide> scales(preferred);
    scales.push_back(scale / divisor);
    for (Wide const chosen : scales)
        if (chosen <= UINT_MAX && value * chosen % scale == 0 && FitsIn(value * chosen / scale, chosen)) {
            ASSERT_EQ(0, code);
            ASSERT_TRUE(IsSame(result, {static_cast<int>(value * chosen / scale), static_cast<unsigned>(chosen)}))
                << "gave " << result;
            return;
        }
    ASSERT_EQ(T_Err_Overflow, code);
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

TEST(Time, EveryOperationIsExactOrSaysThatItDoesNotFit)
{
    Times times(2);
    int fitted = 0;
    for (int i = 0; i < Rounds(10000) && !testing::Test::HasFatalFailure(); ++i) {
        T_Time const a = times.Time();
        T_Time b = times.Time(), result{};
        if (i % 3 == 0) b.scale = a.scale;
        if (i % 5 == 0 && T_ConvTime(&a, times.Scale(), &b, 0) != 0) b = a;  // near or equal
        SCOPED_TRACE(testing::Message() << a << " and " << b);
        Wide const scale = static_cast<Wide>(a.scale) * b.scale;
        Wide const left = static_cast<Wide>(a.value) * b.scale, right = static_cast<Wide>(b.value) * a.scale;
        Wide const multiple = std::lcm<unsigned long, unsigned long>(a.scale, b.scale);
        ExpectExact(T_AddTime(&a, &b, &result), result, left + right, scale, {multiple});
        ExpectExact(Try([&] { return a + b; }, &result), result, left + right, scale, {multiple});
        ExpectExact(Try([&] { return a - b; }, &result), result, left - right, scale, {multiple});
        T_Time sum = a;
        ExpectExact(Try([&] { return sum += b; }, &result), result, left + right, scale, {multiple});
        M_Ratio const ratio{b.value, b.scale};
        ExpectExact(T_MulTime(&a, &ratio, &result), result, static_cast<Wide>(a.value) * b.value, scale,
                    {a.scale, scale});
        if (b.value != 0) {
            Wide const divisor = b.value < 0 ? -static_cast<Wide>(b.value) : b.value;
            ExpectExact(Try([&] { return a / b.value; }, &result), result,
                        b.value < 0 ? -static_cast<Wide>(a.value) : a.value, a.scale * divisor,
                        {a.scale, a.scale * divisor});
        }

        int order = 77;
        ASSERT_EQ(0, T_CompareTime(&a, &b, &order));
        ASSERT_EQ((left > right) - (left < right), order);
        ASSERT_TRUE((a == b) == (order == 0) && (a != b) == (order != 0) && (a < b) == (order < 0));
        ASSERT_TRUE((a <= b) == (order <= 0) && (a > b) == (order > 0) && (a >= b) == (order >= 0));

        unsigned char changed = 77;
        ASSERT_EQ(0, T_ReduceTime(&a, &result, &changed));
        ASSERT_TRUE(result == a && Gcd(result.value, result.scale) == 1) << result;
        ASSERT_EQ(!IsSame(result, a), changed == 1);

        // Conversion: never more than half a unit off, and a refusal only where the nearest doesn't fit.
        int value = 12345;
        int const code = T_ShortConvTime(a.value, a.scale, b.scale, &value);
        Wide const twice = 2 * (left < 0 ? -left : left) + a.scale, nearest = twice / (2 * static_cast<Wide>(a.scale));
        Wide const wanted = left < 0 ? -nearest : nearest;
        ASSERT_EQ(FitsIn(wanted) ? 0 : T_Err_Overflow, code);
        ASSERT_TRUE(value == (code == 0 ? wanted : 12345)) << "a failure leaves the destination alone";
        T_Time whole = a;
        ASSERT_EQ(code, T_ConvTime(&whole, b.scale, &whole, 0)) << "in place";
        ASSERT_TRUE(IsSame(whole, code == 0 ? T_Time{value, b.scale} : a));
        fitted += code == 0;

        // A span: half open, whatever the scales; and the same in one scale.
        T_TimeSpan const span{a, b};
        T_Time asked = i % 2 ? a : times.Time();
        if (i % 4 == 1 && T_AddTime(&a, &b, &asked) == 0)
            asked.value -= i % 8 == 1 && asked.value > INT_MIN;  // its end, and just before it
        Wide const at = static_cast<Wide>(asked.value) * a.scale - static_cast<Wide>(a.value) * asked.scale;
        bool const isBefore = at * b.scale < static_cast<Wide>(b.value) * a.scale * asked.scale;
        ASSERT_EQ(b.value > 0 && at >= 0 && isBefore, span.Contains(asked)) << asked;
        try {
            T_TimeSpan const normal = T_NormalizeSpan(span);
            ASSERT_TRUE(normal.start.scale == normal.duration.scale && a == normal.start && b == normal.duration);
        } catch (int thrown) {
            ASSERT_EQ(T_Err_Overflow, thrown);
        }
    }
    EXPECT_GT(fitted, Rounds(2000));
}

T_Time Normal(T_Time start, T_Time duration)
{
    return T_NormalizeSpan({start, duration}).start;
}

TEST(Time, AScaleOfZeroIsRefusedAndOrderedBeforeAllOthers)
{
    T_Time const good{6, 600}, none{7, 0};
    T_Time result{77, 77};
    M_Ratio const one{1, 1}, nonsense{1, 0};
    int value = 77;
    EXPECT_EQ(
        std::vector<int>(16, T_Err_Scale),
        Codes(T_ShortConvTime(7, 0, 600, &value), T_ShortConvTime(7, 600, 0, &value), T_ShortConvTime(0, 0, 0, &value),
              T_ConvTime(&none, 600, &result, 0), T_AddTime(&none, &good, &result), T_AddTime(&good, &none, &result),
              T_AddTime(&none, &none, &result), T_MulTime(&none, &one, &result), T_MulTime(&good, &nonsense, &result),
              T_CompareTime(&none, &good, &value), T_CompareTime(&good, &none, &value),
              T_ReduceTime(&none, &result, nullptr), Try([&] { return good / 0; }, &result),
              Try([&] { return none / 2; }, &result), Try([&] { return Normal(none, good); }, &result),
              Try([&] { return Normal(good, none); }, &result)));
    EXPECT_TRUE(IsSame(result, {77, 77}) && value == 77);
    EXPECT_EQ(0, T_CompareTime(&none, &none, &value));
    EXPECT_EQ(0, value);
    std::vector<T_Time> const ascending = {{INT_MIN, 0}, {-1, 0}, {0, 0},        {5, 0},      {INT_MIN, 1},
                                           {-1, 600},    {0, 1},  {1, UINT_MAX}, {INT_MAX, 1}};
    for (std::size_t i = 0; i < ascending.size(); ++i)
        for (std::size_t k = 0; k < ascending.size(); ++k) {
            EXPECT_EQ(i < k, ascending[i] < ascending[k]) << ascending[i] << " and " << ascending[k];
            EXPECT_EQ(i == k, ascending[i] == ascending[k]) << ascending[i] << " and " << ascending[k];
        }
    T_Time const start{0, 600}, least{INT_MIN, 0};
    EXPECT_FALSE((T_TimeSpan{start, good}.Contains(least) || T_TimeSpan{none, good}.Contains(start)));
    EXPECT_FALSE((T_TimeSpan{start, none}.Contains(start)));
    EXPECT_TRUE((T_TimeSpan{{INT_MAX, 1}, {INT_MAX, 1}}.Contains({INT_MAX, 1})));
    T_TimeSpan const reduced = T_NormalizeSpan({{0, UINT_MAX}, {5, UINT_MAX - 1}});
    EXPECT_EQ(UINT_MAX - 1, reduced.start.scale)
        << "where the multiple of the scales doesn't fit, that of the lowest does";
}

TEST(Time, DoublesAreRoundedToTheNearestAtEverySize)
{
    constexpr double infinity = std::numeric_limits<double>::infinity(), nan = std::numeric_limits<double>::quiet_NaN();
    std::pair<double, long> const table[] = {{0.49999999999999994, 0},
                                             {-0.49999999999999994, 0},
                                             {4503599627370497.5, 4503599627370498},
                                             {9007199254740993.0, 9007199254740992},
                                             {9223372036854774784.0, 9223372036854774784},
                                             {9223372036854775808.0, LONG_MAX},
                                             {-9223372036854775808.0, LONG_MIN},
                                             {-1e300, LONG_MIN},
                                             {infinity, LONG_MAX},
                                             {nan, 0},
                                             {5e-324, 0},
                                             {0.5, 1},
                                             {-2.5, -3}};
    for (auto const& [number, rounded] : table) EXPECT_EQ(rounded, M_RoundDouble(number)) << number;
    std::tuple<unsigned, double, int> const seconds[] = {{600, 0.5, 300},
                                                         {2, 0.25, 1},
                                                         {2, -0.25, -1},
                                                         {2, 0.2499, 0},
                                                         {1, 2147483647.4, INT_MAX},
                                                         {1, 2147483648.0, INT_MAX},
                                                         {600, 1e300, INT_MAX},
                                                         {600, -infinity, INT_MIN},
                                                         {600, nan, 0},
                                                         {0, infinity, 0}};
    for (auto const& [scale, number, value] : seconds) EXPECT_EQ(value, T_FpLong2TimeValue(scale, number)) << number;
    Times random(6);
    for (int i = 0; i < Rounds(20000); ++i) {
        double const number = std::ldexp(static_cast<double>(static_cast<long>(random.Bits())), -random.Below(70));
        ASSERT_EQ(std::lround(number), M_RoundDouble(number)) << number;
        unsigned const scale = random.Scale();
        double const second = random.Between(-2e9, 2e9) / scale;
        ASSERT_NEAR(second * scale, T_FpLong2TimeValue(scale, second), 0.5 + 1e-6);
    }
}

}  // namespace
