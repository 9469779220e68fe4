#include "curves/derivatives.h"

#include "curves/spacetangents.h"
#include "curves/tangents.h"
#include "frame/errors.h"
#include "tests/support/streams.h"

#include <cmath>
#include <random>

namespace {

class Derivatives : public StreamTest {
protected:
    double Rate(KFS_Stream const* stream, int time) const
    {
        T_Time const at{time, stream->GetTimeScale()};
        double rate = -12345.0;
        EXPECT_EQ(0, KFS_GetDeriv(stream, &at, KFS_Deriv_Velocity, 0, 0, &rate, nullptr, nullptr, {}, {}));
        return rate;
    }
};

struct Handles {
    double value0, speed0, influence0, value1, speed1, influence1;
};

// dy/dx of the segment's cubic at x, a share of its `seconds`: x by bisection in long double, then the quotient.
long double TrueRate(Handles const& h, long double seconds, long double x)
{
    auto const cubic = [](long double a, long double b, long double c, long double d, long double t) {
        long double const s = 1 - t;
        return s * s * s * a + 3 * s * s * t * b + 3 * s * t * t * c + t * t * t * d;
    };
    auto const slope = [](long double a, long double b, long double c, long double d, long double t) {
        long double const s = 1 - t;
        return 3 * (s * s * (b - a) + 2 * s * t * (c - b) + t * t * (d - c));
    };
    long double const x1 = h.influence0, x2 = 1 - h.influence1;
    long double low = 0, high = 1;
    for (int i = 0; i < 200; ++i) {
        long double const middle = (low + high) / 2;
        (cubic(0, x1, x2, 1, middle) < x ? low : high) = middle;
    }
    long double const y1 = h.value0 + h.speed0 * x1 * seconds, y2 = h.value1 - h.speed1 * h.influence1 * seconds;
    return slope(h.value0, y1, y2, h.value1, low) / (slope(0, x1, x2, 1, low) * seconds);
}

TEST_F(Derivatives, AreThoseOfTheCurve)
{
    std::mt19937 random(7);
    std::uniform_real_distribution<double> value(-100, 100), speed(-300, 300), influence(0.01, 1.0);
    for (int round = 0; round < 2000; ++round) {
        Handles const h{value(random), speed(random), influence(random),
                        value(random), speed(random), influence(random)};
        TestStream stream;
        stream.Key(0, {h.value0}, KFS_Interp_Spline).Key(1000, {h.value1}, KFS_Interp_Spline);
        ASSERT_EQ(0, KFS_SetKeyVelocityF(stream, 0, nullptr, &h.speed0));
        ASSERT_EQ(0, KFS_SetKeyInfluence(stream, 0, nullptr, &h.influence0));
        ASSERT_EQ(0, KFS_SetKeyVelocityF(stream, 1, &h.speed1, nullptr));
        ASSERT_EQ(0, KFS_SetKeyInfluence(stream, 1, &h.influence1, nullptr));
        EXPECT_EQ(h.speed0, Rate(stream, 0));
        EXPECT_EQ(h.speed1, Rate(stream, 1000));
        EXPECT_EQ(0.0, Rate(stream, -1));
        EXPECT_EQ(0.0, Rate(stream, 1001));
        for (int time : {1, 137, 500, 861, 999}) {
            long double const wanted = TrueRate(h, 1000.0L / 600, time / 1000.0L);
            // Near a vertical tangent a rate says more of rounding than of the curve.
            if (std::fabs(wanted) > 1e4L) continue;
            EXPECT_NEAR(static_cast<double>(wanted), Rate(stream, time), 1e-7 * (1.0 + std::fabs(double(wanted))))
                << round << " at " << time << ": " << h.influence0 << " " << h.influence1;
        }
    }
}

TEST_F(Derivatives, FollowTheCodesOfTheSegment)
{
    constexpr char L = KFS_Interp_Linear, H = KFS_Interp_Hold, S = KFS_Interp_Spline;
    struct Row {
        char out, in;
        double rate;  // a quarter into a segment from 0 to 60 in one second
    } const rows[] = {{L, L, 60.0}, {H, L, 0.0}, {L, H, 0.0}, {H, H, 0.0}, {S, H, 0.0}};
    for (Row const& row : rows) {
        TestStream stream;
        stream.Key(0, {0.0}, L, row.out).Key(600, {60.0}, row.in, L).Key(1200, {90.0}, L);
        EXPECT_DOUBLE_EQ(row.rate, Rate(stream, 150)) << int(row.out) << int(row.in);
        double const value = stream.At1(150);  // the record holds no rate afterwards
        EXPECT_EQ(row.out == H ? 0.0 : row.in == H ? 60.0 : 15.0, value);
    }

    TestStream stream({.dimension = 2});
    stream.Key(0, {0.0, 0.0}).Key(600, {60.0, -30.0});
    T_Time const at{300, 600}, key{600, 600};
    double rates[2] = {7.0, 7.0};
    unsigned char atKey = 9;
    EXPECT_EQ(0, KFS_GetDeriv(stream, &at, KFS_Deriv_Velocity, 1, 0, rates, &atKey, nullptr, {}, {}));
    EXPECT_EQ(7.0, rates[0]) << "only keys were asked for";
    EXPECT_EQ(0, atKey);
    EXPECT_EQ(0, KFS_GetDeriv(stream, &key, KFS_Deriv_Velocity, 1, 0, rates, &atKey, nullptr, {}, {}));
    EXPECT_EQ(1, atKey);
    char** made = nullptr;
    EXPECT_EQ(0, KFS_GetDerivs(stream, &at, &at, 0, 0, nullptr, &made, nullptr, {}, {}));
    EXPECT_DOUBLE_EQ(-30.0, reinterpret_cast<double*>(*made)[1]);
    Q_FreeHandle(made);

    TestStream constant({.noKeys = true});
    EXPECT_EQ(7427, KFS_GetDeriv(constant, &at, 0, 0, 0, rates, nullptr, nullptr, {}, {}));
    EXPECT_EQ(1u, reports.Take().size());
    constant.Key(0, {5.0});
    EXPECT_EQ(0.0, Rate(constant, 77));
}

TEST_F(Derivatives, OfAPathAreItsSpeedAndItsDirection)
{
    TestStream path({.dimension = 2, .spatial = true});
    path.Key(0, {10.0, 20.0}).Key(600, {40.0, 60.0}).Key(1200, {40.0, 60.0}).Key(1800, {70.0, 60.0});
    double const none[2] = {};
    for (int key = 0; key < 4; ++key) {  // straight from key to key
        ASSERT_EQ(0, KFS_SetKeySpaceTangentsF(path, key, -1, none, none));
        ASSERT_EQ(0, KFS_SetKeySpModifiable(path, 0, key));
    }
    EXPECT_NEAR(50.0, Rate(path, 200), 1e-6);
    EXPECT_NEAR(0.0, Rate(path, 900), 1e-9);

    auto const tangent = [&](int time) {
        T_Time const at{time, 600};
        std::vector<double> way(2, -7.0);
        EXPECT_EQ(0, KFS_GetSpaceTangent(path, &at, 0, 0, way.data(), nullptr, nullptr));
        return way;
    };
    std::vector<double> const moving = tangent(200);
    EXPECT_NEAR(0.0, moving[0] * 40.0 - moving[1] * 30.0, 1e-9);
    EXPECT_GT(moving[0], 0.0);
    EXPECT_EQ((std::vector<double>{0.0, 0.0}), tangent(900)) << "nothing moves within reach";
    EXPECT_GT(tangent(1195)[0], 0.0) << "it goes on five units of time later";
    EXPECT_GT(tangent(1805)[0], 0.0) << "behind the last key it looks back";

    TestStream plain;
    plain.Key(0, {1.0});
    T_Time const at{0, 600};
    double way[2];
    EXPECT_EQ(KFS_Err_NotSpatial, KFS_GetSpaceTangent(plain, &at, 0, 0, way, nullptr, nullptr));
    EXPECT_EQ(1u, reports.Take().size());
}

}  // namespace
