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

// Against the ticks worked out key by key in exact arithmetic: every tick that a key comes to holds one key in the end,
// the nearest.
TEST_F(Rescale, EveryTickKeepsOneOfItsKeys)
{
    std::mt19937 random(28);
    unsigned const scales[] = {24, 25, 30, 100, 600, 1000, 48000};
    for (int round = 0; round < 60; ++round) {
        std::int64_t const from = scales[random() % 7];
        std::int64_t const to = scales[random() % 7];
        std::vector<int> times;
        for (int time = -40; times.size() < 30; time += 1 + static_cast<int>(random() % 7)) times.push_back(time);
        auto const stream = WithKeys(times, static_cast<unsigned>(from));
        ASSERT_EQ(0, KFS_RescaleStream(*stream, static_cast<unsigned>(to)));
        std::map<int, std::vector<int>> met;  // by tick, the keys
        for (std::size_t i = 0; i < times.size(); ++i) {
            std::int64_t const doubled = 2 * times[i] * to;
            std::int64_t const rounded =
                doubled >= 0 ? (doubled + from) / (2 * from) : -((-doubled + from) / (2 * from));
            met[static_cast<int>(rounded)].push_back(static_cast<int>(i));
        }
        ASSERT_EQ(met.size(), static_cast<std::size_t>(stream->Count()));
        std::vector<int> const survivors = Survivors(*stream);
        int position = 0;
        for (auto const& [tick, keys] : met) {
            SCOPED_TRACE(testing::Message() << "round " << round << ", " << from << " to " << to << ", tick " << tick);
            EXPECT_EQ(tick, stream->Record(position)->time);
            auto const far = [&](int key) { return std::abs(times[static_cast<std::size_t>(key)] * to - tick * from); };
            int const nearest =
                *std::min_element(keys.begin(), keys.end(), [&](int a, int b) { return far(a) < far(b); });
            EXPECT_EQ(nearest, survivors[static_cast<std::size_t>(position)]) << "a tie goes to the earlier";
            // And look-ups know of it.
            int index = 77;
            T_Time const at{tick, static_cast<unsigned>(to)};
            EXPECT_EQ(0, KFS_TimeToIndex(*stream, &at, &index));
            EXPECT_EQ(position, index);
            ++position;
        }
    }
}

TEST_F(Rescale, ValuesStayWhereTheyAreInSeconds)
{
    TestStream stream;
    stream.Key(0, {0.0}, KFS_Interp_Spline).Key(300, {4.0}, KFS_Interp_Spline).Key(600, {1.0}, KFS_Interp_Spline);
    std::vector<double> before;
    for (int time = 0; time <= 600; time += 30) before.push_back(stream.At1(time));
    auto const bytes = stream.Bytes();
    EXPECT_EQ(0, KFS_RescaleStream(stream, 600));
    EXPECT_EQ(bytes, stream.Bytes()) << "the same scale is no edit";
    EXPECT_EQ(600, stream->GetCache()->time);
    ASSERT_EQ(0, KFS_RescaleStream(stream, 2400));
    for (std::size_t i = 0; i <= 20; ++i) EXPECT_DOUBLE_EQ(before[i], stream.At1(static_cast<int>(120 * i)));
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

TEST_F(Rescale, AStreamWithoutKeysOnlyTakesTheScale)
{
    TestStream constant({.noKeys = true});
    constant.Key(7, {1.0});
    TestStream const empty;
    for (KFS_Stream* const stream : {constant.get(), empty.get()}) {
        EXPECT_EQ(0, KFS_RescaleStream(stream, 30));
        EXPECT_EQ(30u, stream->GetTimeScale());
    }
    EXPECT_EQ(7, constant->GetCache()->time);
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
