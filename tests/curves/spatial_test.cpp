#include "curves/spatial.h"

#include "curves/floatkeys.h"
#include "curves/spatial_private.h"
#include "frame/errors.h"
#include "frame/services/memory.h"
#include "keystore/items.h"
#include "tests/curves/pathstream.h"

#include <random>

namespace {

using InterpolateSpatial = StreamTest;
using SpeedAlongThePath = StreamTest;
using PathDirection = StreamTest;
using CalculateT = StreamTest;

// The value data of the cache record after one of the three functions has written it.
Vector CacheNumbers(PathStream const& stream)
{
    double const* const numbers = KFSp_Numbers(stream->GetCache());
    return {numbers, numbers + 3 * stream->GetDimension()};
}

Vector Interpolate(PathStream const& stream, int time, int hint = -1)
{
    EXPECT_EQ(0, KFSp_InterpolateSpatial(stream, 0, time, hint)) << "at " << time;
    Vector numbers = CacheNumbers(stream);
    numbers.resize(static_cast<std::size_t>(stream->GetDimension()));
    return numbers;
}

// The path's parameter, where `place` says that it was left.
double ParameterAt(PathStream const& stream, int time, int place)
{
    EXPECT_EQ(0, KFSp_InterpolateSpatial(stream, 0, time, -1));
    return CacheNumbers(stream)[static_cast<std::size_t>(place)];
}

// A path segment measured by many small chords: the truth to which reads are held.
class SlowPath {
public:
    SlowPath(KFS_KeyScalar const* a, KFS_KeyScalar const* b, int dimension) : dimension_(dimension)
    {
        KFSp_SpatialRuns<double const> const from = KFSp_GetSpatialRuns(a, dimension);
        KFSp_SpatialRuns<double const> const to = KFSp_GetSpatialRuns(b, dimension);
        for (int i = 0; i < dimension; ++i) {
            points_.push_back(
                {from.value[i], from.value[i] + from.outTangent[i], to.value[i] + to.inTangent[i], to.value[i]});
        }
        lengths_.push_back(0.0);
        for (int i = 1; i <= Steps; ++i)
            lengths_.push_back(lengths_.back() + Distance(At((i - 1.0) / Steps), At(static_cast<double>(i) / Steps)));
    }

    double Length() const { return lengths_.back(); }

    Vector At(double t) const
    {
        Vector point;
        for (std::array<double, 4> const& p : points_) {
            long double const exact[4] = {p[0], p[1], p[2], p[3]};
            point.push_back(static_cast<double>(CubicAt(exact, static_cast<long double>(t))));
        }
        return point;
    }

