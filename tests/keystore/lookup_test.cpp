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

// Every look-up's answer at one time.
struct Answers {
    int nearest = 77;
    T_Time nearestTime{77, 77};
    int atOrBefore = 77;
    unsigned char exactly = 77;
    int at = 77;

    static Answers Of(KFS_Stream const* stream, T_Time const& time)
    {
        Answers answers;
        EXPECT_EQ(0, KFS_FindNearestKeyTime(stream, &time, &answers.nearest, &answers.nearestTime));
        EXPECT_EQ(0, KFS_GetKeyIndex(stream, &time, &answers.atOrBefore, &answers.exactly));
        EXPECT_EQ(0, KFS_TimeToIndex(stream, &time, &answers.at));
        return answers;
    }
};

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

TEST_F(Lookup, AnswersAlikeHoweverItIsAsked)
{
    struct Ask {
        char const* why;
        std::vector<int> keys;
        int at;
        int nearest, nearestTime, atOrBefore, exactly;
    };
    Ask const asks[] = {
        {"the only key, from afar", {20}, -9000, 0, 20, None, None},
        {"before the first", {10, 20, 30}, 5, 0, 10, None, None},
        {"exactly on a key", {10, 20, 30}, 20, 1, 20, 1, 1},
        {"a tie goes to the past", {10, 20, 30}, 15, 0, 10, 0, None},
        {"one unit after the tie", {10, 20, 30}, 16, 1, 20, 0, None},
        {"in the last segment", {10, 20, 30}, 25, 1, 20, 1, None},
        {"after the last", {10, 20, 30}, 99, 2, 30, 2, None},
        {"negative times", {-30, -10}, -20, 0, -30, 0, None},
        {"far apart", {-1000000000, 1000000000}, 1, 1, 1000000000, 0, None},
    };
    for (Ask const& ask : asks) {
        for (bool const backwards : {false, true}) {  // the order of insertion must not show
            for (int const finer : {1, 7}) {          // nor must the scale of the question
                if (finer > 1 && std::abs(ask.keys.front()) > 1000000) continue;
                SCOPED_TRACE(testing::Message() << ask.why << ", backwards " << backwards << ", scale x" << finer);
                auto const stream = WithKeys(ask.keys, backwards);
                T_Time const at{ask.at * finer, 600u * static_cast<unsigned>(finer)};
                Answers const answers = Answers::Of(stream->get(), at);
                EXPECT_EQ(ask.nearest, answers.nearest);
                EXPECT_TRUE(Same({ask.nearestTime, 600}, answers.nearestTime));
                EXPECT_EQ(ask.atOrBefore, answers.atOrBefore);
                EXPECT_EQ(ask.exactly != None, answers.exactly != 0);
                EXPECT_EQ(ask.exactly, answers.at);
                EXPECT_EQ(0, stream->Pins());
            }
        }
    }
}

