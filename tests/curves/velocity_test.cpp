#include "curves/tangents.h"

#include "tests/curves/threekeys.h"

#include <cmath>

namespace {

using VelocityTest = StreamTest;

TEST_F(VelocityTest, SettingASpeedMakesItTheUsers)
{
    for (bool const spatial : {false, true}) {
        for (bool const continuous : {false, true}) {
            for (int sides = 0; sides < 4; ++sides) {
                SCOPED_TRACE(testing::Message()
                             << "spatial " << spatial << ", continuous " << continuous << ", sides " << sides);
                bool const in = sides & 1;
                bool const out = sides & 2;
                KeyedStream stream = MakeThree(spatial);
                stream.Flag(1, KFS_KeyFlag_Continuous, continuous).Flag(1, KFS_KeyFlag_Modifiable);
                double const inSpeed = 8.0;
                double const outSpeed = 9.0;
                ASSERT_EQ(0, KFS_SetKeyVelocity(stream, 1, in ? &inSpeed : nullptr, out ? &outSpeed : nullptr));
                Handle const handle = stream.GetHandle(1);
                EXPECT_EQ(in ? 8.0 : (out && continuous ? 9.0 : 3.0), handle.inSpeed);
                EXPECT_EQ(out ? 9.0 : (in && continuous ? 8.0 : 2.0), handle.outSpeed);
                EXPECT_EQ(0.25, handle.inInfluence);
                EXPECT_EQ(0.5, handle.outInfluence);
                EXPECT_FALSE(stream.Record(1)->flags & KFS_KeyFlag_Modifiable);
                bool const marksIn = spatial && (in || continuous);
                bool const marksOut = spatial && (out || continuous);
                Range const stale =
                    !marksIn && !marksOut ? TestStream::NotStale : Range{marksIn ? 0 : 1, marksOut ? 2 : 1};
                EXPECT_EQ(stale, stream.Stale());
                EXPECT_EQ(0, stream.Pins());
            }
        }
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
            EXPECT_EQ(spatial && nonDecreasing ? 0.0 : -4.0, stream.GetHandle(1).inSpeed);
            EXPECT_EQ(spatial && nonDecreasing ? 0.0 : -4.0, stream.GetHandle(1).outSpeed);
        }
    }
}

// Values in the stream's own type; the other form takes doubles on any stream and leaves its description as it was.
TEST_F(VelocityTest, SpeedsAreGivenInTheStreamsTypeOrInDoubles)
{
    StreamOptions options;
    options.type = KFS_Type_U8;
    options.dimension = 2;
    KeyedStream stream = MakeKeyed({{0, 0.0}, {600, 10.0}}, S, options);
    unsigned char const bytes[] = {200, 7};
    ASSERT_EQ(0, KFS_SetKeyVelocity(stream, 0, nullptr, bytes));
    EXPECT_EQ(200.0, stream.GetHandle(0, 0).outSpeed);
    EXPECT_EQ(7.0, stream.GetHandle(0, 1).outSpeed);
    double const speeds[] = {-1.75, 1e6};
    ASSERT_EQ(0, KFS_SetKeyVelocityF(stream, 0, speeds, nullptr));
    EXPECT_EQ(-1.75, stream.GetHandle(0, 0).inSpeed);
    EXPECT_EQ(1e6, stream.GetHandle(0, 1).inSpeed);
    EXPECT_EQ(200.0, stream.GetHandle(0, 0).outSpeed);
    EXPECT_EQ(KFS_Type_U8, static_cast<signed char>(stream.get()->GetValueDesc()->dataType));
    EXPECT_EQ(1, stream.get()->GetValueDesc()->itemSize);
    EXPECT_EQ(nullptr, stream.get()->GetCopyItemFunc());
    EXPECT_FALSE(stream.get()->IsTemporarilyNonCustom());
    // Also after a failure.
    EXPECT_EQ(SEQ_Err_BadIndex, KFS_SetKeyVelocityF(stream, 9, speeds, speeds));
    EXPECT_EQ(1, stream.get()->GetValueDesc()->itemSize);
    EXPECT_EQ(nullptr, stream.get()->GetCopyItemFunc());
}

