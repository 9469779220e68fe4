#include "keystore/cache_private.h"

#include "keystore/attributes.h"
#include "keystore/cachestate.h"
#include "keystore/lookup.h"
#include "tests/support/ownedvalues.h"
#include "tests/support/streams.h"

#include <cstdlib>

namespace {

// Interpolates with the stream's own function and counts.
struct Counting {
    static inline int calls = 0;
    static inline KFS_InterpFunc real = nullptr;
    static int Interpolate(KFS_Stream const* stream, long refcon, int time, int keyIndex)
    {
        ++calls;
        return real(stream, refcon, time, keyIndex);
    }
    static void Install(KFS_Stream* stream)
    {
        calls = 0;
        real = stream->GetInterpFunc();
        stream->SetInterpFunc(Interpolate);
    }
};

class Cache : public StreamTest {};

TEST_F(Cache, AskingTwiceForOneTimeInterpolatesOnce)
{
    TestStream stream;
    stream.Key(0, {0.0}).Key(100, {1.0});
    Counting::Install(stream);
    EXPECT_DOUBLE_EQ(0.25, stream.At1(25));
    EXPECT_DOUBLE_EQ(0.25, stream.At1(25));
    EXPECT_EQ(1, Counting::calls);
    EXPECT_EQ(25, stream->GetCache()->time);
    stream.Key(50, {9.0});
    EXPECT_TRUE(stream.CacheIsEmpty()) << "an edit leaves nothing to be believed";
    EXPECT_DOUBLE_EQ(4.5, stream.At1(25));
    EXPECT_EQ(2, Counting::calls);
}

TEST_F(Cache, WhichKeyAnswersWithoutACurve)
{
    struct Row {
        char const* why;
        char aOut, bIn;
        int time;
        double value;
        int cacheTime;
    };
    const Row rows[] = {
        {"before the first key, with that key's time", KFS_Interp_Linear, KFS_Interp_Linear, -50, 2.0, 0},
        {"after the last key", KFS_Interp_Linear, KFS_Interp_Linear, 500, 6.0, 100},
        {"a hold on the near side", KFS_Interp_Hold, KFS_Interp_Linear, 50, 2.0, 0},
        {"a hold on both sides", KFS_Interp_Hold, KFS_Interp_Hold, 99, 2.0, 0},
        {"a hold on the far side takes the later value", KFS_Interp_Linear, KFS_Interp_Hold, 1, 6.0, 100},
        {"on a key", KFS_Interp_Linear, KFS_Interp_Linear, 100, 6.0, 100},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.why);
        TestStream stream;
        stream.Key(0, {2.0}, KFS_Interp_Linear, row.aOut).Key(100, {6.0}, row.bIn, KFS_Interp_Linear);
        Counting::Install(stream);
        EXPECT_EQ(row.value, stream.At1(row.time));
        EXPECT_EQ(row.cacheTime, stream->GetCache()->time);
        EXPECT_EQ(0, Counting::calls);
        EXPECT_EQ(0, stream.Pins());
    }
}

TEST_F(Cache, AConstantFollowsTheAskedTime)
{
    const TestStream stream({.noKeys = true});
    const T_Time zero{0, 600};
    const double value = 7.0;
    ASSERT_EQ(0, KFS_InsertKeyF(stream, &zero, 1, &value, 0, 0));
    unsigned char atKey = 0;
    for (const int time : {5, -3, 100000}) {
        KFSp_UpdateStreamCacheToTime(stream, time, 0, &atKey, &atKey, nullptr, 0);
        EXPECT_EQ(time, stream->GetCache()->time);
        EXPECT_EQ(1, atKey);
    }
    stream->ValidateCacheAtTime({1, 2});
    EXPECT_EQ(300, stream->GetCache()->time);
    // The sentinel isn't a time: it would say that the constant has no value.
    KFSp_UpdateStreamCacheToTime(stream, KFS_INVALID_INDEX, 0, &atKey, nullptr, nullptr, 0);
    EXPECT_FALSE(stream->HasNoValue());
    stream->ValidateCacheAtTime({KFS_INVALID_INDEX, 600});
    EXPECT_FALSE(stream->HasNoValue());
}

TEST_F(Cache, KeysOnlyLeavesItEmptyBetweenKeys)
{
    TestStream stream;
    stream.Key(0, {2.0}).Key(100, {6.0});
    double value = -1.0;
    unsigned char atKey = 7;
    KFS_GetValueFNoExpr(stream, 50, 1, &value, &atKey, nullptr);
    EXPECT_EQ(-1.0, value);
    EXPECT_EQ(0, atKey);
    EXPECT_TRUE(stream.CacheIsEmpty());
    KFS_GetValueFNoExpr(stream, 100, 1, &value, &atKey, nullptr);
    EXPECT_EQ(6.0, value);
    EXPECT_EQ(1, atKey);
}

