#include "keystore/cache_private.h"

#include "keystore/attributes.h"
#include "keystore/cachestate.h"
#include "keystore/lookup.h"
#include "tests/support/ownedvalues.h"
#include "tests/support/streams.h"

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

TEST_F(Cache, WhatIsAskedForIsAllThatIsDone)
{
    TestStream stream;
    stream.Key(0, {2.0}).Key(100, {6.0});
    double value = -1.0;
    unsigned char atKey = 7;
    KFS_GetValueFNoExpr(stream, 50, 1, &value, &atKey, nullptr);
    EXPECT_EQ(-1.0, value) << "keys only, and there is none";
    EXPECT_EQ(0, atKey);
    EXPECT_TRUE(stream.CacheIsEmpty());
    KFS_GetValueFNoExpr(stream, 100, 1, &value, &atKey, nullptr);
    EXPECT_EQ(6.0, value);
    EXPECT_EQ(1, atKey);
    double const overriding = 42.0;
    KFS_GetValueFNoExpr(stream, 100, 0, &value, &atKey, &overriding);
    EXPECT_EQ((std::pair{42.0, 1}), (std::pair{value, int{atKey}})) << "an override takes the place of the keys";
    stream->ValidateCacheAtTime({50, 600});
    EXPECT_EQ(50, stream->GetCache()->time);
    stream->ForceInterpolateAtTime({20, 600});
    EXPECT_EQ(20, stream->GetCache()->time);
    stream.At1(40);
    atKey = 7;
    KFSp_UpdateCacheToTime(stream, stream->GetKeyData(), 100, {.wantsValue = false, .atKey = &atKey});
    EXPECT_EQ(1, atKey);
    EXPECT_EQ(40, stream->GetCache()->time) << "whether a key is there needs no value";
}

TEST_F(Cache, FailedInterpolationLeavesItEmptyAndUnpinned)
{
    TestStream stream;
    stream.Key(0, {2.0}).Key(100, {6.0});
    stream->SetInterpFunc([](KFS_Stream const*, long, int, int) { return 4711; });
    double value = 0.0;
    T_Time const at{50, 600};
    EXPECT_EQ(4711, KFS_GetValueFPlus(stream, &at, 0, &value, nullptr, nullptr));
    EXPECT_TRUE(stream.CacheIsEmpty());
    EXPECT_EQ(0, stream.Pins());
    KFS_InterpFunc own = [](KFS_Stream const* s, long refcon, int, int) {
        *KFSp_Numbers(s->GetCache()) = static_cast<double>(refcon);
        return 0;
    };
    EXPECT_EQ(0, KFS_GetValuePlus(stream, &at, 0, &value, nullptr, nullptr, &own, 31));
    EXPECT_EQ(31.0, value) << "the caller's function with the caller's word";
}

TEST_F(Cache, CustomValuesAreNeverSharedNorArcTables)
{
    OwnedValues::Scope const owned;
    auto const stream = OwnedValues::MakeStream(false, true);
    OwnedValues::InsertKey(stream.get(), 30, 5.0);
    EXPECT_EQ(5.0, OwnedValues::Read(stream.get(), 30));
    void* item = nullptr;
    ASSERT_EQ(0, SEQ_GetAddress(stream->GetKeys(), 0, 0, &item));
    auto* const key = static_cast<KFS_KeyScalar*>(item);
    key->arcLength = 12.5;
    ASSERT_EQ(0, SEQ_New(0, 8, 4, 1, &key->remapTable));
    {
        KFS_StreamKeyData const copy(*stream->GetKeyData(), stream.get());
        EXPECT_EQ(4, OwnedValues::Live());
    }
    SEQ_Head** copies = nullptr;
    ASSERT_EQ(0, SEQ_Duplicate(stream->GetKeys(), 0, &copies));
    void const* copied = nullptr;
    ASSERT_EQ(0, SEQ_GetConstAddress(copies, 0, &copied));
    auto const* const copiedKey = static_cast<KFS_KeyScalar const*>(copied);
    EXPECT_EQ((std::pair{30, 12.5}), (std::pair{copiedKey->time, copiedKey->arcLength}));
    EXPECT_EQ(nullptr, copiedKey->remapTable);
    EXPECT_EQ(0, SEQ_Dispose(copies, 0));
    EXPECT_EQ(5.0, OwnedValues::Read(stream.get(), 30)) << "the copy's end took nothing of the stream's";
}

