#include "host/names.h"
#include "host/rational.h"
#include "host/timescale.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <cmath>
#include <limits>
#include <random>
#include <sstream>
#include <stdexcept>
#include <tuple>
#include <utility>
#include <vector>

using kfshost::Rational;

TEST(Rational, ReadsWhatTheTextSaysExactlyAndRefusesEveryOther)
{
    std::istringstream rows("12 12 1  -12 -12 1  0.5 1 2  -0.25 -1 4  .0083333 83333 10000000  5. 5 1 "
                            "30000/1001 30000 1001  -6/8 -3 4  8.3333e-3 83333 10000000  2.5E+2 250 1 "
                            "9223372036854775807 9223372036854775807 1");
    std::string read;
    for (std::int64_t numerator = 0, denominator = 0; rows >> read >> numerator >> denominator;)
        EXPECT_EQ(Rational(numerator, denominator), Rational::Parse(read)) << read;
    EXPECT_TRUE(rows.eof());
    for (char const* text : {"",     "-",    ".",      "1/0",    "1/",     "/2",  "1.2.3", "--1",
                             "1/-2", "+1",   " 1",     "1 ",     "0x10",   "nan", "inf",   "9223372036854775808",
                             "1e",   "1e99", "9e18/1", "1e18.5", "100e18", "1,5"})
        EXPECT_FALSE(Rational::Parse(text)) << text;
    // Units have halves away from zero and stay in range.
    EXPECT_EQ((std::vector<int>{3, -3, 1, 0, INT_MAX, -INT_MAX}),
              (std::vector<int>{Rational(5, 2).ToUnits(1), Rational(-5, 2).ToUnits(1), Rational(1, 3).ToUnits(2),
                                Rational(1, 3).ToUnits(1), Rational(LLONG_MAX, 1).ToUnits(UINT_MAX),
                                Rational(LLONG_MIN + 1, 1).ToUnits(UINT_MAX)}));
}

