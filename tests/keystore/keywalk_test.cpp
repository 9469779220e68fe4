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

}  // namespace