// The list as a sorted vector, and every answer worked out by looking at all of it.
TEST_F(Lookup, AgreesWithAPlainWalkOverRandomKeys)
{
    std::mt19937 random(24);
    for (int round = 0; round < 40; ++round) {
        int const span = round % 2 ? 100 : 2000000;
        auto const any = [&] { return static_cast<int>(random() % static_cast<unsigned>(span)) - span / 2; };
        std::set<int> keys;
        for (unsigned long count = 1 + random() % 60; count > 0; --count) keys.insert(any());
        std::vector<int> const times(keys.begin(), keys.end());
        auto const made = WithKeys(times);
        TestStream const& stream = *made;
        for (int ask = 0; ask < 50; ++ask) {
            int const at = ask % 3 == 0 ? times[random() % times.size()] : any();
            SCOPED_TRACE(testing::Message() << "round " << round << " at " << at);
            auto const next = std::lower_bound(times.begin(), times.end(), at);
            bool const exactly = next != times.end() && *next == at;
            int const position = static_cast<int>(next - times.begin());
            auto const nearest = std::min_element(times.begin(), times.end(),
                                                  [at](int a, int b) { return std::abs(a - at) < std::abs(b - at); });
            Answers const answers = Answers::Of(stream, stream.Time(at));
            EXPECT_EQ(nearest - times.begin(), answers.nearest);
            EXPECT_EQ(exactly ? position : None, answers.at);
            EXPECT_EQ(exactly, answers.exactly != 0);
            EXPECT_EQ(exactly ? position : position > 0 ? position - 1 : None, answers.atOrBefore);
            int const size = static_cast<int>(times.size());
            std::pair<int, int> const steps[] = {
                {0, exactly ? position + 1 : position},
                {KFS_Find_Backward, position - 1},
                {KFS_Find_AtTime, position},
                {KFS_Find_AtTime | KFS_Find_Backward, exactly ? position : position - 1},
            };
            for (auto const& [direction, index] : steps) {
                Step const step = Step::Of(stream, stream.Time(at), direction);
                bool const there = index >= 0 && index < size;
                T_Time const time = there ? T_Time{times[static_cast<std::size_t>(index)], 600} : NoTime;
                EXPECT_EQ((std::tuple{0, there, there ? index : None}),
                          (std::tuple{step.code, step.found != 0, step.index}));
                EXPECT_TRUE(Same(time, step.time));
            }
        }
    }
}

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

TEST_F(Lookup, AConstantHasOneKeyWhereverItIsAsked)
{
    TestStream stream({.noKeys = true});
    stream.Key(5, {2.5}, KFS_Interp_Linear, KFS_Interp_Hold);
    int index = 77;
    unsigned char found = 77;
    T_Time time{77, 77};
    T_Time const asked{300, 1200};
    EXPECT_EQ(0, KFS_FindNearestKeyTime(stream, &asked, &index, &time));
    EXPECT_EQ(0, index);
    EXPECT_TRUE(Same(asked, time)) << "as it was asked";
    EXPECT_EQ(0, KFS_IndexToTime(stream, 99, &time));
    EXPECT_TRUE(Same({150, 600}, time)) << "the value has moved there";
    T_Time const later = stream.Time(42);
    EXPECT_EQ(0, KFS_GetKeyIndex(stream, &later, &index, &found));
    EXPECT_EQ(0, index);
    EXPECT_EQ(1, found);
    EXPECT_EQ(42, stream->GetCache()->time);
    // The one time that would say that there is no value.
    T_Time const none = stream.Time(KFS_INVALID_INDEX);
    EXPECT_EQ(0, KFS_GetKeyIndex(stream, &none, &index, &found));
    EXPECT_EQ(0, KFS_FindNearestKeyTime(stream, &none, &index, &time));
    double value = 0.0;
    char in = 77;
    char out = 77;
    EXPECT_EQ(0, KFS_GetKey(stream, 1234, &value, &in, &out));
    EXPECT_EQ((std::tuple{2.5, KFS_Interp_Linear, KFS_Interp_Hold}), (std::tuple{value, in, out}));
    EXPECT_EQ(7426, Step::Of(stream, later, 0).code);
    EXPECT_REPORT(reports, 22, "attempt to get a key value from a constant time stream.");
    index = 77;
    EXPECT_EQ(7426, KFS_TimeToIndex(stream, &later, &index));
    EXPECT_EQ(None, index);
    EXPECT_REPORT(reports, 24, "attempt to inquire about a key value in a constant time stream.");
}

