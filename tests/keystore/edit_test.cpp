#include "keystore/edit.h"

#include "keystore/edit_private.h"
#include "tests/support/listening.h"
#include "tests/support/streams.h"

namespace {

constexpr char Linear = KFS_Interp_Linear;

class Edit : public StreamTest {};

// ---- which codes are allowed

TEST_F(Edit, TheMaskDecidesAboutCodes)
{
    struct Row {
        unsigned short mask;
        int code;
        bool allowed;
    } const rows[] = {{0, 0, true},       {0, 1, false},      {0x7, 1, true},  {0x7, 2, true},    {0x7, 3, true},
                      {0x7, 4, false},    {0x7, -1, false},   {0xF, -1, true}, {0xF, -128, true}, {0xF, 4, true},
                      {0x4, 1, false},    {0x4, 3, true},     {0x8, 1, false}, {0x8, -5, true},   {0x7, 127, false},
                      {0xFFFF, 16, true}, {0xFFFF, 17, false}};
    for (Row const& row : rows) {
        SCOPED_TRACE(testing::Message() << "mask " << row.mask << " code " << row.code);
        TestStream const stream({.interpMask = row.mask});
        EXPECT_EQ(row.allowed ? 0 : 7431, KFSp_CanDoInterp(stream, static_cast<char>(row.code)));
        std::string const text = "interpolation method not allowed for this stream (" + std::to_string(row.code) + ").";
        EXPECT_EQ(row.allowed ? std::vector<Reported>{} : std::vector{KfsReport(13, text)}, reports.Take());
    }
}

// ---- inserting

TEST_F(Edit, ATimeIsTakenInTheStreamsScale)
{
    double const value = 4.0;
    TestStream const stream;
    for (T_Time const time : {T_Time{1, 2}, T_Time{-1, 1}, T_Time{1, 24000}})
        EXPECT_EQ(0, KFS_InsertKeyF(stream, &time, 0, &value, Linear, Linear));
    EXPECT_EQ(0, KFS_InsertKey(stream, nullptr, 1, &value, Linear, Linear));
    EXPECT_EQ((std::vector<int>{-600, 0, 300}), stream.Times());
    // The sentinel isn't a time that a key could have.
    T_Time const sentinel = stream.Time(KFS_INVALID_INDEX);
    EXPECT_EQ(7430, KFS_InsertKeyF(stream, &sentinel, 0, &value, Linear, Linear));
    EXPECT_REPORT(reports, 17,
                  "attempt to insert a key value into a time stream at a time position not representable in the "
                  "stream time scale.");
}

// ---- insertion from the cache record, the way in for everybody

TEST_F(Edit, AnOverwrittenKeyKeepsItsArcTable)
{
    TestStream stream({.dimension = 2, .spatial = true});
    stream.Key(0, {0, 0}).Key(100, {10, 0});
    ASSERT_EQ(0, SEQ_New(0, 8, 4, 1, &stream.Record(0)->remapTable));
    SEQ_Head** const table = stream.Record(0)->remapTable;
    std::memcpy(static_cast<void*>(stream->GetCache()), stream.Record(0), KFS_KeySpatialHeadSize + 48);
    stream->GetCache()->remapTable = nullptr;
    EXPECT_EQ(0, KFSp_InsertKeyFromCache(1, 1, 1, 0, stream, nullptr));
    EXPECT_EQ(table, stream.Record(0)->remapTable);
}

// ---- setting and removing

TEST_F(Edit, AListenerReadsThePresentCurveAndSpoilsNoRemovedValue)
{
    TestStream stream;
    stream.Key(0, {10}).Key(100, {99}).Key(200, {30});
    HeardRoot root;
    root.Store(stream);
    std::vector<double> read;
    ValueListener listener([&] { read = {stream.At1(100), stream.At1(50)}; });
    double value = 0.0;
    ASSERT_EQ(0, KFS_RemoveKey(stream, 1, &value));
    EXPECT_EQ(99.0, value);
    EXPECT_EQ((std::vector<double>{20, 15}), read);
}

}  // namespace
