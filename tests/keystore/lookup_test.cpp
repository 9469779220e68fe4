#include "keystore/lookup.h"

#include "frame/services/context.h"
#include "frame/statics_private.h"
#include "keystore/items.h"
#include "tests/support/streams.h"

#include <array>
#include <cstring>
#include <stdexcept>

// Questions about keys, beyond what the leaf's twin is asked.

namespace {

class Lookup : public StreamTest {};

TEST_F(Lookup, NullTimeIsTheOriginAndAnswersMayBeNull)
{
    TestStream stream({.dimension = 3, .type = KFS_Type_S16});
    for (int const time : {-10, 0, 10}) stream.Key(time, {-1.5, 2.25, 40000.0});
    int index = 77;
    EXPECT_EQ(0, KFS_TimeToIndex(stream, nullptr, &index));
    EXPECT_EQ(1, index);
    EXPECT_EQ(0, KFS_GetKeyIndex(stream, nullptr, &index, nullptr));
    EXPECT_EQ(1, index);
    EXPECT_EQ(0, KFS_FindNearestKeyTime(stream, nullptr, nullptr, nullptr));
    EXPECT_EQ(0, KFS_FindKeyTime(stream, nullptr, 0, nullptr, &index, nullptr));
    EXPECT_EQ(2, index);
    EXPECT_EQ(0, KFS_GetKey(stream, 1, nullptr, nullptr, nullptr));
    // -1 names the last key.
    std::array<short, 4> value{77, 77, 77, 77};
    T_Time time{77, 77};
    EXPECT_EQ(0, KFS_GetKey(stream, -1, value.data(), nullptr, nullptr));
    EXPECT_EQ((std::array<short, 4>{-2, 2, 40000 - 65536, 77}), value) << "halves away from zero, nothing is clamped";
    char in = 77;
    EXPECT_EQ(SEQ_Err_BadIndex, KFS_GetKey(stream, 3, value.data(), &in, nullptr));
    EXPECT_EQ(KFS_Interp_None, in);
    EXPECT_EQ(0, KFS_IndexToTime(stream, -1, &time));
    EXPECT_EQ(10, time.value);
    EXPECT_EQ(0, stream.Pins());
}

TEST_F(Lookup, ATimeThatDoesNotFitIsRefusedWithoutAReport)
{
    TestStream stream;
    stream.Key(10, {10}).Key(20, {20});
    for (auto const& [bad, code] :
         {std::pair<T_Time, int>{{2000000000, 1}, T_Err_Overflow}, {{KFS_INVALID_INDEX, 0}, T_Err_Scale}}) {
        std::array indices{77, 77, 77, 77};
        unsigned char found = 77;
        T_Time time{77, 77};
        EXPECT_EQ(code, KFS_FindNearestKeyTime(stream, &bad, &indices[0], &time));
        EXPECT_EQ(code, KFS_TimeToIndex(stream, &bad, &indices[1]));
        EXPECT_EQ(code, KFS_GetKeyIndex(stream, &bad, &indices[2], &found));
        EXPECT_EQ(code, KFS_FindKeyTime(stream, &bad, 0, &found, &indices[3], &time));
        double value = 0.0;
        EXPECT_EQ(code, KFS_GetValueFPlus(stream, &bad, 0, &value, nullptr, nullptr));
        EXPECT_EQ(code, KFS_InsertKey(stream, &bad, 0, &value, KFS_Interp_Linear, KFS_Interp_Linear));
        for (int const index : indices) EXPECT_EQ(KFS_INVALID_INDEX, index);
        EXPECT_EQ((std::array{0, KFS_INVALID_INDEX, 0}), (std::array{int{found}, time.value, int(time.scale)}));
    }
    EXPECT_NO_REPORT(reports);
}

// A key whose flag says so has its value behind the short head, on a spatial stream too.
TEST_F(Lookup, TheRecordSaysWhereItsValueIs)
{
    TestStream stream({.dimension = 2, .spatial = true});
    stream.Key(0, {3.0, 4.0});
    KFS_KeyScalar* const key = stream.Record(0);
    key->flags = static_cast<unsigned short>(key->flags & ~KFS_KeyFlag_SpatialBlock);
    KFSp_Numbers(key)[0] = 8.0;
    KFSp_Numbers(key)[1] = 9.0;
    std::array<double, 2> numbers{};
    EXPECT_EQ(0, KFS_GetKeyF(stream, 0, numbers.data(), nullptr, nullptr));
    EXPECT_EQ((std::array{8.0, 9.0}), numbers);
    key->flags |= KFS_KeyFlag_SpatialBlock;
    key->remapTable = nullptr;
}

long lastRefcon;
short lastKind;

int RememberingCopy(KFS_Stream const* stream, long refcon, short kind, void const* source, void* destination)
{
    lastRefcon = refcon;
    lastKind = kind;
    std::memcpy(destination, source, stream->GetValueDesc()->itemSize);
    return refcon < 0 ? 4711 : 0;
}

TEST_F(Lookup, ACustomValueGoesThroughTheClientsFunctionAndNeverAsDoubles)
{
    for (bool const noKeys : {false, true}) {
        for (long const word : {42L, -42L}) {
            KFS_ValueDesc desc{1, 8, word, [](KFS_Stream const*, long, int, int) { return 0; }};
            KFS_Stream stream(1, 600, noKeys, 0, KFS_InterpMask_Hold, 0, desc, nullptr, nullptr, false);
            long const stored = 0x1122334455667788;
            ASSERT_EQ(0, KFS_InsertKey(&stream, nullptr, 1, &stored, KFS_Interp_Hold, KFS_Interp_Hold));
            for (KFS_CopyItemFunc const function : {KFS_CopyItemFunc(RememberingCopy), KFS_CopyItemFunc(nullptr)}) {
                stream.SetCopyItemFunc(function);  // without one the bytes are copied
                long value = 0;
                char in = 77;
                EXPECT_EQ(function && word < 0 ? 4711 : 0, KFS_GetKey(&stream, 0, &value, &in, nullptr));
                EXPECT_EQ(stored, value);
                EXPECT_EQ(KFS_Interp_Hold, in) << "also where the copy fails";
            }
            EXPECT_EQ(word, lastRefcon);
            EXPECT_EQ(noKeys ? KFS_Item_CacheValue : KFS_Item_KeyValue, lastKind);
            double number = 77.0;
            EXPECT_EQ(7441, KFS_GetKeyF(&stream, 99, &number, nullptr, nullptr)) << "before the index is looked at";
            EXPECT_EQ(77.0, number);
            EXPECT_REPORT(reports, 115, "can#{rsquo}t compute floating point value(s) for a custom value");
            EXPECT_EQ(0, KFS_GetKeyF(&stream, 0, nullptr, nullptr, nullptr)) << "the codes are no value";
        }
    }
}

// ---- walks

// Writes down the keys that it is handed and stops at one of them.
struct Visitor {
    std::vector<int> times;
    std::vector<int> indices;
    int stopAt = KFS_INVALID_INDEX;
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

// Ranges of times are the twin's matter.
TEST_F(Lookup, WalksTheKeysOfARangeOfIndices)
{
    TestStream stream, constant({.noKeys = true});
    stream.Key(10, {1.0}).Key(20, {2.0}).Key(30, {3.0});
    constant.Key(15, {1.0});
    struct Row {
        KFS_Stream* stream;
        int first, last, code;
        std::vector<int> times;
        int lastIndex;
    } const rows[] = {
        {stream, 0, 2, 0, {10, 20, 30}, 2},
        {stream, 2, 0, 0, {30, 20, 10}, 0},
        {stream, 1, 1, 0, {20}, 1},
        {stream, 0, 3, SEQ_Err_BadIndex, {}, KFS_INVALID_INDEX},
        {stream, -1, 1, SEQ_Err_BadIndex, {}, KFS_INVALID_INDEX},
        {constant, 5, 9, 0, {15}, 0},
    };
    for (Row const& row : rows) {
        SCOPED_TRACE(testing::Message() << row.first << " to " << row.last);
        Visitor visitor;
        int lastIndex = 77;
        EXPECT_EQ(row.code,
                  KFS_ForIndexRange(row.stream, row.first, row.last, visitor.Word(), Visitor::Visit, &lastIndex));
        EXPECT_EQ(row.times, visitor.times);
        EXPECT_EQ(row.lastIndex, lastIndex);
        if (row.stream == constant) EXPECT_EQ(std::vector{KFS_INVALID_INDEX}, visitor.indices);
    }
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

// ---- what a look-up brings up to date

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
    EXPECT_EQ(KFS_INVALID_INDEX, At(333));
    EXPECT_TRUE(IsStale());
    EXPECT_EQ(1, *level);
    *level = 0;
    EXPECT_EQ(KFS_INVALID_INDEX, At(333));
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
            EXPECT_EQ(time == 300 ? 3 : KFS_INVALID_INDEX, index);
            EXPECT_EQ(0, *KFSp_GetTimeToIndexCheck());
            EXPECT_EQ(0, stream.Pins());
            failures += time == 333 ? code != 0 : fired;
        }
        EXPECT_GT(failures, 0);
    }
}

}  // namespace
