#include "curves/tangents.h"

#include "tests/curves/keyedstream.h"
#include "tree/listener.h"

#include <array>
#include <cmath>
#include <functional>
#include <limits>
#include <stdexcept>

namespace {

using TangentsTest = StreamTest;
using Range = std::array<int, 2>;

constexpr int L = KFS_Interp_Linear;
constexpr int S = KFS_Interp_Spline;
constexpr int H = KFS_Interp_Hold;
constexpr double Unanswered = 77.0;

// Keys after 0, 1 and 3 seconds; values 0, 10, 40; on a spatial stream arcs of 5 and 20.
KeyedStream MakeThree(bool spatial = false, char interp = S)
{
    StreamOptions options;
    options.dimension = spatial ? 2 : 1;
    options.spatial = spatial;
    KeyedStream stream = MakeKeyed({{0, 0.0}, {600, 10.0}, {1800, 40.0}}, interp, options);
    for (int i = 0; i < 3; ++i) stream.SetHandle(i, {3, 0.25, 2, 0.5});
    if (spatial) {
        stream.Record(0)->arcLength = 5.0;
        stream.Record(1)->arcLength = 20.0;
        stream.Record(2)->arcLength = 0.0;
    }
    return stream;
}

// ---- KFS_SetKeyTangentsF

struct Stored {
    char const* why;
    bool in;
    double x, y;
    double speed;
    double plainInfluence;
    double spatialInfluence;
};

// At the middle key: one second to the previous key, two to the next.
Stored const Tangents[] = {
    {"in", true, -0.5, 2, -4, 0.5, 0.5},
    {"in, the wrong side", true, 0.3, 2, 0, 0.0001, 0},
    {"in, upright", true, 0, 5, 0, 0.0001, 0},
    {"in, very short", true, -1e-9, -2e-9, 2, 0.0001, 1e-9},
    {"in, just long enough", true, -0.0001, 0.0001, -1, 0.0001, 0.0001},
    {"in, beyond the neighbour", true, -3, -6, 2, 1, 3},
    {"out", false, 0.5, 2, 4, 0.25, 0.25},
    {"out, the wrong side", false, -0.5, 2, 0, 0.0001, 0},
    {"out, to the neighbour", false, 2, -1, -0.5, 1, 1},
    {"out, beyond it", false, 7, 7, 1, 1, 3.5},
};

TEST_F(TangentsTest, AGraphTangentIsStoredAsSpeedAndInfluence)
{
    for (Stored const& c : Tangents) {
        for (bool const spatial : {false, true}) {
            for (bool const nonDecreasing : {false, true}) {
                SCOPED_TRACE(testing::Message() << c.why << ", spatial " << spatial << ", non-decreasing " << nonDecreasing);
                KeyedStream stream = MakeThree(spatial);
                stream.StreamFlag(KFS_StreamFlag_NonDecreasing, nonDecreasing);
                unsigned short const flags = stream.Record(1)->flags;
                ASSERT_EQ(0, KFS_SetKeyTangentsF(stream, 1, c.in ? &c.x : nullptr, c.in ? &c.y : nullptr, c.in ? nullptr : &c.x,
                                                 c.in ? nullptr : &c.y, 1.0));
                Handle const handle = stream.GetHandle(1);
                double const speed = spatial && nonDecreasing ? std::max(c.speed, 0.0) : c.speed;
                EXPECT_DOUBLE_EQ(speed, c.in ? handle.inSpeed : handle.outSpeed);
                EXPECT_DOUBLE_EQ(spatial ? c.spatialInfluence : c.plainInfluence, c.in ? handle.inInfluence : handle.outInfluence);
                EXPECT_EQ(c.in ? 2.0 : 3.0, c.in ? handle.outSpeed : handle.inSpeed) << "the other side stays";
                EXPECT_EQ(c.in ? 0.5 : 0.25, c.in ? handle.outInfluence : handle.inInfluence);
                EXPECT_EQ(flags, stream.Record(1)->flags);
                EXPECT_EQ((c.in ? Range{0, 1} : Range{1, 2}), stream.Stale());
                EXPECT_EQ(0, stream.Pins());
            }
        }
    }
}

TEST_F(TangentsTest, ASideNeedsBothPointersAndANeighbour)
{
    double const x[] = {-0.5};
    double const outX[] = {0.5};
    double const y[] = {1.0};
    KeyedStream stream = MakeThree();
    std::vector<unsigned char> const before = stream.Bytes();
    EXPECT_EQ(0, KFS_SetKeyTangentsF(stream, 0, x, y, nullptr, y, 1.0));
    EXPECT_EQ(0, KFS_SetKeyTangentsF(stream, 2, x, nullptr, outX, y, 1.0));
    EXPECT_EQ(0, KFS_SetKeyTangentsF(stream, 1, nullptr, nullptr, nullptr, nullptr, 1.0));
    EXPECT_EQ(before, stream.Bytes());
    EXPECT_EQ(TestStream::NotStale, stream.Stale());
}

TEST_F(TangentsTest, AContinuousHandleKeepsItsLength)
{
    std::mt19937 random(11);
    std::uniform_real_distribution<double> speed(-5.0, 5.0);
    std::uniform_real_distribution<double> influence(0.1, 0.9);
    int kept = 0;
    for (int n = 0; n < 400; ++n) {
        double const yScale = n % 3 == 0 ? 1.0 : 0.25 * (1 + n % 7);
        bool const setIn = n % 2 == 0;
        KeyedStream stream = MakeThree();
        Handle const old{speed(random), influence(random), speed(random), influence(random)};
        stream.SetHandle(1, old).Flag(1, KFS_KeyFlag_Continuous);
        double const newSpeed = speed(random);
        double const x = setIn ? -0.5 : 0.5;
        double const y = newSpeed * x;
        ASSERT_EQ(0, setIn ? KFS_SetKeyTangentsF(stream, 1, &x, &y, nullptr, &y, yScale)
                           : KFS_SetKeyTangentsF(stream, 1, nullptr, nullptr, &x, &y, yScale));
        Handle const handle = stream.GetHandle(1);
        EXPECT_EQ(handle.inSpeed, handle.outSpeed);
        EXPECT_NEAR(newSpeed, handle.inSpeed, 1e-12);
        double const duration = setIn ? 2.0 : 1.0;      // of the side that follows
        double const oldX = (setIn ? old.outInfluence : old.inInfluence) * duration;
        double const newX = (setIn ? handle.outInfluence : handle.inInfluence) * duration;
        double const oldLength = std::hypot(oldX, oldX * (setIn ? old.outSpeed : old.inSpeed) * yScale);
        double const newLength = std::hypot(newX, newX * newSpeed * yScale);
        if (newX < duration) {
            EXPECT_NEAR(oldLength, newLength, 1e-9);
            ++kept;
        } else {
            EXPECT_EQ(duration, newX);                  // no longer than the segment
            EXPECT_LE(newLength, oldLength + 1e-9);
        }
        EXPECT_EQ((Range{0, 2}), stream.Stale());
    }
    EXPECT_GT(kept, 200);
}

TEST_F(TangentsTest, ContinuityHasItsExceptions)
{
    double const x = -0.5;
    double const y = -1.0;
    double const outX = 1.0;
    double const outY = 7.0;
    // Both sides given: each as it is.
    KeyedStream both = MakeThree();
    both.Flag(1, KFS_KeyFlag_Continuous);
    ASSERT_EQ(0, KFS_SetKeyTangentsF(both, 1, &x, &y, &outX, &outY, 1.0));
    EXPECT_EQ(2.0, both.GetHandle(1).inSpeed);
    EXPECT_EQ(7.0, both.GetHandle(1).outSpeed);
    EXPECT_EQ((Range{0, 2}), both.Stale());

    // A spatial key's other side takes the speed alone.
    KeyedStream spatial = MakeThree(true);
    spatial.Flag(1, KFS_KeyFlag_Continuous);
    ASSERT_EQ(0, KFS_SetKeyTangentsF(spatial, 1, &x, &y, nullptr, nullptr, 1.0));
    EXPECT_EQ(2.0, spatial.GetHandle(1).outSpeed);
    EXPECT_EQ(0.5, spatial.GetHandle(1).outInfluence);
    // Also when that speed was negative and may not be.
    ASSERT_EQ(0, KFS_SetKeyTangentsF(spatial, 1, nullptr, nullptr, &outX, &x, 1.0));
    EXPECT_EQ(0.0, spatial.GetHandle(1).inSpeed);

    // Where the other side has no segment its influence times no time is left.
    KeyedStream first = MakeThree();
    first.Flag(0, KFS_KeyFlag_Continuous);
    ASSERT_EQ(0, KFS_SetKeyTangentsF(first, 0, nullptr, nullptr, &outX, &outY, 1.0));
    EXPECT_EQ(7.0, first.GetHandle(0).inSpeed);
    EXPECT_EQ(0.0, first.GetHandle(0).inInfluence);

    // A handle can't get shorter than the least.
    KeyedStream steep = MakeThree();
    steep.Flag(1, KFS_KeyFlag_Continuous);
    double const rise = -1e9;
    ASSERT_EQ(0, KFS_SetKeyTangentsF(steep, 1, &x, &rise, nullptr, nullptr, 1.0));
    EXPECT_EQ(0.0001, steep.GetHandle(1).outInfluence);
}

// ---- KFS_GetKeyTangentsF

TEST_F(TangentsTest, TangentsComeBackAsTheyWereSet)
{
    for (bool const spatial : {false, true}) {
        KeyedStream stream = MakeThree(spatial);
        double const in[] = {-0.25, -1.0};
        double const out[] = {1.5, 3.0};
        ASSERT_EQ(0, KFS_SetKeyTangentsF(stream, 1, &in[0], &in[1], &out[0], &out[1], 1.0));
        double inX = 0.0, inY = 0.0, outX = 0.0, outY = 0.0;
        ASSERT_EQ(0, KFS_GetKeyTangentsF(stream, 1, &inX, &inY, &outX, &outY));
        EXPECT_EQ((std::array<double, 4>{in[0], in[1], out[0], out[1]}), (std::array<double, 4>{inX, inY, outX, outY}));
        // At an end there is no segment and so no handle; single answers may be asked for.
        ASSERT_EQ(0, KFS_GetKeyTangentsF(stream, 0, &inX, &inY, nullptr, &outY));
        EXPECT_EQ(0.0, inX);
        EXPECT_EQ(0.0, inY);
        EXPECT_EQ(2.0 * 0.5 * 1.0, outY);
    }
}

TEST_F(TangentsTest, EachComponentHasItsOwnTangent)
{
    StreamOptions options;
    options.dimension = 3;
    KeyedStream stream = MakeKeyed({{0, 0.0}, {600, 10.0}, {1800, 40.0}}, S, options);
    double const inX[] = {-0.5, -0.25, 1.0};
    double const inY[] = {1.0, 2.0, 3.0};
    ASSERT_EQ(0, KFS_SetKeyTangentsF(stream, 1, inX, inY, nullptr, nullptr, 1.0));
    EXPECT_EQ((std::array{-2.0, -8.0, 0.0}),
              (std::array{stream.GetHandle(1, 0).inSpeed, stream.GetHandle(1, 1).inSpeed, stream.GetHandle(1, 2).inSpeed}));
    double x[3] = {};
    double y[3] = {};
    ASSERT_EQ(0, KFS_GetKeyTangentsF(stream, 1, x, y, nullptr, nullptr));
    EXPECT_EQ((std::array{-0.5, -0.25, -0.0001}), (std::array{x[0], x[1], x[2]}));
    EXPECT_EQ((std::array{1.0, 2.0, 0.0}), (std::array{y[0], y[1], y[2]}));
}

// ---- speeds

TEST_F(TangentsTest, SettingASpeedMakesItTheUsers)
{
    for (bool const spatial : {false, true}) {
        for (bool const continuous : {false, true}) {
            for (int sides = 0; sides < 4; ++sides) {
                SCOPED_TRACE(testing::Message() << "spatial " << spatial << ", continuous " << continuous << ", sides " << sides);
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
                Range const stale = !marksIn && !marksOut ? TestStream::NotStale : Range{marksIn ? 0 : 1, marksOut ? 2 : 1};
                EXPECT_EQ(stale, stream.Stale());
                EXPECT_EQ(0, stream.Pins());
            }
        }
    }
}

TEST_F(TangentsTest, OnlyASpatialStreamForbidsFallingSpeeds)
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
TEST_F(TangentsTest, SpeedsAreGivenInTheStreamsTypeOrInDoubles)
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
    int prevOut, in, out, nextIn;   // codes around the key
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

TEST_F(TangentsTest, SpeedsOfAPlainKey)
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

TEST_F(TangentsTest, OnlyTheFirstComponentsTinySpeedIsNone)
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

TEST_F(TangentsTest, SpeedsOfASpatialKey)
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
    stream.SetHandle(1, {3, 0.0, 2, 0.0});      // without influence there is no handle
    double in = Unanswered;
    double out = Unanswered;
    EXPECT_EQ(0, KFS_GetKeyVelocityF(stream, 1, 0, &in, &out));
    EXPECT_EQ(0.0, in);
    EXPECT_EQ(0.0, out);
}