TEST_F(Cache, AKeyThatCannotBeCopiedLeavesItEmpty)
{
    OwnedValues::Scope const owned;
    auto const stream = OwnedValues::MakeStream(false);
    for (int const time : {0, 100}) OwnedValues::InsertKey(stream.get(), time, time, KFS_Interp_Linear);
    OwnedValues::copyCode = 77;
    for (int const time : {100, -5}) {
        OwnedValues::Ticket out{};
        T_Time const at{time, 600};
        EXPECT_EQ(77, KFS_GetValue(stream.get(), &at, 0, &out, nullptr, nullptr));
        EXPECT_TRUE(KFSp_CacheIsEmpty(stream->GetCache())) << "its value would be disposed though nobody made it";
    }
    OwnedValues::copyCode = 0;
    EXPECT_EQ(100.0, OwnedValues::Read(stream.get(), 100));
}

// ---- renders on temporary clone contexts

TEST_F(Cache, ARenderReadsTheStreamAsItStoodAtTheFirstRead)
{
    TestStream stream({.dimension = 2, .spatial = true});
    stream.Key(0, {0.0, 0.0}).Key(600, {3.0, 4.0}, KFS_Interp_Spline).Key(1200, {9.0, 4.0});
    std::vector<unsigned char> const bytes = stream.Bytes();
    boost::shared_ptr<Q_RenderContext> const render = kfshost::MakeRenderContext(true);
    std::vector<double> seen;
    {
        Q_ScSetCurrentRenderContext const current(render);
        seen = stream.At(450);
        EXPECT_EQ(TestStream::NotStale, stream.ArcStale()) << "worked down on the copy";
        EXPECT_NE(nullptr, stream.Record(0)->remapTable);
    }
    EXPECT_NE(TestStream::NotStale, stream.ArcStale());
    EXPECT_TRUE(stream.CacheIsEmpty());
    EXPECT_EQ(bytes, stream.Bytes());
    stream.Key(600, {30.0, 40.0}, KFS_Interp_Spline);
    Q_ScSetCurrentRenderContext const current(render);
    EXPECT_EQ(seen, stream.At(450));
    static_cast<KFS_StreamCacheState*>(render->PeekState(KFS_StreamCacheState::S_StateName))->FreeCacheData();
    EXPECT_NE(seen, stream.At(450));
}

TEST_F(Cache, AStreamsEndIsItsCopysEnd)
{
    OwnedValues::Scope const owned;
    auto const custom = OwnedValues::MakeStream(false);
    OwnedValues::InsertKey(custom.get(), 0, 5.0);
    Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
    std::unique_ptr<KFS_Stream> clone(custom->CloneLeaf({true, true}));
    EXPECT_EQ(5.0, OwnedValues::Read(clone.get(), 10));
    clone.reset();
    alignas(KFS_Stream) std::byte place[sizeof(KFS_Stream)];
    for (short const dimension : {1, 3}) {  // at one address
        KFS_ValueDesc desc;
        desc.dataType = KFS_Type_Double;
        auto* const stream =
            new (place) KFS_Stream(dimension, 600, 1, 0, KFS_InterpMask_All, 0, desc, nullptr, nullptr, false);
        std::vector<double> const value(static_cast<std::size_t>(dimension), dimension);
        std::vector<double> read(value.size(), -1.0);
        EXPECT_EQ(0, KFS_InsertKeyF(stream, nullptr, 1, value.data(), 0, 0));
        EXPECT_EQ(0, KFS_GetValueFPlus(stream, nullptr, 0, read.data(), nullptr, nullptr));
        EXPECT_EQ(value, read);
        stream->~KFS_Stream();
    }
}

}  // namespace
