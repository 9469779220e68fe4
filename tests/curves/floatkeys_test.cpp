#include "curves/floatkeys.h"

#include "curves/floatkeys_private.h"
#include "curves/tangents.h"
#include "frame/errors.h"
#include "keystore/lookup.h"
#include "tests/curves/pathstream.h"
#include "tests/support/listening.h"

#include <random>

namespace {

using FloatKeys = StreamTest;
using SetKeyTime = StreamTest;

// A path along the x axis without tangents, so that an abscissa is a distance.
PathStream Line(std::vector<std::pair<int, double>> const& keys, char interp = KFS_Interp_Linear)
{
    std::vector<PathStream::Stop> stops;
    for (auto const& [time, x] : keys) stops.push_back({time, {x, 0}});
    PathStream stream(stops, interp);
    stream.Straighten();
    return stream;
}

PathStream& Float(PathStream& stream, std::vector<int> const& indices)
{
    for (int const index : indices) EXPECT_EQ(0, KFS_SetKeyFloat(stream, 1, index));
    EXPECT_EQ(0, stream->UpdateStream());
    return stream;
}

struct FloatCase {
    char const* why;
    std::vector<std::pair<int, double>> keys;  // the first and the last are anchors
    char out, in;                              // of the anchors
    std::vector<int> times;
};

FloatCase const FloatCases[] = {
    {"linear sides", {{0, 0}, {1, 10}, {2, 40}, {100, 100}}, 1, 1, {0, 10, 40, 100}},
    {"cut off towards the past", {{0, 0}, {1, 1}, {2, 2}, {100, 3}}, 1, 1, {0, 33, 66, 100}},
    {"on the earlier anchor", {{0, 0}, {50, 0}, {100, 8}}, 1, 1, {0, 1, 100}},
    {"on the later anchor", {{0, 0}, {50, 8}, {100, 8}}, 1, 1, {0, 99, 100}},
    {"room for those that follow", {{0, 0}, {40, 8}, {50, 8}, {60, 8}, {100, 8}}, 1, 1, {0, 97, 98, 99, 100}},
    {"at one place", {{0, 0}, {10, 4}, {50, 4}, {60, 4}, {100, 8}}, 1, 1, {0, 49, 50, 51, 100}},
    {"no way at all", {{0, 5}, {40, 5}, {50, 5}, {100, 5}}, 1, 1, {0, 1, 2, 100}},
    {"a hold out of the earlier anchor", {{0, 0}, {40, 4}, {50, 6}, {100, 8}}, 3, 1, {0, 1, 2, 100}},
    {"a hold into the later one", {{0, 0}, {40, 4}, {50, 6}, {100, 8}}, 1, 3, {0, 1, 2, 100}},
    {"codes without a shape", {{0, 0}, {40, 4}, {50, 6}, {100, 8}}, -1, 1, {0, 1, 2, 100}},
    {"no more room than keys", {{0, 0}, {1, 4}, {2, 6}, {3, 8}}, 1, 1, {0, 1, 2, 3}},
};

TEST_F(FloatKeys, TakeTheTimeAtWhichThePointPasses)
{
    for (FloatCase const& c : FloatCases) {
        for (bool const again : {false, true}) {
            SCOPED_TRACE(testing::Message() << c.why << (again ? ", twice" : ""));
            PathStream stream = Line(c.keys);
            int const last = stream.Count() - 1;
            stream.Codes(0, 1, c.out).Codes(last, c.in, 1);
            std::vector<int> inner;
            for (int i = 1; i < last; ++i) inner.push_back(i);
            Float(stream, inner);
            EXPECT_EQ(0, again ? KFS_ForceUpdateStream(stream) : 0);
            EXPECT_EQ(c.times, stream.Times());
            EXPECT_EQ(0, stream.Pins());
        }
    }
}

TEST_F(FloatKeys, AreWhereTheReadFindsThem)
{
    std::mt19937 random(4242);
    std::uniform_real_distribution<double> influence(0.1, 0.9);
    std::uniform_real_distribution<double> step(0.5, 10.0);
    for (int round = 0; round < 30; ++round) {
        SCOPED_TRACE(round);
        std::vector<std::pair<int, double>> keys;
        double x = 0.0;
        for (int i = 0; i < 7; ++i) {
            keys.emplace_back(i * 1000, x);
            x += step(random);
        }
        PathStream stream = Line(keys, KFS_Interp_Spline);
        stream.Settle();
        for (int i = 0; i < 7; ++i)
            stream.SetHandle(i, {step(random), influence(random), step(random), influence(random)});
        if (round % 3 == 1) stream.Codes(0, 1, KFS_Interp_Linear);
        if (round % 3 == 2) stream.Codes(6, KFS_Interp_Linear, 1);
        Float(stream, {1, 2, 4, 5});
        stream.Record(3)->flags |= KFS_KeyFlag_Float;
        ASSERT_EQ(0, KFS_ForceUpdateStream(stream));
        std::vector<int> const times = stream.Times();
        for (std::size_t i = 1; i < times.size(); ++i) EXPECT_LT(times[i - 1], times[i]);
        for (int i = 1; i < 6; ++i) {
            // A unit of time to either side the point is on either side of the key.
            int const at = times[static_cast<std::size_t>(i)];
            double const place = KFSp_Numbers(stream.Record(i))[0];
            EXPECT_LE(stream.At(at - 1)[0], place + 2e-2) << "key " << i;
            EXPECT_GE(stream.At(at + 1)[0], place - 2e-2) << "key " << i;
        }
    }
}

// Many keys that want the same unit of time, or stand one behind the other where they pass each other. Were each moved
// tick by tick, this would take hours.
TEST_F(FloatKeys, InGreatNumbersFindRoomAtOnce)
{
    constexpr int last = 1 << 17;  // so that distances are exact parts of the way
    for (bool const atOnePlace : {true, false}) {
        SCOPED_TRACE(atOnePlace);
        KeyedStream stream(PathOptions());
        for (int i = 0; i <= last; ++i) {
            double const x = !atOnePlace ? i : i == 0 ? 0.0 : i == last ? 2.0 : 1.0;
            stream.Key(i == last ? 4 * last : i, {x, 0.0}, KFS_Interp_Linear);
        }
        for (int i = 1; i < last; ++i) stream.Record(i)->flags |= KFS_KeyFlag_Float;
        ASSERT_EQ(0, KFS_ForceUpdateStream(stream));
        std::vector<int> const times = stream.Times();
        for (int i = 1; i < last; ++i) {
            // What wants a place where later keys still stand stays before them.
            int const wanted = atOnePlace ? 2 * last + i - 1 : 4 * i < last ? i : 4 * i;
            ASSERT_EQ(wanted, times[static_cast<std::size_t>(i)]) << "key " << i;
        }
    }
}

TEST_F(FloatKeys, AreUniqueInsideOneRepairToo)
{
    // Entered by a lookup the repair can't run a second time, and meets the keys in the order of their old times.
    PathStream stream = Line({{0, 0}, {1, 4}, {2, 4}, {3, 4}, {4, 4}, {100, 8}});
    for (int i = 1; i < 5; ++i) stream.Flag(i, KFS_KeyFlag_Float);
    ASSERT_EQ(0, stream->SetInvalid(-1, 6));
    ASSERT_EQ(0, stream->SetArcInvalid(-1, 6));
    T_Time const nowhere = stream.Time(777);
    int index = 0;
    ASSERT_EQ(0, KFS_TimeToIndex(stream, &nowhere, &index));
    EXPECT_EQ((std::vector<int>{0, 50, 51, 52, 53, 100}), stream.Times());
}

TEST_F(FloatKeys, GiveWayToALaterKeyThatHasNotMovedYet)
{
    PathStream stream = Line({{0, 0}, {10, 40}, {40, 70}, {100, 100}});
    stream.Flag(1, KFS_KeyFlag_Float).Flag(2, KFS_KeyFlag_Float);
    ASSERT_EQ(0, stream->SetInvalid(2, 2));
    ASSERT_EQ(0, stream->UpdateStream());
    EXPECT_EQ((std::vector<int>{0, 39, 70, 100}), stream.Times());
    ASSERT_EQ(0, KFS_ForceUpdateStream(stream));
    EXPECT_EQ((std::vector<int>{0, 40, 70, 100}), stream.Times());
}

TEST_F(FloatKeys, OneAtATimeGiveTheSameTimes)
{
    std::vector<std::pair<int, double>> const keys = {{0, 0}, {1, 3}, {2, 9}, {3, 20}, {1000, 50}};
    PathStream together = Line(keys, KFS_Interp_Spline);
    Float(together, {1, 2, 3});
    PathStream single = Line(keys, KFS_Interp_Spline);
    for (int const index : {3, 2, 1}) single.Flag(index, KFS_KeyFlag_Float);
    for (int const index : {3, 2, 1}) ASSERT_EQ(0, KFSp_ComputeFloatTime(single, index));
    EXPECT_EQ(together.Times(), single.Times());
    EXPECT_EQ(0, KFSp_ComputeFloatTime(single, 0));  // not a float key
    EXPECT_EQ(together.Times(), single.Times());
}

TEST_F(FloatKeys, StayAtTheEndsOfTheListAndRefuseOtherDimensions)
{
    PathStream line = Line({{0, 0}, {10, 5}, {100, 10}});
    for (int const index : {0, 2}) {
        EXPECT_EQ(0, KFS_SetKeyFloat(line, 1, index));
        EXPECT_EQ(0, line.Record(index)->flags & KFS_KeyFlag_Float);
        line.Flag(index, KFS_KeyFlag_Float);  // however it got there
    }
    ASSERT_EQ(0, KFS_ForceUpdateStream(line));
    EXPECT_EQ((std::vector<int>{0, 10, 100}), line.Times());
    EXPECT_NEAR(2.5, line.At(5)[0], 1e-6);
    EXPECT_NEAR(7.5, line.At(55)[0], 1e-6);

    PathStream stream({{0, {0, 0, 0, 0}}, {50, {1, 1, 1, 1}}, {100, {2, 2, 2, 2}}}, KFS_Interp_Linear,
                      PathOptions(4, false));
    stream.StreamFlag(KFS_StreamFlag_SParametrize).Flag(1, KFS_KeyFlag_Float);
    EXPECT_EQ(KFS_Err_Only2D3D, KFSp_ComputeFloatTime(stream, 1));
    EXPECT_REPORT(reports, 45, "only 2d or 3d spatial streams are allowed for this operation.");
}

TEST_F(FloatKeys, KeepTheSpeedGraphWhenTheyStop)
{
    PathStream stream = Line({{0, 0}, {1, 30}, {600, 100}}, KFS_Interp_Spline);
    stream.Settle().SetHandle(0, {0, 0, 20, 0.4}).SetHandle(2, {60, 0.3, 0, 0});
    Float(stream, {1});
    std::vector<Vector> before;
    for (int time = 1; time < 600; time += 7) before.push_back(stream.At(time));
    int const stopped = stream.Record(1)->time;
    ASSERT_EQ(0, KFS_SetKeyFloat(stream, 0, 1));
    ASSERT_EQ(0, stream->UpdateStream());
    EXPECT_EQ(stopped, stream.Record(1)->time);
    EXPECT_EQ(0, stream.Record(1)->flags & KFS_KeyFlag_Float);
    std::size_t i = 0;
    // The key's own unit of time is rounded, which moves the point by less than its way in one unit.
    for (int time = 1; time < 600; time += 7) EXPECT_LT(Distance(before[i++], stream.At(time)), 0.4) << "at " << time;
}

struct MoveCase {
    char const* why;
    std::vector<int> keys;
    std::vector<int> floats;
    int index, target;
    std::vector<int> times;  // before the next repair
    int newIndex;
    std::array<int, 2> stale;
};

MoveCase const MoveCases[] = {
    {"between its neighbours", {0, 10, 20, 30}, {}, 1, 15, {0, 15, 20, 30}, 1, {0, 2}},
    {"to its own place", {0, 10, 20, 30}, {}, 1, 10, {0, 10, 20, 30}, 1, {0, 2}},
    {"past its neighbour", {0, 10, 20, 30}, {}, 1, 25, {0, 20, 25, 30}, 2, {0, 3}},
    {"past all others", {0, 10, 20, 30}, {}, 1, 99, {0, 20, 30, 99}, 3, {0, 3}},
    {"onto another key", {0, 10, 20, 30}, {}, 1, 20, {0, 20, 30}, 1, {0, 2}},
    {"the first past its neighbour", {0, 10, 20}, {}, 0, 15, {10, 15, 20}, 1, {0, 2}},
    {"the last past its neighbour", {0, 10, 20, 30}, {}, 3, 15, {0, 10, 15, 20}, 2, {1, 3}},
    {"the first further out", {0, 10, 20}, {}, 0, -50, {-50, 10, 20}, 0, {0, 1}},
    {"the only one", {10}, {}, 0, 500, {500}, 0, {0, 0}},
    {"between float keys", {0, 10, 20, 30, 40, 50}, {1, 3, 4}, 2, 25, {0, 1, 25, 48, 49, 50}, 2, {0, 5}},
    {"in place between float keys", {0, 10, 20, 30, 40, 50}, {1, 3, 4}, 2, 20, {0, 1, 20, 48, 49, 50}, 2, {0, 5}},
    {"the first into a run of float keys", {0, 10, 20, 30, 50}, {2, 3}, 0, 25, {10, 25, 48, 49, 50}, 1, {0, 4}},
    {"the first onto an anchor past a float key", {-1, 0, 2, 4}, {1}, 0, 2, {1, 2, 4}, 1, {0, 3}},
    {"the last onto an anchor between float keys",
     {0, 10, 20, 30, 40, 50},
     {1, 3},
     5,
     20,
     {0, 1, 20, 21, 40},
     2,
     {0, 5}},
    {"the last into a run of float keys", {0, 10, 20, 40, 50}, {1, 2}, 4, 25, {0, 1, 2, 25, 40}, 3, {0, 4}},
};

TEST_F(SetKeyTime, MovesTheKeyAndPacksFloatKeys)
{
    for (MoveCase const& c : MoveCases) {
        for (int const finer : {0, 1, 3}) {  // 0: the target as a bare value
            SCOPED_TRACE(testing::Message() << c.why << ", scale x" << finer);
            std::vector<std::pair<int, double>> keys;
            for (int const time : c.keys) keys.emplace_back(time, 100.0 + time);
            PathStream stream = Line(keys);
            for (int const index : c.floats) stream.Flag(index, KFS_KeyFlag_Float);
            double const x = KFSp_Numbers(stream.Record(c.index))[0];
            stream.At(5);

            T_Time const target{c.target * finer, 600U * static_cast<unsigned>(finer)};
            int newIndex = 77;
            T_Time old{77, 77};
            ASSERT_EQ(0, KFS_SetKeyTime(stream, c.index, finer == 0 ? nullptr : &target, finer == 0 ? c.target : 1234,
                                        &newIndex, &old));
            EXPECT_EQ(c.times, stream.Times());
            EXPECT_EQ(c.newIndex, newIndex);
            EXPECT_EQ(std::pair(c.keys[static_cast<std::size_t>(c.index)], 600U), std::pair(old.value, old.scale));
            EXPECT_EQ(x, KFSp_Numbers(stream.Record(newIndex))[0]);
            EXPECT_LE(stream.Stale()[0], c.stale[0]);
            EXPECT_GE(stream.Stale()[1], std::min(c.stale[1], stream.Count() - 1));
            EXPECT_TRUE(stream.CacheIsEmpty());
            EXPECT_EQ(0, stream.Pins());
            // What the search says of the list is what the list says.
            for (int i = 0; i < stream.Count(); ++i) {
                T_Time const at = stream.Time(stream.Record(i)->time);
                int found = -1;
                stream->SetDisabledUpdateStream(true);
                EXPECT_EQ(0, KFS_TimeToIndex(stream, &at, &found));
                stream->SetDisabledUpdateStream(false);
                EXPECT_EQ(i, found);
            }
        }
    }
}

TEST_F(SetKeyTime, MovesThePlainKeyWithItsHandlesPastListenersThatRead)
{
    HeardRoot root;
    KeyedStream stream = MakeKeyed({{0, 1}, {100, 5}, {200, 2}}, KFS_Interp_Spline);
    Handle const handle{1.5, 0.25, -2.5, 0.75};
    stream.SetHandle(1, handle);
    root.Store(stream);
    {
        ValueListener listener([&] { stream.At(20); });
        ASSERT_EQ(0, KFS_SetKeyTime(stream, 1, nullptr, 150, nullptr, nullptr));
        EXPECT_EQ(3, listener.Take());  // it left, it came, it has moved
    }
    EXPECT_EQ((std::vector<int>{0, 150, 200}), stream.Times());
    EXPECT_EQ((std::vector<double>{5, handle.inSpeed, handle.inInfluence, handle.outSpeed, handle.outInfluence}),
              stream.Numbers(1));
    EXPECT_EQ(5.0, stream.At1(150));

    // One that objects can't keep the key from arriving.
    int newIndex = 0;
    {
        ValueListener listener([] { throw 4711; });
        EXPECT_EQ(4711, KFS_SetKeyTime(stream, 1, nullptr, 250, &newIndex, nullptr));
    }
    EXPECT_EQ((std::vector<int>{0, 200, 250}), stream.Times());
    EXPECT_EQ(2, newIndex);
    stream->SetParent(nullptr);
}

TEST_F(SetKeyTime, ResetsTheInfluenceBesideTheEnds)
{
    for (short const dimension : {1, 6}) {
        KeyedStream stream = MakeKeyed({{0, 1}, {100, 5}, {200, 2}}, KFS_Interp_Spline, {.dimension = dimension});
        for (int i = 0; i < 3; ++i) {
            stream.Flag(i, KFS_KeyFlag_Modifiable);
            for (int d = 0; d < dimension; ++d) stream.SetHandle(i, {1, 0.9, 1, 0.9}, d);
        }
        stream->SetDisabledUpdateStream(true);
        for (int i = 0; i < 3; ++i) {
            ASSERT_EQ(0, KFS_SetKeyTime(stream, i, nullptr, 100 * i + 5, nullptr, nullptr));
            Handle const handle = stream.GetHandle(i, dimension - 1);
            EXPECT_EQ(i == 0 ? KFSp_OneSixth : 0.9, handle.inInfluence);
            EXPECT_EQ(i == 2 ? KFSp_OneSixth : 0.9, handle.outInfluence);
            EXPECT_EQ(i == 1, (stream.Record(i)->flags & KFS_KeyFlag_Modifiable) != 0);
        }
        stream->SetDisabledUpdateStream(false);
    }
}

TEST_F(SetKeyTime, OfAConstantIsWhereItsValueStands)
{
    TestStream stream({.noKeys = true});
    stream.Key(40, {3.5});
    stream.At(40);
    T_Time old{};
    ASSERT_EQ(0, KFS_SetKeyTime(stream, 12, nullptr, 90, nullptr, &old));
    EXPECT_EQ(40, old.value);
    EXPECT_EQ(90, stream->GetCache()->time);
    EXPECT_EQ(KFS_Err_TimeNotRepresentable, KFS_SetKeyTime(stream, 0, nullptr, KFS_INVALID_INDEX, nullptr, nullptr));
    EXPECT_EQ(1U, reports.Take().size());
    EXPECT_EQ(3.5, stream.At1(0));
}

TEST_F(SetKeyTime, RefusesWhatItCannotMove)
{
    KeyedStream stream = MakeKeyed({{0, 1}, {100, 5}, {200, 2}}, KFS_Interp_Linear);
    std::vector<unsigned char> const before = stream.Bytes();
    for (int const index : {-1, 3, 50}) {
        T_Time old{1, 1};
        int newIndex = 9;
        EXPECT_NE(0, KFS_SetKeyTime(stream, index, nullptr, 150, &newIndex, &old)) << index;
        EXPECT_EQ(std::tuple(KFS_INVALID_INDEX, 600U, KFS_INVALID_INDEX), std::tie(old.value, old.scale, newIndex));
        EXPECT_EQ(0, stream.Pins());
    }
    T_Time const far{2000000000, 1};
    EXPECT_EQ(T_Err_Overflow, KFS_SetKeyTime(stream, 1, &far, 0, nullptr, nullptr));
    EXPECT_EQ(before, stream.Bytes());

    TestStream empty;
    EXPECT_EQ(KFS_Err_NoKeys, KFS_SetKeyTime(empty, 0, nullptr, 1, nullptr, nullptr));
    EXPECT_REPORT(reports, 33, NoKeysText("alter a key value in"));
    DamagedStream damaged;
    EXPECT_EQ(2, KFS_SetKeyTime(damaged.get(), 0, nullptr, 1, nullptr, nullptr));
    EXPECT_EQ(reports.Take(), std::vector<Reported>{DamagedReport(33, "alter a key value in")});
}

}  // namespace
