#include "curves/tangents.h"

#include "tests/curves/threekeys.h"

#include <cmath>
#include <span>

namespace {

using VelocityTest = StreamTest;
using Speeds = std::pair<double, double>;  // in and out

Speeds Ask(KeyedStream const& stream, int index, bool zeroAtEnds = false)
{
    Speeds speeds{Unanswered, Unanswered};
    EXPECT_EQ(0, KFS_GetKeyVelocityF(stream, index, zeroAtEnds, &speeds.first, &speeds.second));
    return speeds;
}

void ExpectSpeeds(Speeds const& expected, Speeds const& actual)
{
    EXPECT_DOUBLE_EQ(expected.first, actual.first);
    EXPECT_DOUBLE_EQ(expected.second, actual.second);
}

TEST_F(VelocityTest, SettingASpeedMakesItTheUsers)
{
    for (int kind = 0; kind < 16; ++kind) {
        bool const spatial = kind & 1, continuous = kind & 2, in = kind & 4, out = kind & 8;
        SCOPED_TRACE(testing::Message() << "spatial " << spatial << ", continuous " << continuous << ", in " << in
                                        << ", out " << out);
        KeyedStream stream = MakeThree(spatial);
        stream.Flag(1, KFS_KeyFlag_Continuous, continuous).Flag(1, KFS_KeyFlag_Modifiable);
        double const inSpeed = 8.0;
        double const outSpeed = 9.0;
        ASSERT_EQ(0, KFS_SetKeyVelocity(stream, 1, in ? &inSpeed : nullptr, out ? &outSpeed : nullptr));
        Handle const expected{in ? 8.0 : (out && continuous ? 9.0 : 3.0), 0.25,
                              out ? 9.0 : (in && continuous ? 8.0 : 2.0), 0.5};
        EXPECT_EQ(expected, stream.GetHandle(1));
        EXPECT_FALSE(stream.Record(1)->flags & KFS_KeyFlag_Modifiable);
        bool const marksIn = spatial && (in || continuous);
        bool const marksOut = spatial && (out || continuous);
        EXPECT_EQ(!marksIn && !marksOut ? TestStream::NotStale : (Range{marksIn ? 0 : 1, marksOut ? 2 : 1}),
                  stream.Stale());
        EXPECT_EQ(0, stream.Pins());
    }
}

TEST_F(VelocityTest, OnlyASpatialStreamForbidsFallingSpeeds)
{
    for (bool const spatial : {false, true}) {
        for (bool const nonDecreasing : {false, true}) {
            KeyedStream stream = MakeThree(spatial);
            stream.StreamFlag(KFS_StreamFlag_NonDecreasing, nonDecreasing);
            double const falling = -4.0;
            ASSERT_EQ(0, KFS_SetKeyVelocityF(stream, 1, &falling, &falling));
            double const stored = spatial && nonDecreasing ? 0.0 : -4.0;
            EXPECT_EQ((Handle{stored, 0.25, stored, 0.5}), stream.GetHandle(1));
        }
    }
}

// Values in the stream's own type; the other form takes doubles on any stream and leaves its description as it was.
TEST_F(VelocityTest, SpeedsAreGivenInTheStreamsTypeOrInDoubles)
{
    KeyedStream stream = MakeKeyed({{0, 0.0}, {600, 10.0}}, S, {.dimension = 2, .type = KFS_Type_U8});
    unsigned char const bytes[] = {200, 7};
    double const speeds[] = {-1.75, 1e6};
    ASSERT_EQ(0, KFS_SetKeyVelocity(stream, 0, nullptr, bytes));
    for (bool const fails : {false, true}) {
        EXPECT_EQ(fails ? SEQ_Err_BadIndex : 0, KFS_SetKeyVelocityF(stream, fails ? 9 : 0, speeds, nullptr));
        EXPECT_EQ(KFS_Type_U8, static_cast<signed char>(stream->GetValueDesc()->dataType));
        EXPECT_EQ(1, stream->GetValueDesc()->itemSize);
        EXPECT_EQ(nullptr, stream->GetCopyItemFunc());
        EXPECT_FALSE(stream->IsTemporarilyNonCustom());
    }
    for (int i = 0; i < 2; ++i) {
        EXPECT_EQ(speeds[i], stream.GetHandle(0, i).inSpeed);
        EXPECT_EQ(bytes[i], stream.GetHandle(0, i).outSpeed);
    }
}

struct AskedSpeed {
    char const* why;
    int index;
    int prevOut, in, out, nextIn;  // codes around the key
    bool zeroAtEnds;
    Speeds speeds;
};

// Stored are 3 and 2; the straight segments have 10 and 15 a second. Wanting zero at the ends makes no difference.
AskedSpeed const PlainSpeeds[] = {
    {"splines answer what is stored", 1, S, S, S, S, false, {3, 2}},
    {"straight sides answer their slope", 1, L, L, L, L, false, {10, 15}},
    {"each side for itself", 1, S, L, S, L, false, {10, 2}},
    {"a straight side next to a spline", 1, S, L, L, S, false, {10, 15}},
    {"a held side rests", 1, S, H, H, S, false, {0, 0}},
    {"so does one that faces a hold", 1, H, S, S, H, false, {0, 0}},
    {"or a straight one", 1, H, L, L, H, false, {0, 0}},
    {"at the first key nothing comes in", 0, S, S, S, S, false, {0, 2}},
    {"at the first key, straight", 0, S, L, L, L, false, {0, 10}},
    {"at the last key nothing goes out", 2, S, S, S, S, false, {3, 0}},
    {"at the last key, straight", 2, L, L, L, S, false, {15, 0}},
};

// Stored are 3 and 2; the straight arcs have 5 and 10 a second.
AskedSpeed const SpatialSpeeds[] = {
    {"splines answer what is stored", 1, S, S, S, S, false, {3, 2}},
    {"straight arcs answer their length a second", 1, L, L, L, L, false, {5, 10}},
    {"holds rest", 1, H, S, L, H, false, {0, 0}},
    {"the first key's in side is what is stored", 0, S, S, S, S, false, {3, 2}},
    {"or zero if wanted", 0, S, S, S, S, true, {0, 2}},
    {"the last key's out side likewise", 2, S, S, S, S, false, {3, 2}},
    {"or zero", 2, S, S, S, S, true, {3, 0}},
    {"a straight end isn't answered", 0, S, L, L, L, false, {Unanswered, 5}},
    {"at the other end", 2, L, L, L, S, false, {10, Unanswered}},
    {"unless zero is wanted", 2, L, L, L, S, true, {10, 0}},
    {"an end that holds rests", 0, S, H, S, S, false, {0, 2}},
    {"codes without a meaning aren't answered", 1, S, 0, -1, S, false, {Unanswered, Unanswered}},
};

TEST_F(VelocityTest, SpeedsOfEveryKindOfKey)
{
    for (bool const spatial : {false, true})
        for (AskedSpeed const& c : spatial ? std::span<AskedSpeed const>(SpatialSpeeds) : PlainSpeeds) {
            SCOPED_TRACE(testing::Message() << c.why << ", spatial " << spatial);
            KeyedStream stream = MakeThree(spatial);
            if (c.index > 0) stream.Record(c.index - 1)->outInterp = static_cast<signed char>(c.prevOut);
            if (c.index < 2) stream.Record(c.index + 1)->inInterp = static_cast<signed char>(c.nextIn);
            stream.Codes(c.index, c.in, c.out);
            ExpectSpeeds(c.speeds, Ask(stream, c.index, c.zeroAtEnds));
            if (!spatial) ExpectSpeeds(c.speeds, Ask(stream, c.index, !c.zeroAtEnds));
        }
    KeyedStream stream = MakeThree(true);
    stream.SetHandle(1, {3, 0.0, 2, 0.0});  // without influence there is no handle
    EXPECT_EQ((Speeds{0.0, 0.0}), Ask(stream, 1));
}

TEST_F(VelocityTest, OnlyTheFirstComponentsTinySpeedIsNone)
{
    KeyedStream stream = MakeKeyed({{0, 0.0}, {600, 10.0}, {1800, 40.0}}, S, {.dimension = 2});
    for (int i = 0; i < 2; ++i) stream.SetHandle(1, {-5e-11, 0.3, 1.5e-10, 0.3}, i);
    double in[2] = {};
    double out[2] = {};
    ASSERT_EQ(0, KFS_GetKeyVelocityF(stream, 1, 0, in, out));
    EXPECT_EQ(0.0, in[0]);
    EXPECT_EQ(-5e-11, in[1]);
    EXPECT_EQ(1.5e-10, out[0]);
}

TEST_F(VelocityTest, StraightSpeedsRunFromAnchorToAnchor)
{
    KeyedStream stream =
        MakeKeyed({{0, 0.0}, {600, 1.0}, {1200, 5.0}, {3000, 9.0}}, L, {.dimension = 2, .spatial = true});
    for (int i = 0; i < 4; ++i) stream.Record(i)->arcLength = i < 3 ? 3.0 + i : 0.0;  // 3 4 5 over 1, 1, 3 seconds
    stream.Flag(1, KFS_KeyFlag_Float).Flag(2, KFS_KeyFlag_Float);
    auto const expectAll = [&](std::array<Speeds, 4> const& expected) {
        for (int i = 0; i < 4; ++i) ExpectSpeeds(expected[static_cast<std::size_t>(i)], Ask(stream, i));
    };
    expectAll({{{Unanswered, 2.4}, {2.4, 2.4}, {2.4, 2.4}, {2.4, Unanswered}}});
    // Without arc-length parametrisation a float key is measured between the keys next to it, others on their own side.
    stream.StreamFlag(KFS_StreamFlag_SParametrize, false);
    expectAll({{{Unanswered, 3.0}, {3.5, 3.5}, {9.0 / 4.0, 9.0 / 4.0}, {5.0 / 3.0, Unanswered}}});
    // Two keys at one time, as a broken file may have them.
    stream.Flag(1, KFS_KeyFlag_Float, false);
    stream.Record(1)->time = 0;
    double speed = Unanswered;
    EXPECT_EQ(3, KFS_GetKeyVelocityF(stream, 1, 0, &speed, nullptr));
    EXPECT_EQ(3, KFS_GetKeyVelocityF(stream, 0, 0, nullptr, &speed));
    EXPECT_EQ(Unanswered, speed);
    stream.Record(1)->time = 600;
}

// Speeds of straight runs need true arcs, though only the other range says that they are stale.
TEST_F(VelocityTest, StaleArcsAreMeasuredBeforeTheyAreRead)
{
    KeyedStream stream = MakeThree(true, L);
    EXPECT_EQ(5.0, Ask(stream, 0).second);
    ASSERT_EQ(0, stream->SetArcInvalid(-1, 3));
    double const out = Ask(stream, 0).second;
    EXPECT_NEAR(std::sqrt(200.0), out, 1e-2);  // from (0, 0) to (10, 10)
    EXPECT_EQ(stream.Record(0)->arcLength, out);
}

}  // namespace