struct PlainSpeed {
    char const* why;
    int index;
    int prevOut, in, out, nextIn;  // codes around the key
    double inSpeed, outSpeed;
};

// Stored are 3 and 2; the straight segments have 10 and 15 a second.
PlainSpeed const PlainSpeeds[] = {
    {"splines answer what is stored", 1, S, S, S, S, 3, 2},
    {"straight sides answer their slope", 1, L, L, L, L, 10, 15},
    {"each side for itself", 1, S, L, S, L, 10, 2},
    {"a straight side next to a spline", 1, S, L, L, S, 10, 15},
    {"a held side rests", 1, S, H, H, S, 0, 0},
    {"so does one that faces a hold", 1, H, S, S, H, 0, 0},
    {"or a straight one", 1, H, L, L, H, 0, 0},
    {"at the first key nothing comes in", 0, S, S, S, S, 0, 2},
    {"at the first key, straight", 0, S, L, L, L, 0, 10},
    {"at the last key nothing goes out", 2, S, S, S, S, 3, 0},
    {"at the last key, straight", 2, L, L, L, S, 15, 0},
};

TEST_F(VelocityTest, SpeedsOfAPlainKey)
{
    for (PlainSpeed const& c : PlainSpeeds) {
        for (bool const zeroAtEnds : {false, true}) {
            SCOPED_TRACE(c.why);
            KeyedStream stream = MakeThree();
            if (c.index > 0) stream.Record(c.index - 1)->outInterp = static_cast<signed char>(c.prevOut);
            if (c.index < 2) stream.Record(c.index + 1)->inInterp = static_cast<signed char>(c.nextIn);
            stream.Codes(c.index, c.in, c.out);
            double in = Unanswered;
            double out = Unanswered;
            EXPECT_EQ(0, KFS_GetKeyVelocityF(stream, c.index, zeroAtEnds, &in, &out));
            EXPECT_DOUBLE_EQ(c.inSpeed, in);
            EXPECT_DOUBLE_EQ(c.outSpeed, out);
        }
    }
}

TEST_F(VelocityTest, OnlyTheFirstComponentsTinySpeedIsNone)
{
    StreamOptions options;
    options.dimension = 2;
    KeyedStream stream = MakeKeyed({{0, 0.0}, {600, 10.0}, {1800, 40.0}}, S, options);
    for (int i = 0; i < 2; ++i) stream.SetHandle(1, {-5e-11, 0.3, 1.5e-10, 0.3}, i);
    double in[2] = {};
    double out[2] = {};
    ASSERT_EQ(0, KFS_GetKeyVelocityF(stream, 1, 0, in, out));
    EXPECT_EQ(0.0, in[0]);
    EXPECT_EQ(-5e-11, in[1]);
    EXPECT_EQ(1.5e-10, out[0]);
}

struct SpatialSpeed {
    char const* why;
    int index;
    int prevOut, in, out, nextIn;
    bool zeroAtEnds;
    double inSpeed, outSpeed;
};

// Stored are 3 and 2; the straight arcs have 5 and 10 a second.
SpatialSpeed const SpatialSpeeds[] = {
    {"splines answer what is stored", 1, S, S, S, S, false, 3, 2},
    {"straight arcs answer their length a second", 1, L, L, L, L, false, 5, 10},
    {"holds rest", 1, H, S, L, H, false, 0, 0},
    {"the first key's in side is what is stored", 0, S, S, S, S, false, 3, 2},
    {"or zero if wanted", 0, S, S, S, S, true, 0, 2},
    {"the last key's out side likewise", 2, S, S, S, S, false, 3, 2},
    {"or zero", 2, S, S, S, S, true, 3, 0},
    {"a straight end isn't answered", 0, S, L, L, L, false, Unanswered, 5},
    {"at the other end", 2, L, L, L, S, false, 10, Unanswered},
    {"unless zero is wanted", 2, L, L, L, S, true, 10, 0},
    {"an end that holds rests", 0, S, H, S, S, false, 0, 2},
    {"codes without a meaning aren't answered", 1, S, 0, -1, S, false, Unanswered, Unanswered},
};

