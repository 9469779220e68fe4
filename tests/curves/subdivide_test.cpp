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

TEST_F(Subdivide, CarriesALineWithHandles)
{
    KeyedStream stream = MakeKeyed({{0, 10}, {1200, 34}}, KFS_Interp_Linear);
    ASSERT_EQ(0, InsertOnCurve(stream, 600, KFS_Interp_Spline, KFS_Interp_Spline));
    EXPECT_NEAR(22.0, stream.Numbers(1)[0], 1e-9);
    EXPECT_EQ(KFS_Interp_Spline, stream.Record(0)->outInterp);
    EXPECT_EQ(KFS_Interp_Spline, stream.Record(2)->inInterp);
    // The halves of a curve whose handles are at a sixth of it: at a sixth of the half outside, at five twelfths of it
    // inside.
    EXPECT_NEAR(KFSp_OneSixth, stream.GetHandle(0).outInfluence, 1e-9);
    EXPECT_NEAR(KFSp_OneSixth, stream.GetHandle(2).inInfluence, 1e-9);
    EXPECT_NEAR(5.0 / 12, stream.GetHandle(1).inInfluence, 1e-9);
    EXPECT_NEAR(5.0 / 12, stream.GetHandle(1).outInfluence, 1e-9);
    for (double const speed : {stream.GetHandle(0).outSpeed, stream.GetHandle(1).inSpeed, stream.GetHandle(1).outSpeed,
                               stream.GetHandle(2).inSpeed})
        EXPECT_NEAR(12.0, speed, 1e-8);
}

// What a key gets where nothing is split, whatever was in the record before.
struct RestCase {
    char const* why;
    char out, in;  // of the segment's keys
    int time;
    char interp;
    double value;
};

RestCase const RestCases[] = {
    {"a linear segment", 1, 1, 300, KFS_Interp_None, 20},
    {"linear sides on a linear segment", 1, 1, 150, KFS_Interp_Linear, 15},
    {"a held segment", 3, 1, 300, KFS_Interp_None, 10},
    {"a segment held by its end", 1, 3, 300, KFS_Interp_Linear, 30},
    {"linear sides on a curve", 2, 2, 300, KFS_Interp_Linear, 20},
    {"before the first key", 1, 1, -300, KFS_Interp_Spline, 10},
    {"behind the last key", 1, 1, 900, KFS_Interp_Spline, 30},
    {"behind the last key, undecided", 1, 1, 900, KFS_Interp_None, 30},
};

TEST_F(Subdivide, TakesTheValueAndRestsWhereNothingIsSplit)
{
    for (RestCase const& c : RestCases) {
        for (double const left : {0.0, 4.5}) {
            SCOPED_TRACE(testing::Message() << c.why << ", the record held " << left);
            KeyedStream stream = MakeKeyed({{0, 10}, {600, 30}}, KFS_Interp_Linear);
            stream.Codes(0, 1, c.out).Codes(1, c.in, 1);
            stream.SetHandle(0, {0, KFSp_OneSixth, 0, 0.5}).SetHandle(1, {0, 0.5, 0, KFSp_OneSixth});
            std::fill_n(KFSp_Numbers(stream->GetCache()), 5, left);
            ASSERT_EQ(0, InsertOnCurve(stream, c.time, c.interp, c.interp));
            int const index = c.time < 0 ? 0 : c.time > 600 ? 2 : 1;
            Vector numbers = stream.Numbers(index);
            EXPECT_NEAR(c.value, numbers[0], 1e-9);
            numbers[0] = 0;
            EXPECT_EQ((Vector{0, 0, KFSp_OneSixth, 0, KFSp_OneSixth}), numbers);
        }
    }
    // Spline sides have the held segment split as a curve, which nobody sees.
    KeyedStream const held = MakeKeyed({{0, 10}, {600, 30}}, KFS_Interp_Hold);
    ASSERT_EQ(0, InsertOnCurve(held, 300, KFS_Interp_Spline, KFS_Interp_Spline));
    EXPECT_EQ(10.0, held.Numbers(1)[0]);
}

