// The library as a host with services of its own gets it: on a list of another make (list.cpp), and on a kernel that
// counts what it is asked.
#include "curves/tangents.h"
#include "frame/services/curvekernel.h"
#include "tests/support/streams.h"

#include <dlfcn.h>

#include <iterator>
#include <map>
#include <random>

namespace {

int solves = 0;
int points = 0;

template <class Func>
Func Next(char const* name)
{
    return reinterpret_cast<Func>(dlsym(RTLD_NEXT, name));
}

}  // namespace

int CRV_EvaluateYFromX(CRV_Curve const* curve, double* y, double x)
{
    ++solves;
    return Next<decltype(&CRV_EvaluateYFromX)>("_Z18CRV_EvaluateYFromXPK9CRV_CurvePdd")(curve, y, x);
}

int CRV_EvaluatePoint(CRV_Curve const* curve, double* point, double t)
{
    ++points;
    return Next<decltype(&CRV_EvaluatePoint)>("_Z17CRV_EvaluatePointPK9CRV_CurvePdd")(curve, point, t);
}

namespace {

class ForeignServices : public testing::Test {
    kfshost::Session session_;
};

TEST_F(ForeignServices, KeysLieInAListOfAnotherMake)
{
    std::map<int, double> expected;
    TestStream const stream;
    std::mt19937 random(1);
    for (int step = 0; step < 2000; ++step) {
        int const time = static_cast<int>(random() % 200);
        T_Time const at = stream.Time(time);
        double const value = random() % 1000;
        if (random() % 3 != 0) {
            ASSERT_EQ(0, KFS_InsertKeyF(stream, &at, 1, &value, KFS_Interp_Linear, KFS_Interp_Linear));
            expected[time] = value;
        } else if (expected.contains(time) && expected.size() > 1) {
            auto const index = std::distance(expected.begin(), expected.find(time));
            ASSERT_EQ(0, KFS_RemoveKey(stream, static_cast<int>(index), nullptr));
            expected.erase(time);
        }
        if (expected.empty()) continue;
        int const asked = static_cast<int>(random() % 200);
        auto const next = expected.lower_bound(asked);
        double wanted = next == expected.end() ? std::prev(next)->second : next->second;
        if (next != expected.begin() && next != expected.end()) {
            auto const before = std::prev(next);
            wanted = before->second + (next->second - before->second) * (asked - before->first) /
                                          static_cast<double>(next->first - before->first);
        }
        ASSERT_NEAR(wanted, stream.At1(asked), 1e-9) << "step " << step;
        ASSERT_EQ(0, stream.Pins());
    }
    EXPECT_EQ(static_cast<int>(expected.size()), stream.Count());
}

TEST_F(ForeignServices, CurvesAreTheKernelsAffair)
{
    TestStream stream;
    stream.Key(0, {0}, KFS_Interp_Spline).Key(600, {10}, KFS_Interp_Spline);
    double const speed = 0.0;
    double const third = 1.0 / 3.0;
    for (int const key : {0, 1}) {
        ASSERT_EQ(0, KFS_SetKeyVelocityF(stream, key, &speed, &speed));
        ASSERT_EQ(0, KFS_SetKeyInfluence(stream, key, &third, &third));
    }
    solves = 0;
    for (int time = 1; time < 600; ++time) {
        double const u = time / 600.0;
        ASSERT_NEAR(10 * u * u * (3 - 2 * u), stream.At1(time), 1e-9) << time;
    }
    EXPECT_EQ(599, solves) << "each read asks once";
}

TEST_F(ForeignServices, PathsAreTheKernelsAffair)
{
    TestStream stream({.dimension = 2, .spatial = true});
    stream.Key(0, {0, 0}).Key(600, {30, 40});
    points = 0;
    for (int time = 1; time < 600; ++time) {
        std::vector<double> const at = stream.At(time);
        ASSERT_NEAR(time / 20.0, at[0], 1e-3) << time;
        ASSERT_NEAR(time / 15.0, at[1], 1e-3) << time;
    }
    EXPECT_EQ(599, points);
}

}  // namespace
