#include "host/rotations.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <numbers>
#include <numeric>
#include <random>

using kfshost::RotationKey;

namespace {

using Quaternion = std::array<double, 4>;

constexpr double Radian = std::numbers::pi / 180.0;

Quaternion Product(Quaternion const& a, Quaternion const& b)
{
    return {
        a[3] * b[0] + a[0] * b[3] + a[1] * b[2] - a[2] * b[1], a[3] * b[1] - a[0] * b[2] + a[1] * b[3] + a[2] * b[0],
        a[3] * b[2] + a[0] * b[1] - a[1] * b[0] + a[2] * b[3], a[3] * b[3] - a[0] * b[0] - a[1] * b[1] - a[2] * b[2]};
}

// Degrees, good for small angles too.
double Angle(Quaternion const& a, Quaternion const& b)
{
    double near = 0.0, far = 0.0;  // squares of the distances, one with the sign of b turned
    for (std::size_t d = 0; d < 4; ++d) {
        near += (a[d] - b[d]) * (a[d] - b[d]);
        far += (a[d] + b[d]) * (a[d] + b[d]);
    }
    return 4.0 * std::asin(std::min(1.0, std::sqrt(std::min(near, far)) / 2.0)) / Radian;
}

Quaternion Slerp(double const* a, double const* b, double u)
{
    double const between = std::acos(std::min(1.0, std::inner_product(a, a + 4, b, 0.0)));
    Quaternion q{};
    for (std::size_t i = 0; i < 4; ++i)
        q[i] = (std::sin((1.0 - u) * between) * a[i] + std::sin(u * between) * b[i]) / std::sin(between);
    return q;
}

}  // namespace

// Between random keys: added keys lie on the arc, and nowhere is the way between two of them farther off than was asked.
TEST(Rotations, KeysOnTheArcKeepTheTolerance)
{
    std::mt19937 random(21);
    std::normal_distribution<double> normal;
    for (double const tolerance : {5.0, 0.5, 0.01, 0.0001}) {
        for (int round = 0; round < 40; ++round) {
            std::array<double, 8> pair{};
            for (double& number : pair) number = normal(random);
            for (std::size_t const start : {0U, 4U}) kfshost::Normalise(pair.data() + start);
            kfshost::AlignSigns(pair);
            int const length = 99991 + static_cast<int>(random() % 1000);  // even and odd
            std::vector<RotationKey> const ends{{7, {pair[0], pair[1], pair[2], pair[3]}},
                                                {7 + length, {pair[4], pair[5], pair[6], pair[7]}}};
            auto const keys = kfshost::WithArcKeys(ends, tolerance);
            ASSERT_GE(keys.size(), 2U);
            for (std::size_t i = 1; i < keys.size(); ++i) {
                ASSERT_LT(keys[i - 1].time, keys[i].time);
                for (int step = 0; step <= 10; ++step) {
                    double const time = keys[i - 1].time + (keys[i].time - keys[i - 1].time) * step / 10.0;
                    Quaternion chord{};
                    for (std::size_t d = 0; d < 4; ++d)
                        chord[d] = keys[i - 1].value[d] + (keys[i].value[d] - keys[i - 1].value[d]) * step / 10.0;
                    kfshost::Normalise(chord.data());
                    Quaternion const arc = Slerp(pair.data(), pair.data() + 4, (time - 7) / length);
                    ASSERT_LE(Angle(chord, arc), tolerance + 2e-5) << "tolerance " << tolerance << " round " << round;
                }
            }
        }
    }
}

// An angle about each axis in turn, put together by hand, comes back in each order, at the poles as a rotation.
TEST(Rotations, AnglesMultiplyToTheRotation)
{
    std::mt19937 random(5);
    std::uniform_real_distribution<double> angle(-180.0, 180.0);
    auto const turn = [](int axis, double degrees) {
        Quaternion q{0, 0, 0, std::cos(degrees * Radian / 2)};
        q[static_cast<std::size_t>(axis)] = std::sin(degrees * Radian / 2);
        return q;
    };
    for (char const* name : {"XYZ", "XZY", "YXZ", "yzx", "ZXY", "ZYX"}) {
        auto const order = kfshost::EulerOrder::Parse(name);
        ASSERT_TRUE(order);
        for (int round = 0; round < 300; ++round) {
            double const middle = round % 10 == 0 ? (round % 20 == 0 ? 90.0 : -90.0) : angle(random) / 2.0;
            Quaternion const whole =
                Product(turn(order->axes[0], angle(random)),
                        Product(turn(order->axes[1], middle), turn(order->axes[2], angle(random))));
            double found[3];
            kfshost::ToEuler(whole.data(), *order, found);
            EXPECT_NEAR(middle, found[1], 2e-5) << name;
            Quaternion const again = Product(turn(order->axes[0], found[0]),
                                             Product(turn(order->axes[1], found[1]), turn(order->axes[2], found[2])));
            EXPECT_LT(Angle(whole, again), 1e-4) << name << ' ' << middle;
        }
    }
    for (char const* name : {"", "XY", "XXY", "XYW", "XYZX"}) EXPECT_FALSE(kfshost::EulerOrder::Parse(name)) << name;
}

TEST(Rotations, ZerosAndGiantsHaveALengthToo)
{
    Quaternion zero{};
    kfshost::Normalise(zero.data());
    EXPECT_EQ(Quaternion{}, zero);
    Quaternion giant{1e308, 0, 0, 1e308};
    kfshost::Normalise(giant.data());
    EXPECT_NEAR(std::sqrt(0.5), giant[0], 1e-15);
}
