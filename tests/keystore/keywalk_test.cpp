#include "keystore/lookup.h"

#include "tests/support/streams.h"

#include <algorithm>
#include <random>
#include <stdexcept>

namespace {

constexpr int None = KFS_INVALID_INDEX;

// Writes down the keys that it is handed and stops at one of them.
struct Visitor {
    std::vector<int> times;
    std::vector<int> indices;
    int stopAt = None;
    int answer = 4711;

    static int Visit(KFS_Stream* stream, long self, int index, KFS_KeyScalar* key)
    {
        auto* const visitor = reinterpret_cast<Visitor*>(self);
        visitor->times.push_back(key->time);
        visitor->indices.push_back(index);
        EXPECT_EQ(KFS_StreamValidStamp, stream->GetStamp());
        if (key->time != visitor->stopAt) return 0;
        if (visitor->answer == -1) throw 815;
        if (visitor->answer == -2) throw std::runtime_error("from inside");
        return visitor->answer;
    }
    long Word() { return reinterpret_cast<long>(this); }
};

class KeyWalk : public StreamTest {
protected:
    KeyWalk() { stream.Key(10, {1.0}).Key(20, {2.0}).Key(30, {3.0}); }
    TestStream stream;
};

TEST_F(KeyWalk, WalksTheKeysOfARangeOfTimes)
{
    constexpr int Null = 12345;
    struct Row {
        int first, last;
        std::vector<int> times;
    };
    // What lies between two times is the random test's.
    Row const rows[] = {
        {Null, Null, {10, 20, 30}}, {Null, 20, {10, 20}}, {20, Null, {20, 30}}, {Null, 9, {}}, {31, Null, {}},
        {10, 30, {10, 20, 30}},     {30, 15, {30, 20}},   {11, 19, {}},
    };
    for (Row const& row : rows) {
        for (unsigned const finer : {1u, 5u}) {
            SCOPED_TRACE(testing::Message() << row.first << " to " << row.last << " scale x" << finer);
            T_Time const first{row.first * static_cast<int>(finer), 600 * finer};
            T_Time const last{row.last, 600};
            Visitor visitor;
            T_Time lastTime{77, 77};
            EXPECT_EQ(0, KFS_ForRange(stream, row.first == Null ? nullptr : &first, row.last == Null ? nullptr : &last,
                                      visitor.Word(), Visitor::Visit, &lastTime));
            EXPECT_EQ(row.times, visitor.times);
            EXPECT_EQ(row.times.empty() ? None : row.times.back(), lastTime.value);
            EXPECT_EQ(600u, lastTime.scale);
            for (std::size_t i = 0; i < visitor.times.size(); ++i)
                EXPECT_EQ(visitor.times[i] / 10 - 1, visitor.indices[i]);
        }
    }
}

TEST_F(KeyWalk, AgreesWithAFilterOverRandomKeys)
{
    std::mt19937 random(34);
    for (int round = 0; round < 30; ++round) {
        TestStream keys;
        for (int i = 0; i < 20; ++i) keys.Key(static_cast<int>(random() % 100), {0.0});
        for (int ask = 0; ask < 20; ++ask) {
            int const a = static_cast<int>(random() % 120) - 10;
            int const b = static_cast<int>(random() % 120) - 10;
            std::vector<int> expected = keys.Times();
            std::erase_if(expected, [&](int time) { return time < std::min(a, b) || time > std::max(a, b); });
            if (a > b) std::reverse(expected.begin(), expected.end());
            T_Time const first = keys.Time(a), last = keys.Time(b);
            Visitor visitor;
            EXPECT_EQ(0, KFS_ForRange(keys, &first, &last, visitor.Word(), Visitor::Visit, nullptr));
            EXPECT_EQ(expected, visitor.times) << a << " to " << b;
        }
    }
}

TEST_F(KeyWalk, WalksTheKeysOfARangeOfIndices)
{
    struct Row {
        int first, last, code;
        std::vector<int> times;
        int lastIndex;
    };
    Row const rows[] = {
        {0, 2, 0, {10, 20, 30}, 2},         {2, 0, 0, {30, 20, 10}, 0},          {1, 1, 0, {20}, 1},
        {0, 3, SEQ_Err_BadIndex, {}, None}, {-1, 1, SEQ_Err_BadIndex, {}, None},
    };
    for (Row const& row : rows) {
        SCOPED_TRACE(testing::Message() << row.first << " to " << row.last);
        Visitor visitor;
        int lastIndex = 77;
        EXPECT_EQ(row.code, KFS_ForIndexRange(stream, row.first, row.last, visitor.Word(), Visitor::Visit, &lastIndex));
        EXPECT_EQ(row.times, visitor.times);
        EXPECT_EQ(row.lastIndex, lastIndex);
    }
}

TEST_F(KeyWalk, TheFunctionEndsTheWalk)
{
    for (auto const& [answer, code] : {std::pair{4711, 4711}, {-1, 815}, {-2, static_cast<int>(Q_Err_Exception)}}) {
        SCOPED_TRACE(code);
        Visitor visitor;
        visitor.stopAt = 20;
        visitor.answer = answer;
        T_Time lastTime{77, 77};
        EXPECT_EQ(code, KFS_ForRange(stream, nullptr, nullptr, visitor.Word(), Visitor::Visit, &lastTime));
        EXPECT_EQ((std::vector{10, 20}), visitor.times);
        EXPECT_EQ(20, lastTime.value) << "the last key handed out";
        int lastIndex = 77;
        EXPECT_EQ(code, KFS_ForIndexRange(stream, 2, 0, visitor.Word(), Visitor::Visit, &lastIndex));
        EXPECT_EQ(1, lastIndex);
        EXPECT_EQ(0, stream.Pins());
        EXPECT_EQ(answer == -2 ? 2u : 0u, reports.Take().size());
    }
}

TEST_F(KeyWalk, AConstantIsOneKeyWithoutAnIndex)
{
    TestStream constant({.noKeys = true});
    constant.Key(15, {1.0});
    Visitor visitor;
    T_Time lastTime{77, 77};
    T_Time const early{-99, 600};
    EXPECT_EQ(0, KFS_ForRange(constant, &early, &early, visitor.Word(), Visitor::Visit, &lastTime));
    EXPECT_EQ(15, lastTime.value);
    int lastIndex = 77;
    EXPECT_EQ(0, KFS_ForIndexRange(constant, 5, 9, visitor.Word(), Visitor::Visit, &lastIndex));
    EXPECT_EQ(0, lastIndex);
    EXPECT_EQ((std::vector{15, 15}), visitor.times);
    EXPECT_EQ((std::vector{None, None}), visitor.indices);
}

TEST_F(KeyWalk, NothingToWalkOverIsReported)
{
    TestStream const empty;
    TestStream const unset({.noKeys = true});
    Visitor visitor;
    for (KFS_Stream* const nothing : {empty.get(), unset.get()}) {
        T_Time lastTime{77, 77};
        int lastIndex = 77;
        EXPECT_EQ(7427, KFS_ForRange(nothing, nullptr, nullptr, visitor.Word(), Visitor::Visit, &lastTime));
        EXPECT_REPORT(reports, 34, "attempt to iterate over a time stream with no key values.");
        EXPECT_EQ(7427, KFS_ForIndexRange(nothing, 0, 0, visitor.Word(), Visitor::Visit, &lastIndex));
        EXPECT_REPORT(reports, 35, "attempt to iterate over a time stream with no key values.");
        EXPECT_EQ(None, lastTime.value);
        EXPECT_EQ(0u, lastTime.scale);
        EXPECT_EQ(None, lastIndex);
    }
    T_Time const noScale{0, 0}, fine{0, 600};
    EXPECT_NE(0, KFS_ForRange(stream, &noScale, &fine, visitor.Word(), Visitor::Visit, nullptr));
    EXPECT_NE(0, KFS_ForRange(stream, nullptr, &noScale, visitor.Word(), Visitor::Visit, nullptr));
    EXPECT_TRUE(visitor.times.empty());
}

TEST_F(KeyWalk, TheStreamIsUpToDateWhenTheWalkBegins)
{
    ASSERT_EQ(0, stream->SetInvalid(-1, 3));
    Visitor visitor;
    EXPECT_EQ(0, KFS_ForRange(stream, nullptr, nullptr, visitor.Word(), Visitor::Visit, nullptr));
    EXPECT_EQ(TestStream::NotStale, stream.Stale());
    ASSERT_EQ(0, stream->SetInvalid(-1, 3));
    EXPECT_EQ(0, KFS_ForIndexRange(stream, 0, 2, visitor.Word(), Visitor::Visit, nullptr));
    EXPECT_EQ(TestStream::NotStale, stream.Stale());
}

}  // namespace