TEST_F(Cache, AskingOnlyForAKeyLeavesTheCacheAlone)
{
    TestStream stream;
    stream.Key(0, {2.0}).Key(100, {6.0});
    stream.At1(40);
    unsigned char atKey = 7;
    KFSp_UpdateStreamCacheToTime(stream, 100, 0, nullptr, &atKey, nullptr, 0);
    EXPECT_EQ(1, atKey);
    EXPECT_EQ(40, stream->GetCache()->time);
}

// A read on a key needs no derived data; a read between keys repairs it.
TEST_F(Cache, OnlyReadsThatNeedItRunTheUpdatePass)
{
    TestStream stream;
    stream.Key(0, {0.0}, KFS_Interp_Spline).Key(100, {1.0}, KFS_Interp_Spline).Key(200, {5.0}, KFS_Interp_Spline);
    ASSERT_NE(TestStream::NotStale, stream.Stale());
    stream.At1(100);
    EXPECT_NE(TestStream::NotStale, stream.Stale());
    stream.At1(150);
    EXPECT_EQ(TestStream::NotStale, stream.Stale());
}

int FailingInterpolation(KFS_Stream const*, long, int, int)
{
    return 4711;
}

int RememberRefcon(KFS_Stream const* stream, long refcon, int, int)
{
    *KFSp_Numbers(stream->GetCache()) = static_cast<double>(refcon);
    return 0;
}

TEST_F(Cache, FailedInterpolationLeavesItEmptyAndUnpinned)
{
    TestStream stream;
    stream.Key(0, {2.0}).Key(100, {6.0});
    stream->SetInterpFunc(FailingInterpolation);
    double value = 0.0;
    const T_Time at{50, 600};
    EXPECT_EQ(4711, KFS_GetValueFPlus(stream, &at, 0, &value, nullptr, nullptr));
    EXPECT_TRUE(stream.CacheIsEmpty());
    EXPECT_EQ(0, stream.Pins());
    KFS_InterpFunc own = RememberRefcon;
    EXPECT_EQ(0, KFS_GetValuePlus(stream, &at, 0, &value, nullptr, nullptr, &own, 31));
    EXPECT_EQ(31.0, value) << "the caller's function with the caller's word";
}

// A custom value that owns memory: a block of the heap, copied and freed by the client's functions.
struct Owned {
    static inline int live = 0;
    static int Copy(KFS_Stream const*, long, short, void const* source, void* destination)
    {
        auto* const block = static_cast<int*>(std::malloc(sizeof(int)));
        int const* from = nullptr;
        std::memcpy(&from, source, sizeof from);
        *block = *from;
        std::memcpy(destination, &block, sizeof block);
        ++live;
        return 0;
    }
    static int Dispose(KFS_Stream const* stream, long, short, void* block)
    {
        EXPECT_EQ(KFS_StreamValidStamp, stream->GetStamp())
            << "a stream that dies is whole until its values are given back";
        int* held = nullptr;
        std::memcpy(&held, block, sizeof held);
        std::free(held);
        --live;
        return 0;
    }
    static int Hold(KFS_Stream const*, long, int, int) { return 0; }
};

TEST_F(Cache, CustomValuesAreNeverShared)
{
    Owned::live = 0;
    {
        KFS_ValueDesc desc;
        desc.isCustom = 1;
        desc.itemSize = sizeof(int*);
        desc.interpFunc = Owned::Hold;
        KFS_Stream stream(1, 600, 0, 0, KFS_InterpMask_Hold, 0, desc, nullptr, nullptr, false);
        ASSERT_EQ(0, KFS_SetCustomFuncs(&stream, Owned::Copy, Owned::Dispose));
        int number = 5;
        int* value = &number;
        const T_Time at{0, 600};
        ASSERT_EQ(0, KFS_InsertKey(&stream, &at, 1, &value, KFS_Interp_Hold, KFS_Interp_Hold));
        int* out = nullptr;
        ASSERT_EQ(0, KFS_GetValue(&stream, &at, 0, &out, nullptr, nullptr));
        EXPECT_EQ(5, *out);
        {
            const KFS_StreamKeyData copy(*stream.GetKeyData(), &stream);
            EXPECT_NE(nullptr, copy.keys);
        }
        EXPECT_EQ(5, *out);
        ASSERT_EQ(0, KFS_DisposeValue(&stream, &out));
        ASSERT_EQ(0, KFS_GetValue(&stream, &at, 0, &out, nullptr, nullptr));
        EXPECT_EQ(5, *out) << "the copy's end took nothing of the stream's";
        ASSERT_EQ(0, KFS_DisposeValue(&stream, &out));
    }
    EXPECT_EQ(0, Owned::live);
}

