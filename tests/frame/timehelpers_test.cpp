#include "frame/timehelpers.h"

#include <gtest/gtest.h>

#include <climits>

namespace {

// The arithmetic itself is held elsewhere; here: the wanted scale, 0 for an exact result, and none after a failure.
TEST(TimeHelpers, ConvertIntoTheWantedScaleOrLeaveNone)
{
    T_Time const third{1, 3}, seventh{1, 7}, half{1, 2}, large{INT_MAX, 1}, least{INT_MIN, 1}, zero{0, 1},
        before{-1, 1};
    M_Ratio const twice{2, 1};
    struct {
        int (*call)(T_Time const*, T_Time const*, unsigned, T_Time*);
        T_Time a, b;
        unsigned scale;
        T_Time result;
    } const rows[] = {
        {KFS_AddTime, third, half, 600, {500, 600}}, {KFS_SubTime, third, half, 600, {-100, 600}},
        {KFS_AddTime, third, seventh, 0, {10, 21}},  {KFS_AddTime, large, zero, 600, {7, 0}},
        {KFS_AddTime, large, large, 0, {7, 0}},      {KFS_SubTime, zero, least, 0, {7, 0}},
        {KFS_SubTime, before, least, 0, large},  // what has no negative can be taken away
    };
    T_Time result{};
    for (auto const& [call, a, b, scale, wanted] : rows) {
        result = {7, 7};
        EXPECT_EQ(wanted.scale ? 0 : T_Err_Overflow, call(&a, &b, scale, &result));
        if (wanted.scale + scale != 0) EXPECT_EQ(wanted.scale, result.scale);
        if (wanted.scale != 0) EXPECT_EQ(wanted.value, result.value);
    }
    ASSERT_EQ(0, KFS_MulTime(&third, &twice, 30, &result));
    EXPECT_EQ(20, result.value);
}

TEST(TimeHelpers, EqualInstantsHashAlike)
{
    auto const mixIn = [](T_Time const& time) {
        hearth::utility::MixHashGuidT<hearth::utility::Murmur3MixerState> mixer;
        KFS_MixInTime(mixer, time);
        return mixer.GetGuid();
    };
    EXPECT_TRUE(mixIn({1, 2}) == mixIn({300, 600}) && mixIn({-4, 8}) == mixIn({-1, 2}));
    EXPECT_FALSE(mixIn({1, 2}) == mixIn({2, 1}) || mixIn({1, 2}) == mixIn({-1, 2}));
    EXPECT_THROW(mixIn({1, 0}), int);
}

}  // namespace
