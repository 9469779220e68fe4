// The packed index of key times: what it remembers of the last search must never show in an answer.

#include "keystore/keytimes.h"

#include "tests/support/streams.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <random>
#include <vector>

namespace {

// A list of records of which only the times are looked at.
class KeyTimesTest : public StreamTest {
protected:
    KeyTimesTest() { EXPECT_EQ(SEQ_New(0, sizeof(KFS_KeyScalar), 0, 0, &list_), 0); }
    ~KeyTimesTest() override { EXPECT_EQ(0, SEQ_Dispose(list_, 0)); }

    void Insert(int time)
    {
        auto const at = std::lower_bound(expected_.begin(), expected_.end(), time);
        if (at != expected_.end() && *at == time) return;
        times_.Inserted(static_cast<int>(at - expected_.begin()), time);
        expected_.insert(at, time);
    }
    void RemoveAny(std::mt19937& random)
    {
        if (expected_.empty()) return;
        int const index = static_cast<int>(random() % expected_.size());
        times_.Removed(index);
        expected_.erase(expected_.begin() + index);
    }
    // Half of a gap, so that the order stays.
    void RetimeAny(std::mt19937& random)
    {
        if (expected_.size() < 2) return;
        std::size_t const index = random() % (expected_.size() - 1);
        expected_[index] += (expected_[index + 1] - expected_[index]) / 2;
        times_.Retimed(static_cast<int>(index), expected_[index]);
    }
    void Ask(int time)
    {
        int const right =
            static_cast<int>(std::lower_bound(expected_.begin(), expected_.end(), time) - expected_.begin());
        ASSERT_EQ(times_.LowerBound(time), right) << "at " << time << " of " << expected_.size() << " keys";
    }

    SEQ_Head** list_ = nullptr;
    std::vector<int> expected_;
    KFS_KeyTimes times_;
};

TEST_F(KeyTimesTest, AnswersDontDependOnTheSearchesBefore)
{
    std::mt19937 random(11);
    ASSERT_TRUE(times_.Build(list_));
    int cursor = 0;
    for (int step = 0; step < 20000; ++step) {
        switch (random() % 16) {
        case 0: Insert(static_cast<int>(random() % 2000)); break;
        case 1: RemoveAny(random); break;
        case 2: RetimeAny(random); break;
        case 3: cursor = static_cast<int>(random() % 2200) - 100; break;  // a seek
        case 4:
            Ask(INT_MAX);
            Ask(INT_MIN + 4000);
            break;                                                      // far outside, not yet around the circle
        default: cursor += static_cast<int>(random() % 12) - 2; break;  // play, now and then a step back
        }
        Ask(cursor);
        if (HasFatalFailure()) return;
    }
    EXPECT_GT(expected_.size(), 0U);
}

// Keys all around the circle, where a time lies before or after a key depending on the key, and keys of which a float key has got its time before those behind it: first and last look
// like those of a short list in order.
TEST_F(KeyTimesTest, AListOutOfOrderHasNoMemory)
{
    std::vector<std::vector<int>> const lists{{INT_MIN + 10, -1000, 1000, INT_MAX - 10},
                                              {INT_MIN + 19, 10, INT_MAX - 3, INT_MIN + 21},
                                              {0, 50, 40, 41, 42, 60}};
    for (std::vector<int> const& times : lists) {
        auto const fill = [&](KFS_KeyTimes& index) {
            ASSERT_TRUE(index.Build(list_));
            for (std::size_t i = 0; i < times.size(); ++i) index.Inserted(static_cast<int>(i), times[i]);
        };
        for (int const before : times)
            for (int const time : times)
                for (int const beside : {-1, 0, 1}) {
                    KFS_KeyTimes fresh;
                    fill(fresh);
                    fill(times_);
                    for (int const off : {1, 2, 3}) times_.LowerBound(before + off);
                    EXPECT_EQ(times_.LowerBound(time + beside), fresh.LowerBound(time + beside))
                        << time + beside << " after " << before;
                }
    }
}

// A list in order that an edit stretches around the circle: what was known of its order goes with the edit.
TEST_F(KeyTimesTest, AnEditThatEndsTheOrderEndsTheMemory)
{
    KFS_KeyScalar key{};
    for (int const time : {0, 10, 20}) {
        key.time = time;
        ASSERT_EQ(0, SEQ_Insert(&key, (*list_)->count, list_));
    }
    constexpr int Far = INT_MIN + 10;
    using Edit = void (*)(KFS_KeyTimes&);
    for (auto const& [edit, after] :
         {std::pair<Edit, std::vector<int>>{[](KFS_KeyTimes& times) { times.Inserted(3, Far); }, {0, 10, 20, Far}},
          {[](KFS_KeyTimes& times) { times.Retimed(2, Far); }, {0, 10, Far}}}) {
        KFS_KeyTimes times;
        ASSERT_TRUE(times.Build(list_));
        for (int const before : {11, 12}) ASSERT_EQ(2, times.LowerBound(before));
        edit(times);
        for (int const time : {-5, 5, 15, 25, INT_MAX, Far - 1, Far, Far + 1}) {
            // As the list itself searches, by halves and differences.
            std::size_t base = 0;
            auto const isBefore = [&](std::size_t i) {
                return static_cast<int>(static_cast<unsigned>(after[i]) - static_cast<unsigned>(time)) < 0;
            };
            for (std::size_t count = after.size(); count > 1; count -= count / 2)
                if (isBefore(base + count / 2 - 1)) base += count / 2;
            EXPECT_EQ(static_cast<int>(base) + isBefore(base), times.LowerBound(time))
                << "at " << time << " of " << after.size();
        }
    }
}

}  // namespace
