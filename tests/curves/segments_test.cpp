// What lies between two keys, asked of the functions that reads, splits and questions share. The values that reads
// answer are the twin's matter; here is what no read shows.

#include "curves/floatkeys.h"
#include "curves/interpolate_private.h"
#include "curves/neighbours_private.h"
#include "curves/spatial.h"
#include "curves/spatial_private.h"
#include "curves/subdivide_private.h"
#include "tests/curves/keyedstream.h"
#include "tests/support/dice.h"

#include <climits>
#include <limits>

namespace {

class Segments : public StreamTest {};

constexpr int L = KFS_Interp_Linear, S = KFS_Interp_Spline, H = KFS_Interp_Hold;
constexpr double Untouched = -4321.0;
char const* const OnlyPaths = "only 2d or 3d spatial streams are allowed for this operation.";

using Interpolator = int (*)(KFS_Stream const*, long, int, int);

// The cache record's numbers after an interpolator has written some of them.
Vector Evaluate(Interpolator interpolator, TestStream const& stream, int time, int hint = KFS_INVALID_INDEX,
                int code = 0)
{
    double* const numbers = KFSp_Numbers(stream->GetCache());
    std::fill_n(numbers, 3 * stream->GetDimension(), Untouched);
    EXPECT_EQ(code, interpolator(stream, 0, time, hint)) << "at " << time << " with hint " << hint;
    return {numbers, numbers + 3 * stream->GetDimension()};
}

// ---- values and slopes

// The hint saves a search and must not show in any bit, wherever it points and also where a key stands.
TEST_F(Segments, AWrongHintChangesNothing)
{
    for (bool const spatial : {false, true}) {
        Dice dice(7);
        KeyedStream stream({.dimension = 2, .spatial = spatial, .spInterpMask = KFS_InterpMask_Negative});
        for (int i = 0; i < 9; ++i)
            stream.Key(100 * i, {dice.Between(-50, 50), dice.Between(-50, 50)}, static_cast<char>(i % 3 ? S : L));
        for (int const index : {2, 3, 6}) ASSERT_EQ(0, KFS_SetKeyFloat(stream, 1, index));
        ASSERT_EQ(0, stream->UpdateStream());
        std::vector<int> times = stream.Times();
        times.erase(times.begin());
        times.pop_back();
        for (int time = 3; time < 800; time += 11) times.push_back(time);
        std::array const plain{KFSp_Interpolate, KFSp_InterpDeriv};
        std::array const path{KFSp_InterpolateSpatial, KFSp_InterpDerivSpatial};
        for (Interpolator const interpolator : spatial ? path : plain) {
            for (int const time : times) {
                Vector const expected = Evaluate(interpolator, stream, time);
                for (int hint = -2; hint < 11; ++hint)
                    EXPECT_EQ(expected, Evaluate(interpolator, stream, time, hint < 10 ? hint : INT_MAX));
            }
        }
    }
}

TEST_F(Segments, OtherPairsOfCodesWriteNothing)
{
    KeyedStream stream = MakeKeyed({{0, 1.0}, {600, 2.0}}, S);
    PathStream path({{0, {0, 0}}, {600, {10, 0}}});
    for (int out = -1; out <= 4; ++out) {
        for (int in = -1; in <= 4; ++in) {
            SCOPED_TRACE(testing::Message() << out << " to " << in);
            bool const shaped = (out == L || out == S) && (in == L || in == S);
            bool const curved = shaped && (out == S || in == S);
            stream.Codes(0, L, out).Codes(1, in, L);
            path.Codes(0, L, out).Codes(1, in, L);
            EXPECT_EQ(shaped, Evaluate(KFSp_Interpolate, stream, 300, 0)[0] != Untouched);
            EXPECT_EQ(curved, Evaluate(KFSp_InterpDeriv, stream, 300, 0)[0] != Untouched);
            EXPECT_EQ(curved, Evaluate(KFSp_InterpDerivSpatial, path, 300, 0)[0] != Untouched);
            bool const holds = out == H || in == H;
            int const code = shaped || holds ? 0 : KFS_Err_InterpNotAllowed;  // not reported
            EXPECT_EQ(code == 0, Evaluate(KFSp_InterpolateSpatial, path, 300, 0, code)[0] != Untouched);
            stream.At(600);
            EXPECT_TRUE(code == 0 || stream.At1(300) == 1.0) << "a read has the earlier key's value";
        }
    }
}

TEST_F(Segments, DerivativesAreTheSlopesOfValues)
{
    Dice dice(99);
    for (int round = 0; round < 20; ++round) {
        KeyedStream plain = MakeKeyed({{0, 0.0}, {60000, 100.0}}, S, {.dimension = 2});
        PathStream path({{0, {0, 0}}, {60000, {100, 0}}}, S);
        path.Straighten().Settle();
        for (KeyedStream* const stream : {&plain, static_cast<KeyedStream*>(&path)}) {
            Handle const first{0, 0, round * 0.3, dice.Between(0.1, 0.9)},
                second{round * 0.2, dice.Between(0.1, 0.9), 0, 0};
            stream->SetHandle(0, first).SetHandle(1, second);
            stream->Codes(0, L, round % 3 == 1 ? L : S).Codes(1, round % 3 == 2 ? L : S, L);
            bool const spatial = stream == &path;
            for (int time = 1500; time < 60000; time += 2900) {
                Interpolator const value = spatial ? KFSp_InterpolateSpatial : KFSp_Interpolate;
                Interpolator const derivative = spatial ? KFSp_InterpDerivSpatial : KFSp_InterpDeriv;
                double const slope =
                    (Evaluate(value, *stream, time + 5)[0] - Evaluate(value, *stream, time - 5)[0]) * 600 / 10;
                // A straight path's table is as good as its accuracy, which the difference enlarges.
                EXPECT_NEAR(slope, Evaluate(derivative, *stream, time)[0],
                            (spatial ? 1e-2 : 1e-5) * (1 + std::fabs(slope)))
                    << "round " << round << " at " << time;
            }
        }
    }
}

TEST_F(Segments, TheFirstFailingComponentEndsIt)
{
    KeyedStream stream = MakeKeyed({{0, 0.0}, {600, 2.0}}, S, {.dimension = 3});
    for (int i = 0; i < 3; ++i) stream.SetHandle(0, {0, 0, 2, 1.0 / 3.0}, i).SetHandle(1, {2, 1.0 / 3.0, 0, 0}, i);
    stream.SetHandle(1, {std::numeric_limits<double>::infinity(), 0.2, 0, 0}, 1);
    TestStream const empty;
    KeyedStream const none = MakeKeyed({{0, 0.0}, {600, 0.0}}, S, {.dimension = 0});
    for (Interpolator const interpolator : {&KFSp_Interpolate, &KFSp_InterpDeriv}) {
        Vector const cached = Evaluate(interpolator, stream, 300, 0, CRV_Err_NotFinite);
        EXPECT_TRUE(cached[0] != Untouched && cached[1] == Untouched && cached[2] == Untouched);
        EXPECT_EQ(Vector{}, Evaluate(interpolator, none, 300, 0));
        Evaluate(interpolator, empty, 10, 0, KFS_Err_NoKeys);
        EXPECT_REPORT(reports, 85, NoKeysText("inquire about a key value in"));
    }
}

// A split of three components, whose second fails: nothing behind it is split. The non-decreasing treatment's success
// replaces the failure.
TEST_F(Segments, ASplitFollowsTheLastComponentThatCouldBeTried)
{
    for (bool const nonDecreasing : {false, true}) {
        double prev[15] = {0, 0, 0, /**/ 0, 0, 0, 0, 0, 0, /**/ 0, std::nan(""), 0, 0.3, 0.3, 0.3};
        double next[15] = {6, 6, 6, /**/ 0, 0, 0, 0.3, 0.3, 0.3, /**/ 0, 0, 0, 0, 0, 0};
        double out[15] = {};
        int const code = KFSp_ComputeTempSubdivision(3, 0.5, 1.0, nonDecreasing, false, false, prev, next, out);
        EXPECT_NEAR(3.0, out[0], 1e-12);
        EXPECT_EQ(nonDecreasing, code == 0);
        EXPECT_EQ(nonDecreasing, out[2] != 0.0);
    }
}

// ---- paths

// Also without the flag, and however far the handles reach.
TEST_F(Segments, APathNeverMovesBackwards)
{
    PathStream stream({{0, {0, 0}}, {600, {100, 0}}}, S);
    stream.Straighten().Settle().StreamFlag(KFS_StreamFlag_NonDecreasing, false);
    stream.SetHandle(0, {0, 0, 900, 0.9}).SetHandle(1, {900, 0.9, 0, 0});
    double before = 0.0;
    for (int time = 1; time < 600; ++time) {
        double const x = stream.At1(time);
        EXPECT_TRUE(x >= before && x <= 100.0) << x << " at " << time;
        before = x;
    }
}

// Where the parameter is left depends on how the point, or the direction, was found.
TEST_F(Segments, TheParameterIsLeftBehindTheResult)
{
    for (int form = 0; form < 8; ++form) {
        SCOPED_TRACE(form);
        bool const automatic = form & 1;  // a point of the path, else of the straight line
        auto const size = static_cast<std::size_t>(form & 4 ? 3 : 2);
        PathStream stream({{0, Vector(size, 0.0)}, {100, Vector(size, 30.0)}}, L,
                          PathOptions(static_cast<short>(size), automatic));
        stream.StreamFlag(KFS_StreamFlag_SParametrize, form & 2);
        ASSERT_EQ(0, KFS_ForceUpdateStream(stream));
        bool const direction = (form & 2) || (automatic && size == 2);
        for (bool const tangent : {false, true}) {
            Vector const numbers = Evaluate(tangent ? KFSp_InterpTangentSpatial : KFSp_InterpolateSpatial, stream, 25);
            std::size_t const place = (tangent ? direction : automatic) ? size : 2 * size;
            EXPECT_TRUE(numbers[place] > 0.1 && numbers[place] < 0.35) << numbers[place];
            for (std::size_t i = size; i < 3 * size; ++i)
                EXPECT_EQ(i != place, numbers[i] == Untouched) << "number " << i;
            // Without a path the direction is the position; a straight path's direction leads along the chord.
            EXPECT_NEAR(tangent && !direction ? 7.5 : numbers[0], numbers[0], 1e-9);
            EXPECT_NEAR(numbers[0], numbers[1], 1e-9);
        }
    }
}

TEST_F(Segments, ADirectionIsAThirdOfThePathsDerivative)
{
    Dice dice(31);
    for (short const dimension : {2, 3}) {
        std::vector<PathStream::Stop> stops;
        for (int i = 0; i < 3; ++i)
            stops.push_back({600 * i, {dice.Between(-50, 50), dice.Between(-50, 50), dice.Between(-50, 50)}});
        for (PathStream::Stop& stop : stops) stop.place.resize(static_cast<std::size_t>(dimension));
        PathStream stream(stops, L, PathOptions(dimension));
        stream.Bend();
        for (int time = 20; time < 1200; time += 100) {
            Vector const tangent = Evaluate(KFSp_InterpTangentSpatial, stream, time);
            double const t = tangent[static_cast<std::size_t>(dimension)];
            EXPECT_NEAR(Evaluate(KFSp_InterpolateSpatial, stream, time)[static_cast<std::size_t>(dimension)], t, 1e-12);
            KFSp_SegmentCurve path(dimension);
            KFSp_FillPathSegment(stream.Record(time / 600), stream.Record(time / 600 + 1), dimension, path.curve);
            for (std::size_t i = 0; i < static_cast<std::size_t>(dimension); ++i) {
                double const u = 1 - t, a = path.p1[i] - path.p0[i], b = path.p2[i] - path.p1[i];
                EXPECT_NEAR(u * u * a + 2 * u * t * b + t * t * (path.p3[i] - path.p2[i]), tangent[i], 1e-9);
            }
        }
    }
}

TEST_F(Segments, PathsHaveTwoOrThreeDimensions)
{
    for (short const dimension : {1, 4}) {
        auto const size = static_cast<std::size_t>(dimension);
        for (bool const automatic : {true, false}) {
            PathStream stream({{0, Vector(size, 0.0)}, {100, Vector(size, 10.0)}}, L, PathOptions(dimension, false));
            stream.StreamFlag(KFS_StreamFlag_SParametrize, !automatic);
            stream->SetSpInterp(automatic ? KFS_SpInterp_Auto : KFS_SpInterp_None);
            Evaluate(KFSp_InterpolateSpatial, stream, 50, 0, KFS_Err_Only2D3D);
            EXPECT_REPORT(reports, 45, OnlyPaths);
            for (Interpolator const interpolator : {&KFSp_InterpTangentSpatial, &KFSp_InterpDerivSpatial})
                Evaluate(interpolator, stream, 50, 0, automatic ? 0 : KFS_Err_Only2D3D);
            EXPECT_EQ(automatic ? 0U : 2U, reports.Take().size());
            stream.StreamFlag(KFS_StreamFlag_SParametrize).Key(50, Vector(size, 1.0)).Record(1)->flags |=
                KFS_KeyFlag_Float;
            EXPECT_EQ(KFS_Err_Only2D3D, KFS_ForceUpdateStream(stream)) << "nothing floats there";
            EXPECT_EQ(1U, reports.Take().size());
        }
    }
}

TEST_F(Segments, APathIsReadWithoutTablesWhileUpdatesAreHeldOff)
{
    PathStream stream({{0, {0, 0}}, {100, {30, 40}}, {200, {60, 0}}});
    Vector const expected = stream.At(60);
    for (bool const automatic : {true, false}) {
        stream->SetSpInterp(automatic ? KFS_SpInterp_Auto : KFS_SpInterp_None);
        SEQ_Head** const table = std::exchange(stream.Record(0)->remapTable, nullptr);
        stream->SetDisabledUpdateStream(true);
        Vector const at = Evaluate(KFSp_InterpolateSpatial, stream, 60);
        EXPECT_NEAR(at[0] * 4, at[1] * 3, automatic ? 0.5 : 1e-9);
        EXPECT_NEAR(automatic ? expected[0] : at[0], at[0], 0.1);
        EXPECT_EQ(nullptr, stream.Record(0)->remapTable);
        stream->SetDisabledUpdateStream(false);
        stream.Record(0)->remapTable = table;
    }
}

// ---- the part of a key's arc that is covered

TEST_F(Segments, TheCoveredPartOfAnArc)
{
    PathStream stream({{0, {0, 0}}, {600, {0, 30}}, {1200, {0, 30}}});
    stream.Straighten().Settle();
    double const length = stream.Arc(0);
    double t = -1.0;
    auto const ask = [&](int index, int time) {
        KFS_KeyScalar *first = nullptr, *second = nullptr;
        int const code = KFS_CalculateTFromStream(stream, 0, time, index, &first, &second, &t);
        EXPECT_TRUE(code != 0 || (first == stream.Record(index) && second == stream.Record(index + 1)));
        return code;
    };
    // The first handle would end at twice the length, the second at half of it below 0: both are shortened to the box.
    // With a linear side nothing is held, and the handle keeps reaching beyond.
    stream.SetHandle(0, {0, 0, 4 * length, 0.5}).SetHandle(1, {3 * length, 0.5, 0, 0});
    using Cubic = long double[4];
    constexpr long double sixth = KFSp_OneSixth;
    struct Row {
        int out, in;
        Cubic x, y;
    } const rows[] = {{L, L, {0, sixth, 1 - sixth, 1}, {0, sixth, 1 - sixth, 1}},
                      {S, S, {0, 0.25L, 1 - 0.5L * (1 / 1.5L), 1}, {0, 1, 0, 1}},
                      {S, L, {0, 0.5L, 1 - sixth, 1}, {0, 2, 1 - sixth, 1}},
                      {H, S, {0, 0, 1, 1}, {0, 0, 0, 0}}};
    for (Row const& row : rows) {
        stream.Codes(0, L, row.out).Codes(1, row.in, L);
        for (int time = 60; time < 600; time += 60) {
            ASSERT_EQ(0, ask(0, time));
            EXPECT_NEAR(static_cast<double>(CubicAt(row.y, SolveCubic(row.x, time / 600.0L))), t, 1e-9)
                << row.out << row.in;
        }
    }
    ASSERT_EQ(0, stream->SetArcInvalid(1, 1));
    stream.Record(0)->arcLength = 1e6;
    EXPECT_EQ(0, ask(0, 300));
    EXPECT_NEAR(length, stream.Arc(0), 1e-9) << "a stale arc is repaired first";
    stream.Codes(0, L, -1);
    EXPECT_EQ(KFS_Err_InterpNotAllowed, ask(0, 300));
    EXPECT_EQ(SEQ_Err_BadIndex, ask(2, 1300));
    EXPECT_EQ(0, ask(1, 900));
    EXPECT_FALSE(std::isfinite(t)) << "divided by an arc of no length";
}

// ---- a segment as a curve

using Points = std::array<double, 8>;  // p0 to p3, x and y

Points PointsOf(KFSp_SegmentCurve const& s)
{
    return {s.p0[0], s.p0[1], s.p1[0], s.p1[1], s.p2[0], s.p2[1], s.p3[0], s.p3[1]};
}

// Two seconds from value 10 to value 20, beginning at second 3.
KeyedStream MakeSegment(int out, int in, Handle const& first = {99, 99, 3, 0.25},
                        Handle const& second = {-1, 0.5, 99, 99})
{
    KeyedStream stream = MakeKeyed({{1800, 10.0}, {3000, 20.0}}, L);
    stream.Codes(0, L, out).Codes(1, in, L).SetHandle(0, first).SetHandle(1, second);
    return stream;
}

TEST_F(Segments, ACurveForEveryPairOfCodes)
{
    // Out handle 3 a second and a quarter long, in handle -1 a second and half; a chord handle is 0.16666666667 of
    // (2, 10).
    struct Row {
        int out, in;
        Points points;
    } const rows[] = {
        {L, L, {0, 10, 0.33333333334, 11.6666666667, 1.66666666666, 18.3333333333, 2, 20}},
        {L, S, {0, 10, 0.33333333334, 11.6666666667, 1, 21, 2, 20}},
        {S, L, {0, 10, 0.5, 11.5, 1.66666666666, 18.3333333333, 2, 20}},
        {S, S, {0, 10, 0.5, 11.5, 1, 21, 2, 20}},
        {H, L, {}},
        {S, H, {}},
        {H, 0, {}},
    };
    for (Row const& row : rows) {
        bool const holds = row.out == H || row.in == H;
        for (bool const relative : {false, true}) {
            SCOPED_TRACE(testing::Message() << row.out << " to " << row.in << (relative ? ", relative" : ""));
            KeyedStream const stream = MakeSegment(row.out, row.in);
            for (int const time : {0, 1801, 2400}) {
                KFSp_SegmentCurve curve(2);
                unsigned char isHold = 9;
                int const index = time == 0 ? 0 : KFS_INVALID_INDEX;
                ASSERT_EQ(0, KFSp_ConstructCurve(stream, index, time, 0, relative, 0, &isHold, &curve.curve));
                EXPECT_EQ(holds, isHold != 0);
                Points const points = PointsOf(curve);
                for (std::size_t i = 0; i < 8 && !holds; ++i)
                    EXPECT_DOUBLE_EQ(row.points[i] + (i % 2 == 0 && !relative ? 3.0 : 0.0), points[i]) << i;
            }
            EXPECT_EQ(0, stream.Pins());
            // One that leaves and arrives falling: segments with a spline side are treated, on streams that ask for it.
            KeyedStream falling = MakeSegment(row.out, row.in, {0, 0, -6, 0.5}, {-6, 0.5, 0, 0});
            Points points[2] = {};
            for (bool const flag : {false, true}) {
                KFSp_SegmentCurve curve(2);
                unsigned char isHold = 9;
                falling.StreamFlag(KFS_StreamFlag_NonDecreasing, flag);
                ASSERT_EQ(0, KFSp_ConstructCurve(falling, 0, 0, 0, relative, 0, &isHold, &curve.curve));
                if (!holds) points[flag] = PointsOf(curve);
            }
            EXPECT_EQ(!holds && (row.out == S || row.in == S), points[0] != points[1]);
        }
    }
    // Only x counts for a component outside the value; nothing outside the record is read for it.
    KeyedStream const stream = MakeSegment(S, L);
    for (int const component : {-1, 1, 5, 1000000, -1000000}) {
        KFSp_SegmentCurve curve(2);
        unsigned char isHold = 1;
        ASSERT_EQ(0, KFSp_ConstructCurve(stream, 0, 0, component, 0, 0, &isHold, &curve.curve));
        EXPECT_TRUE(curve.p0[0] == 3.0 && curve.p3[0] == 5.0) << component;
    }
}

TEST_F(Segments, ACurveOutsideTheKeysIsReported)
{
    KeyedStream const stream = MakeKeyed({{10, 1}, {20, 2}}, L), lone = MakeKeyed({{10, 1}}, L);
    TestStream const empty;
    constexpr int none = KFS_INVALID_INDEX;
    struct Row {
        KFS_Stream const* stream;
        int index, time, code;
    } const rows[] = {{stream, none, 5, KFS_Err_TimeOutsideKeys}, {stream, none, 25, KFS_Err_TimeOutsideKeys},
                      {stream, 1, 0, KFS_Err_TimeOutsideKeys},    {stream, none, 20, KFS_Err_TimeOutsideKeys},
                      {lone, 0, 0, KFS_Err_TimeOutsideKeys},      {lone, none, 10, KFS_Err_TimeOutsideKeys},
                      {stream, 7, 0, SEQ_Err_BadIndex},           {empty, 0, 0, SEQ_Err_BadList}};
    for (Row const& row : rows) {
        KFSp_SegmentCurve curve(2);
        unsigned char isHold = 1;
        EXPECT_EQ(row.code, KFSp_ConstructCurve(row.stream, row.index, row.time, 0, 0, 0, &isHold, &curve.curve));
        EXPECT_EQ(0, isHold);
        std::vector<Reported> const outside{KfsReport(100, "time is before first keyframe or after last")};
        EXPECT_EQ(row.code == KFS_Err_TimeOutsideKeys ? outside : std::vector<Reported>{}, reports.Take());
    }
    EXPECT_EQ(0, stream.Pins() + lone.Pins());
}

TEST_F(Segments, APathsCurveRunsThroughFloatKeysAndTheSpeedGraphDoesNot)
{
    KeyedStream stream({.dimension = 2, .spatial = true});
    for (int i = 0; i < 4; ++i) stream.Key(10 * (i + 1), {1.0 * i, 1.0});
    stream.Settle().Flag(1, KFS_KeyFlag_Float).Flag(2, KFS_KeyFlag_Float);
    for (int i = 0; i < 4; ++i) {
        double const numbers[] = {100.0 * i, 1.0 * i, /*in*/ -1.0 - i, 0.5, /*out*/ 2.0 + i, -0.25};
        std::copy_n(numbers, 6, KFSp_Numbers(stream.Record(i)));
    }
    unsigned char isHold = 1;
    for (int const index : {1, KFS_INVALID_INDEX}) {
        KFSp_SegmentCurve path(2);
        ASSERT_EQ(0, KFSp_ConstructCurve(stream, index, 25, -9999, 0, 1, &isHold, &path.curve));
        EXPECT_EQ((Points{100, 1, 103, 0.75, 197, 2.5, 200, 2}), PointsOf(path));
    }
    // Asked by a float key or by the anchor before it: one speed graph, from anchor to anchor.
    for (int const index : {0, 1, 2}) {
        KFSp_SegmentCurve graph(2);
        ASSERT_EQ(0, KFSp_ConstructCurve(stream, index, 0, -1, 0, 0, &isHold, &graph.curve));
        EXPECT_DOUBLE_EQ(10.0 / 600.0, graph.p0[0]) << index;
        EXPECT_DOUBLE_EQ(40.0 / 600.0, graph.p3[0]) << index;
    }
}

}  // namespace