    Vector AtLength(double s) const
    {
        auto const above = std::lower_bound(lengths_.begin() + 1, lengths_.end() - 1, s);
        double const fraction = (s - above[-1]) / (above[0] - above[-1]);
        return At((static_cast<double>(above - lengths_.begin()) - 1.0 + fraction) / Steps);
    }

private:
    static constexpr int Steps = 20000;
    int dimension_;
    std::vector<std::array<double, 4>> points_;
    std::vector<double> lengths_;
};

PathStream RandomPath(std::mt19937& random, short dimension, int count, char interp)
{
    std::uniform_real_distribution<double> place(-50.0, 50.0);
    std::vector<PathStream::Stop> stops;
    for (int i = 0; i < count; ++i) {
        Vector at;
        for (int d = 0; d < dimension; ++d) at.push_back(place(random));
        stops.push_back({600 * i, at});
    }
    PathStream stream(stops, interp, PathOptions(dimension));
    stream.Bend();
    return stream;
}

// In equal steps where both sides are linear.
TEST_F(InterpolateSpatial, FollowsThePathByTheSpeedGraph)
{
    std::mt19937 random(20240511);
    std::uniform_real_distribution<double> influence(0.05, 0.95);
    std::uniform_real_distribution<double> speed(0.0, 60.0);
    for (int round = 0; round < 24; ++round) {
        SCOPED_TRACE(round);
        short const dimension = round % 2 == 0 ? 2 : 3;
        bool const linear = round % 4 < 2;
        PathStream stream = RandomPath(random, dimension, 4, linear ? KFS_Interp_Linear : KFS_Interp_Spline);
        stream->SetAccuracy(1e-6);
        ASSERT_EQ(0, KFS_ForceUpdateStream(stream));
        stream.Settle();
        for (int k = 0; k < 4; ++k)
            stream.SetHandle(k, {speed(random), influence(random), speed(random), influence(random)});
        for (int k = 0; k < 3; ++k) {
            SlowPath const path(stream.Record(k), stream.Record(k + 1), dimension);
            EXPECT_NEAR(path.Length(), stream.Arc(k), 1e-3);
            KFSp_SegmentCurve graph(2);
            KFSp_FillSpeedGraph(stream.Record(k), stream.Record(k + 1), stream.Arc(k), 1.0, graph.curve);
            ASSERT_EQ(0, CRV_CurveSetNonDecreasing(&graph.curve, nullptr));
            long double const x[4] = {graph.p0[0], graph.p1[0], graph.p2[0], graph.p3[0]};
            long double const y[4] = {graph.p0[1], graph.p1[1], graph.p2[1], graph.p3[1]};
            for (int time = 7; time < 600; time += 31) {
                double const s = static_cast<double>(CubicAt(y, SolveCubic(x, time / 600.0L)));
                Vector const expected = path.AtLength(linear ? path.Length() * time / 600 : s);
                EXPECT_LT(Distance(expected, stream.At(600 * k + time)), 0.02) << "segment " << k << " at " << time;
            }
        }
    }
}

TEST_F(InterpolateSpatial, AnswersTheSameWhateverTheHint)
{
    std::mt19937 random(5);
    PathStream stream = RandomPath(random, 2, 9, KFS_Interp_Spline);
    for (int const index : {2, 3, 6}) ASSERT_EQ(0, KFS_SetKeyFloat(stream, 1, index));
    ASSERT_EQ(0, stream->UpdateStream());
    for (int time = 3; time < 4800; time += 41) {
        Vector const expected = Interpolate(stream, time);
        for (int hint = -1; hint <= 9; ++hint)
            EXPECT_EQ(expected, Interpolate(stream, time, hint)) << time << " " << hint;
    }
}

TEST_F(InterpolateSpatial, NeedsNoMemory)
{
    std::mt19937 random(6);
    PathStream stream = RandomPath(random, 3, 5, KFS_Interp_Spline);
    stream.At(50);
    Q_FailAllocation(1);
    for (int time = 3; time < 2400; time += 41) stream.At(time);
    EXPECT_FALSE(Q_FailAllocationFired());
    Q_FailAllocation(0);
}

TEST_F(InterpolateSpatial, NeverMovesBackwards)
{
    for (bool const flagged : {true, false}) {
        PathStream stream({{0, {0, 0}}, {600, {100, 0}}}, KFS_Interp_Spline);
        stream.Straighten().Settle().StreamFlag(KFS_StreamFlag_NonDecreasing, flagged);
        stream.SetHandle(0, {0, 0, 900, 0.9}).SetHandle(1, {900, 0.9, 0, 0});  // overshoots at both ends
        double before = 0.0;
        for (int time = 1; time < 600; ++time) {
            double const x = Interpolate(stream, time)[0];
            EXPECT_GE(x, before) << "at " << time;
            EXPECT_LE(x, 100.0);
            before = x;
        }
    }
}

// Where the parameter is left depends on how the point was found.
TEST_F(InterpolateSpatial, LeavesTheParameterBehindTheResult)
{
    for (int form = 0; form < 8; ++form) {
        bool const automatic = form & 1;  // a point of the path, else of the straight line
        bool const sParametrized = form & 2;
        short const dimension = form & 4 ? 3 : 2;
        SCOPED_TRACE(form);
        Vector const from(static_cast<std::size_t>(dimension), 0.0);
        Vector const to(static_cast<std::size_t>(dimension), 30.0);
        PathStream stream({{0, from}, {100, to}}, KFS_Interp_Linear, PathOptions(dimension, automatic));
        stream.StreamFlag(KFS_StreamFlag_SParametrize, sParametrized);
        ASSERT_EQ(0, KFS_ForceUpdateStream(stream));
        std::fill_n(KFSp_Numbers(stream->GetCache()), 3 * dimension, -9.0);
        int const place = automatic ? dimension : 2 * dimension;
        double const t = ParameterAt(stream, 25, place);
        EXPECT_TRUE(t > 0.1 && t < 0.35) << t;
        Vector const numbers = CacheNumbers(stream);
        for (int i = dimension; i < 3 * dimension; ++i)
            EXPECT_EQ(i == place ? t : -9.0, numbers[static_cast<std::size_t>(i)]) << "number " << i;
    }
}

TEST_F(InterpolateSpatial, RefusesCodesWithoutAShapeAndCurvesInOtherDimensions)
{
    PathStream shapeless({{0, {0, 0}}, {100, {10, 0}}});
    shapeless.Bend().Codes(0, KFS_Interp_Linear, -2);
    EXPECT_EQ(KFS_Err_InterpNotAllowed, KFSp_InterpolateSpatial(shapeless, 0, 50, 0));  // not reported
    EXPECT_EQ(0, KFSp_InterpTangentSpatial(shapeless, 0, 50, 0));
    EXPECT_NEAR(10 * KFSp_OneSixth, CacheNumbers(shapeless)[0], 1e-9);  // stands at the first anchor

    std::string const text = "only 2d or 3d spatial streams are allowed for this operation.";
    for (short const dimension : {1, 4}) {
        auto const size = static_cast<std::size_t>(dimension);
        for (bool const automatic : {true, false}) {
            PathStream stream({{0, Vector(size, 0.0)}, {100, Vector(size, 10.0)}}, KFS_Interp_Linear,
                              PathOptions(dimension, false));
            stream.StreamFlag(KFS_StreamFlag_SParametrize, !automatic);
            stream->SetSpInterp(automatic ? KFS_SpInterp_Auto : KFS_SpInterp_None);
            EXPECT_EQ(KFS_Err_Only2D3D, KFSp_InterpolateSpatial(stream, 0, 50, 0));
            EXPECT_REPORT(reports, 45, text);
            EXPECT_EQ(automatic ? 0 : KFS_Err_Only2D3D, KFSp_InterpTangentSpatial(stream, 0, 50, 0));
            EXPECT_EQ(automatic ? 0 : KFS_Err_Only2D3D, KFSp_InterpDerivSpatial(stream, 0, 50, 0));
            EXPECT_EQ(automatic ? 0U : 2U, reports.Take().size());
        }
    }
}

TEST_F(InterpolateSpatial, ReadsWithoutTablesWhileUpdatesAreHeldOff)
{
    PathStream stream({{0, {0, 0}}, {100, {30, 40}}, {200, {60, 0}}}, KFS_Interp_Linear);
    Vector const expected = Interpolate(stream, 60);
    for (bool const automatic : {true, false}) {
        stream->SetSpInterp(automatic ? KFS_SpInterp_Auto : KFS_SpInterp_None);
        SEQ_Head** const table = std::exchange(stream.Record(0)->remapTable, nullptr);
        stream->SetDisabledUpdateStream(true);
        Vector const at = Interpolate(stream, 60);
        if (automatic)
            EXPECT_LT(Distance(expected, at), 0.1);
        else
            EXPECT_NEAR(at[0] * 4, at[1] * 3, 1e-9);
        EXPECT_EQ(nullptr, stream.Record(0)->remapTable);
        stream->SetDisabledUpdateStream(false);
        stream.Record(0)->remapTable = table;
    }
}

TEST_F(SpeedAlongThePath, IsTheSlopeOfTheDistance)
{
    std::mt19937 random(99);
    std::uniform_real_distribution<double> influence(0.1, 0.9);
    for (int round = 0; round < 20; ++round) {
        PathStream stream({{0, {0, 0}}, {60000, {100, 0}}}, KFS_Interp_Spline);
        stream.Straighten().Settle();
        stream.SetHandle(0, {0, 0, round * 0.3, influence(random)})
            .SetHandle(1, {round * 0.2, influence(random), 0, 0});
        if (round % 3 == 1) stream.Codes(0, 1, KFS_Interp_Linear);
        if (round % 3 == 2) stream.Codes(1, KFS_Interp_Linear, 1);
        for (int time = 1500; time < 60000; time += 2900) {
            double const after = Interpolate(stream, time + 5)[0];
            double const before = Interpolate(stream, time - 5)[0];
            ASSERT_EQ(0, KFSp_InterpDerivSpatial(stream, 0, time, -1));
            double const slope = (after - before) * 600 / 10;
            // A straight path's table is as good as its accuracy, which differences over a sixtieth of a second
            // enlarge.
            EXPECT_NEAR(slope, CacheNumbers(stream)[0], 1e-2 + 1e-2 * std::fabs(slope))
                << "round " << round << " at " << time;
        }
    }
}

TEST_F(SpeedAlongThePath, WritesNothingWhereOthersAnswer)
{
    PathStream stream({{0, {0, 0}}, {100, {10, 0}}});
    for (auto const& [out, in] : {std::pair{1, 1}, std::pair{3, 2}, std::pair{2, 3}, std::pair{-2, 2}}) {
        stream.Codes(0, 1, out).Codes(1, in, 1);
        KFSp_Numbers(stream->GetCache())[0] = 42.0;
        EXPECT_EQ(0, KFSp_InterpDerivSpatial(stream, 0, 50, 0));
        EXPECT_EQ(42.0, CacheNumbers(stream)[0]);
    }
}

TEST_F(PathDirection, IsATangentOfThePath)
{
    std::mt19937 random(31);
    for (short const dimension : {2, 3}) {
        PathStream stream = RandomPath(random, dimension, 3, KFS_Interp_Linear);
        auto const size = static_cast<std::size_t>(dimension);
        for (int time = 20; time < 1200; time += 100) {
            int const first = time < 600 ? 0 : 1;
            double const t = ParameterAt(stream, time, dimension);
            ASSERT_EQ(0, KFSp_InterpTangentSpatial(stream, 0, time, -1));
            Vector const tangent = CacheNumbers(stream);
            EXPECT_NEAR(t, tangent[size], 1e-12);
            KFSp_SegmentCurve path(dimension);
            KFSp_FillPathSegment(stream.Record(first), stream.Record(first + 1), dimension, path.curve);
            for (std::size_t i = 0; i < size; ++i) {
                long double const p[4] = {path.p0[i], path.p1[i], path.p2[i], path.p3[i]};
                EXPECT_NEAR(static_cast<double>(CubicSlopeAt(p, static_cast<long double>(t)) / 3.0L), tangent[i], 1e-9);
            }
        }
        // Next to a key it is that key's tangent.
        ASSERT_EQ(0, KFSp_InterpTangentSpatial(stream, 0, 601, -1));
        Vector const near = CacheNumbers(stream);
        EXPECT_NEAR(KFSp_GetSpatialRuns(stream.Record(1), dimension).outTangent[0], near[0], 0.02 * stream.Arc(1));
    }
}

TEST_F(PathDirection, IsThePositionWhereThereIsNoPath)
{
    for (auto const& [size, automatic] : {std::pair{2U, true}, {2U, false}, {3U, true}, {5U, false}}) {
        PathStream stream({{0, Vector(size, 10.0)}, {100, Vector(size, 40.0)}}, KFS_Interp_Linear,
                          PathOptions(static_cast<short>(size), false));
        stream.StreamFlag(KFS_StreamFlag_SParametrize, false);
        if (automatic) stream->SetSpInterp(KFS_SpInterp_Auto);
        ASSERT_EQ(0, KFS_ForceUpdateStream(stream));
        ASSERT_EQ(0, KFSp_InterpTangentSpatial(stream, 0, 50, 0));
        Vector const numbers = CacheNumbers(stream);
        bool const direction = automatic && size == 2;
        EXPECT_TRUE(direction ? numbers[0] < 20.0 : std::fabs(numbers[0] - 25.0) <= 1e-9) << numbers[0];
        EXPECT_NEAR(0.5, numbers[direction ? size : 2 * size], 1e-12);
    }
}

struct Covered {
    int code = 0;
    double t = -1.0;
};

Covered Ask(PathStream const& stream, int time, int index = 0)
{
    KFS_KeyScalar *first = nullptr, *second = nullptr;
    Covered covered;
    covered.code = KFS_CalculateTFromStream(stream, 0, time, index, &first, &second, &covered.t);
    if (covered.code == 0) {
        EXPECT_EQ(stream.Record(index), first);
        EXPECT_EQ(stream.Record(index + 1), second);
    }
    return covered;
}

TEST_F(CalculateT, IsTheFractionOfTheArc)
{
    PathStream stream({{0, {0, 0}}, {100, {0, 30}}, {200, {0, 40}}});
    stream.Straighten();
    EXPECT_DOUBLE_EQ(0.25, Ask(stream, 25).t);
    EXPECT_DOUBLE_EQ(0.75, Ask(stream, 175, 1).t);
    stream.Codes(0, 1, KFS_Interp_Hold);
    EXPECT_EQ(0.0, Ask(stream, 70).t);
    stream.Codes(0, 1, -1);
    EXPECT_EQ(KFS_Err_InterpNotAllowed, Ask(stream, 70).code);
    EXPECT_EQ(SEQ_Err_BadIndex, Ask(stream, 70, 2).code);
    PathStream resting({{0, {5, 5}}, {100, {5, 5}}});
    resting.Straighten();
    EXPECT_FALSE(std::isfinite(Ask(resting, 50).t)) << "divided by an arc of no length";
}

TEST_F(CalculateT, RepairsAStaleArcFirst)
{
    PathStream stream({{0, {0, 0}}, {100, {0, 30}}}, KFS_Interp_Spline);
    stream.Settle().SetHandle(0, {0, 0, 60, 0.5}).SetHandle(1, {60, 0.5, 0, 0});
    double const t = Ask(stream, 20).t;
    stream.Record(0)->arcLength = 1e6;
    EXPECT_NE(t, Ask(stream, 20).t);
    ASSERT_EQ(0, stream->SetArcInvalid(1, 1));
    EXPECT_EQ(t, Ask(stream, 20).t);
}

TEST_F(CalculateT, HoldsHandlesInsideTheBoxByShorteningThem)
{
    PathStream stream({{0, {0, 0}}, {600, {100, 0}}}, KFS_Interp_Spline);
    stream.Straighten().Settle();
    double const length = stream.Arc(0);
    stream.SetHandle(0, {0, 0, 4 * length, 0.5}).SetHandle(1, {3 * length, 0.5, 0, 0});
    // The first handle would end at twice the length, the second at half of it below 0: both are shortened to the box.
    long double const x[4] = {0, 0.25L, 1 - 0.5L * (1 / 1.5L), 1};
    long double const y[4] = {0, 1, 0, 1};
    for (int time = 60; time < 600; time += 60) {
        long double const expected = CubicAt(y, SolveCubic(x, time / 600.0L));
        EXPECT_NEAR(static_cast<double>(expected), Ask(stream, time).t, 1e-12) << "at " << time;
    }
    // With a linear side nothing is held: the handle keeps reaching beyond.
    stream.Codes(1, KFS_Interp_Linear, 1);
    long double const freeX[4] = {0, 0.5L, 1 - KFSp_OneSixth, 1};
    long double const freeY[4] = {0, 2, 1 - KFSp_OneSixth, 1};
    EXPECT_NEAR(static_cast<double>(CubicAt(freeY, SolveCubic(freeX, 0.6L))), Ask(stream, 360).t, 1e-9);
}

}  // namespace