TEST_F(TangentsTest, StraightSpeedsRunFromAnchorToAnchor)
{
    StreamOptions options;
    options.dimension = 2;
    options.spatial = true;
    KeyedStream stream = MakeKeyed({{0, 0.0}, {600, 1.0}, {1200, 5.0}, {3000, 9.0}}, L, options);
    for (int i = 0; i < 4; ++i) stream.Record(i)->arcLength = i < 3 ? 3.0 + i : 0.0;      // 3 4 5 over 1, 1, 3 seconds
    stream.Flag(1, KFS_KeyFlag_Float).Flag(2, KFS_KeyFlag_Float);
    struct Expected { int index; double in, out; };
    for (Expected const& e : {Expected{0, Unanswered, 2.4}, {1, 2.4, 2.4}, {2, 2.4, 2.4}, {3, 2.4, Unanswered}}) {
        double in = Unanswered;
        double out = Unanswered;
        ASSERT_EQ(0, KFS_GetKeyVelocityF(stream, e.index, 0, &in, &out));
        EXPECT_DOUBLE_EQ(e.in, in) << e.index;
        EXPECT_DOUBLE_EQ(e.out, out) << e.index;
    }
    // Without arc-length parametrisation a float key is measured between the keys next to it, others on their own side.
    stream.StreamFlag(KFS_StreamFlag_SParametrize, false);
    for (Expected const& e : {Expected{0, Unanswered, 3.0}, {1, 3.5, 3.5}, {2, 9.0 / 4.0, 9.0 / 4.0}, {3, 5.0 / 3.0, Unanswered}}) {
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

// Speeds of straight runs need true arcs, whichever range says that they are stale.
TEST_F(TangentsTest, StaleArcsAreMeasuredBeforeTheyAreRead)
{
    StreamOptions options;
    options.dimension = 2;
    options.spatial = true;
    KeyedStream stream(options);
    stream.Key(0, {0, 0}).Key(600, {30, 40}).Key(1200, {30, 50});
    double out = 0.0;
    ASSERT_EQ(0, KFS_GetKeyVelocityF(stream, 0, 0, nullptr, &out));
    EXPECT_NEAR(stream.Record(0)->arcLength, out, 1e-9);
    EXPECT_GE(out, 50.0);       // no shorter than the chord
}

// ---- influences

TEST_F(TangentsTest, InfluencesAreKeptBetweenNoneAndAll)
{
    struct Row { double given, stored; };
    for (bool const spatial : {false, true}) {
        for (Row const& row : {Row{0.0, 0.0}, {0.3, 0.3}, {1.0, 1.0}, {1.5, 1.0}, {-0.1, 0.0}, {1e-9, 1e-9}}) {
            KeyedStream stream = MakeThree(spatial);
            stream.Flag(1, KFS_KeyFlag_Modifiable).Flag(1, KFS_KeyFlag_Continuous);
            ASSERT_EQ(0, KFS_SetKeyInfluence(stream, 1, &row.given, nullptr));
            EXPECT_EQ(row.stored, stream.GetHandle(1).inInfluence);
            EXPECT_EQ(0.5, stream.GetHandle(1).outInfluence) << "sides don't move together";
            EXPECT_FALSE(stream.Record(1)->flags & KFS_KeyFlag_Modifiable);
            EXPECT_EQ((spatial ? Range{0, 1} : TestStream::NotStale), stream.Stale());
            ASSERT_EQ(0, KFS_SetKeyInfluence(stream, 1, nullptr, &row.given));
            EXPECT_EQ(row.stored, stream.GetHandle(1).outInfluence);
            EXPECT_EQ((spatial ? Range{0, 2} : TestStream::NotStale), stream.Stale());
            double in = Unanswered;
            double out = Unanswered;
            ASSERT_EQ(0, KFS_GetKeyInfluence(stream, 1, &in, &out));
            EXPECT_EQ(row.stored, in);
            EXPECT_EQ(row.stored, out);
        }
    }
}

TEST_F(TangentsTest, OnlySplineSidesHaveAnInfluence)
{
    for (bool const spatial : {false, true}) {
        for (int const code : {L, H, 0}) {
            KeyedStream stream = MakeThree(spatial);
            stream.Codes(1, code, S);
            double in = 0.0;
            double out = 0.0;
            ASSERT_EQ(0, KFS_GetKeyInfluence(stream, 1, &in, &out));
            EXPECT_EQ(0.16666666667, in);
            EXPECT_EQ(0.5, out);
            stream.Codes(1, S, code);
            ASSERT_EQ(0, KFS_GetKeyInfluence(stream, 1, nullptr, &out));
            EXPECT_EQ(0.16666666667, out);
            EXPECT_EQ(0.25, stream.GetHandle(1).inInfluence);
            EXPECT_EQ(0.5, stream.GetHandle(1).outInfluence);
        }
    }
}

// ---- the cache record

// A value that was read once must not outlive the curve that it came from.
TEST_F(TangentsTest, EverySetterDropsTheCachedValue)
{
    double const x = -0.9;
    double const y = 5.0;
    double const half = 0.9;
    std::function<int(KFS_Stream*)> const setters[] = {
        [&](KFS_Stream* stream) { return KFS_SetKeyTangentsF(stream, 1, &x, &y, nullptr, nullptr, 1.0); },
        [&](KFS_Stream* stream) { return KFS_SetKeyVelocity(stream, 1, &y, nullptr); },
        [&](KFS_Stream* stream) { return KFS_SetKeyVelocityF(stream, 1, &y, nullptr); },
        [&](KFS_Stream* stream) { return KFS_SetKeyInfluence(stream, 1, &half, nullptr); },
    };
    for (auto const& set : setters) {
        KeyedStream stream = MakeThree();
        double const before = stream.At1(300);
        EXPECT_FALSE(stream.CacheIsEmpty());
        ASSERT_EQ(0, set(stream));
        EXPECT_TRUE(stream.CacheIsEmpty());
        EXPECT_GT(std::fabs(before - stream.At1(300)), 0.01);
    }
}

TEST_F(TangentsTest, GettersMayUseTheCacheButNeverLeaveANumberInItAsAValue)
{
    KeyedStream stream = MakeThree(false, L);
    double const before = stream.At1(300);
    double number[4] = {};
    ASSERT_EQ(0, KFS_GetKeyVelocityF(stream, 1, 0, &number[0], &number[1]));
    EXPECT_EQ(before, stream.At1(300));
    ASSERT_EQ(0, KFS_GetKeyInfluence(stream, 1, &number[2], &number[3]));
    EXPECT_EQ(before, stream.At1(300));
    EXPECT_EQ((std::array{10.0, 15.0, 0.16666666667, 0.16666666667}), (std::array{number[0], number[1], number[2], number[3]}));
}

// ---- KFS_GetClampedVelInflF

struct Clamp {
    char const* why;
    bool in;
    double speed, influence;
    bool clamped;
    double newSpeed, newInfluence;
};

// The middle key's value is 10 after one second; before it 0, one second away, after it 40, two seconds away.
Clamp const Clamps[] = {
    {"inside", true, 4, 0.5, false, 4, 0.5},
    {"up to the neighbour's value", true, 20, 0.5, false, 20, 0.5},
    {"beyond it", true, 40, 0.5, true, 40, 0.25},
    {"far beyond it", true, 1000, 1, true, 1000, 0.01},
    {"in the wrong direction", true, -4, 0.5, true, 0, 0.5},
    {"flat", true, 0, 0.9, false, 0, 0.9},
    {"without length", true, 99, 0, false, 99, 0},
    {"out, inside", false, 10, 0.5, false, 10, 0.5},
    {"out, beyond", false, 100, 0.5, true, 100, 0.15},
    {"out, in the wrong direction", false, -1, 0.25, true, 0, 0.25},
};

TEST_F(TangentsTest, ProposedHandlesStayBetweenTheValues)
{
    for (Clamp const& c : Clamps) {
        SCOPED_TRACE(c.why);
        KeyedStream stream = MakeThree();
        std::vector<unsigned char> const before = stream.Bytes();
        double speed = c.speed;
        double influence = c.influence;
        unsigned char clamped = 0;
        auto const ask = [&](double* speeds, double* influences) {
            return c.in ? KFS_GetClampedVelInflF(stream, 1, -1, speeds, influences, nullptr, nullptr, &clamped)
                        : KFS_GetClampedVelInflF(stream, 1, 1, nullptr, nullptr, speeds, influences, &clamped);
        };
        ASSERT_EQ(0, ask(&speed, &influence));
        EXPECT_NEAR(c.newSpeed, speed, 1e-9);
        EXPECT_NEAR(c.newInfluence, influence, 1e-12);
        EXPECT_EQ(c.clamped, clamped);
        EXPECT_EQ(before, stream.Bytes());
        // What is clamped already stays, up to rounding.
        double again = speed;
        ASSERT_EQ(0, ask(&again, &influence));
        EXPECT_NEAR(speed, again, 1e-9);

        // A missing number is the stored one.
        stream.SetHandle(1, {c.speed, c.influence, c.speed, c.influence});
        speed = c.speed;
        influence = c.influence;
        clamped = 0;
        ASSERT_EQ(0, ask(&speed, nullptr));
        ASSERT_EQ(0, ask(nullptr, &influence));
        EXPECT_NEAR(c.newSpeed, speed, 1e-9);
        EXPECT_NEAR(c.newInfluence, influence, 1e-12);
        EXPECT_EQ(c.clamped, clamped);
    }
}

TEST_F(TangentsTest, ClampingIsPerComponentAndOnlyEverSetsItsFlag)
{
    StreamOptions options;
    options.dimension = 2;
    KeyedStream stream = MakeKeyed({{0, 0.0}, {600, 10.0}}, S, options);
    double speeds[] = {5.0, 50.0};
    double influences[] = {0.5, 1.0};
    unsigned char clamped = 0;
    ASSERT_EQ(0, KFS_GetClampedVelInflF(stream, 0, 0, speeds, influences, speeds, influences, &clamped));
    EXPECT_EQ(5.0, speeds[0]);
    EXPECT_EQ(0.5, influences[0]);
    EXPECT_NEAR(0.2, influences[1], 1e-12);
    EXPECT_EQ(1, clamped);
    speeds[1] = 5.0;
    ASSERT_EQ(0, KFS_GetClampedVelInflF(stream, 0, 0, nullptr, nullptr, speeds, influences, &clamped));
    EXPECT_EQ(1, clamped);
    // Between equal values a handle can only be flat; and at a last key nothing goes out.
    KeyedStream const level = MakeKeyed({{0, 10.0}, {600, 10.0}}, S);
    double speed = 3.0;
    double influence = 0.5;
    clamped = 0;
    ASSERT_EQ(0, KFS_GetClampedVelInflF(level, 1, 0, nullptr, nullptr, &speed, &influence, &clamped));
    EXPECT_EQ(0, clamped);
    ASSERT_EQ(0, KFS_GetClampedVelInflF(level, 1, 0, &speed, &influence, nullptr, nullptr, nullptr));
    EXPECT_EQ(0.0, speed);
    EXPECT_EQ(0.0, influence);
}

// ---- KFS_GetZeroVelocityPoints

struct Turn {
    char const* why;
    int out, in;
    Handle first, second;       // of the two keys; values 5 and 5 after 1 and 3 seconds
    std::vector<int> times;
    std::vector<int> signs;     // of the second derivatives
};

constexpr double Third = 1.0 / 3.0;

Turn const Turns[] = {
    {"a hump", S, S, {0, 0, 6, Third}, {-6, Third, 0, 0}, {1200}, {-1}},
    {"a dip", S, S, {0, 0, -6, Third}, {6, Third, 0, 0}, {1200}, {1}},
    {"up and down again", S, S, {0, 0, 6, Third}, {6, Third, 0, 0}, {854, 1546}, {-1, 1}},
    {"straight", L, L, {0, 0, 6, Third}, {6, Third, 0, 0}, {}, {}},
    {"level", S, S, {0, 0, 0, Third}, {0, Third, 0, 0}, {}, {}},
    {"held", H, S, {0, 0, 6, Third}, {-6, Third, 0, 0}, {}, {}},
};

TEST_F(TangentsTest, FindsWhereAComponentTurns)
{
    StreamOptions options;
    options.dimension = 2;
    for (Turn const& c : Turns) {
        SCOPED_TRACE(c.why);
        KeyedStream stream = MakeKeyed({{600, 5.0}, {1800, 5.0}}, L, options);
        stream.Codes(0, L, c.out).Codes(1, c.in, L).SetHandle(0, c.first, 1).SetHandle(1, c.second, 1);
        int count = 99;
        T_Time times[2] = {{-1, 1}, {-1, 1}};
        double bends[2] = {};
        ASSERT_EQ(0, KFS_GetZeroVelocityPoints(stream, 0, 1, &count, times, bends));
        ASSERT_EQ(static_cast<int>(c.times.size()), count);
        for (std::size_t i = 0; i < c.times.size(); ++i) {
            EXPECT_EQ(c.times[i], times[i].value);
            EXPECT_EQ(600U, times[i].scale);
            EXPECT_GT(bends[i] * c.signs[i], 1.0);
        }
        ASSERT_EQ(0, KFS_GetZeroVelocityPoints(stream, 0, 1, &count, times, nullptr));
        EXPECT_EQ(0, stream.Pins());
    }
    KeyedStream const stream = MakeThree();
    int count = 99;
    T_Time times[2];
    EXPECT_EQ(KFS_Err_TimeOutsideKeys, KFS_GetZeroVelocityPoints(stream, 2, 0, &count, times, nullptr));
    EXPECT_REPORT(reports, 100, "time is before first keyframe or after last");
}

// ---- all doors

struct Door {
    char const* name;
    std::function<int(KFS_Stream*, int index)> call;
    int damagedOperation;
    char const* damagedAction;
    int noKeysOperation;
    char const* noKeysAction;
};

std::vector<Door> Doors()
{
    static double const in = -0.5;
    static double const out = 0.5;
    static double number[8];
    static int count;
    static T_Time times[2];
    return {
        {"KFS_SetKeyTangentsF", [](KFS_Stream* s, int i) { return KFS_SetKeyTangentsF(s, i, &in, &in, &out, &out, 1.0); },
         29, "get a value from", 30, "get a value from"},
        {"KFS_GetKeyTangentsF", [](KFS_Stream* s, int i) { return KFS_GetKeyTangentsF(s, i, number, number + 1, number + 2, number + 3); },
         30, "get a value from", 30, "get a value from"},
        {"KFS_SetKeyVelocity", [](KFS_Stream* s, int i) { return KFS_SetKeyVelocity(s, i, &in, &out); },
         51, "alter a key value in", 51, "inquire about a key value in"},
        {"KFS_SetKeyVelocityF", [](KFS_Stream* s, int i) { return KFS_SetKeyVelocityF(s, i, &in, &out); },
         55, "alter a key value in", 51, "inquire about a key value in"},
        {"KFS_GetKeyVelocityF", [](KFS_Stream* s, int i) { return KFS_GetKeyVelocityF(s, i, 0, number, number + 1); },
         52, "get a value from", 52, "get a value from"},
        {"KFS_SetKeyInfluence", [](KFS_Stream* s, int i) { return KFS_SetKeyInfluence(s, i, &out, &out); },
         53, "alter a key value in", 53, "inquire about a key value in"},
        {"KFS_GetKeyInfluence", [](KFS_Stream* s, int i) { return KFS_GetKeyInfluence(s, i, number, number + 1); },
         54, "get a value from", 54, "get a value from"},
        {"KFS_GetClampedVelInflF",
         [](KFS_Stream* s, int i) { return KFS_GetClampedVelInflF(s, i, 0, number, number + 1, number + 2, number + 3, nullptr); },
         101, "get a value from", 101, "get a value from"},
        {"KFS_GetZeroVelocityPoints", [](KFS_Stream* s, int i) { return KFS_GetZeroVelocityPoints(s, i, 0, &count, times, nullptr); },
         103, "alter a key value in", 103, "alter a key value in"},
    };
}

TEST_F(TangentsTest, EveryDoorRefusesInItsOwnWords)
{
    StreamOptions constant;
    constant.noKeys = true;
    for (Door const& door : Doors()) {
        SCOPED_TRACE(door.name);
        DamagedStream const damaged;
        EXPECT_EQ(KFS_Err_DamagedStream, door.call(damaged.get(), 0));
        EXPECT_EQ(reports.Take(), std::vector<Reported>{DamagedReport(door.damagedOperation, door.damagedAction)});
        EXPECT_TRUE(damaged.Untouched());

        TestStream const empty;
        TestStream const withoutValue(constant);
        for (TestStream const* stream : {&empty, &withoutValue}) {
            EXPECT_EQ(KFS_Err_NoKeys, door.call(stream->get(), 0));
            EXPECT_REPORT(reports, door.noKeysOperation, NoKeysText(door.noKeysAction));
        }

        KeyedStream const stream = MakeThree();
        std::vector<unsigned char> const before = stream.Bytes();
        for (int const index : {3, 99, -1, -2, KFS_INVALID_INDEX, std::numeric_limits<int>::max()}) {
            EXPECT_EQ(SEQ_Err_BadIndex, door.call(stream, index)) << index;
        }
        EXPECT_EQ(before, stream.Bytes());
        EXPECT_EQ(0, stream.Pins());
    }
}

TEST_F(TangentsTest, AConstantsRecordStandsInForTheKey)
{
    for (bool const spatial : {false, true}) {
        StreamOptions options;
        options.noKeys = true;
        options.spatial = spatial;
        options.dimension = 2;
        TestStream stream(options);
        stream.Key(0, {4.0, 5.0}, S);
        double const number = 0.5;
        EXPECT_EQ(0, KFS_SetKeyTangentsF(stream, 0, &number, &number, &number, &number, 1.0));
        EXPECT_EQ(0, KFS_SetKeyInfluence(stream, 0, &number, &number));
        double const speeds[] = {1.0, 1.0};
        EXPECT_EQ(0, KFS_SetKeyVelocityF(stream, 0, speeds, speeds));
        double x[2] = {9, 9}, y[2] = {9, 9}, outX[2] = {9, 9}, outY[2] = {9, 9};
        EXPECT_EQ(0, KFS_GetKeyTangentsF(stream, 0, x, y, outX, outY));
        EXPECT_EQ(0.0, std::fabs(x[0]) + std::fabs(y[0]) + std::fabs(outX[0]) + std::fabs(outY[0]));
        double in[2] = {9, 9};
        EXPECT_EQ(0, KFS_GetKeyVelocityF(stream, 0, 1, in, nullptr));
        EXPECT_EQ(0.0, in[0]);
        EXPECT_EQ((std::vector<double>{4.0, 5.0}), stream.At(100));     // the value is where it was
    }
}

// A client's type of eight bytes a value and one of four: neither has room for handles.

int InterpolateCustom(KFS_Stream const*, long, int, int)
{
    return 0;
}

TEST_F(TangentsTest, CustomKeysHoldNoHandles)
{
    for (unsigned short const size : {4, 8, 16}) {
        SCOPED_TRACE(size);
        KFS_ValueDesc desc;
        desc.isCustom = 1;
        desc.itemSize = size;
        desc.dataType = 5;
        desc.interpFunc = &InterpolateCustom;
        KFS_Stream stream(1, 600, 0, 0, KFS_InterpMask_All, 0, desc, nullptr, nullptr, false);
        std::array<unsigned char, 16> value{};
        for (int k = 0; k < 3; ++k) {
            value.fill(static_cast<unsigned char>(k + 1));
            T_Time const time{600 * k, 600};
            ASSERT_EQ(0, KFS_InsertKey(&stream, &time, 1, value.data(), k == 0 ? L : S, k == 0 ? L : S));
        }
        auto const bytes = [&] {
            std::vector<unsigned char> all;
            for (int k = 0; k < 3; ++k) {
                void const* item = nullptr;
                EXPECT_EQ(0, SEQ_GetConstAddress(stream.GetKeys(), k, &item));
                all.insert(all.end(), static_cast<unsigned char const*>(item) + 8, static_cast<unsigned char const*>(item) + 8 + size);
            }
            return all;
        };
        std::vector<unsigned char> const before = bytes();
        double const number = 0.5;
        double const x = -0.5;
        EXPECT_EQ(0, KFS_SetKeyTangentsF(&stream, 1, &x, &x, &number, &number, 1.0));
        EXPECT_EQ(0, KFS_SetKeyVelocityF(&stream, 1, &number, &number));
        EXPECT_EQ(0, KFS_SetKeyVelocity(&stream, 1, value.data(), value.data()));
        EXPECT_EQ(0, KFS_SetKeyInfluence(&stream, 1, &number, &number));
        EXPECT_EQ(before, bytes());
        EXPECT_TRUE(stream.IsCustom());

        double a = 9.0, b = 9.0, c = 9.0, d = 9.0;
        EXPECT_EQ(0, KFS_GetKeyTangentsF(&stream, 1, &a, &b, &c, &d));
        EXPECT_EQ(0.0, std::fabs(a) + std::fabs(b) + std::fabs(c) + std::fabs(d));
        a = b = 9.0;
        EXPECT_EQ(0, KFS_GetKeyVelocityF(&stream, 1, 0, &a, &b));
        EXPECT_EQ(0.0, std::fabs(a) + std::fabs(b));
        unsigned char clamped = 0;
        a = b = 100.0;
        EXPECT_EQ(0, KFS_GetClampedVelInflF(&stream, 1, 0, &a, &b, &a, &b, &clamped));
        EXPECT_EQ(0, clamped);

        a = b = 9.0;
        if (size == 8) {
            EXPECT_EQ(0, KFS_GetKeyInfluence(&stream, 1, &a, &b));
            EXPECT_EQ(0.16666666667, a);
            EXPECT_EQ(0.16666666667, b);
        } else {
            EXPECT_EQ(KFS_Err_CustomNotAllowed, KFS_GetKeyInfluence(&stream, 1, &a, &b));
            EXPECT_REPORT(reports, 54, "Attempting to get the key influence of a custon non-spatial stream.");
            EXPECT_EQ(9.0, a);
        }
    }
}

// ---- notifications

class HeardStream : public KFS_Stream {
public:
    using KFS_Stream::KFS_Stream;
    int ProbeListenerState() override { return KFS_ListenerState_Heard; }
};

class Ear : public KFS_StreamListener {
public:
    Ear() { KFS_RegisterMainListener(this); }
    ~Ear() override { KFS_UnregisterMainListener(this); }
    void StreamAboutToBeInserted(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int) override {}
    void StreamInserted(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int) override {}
    void StreamAboutToBeRemoved(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int) override {}
    void StreamRemoved(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int) override {}
    void StreamAboutToBeSwapped(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int) override {}
    void StreamSwapped(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int) override {}
    void StreamsAboutToBeReordered(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int, unsigned int) override {}
    void StreamsReordered(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int, unsigned int) override {}
    void StreamDestroyed(KFS_StreamBase const*) override {}
    void StreamValueChanged(KFS_Stream*) override
    {
        ++heard;
        if (answer) answer();
    }
    void StreamFlagsChanged(KFS_StreamBase*, unsigned int, unsigned int) override {}
    void StreamDisplayNameChanged(KFS_StreamBase*) override {}

    int heard = 0;
    std::function<void()> answer;
};

TEST_F(TangentsTest, SettersTellOnceAndOnlyOnSuccess)
{
    KFS_ValueDesc desc;
    desc.dataType = KFS_Type_Double;
    HeardStream stream(1, 600, 0, 0, KFS_InterpMask_All, 0, desc, nullptr, nullptr, false);
    for (int k = 0; k < 3; ++k) {
        double const value = k;
        T_Time const time{600 * k, 600};
        ASSERT_EQ(0, KFS_InsertKeyF(&stream, &time, 1, &value, S, S));
    }
    for (Door const& door : Doors()) {
        SCOPED_TRACE(door.name);
        bool const setter = std::string_view(door.name).starts_with("KFS_Set");
        Ear ear;
        EXPECT_EQ(0, door.call(&stream, 1));
        EXPECT_EQ(setter ? 1 : 0, ear.heard);
        EXPECT_EQ(SEQ_Err_BadIndex, door.call(&stream, 7));
        EXPECT_EQ(setter ? 1 : 0, ear.heard);
        if (!setter) continue;
        ear.answer = [] { throw 4711; };
        EXPECT_EQ(4711, door.call(&stream, 1));
        ear.answer = [] { throw std::runtime_error("no ears"); };
        EXPECT_EQ(Q_Err_Exception, door.call(&stream, 1));
        EXPECT_EQ(1U, reports.Take().size());
        ear.answer = [] { throw "something else"; };
        EXPECT_THROW(door.call(&stream, 1), char const*);
        EXPECT_EQ(8, stream.GetValueDesc()->itemSize);
        EXPECT_EQ(nullptr, stream.GetCopyItemFunc());
    }
}

} // namespace
