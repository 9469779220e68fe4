#include "curves/spacetangents.h"

#include "curves/spacetangents_private.h"
#include "frame/errors.h"
#include "tests/curves/pathstream.h"

#include <limits>

namespace {

using SpaceTangents = StreamTest;
using SpatialFlags = StreamTest;

TEST_F(SpaceTangents, AreConvertedFromTheExternalType)
{
    PathStream stream({{0, {0, 0}}, {100, {5, 5}}}, KFS_Interp_Linear,
                      {.dimension = 2, .spatial = true, .type = KFS_Type_S16});
    stream.Record(0)->spFlags = 0;
    short const given[2] = {-7, 300};
    ASSERT_EQ(0, KFS_SetKeySpaceTangents(stream, 0, 0, nullptr, given));
    double const exact[2] = {0.25, -0.75};
    ASSERT_EQ(0, KFS_SetKeySpaceTangentsF(stream, 0, 0, exact, nullptr));
    Vector in(2), out(2);
    ASSERT_EQ(0, KFS_GetKeySpaceTangentsF(stream, 0, 0, in.data(), out.data()));
    EXPECT_EQ((Vector{-7, 300}), out);
    EXPECT_EQ((Vector{0.25, -0.75}), in);
    EXPECT_EQ(KFS_Type_S16, stream->GetValueDesc()->dataType & 0xFF);
    EXPECT_EQ(nullptr, stream->GetCopyItemFunc());
}

TEST_F(SpaceTangents, CountAsEditedWhenTheCopyFails)
{
    PathStream stream({{0, {0, 0}}, {100, {5, 5}}, {200, {9, 0}}});
    stream.Flag(1, KFS_KeyFlag_TangentsSet, false);
    stream.Record(1)->spFlags = KFS_KeySpFlag_Modifiable;
    stream->SetCopyItemFunc([](KFS_Stream const*, long, short, void const*, void*) { return 4711; });
    double const given[2] = {1, 2};
    EXPECT_EQ(4711, KFS_SetKeySpaceTangents(stream, 1, 0, given, given));
    stream->SetCopyItemFunc(nullptr);
    EXPECT_NE(0, stream.Record(1)->flags & KFS_KeyFlag_TangentsSet);
    EXPECT_EQ(0U, stream.Record(1)->spFlags);
    EXPECT_EQ((std::array<int, 2>{0, 2}), stream.ArcStale());
    EXPECT_EQ(0, stream.Pins());
}

TEST_F(SpatialFlags, OfAConstantAreReadAsItsKeyFlags)
{
    TestStream stream({.dimension = 2, .noKeys = true, .spatial = true});
    stream.Key(0, {3, 4});
    ASSERT_EQ(0, KFS_SetKeySpFlags(stream, 5, 3, 2));
    EXPECT_EQ(2U, stream->GetCache()->spFlags);
    EXPECT_FALSE(stream.CacheIsEmpty());  // the record is the value
    unsigned int flags = 0;
    ASSERT_EQ(0, KFS_GetKeySpFlags(stream, 0, &flags));
    EXPECT_EQ(stream->GetCache()->flags, flags);
    EXPECT_NE(2U, flags);
}

TEST_F(SpatialFlags, OfABadIndexAreTheMarksResultAndARecordWithoutThemStays)
{
    PathStream stream({{0, {0, 0}}, {100, {1, 1}}});
    EXPECT_EQ(0, KFS_SetKeySpFlags(stream, 9, KFS_KeySpFlag_Modifiable, 0));
    EXPECT_EQ(SEQ_Err_BadIndex, KFS_SetKeySpFlags(stream, 9, KFS_KeySpFlag_Continuous, 0));
    EXPECT_EQ(SEQ_Err_BadIndex, KFSp_SetKeySpaceFlags(stream, 1, 9));
    unsigned int flags = 0;
    for (int const index : {9, -1}) EXPECT_EQ(SEQ_Err_BadIndex, KFS_GetKeySpFlags(stream, index, &flags));
    EXPECT_EQ(0, stream.Pins());

    KeyedStream plain = MakeKeyed({{0, 1}, {100, 2}}, KFS_Interp_Linear);
    std::vector<unsigned char> const before = plain.Bytes();
    EXPECT_EQ(0, KFSp_SetKeySpaceFlags(plain, 3, 0));
    EXPECT_EQ(0, KFS_SetKeySpFlags(plain, 0, 3, 3));
    EXPECT_EQ(before, plain.Bytes());
}

}  // namespace
