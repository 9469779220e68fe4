#include "keystore/lookup.h"

#include "frame/services/context.h"
#include "frame/statics_private.h"
#include "keystore/items.h"
#include "tests/support/streams.h"

#include <algorithm>
#include <functional>
#include <random>
#include <set>
#include <tuple>

namespace {

constexpr T_Time NoTime{KFS_INVALID_INDEX, 0};

bool Same(T_Time const& a, T_Time const& b)
{
    return a.value == b.value && a.scale == b.scale;
}

class Lookup : public StreamTest {};

std::unique_ptr<TestStream> WithKeys(std::vector<int> times, bool backwards = false)
{
    auto stream = std::make_unique<TestStream>();
    if (backwards) std::reverse(times.begin(), times.end());
    for (int const time : times) stream->Key(time, {1.0 * time});
    return stream;
}

struct Step {
    int code = 77;
    unsigned char found = 77;
    int index = 77;
    T_Time time{77, 77};

    static Step Of(KFS_Stream const* stream, T_Time const& time, int direction)
    {
        Step step;
        step.code = KFS_FindKeyTime(stream, &time, static_cast<short>(direction), &step.found, &step.index, &step.time);
        return step;
    }
};

constexpr int None = KFS_INVALID_INDEX;

TEST_F(Lookup, NullTimeIsTheOriginAndAnswersMayBeNull)
{
    auto const stream = WithKeys({-10, 0, 10});
    int index = 77;
    EXPECT_EQ(0, KFS_TimeToIndex(*stream, nullptr, &index));
    EXPECT_EQ(1, index);
    EXPECT_EQ(0, KFS_GetKeyIndex(*stream, nullptr, &index, nullptr));
    EXPECT_EQ(1, index);
    EXPECT_EQ(0, KFS_FindNearestKeyTime(*stream, nullptr, nullptr, nullptr));
    EXPECT_EQ(0, KFS_FindKeyTime(*stream, nullptr, 0, nullptr, &index, nullptr));
    EXPECT_EQ(2, index);
    EXPECT_EQ(0, KFS_GetKey(*stream, 1, nullptr, nullptr, nullptr));
    for (auto const& [at, expected] : {std::pair<int, T_Time>{0, {-10, 600}},
                                       {2, {10, 600}},
                                       {-1, {10, 600}},
                                       {3, NoTime},
                                       {-2, NoTime},
                                       {None, NoTime}}) {
        T_Time time{77, 77};
        EXPECT_EQ(0, KFS_IndexToTime(*stream, at, &time));
        EXPECT_TRUE(Same(expected, time)) << at << " gave " << time.value << "/" << time.scale;
    }
    EXPECT_EQ(0, stream->Pins());
}

TEST_F(Lookup, ATimeThatDoesNotFitIsRefusedWithoutAReport)
{
    auto const stream = WithKeys({10, 20});
    T_Time const tooFar{2000000000, 1}, noTime = NoTime;
    unsigned char found = 77;
    T_Time time{77, 77};
    Step const step = Step::Of(*stream, tooFar, 0);
    EXPECT_EQ((std::tuple{int{T_Err_Overflow}, 0, None}), (std::tuple{step.code, int{step.found}, step.index}));
    EXPECT_TRUE(Same(NoTime, step.time));
    for (auto const& [bad, code] : {std::pair<T_Time, int>{tooFar, T_Err_Overflow}, {noTime, T_Err_Scale}}) {
        std::array indices{77, 77, 77};
        EXPECT_EQ(code, KFS_FindNearestKeyTime(*stream, &bad, &indices[0], &time));
        EXPECT_EQ(code, KFS_TimeToIndex(*stream, &bad, &indices[1]));
        EXPECT_EQ(code, KFS_GetKeyIndex(*stream, &bad, &indices[2], &found));
        EXPECT_EQ((std::array{None, None, None}), indices);
    }
    EXPECT_NO_REPORT(reports);
}

// Stale marks are left or consumed as a look-up does or doesn't bring the stream up to date.
class Updates : public StreamTest {
protected:
    Updates()
    {
        for (int i = 0; i < 5; ++i) stream.Key(i * 100, {100.0 * i, 10.0 * i * i});
        EXPECT_EQ(0, stream->UpdateStream());
        stream.Record(2)->flags |= KFS_KeyFlag_Float;
        MakeStale();
    }
    void MakeStale()
    {
        EXPECT_EQ(0, stream->SetInvalid(-1, 5));
        EXPECT_EQ(0, stream->SetArcInvalid(-1, 5));
    }
    bool IsStale() const { return stream.Stale() != TestStream::NotStale && stream.ArcStale() != TestStream::NotStale; }
    int At(int time)
    {
        int index = 77;
        T_Time const at = stream.Time(time);
        EXPECT_EQ(0, KFS_TimeToIndex(stream, &at, &index));
        return index;
    }

    TestStream stream{{.dimension = 2, .spatial = true}};
};

TEST_F(Updates, NoUpdateStartsInsideAnother)
{
    EXPECT_EQ(3, At(300));
    int* const level = KFSp_GetTimeToIndexCheck().get();
    ASSERT_NE(nullptr, level);
    EXPECT_EQ(0, *level);
    MakeStale();
    *level = 1;
    EXPECT_EQ(3, At(300));
    EXPECT_EQ(None, At(333));
    EXPECT_TRUE(IsStale());
    EXPECT_EQ(1, *level);
    *level = 0;
    EXPECT_EQ(None, At(333));
    EXPECT_FALSE(IsStale());
    EXPECT_EQ(0, *level);
}

// A key that stood at the time before is the answer all the same.
TEST_F(Updates, AFailedUpdateIsTheResultWhereNoKeyStandsAndIsOverAfterIt)
{
    for (int const time : {300, 333}) {
        SCOPED_TRACE(time);
        int failures = 0;
        bool fired = true;
        for (int n = 1; fired; ++n) {
            ASSERT_LT(n, 100);
            ASSERT_EQ(0, KFS_DisposeRemapTables(stream));  // so that the arcs need memory again
            int index = 77;
            T_Time const at = stream.Time(time);
            Q_FailAllocation(n);
            int const code = KFS_TimeToIndex(stream, &at, &index);
            fired = Q_FailAllocationFired();
            Q_FailAllocation(0);
            EXPECT_TRUE(code == 0 || (code == 4 && time == 333)) << code;
            EXPECT_EQ(time == 300 ? 3 : None, index);
            EXPECT_EQ(0, *KFSp_GetTimeToIndexCheck());
            EXPECT_EQ(0, stream.Pins());
            failures += time == 333 ? code != 0 : fired;
        }
        EXPECT_GT(failures, 0);
    }
}

TEST_F(Updates, ARenderAsksItsOwnKeys)
{
    TestStream constant({.noKeys = true});
    constant.Key(5, {1.0});
    {
        Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
        int index = 77;
        T_Time const at = constant.Time(99);
        EXPECT_EQ(0, KFS_GetKeyIndex(constant, &at, &index, nullptr));
        EXPECT_EQ(99, constant->GetCache()->time);
        EXPECT_EQ(3, At(300));
        EXPECT_FALSE(IsStale());
    }
    EXPECT_EQ(5, constant->GetCache()->time);
    EXPECT_TRUE(IsStale());
}

}  // namespace