// Without a value, and with keys but none there: the same questions, other answers.
TEST_F(Lookup, WhatThereIsToSayWithoutAnything)
{
    TestStream const constant({.noKeys = true}), keyed;
    T_Time const at = keyed.Time(5);
    const std::string getText = "attempt to get a value from a time stream with no key values.";
    const std::string inquireText = "attempt to inquire about a key value in a time stream with no key values.";
    int index = 77;
    T_Time time{77, 77};
    unsigned char found = 77;
    unsigned short flags = 77;
    EXPECT_EQ(7427, KFS_FindNearestKeyTime(constant, &at, &index, &time));
    EXPECT_EQ(None, index);
    EXPECT_TRUE(Same(NoTime, time));
    EXPECT_REPORT(reports, 23, getText);
    EXPECT_EQ(0, KFS_FindNearestKeyTime(keyed, &at, &index, &time));
    EXPECT_EQ(None, index);
    EXPECT_TRUE(Same({KFS_INVALID_INDEX, 600}, time)) << "no time, in the stream's scale";
    Step const step = Step::Of(keyed, at, 0);
    EXPECT_EQ((std::tuple{0, 0, None}), (std::tuple{step.code, int{step.found}, step.index}));
    EXPECT_TRUE(Same(NoTime, step.time));
    EXPECT_EQ(7427, KFS_TimeToIndex(keyed, &at, &index));
    EXPECT_REPORT(reports, 24, inquireText);
    EXPECT_EQ(7426, KFS_IndexToTime(constant, 0, &time));
    EXPECT_TRUE(Same(NoTime, time));
    EXPECT_REPORT(reports, 25, "attempt to inquire about a key value in a constant time stream.");
    time = {77, 77};
    EXPECT_EQ(0, KFS_IndexToTime(keyed, -1, &time));
    EXPECT_TRUE(Same(NoTime, time));
    for (TestStream const* const stream : {&constant, &keyed}) {
        double value = 77.0;
        char in = 77;
        char out = 77;
        index = 77;
        EXPECT_EQ(7427, KFS_GetKeyIndex(*stream, &at, &index, &found));
        EXPECT_EQ((std::pair{None, 0}), (std::pair{index, int{found}}));
        EXPECT_EQ(7427, KFS_GetKeyFlags(*stream, 0, &flags));
        EXPECT_EQ(7427, KFS_GetKey(*stream, 0, &value, &in, &out));
        EXPECT_EQ((std::pair{0, 0}), (std::pair{int{in}, int{out}}));
        in = out = 77;
        EXPECT_EQ(7427, KFS_GetKeyF(*stream, 0, &value, &in, &out));
        EXPECT_EQ((std::pair{0, 0}), (std::pair{int{in}, int{out}}));
        EXPECT_EQ((std::vector{KfsReport(26, getText), KfsReport(72, inquireText), KfsReport(28, getText),
                               KfsReport(28, getText)}),
                  reports.Take());
        EXPECT_EQ(77, flags);
        EXPECT_EQ(77.0, value);
        EXPECT_TRUE(stream->CacheIsEmpty());
    }
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

TEST_F(Updates, AFloatKeyIsTakenWhereItStands)
{
    EXPECT_EQ(2, At(200));
    EXPECT_TRUE(IsStale());
    EXPECT_EQ(3, At(300)) << "a key that doesn't float";
    EXPECT_FALSE(IsStale());
    MakeStale();
    stream.Record(2)->time = 190;
    stream->SetKeys(stream->GetKeys());
    int const moved = At(200);
    EXPECT_FALSE(IsStale()) << "nothing there";
    EXPECT_EQ(stream.Record(2)->time == 200 ? 2 : None, moved) << "the answer is that after the update";
}

TEST_F(Updates, IndexToTimeAnswersWhereAStaleFloatKeyComesToStand)
{
    T_Time time{77, 77};
    EXPECT_EQ(0, KFS_IndexToTime(stream, 1, &time));
    EXPECT_TRUE(IsStale()) << "a key that doesn't float needs no update";
    stream.Record(2)->time = 101;
    stream->SetKeys(stream->GetKeys());
    EXPECT_EQ(0, KFS_IndexToTime(stream, 2, &time));
    EXPECT_FALSE(IsStale());
    EXPECT_EQ(stream.Record(2)->time, time.value);
    EXPECT_NE(101, time.value);
}

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
