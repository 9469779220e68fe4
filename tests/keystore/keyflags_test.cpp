#include "keystore/keyflags.h"

#include "curves/tangents.h"
#include "keystore/edit_private.h"
#include "tests/support/listening.h"
#include "tests/support/ownedvalues.h"
#include "tests/support/streams.h"

#include <climits>
#include <map>

namespace {

class KeyFlags : public StreamTest {};

constexpr unsigned short C = KFS_KeyFlag_Continuous;
constexpr unsigned short M = KFS_KeyFlag_Modifiable;
constexpr unsigned short F = KFS_KeyFlag_Float;
constexpr unsigned short T = KFS_KeyFlag_TangentsSet;

TEST_F(KeyFlags, ACustomKeyHasFlagsAndKeepsItsValue)
{
    OwnedValues::Scope const owned;
    auto const stream = OwnedValues::MakeStream(false);
    for (int const time : {0, 100}) OwnedValues::InsertKey(stream.get(), time, 5.0, KFS_Interp_Spline);
    OwnedValues::Read(stream.get(), 100);
    ASSERT_EQ(3, OwnedValues::Live()) << "two keys, and the last value that was read";
    ASSERT_EQ(0, KFS_SetKeyFlags(stream.get(), 1, C | M, C | M));
    EXPECT_EQ(2, OwnedValues::Live());
}

TEST_F(KeyFlags, IterationFunctionsSeeToRecordsReadFromAFile)
{
    TestStream stream({.dimension = 2, .spatial = true});
    stream.Key(0, {1, 2}).Key(100, {3, 4});
    SEQ_Head** table = nullptr;
    ASSERT_EQ(0, SEQ_New(0, 8, 4, 1, &table));
    stream.Record(0)->remapTable = table;
    ASSERT_EQ(0, SEQ_ForEach(stream->GetKeys(), 0, KFSp_SetKeySpatialState, 0));
    EXPECT_EQ(0, stream.Record(0)->flags & KFS_KeyFlag_SpatialBlock);
    ASSERT_EQ(0, SEQ_ForEach(stream->GetKeys(), 0, KFSp_KeyClearRemap, 0));
    EXPECT_EQ(table, stream.Record(0)->remapTable) << "without the block the word is none of its business";
    ASSERT_EQ(0, SEQ_ForEach(stream->GetKeys(), KFS_StreamFlag_Spatial, KFSp_SetKeySpatialState, 0));
    EXPECT_NE(0, stream.Record(1)->flags & KFS_KeyFlag_SpatialBlock);
    ASSERT_EQ(0, SEQ_ForEach(stream->GetKeys(), 0, KFSp_KeyClearRemap, 0));
    EXPECT_EQ(nullptr, stream.Record(0)->remapTable);
    EXPECT_EQ(0, SEQ_Dispose(table, 0)) << "forgotten, not disposed";
}

}  // namespace
