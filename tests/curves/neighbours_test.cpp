#include "curves/neighbours_private.h"

#include "frame/report_private.h"
#include "tests/curves/keyedstream.h"

#include <array>
#include <limits>

namespace {

using NeighboursTest = StreamTest;

// Keys are written as a string: 'A' is a key, 'f' a float key, at times 10, 20, 30 ...
KeyedStream MakeRow(std::string const& row, bool spatial, bool sParametrized)
{
    KeyedStream stream({.dimension = 2, .spatial = spatial});
    for (std::size_t i = 0; i < row.size(); ++i)
        stream.Key(10 * (static_cast<int>(i) + 1), {static_cast<double>(i), 1.0});
    stream.Settle();
    for (std::size_t i = 0; i < row.size(); ++i) stream.Flag(static_cast<int>(i), KFS_KeyFlag_Float, row[i] == 'f');
    stream.StreamFlag(KFS_StreamFlag_SParametrize, sParametrized);
    return stream;
}

// ---- curves

struct Points {
    std::array<double, 8> xy;  // p0, p1, p2, p3
    explicit Points(KFSp_SegmentCurve const& s)
        : xy{s.p0[0], s.p0[1], s.p1[0], s.p1[1], s.p2[0], s.p2[1], s.p3[0], s.p3[1]}
    {}
};

struct PairOfCodes {
    int out;
    int in;
    std::array<double, 8> xy;
};

// Two seconds from value 10 to value 20, beginning at second 3; out handle 3 a second and a quarter long, in handle -1
// a second and half. A chord handle is 0.16666666667 of (2, 10).
PairOfCodes const Codes[] = {
    {KFS_Interp_Linear, KFS_Interp_Linear, {0, 10, 0.33333333334, 11.6666666667, 1.66666666666, 18.3333333333, 2, 20}},
    {KFS_Interp_Linear, KFS_Interp_Spline, {0, 10, 0.33333333334, 11.6666666667, 1, 21, 2, 20}},
    {KFS_Interp_Spline, KFS_Interp_Linear, {0, 10, 0.5, 11.5, 1.66666666666, 18.3333333333, 2, 20}},
    {KFS_Interp_Spline, KFS_Interp_Spline, {0, 10, 0.5, 11.5, 1, 21, 2, 20}},
};

KeyedStream MakeSegment(int out, int in, double from = 10.0, double to = 20.0)
{
    KeyedStream stream = MakeKeyed({{1800, from}, {3000, to}}, KFS_Interp_Linear);
    stream.Codes(0, KFS_Interp_Linear, out).Codes(1, in, KFS_Interp_Linear);
    stream.SetHandle(0, {99, 99, 3, 0.25}).SetHandle(1, {-1, 0.5, 99, 99});
    return stream;
}

TEST_F(NeighboursTest, FillsTheSegmentOfEveryPairOfCodes)
{
    for (PairOfCodes const& pair : Codes) {
        SCOPED_TRACE(testing::Message() << pair.out << " to " << pair.in);
        KeyedStream const stream = MakeSegment(pair.out, pair.in);
        for (auto const& [keyIndex, time, relative] : {std::tuple{0, 0, true},
                                                       {KFS_INVALID_INDEX, 2400, true},
                                                       {0, 0, false},
                                                       {KFS_INVALID_INDEX, 1801, false}}) {
            KFSp_SegmentCurve segment(2);
            unsigned char isHold = 9;
            ASSERT_EQ(0, KFSp_ConstructCurve(stream, keyIndex, time, 0, relative, 0, &isHold, &segment.curve));
            EXPECT_EQ(0, isHold);
            Points const points(segment);
            for (std::size_t i = 0; i < 8; ++i) {
                double const shift = i % 2 == 0 && !relative ? 3.0 : 0.0;
                EXPECT_DOUBLE_EQ(pair.xy[i] + shift, points.xy[i]) << "coordinate " << i;
            }
        }
        EXPECT_EQ(0, stream.Pins());
    }
}

TEST_F(NeighboursTest, AHoldOnEitherSideBuildsNothing)
{
    for (auto const& [out, in] : {std::pair{3, 1}, {1, 3}, {2, 3}, {3, 3}, {3, 0}}) {
        KeyedStream const stream = MakeSegment(out, in);
        KFSp_SegmentCurve segment(2);
        segment.p0[0] = segment.p1[1] = segment.p2[0] = segment.p3[1] = -55.0;
        unsigned char isHold = 0;
        EXPECT_EQ(0, KFSp_ConstructCurve(stream, 0, 0, 0, 0, 0, &isHold, &segment.curve));
        EXPECT_EQ(1, isHold);
        for (double const coordinate : {segment.p0[0], segment.p1[1], segment.p2[0], segment.p3[1]})
            EXPECT_EQ(-55.0, coordinate);
    }
}

TEST_F(NeighboursTest, TimesOutsideTheKeysAreReported)
{
    KeyedStream const stream = MakeKeyed({{10, 1}, {20, 2}}, KFS_Interp_Linear);
    KeyedStream const lone = MakeKeyed({{10, 1}}, KFS_Interp_Linear);
    KFSp_SegmentCurve segment(2);
    unsigned char isHold = 1;
    constexpr int none = KFS_INVALID_INDEX;
    using Ask = std::tuple<KFS_Stream const*, int, int>;
    for (auto const& [asked, keyIndex, time] : {Ask{stream, none, 5},
                                                {stream, none, 25},
                                                {stream, 1, 0},
                                                {stream, none, 20},
                                                {lone, 0, 0},
                                                {lone, none, 10}}) {
        isHold = 1;
        EXPECT_EQ(KFS_Err_TimeOutsideKeys,
                  KFSp_ConstructCurve(asked, keyIndex, time, 0, 0, 0, &isHold, &segment.curve));
        EXPECT_REPORT(reports, 100, "time is before first keyframe or after last");
        EXPECT_EQ(0, isHold);
    }
    EXPECT_EQ(SEQ_Err_BadIndex, KFSp_ConstructCurve(stream, 7, 0, 0, 0, 0, &isHold, &segment.curve));
    EXPECT_EQ(SEQ_Err_BadList, KFSp_ConstructCurve(TestStream(), 0, 0, 0, 0, 0, &isHold, &segment.curve));
    EXPECT_EQ(0, stream.Pins() + lone.Pins());
}

// A curve from 20 down to 10 and one that overshoots: only segments with a spline side are treated, and only on such
// streams.
TEST_F(NeighboursTest, OnlySplineSidesAreMadeNonDecreasing)
{
    for (PairOfCodes const& pair : Codes) {
        for (bool const nonDecreasing : {false, true}) {
            SCOPED_TRACE(testing::Message() << pair.out << " to " << pair.in << ", " << nonDecreasing);
            KeyedStream stream = MakeSegment(pair.out, pair.in);
            stream.SetHandle(0, {0, 0, -6, 0.5}).SetHandle(1, {-6, 0.5, 0, 0});  // leaves and arrives falling
            KFSp_SegmentCurve before(2);
            unsigned char isHold = 0;
            ASSERT_EQ(0, KFSp_ConstructCurve(stream, 0, 0, 0, 1, 0, &isHold, &before.curve));
            stream.StreamFlag(KFS_StreamFlag_NonDecreasing, nonDecreasing);
            KFSp_SegmentCurve after(2);
            ASSERT_EQ(0, KFSp_ConstructCurve(stream, 0, 0, 0, 1, 0, &isHold, &after.curve));
            bool const treated = nonDecreasing && (pair.out == KFS_Interp_Spline || pair.in == KFS_Interp_Spline);
            EXPECT_EQ(!treated, Points(before).xy == Points(after).xy);
        }
    }
}

TEST_F(NeighboursTest, APathRunsThroughFloatKeysAndTheSpeedGraphDoesNot)
{
    KeyedStream stream = MakeRow("AffA", true, true);
    for (int i = 0; i < 4; ++i) {
        double const numbers[] = {100.0 * i, 1.0 * i, /*in*/ -1.0 - i, 0.5, /*out*/ 2.0 + i, -0.25};
        std::copy_n(numbers, 6, KFSp_Numbers(stream.Record(i)));
    }
    for (auto const& [keyIndex, time] : {std::pair{1, 0}, {KFS_INVALID_INDEX, 25}}) {
        KFSp_SegmentCurve path(2);
        unsigned char isHold = 1;
        ASSERT_EQ(0, KFSp_ConstructCurve(stream, keyIndex, time, -9999, 0, 1, &isHold, &path.curve));
        EXPECT_EQ((std::array<double, 8>{100, 1, 103, 0.75, 197, 2.5, 200, 2}), Points(path).xy);
    }
    // Asked by the float key or by the anchor before it: one speed graph, from anchor to anchor, 30 units long.
    for (int const keyIndex : {0, 1, 2}) {
        KFSp_SegmentCurve graph(2);
        unsigned char isHold = 1;
        ASSERT_EQ(0, KFSp_ConstructCurve(stream, keyIndex, 0, -1, 0, 0, &isHold, &graph.curve));
        EXPECT_DOUBLE_EQ(10.0 / 600.0, graph.p0[0]) << keyIndex;
        EXPECT_DOUBLE_EQ(40.0 / 600.0, graph.p3[0]) << keyIndex;
    }
}

// Only x counts where a caller asks for the component before the first; nothing outside the record is read for a
// component past the last.
TEST_F(NeighboursTest, ComponentsOutsideTheValueLeaveTheTimesRight)
{
    KeyedStream const stream = MakeSegment(KFS_Interp_Spline, KFS_Interp_Linear);
    for (int const component : {-1, 1, 5, 1000000, -1000000}) {
        KFSp_SegmentCurve segment(2);
        unsigned char isHold = 1;
        ASSERT_EQ(0, KFSp_ConstructCurve(stream, 0, 0, component, 0, 0, &isHold, &segment.curve));
        EXPECT_EQ(3.0, segment.p0[0]) << component;
        EXPECT_EQ(5.0, segment.p3[0]) << component;
    }
}

}  // namespace
