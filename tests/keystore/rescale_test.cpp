#include "keystore/attributes.h"

#include "curves/update.h"
#include "keystore/lookup.h"
#include "tests/support/listening.h"
#include "tests/support/streams.h"

#include <algorithm>
#include <cstdint>
#include <map>
#include <random>

namespace {

class Rescale : public StreamTest {
protected:
    // Each key's value is its index, so that it can be told which ones are left.
    static std::unique_ptr<TestStream> WithKeys(std::vector<int> const& times, unsigned scale)
    {
        auto stream = std::make_unique<TestStream>(StreamOptions{.timeScale = scale});
        for (std::size_t i = 0; i < times.size(); ++i) stream->Key(times[i], {1.0 * static_cast<double>(i)});
        return stream;
    }
    static std::vector<int> Survivors(TestStream const& stream)
    {
        std::vector<int> survivors;
        for (int i = 0; i < stream.Count(); ++i) survivors.push_back(static_cast<int>(stream.Numbers(i)[0]));
        return survivors;
    }
};

TEST_F(Rescale, OfTwoKeysOnATickTheNearerStays)
{
    struct Row {
        char const* why;
        unsigned from, to;
        std::vector<int> times, newTimes, survivors;
    };
    Row const rows[] = {
        {"coarser, all apart", 600, 300, {0, 10, 20}, {0, 5, 10}, {0, 1, 2}},
        {"0.10 and 0.12 s meet on 0.1: the earlier is there", 100, 10, {10, 12}, {1}, {0}},
        {"0.07 and 0.11 s: the later is nearer", 100, 10, {7, 11}, {1}, {1}},
        {"0.08 and 0.12 s: a tie", 100, 10, {8, 12}, {1}, {0}},
        {"two meetings", 100, 10, {7, 11, 20, 22}, {1, 2}, {1, 2}},
        {"negative: -0.12 and -0.10 s", 100, 10, {-12, -10}, {-1}, {1}},
        {"three on a tick, the middle one nearest", 100, 10, {8, 10, 12}, {1}, {1}},
    };
    for (Row const& row : rows) {
        SCOPED_TRACE(row.why);
        auto const stream = WithKeys(row.times, row.from);
        EXPECT_EQ(0, KFS_RescaleStream(*stream, row.to));
        EXPECT_EQ(row.to, (*stream)->GetTimeScale());
        EXPECT_EQ(row.newTimes, stream->Times());
        EXPECT_EQ(row.survivors, Survivors(*stream));
        EXPECT_EQ(0, stream->Pins());
        EXPECT_TRUE(stream->CacheIsEmpty());
    }
}

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
    auto const stream = WithKeys({10, 1500000000, 1600000000}, 600);
    EXPECT_EQ(T_Err_Overflow, KFS_RescaleStream(*stream, 1200));
    EXPECT_EQ(600u, (*stream)->GetTimeScale());
    EXPECT_EQ((std::vector{20, 1500000000, 1600000000}), stream->Times()) << "what was converted stays so";
    EXPECT_EQ(0, stream->Pins());
    EXPECT_EQ(T_Err_Scale, KFS_RescaleStream(*stream, 0));
    EXPECT_NO_REPORT(reports);
}

}  // namespace
