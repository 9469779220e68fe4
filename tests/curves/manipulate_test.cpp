// Drags over random segments, held against reads before and after, and conversions there and back again.
#include "curves/manipulate.h"

#include "curves/spatial_private.h"
#include "curves/tangents.h"
#include "curves/update.h"
#include "keystore/attributes.h"
#include "keystore/keyflags.h"
#include "keystore/lookup.h"
#include "tests/curves/keyedstream.h"
#include "tests/support/dice.h"

#include <climits>
#include <cmath>

namespace {

using Manipulate = StreamTest;

constexpr char const* OutsideText = "time is before first keyframe or after last";
constexpr char const* CantText = "can#{rsquo}t directly manipulate this stream.";

void Done(int code)
{
    ASSERT_EQ(0, code);
}

double RandomInfluence(Dice& dice)
{
    static constexpr double special[] = {0.0, 1e-300, 0.0001, 1.0, 1.0, 1.7, -0.3, 1.0 / 3.0};
    return dice.Below(3) ? dice.Between(0.0, 1.0) : special[dice.Below(8)];
}

char RandomCode(Dice& dice)
{
    static constexpr char codes[] = {KFS_Interp_Spline, KFS_Interp_Spline, KFS_Interp_Linear, KFS_Interp_Hold};
    return codes[dice.Below(4)];
}

// Keys of all kinds, somewhere on the time axis.
KeyedStream RandomStream(Dice& dice, bool rising)
{
    static constexpr unsigned int scales[] = {1, 24, 600, 30000, 254016000};
    int const dimension = 1 + dice.Below(3);
    KeyedStream stream({.dimension = static_cast<short>(dimension), .timeScale = scales[dice.Below(5)]});
    int const gap = 1 << (2 + dice.Below(22));
    int time = static_cast<int>(dice.Between(-2.1e9, 1.9e9));
    double const size = std::fabs(dice.Wild(8));
    for (int i = 0; i < 9; ++i) {
        std::vector<double> value;
        for (int c = 0; c < dimension; ++c) value.push_back(dice.Between(-size, size));
        stream.Key(time, value, KFS_Interp_Spline);
        time += 2 + dice.Below(gap);
    }
    stream.Settle();
    if (rising) stream.StreamFlag(KFS_StreamFlag_NonDecreasing);
    double const second = stream->GetTimeScale() / static_cast<double>(gap);
    auto const speed = [&] { return dice.Below(4) ? dice.Between(-size, size) * second * 4.0 : 0.0; };
    for (int i = 0; i < stream.Count(); ++i) {
        for (int c = 0; c < dimension; ++c)
            stream.SetHandle(i, {speed(), RandomInfluence(dice), speed(), RandomInfluence(dice)}, c);
        stream.Codes(i, RandomCode(dice), RandomCode(dice));
        stream.Flag(i, KFS_KeyFlag_Modifiable, dice.Below(4) == 0).Flag(i, KFS_KeyFlag_Continuous, dice.Below(3) == 0);
    }
    EXPECT_EQ(0, stream->SetInvalid(-1, static_cast<short>(stream.Count())));
    return stream;
}

// A component's control points as the keys have them.
struct Graph {
    long double x[4];
    long double y[4];

