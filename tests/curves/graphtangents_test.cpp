#include "curves/tangents.h"

#include "tests/curves/threekeys.h"

#include <cmath>

namespace {

using GraphTangentsTest = StreamTest;

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

TEST_F(GraphTangentsTest, AGraphTangentIsStoredAsSpeedAndInfluence)
{
    for (Stored const& c : Tangents) {
        for (bool const spatial : {false, true}) {
            for (bool const nonDecreasing : {false, true}) {
                SCOPED_TRACE(testing::Message()
                             << c.why << ", spatial " << spatial << ", non-decreasing " << nonDecreasing);
                KeyedStream stream = MakeThree(spatial);
                stream.StreamFlag(KFS_StreamFlag_NonDecreasing, nonDecreasing);
                unsigned short const flags = stream.Record(1)->flags;
                ASSERT_EQ(0, KFS_SetKeyTangentsF(stream, 1, c.in ? &c.x : nullptr, c.in ? &c.y : nullptr,
                                                 c.in ? nullptr : &c.x, c.in ? nullptr : &c.y, 1.0));
                Handle const handle = stream.GetHandle(1);
                double const speed = spatial && nonDecreasing ? std::max(c.speed, 0.0) : c.speed;
                EXPECT_DOUBLE_EQ(speed, c.in ? handle.inSpeed : handle.outSpeed);
                EXPECT_DOUBLE_EQ(spatial ? c.spatialInfluence : c.plainInfluence,
                                 c.in ? handle.inInfluence : handle.outInfluence);
                EXPECT_EQ(c.in ? 2.0 : 3.0, c.in ? handle.outSpeed : handle.inSpeed) << "the other side stays";
                EXPECT_EQ(c.in ? 0.5 : 0.25, c.in ? handle.outInfluence : handle.inInfluence);
                EXPECT_EQ(flags, stream.Record(1)->flags);
                EXPECT_EQ((c.in ? Range{0, 1} : Range{1, 2}), stream.Stale());
                EXPECT_EQ(0, stream.Pins());
            }
        }
    }
}

TEST_F(GraphTangentsTest, ASideNeedsBothPointersAndANeighbour)
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

TEST_F(GraphTangentsTest, AContinuousHandleKeepsItsLength)
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
        double const duration = setIn ? 2.0 : 1.0;  // of the side that follows
        double const oldX = (setIn ? old.outInfluence : old.inInfluence) * duration;
        double const newX = (setIn ? handle.outInfluence : handle.inInfluence) * duration;
        double const oldLength = std::hypot(oldX, oldX * (setIn ? old.outSpeed : old.inSpeed) * yScale);
        double const newLength = std::hypot(newX, newX * newSpeed * yScale);
        if (newX < duration) {
            EXPECT_NEAR(oldLength, newLength, 1e-9);
            ++kept;
        } else {
            EXPECT_EQ(duration, newX);  // no longer than the segment
            EXPECT_LE(newLength, oldLength + 1e-9);
        }
        EXPECT_EQ((Range{0, 2}), stream.Stale());
    }
    EXPECT_GT(kept, 200);
}

TEST_F(GraphTangentsTest, ContinuityHasItsExceptions)
{
    double const x = -0.5, y = -1.0, outX = 1.0, outY = 7.0;
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

TEST_F(GraphTangentsTest, TangentsComeBackAsTheyWereSet)
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
        EXPECT_EQ((std::array{0.0, 0.0, 2.0 * 0.5 * 1.0}), (std::array{inX, inY, outY}));
    }
}

TEST_F(GraphTangentsTest, EachComponentHasItsOwnTangent)
{
    KeyedStream stream = MakeKeyed({{0, 0.0}, {600, 10.0}, {1800, 40.0}}, S, {.dimension = 3});
    double const inX[] = {-0.5, -0.25, 1.0};
    double const inY[] = {1.0, 2.0, 3.0};
    ASSERT_EQ(0, KFS_SetKeyTangentsF(stream, 1, inX, inY, nullptr, nullptr, 1.0));
    for (int i = 0; i < 3; ++i)
        EXPECT_EQ((std::array{-2.0, -8.0, 0.0}[static_cast<std::size_t>(i)]), stream.GetHandle(1, i).inSpeed);
    double x[3] = {};
    double y[3] = {};
    ASSERT_EQ(0, KFS_GetKeyTangentsF(stream, 1, x, y, nullptr, nullptr));
    EXPECT_EQ((std::array{-0.5, -0.25, -0.0001}), (std::array{x[0], x[1], x[2]}));
    EXPECT_EQ((std::array{1.0, 2.0, 0.0}), (std::array{y[0], y[1], y[2]}));
}

}  // namespace