TEST(Rational, ArithmeticHoldsItselfAgainstIntegers)
{
    std::mt19937 random(7);
    std::uniform_int_distribution<int> numbers(-1000, 1000);
    for (int i = 0; i < 2000; ++i) {
        int const a = numbers(random), b = 1 + std::abs(numbers(random));
        int const c = numbers(random), d = 1 + std::abs(numbers(random));
        Rational const x(a, b), y(c, d);
        EXPECT_EQ(Rational(a * d + c * b, b * d), x + y);
        EXPECT_EQ(x, x + y - y);
        EXPECT_EQ(a * d < c * b, x < y);
        EXPECT_TRUE(c == 0 || x == x * y / y);
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
    using Row = std::tuple<char const*, std::vector<float>, unsigned int>;
    for (auto const& [why, times, wanted] : {Row{"no keys", {}, 120000},
                                             {"film", Frames(200, 24), 120000},
                                             {"ntsc", Frames(200, 30000.0 / 1001), 120000},
                                             {"milliseconds", {0.001F, 0.017F, 1.234F}, 120000},
                                             {"a handheld display", Frames(100, 72), 360000},
                                             {"microseconds", {0.000001F, 0.123457F, 1.5F}, 3000000},
                                             {"film but for one key", {0.0F, 1.0F / 24, 2.0F / 24, 0.123457F}, 3000000},
                                             {"three hours of frames", {0.0F, 10800.0F}, 30000},
                                             {"before the start", {-0.5F, 0.0F}, 120000}}) {
        kfshost::TimeScale const scale = kfshost::ChooseTimeScale(times);
        EXPECT_EQ(wanted, scale.scale) << why;
        EXPECT_TRUE(scale.exact) << why;
    }
}

// A frame is a whole number of units, wherever its float is by a last place or two.
TEST(TimeScale, KeysAtFramesStandOnThem)
{
    std::mt19937 random(3);
    for (kfshost::FrameRate const& rate : kfshost::UsualRates) {
        std::vector<float> times;
        for (int frame = 1; frame < 300; ++frame) {
            auto time = static_cast<float>(static_cast<double>(frame) * rate.denominator / rate.numerator);
            for (unsigned int step = random() % 3; step > 0; --step) time = std::nextafter(time, random() % 2 * 100.0F);
            times.push_back(time);
        }
        kfshost::TimeScale const scale = kfshost::ChooseTimeScale(times);
        EXPECT_TRUE(scale.exact);
        for (int frame = 1; frame < 300; ++frame) {
            Rational const meant = Rational(frame, 1) / rate.ToRational();
            ASSERT_EQ(meant, Rational(scale.ToUnits(times[static_cast<std::size_t>(frame) - 1]), scale.scale));
        }
        for (kfshost::FrameRate const& other : kfshost::UsualRates)
            if (other.numerator % 24 == 0 && other.numerator != 72 && other.numerator != 144)
                EXPECT_EQ(0, std::int64_t{scale.scale} * other.denominator % other.numerator) << other.numerator;
    }
}

TEST(FrameTimes, AreWhatTheirDigitsAreMeantFor)
{
    std::istringstream rows("0.0083 1/120  .0083333 1/120  0.00833 1/120  8.3333e-3 1/120  0.0083333333333333332 1/120 "
                            "0.008333333767950535 1/120  0.033 1/30  0.0333 1/30  0.033367 1001/30000 "
                            "0.0166833 1001/60000  0.041708333 1001/24000  0.0417 1/24  0.066667 1/15  0.04 1/25 "
                            "0.03 3/100  0.016 2/125  1/120 1/120  0.041 41/1000  0.0412 103/2500  5 5 "
                            "0.1234567890123456 123456789012/1000000000000");
    for (std::string read, time; rows >> read >> time;)
        EXPECT_EQ(Rational::Parse(time), kfshost::ParseFrameTime(read)) << read;
    for (char const* text : {"", "0", "-0.04", "fast", "nan", "inf", "1e400", "0x1"})
        EXPECT_FALSE(kfshost::ParseFrameTime(text)) << text;
}

// Whatever the times are: the result says truly how far off keys are, and no key is off by more than half a unit, or
// what a frame may be.
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
            int const units = scale.ToUnits(time);
            EXPECT_LE(std::abs(units), kfshost::MaxKeyUnits);
            double const found = static_cast<double>(units) / scale.scale;
            worst = std::max(worst, std::abs(found - static_cast<double>(time)));
            float const last = std::nextafter(time, HUGE_VALF) - time;
            EXPECT_LE(std::abs(found - static_cast<double>(time)),
                      0.500001 / scale.scale + (kfshost::FrameTolerance + 0.5) * static_cast<double>(last));
            exact = exact && static_cast<float>(found) == time;
        }
        EXPECT_EQ(worst, scale.worstError) << span;
        EXPECT_TRUE(!exact || scale.exact) << span;
    }
    EXPECT_THROW(kfshost::ChooseTimeScale(std::vector{2e9F}), std::range_error);
    for (unsigned int const scale : {1U << 31, 0U})
        EXPECT_THROW(kfshost::JudgeTimeScale(std::vector{2.0F}, scale), std::range_error);
}

TEST(Names, BecomeTextThatCanBeShownAnywhereAndAreGivenOnce)
{
    for (char const* kept : {"Ball", "K\xC3\xB6rper \xF0\x9F\x8E\x88", "\xC2\xA0"})
        EXPECT_EQ(kept, kfshost::CleanName(kept));
    std::pair<char const*, char const*> const rows[] = {
        {"a\x1B[31mb\x7F", R"(a\x1b[31mb\x7f)"},
        {"\xC3\xFF", R"(\xc3\xff)"},                  // cut off, and no lead byte
        {"\xC0\x80", R"(\xc0\x80)"},                  // overlong
        {"\xED\xA0\x80", R"(\xed\xa0\x80)"},          // surrogate
        {"\xF4\x90\x80\x80", R"(\xf4\x90\x80\x80)"},  // past the last code point
        {"\xC2\x85", R"(\xc2\x85)"}};                 // next line
    for (auto const& [name, clean] : rows) EXPECT_EQ(clean, kfshost::CleanName(name));
    kfshost::UniqueNames names;
    for (auto const& [wanted, given] : {std::pair("a", "a"), {"a", "a#2"}, {"a", "a#3"}, {"a#2", "a#2#2"}})
        EXPECT_EQ(given, names.Make(wanted));
}
