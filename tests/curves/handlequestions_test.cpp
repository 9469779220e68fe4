#include "curves/tangents.h"

#include "tests/curves/threekeys.h"

namespace {

using HandleQuestionsTest = StreamTest;

// ---- KFS_GetClampedVelInflF

TEST_F(HandleQuestionsTest, ClampingIsPerComponentAndOnlyEverSetsItsFlag)
{
    KeyedStream stream = MakeKeyed({{0, 0.0}, {600, 10.0}}, S, {.dimension = 2});
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
    Handle first, second;  // of the two keys; values 5 and 5 after 1 and 3 seconds
    std::vector<int> times;
    std::vector<int> signs;  // of the second derivatives
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

TEST_F(HandleQuestionsTest, FindsWhereAComponentTurns)
{
    for (Turn const& c : Turns) {
        SCOPED_TRACE(c.why);
        KeyedStream stream = MakeKeyed({{600, 5.0}, {1800, 5.0}}, L, {.dimension = 2});
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

}  // namespace
