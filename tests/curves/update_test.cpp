#include "curves/update.h"

#include "frame/errors.h"
#include "frame/services/memory.h"
#include "tests/curves/keyedstream.h"

#include <utility>

namespace {

using UpdateStream = StreamTest;

PathStream Corner()
{
    return PathStream({{0, {0, 0}}, {100, {3, 4}}, {200, {3, 10}}, {300, {11, 10}}}, KFS_Interp_Spline);
}

TEST_F(UpdateStream, MeasuresDurationsOfACustomStream)
{
    PathStream stream = Corner();
    ASSERT_EQ(0, stream->UpdateStream());
    stream->MarkTemporarilyNonCustom(true);
    stream.Flag(1, KFS_KeyFlag_Float);
    ASSERT_EQ(0, KFS_ForceUpdateStream(stream));
    stream->MarkTemporarilyNonCustom(false);
    for (int i = 0; i < 4; ++i) EXPECT_EQ(i < 3 ? 100.0 / 600 : 0.0, stream.Arc(i));
    EXPECT_EQ(100, stream.Record(1)->time);  // and nothing floats
}

TEST_F(UpdateStream, WaitsWhileItIsHeldOff)
{
    PathStream stream = Corner();
    ASSERT_EQ(0, stream->SetInvalid(-1, 4));
    ASSERT_EQ(0, stream->SetArcInvalid(-1, 4));
    stream->SetDisabledUpdateStream(true);
    stream->SetDisabledUpdateStream(true);
    stream.Record(1)->arcLength = 77.0;
    std::vector<unsigned char> const before = stream.Bytes();
    double tangent[2] = {-1, -1};
    for (int release = 0; release < 2; ++release) {
        EXPECT_EQ(0, stream->UpdateStream());
        EXPECT_EQ(0, KFS_GetKeySpaceTangentsF(stream, 1, 0, tangent, nullptr));
        EXPECT_EQ(before, stream.Bytes());
        EXPECT_EQ((std::array<int, 2>{0, 3}), stream.Stale());
        EXPECT_EQ((std::array<int, 2>{0, 3}), stream.ArcStale());
        stream->SetDisabledUpdateStream(false);
    }
    EXPECT_EQ(0, stream->UpdateStream());
    EXPECT_NE(77.0, stream.Arc(1));
    EXPECT_EQ(TestStream::NotStale, stream.ArcStale());
}

TEST_F(UpdateStream, ConsumesTheMarksOfARepairThatFails)
{
    PathStream stream = Corner();
    for (int i = 0; i < 3; ++i) {
        KFS_KeyScalar* const key = stream.Record(i);
        key->arcLength = -1.0;
        // A table in its place would need no memory.
        EXPECT_EQ(0, key->remapTable ? SEQ_Dispose(std::exchange(key->remapTable, nullptr), 0) : 0);
    }
    ASSERT_EQ(0, stream->SetInvalid(-1, 4));
    ASSERT_EQ(0, stream->SetArcInvalid(-1, 4));
    Q_FailAllocation(2);
    int const code = stream->UpdateStream();
    bool const fired = Q_FailAllocationFired();
    Q_FailAllocation(0);
    ASSERT_TRUE(fired);
    EXPECT_EQ(Q_Err_OutOfMemory, code);
    EXPECT_EQ(TestStream::NotStale, stream.Stale());
    EXPECT_EQ(TestStream::NotStale, stream.ArcStale());
    EXPECT_EQ(0, stream.Pins());
    EXPECT_EQ(-1.0, stream.Arc(2));  // behind the failing one nothing changed
    // And the stream recovers.
    ASSERT_EQ(0, KFS_ForceUpdateStream(stream));
    EXPECT_GT(stream.Arc(2), 7.9);
}

TEST_F(UpdateStream, ForcedOnALongListNarrowsItsCount)
{
    TestStream stream;
    int const count = 32768;
    for (int i = 0; i < count; ++i) stream.Key(i, {static_cast<double>(i % 7)}, KFS_Interp_Spline);
    ASSERT_EQ(0, stream->UpdateStream());
    auto const speedAt5 = [&] { return KFSp_GetTemporalRuns(stream.Record(5), 1).inSpeed[0]; };
    KFSp_GetTemporalRuns(stream.Record(5), 1).inSpeed[0] = 123.0;
    stream.Record(5)->flags |= KFS_KeyFlag_Modifiable;
    EXPECT_EQ(0, KFS_ForceUpdateStream(stream));
    EXPECT_EQ(123.0, speedAt5());  // a short made of the count is below 1: nothing is marked

    ASSERT_EQ(0, stream->RemoveKey(count - 1, 0));
    EXPECT_EQ(0, KFS_ForceUpdateStream(stream));
    EXPECT_NE(123.0, speedAt5());
}

}  // namespace