TEST_F(Cache, AKeyThatCannotBeCopiedLeavesItEmpty)
{
    OwnedValues::Reset();
    {
        const std::unique_ptr<KFS_Stream> stream = OwnedValues::MakeStream(false);
        for (const int time : {0, 100}) {
            const T_Time at{time, 600};
            const OwnedValues::Ticket ticket = OwnedValues::Make(time);
            ASSERT_EQ(0, KFS_InsertKey(stream.get(), &at, 1, &ticket, KFS_Interp_Linear, KFS_Interp_Linear));
            OwnedValues::Free(ticket);
        }
        OwnedValues::Ticket out{};
        const T_Time atKey{100, 600}, before{-5, 600};
        OwnedValues::copyCode = 77;
        for (T_Time const* const at : {&atKey, &before}) {
            EXPECT_EQ(77, KFS_GetValue(stream.get(), at, 0, &out, nullptr, nullptr));
            EXPECT_TRUE(KFSp_CacheIsEmpty(stream->GetCache())) << "its value would be disposed though nobody made it";
        }
        OwnedValues::copyCode = 0;
        ASSERT_EQ(0, KFS_GetValue(stream.get(), &atKey, 0, &out, nullptr, nullptr));
        EXPECT_EQ(100.0, OwnedValues::Value(out));
        OwnedValues::Free(out);
    }
    EXPECT_EQ(0, OwnedValues::Live());
}

// ---- renders on temporary clone contexts

TEST_F(Cache, ARenderReadsItsOwnCopyAndLeavesTheStreamAlone)
{
    TestStream stream({.dimension = 2, .spatial = true});
    stream.Key(0, {0.0, 0.0}, KFS_Interp_Spline)
        .Key(600, {3.0, 4.0}, KFS_Interp_Spline)
        .Key(1200, {9.0, 4.0}, KFS_Interp_Spline);
    const auto stale = stream.Stale();
    const auto arcStale = stream.ArcStale();
    ASSERT_NE(TestStream::NotStale, arcStale);
    const std::vector<unsigned char> bytes = stream.Bytes();
    const boost::shared_ptr<Q_RenderContext> render = kfshost::MakeRenderContext(true);
    std::vector<double> seen;
    {
        const Q_ScSetCurrentRenderContext current(render);
        EXPECT_NE(stream->GetKeyData()->keys, nullptr);
        seen = stream.At(450);
        EXPECT_EQ(TestStream::NotStale, stream.ArcStale()) << "worked down on the copy";
        EXPECT_NE(nullptr, stream.Record(0)->remapTable);
    }
    EXPECT_EQ(stale, stream.Stale());
    EXPECT_EQ(arcStale, stream.ArcStale());
    EXPECT_TRUE(stream.CacheIsEmpty());
    EXPECT_EQ(bytes, stream.Bytes());
    stream.Key(600, {30.0, 40.0}, KFS_Interp_Spline);
    {
        const Q_ScSetCurrentRenderContext current(render);
        EXPECT_EQ(seen, stream.At(450)) << "as it stood at the first read";
        static_cast<KFS_StreamCacheState*>(render->PeekState(KFS_StreamCacheState::S_StateName))->FreeCacheData();
        EXPECT_NE(seen, stream.At(450));
    }
}

TEST_F(Cache, ACopyOwnsItsArcTables)
{
    TestStream stream({.dimension = 3, .spatial = true});
    for (int i = 0; i < 5; ++i) {
        stream.Key(i * 60, {1.0 * i, 2.0 * (i % 2), 0.0}, KFS_Interp_Spline);
    }
    const std::vector<double> before = stream.At(100);
    const Q_MemoryCount live = Q_MemoryLive(nullptr);
    {
        const KFS_StreamKeyData copy(*stream->GetKeyData(), stream);
        void const* item = nullptr;
        ASSERT_EQ(0, SEQ_GetConstAddress(copy.keys, 1, &item));
        auto const* const key = static_cast<KFS_KeyScalar const*>(item);
        EXPECT_NE(nullptr, key->remapTable);
        EXPECT_NE(stream.Record(1)->remapTable, key->remapTable);
    }
    EXPECT_EQ(live, Q_MemoryLive(nullptr));
    stream.At(10);
    EXPECT_EQ(before, stream.At(100));
}

TEST_F(Cache, CopyingKeyDataWithoutMemoryThrows4AndLeaksNothing)
{
    TestStream stream({.dimension = 2, .spatial = true});
    stream.Key(0, {0.0, 0.0}).Key(60, {1.0, 2.0}).Key(120, {5.0, 0.0});
    stream.At(30);
    const std::vector<unsigned char> bytes = stream.Bytes();
    const int failures = FailEveryAllocation([] { return std::make_unique<int>(); },
                                             [&](int&) {
                                                 const KFS_StreamKeyData copy(*stream->GetKeyData(), stream);
                                                 return 0;
                                             },
                                             [&](int&, int code, Q_MemoryCount const& before) {
                                                 EXPECT_EQ(4, code);
                                                 EXPECT_EQ(before, Q_MemoryLive(nullptr));
                                                 EXPECT_EQ(bytes, stream.Bytes());
                                             });
    EXPECT_GE(failures, 4);
}

}  // namespace
