#include "curves/floatkeys.h"

#include "frame/errors.h"
#include "tests/curves/keyedstream.h"
#include "tests/support/listening.h"

namespace {

class FloatKeys : public StreamTest {};

// A path along the x axis without tangents, so that an abscissa is a distance. All keys but the ends float.
PathStream Line(std::vector<std::pair<int, double>> const& keys)
{
    std::vector<PathStream::Stop> stops;
    for (auto const& [time, x] : keys) stops.push_back({time, {x, 0}});
    PathStream stream(stops);
    stream.Straighten();
    for (int i = 1; i < stream.Count() - 1; ++i) stream.Flag(i, KFS_KeyFlag_Float);
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
    {"in the order of their old times",
     {{0, 0}, {1, 4}, {2, 4}, {3, 4}, {4, 4}, {100, 8}},
     1,
     1,
     {0, 50, 51, 52, 53, 100}},
    {"before a later key that has not moved yet", {{0, 0}, {10, 40}, {40, 70}, {100, 100}}, 1, 1, {0, 39, 70, 100}},
    {"between the key before and one that has not moved yet",
     {{0, 0}, {10, 50}, {20, 51}, {51, 60}, {100, 100}},
     1,
     1,
     {0, 50, 51, 60, 100}},
};

TEST_F(FloatKeys, TakeTheTimeAtWhichThePointPasses)
{
    for (FloatCase const& c : FloatCases) {
        SCOPED_TRACE(c.why);
        PathStream stream = Line(c.keys);
        int const last = stream.Count() - 1;
        stream.Codes(0, 1, c.out).Codes(last, c.in, 1);
        ASSERT_EQ(0, KFS_ForceUpdateStream(stream));
        EXPECT_EQ(c.times, stream.Times());
        EXPECT_EQ(0, stream.Pins());
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
            stream.Key(i == last ? 4 * last : i, {x, 0.0});
        }
        for (int i = 1; i < last; ++i) stream.Flag(i, KFS_KeyFlag_Float);
        ASSERT_EQ(0, KFS_ForceUpdateStream(stream));
        std::vector<int> const times = stream.Times();
        for (int i = 1; i < last; ++i) {
            // What wants a place where later keys still stand stays before them.
            int const wanted = atOnePlace ? 2 * last + i - 1 : 4 * i < last ? i : 4 * i;
            ASSERT_EQ(wanted, times[static_cast<std::size_t>(i)]) << "key " << i;
        }
    }
}

TEST_F(FloatKeys, AListenerReadsAsAKeyMovesAndCantKeepItFromArriving)
{
    HeardRoot root;
    KeyedStream stream = MakeKeyed({{0, 1}, {100, 5}, {200, 2}}, KFS_Interp_Spline);
    root.Store(stream);
    {
        ValueListener listener([&] { stream.At(20); });
        ASSERT_EQ(0, KFS_SetKeyTime(stream, 1, nullptr, 150, nullptr, nullptr));
    }
    EXPECT_EQ(5.0, stream.At1(150));
    int newIndex = 0;
    {
        ValueListener listener([] { throw 4711; });
        EXPECT_EQ(4711, KFS_SetKeyTime(stream, 1, nullptr, 250, &newIndex, nullptr));
    }
    EXPECT_EQ((std::vector<int>{0, 200, 250}), stream.Times());
    EXPECT_EQ(2, newIndex);
    T_Time const far{2000000000, 1};
    EXPECT_EQ(T_Err_Overflow, KFS_SetKeyTime(stream, 1, &far, 0, nullptr, nullptr));
    EXPECT_EQ((std::vector<int>{0, 200, 250}), stream.Times());
    stream->SetParent(nullptr);
}

}  // namespace