    Graph(KeyedStream const& stream, int index, int component)
    {
        KFS_KeyScalar const* const a = stream.Record(index);
        KFS_KeyScalar const* const b = stream.Record(index + 1);
        int const dimension = stream->GetDimension();
        double const dt = KFSp_Seconds(b->time, a->time, stream->GetTimeScale());
        auto const from = KFSp_GetTemporalRuns(a, dimension);
        auto const to = KFSp_GetTemporalRuns(b, dimension);
        double const out = std::clamp(from.outInfluence[component], 1e-4, 1.0) * dt;
        double const in = std::clamp(to.inInfluence[component], 1e-4, 1.0) * dt;
        double p0[] = {0.0, from.value[component]};
        double p1[] = {out, from.value[component] + out * from.outSpeed[component]};
        double p2[] = {dt - in, to.value[component] - in * to.inSpeed[component]};
        double p3[] = {dt, to.value[component]};
        CRV_Curve curve{2, p0, p1, p2, p3};
        if (stream->GetKFSFlags() & KFS_StreamFlag_NonDecreasing) Done(CRV_CurveSetNonDecreasing(&curve, nullptr));
        double const* const points[] = {p0, p1, p2, p3};
        for (std::size_t i = 0; i < 4; ++i) {
            x[i] = points[i][0];
            y[i] = points[i][1];
        }
    }
    long double Size() const
    {
        long double size = 0.0L;
        for (long double const height : y) size = std::max(size, std::fabs(height));
        return size;
    }
    // The heights to which handles between the two ends carry it, at these lengths.
    std::pair<long double, long double> Reach(long double seconds) const
    {
        long double const t = SolveCubic(x, seconds);
        long double const low = std::min(y[0], y[3]);
        long double const high = std::max(y[0], y[3]);
        long double const lowest[] = {y[0], low, low, y[3]};
        long double const highest[] = {y[0], high, high, y[3]};
        return {CubicAt(lowest, t), CubicAt(highest, t)};
    }
};

// Drags the segment behind a key at a time. Answers whether it came through.
bool DragOne(Dice& dice, KeyedStream& stream, int index, int time)
{
    int const dimension = stream->GetDimension();
    int const chosen = dimension == 1 ? dice.Below(2) - 1 : -1;
    std::vector<double> const before = stream.At(time);
    std::vector<double> change;
    double const far = stream->GetKFSFlags() & KFS_StreamFlag_NonDecreasing ? 0.3 : 3.0;
    for (int c = 0; c < dimension; ++c) {
        double const size = std::max(std::fabs(KFSp_Numbers(stream.Record(index))[c]), 1e-6);
        change.push_back(dice.Below(5) ? dice.Between(-far, far) * size : 0.0);
    }
    T_Time at{time, 1};  // the scale isn't looked at
    int const code = KFS_DirectManipArc(stream, &at, 0, chosen, change.data());
    EXPECT_EQ(0, stream.Pins());
    EXPECT_EQ(KFS_Interp_Spline, stream.Record(index)->outInterp);
    EXPECT_EQ(KFS_Interp_Spline, stream.Record(index + 1)->inInterp);
    bool beyond = false;
    std::vector<double> const after = stream.At(time);
    for (int c = 0; c < dimension; ++c) {
        auto const d = static_cast<std::size_t>(c);
        Graph const graph(stream, index, c);
        long double const wanted = static_cast<long double>(before[d]) + change[d];
        long double const allowed = 1e-9L * std::max(graph.Size(), std::fabs(wanted));
        EXPECT_TRUE(code != 0 || std::fabs(wanted - after[d]) <= allowed)
            << "component " << c << " at " << after[d] << " of " << static_cast<double>(wanted);
        auto const [lowest, highest] = graph.Reach(
            static_cast<long double>(KFSp_TimeDifference(time, stream.Record(index)->time)) / stream->GetTimeScale());
        long double const slack = (highest - lowest) / 20;  // an upright curve's handles become a little shorter
        beyond = beyond || wanted < lowest + slack + allowed || wanted > highest - slack - allowed;
    }
    if (code == 0) return true;
    EXPECT_EQ(CRV_Err_OutOfReach, code);
    EXPECT_TRUE(beyond && (stream->GetKFSFlags() & KFS_StreamFlag_NonDecreasing)) << "nothing is out of reach";
    return false;
}

TEST_F(Manipulate, ADraggedCurvePassesThroughItsTargetOrSaysThatItCant)
{
    int const rounds = Rounds(1300);
    int through[2] = {0, 0};
    int dragged[2] = {0, 0};
    for (int round = 0; round < rounds && !HasFailure(); ++round) {
        Dice dice(static_cast<std::uint64_t>(round));
        bool const rising = round % 4 == 0;
        KeyedStream stream = RandomStream(dice, rising);
        for (int i = 0; i + 1 < stream.Count(); ++i) {
            int const start = stream.Record(i)->time;
            int const length = stream.Record(i + 1)->time - start;
            int const offset = dice.Below(4) ? 1 + dice.Below(length - 1) : dice.Below(2) ? 1 : length - 1;
            SCOPED_TRACE(testing::Message()
                         << "round " << round << ", segment " << i << " at " << offset << " of " << length);
            ++dragged[rising];
            through[rising] += DragOne(dice, stream, i, start + offset) ? 1 : 0;
        }
    }
    EXPECT_EQ(dragged[0], through[0]);
    EXPECT_LT(dragged[1] / 20, through[1]);
    EXPECT_LT(through[1], dragged[1]);
}

// What doesn't fit doubles ends in a code, and never in a handle that isn't finite.
TEST_F(Manipulate, HugeNumbersAreReachedOrRefused)
{
    static constexpr double sizes[] = {0.0, 5e-324, 1e-300, 1.0, 1e150, 1e300, -1e308, 1.7e308};
    Dice dice(7);
    int refused = 0;
    for (int round = 0; round < Rounds(3000); ++round) {
        KeyedStream stream = MakeKeyed({{0, sizes[dice.Below(8)]}, {1000, sizes[dice.Below(8)]}}, RandomCode(dice));
        auto const influence = [&] { return dice.Below(2) ? 1.0 / 6.0 : sizes[dice.Below(8)]; };
        for (int i = 0; i < 2; ++i)
            stream.SetHandle(i, {sizes[dice.Below(8)], influence(), sizes[dice.Below(8)], influence()});
        T_Time at{1 + dice.Below(999), 600};
        double const change = sizes[dice.Below(8)];
        int const code = KFS_DirectManipArc(stream, &at, 0, -1, &change);
        EXPECT_TRUE(std::isfinite(stream.GetHandle(0).outSpeed) && std::isfinite(stream.GetHandle(0).outInfluence));
        EXPECT_TRUE(std::isfinite(stream.GetHandle(1).inSpeed) && std::isfinite(stream.GetHandle(1).inInfluence));
        if (code == 0) {
            EXPECT_TRUE(std::isfinite(stream.At1(at.value)));
            continue;
        }
        EXPECT_TRUE(code == CRV_Err_NotFinite || code == CRV_Err_OutOfReach) << code;
        ++refused;
    }
    EXPECT_LT(100, refused);
}

TEST_F(Manipulate, ADraggedPathPassesThroughItsTarget)
{
    int const rounds = Rounds(150);
    for (int round = 0; round < rounds && !HasFailure(); ++round) {
        SCOPED_TRACE(round);
        Dice dice(static_cast<std::uint64_t>(round));
        double const size = std::fabs(dice.Wild(6));
        auto const place = [&] { return Vector{dice.Between(-size, size), dice.Between(-size, size)}; };
        KeyedStream stream(PathOptions(2, round % 2 == 0));
        int const start = static_cast<int>(dice.Between(-2e9, 2e9));
        for (int i = 0; i < 9; ++i) stream.Key(start + i * 300, place(), KFS_Interp_Spline);
        for (int i = 0; i < 9; ++i) {
            Vector const in = place();
            Vector const out = place();
            if (dice.Below(3)) Done(KFS_SetKeySpaceTangentsF(stream, i, -1, in.data(), out.data()));
            if (dice.Below(4) == 0) Done(KFS_SetKeySpModifiable(stream, 1, i));
            if (dice.Below(3) == 0 && round % 4 < 2)
                Done(KFS_SetKeyFlags(stream, i, KFS_KeyFlag_Float, KFS_KeyFlag_Float));
        }
        for (int i = 0; i < 8; ++i) {
            EXPECT_EQ(0, stream->UpdateStream());
            int const first = stream.Record(i)->time;
            int const length = stream.Record(i + 1)->time - first;
            if (length < 2) continue;
            T_Time at{first + 1 + dice.Below(length - 1), 1};
            KFSp_PathPoint held;
            ASSERT_EQ(0, KFSp_FindOnPath(stream, at.value, &held));
            KFS_KeyScalar const* const a = held.first;
            KFS_KeyScalar const* const b = held.second;
            Vector const target = place();
            auto const numbers = [](KFS_KeyScalar const* key) {
                return Vector(KFSp_Numbers(key), KFSp_Numbers(key) + 6);
            };
            Vector const handles[] = {numbers(a), numbers(b)};
            ASSERT_EQ(0, KFS_DirectManipArc(stream, &at, 1, -1, target.data()));
            EXPECT_EQ(0, stream.Pins());
            auto const from = KFSp_GetSpatialRuns(a, 2);
            auto const to = KFSp_GetSpatialRuns(b, 2);
            for (std::size_t c = 0; c < 2; ++c) {
                long double const p[] = {from.value[c], from.value[c] + from.outTangent[c],
                                         to.value[c] + to.inTangent[c], to.value[c]};
                long double const reach =
                    std::max({std::fabs(p[1]), std::fabs(p[2]), std::fabs(p[0]), std::fabs(p[3])});
                EXPECT_NEAR(target[c], CubicAt(p, held.t), 1e-9L * reach);
                EXPECT_EQ(handles[0][c], from.value[c]);
                EXPECT_EQ(handles[1][c], to.value[c]);
            }
        }
    }
}

TEST_F(Manipulate, OneComponentDraggedGivesItsOldHandlesToTheOthers)
{
    KeyedStream stream = MakeKeyed({{6000, 5}, {6600, 50}}, KFS_Interp_Spline, {.dimension = 3});
    for (int i = 0; i < 2; ++i)
        for (int c = 0; c < 3; ++c) stream.SetHandle(i, {3.0 * c, 0.25, 5.0 * c, 0.5}, c);
    std::vector<double> const before = stream.At(6300);
    T_Time at{6300, 600};
    double const change[] = {100, 7, 100};
    ASSERT_EQ(0, KFS_DirectManipArc(stream, &at, 0, 1, change));
    EXPECT_NEAR(before[1] + 7, stream.At(6300)[1], 1e-12);
    for (int const c : {0, 2}) {
        EXPECT_DOUBLE_EQ(5.0, stream.GetHandle(0, c).outSpeed);
        EXPECT_DOUBLE_EQ(0.5, stream.GetHandle(0, c).outInfluence);
        EXPECT_DOUBLE_EQ(3.0, stream.GetHandle(1, c).inSpeed);
        EXPECT_DOUBLE_EQ(0.25, stream.GetHandle(1, c).inInfluence);
    }
}

// A line stays the line that it is where it isn't moved, also one whose keys hold other handles.
TEST_F(Manipulate, ALineDraggedNowhereStays)
{
    KeyedStream stream = MakeKeyed({{0, 10}, {600, 40}}, KFS_Interp_Linear);
    for (int i = 0; i < 2; ++i) stream.SetHandle(i, {-77, 0.9, 55, 0.8});
    T_Time at{100, 600};
    double const change = 0;
    ASSERT_EQ(0, KFS_DirectManipArc(stream, &at, 0, 0, &change));
    for (int time = 0; time <= 600; time += 25) EXPECT_NEAR(10 + time / 20.0, stream.At1(time), 1e-12);
}

TEST_F(Manipulate, WhatCantBeDraggedIsRefusedUntouched)
{
    KeyedStream const plain = MakeKeyed({{0, 1}, {300, 2}, {600, 3}}, KFS_Interp_Linear, {.dimension = 2});
    PathStream const path({{0, {0, 0}}, {300, {5, 5}}, {600, {9, 0}}});
    PathStream const solid({{0, {0, 0, 0}}, {300, {5, 5, 5}}}, KFS_Interp_Linear, PathOptions(3));
    PathStream const held({{0, {0, 0}}, {300, {5, 5}}}, KFS_Interp_Hold);
    TestStream const constant({.noKeys = true, .spatial = false});
    constant->GetCache()->time = 0;
    struct Row {
        char const* what;
        TestStream const* stream;
        int time;
        bool spatial;
        int dimension;
        int code;
        std::vector<Reported> reports;
        int pins = 0;
    };
    std::vector<Reported> const outside{KfsReport(100, OutsideText)};
    std::vector<Reported> const refused{KfsReport(98, CantText)};
    for (Row const& row :
         std::vector<Row>{{"before", &plain, -1, false, -1, KFS_Err_TimeOutsideKeys, outside},
                          {"after", &plain, 601, false, 0, KFS_Err_TimeOutsideKeys, outside},
                          {"at the first", &plain, 0, false, 0, KFS_Err_TimeOutsideKeys, outside},
                          {"at a key", &plain, 300, false, 0, KFS_Err_TimeOutsideKeys, outside},
                          {"at the last", &path, 600, true, -1, KFS_Err_TimeOutsideKeys, outside},
                          {"a path of a plain stream", &plain, 100, true, -1, KFS_Err_ArcLength2D, refused, 1},
                          {"three dimensions", &solid, 100, true, -1, KFS_Err_ArcLength2D, refused, 1},
                          {"outside of three dimensions", &solid, 999, true, -1, KFS_Err_ArcLength2D, refused, 2},
                          {"the speed graph", &path, 100, false, -1, KFS_Err_ArcLength2D, refused},
                          {"no such component", &plain, 100, false, 2, KFS_Err_ArcLength2D, refused, 1},
                          {"a path that stands", &held, 100, true, -1, CRV_Err_OutOfReach, {}},
                          {"a constant", &constant, 100, false, 0, SEQ_Err_BadList, {}}}) {
        SCOPED_TRACE(row.what);
        std::vector<unsigned char> const before = row.stream->Bytes();
        T_Time at{row.time, 600};
        double const target[] = {77, 88};
        EXPECT_EQ(row.code, KFS_DirectManipArc(*row.stream, &at, row.spatial, row.dimension, target));
        EXPECT_EQ(row.reports, reports.Take());
        EXPECT_EQ(before, row.stream->Bytes());
        EXPECT_EQ(row.pins, row.stream->Pins());
    }
    for (TestStream const* const pinned :
         {static_cast<TestStream const*>(&plain), static_cast<TestStream const*>(&solid)})
        while (pinned->Pins() > 0) EXPECT_EQ(0, SEQ_Unlock((*pinned)->GetKeys()));
}

TEST_F(Manipulate, ADimensionMoreAndOneLessIsTheSameStream)
{
    for (int round = 0; round < Rounds(300) && !HasFailure(); ++round) {
        SCOPED_TRACE(round);
        Dice dice(static_cast<std::uint64_t>(round));
        bool const spatial = round % 2 == 1;
        auto const make = [&](short dimension, bool wrongForm) {
            // Constants and plain streams take the source's form.
            return TestStream({.dimension = dimension, .noKeys = wrongForm, .spatial = spatial != wrongForm});
        };
        KeyedStream flat({.dimension = 2, .spatial = spatial});
        for (int i = 0; i < 2 + dice.Below(6); ++i)
            flat.Key(i * 300, {dice.Between(-9, 9), dice.Between(-9, 9)}, RandomCode(dice), RandomCode(dice));
        for (int i = 0; i < flat.Count(); ++i) {
            double const handle[] = {dice.Between(-9, 9), dice.Between(-9, 9), dice.Between(0, 1), dice.Between(0, 1)};
            bool const spline =
                flat.Record(i)->inInterp == KFS_Interp_Spline && flat.Record(i)->outInterp == KFS_Interp_Spline;
            if (spline && dice.Below(2)) {
                EXPECT_EQ(0, KFS_SetKeyVelocityF(flat, i, handle, handle));
                EXPECT_EQ(0, KFS_SetKeyInfluence(flat, i, handle + 2, handle + 2));
            }
            if (spatial && dice.Below(2)) Done(KFS_SetKeySpaceTangentsF(flat, i, -1, handle, handle + 2));
            if (spatial && dice.Below(3) == 0) Done(KFS_SetKeySpModifiable(flat, 1, i));
            if (spatial && dice.Below(3) == 0) Done(KFS_SetKeyFlags(flat, i, KFS_KeyFlag_Float, KFS_KeyFlag_Float));
            if (spline && dice.Below(2)) Done(KFS_SetKeyModifiable(flat, 1, i));
        }
        double const accuracy = 0.5;
        Vector const multiplier{2, 0.5};
        EXPECT_EQ(0, KFS_SetStreamAccuracy(flat, &accuracy, nullptr));
        if (spatial) Done(KFS_SetStreamMultiplier(flat, multiplier.data(), nullptr));
        TestStream const solid = make(3, dice.Below(2) == 0);
        TestStream const again = make(2, dice.Below(2) == 0);
        ASSERT_EQ(0, KFS_ConvertStreamDim(3, 4.5, flat, solid));
        ASSERT_EQ(0, KFS_ConvertStreamDim(2, 99, solid, again));
        EXPECT_EQ(flat->GetKFSFlags(), again->GetKFSFlags());
        EXPECT_TRUE(!spatial || flat->GetSpInterp() == again->GetSpInterp());
        // A mark ends at anchors, so times of float keys beyond one may be older than its handles.
        EXPECT_EQ(0, KFS_ForceUpdateStream(flat));
        EXPECT_EQ(0, KFS_ForceUpdateStream(again));
        ASSERT_EQ(flat.Times(), again.Times());
        for (int i = 0; i < solid.Count(); ++i) {
            EXPECT_EQ(4.5, KFSp_Numbers(solid.Record(i))[2]);
            EXPECT_EQ(flat.Record(i)->flags, again.Record(i)->flags);
            EXPECT_EQ(flat.Record(i)->inInterp, again.Record(i)->inInterp);
            EXPECT_EQ(flat.Record(i)->outInterp, again.Record(i)->outInterp);
        }
        for (int time = -100; time <= flat.Count() * 300; time += 50) {
            std::vector<double> const there = solid.At(time);
            EXPECT_EQ(4.5, there[2]);
            EXPECT_EQ(flat.At(time), again.At(time)) << time;
            EXPECT_TRUE(spatial || flat.At(time) == std::vector<double>(there.begin(), there.end() - 1)) << time;
        }
    }
}

TEST_F(Manipulate, AConstantOfAnotherDimensionIsAConstant)
{
    TestStream constant({.dimension = 2, .noKeys = true});
    constant.Key(500, {3, 4});
    TestStream keyed({.dimension = 3});
    keyed.Key(100, {1, 1, 1}).Key(200, {2, 2, 2});
    ASSERT_EQ(0, KFS_ConvertStreamDim(3, 8, constant, keyed));
    EXPECT_TRUE(keyed->HasNoKeys());
    EXPECT_EQ(0, keyed.Count());
    EXPECT_EQ((std::vector<double>{3, 4, 8}), keyed.At(123));
}

TEST_F(Manipulate, OnlyTwoAndThreeDimensionsAreConverted)
{
    TestStream const flat({.dimension = 2});
    TestStream const solid({.dimension = 3});
    TestStream const line({.dimension = 1});
    KFS_ValueDesc desc;
    desc.isCustom = 1;
    desc.itemSize = 16;
    KFS_Stream custom(2, 600, 0, 0, KFS_InterpMask_All, 0, desc, nullptr, nullptr, false);
    char const* const only = "only 2d or 3d spatial streams are allowed for this operation.";
    char const* const noCustom = "custom streams are not allowed for this operation.";
    struct Row {
        short newDimension;
        KFS_Stream* source;
        KFS_Stream* destination;
        int code;
        char const* text;
    };
    for (Row const& row : {Row{4, flat, solid, KFS_Err_Only2D3D, only},
                           {1, flat, solid, KFS_Err_Only2D3D, only},
                           {3, line, solid, KFS_Err_Only2D3D, only},
                           {3, flat, line, KFS_Err_Only2D3D, only},
                           {3, &custom, solid, KFS_Err_CustomNotAllowed, noCustom},
                           {3, flat, &custom, KFS_Err_CustomNotAllowed, noCustom}}) {
        EXPECT_EQ(row.code, KFS_ConvertStreamDim(row.newDimension, 0, row.source, row.destination));
        EXPECT_REPORT(reports, 106, row.text);
    }
}

}  // namespace