TEST_F(VelocityTest, SpeedsOfASpatialKey)
{
    for (SpatialSpeed const& c : SpatialSpeeds) {
        SCOPED_TRACE(c.why);
        KeyedStream stream = MakeThree(true);
        if (c.index > 0) stream.Record(c.index - 1)->outInterp = static_cast<signed char>(c.prevOut);
        if (c.index < 2) stream.Record(c.index + 1)->inInterp = static_cast<signed char>(c.nextIn);
        stream.Codes(c.index, c.in, c.out);
        double in = Unanswered;
        double out = Unanswered;
        EXPECT_EQ(0, KFS_GetKeyVelocityF(stream, c.index, c.zeroAtEnds, &in, &out));
        EXPECT_DOUBLE_EQ(c.inSpeed, in);
        EXPECT_DOUBLE_EQ(c.outSpeed, out);
    }
    KeyedStream stream = MakeThree(true);
    stream.SetHandle(1, {3, 0.0, 2, 0.0});  // without influence there is no handle
    double in = Unanswered;
    double out = Unanswered;
    EXPECT_EQ(0, KFS_GetKeyVelocityF(stream, 1, 0, &in, &out));
    EXPECT_EQ(0.0, in);
    EXPECT_EQ(0.0, out);
}

TEST_F(VelocityTest, StraightSpeedsRunFromAnchorToAnchor)
{
    StreamOptions options;
    options.dimension = 2;
    options.spatial = true;
    KeyedStream stream = MakeKeyed({{0, 0.0}, {600, 1.0}, {1200, 5.0}, {3000, 9.0}}, L, options);
    for (int i = 0; i < 4; ++i) stream.Record(i)->arcLength = i < 3 ? 3.0 + i : 0.0;  // 3 4 5 over 1, 1, 3 seconds
    stream.Flag(1, KFS_KeyFlag_Float).Flag(2, KFS_KeyFlag_Float);
    struct Expected {
        int index;
        double in, out;
    };
    for (Expected const& e : {Expected{0, Unanswered, 2.4}, {1, 2.4, 2.4}, {2, 2.4, 2.4}, {3, 2.4, Unanswered}}) {
        double in = Unanswered;
        double out = Unanswered;
        ASSERT_EQ(0, KFS_GetKeyVelocityF(stream, e.index, 0, &in, &out));
        EXPECT_DOUBLE_EQ(e.in, in) << e.index;
        EXPECT_DOUBLE_EQ(e.out, out) << e.index;
    }
    // Without arc-length parametrisation a float key is measured between the keys next to it, others on their own side.
    stream.StreamFlag(KFS_StreamFlag_SParametrize, false);
    for (Expected const& e :
         {Expected{0, Unanswered, 3.0}, {1, 3.5, 3.5}, {2, 9.0 / 4.0, 9.0 / 4.0}, {3, 5.0 / 3.0, Unanswered}}) {
        double in = Unanswered;
        double out = Unanswered;
        ASSERT_EQ(0, KFS_GetKeyVelocityF(stream, e.index, 0, &in, &out));
        EXPECT_DOUBLE_EQ(e.in, in) << e.index;
        EXPECT_DOUBLE_EQ(e.out, out) << e.index;
    }
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
    double out = 0.0;
    ASSERT_EQ(0, KFS_GetKeyVelocityF(stream, 0, 0, nullptr, &out));
    EXPECT_EQ(5.0, out);
    ASSERT_EQ(0, stream.get()->SetArcInvalid(-1, 3));
    ASSERT_EQ(0, KFS_GetKeyVelocityF(stream, 0, 0, nullptr, &out));
    EXPECT_NEAR(std::sqrt(200.0), out, 1e-2);  // from (0, 0) to (10, 10)
    EXPECT_EQ(stream.Record(0)->arcLength, out);
}

}  // namespace
