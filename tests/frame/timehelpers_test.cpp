#include "frame/timehelpers.h"

#include <gtest/gtest.h>

#include <climits>

namespace {

using Mixer = hearth::utility::MixHashGuidT<hearth::utility::Murmur3MixerState>;

hearth::utility::Guid MixIn(T_Time const& time)
{
    Mixer mixer;
    KFS_MixInTime(mixer, time);
    return mixer.GetGuid();
}

TEST(TimeHelpers, ConvertIntoTheWantedScale)
{
    T_Time const third{1, 3};
    T_Time const half{1, 2};
    T_Time result{};
    ASSERT_EQ(0, KFS_AddTime(&third, &half, 600, &result));
    EXPECT_EQ(500, result.value);
    EXPECT_EQ(600u, result.scale);
    ASSERT_EQ(0, KFS_SubTime(&third, &half, 600, &result));
    EXPECT_EQ(-100, result.value);
    EXPECT_EQ(1, half.value) << "the argument stays";
    M_Ratio const twice{2, 1};
    ASSERT_EQ(0, KFS_MulTime(&third, &twice, 30, &result));
    EXPECT_EQ(20, result.value);
}

TEST(TimeHelpers, WithoutAScaleTheSumIsExact)
{
    T_Time const third{1, 3};
    T_Time const seventh{1, 7};
    T_Time sum{};
    ASSERT_EQ(0, KFS_AddTime(&third, &seventh, 0, &sum));
    EXPECT_TRUE(sum == (T_Time{10, 21}));
}

TEST(TimeHelpers, AFailedConversionLeavesNoScale)
{
    T_Time const large{INT_MAX, 1};
    T_Time const zero{0, 1};
    T_Time result{7, 7};
    EXPECT_EQ(T_Err_Overflow, KFS_AddTime(&large, &zero, 600, &result));
    EXPECT_EQ(0u, result.scale);
    EXPECT_EQ(T_Err_Overflow, KFS_AddTime(&large, &large, 0, &result));
    T_Time const least{INT_MIN, 1};
    EXPECT_EQ(T_Err_Overflow, KFS_SubTime(&zero, &least, 0, &result));
    T_Time const before{-1, 1};
    EXPECT_EQ(0, KFS_SubTime(&before, &least, 0, &result)) << "what has no negative can be taken away";
    EXPECT_TRUE(result == large);
}

TEST(TimeHelpers, EqualInstantsHashAlike)
{
    EXPECT_TRUE(MixIn({1, 2}) == MixIn({300, 600}));
    EXPECT_TRUE(MixIn({-4, 8}) == MixIn({-1, 2}));
    EXPECT_FALSE(MixIn({1, 2}) == MixIn({2, 1}));
    EXPECT_FALSE(MixIn({1, 2}) == MixIn({-1, 2}));
    EXPECT_THROW(MixIn({1, 0}), int);
}

}  // namespace