TEST_F(Subdivide, LeavesNobodyAutomatic)
{
    for (bool const spatial : {false, true}) {
        KeyedStream stream(spatial ? PathOptions() : StreamOptions{.dimension = 2});
        for (int i = 0; i < 3; ++i) stream.Key(600 * i, {1.0 * i, i % 2 == 0 ? 0.0 : 4.0}, KFS_Interp_Spline);
        for (int i = 0; i < 3; ++i) {
            stream.Flag(i, KFS_KeyFlag_Modifiable);
            if (spatial) stream.Record(i)->spFlags |= KFS_KeySpFlag_Modifiable;
        }
        ASSERT_EQ(0, KFS_ForceUpdateStream(stream));
        ASSERT_EQ(0, InsertOnCurve(stream, 300));
        for (int i = 0; i < 4; ++i) {
            SCOPED_TRACE(testing::Message() << (spatial ? "spatial" : "plain") << ", key " << i);
            EXPECT_EQ(i == 3, (stream.Record(i)->flags & KFS_KeyFlag_Modifiable) != 0);
            if (!spatial) continue;
            EXPECT_EQ(i == 3, (stream.Record(i)->spFlags & KFS_KeySpFlag_Modifiable) != 0);
            EXPECT_NE(0, stream.Record(i)->flags & KFS_KeyFlag_TangentsSet);
        }
    }
}

TEST_F(Subdivide, KeepsAStraightPathFreeOfTangents)
{
    PathStream straight({{0, {0, 0}}, {600, {10, 0}}, {1200, {20, 0}}});
    straight.Straighten();
    ASSERT_EQ(0, InsertOnCurve(straight, 900));
    KFSp_SpatialRuns<double> const key = KFSp_GetSpatialRuns(straight.Record(2), 2);
    EXPECT_NEAR(15.0, key.value[0], 1e-3);
    EXPECT_EQ((Vector{0, 0, 0, 0}), Vector(key.inTangent, key.inTangent + 4));
    EXPECT_EQ(0.0, KFSp_GetSpatialRuns(straight.Record(1), 2).outTangent[0]);

    // Handles along a line between keys whose far sides have none: the neighbours keep theirs, the new key has none.
    PathStream handled({{0, {0, 0}}, {600, {12, 0}}});
    handled.Tangents(0, {0, 0}, {4, 0}).Tangents(1, {-4, 0}, {0, 0});
    ASSERT_EQ(0, handled->UpdateStream());
    ASSERT_EQ(0, InsertOnCurve(handled, 300));
    KFSp_SpatialRuns<double> const flat = KFSp_GetSpatialRuns(handled.Record(1), 2);
    EXPECT_EQ((Vector{0, 0, 0, 0}), Vector(flat.inTangent, flat.inTangent + 4));
    EXPECT_NEAR(2.0, KFSp_GetSpatialRuns(handled.Record(0), 2).outTangent[0], 1e-2);
    EXPECT_NEAR(-2.0, KFSp_GetSpatialRuns(handled.Record(2), 2).inTangent[0], 1e-2);
}

TEST_F(Subdivide, LeavesThePathAloneWithoutAutomaticTangents)
{
    PathStream stream({{0, {0, 0}}, {600, {10, 0}}}, KFS_Interp_Spline, PathOptions(2, false));
    stream.Tangents(0, {0, 0}, {0, 6}).Tangents(1, {0, 6}, {0, 0});
    ASSERT_EQ(0, stream->UpdateStream());
    Vector const expected = stream.At(200);
    ASSERT_EQ(0, InsertOnCurve(stream, 200));
    EXPECT_EQ(6.0, KFSp_GetSpatialRuns(stream.Record(0), 2).outTangent[1]);
    KFSp_SpatialRuns<double> const key = KFSp_GetSpatialRuns(stream.Record(1), 2);
    EXPECT_EQ(expected, Vector(key.value, key.value + 2));
    EXPECT_EQ((Vector{0, 0, 0, 0}), Vector(key.inTangent, key.inTangent + 4));
}

TEST_F(Subdivide, TakesTheEndsPlaceBeyondThePath)
{
    PathStream stream({{0, {1, 2}}, {600, {10, 0}}}, KFS_Interp_Spline);
    std::fill_n(KFSp_Numbers(stream->GetCache()), 6, 4.5);
    stream->GetCache()->inSpeed = stream->GetCache()->outInfluence = stream->GetCache()->arcLength = 4.5;
    ASSERT_EQ(0, InsertOnCurve(stream, -100, KFS_Interp_Linear, KFS_Interp_Linear));
    ASSERT_EQ(0, InsertOnCurve(stream, 900, KFS_Interp_Linear, KFS_Interp_Linear));
    KFS_KeyScalar const* const first = stream.Record(0);
    KFS_KeyScalar const* const last = stream.Record(3);
    EXPECT_EQ((Vector{1, 2}), Vector(KFSp_Numbers(first), KFSp_Numbers(first) + 2));
    EXPECT_EQ(10.0, KFSp_Numbers(last)[0]);
    EXPECT_EQ(0.0, last->arcLength);
    for (KFS_KeyScalar const* const key : {first, last}) {
        EXPECT_EQ(0.0, key->inSpeed);
        EXPECT_EQ(KFSp_OneSixth, key->outInfluence);
    }
}

