#include "curves/floatkeys.h"

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
    EXPECT_EQ(KFS_Err_Only2D3D, KFS_ForceUpdateStream(stream));
    EXPECT_REPORT(reports, 45, "only 2d or 3d spatial streams are allowed for this operation.");
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
