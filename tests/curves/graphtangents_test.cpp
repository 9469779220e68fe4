#include "curves/tangents.h"

#include "tests/curves/threekeys.h"

#include <cmath>

namespace {

using GraphTangentsTest = StreamTest;

// ---- KFS_SetKeyTangentsF

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

}  // namespace