TEST_F(Subdivide, ChangesOnlyTheSpeedGraphOfAKeyThatStopsFloating)
{
    PathStream stream({{0, {0, 0}}, {200, {10, 30}}, {400, {30, 0}}, {600, {60, 10}}}, KFS_Interp_Spline);
    stream.Bend().Settle();
    stream.SetHandle(0, {0, 0, 50, 0.4}).SetHandle(3, {150, 0.4, 0, 0});
    ASSERT_EQ(0, KFS_SetKeyFloat(stream, 1, 1));
    ASSERT_EQ(0, KFS_SetKeyFloat(stream, 1, 2));
    ASSERT_EQ(0, stream->UpdateStream());
    std::vector<Vector> numbers;
    for (int i = 0; i < 4; ++i) numbers.push_back(stream.Numbers(i));
    Handle const far = stream.GetHandle(2);
    ASSERT_EQ(0, KFS_SetKeyFloat(stream, 0, 1));
    for (int i = 0; i < 4; ++i) EXPECT_EQ(numbers[static_cast<std::size_t>(i)], stream.Numbers(i)) << "key " << i;
    EXPECT_NE(0.4, stream.GetHandle(0).outInfluence);
    EXPECT_NE(0.4, stream.GetHandle(3).inInfluence);
    EXPECT_EQ(far, stream.GetHandle(2));
    // The run's two parts have the whole way between them.
    double total = 0.0;
    for (int i = 0; i < 3; ++i) total += stream.Arc(i);
    EXPECT_GT(total, 60.0);
}

TEST_F(Subdivide, BringsTheStreamUpToDateFirst)
{
    auto const make = [](double third) {
        KeyedStream stream;
        for (int i = 0; i < 4; ++i) stream.Key(600 * i, {i == 2 ? third : i * i * 1.0}, KFS_Interp_Spline);
        for (int i = 0; i < 4; ++i) stream.Flag(i, KFS_KeyFlag_Modifiable);
        EXPECT_EQ(0, KFS_ForceUpdateStream(stream));
        return stream;
    };
    KeyedStream const stale = make(4.0);
    double const value = 40.0;
    ASSERT_EQ(0, KFS_SetKeyF(stale, 2, &value, 0, 0));  // handles around it are stale now
    ASSERT_EQ(0, InsertOnCurve(stale, 900, KFS_Interp_Spline, KFS_Interp_Spline));
    EXPECT_NEAR(make(40.0).At1(900), stale.Numbers(2)[0], 1e-9);
}

TEST_F(Subdivide, GivesBackShortenedHandles)
{
    // Both components overshoot; the first one that does so says for all that follow that handles changed.
    double prev[10] = {0, 5, /**/ 0, 0, 0, 0, /**/ 900, 1, 0.9, 0.2};
    double next[10] = {10, 6, /**/ 900, 1, 0.9, 0.2, /**/ 0, 0, 0, 0};
    double out[10] = {};
    ASSERT_EQ(0, KFSp_ComputeTempSubdivision(2, 0.25, 1.0, 1, false, false, prev, next, out));
    KFSp_TemporalRuns<double> const left(prev, 2);
    KFSp_TemporalRuns<double> const key(out, 2);
    KFSp_TemporalRuns<double> const right(next, 2);
    for (int i = 0; i < 2; ++i) {
        EXPECT_TRUE(key.value[i] >= left.value[i] && key.value[i] <= right.value[i]) << key.value[i];
        EXPECT_TRUE(key.inSpeed[i] >= 0.0 && key.outSpeed[i] >= 0.0) << key.inSpeed[i] << " " << key.outSpeed[i];
        for (double const influence :
             {left.outInfluence[i], key.inInfluence[i], key.outInfluence[i], right.inInfluence[i]})
            EXPECT_TRUE(influence >= 0.0 && influence <= 1.0) << influence;
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
