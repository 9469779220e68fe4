#include "frame/services/math.h"
#include "frame/services/time.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <cmath>
#include <limits>
#include <random>
#include <vector>

// Beside the type, where gtest's printer looks for it.
static std::ostream& operator<<(std::ostream& out, T_Time const& time)
{
    return out << time.value << "/" << time.scale;
}

namespace {

__extension__ typedef __int128 Wide;

// Random times that mix what is usual with the ends of the ranges.
class Times {
public:
    explicit Times(unsigned seed) : random_(seed) {}

    unsigned Scale()
    {
        static unsigned const usual[] = {1, 24, 25, 30, 600, 1001, 24000, 44100, 48000, 90000, UINT_MAX, 0x80000000u};
        return random_() % 2 ? usual[random_() % std::size(usual)] : static_cast<unsigned>(random_()) | 1u;
    }
    int Value()
    {
        static int const ends[] = {INT_MIN, INT_MIN + 1, -1, 0, 1, INT_MAX - 1, INT_MAX};
        switch (random_() % 4) {
        case 0: return ends[random_() % std::size(ends)];
        case 1: return static_cast<int>(random_());
        default: return static_cast<int>(random_() % 200001) - 100000;
        }
    }
    T_Time Time() { return {Value(), Scale()}; }

private:
    std::mt19937 random_;
};

Wide Gcd(Wide a, Wide b)
{
    while (b != 0) std::swap(a %= b, b);
    return a < 0 ? -a : a;
}

// Whether value/scale has a form that fits.
bool Fits(Wide value, Wide scale)
{
    Wide const divisor = Gcd(value, scale);
    value /= divisor;
    scale /= divisor;
    return value >= INT_MIN && value <= INT_MAX && scale <= UINT_MAX;
}

bool IsSame(T_Time const& time, Wide value, Wide scale)
{
    return time.scale != 0 && time.value * scale == value * time.scale;
}

// ---- conversion

TEST(TimeConversion, RoundsToTheNearestOrRefuses)
{
    const struct {
        char const* why;
        int value;
        unsigned scale, newScale;
        int code, result;
    } rows[] = {
        {"a half goes away from zero", 150, 600, 2, 0, 1},
        {"a negative half too", -150, 600, 2, 0, -1},
        {"the least value in its own scale", INT_MIN, 1, 1, 0, INT_MIN},
        {"the least value arrived at", INT_MIN / 2, 1, 2, 0, INT_MIN},
        {"one too great", (INT_MAX / 2) + 1, 1, 2, T_Err_Overflow, 0},
        {"one too small", (INT_MIN / 2) - 1, 1, 2, T_Err_Overflow, 0},
        {"rounded just beyond", INT_MAX, 2147483647u, 0x80000000u, T_Err_Overflow, 0},
        {"the greatest divisor", INT_MIN, UINT_MAX, 1, 0, -1},
        {"from no scale", 7, 0, 600, T_Err_Scale, 0},
        {"to no scale", 7, 600, 0, T_Err_Scale, 0},
        {"nothing of no scale", 0, 0, 600, T_Err_Scale, 0},
    };
    for (auto const& row : rows) {
        SCOPED_TRACE(row.why);
        int out = 12345;
        EXPECT_EQ(row.code, T_ShortConvTime(row.value, row.scale, row.newScale, &out));
        EXPECT_EQ(row.code ? 12345 : row.result, out) << "a failure leaves the destination alone";

        T_Time whole{row.value, row.scale};
        EXPECT_EQ(row.code, T_ConvTime(&whole, row.newScale, &whole, 0)) << "in place";
        EXPECT_EQ(row.code ? row.value : row.result, whole.value);
        EXPECT_EQ(row.code ? row.scale : row.newScale, whole.scale);
    }
}

TEST(TimeConversion, IsNeverMoreThanHalfAUnitOff)
{
    Times times(1);
    int fitted = 0;
    for (int i = 0; i < 100000; ++i) {
        T_Time const from = times.Time();
        unsigned const scale = times.Scale();
        int value = 0;
        int const code = T_ShortConvTime(from.value, from.scale, scale, &value);
        Wide const exact = static_cast<Wide>(from.value) * scale;  // in units of 1 / from.scale
        if (code == 0) {
            ++fitted;
            Wide const twice = 2 * (static_cast<Wide>(value) * from.scale - exact);
            ASSERT_TRUE(twice >= -static_cast<Wide>(from.scale) && twice <= from.scale) << from << " to " << scale;
        } else {
            Wide const beyond = exact > 0 ? 2 * exact - from.scale * (2 * static_cast<Wide>(INT_MAX) + 1) + 1
                                          : from.scale * (2 * static_cast<Wide>(INT_MIN) - 1) - 2 * exact + 1;
            ASSERT_GE(static_cast<long double>(beyond), 1) << from << " to " << scale;
        }
    }
    EXPECT_GT(fitted, 20000);
}

// ---- arithmetic

// Runs an operation that gives a time or throws.
template <class Operation>
int Try(Operation operation, T_Time* result)
{
    try {
        *result = operation();
        return 0;
    } catch (int code) {
        return code;
    }
}

void ExpectExact(int code, T_Time const& result, Wide value, Wide scale, char const* what, T_Time a, T_Time b)
{
    ASSERT_EQ(Fits(value, scale) ? 0 : T_Err_Overflow, code) << what << " " << a << ", " << b;
    ASSERT_TRUE(code != 0 || IsSame(result, value, scale)) << what << " " << a << ", " << b << " gave " << result;
}

TEST(TimeArithmetic, IsExactOrSaysThatItDoesNotFit)
{
    Times times(2);
    for (int i = 0; i < 100000 && !testing::Test::HasFatalFailure(); ++i) {
        T_Time const a = times.Time();
        T_Time b = times.Time();
        if (i % 3 == 0) b.scale = a.scale;
        Wide const scale = static_cast<Wide>(a.scale) * b.scale;
        Wide const left = static_cast<Wide>(a.value) * b.scale;
        Wide const right = static_cast<Wide>(b.value) * a.scale;
        T_Time result{};

        ExpectExact(T_AddTime(&a, &b, &result), result, left + right, scale, "add", a, b);
        ExpectExact(Try([&] { return a + b; }, &result), result, left + right, scale, "+", a, b);
        ExpectExact(Try([&] { return a - b; }, &result), result, left - right, scale, "-", a, b);
        T_Time sum = a;
        ExpectExact(Try([&] { return sum += b; }, &result), result, left + right, scale, "+=", a, b);

        M_Ratio const ratio{b.value, b.scale};
        ExpectExact(T_MulTime(&a, &ratio, &result), result, static_cast<Wide>(a.value) * b.value, scale, "mul", a, b);
        if (b.value != 0) {
            Wide const sign = b.value < 0 ? -1 : 1;
            ExpectExact(Try([&] { return a / b.value; }, &result), result, a.value * sign,
                        static_cast<Wide>(a.scale) * (b.value * sign), "/", a, b);
        }
    }
}

TEST(TimeArithmetic, ChoosesTheScalesItPromises)
{
    const struct {
        char const* why;
        T_Time a, b;
        int code;
        T_Time sum;
    } sums[] = {
        {"the common scale stays, though it could be reduced", {300, 600}, {300, 600}, 0, {600, 600}},
        {"the least common multiple", {1, 4}, {1, 6}, 0, {5, 12}},
        {"a value that doesn't fit, reduced", {1 << 30, 600}, {1 << 30, 600}, 0, {1 << 28, 75}},
        {"a value that doesn't fit", {INT_MAX, 1}, {1, 1}, T_Err_Overflow, {}},
        {"a scale that doesn't fit", {1, UINT_MAX}, {1, UINT_MAX - 1}, T_Err_Overflow, {}},
        {"no scale", {1, 0}, {1, 600}, T_Err_Scale, {}},
        {"no scale on the other side", {1, 600}, {1, 0}, T_Err_Scale, {}},
    };
    for (auto const& row : sums) {
        SCOPED_TRACE(row.why);
        T_Time sum{77, 77};
        EXPECT_EQ(row.code, T_AddTime(&row.a, &row.b, &sum));
        EXPECT_EQ(row.code ? 77 : row.sum.value, sum.value);
        EXPECT_EQ(row.code ? 77u : row.sum.scale, sum.scale);
    }
    T_Time const six{6, 600};
    T_Time const third = six / -3;
    EXPECT_EQ(-2, third.value);
    EXPECT_EQ(600u, third.scale) << "an exact quotient keeps the scale";
    T_Time const quarter = six / 4;
    EXPECT_EQ(6, quarter.value);
    EXPECT_EQ(2400u, quarter.scale);
    T_Time none{};
    EXPECT_EQ(T_Err_Scale, Try([&] { return six / 0; }, &none));
    M_Ratio const nonsense{1, 0};
    EXPECT_EQ(T_Err_Scale, T_MulTime(&six, &nonsense, &none));
}

// ---- order

TEST(TimeOrder, IsThatOfTheInstants)
{
    Times times(3);
    for (int i = 0; i < 100000; ++i) {
        T_Time const a = times.Time();
        T_Time b = times.Time();
        if (i % 4 == 0 && T_ConvTime(&a, times.Scale(), &b, 0) != 0) b = a;  // near or equal
        Wide const left = static_cast<Wide>(a.value) * b.scale;
        Wide const right = static_cast<Wide>(b.value) * a.scale;
        int result = 77;
        ASSERT_EQ(0, T_CompareTime(&a, &b, &result));
        ASSERT_EQ((left > right) - (left < right), result) << a << " and " << b;
        ASSERT_EQ(left == right, a == b);
        ASSERT_EQ(left != right, a != b);
        ASSERT_EQ(left < right, a < b);
        ASSERT_EQ(left <= right, a <= b);
        ASSERT_EQ(left > right, a > b);
        ASSERT_EQ(left >= right, a >= b);
    }
}

TEST(TimeOrder, IsTotalEvenWithTimesOfNoScale)
{
    T_Time const noTime{INT_MIN, 0};
    std::vector<T_Time> const ascending = {noTime,    {-1, 0}, {0, 0},        {5, 0},      {INT_MIN, 1},
                                           {-1, 600}, {0, 1},  {1, UINT_MAX}, {INT_MAX, 1}};
    for (std::size_t i = 0; i < ascending.size(); ++i)
        for (std::size_t k = 0; k < ascending.size(); ++k) {
            EXPECT_EQ(i < k, ascending[i] < ascending[k]) << ascending[i] << " and " << ascending[k];
            EXPECT_EQ(i == k, ascending[i] == ascending[k]) << ascending[i] << " and " << ascending[k];
        }
    T_Time const zero{0, 600};
    int result = 77;
    EXPECT_EQ(T_Err_Scale, T_CompareTime(&noTime, &zero, &result));
    EXPECT_EQ(T_Err_Scale, T_CompareTime(&zero, &noTime, &result));
    EXPECT_EQ(77, result);
    EXPECT_EQ(0, T_CompareTime(&noTime, &noTime, &result));
    EXPECT_EQ(0, result);
}

// ---- lowest terms, spans

TEST(TimeReduce, EqualInstantsHaveEqualLowestTerms)
{
    Times times(4);
    for (int i = 0; i < 20000; ++i) {
        T_Time const time = times.Time();
        T_Time reduced{};
        unsigned char changed = 77;
        ASSERT_EQ(0, T_ReduceTime(&time, &reduced, &changed));
        ASSERT_TRUE(IsSame(reduced, time.value, time.scale));
        ASSERT_TRUE(Gcd(reduced.value, reduced.scale) == 1) << time << " gave " << reduced;
        ASSERT_EQ(reduced.scale != time.scale, changed == 1);
    }
    T_Time time{0, 600};
    ASSERT_EQ(0, T_ReduceTime(&time, &time, nullptr));
    EXPECT_EQ(1u, time.scale) << "there is one zero";
    T_Time none{3, 0};
    EXPECT_EQ(T_Err_Scale, T_ReduceTime(&none, &none, nullptr));
}

struct Asked {
    char const* why;
    T_TimeSpan span;
    T_Time time;
    bool inside;
};

Asked const Spans[] = {
    {"the start belongs to it", {{10, 600}, {20, 600}}, {10, 600}, true},
    {"before the start", {{10, 600}, {20, 600}}, {9, 600}, false},
    {"the last unit", {{10, 600}, {20, 600}}, {29, 600}, true},
    {"the end doesn't", {{10, 600}, {20, 600}}, {30, 600}, false},
    {"the end in another scale", {{10, 600}, {20, 600}}, {1, 20}, false},
    {"just before the end in a finer scale", {{10, 600}, {20, 600}}, {59999, 1200000}, true},
    {"start and duration in scales of their own", {{1, 3}, {1, 7}}, {9, 19}, true},
    {"and just outside", {{1, 3}, {1, 7}}, {10, 21}, false},
    {"an end past the greatest time", {{INT_MAX, 1}, {INT_MAX, 1}}, {INT_MAX, 1}, true},
    {"the whole range", {{INT_MIN, 1}, {INT_MAX, 1}}, {-2, 1}, true},
    {"the whole range, its end", {{INT_MIN, 1}, {INT_MAX, 1}}, {-1, 1}, false},
    {"extreme scales", {{INT_MIN, UINT_MAX}, {INT_MAX, UINT_MAX}}, {0, UINT_MAX - 1}, false},
    {"nothing", {{10, 600}, {0, 600}}, {10, 600}, false},
    {"a negative duration", {{10, 600}, {-5, 600}}, {8, 600}, false},
    {"no time", {{10, 600}, {20, 600}}, {INT_MIN, 0}, false},
    {"no start", {{0, 0}, {20, 600}}, {0, 600}, false},
    {"no duration", {{0, 600}, {20, 0}}, {0, 600}, false},
};

TEST(TimeSpan, ContainsItsStartAndNotItsEnd)
{
    for (Asked const& row : Spans) EXPECT_EQ(row.inside, row.span.Contains(row.time)) << row.why;
}

TEST(TimeSpan, NormalIsTheSameSpanInOneScale)
{
    Times times(5);
    int made = 0;
    for (int i = 0; i < 20000; ++i) {
        T_TimeSpan const span{times.Time(), times.Time()};
        try {
            T_TimeSpan const normal = T_NormalizeSpan(span);
            ++made;
            ASSERT_EQ(normal.start.scale, normal.duration.scale);
            ASSERT_EQ(span.start, normal.start);
            ASSERT_EQ(span.duration, normal.duration);
        } catch (int code) {
            ASSERT_EQ(T_Err_Overflow, code);
        }
    }
    EXPECT_GT(made, 2000);

    T_TimeSpan const same = T_NormalizeSpan({{300, 600}, {0, 600}});
    EXPECT_EQ(300, same.start.value);
    EXPECT_EQ(600u, same.start.scale) << "a common scale stays";
    T_TimeSpan const reduced = T_NormalizeSpan({{0, UINT_MAX}, {5, UINT_MAX - 1}});
    EXPECT_EQ(UINT_MAX - 1, reduced.start.scale)
        << "where the multiple of the scales doesn't fit, that of the lowest does";
    EXPECT_THROW(T_NormalizeSpan({{0, 0}, {1, 1}}), int);
    EXPECT_THROW(T_NormalizeSpan({{1, 1}, {1, 0}}), int);
}

// ---- rounding of doubles

TEST(TimeFromSeconds, RoundsAndSaturates)
{
    double const infinity = std::numeric_limits<double>::infinity();
    double const nan = std::numeric_limits<double>::quiet_NaN();
    EXPECT_EQ(300, T_FpLong2TimeValue(600, 0.5));
    EXPECT_EQ(1, T_FpLong2TimeValue(2, 0.25));
    EXPECT_EQ(-1, T_FpLong2TimeValue(2, -0.25));
    EXPECT_EQ(0, T_FpLong2TimeValue(2, 0.2499));
    EXPECT_EQ(INT_MAX, T_FpLong2TimeValue(1, 2147483647.4));
    EXPECT_EQ(INT_MAX, T_FpLong2TimeValue(1, 2147483648.0));
    EXPECT_EQ(INT_MAX, T_FpLong2TimeValue(600, 1e300));
    EXPECT_EQ(INT_MIN, T_FpLong2TimeValue(600, -infinity));
    EXPECT_EQ(0, T_FpLong2TimeValue(600, nan));
    EXPECT_EQ(0, T_FpLong2TimeValue(0, infinity));
}

TEST(RoundDouble, IsTheNearestIntegerAtEverySize)
{
    std::pair<double, long> const table[] = {
        {0.5, 1},
        {-0.5, -1},
        {2.5, 3},
        {-2.5, -3},
        {0.49999999999999994, 0},
        {-0.49999999999999994, 0},
        {4503599627370497.5, 4503599627370498},
        {4503599627370495.5, 4503599627370496},
        {9007199254740993.0, 9007199254740992},
        {9223372036854774784.0, 9223372036854774784},
        {9223372036854775808.0, LONG_MAX},
        {-9223372036854775808.0, LONG_MIN},
        {-1e300, LONG_MIN},
        {std::numeric_limits<double>::infinity(), LONG_MAX},
        {std::numeric_limits<double>::quiet_NaN(), 0},
        {5e-324, 0},
    };
    for (auto const& [number, rounded] : table) EXPECT_EQ(rounded, M_RoundDouble(number)) << number;
    std::mt19937_64 random(6);
    for (int i = 0; i < 100000; ++i) {
        double const number =
            std::ldexp(static_cast<double>(static_cast<long>(random())), -static_cast<int>(random() % 70));
        ASSERT_EQ(std::lround(number), M_RoundDouble(number)) << number;
    }
}

}  // namespace
