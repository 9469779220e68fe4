#include "curves/tangents.h"

#include "tests/curves/threekeys.h"

#include <cmath>
#include <span>

namespace {

using VelocityTest = StreamTest;

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

}  // namespace
