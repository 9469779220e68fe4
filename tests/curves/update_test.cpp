#include "curves/update.h"

#include "frame/errors.h"
#include "frame/services/memory.h"
#include "tests/curves/pathstream.h"

#include <utility>

namespace {

using UpdateStream = StreamTest;
using PredictInvalid = StreamTest;

PathStream Corner()
{
    return PathStream({{0, {0, 0}}, {100, {3, 4}}, {200, {3, 10}}, {300, {11, 10}}}, KFS_Interp_Spline);
}

TEST_F(UpdateStream, MeasuresArcsAsTheStreamRunsThroughThem)
{
    const struct {
        char const* why;
        bool sParametrized;
        double xScale;
        std::array<double, 3> arcs;
    } rows[] = {
        {"the length of the path", true, 1, {5, 6, 8}},
        {"in scaled coordinates", true, 2, {std::sqrt(52.0), 6, 16}},
        {"the chord, which nothing scales", false, 2, {5, 6, 8}},
    };
    for (auto const& c : rows) {
        SCOPED_TRACE(c.why);
        PathStream stream = Corner();
        stream.Straighten().StreamFlag(KFS_StreamFlag_SParametrize, c.sParametrized);
        (*stream->GetMultiplierForModify())[0] = c.xScale;
        for (int i = 0; i < 4; ++i) stream.Record(i)->arcLength = -1.0;
        ASSERT_EQ(0, KFS_ForceUpdateStream(stream));
        for (int i = 0; i < 3; ++i)
            EXPECT_NEAR(c.arcs[static_cast<std::size_t>(i)], stream.Arc(i), 1e-3) << "arc " << i;
        // Nothing begins at the last key. A path leaves it what it has, chords say so.
        EXPECT_EQ(c.sParametrized ? -1.0 : 0.0, stream.Arc(3));
        EXPECT_EQ(0, stream.Pins());
    }
}

// Finer is another number; how much finer is the kernel's matter.
TEST_F(UpdateStream, MeasuresToTheStreamsAccuracy)
{
    PathStream stream({{0, {0, 0}}, {600, {10, 0}}});
    stream.Tangents(0, {0, 0}, {0, 90}).Tangents(1, {-60, 30}, {0, 0});
    Vector arcs;
    for (double const accuracy : {1e-9, 10.0}) {
        stream->SetAccuracy(accuracy);
        ASSERT_EQ(0, KFS_ForceUpdateStream(stream));
        arcs.push_back(stream.Arc(0));
    }
    EXPECT_NE(arcs[0], arcs[1]);
}

TEST_F(UpdateStream, MeasuresDurationsOfACustomStream)
{
    PathStream stream = Corner();
    ASSERT_EQ(0, stream->UpdateStream());
    stream->MarkTemporarilyNonCustom(true);
    stream.Flag(1, KFS_KeyFlag_Float);
    ASSERT_EQ(0, KFS_ForceUpdateStream(stream));
    stream->MarkTemporarilyNonCustom(false);
    EXPECT_EQ((std::vector<double>{100.0 / 600, 100.0 / 600, 100.0 / 600, 0.0}), stream.Arcs());
    EXPECT_EQ(100, stream.Record(1)->time);  // and nothing floats
}

TEST_F(UpdateStream, LeavesTheKeyAtTheEndOfTheRangeItsArc)
{
    for (bool const curved : {true, false}) {
        SCOPED_TRACE(curved);
        PathStream stream = Corner();
        stream.Straighten().StreamFlag(KFS_StreamFlag_SParametrize, curved);
        for (int i = 0; i < 4; ++i) stream.Record(i)->arcLength = -7.0;
        ASSERT_EQ(0, stream->SetArcInvalid(2, 1));  // keys 1 and 2
        ASSERT_EQ(0, stream->UpdateStream());
        EXPECT_EQ(-7.0, stream.Arc(0));
        EXPECT_NEAR(6.0, stream.Arc(1), 1e-3);
        EXPECT_EQ(-7.0, stream.Arc(2));
        EXPECT_EQ(-7.0, stream.Arc(3));
    }
}

TEST_F(UpdateStream, TouchesNothingOutsideTheMarks)
{
    PathStream stream({}, KFS_Interp_Spline);
    for (int i = 0; i < 40; ++i) stream.Key(i * 10, {std::sin(i), std::cos(2.0 * i)}, KFS_Interp_Spline);
    ASSERT_EQ(0, stream->UpdateStream());
    for (int i = 0; i < 40; ++i) {
        stream.Record(i)->flags |= KFS_KeyFlag_Modifiable;
        stream.Record(i)->spFlags |= KFS_KeySpFlag_Modifiable;
        stream.Record(i)->inSpeed = 1e9;
        KFSp_GetSpatialRuns(stream.Record(i), 2).inTangent[0] = 1e9;
    }
    ASSERT_EQ(0, stream->SetInvalid(12, 2));
    ASSERT_EQ(0, stream->SetArcInvalid(24, 4));
    ASSERT_EQ(0, stream->UpdateStream());
    for (int i = 0; i < 40; ++i) {
        EXPECT_EQ(i >= 10 && i <= 12, stream.Record(i)->inSpeed != 1e9) << i;
        EXPECT_EQ(i >= 20 && i <= 24, KFSp_GetSpatialRuns(stream.Record(i), 2).inTangent[0] != 1e9) << i;
    }
    EXPECT_EQ(TestStream::NotStale, stream.Stale());
    EXPECT_EQ(TestStream::NotStale, stream.ArcStale());
}

TEST_F(UpdateStream, ComputesTheTangentsThatAreAutomatic)
{
    const struct {
        char const* why;
        unsigned short spInterp;
        bool set, modifiable, computed;
    } rows[] = {
        {"never given", KFS_SpInterp_Auto, false, false, true},
        {"given, and the user's", KFS_SpInterp_Auto, true, false, false},
        {"given, and automatic", KFS_SpInterp_Auto, true, true, true},
        {"a stream without automatic tangents", KFS_SpInterp_None, false, true, false},
    };
    for (auto const& c : rows) {
        SCOPED_TRACE(c.why);
        PathStream stream({{0, {0, 0}}, {100, {6, 0}}, {200, {6, 12}}});
        stream->SetSpInterp(c.spInterp);
        KFS_KeyScalar* const key = stream.Record(1);
        key->flags = static_cast<unsigned short>((key->flags & ~KFS_KeyFlag_TangentsSet) |
                                                 (c.set ? 0x2 : 0));  // one of the two bits is enough
        key->spFlags = c.modifiable ? unsigned{KFS_KeySpFlag_Modifiable} : 0U;
        KFSp_SpatialRuns<double> const runs = KFSp_GetSpatialRuns(key, 2);
        std::fill_n(runs.inTangent, 4, 1.0);
        KFSp_GetSpatialRuns(stream.Record(0), 2).inTangent[0] = 1.0;  // the path isn't straight here
        ASSERT_EQ(0, stream->SetArcInvalid(2, 2));
        ASSERT_EQ(0, stream->UpdateStream());
        Vector const chord = {-6 * KFSp_OneSixth, -12 * KFSp_OneSixth, 6 * KFSp_OneSixth, 12 * KFSp_OneSixth};
        EXPECT_EQ(c.computed ? chord : Vector(4, 1.0), Vector(runs.inTangent, runs.inTangent + 4));
        EXPECT_GT(stream.Arc(0), 6.0);  // measured with the tangents as they now are
    }
}

TEST_F(UpdateStream, WaitsWhileItIsHeldOff)
{
    PathStream stream = Corner();
    ASSERT_EQ(0, stream->SetInvalid(-1, 4));
    ASSERT_EQ(0, stream->SetArcInvalid(-1, 4));
    stream->SetDisabledUpdateStream(true);
    stream->SetDisabledUpdateStream(true);
    stream.Record(1)->arcLength = 77.0;
    std::vector<unsigned char> const before = stream.Bytes();
    double tangent[2] = {-1, -1};
    for (int release = 0; release < 2; ++release) {
        EXPECT_EQ(0, stream->UpdateStream());
        EXPECT_EQ(0, KFS_GetKeySpaceTangentsF(stream, 1, 0, tangent, nullptr));
        EXPECT_EQ(before, stream.Bytes());
        EXPECT_EQ((std::array<int, 2>{0, 3}), stream.Stale());
        EXPECT_EQ((std::array<int, 2>{0, 3}), stream.ArcStale());
        stream->SetDisabledUpdateStream(false);
    }
    EXPECT_EQ(0, stream->UpdateStream());
    EXPECT_NE(77.0, stream.Arc(1));
    EXPECT_EQ(TestStream::NotStale, stream.ArcStale());
}

TEST_F(UpdateStream, ConsumesTheMarksOfARepairThatFails)
{
    PathStream stream = Corner();
    for (int i = 0; i < 3; ++i) {
        KFS_KeyScalar* const key = stream.Record(i);
        key->arcLength = -1.0;
        // A table in its place would need no memory.
        EXPECT_EQ(0, key->remapTable ? SEQ_Dispose(std::exchange(key->remapTable, nullptr), 0) : 0);
    }
    ASSERT_EQ(0, stream->SetInvalid(-1, 4));
    ASSERT_EQ(0, stream->SetArcInvalid(-1, 4));
    Q_FailAllocation(2);
    int const code = stream->UpdateStream();
    bool const fired = Q_FailAllocationFired();
    Q_FailAllocation(0);
    ASSERT_TRUE(fired);
    EXPECT_EQ(Q_Err_OutOfMemory, code);
    EXPECT_EQ(TestStream::NotStale, stream.Stale());
    EXPECT_EQ(TestStream::NotStale, stream.ArcStale());
    EXPECT_EQ(0, stream.Pins());
    EXPECT_EQ(-1.0, stream.Arc(2));  // behind the failing one nothing changed
    // And the stream recovers.
    ASSERT_EQ(0, KFS_ForceUpdateStream(stream));
    EXPECT_GT(stream.Arc(2), 7.9);
}

TEST_F(UpdateStream, GuardsRunItForTheMarkedKeysOnly)
{
    const struct {
        char const* why;
        int index;
        bool floats;
        bool tangents;  // asks UpdateStreamIfStaleTangents, else UpdateStreamIfFloatItem
        bool runs;
    } guards[] = {
        {"before the range", 0, false, true, false},
        {"at its start", 1, false, true, true},
        {"at its end", 3, false, true, true},
        {"behind it", 4, false, true, false},
        {"a float key before it", 0, true, false, false},
        {"a float key in it", 2, true, false, true},
        {"an anchor in it", 2, false, false, false},
        {"a float key behind it", 4, true, false, false},
    };
    for (auto const& guard : guards) {
        SCOPED_TRACE(guard.why);
        PathStream stream({{0, {0, 0}}, {100, {1, 0}}, {200, {2, 0}}, {300, {3, 0}}, {400, {4, 0}}});
        KFS_KeyScalar probe{};
        probe.flags = static_cast<unsigned short>(guard.floats ? KFS_KeyFlag_Float : 0);
        int* const range =
            guard.tangents ? stream->GetInvalidKeyIndexForModify() : stream->GetArcInvalidKeyIndexForModify();
        range[0] = 1;
        range[1] = 3;
        ASSERT_EQ(0, guard.tangents ? stream->UpdateStreamIfStaleTangents(guard.index)
                                    : stream->UpdateStreamIfFloatItem(&probe, guard.index));
        EXPECT_EQ(guard.runs, range[0] == KFS_INVALID_INDEX);
    }
}

TEST_F(UpdateStream, ForcedOnALongListNarrowsItsCount)
{
    TestStream stream;
    KFS_Stream* const s = stream.get();
    int const count = 32768;
    for (int i = 0; i < count; ++i) stream.Key(i, {static_cast<double>(i % 7)}, KFS_Interp_Spline);
    ASSERT_EQ(0, s->UpdateStream());
    auto const speedAt5 = [&] { return KFSp_GetTemporalRuns(stream.Record(5), 1).inSpeed[0]; };
    KFSp_GetTemporalRuns(stream.Record(5), 1).inSpeed[0] = 123.0;
    stream.Record(5)->flags |= KFS_KeyFlag_Modifiable;
    EXPECT_EQ(0, KFS_ForceUpdateStream(s));
    EXPECT_EQ(123.0, speedAt5());  // a short made of the count is below 1: nothing is marked

    ASSERT_EQ(0, s->RemoveKey(count - 1, 0));
    EXPECT_EQ(0, KFS_ForceUpdateStream(s));
    EXPECT_NE(123.0, speedAt5());
}

TEST_F(UpdateStream, RefusesADamagedStream)
{
    DamagedStream damaged;
    EXPECT_EQ(2, KFS_ForceUpdateStream(damaged.get()));
    EXPECT_EQ(reports.Take(), std::vector<Reported>{DamagedReport(59, "merge")});
    T_Time time{0, 600};
    EXPECT_EQ(2, KFS_PredictInvalid(damaged.get(), 1, &time, &time, &time));
    EXPECT_EQ(reports.Take(), std::vector<Reported>{DamagedReport(77, "predict spatial change of")});
    EXPECT_TRUE(damaged.Untouched());
}

// Keys stand at 100, 200 ... 600; letters say what a key is: s spline and automatic, m spline and the user's, l linear,
// h hold.
struct ReachCase {
    char const* why;
    char const* keys;
    bool spatial;
    unsigned short action;
    int at, from, to;
};

ReachCase const ReachCases[] = {
    {"no action", "ssssss", false, 0, 300, 300, 300},
    {"an unknown action", "ssssss", false, 7, 300, 300, 300},
    {"between automatic keys", "ssssss", false, 1, 300, 100, 500},
    {"the second action is the first", "ssssss", false, 2, 300, 100, 500},
    {"between the keys", "ssssss", false, 1, 350, 200, 500},
    {"between the user's keys", "mmmmmm", false, 1, 300, 200, 400},
    {"an automatic key before", "lsmmmm", false, 1, 300, 100, 400},
    {"an automatic key behind", "mmmsmm", false, 1, 300, 200, 500},
    {"at the first key", "ssssss", false, 1, 100, 100, 300},
    {"at the last key", "ssssss", false, 1, 600, 400, 600},
    {"before all keys", "ssssss", false, 1, 10, 10, 200},
    {"behind all keys", "ssssss", false, 1, 999, 500, 999},
    {"next to the first key", "ssssss", false, 1, 200, 100, 400},
    {"the in side", "ssssss", false, 3, 300, 200, 300},
    {"the out side", "ssssss", false, 4, 300, 300, 400},
    {"the in side of the first key", "ssssss", false, 3, 100, 100, 100},
    {"the in side of a continuous key", "sscsss", false, 3, 300, 200, 400},
    {"the out side of a continuous key", "sscsss", false, 4, 300, 200, 400},
    {"the spatial in side", "ssssss", true, 5, 300, 200, 300},
    {"the spatial out side", "ssssss", true, 6, 300, 300, 400},
    {"a path whose key is continuous", "sscsss", true, 5, 300, 200, 400},
    {"a path whose tangents are automatic", "lplplp", true, 1, 300, 100, 500},
};

TEST_F(PredictInvalid, ReachesAsFarAsTheNeighboursAreAutomatic)
{
    for (ReachCase const& c : ReachCases) {
        SCOPED_TRACE(c.why);
        KeyedStream stream(c.spatial ? PathOptions(2, false) : StreamOptions{});
        Vector const value(c.spatial ? 2 : 1, 1.0);
        for (int i = 0; i < 6; ++i) stream.Key(100 + 100 * i, value, KFS_Interp_Spline);
        stream.Settle();
        for (int i = 0; i < 6; ++i) {
            char const letter = c.keys[i];
            if (letter == 'l') stream.Codes(i, KFS_Interp_Linear, KFS_Interp_Linear);
            stream.Flag(i, KFS_KeyFlag_Modifiable, letter == 's' || letter == 'c');
            if (!c.spatial) stream.Flag(i, KFS_KeyFlag_Continuous, letter == 'c');
            if (c.spatial && letter == 'p') stream.Record(i)->spFlags = KFS_KeySpFlag_Modifiable;
            if (c.spatial && letter == 'c') stream.Record(i)->spFlags = KFS_KeySpFlag_Continuous;
        }
        for (int const finer : {1, 3}) {
            T_Time const at{c.at * finer, 600U * static_cast<unsigned>(finer)};
            T_Time from{-5, 5}, to{-5, 5};
            ASSERT_EQ(0, KFS_PredictInvalid(stream, c.action, &at, &from, &to));
            EXPECT_EQ((std::tuple{c.from, c.to, 600U, 600U}), std::tie(from.value, to.value, from.scale, to.scale));
            EXPECT_EQ(0, stream.Pins());
        }
    }
}

TEST_F(PredictInvalid, AnswersTheTimeWithoutKeys)
{
    TestStream constant({.noKeys = true});
    TestStream empty;
    for (KFS_Stream* const stream : {constant.get(), empty.get()}) {
        T_Time const at{1, 2};
        T_Time from{}, to{};
        ASSERT_EQ(0, KFS_PredictInvalid(stream, 3, &at, &from, &to));
        EXPECT_EQ(300, from.value);
        EXPECT_EQ(600U, from.scale);
        EXPECT_EQ(from, to);
        T_Time const nowhere{1, 0};
        EXPECT_EQ(T_Err_Scale, KFS_PredictInvalid(stream, 1, &nowhere, &from, &to));
        EXPECT_EQ(600U, from.scale);
    }
}

TEST_F(PredictInvalid, RefusesSidesWithoutAKeyAndPathsWithoutSpace)
{
    KeyedStream stream = MakeKeyed({{100, 1}, {200, 2}}, KFS_Interp_Spline);
    T_Time const between{150, 600};
    T_Time from{-5, 5}, to{-5, 5};
    for (unsigned short const action : {3, 4}) {
        EXPECT_EQ(KFS_Err_NoControlPoint, KFS_PredictInvalid(stream, action, &between, &from, &to));
        EXPECT_REPORT(reports, 77, "no control point corresponding to passed time value.");
        EXPECT_EQ(-5, from.value);
        EXPECT_EQ(0, stream.Pins());
    }
    for (unsigned short const action : {5, 6}) {
        EXPECT_EQ(KFS_Err_NotSpatial, KFS_PredictInvalid(stream, action, &between, &from, &to));
        EXPECT_REPORT(reports, 77, "attempt to predict spatial change of a non-spatial stream.");
    }
}

}  // namespace
