#include "host/polyline.h"

#include "curves/tangents.h"
#include "tests/host/hosttest.h"
#include "tests/support/dice.h"
#include "tests/support/streams.h"

using kfshost::PolylinePoint;
using kfshost::Rational;

namespace {

using Polyline = HostTest;

// What the line says at a time: where it jumps what it says from there on.
double LineAt(std::vector<PolylinePoint> const& line, double seconds)
{
    auto const after = std::ranges::upper_bound(line, seconds, {}, &PolylinePoint::seconds);
    if (after == line.begin()) return line.front().value;
    PolylinePoint const& a = after[-1];
    if (after == line.end()) return a.value;
    return a.value + (after->value - a.value) * ((seconds - a.seconds) / (after->seconds - a.seconds));
}

TEST_F(Polyline, IsNoFartherFromTheReadsThanItsTolerance)
{
    constexpr int Scale = 600;
    std::size_t few = 0, many = 0;
    for (int round = 0; round < Rounds(150); ++round) {
        SCOPED_TRACE(testing::Message() << "round " << round);
        Dice dice(static_cast<std::uint64_t>(round));
        short const dimension = static_cast<short>(1 + dice.Below(3));
        TestStream stream({.dimension = dimension, .timeScale = Scale});
        int const keys = 2 + dice.Below(6);
        bool const straight = dice.Below(4) == 0;
        auto const interp = [&] {
            int const kind = dice.Below(3);
            return kind == 0 ? KFS_Interp_Hold : kind == 1 || straight ? KFS_Interp_Linear : KFS_Interp_Spline;
        };
        for (int i = 0; i < keys; ++i) {
            double const x = dice.Between(-9, 9), y = dice.Between(-9, 9), z = dice.Between(-9, 9);
            char const in = interp(), out = interp();
            stream.Key(Scale * i / 4 + dice.Below(100), {x, y, z}, in, out);
            double speed[6], influence[6];
            for (int k = 0; k < 6; ++k) speed[k] = dice.Between(-90, 90);
            for (int k = 0; k < 6; ++k) influence[k] = dice.Between(0.05, 0.9);
            EXPECT_EQ(0, KFS_SetKeyVelocityF(stream, i, speed, speed + 3));
            EXPECT_EQ(0, KFS_SetKeyInfluence(stream, i, influence, influence + 3));
        }
        int const component = dice.Below(dimension);
        int const from = dice.Below(Scale * 2) - Scale / 2, to = from + 1 + dice.Below(Scale * 2);
        double const tolerance = dice.Below(2) == 0 ? 0.5 : 1e-4;
        auto const line =
            kfshost::SamplePolyline(*stream, component, Rational(from, Scale), Rational(to, Scale), tolerance);
        ASSERT_FALSE(line.empty());
        EXPECT_TRUE(std::ranges::is_sorted(line, {}, &PolylinePoint::seconds));
        EXPECT_TRUE(!straight || line.size() <= 2u * static_cast<std::size_t>(keys));
        (tolerance > 0.1 ? few : many) += line.size();
        std::vector<int> const atKeys = stream.Times();
        for (int time = from; time <= to; ++time) {
            if (std::ranges::count(atKeys, time) > 0) continue;  // where it jumps there are two values
            double const read = ReadOne(*stream, Rational(time, Scale), static_cast<std::size_t>(component));
            ASSERT_NEAR(read, LineAt(line, static_cast<double>(time) / Scale), tolerance * (1 + 1e-6)) << "at " << time;
        }
    }
    EXPECT_GT(many, 3 * few);
}

TEST_F(Polyline, RefusesWhatNobodyDraws)
{
    TestStream stream;
    for (int i = 0; i < 40; ++i) stream.Key(i * 1000, {i % 2 * 1e9}, KFS_Interp_Spline);
    EXPECT_THROW(static_cast<void>(kfshost::SamplePolyline(*stream, 0, Rational(), Rational(100, 1), 1e-9)),
                 kfshost::PolylineError);
    TestStream constant({.noKeys = true});
    EXPECT_TRUE(kfshost::SamplePolyline(*constant, 0, Rational(), Rational(1, 1), 1.0).empty());
    constant.Key(0, {7.0});
    auto const line = kfshost::SamplePolyline(*constant, 0, Rational(1, 2), Rational(1, 1), 1.0);
    ASSERT_EQ(1u, line.size());
    EXPECT_EQ(7.0, line[0].value);
    EXPECT_EQ(0.5, line[0].seconds);
}

}  // namespace
