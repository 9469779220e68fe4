#include "host/names.h"
#include "host/rational.h"
#include "host/timescale.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <climits>
#include <cmath>
#include <limits>
#include <random>
#include <stdexcept>
#include <vector>

using kfshost::Rational;

TEST(Rational, ReadsWhatTheTextSaysExactly)
{
    struct Row {
        char const* text;
        std::int64_t numerator;
        std::int64_t denominator;
    };
    for (auto const& [text, numerator, denominator] : {Row{"12", 12, 1},
                                                       {"-12", -12, 1},
                                                       {"0.5", 1, 2},
                                                       {"-0.25", -1, 4},
                                                       {".0083333", 83333, 10000000},
                                                       {"5.", 5, 1},
                                                       {"30000/1001", 30000, 1001},
                                                       {"-6/8", -3, 4},
                                                       {"8.3333e-3", 83333, 10000000},
                                                       {"2.5E+2", 250, 1},
                                                       {"9223372036854775807", LLONG_MAX, 1}}) {
        auto const value = Rational::Parse(text);
        ASSERT_TRUE(value) << text;
        EXPECT_EQ(Rational(numerator, denominator), *value) << text;
    }
}

TEST(Rational, RefusesEveryOtherText)
{
    for (char const* text : {"",     "-",    ".",      "1/0",    "1/",     "/2",  "1.2.3", "--1",
                             "1/-2", "+1",   " 1",     "1 ",     "0x10",   "nan", "inf",   "9223372036854775808",
                             "1e",   "1e99", "9e18/1", "1e18.5", "100e18", "1,5"})
        EXPECT_FALSE(Rational::Parse(text)) << text;
}

TEST(Rational, RoundsToUnitsWithHalvesAwayFromZeroAndStaysInRange)
{
    EXPECT_EQ(3, Rational(5, 2).ToUnits(1));
    EXPECT_EQ(-3, Rational(-5, 2).ToUnits(1));
    EXPECT_EQ(1, Rational(1, 3).ToUnits(2));
    EXPECT_EQ(0, Rational(1, 3).ToUnits(1));
    EXPECT_EQ(INT_MAX, Rational(LLONG_MAX, 1).ToUnits(UINT_MAX));
    EXPECT_EQ(-INT_MAX, Rational(LLONG_MIN + 1, 1).ToUnits(UINT_MAX));
}

TEST(Rational, ArithmeticHoldsItselfAgainstIntegers)
{
    std::mt19937 random(7);
    std::uniform_int_distribution<int> numbers(-1000, 1000);
    for (int i = 0; i < 2000; ++i) {
        int const a = numbers(random);
        int const b = 1 + std::abs(numbers(random));
        int const c = numbers(random);
        int const d = 1 + std::abs(numbers(random));
        Rational const x(a, b);
        Rational const y(c, d);
        EXPECT_EQ(Rational(a * d + c * b, b * d), x + y);
        EXPECT_EQ(x, x + y - y);
        EXPECT_EQ(a * d < c * b, x < y);
        if (c != 0) EXPECT_EQ(x, x * y / y);
    }
    EXPECT_THROW(Rational(LLONG_MAX, 1) + Rational(1, 1), std::overflow_error);
    EXPECT_THROW(Rational(1, 1) / Rational(), std::invalid_argument);
}

namespace {

std::vector<float> Frames(int count, double fps)
{
    std::vector<float> times;
    for (int i = 0; i < count; ++i) times.push_back(static_cast<float>(i / fps));
    return times;
}

}  // namespace

