#include "curves/subdivide_private.h"

#include "curves/floatkeys.h"
#include "curves/interpolate_private.h"
#include "curves/neighbours_private.h"
#include "frame/errors.h"
#include "keystore/edit.h"
#include "tests/curves/pathstream.h"

#include <random>

namespace {

using Subdivide = StreamTest;

// Inserts a key and gives no value.
int InsertOnCurve(TestStream const& stream, int time, char inInterp = KFS_Interp_None, char outInterp = KFS_Interp_None)
{
    T_Time const at = stream.Time(time);
    return KFS_InsertKeyF(stream, &at, 0, nullptr, inInterp, outInterp);
}

struct Motion {
    Vector value;
    Vector velocity;
};

// Value and velocity of a plain stream, strictly between two keys.
Motion MotionAt(KeyedStream const& stream, int time)
{
    Motion motion{stream.At(time), {}};
    KFS_KeyScalar *at = nullptr, *prev = nullptr, *next = nullptr;
    EXPECT_EQ(0, KFSp_GetNeighborsFromTime(stream, time, 0, &at, &prev, &next, nullptr, nullptr, nullptr));
    bool const linear = KFSp_GetSegmentKind(prev->outInterp, next->inInterp) == KFSp_SegmentKind::Linear;
    EXPECT_EQ(0, KFSp_InterpDeriv(stream, 0, time, -1));
    for (int i = 0; i < stream->GetDimension(); ++i) {
        double const slope = (KFSp_Numbers(next)[i] - KFSp_Numbers(prev)[i]) /
                             KFSp_Seconds(next->time, prev->time, stream->GetTimeScale());
        motion.velocity.push_back(linear ? slope : KFSp_Numbers(stream->GetCache())[i]);
    }
    stream->GetCache()->time = KFS_INVALID_INDEX;
    return motion;
}

// On a path by differences: its arcs are good to an accuracy only.
Motion MotionAlongPath(PathStream const& stream, int time)
{
    constexpr int reach = 600;
    Motion motion{stream.At(time), {}};
    Vector const before = stream.At(time - reach);
    Vector const after = stream.At(time + reach);
    for (std::size_t i = 0; i < before.size(); ++i)
        motion.velocity.push_back((after[i] - before[i]) * stream->GetTimeScale() / (2.0 * reach));
    return motion;
}

// Plain keys far apart in units of time, with random handles.
KeyedStream RandomCurve(std::mt19937& random, short dimension, bool nonDecreasing)
{
    std::uniform_real_distribution<double> value(-100.0, 100.0);
    std::uniform_real_distribution<double> speed(-40.0, 40.0);
    std::uniform_real_distribution<double> influence(0.0, 1.0);
    std::uniform_int_distribution<int> code(1, 2);
    KeyedStream stream({.dimension = dimension, .timeScale = 254016000});
    double level = 0.0;
    for (int i = 0; i < 4; ++i) {
        Vector at;
        for (int d = 0; d < dimension; ++d) at.push_back(nonDecreasing ? level + 5.0 * d : value(random));
        stream.Key(i * 254016000, at, KFS_Interp_Spline);
        level += 40.0;
    }
    stream.Settle();
    for (int i = 0; i < 4; ++i) {
        stream.Codes(i, code(random), code(random));
        for (int d = 0; d < dimension; ++d)
            stream.SetHandle(i, {speed(random), influence(random), speed(random), influence(random)}, d);
    }
    stream.StreamFlag(KFS_StreamFlag_NonDecreasing, nonDecreasing);
    return stream;
}

TEST_F(Subdivide, KeepsTheMotionOfAPlainStream)
{
    std::mt19937 random(1001);
    std::uniform_int_distribution<int> when(1000000, 3 * 254016000 - 1000000);
    for (int round = 0; round < 60; ++round) {
        SCOPED_TRACE(round);
        short const dimension = static_cast<short>(1 + round % 3);
        KeyedStream stream = RandomCurve(random, dimension, round % 4 == 3);
        std::vector<int> times;
        std::vector<Motion> before;
        for (int i = 0; i < 1000; ++i) {
            times.push_back(when(random));
            before.push_back(MotionAt(stream, times.back()));
        }
        for (int i = 0; i < 3; ++i)
            ASSERT_EQ(0, InsertOnCurve(stream, when(random), KFS_Interp_Spline, KFS_Interp_Spline));
        for (std::size_t i = 0; i < times.size(); ++i) {
            Motion const after = MotionAt(stream, times[i]);
            for (std::size_t d = 0; d < after.value.size(); ++d) {
                ASSERT_NEAR(before[i].value[d], after.value[d], 1e-9 * 100) << "at " << times[i];
                ASSERT_NEAR(before[i].velocity[d], after.velocity[d], 1e-9 * (100 + std::fabs(before[i].velocity[d])))
                    << "at " << times[i];
            }
        }
    }
}

TEST_F(Subdivide, KeepsTheMotionAlongAPath)
{
    std::mt19937 random(1002);
    std::uniform_real_distribution<double> place(-50.0, 50.0);
    std::uniform_int_distribution<int> when(1000, 179000);
    std::uniform_int_distribution<int> inside(1000, 59000);
    for (int round = 0; round < 20; ++round) {
        SCOPED_TRACE(round);
        short const dimension = round % 2 == 0 ? 2 : 3;
        StreamOptions options = PathOptions(dimension);
        options.timeScale = 60000;
        std::vector<PathStream::Stop> stops;
        for (int i = 0; i < 4; ++i) {
            Vector at;
            for (int d = 0; d < dimension; ++d) at.push_back(place(random));
            stops.push_back({60000 * i, at});
        }
        PathStream stream(stops, round % 3 == 0 ? KFS_Interp_Linear : KFS_Interp_Spline, options);
        stream->SetAccuracy(1e-6);
        stream.Bend();
        ASSERT_EQ(0, KFS_ForceUpdateStream(stream));
        for (int i = 0; i < 4; ++i) {
            stream.Record(i)->spFlags &= ~KFS_KeySpFlag_Modifiable;
            stream.Flag(i, KFS_KeyFlag_Modifiable, false);
        }
        for (int const inner : {1, 2})
            if (round % 4 >= 4 - inner) ASSERT_EQ(0, KFS_SetKeyFloat(stream, 1, inner));
        std::vector<int> times;
        std::vector<Motion> before;
        for (int i = 0; i < 1000; ++i) {
            times.push_back(when(random));
            before.push_back(MotionAlongPath(stream, times.back()));
        }
        for (int i = 0; i < 3; ++i) ASSERT_EQ(0, InsertOnCurve(stream, 60000 * i + inside(random)));
        for (std::size_t i = 0; i < times.size(); ++i) {
            Motion const after = MotionAlongPath(stream, times[i]);
            ASSERT_LT(Distance(before[i].value, after.value), 0.05) << "at " << times[i];
            ASSERT_LT(Distance(before[i].velocity, after.velocity), 2.5) << "at " << times[i];
        }
    }
}

TEST_F(Subdivide, FollowsTheLastComponentThatCouldBeTried)
{
    double const nan = std::nan("");
    double prev[15] = {0, 0, 0, /**/ 0, 0, 0, 0, 0, 0, /**/ 0, nan, 0, 0.3, 0.3, 0.3};
    double next[15] = {6, 6, 6, /**/ 0, 0, 0, 0.3, 0.3, 0.3, /**/ 0, 0, 0, 0, 0, 0};
    for (bool const nonDecreasing : {false, true}) {
        double out[15] = {};
        double first[15];
        double second[15];
        std::copy_n(prev, 15, first);
        std::copy_n(next, 15, second);
        int const code = KFSp_ComputeTempSubdivision(3, 0.5, 1.0, nonDecreasing, false, false, first, second, out);
        EXPECT_NEAR(3.0, out[0], 1e-12);
        // Without the non-decreasing treatment, whose success replaces the failure, nothing behind the failing
        // component is split.
        EXPECT_EQ(nonDecreasing, code == 0);
        EXPECT_EQ(nonDecreasing, out[2] != 0.0);
    }
}

TEST_F(Subdivide, RefusesStreamsWithoutKeys)
{
    TestStream empty;
    EXPECT_EQ(KFS_Err_NoKeys, KFSp_SubdivideSpline(empty, 0, 1, empty->GetCache()));
    EXPECT_REPORT(reports, 87, NoKeysText("automatically compute a new point by subdivision in a"));
    DamagedStream damaged;
    EXPECT_EQ(2, KFSp_SubdivideSpline(damaged.get(), 0, 1, nullptr));
    EXPECT_EQ(reports.Take(), std::vector<Reported>{DamagedReport(87, "inquire about a key value in")});
}

}  // namespace
