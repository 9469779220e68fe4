#include "keystore/attributes.h"

#include "curves/update.h"
#include "tests/support/listening.h"
#include "tests/support/streams.h"

namespace {

class Rescale : public StreamTest {};

// Told of a removal it finds some times in the one scale and some in the other; what it makes of them doesn't last.
TEST_F(Rescale, AListenerMayReadMeanwhile)
{
    auto const make = [] {
        auto stream = std::make_unique<TestStream>();
        for (int const time : {0, 300, 310, 600, 910, 1200}) stream->Key(time, {time % 7 * 3.0}, KFS_Interp_Spline);
        for (int i = 0; i < stream->Count(); ++i) stream->Record(i)->flags |= KFS_KeyFlag_Modifiable;
        EXPECT_EQ(0, KFS_ForceUpdateStream(*stream));
        return stream;
    };
    auto const alone = make();
    ASSERT_EQ(0, KFS_RescaleStream(*alone, 20));
    auto const heard = make();
    HeardRoot root;
    root.Store(*heard);
    {
        ValueListener listener([&] { heard->At1(13); });
        ASSERT_EQ(0, KFS_RescaleStream(*heard, 20));
        EXPECT_EQ(1, listener.Take());
    }
    ASSERT_EQ(5, heard->Count());
    EXPECT_EQ(alone->At1(13), heard->At1(13));
    ASSERT_EQ(0, (*alone)->UpdateStream());
    ASSERT_EQ(0, (*heard)->UpdateStream());
    EXPECT_EQ(alone->Bytes(), heard->Bytes());
}

TEST_F(Rescale, ATimeThatDoesNotFitEndsIt)
{
    TestStream stream;
    stream.Key(10, {0}).Key(1500000000, {1}).Key(1600000000, {2});
    EXPECT_EQ(T_Err_Overflow, KFS_RescaleStream(stream, 1200));
    EXPECT_EQ(600u, stream->GetTimeScale());
    EXPECT_EQ((std::vector{20, 1500000000, 1600000000}), stream.Times()) << "what was converted stays so";
    EXPECT_EQ(0, stream.Pins());
    EXPECT_EQ(T_Err_Scale, KFS_RescaleStream(stream, 0));
    EXPECT_NO_REPORT(reports);
}

}  // namespace