TEST(TimeScale, TakesTheFirstWellKnownScaleInWhichAllTimesAreWhole)
{
    struct Row {
        char const* why;
        std::vector<float> times;
        unsigned int scale;
    };
    Row const rows[] = {
        {"no keys", {}, 120000},
        {"film", Frames(200, 24), 120000},
        {"ntsc", Frames(200, 30000.0 / 1001), 120000},
        {"double ntsc", Frames(200, 60000.0 / 1001), 120000},
        {"milliseconds", {0.001F, 0.017F, 1.234F}, 120000},
        {"a handheld display", Frames(100, 72), 360000},
        {"a fast display", Frames(100, 144), 360000},
        {"microseconds", {0.000001F, 0.123457F, 1.5F}, 1000000},
        {"three hours of frames", {0.0F, 10800.0F}, 30000},
        {"before the start", {-0.5F, 0.0F}, 120000},
    };
    for (Row const& row : rows) {
        kfshost::TimeScale const scale = kfshost::ChooseTimeScale(row.times);
        EXPECT_EQ(row.scale, scale.scale) << row.why;
        EXPECT_TRUE(scale.exact) << row.why;
    }
}

// Whatever the times are: the result says truly how far off keys are, and no key is off by more than half a unit.
TEST(TimeScale, SaysHowFarOffItIs)
{
    std::mt19937 random(11);
    for (float const span : {1e-3F, 1.0F, 30.0F, 4000.0F, 1e6F}) {
        std::uniform_real_distribution<float> seconds(0.0F, span);
        std::vector<float> times(200);
        std::ranges::generate(times, [&] { return seconds(random); });
        kfshost::TimeScale const scale = kfshost::ChooseTimeScale(times);
        double worst = 0.0;
        bool exact = true;
        for (float const time : times) {
            int const units = kfshost::ToUnits(time, scale.scale);
            EXPECT_LE(std::abs(units), kfshost::MaxKeyUnits);
            double const found = static_cast<double>(units) / scale.scale;
            worst = std::max(worst, std::abs(found - static_cast<double>(time)));
            exact = exact && static_cast<float>(found) == time;
        }
        EXPECT_EQ(worst, scale.worstError) << span;
        EXPECT_EQ(exact, scale.exact) << span;
        EXPECT_LE(worst, 0.5 / scale.scale) << span;
    }
}

TEST(TimeScale, RefusesTimesThatFitNoScale)
{
    std::array<float, 1> const times{2e9F};
    EXPECT_THROW(kfshost::ChooseTimeScale(times), std::range_error);
    std::array<float, 1> const fits{2.0F};
    EXPECT_THROW(kfshost::JudgeTimeScale(fits, 1U << 31), std::range_error);
    EXPECT_THROW(kfshost::JudgeTimeScale(fits, 0), std::range_error);
}

TEST(Names, BecomeTextThatCanBeShownAnywhere)
{
    EXPECT_EQ("Ball", kfshost::CleanName("Ball"));
    EXPECT_EQ("K\xC3\xB6rper \xF0\x9F\x8E\x88", kfshost::CleanName("K\xC3\xB6rper \xF0\x9F\x8E\x88"));
    EXPECT_EQ("a?[31mb?", kfshost::CleanName("a\x1B[31mb\x7F"));
    EXPECT_EQ("??", kfshost::CleanName("\xC3\xFF"));            // cut off, and no lead byte
    EXPECT_EQ("??", kfshost::CleanName("\xC0\x80"));            // overlong
    EXPECT_EQ("???", kfshost::CleanName("\xED\xA0\x80"));       // surrogate
    EXPECT_EQ("????", kfshost::CleanName("\xF4\x90\x80\x80"));  // past the last code point
    EXPECT_EQ("?", kfshost::CleanName("\xC2\x85"));             // next line
    EXPECT_EQ("\xC2\xA0", kfshost::CleanName("\xC2\xA0"));
}

TEST(Names, AreGivenOnce)
{
    kfshost::UniqueNames names;
    EXPECT_EQ("a", names.Make("a"));
    EXPECT_EQ("a#2", names.Make("a"));
    EXPECT_EQ("a#3", names.Make("a"));
    EXPECT_EQ("a#2#2", names.Make("a#2"));
}
