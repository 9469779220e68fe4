#include "keystore/stream.h"

#include "keystore/attributes.h"
#include "tests/support/streams.h"

namespace {

class Streams : public StreamTest {};

int ConstructionCode(short dimension, bool spatial, unsigned short interpMask, unsigned short spInterpMask,
                     KFS_ValueDesc const& desc)
{
    return KFSp_Boundary(
        [&] { KFS_Stream(dimension, 600, 0, spatial, interpMask, spInterpMask, desc, nullptr, nullptr, false); });
}

KFS_ValueDesc Plain(int type)
{
    return {0, 0, type, nullptr};
}

int NoCopy(KFS_Stream const*, long, short, void const*, void*)
{
    return 0;
}

int HoldFirst(KFS_Stream const*, long, int, int)
{
    return 0;
}

KFS_ValueDesc Custom(unsigned short size)
{
    return {1, size, 42, HoldFirst};
}

TEST_F(Streams, ConstructionSetsWhatItsArgumentsAskFor)
{
    struct Row {
        short dimension;
        bool spatial;
        unsigned short spInterpMask;
        unsigned short flags;
        unsigned short spInterp;
    } const rows[] = {
        {1, false, 8, 0, 0},
        {2, true, 0, 0x2 | 0x4 | 0x8, 0},
        {3, true, 8, 0x2 | 0x4 | 0x8, 3},
        {4, true, 8, 0x2 | 0x4, 0},  // no arc length, and no automatic tangents, above three dimensions
    };
    for (Row const& row : rows) {
        SCOPED_TRACE(row.dimension);
        TestStream const stream({.dimension = row.dimension, .spatial = row.spatial, .spInterpMask = row.spInterpMask});
        EXPECT_EQ(row.flags, stream->GetKFSFlags());
        EXPECT_EQ(row.spInterp, stream->GetSpInterp());
        EXPECT_EQ(nullptr, stream->GetKeys());
        EXPECT_TRUE(stream.CacheIsEmpty());
        EXPECT_EQ(TestStream::NotStale, stream.Stale());
        EXPECT_EQ(TestStream::NotStale, stream.ArcStale());
        EXPECT_EQ(8, stream->GetValueDesc()->itemSize);
        EXPECT_EQ((M_Vector4T<double>{{1.0, 1.0, 1.0, 1.0}}), stream->GetMultiplier());
    }
}

TEST_F(Streams, ConstructionRefusesWhatCannotBe)
{
    KFS_ValueDesc const doubles = Plain(KFS_Type_Double);
    struct Row {
        int code;
        short dimension;
        KFS_ValueDesc desc;
        bool spatial = false;
    } const rows[] = {{7433, 1, Plain(10)},     {7433, 1, Plain(127)},       {7433, -1, doubles},
                      {0, 818, doubles},        {7433, 820, doubles},  // a record of 32808 bytes
                      {0, 1361, doubles, true}, {7433, 1363, doubles, true}, {7433, 1, Custom(40000)}};
    for (Row const& row : rows) EXPECT_EQ(row.code, ConstructionCode(row.dimension, row.spatial, 7, 0, row.desc));
    EXPECT_NO_REPORT(reports);
    // Automatic tangents are code 3, whose permit is the hold bit of the temporal mask.
    EXPECT_EQ(7431, ConstructionCode(2, true, KFS_InterpMask_Linear | KFS_InterpMask_Spline, 8, doubles));
    EXPECT_REPORT(reports, 15, "spatial interpolation method not allowed for this stream (3).");
}

TEST_F(Streams, ConstructionWithoutMemoryThrows4AndLeaksNothing)
{
    int const failures =
        FailEveryAllocation([] { return std::make_unique<int>(); },
                            [](int&) { return ConstructionCode(3, true, 7, 8, Plain(KFS_Type_Double)); },
                            [](int&, int code, Q_MemoryCount const& before) {
                                EXPECT_EQ(4, code);
                                EXPECT_EQ(before, Q_MemoryLive(nullptr));
                            });
    EXPECT_GE(failures, 1);
}

TEST_F(Streams, ADescriptionFollowsItsDataType)
{
    TestStream const stream;
    int const sizes[] = {1, 1, 2, 2, 4, 4, 4, 4, 4, 8};
    for (int type = 0; type <= 9; ++type) {
        KFS_ValueDesc const desc = Plain(type);
        ASSERT_EQ(0, KFS_SetValueDescription(stream, &desc, nullptr));
        EXPECT_EQ(sizes[type], stream->GetValueDesc()->itemSize) << type;
    }
    KFS_ValueDesc old;
    KFS_ValueDesc const bad = Plain(10);
    EXPECT_EQ(7433, KFS_SetValueDescription(stream, &bad, &old));
    EXPECT_EQ(KFS_Type_Double, old.dataType & 0xFF);
    EXPECT_EQ(KFS_Type_Double, stream->GetValueDesc()->dataType & 0xFF) << "a refused description changes nothing";
    EXPECT_EQ(0, KFS_SetValueDescription(stream, nullptr, nullptr));
    EXPECT_NO_REPORT(reports);
    // A negative data type is the word for taking the item functions away.
    stream.get()->SetCopyItemFunc(NoCopy);
    KFS_ValueDesc const negative = Plain(0x80);
    EXPECT_EQ(0, KFS_SetValueDescription(stream, &negative, nullptr));
    EXPECT_EQ(nullptr, stream->GetCopyItemFunc());
    EXPECT_EQ(8, stream->GetValueDesc()->itemSize) << "the size stays what it was";
}

TEST_F(Streams, ACustomStreamIsPlainOnlyForAWhile)
{
    KFS_Stream stream(1, 600, 0, 0, KFS_InterpMask_Hold, 0, Custom(16), nullptr, nullptr, false);
    EXPECT_EQ(HoldFirst, stream.GetInterpFunc());
    EXPECT_NE(nullptr, stream.GetCopyItemFunc()) << "bytes are copied where the client has no function";
    EXPECT_EQ(42, stream.GetItemRefcon());
    KFS_ValueDesc const plain = Plain(KFS_Type_Double);
    KFS_ValueDesc custom;
    ASSERT_EQ(0, KFS_SetValueDescription(&stream, &plain, &custom));
    EXPECT_TRUE(stream.IsTemporarilyNonCustom());
    EXPECT_FALSE(stream.IsCustom());
    EXPECT_EQ(0, stream.GetItemRefcon());
    ASSERT_EQ(0, KFS_SetValueDescription(&stream, &custom, nullptr));
    EXPECT_FALSE(stream.IsTemporarilyNonCustom());
    EXPECT_EQ(16, stream.GetValueDesc()->itemSize);
    EXPECT_EQ(42, stream.GetValueDesc()->dataType);
    stream.SetCopyItemFunc(NoCopy);
    ASSERT_EQ(0, KFS_SetValueDescription(&stream, &custom, nullptr));
    EXPECT_EQ(NoCopy, stream.GetCopyItemFunc()) << "the client's function stays";
}

TEST_F(Streams, QuietTokensNest)
{
    TestStream const stream;
    {
        KFS_Stream::QuietExpressionErrorToken const outer(stream);
        {
            KFS_Stream::QuietExpressionErrorToken const inner(stream);
        }
        EXPECT_TRUE(stream->ExpressionErrorsAreQuiet());
    }
    EXPECT_FALSE(stream->ExpressionErrorsAreQuiet());
}

TEST_F(Streams, TheNumberOfKeysOfAConstantIsOneLess)
{
    TestStream constant({.noKeys = true});
    EXPECT_EQ(0, constant->GetKeyCount());
    EXPECT_TRUE(constant->HasNoValue());
    constant.Key(0, {3.0});
    EXPECT_EQ(-1, constant->GetKeyCount());
    EXPECT_FALSE(constant->HasNoValue());
}

}  // namespace
