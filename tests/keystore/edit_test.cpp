#include "keystore/edit.h"

#include "curves/segment_private.h"
#include "curves/tangents.h"
#include "keystore/attributes.h"
#include "keystore/edit_private.h"
#include "tests/support/listening.h"
#include "tests/support/streams.h"

#include <climits>
#include <functional>
#include <map>
#include <optional>
#include <random>
#include <tuple>

namespace {

constexpr char None = KFS_Interp_None;
constexpr char Linear = KFS_Interp_Linear;

std::string InterpText(int code)
{
    return "interpolation method not allowed for this stream (" + std::to_string(code) + ").";
}

class Edit : public StreamTest {};

// Without a value, or with the number in all its components.
int Insert(TestStream const& stream, int time, std::optional<double> number, char in, char out, bool replace = false)
{
    T_Time const at = stream.Time(time);
    std::vector<double> const value(static_cast<std::size_t>(stream->GetDimension()), number.value_or(0.0));
    return KFS_InsertKeyF(stream, &at, replace, number ? value.data() : nullptr, in, out);
}

std::pair<char, char> Codes(TestStream const& stream, int index)
{
    return {stream.Record(index)->inInterp, stream.Record(index)->outInterp};
}

// ---- which codes are allowed

TEST_F(Edit, TheMaskDecidesAboutCodes)
{
    struct Row {
        unsigned short mask;
        int code;
        bool allowed;
    };
    Row const rows[] = {{0, 0, true},       {0, 1, false},      {0x7, 1, true},  {0x7, 2, true},    {0x7, 3, true},
                        {0x7, 4, false},    {0x7, -1, false},   {0xF, -1, true}, {0xF, -128, true}, {0xF, 4, true},
                        {0x4, 1, false},    {0x4, 3, true},     {0x8, 1, false}, {0x8, -5, true},   {0x7, 127, false},
                        {0xFFFF, 16, true}, {0xFFFF, 17, false}};
    for (Row const& row : rows) {
        SCOPED_TRACE(testing::Message() << "mask " << row.mask << " code " << row.code);
        TestStream const stream({.interpMask = row.mask});
        EXPECT_EQ(row.allowed ? 0 : 7431, KFSp_CanDoInterp(stream, static_cast<char>(row.code)));
        if (!row.allowed) EXPECT_REPORT(reports, 13, InterpText(row.code));
    }
}

// ---- inserting

TEST_F(Edit, ATimeIsTakenInTheStreamsScale)
{
    double const value = 4.0;
    for (auto const& [time, at] : {std::pair<T_Time, int>{{1, 2}, 300}, {{-1, 1}, -600}, {{1, 24000}, 0}}) {
        TestStream const stream;
        EXPECT_EQ(0, KFS_InsertKeyF(stream, &time, 0, &value, Linear, Linear));
        EXPECT_EQ(std::vector<int>{at}, stream.Times());
    }
    TestStream const stream;
    T_Time const unfit{1, 0};
    EXPECT_NE(0, KFS_InsertKey(stream, &unfit, 0, &value, Linear, Linear));
    EXPECT_EQ(0, KFS_InsertKey(stream, nullptr, 0, &value, Linear, Linear));
    EXPECT_EQ(std::vector<int>{0}, stream.Times());
    // The sentinel isn't a time that a key could have.
    EXPECT_EQ(7430, Insert(stream, KFS_INVALID_INDEX, 4.0, Linear, Linear));
    EXPECT_REPORT(reports, 17,
                  "attempt to insert a key value into a time stream at a time position not representable in the "
                  "stream time scale.");
}

TEST_F(Edit, ValuesComeInTheExternalType)
{
    TestStream stream({.dimension = 2, .type = KFS_Type_Fixed});
    int const halves[2] = {98304, -98304};
    T_Time const at = stream.Time(5);
    ASSERT_EQ(0, KFS_InsertKey(stream, &at, 0, halves, None, None));
    EXPECT_EQ((std::vector{1.5, -1.5}), stream.At(5));
    EXPECT_EQ((std::pair{Linear, Linear}), Codes(stream, 0)) << "nothing to go by is linear";
    double const numbers[2] = {0.25, 0.75};
    ASSERT_EQ(0, KFS_SetKeyF(stream, 0, numbers, None, None));
    std::array<int, 2> out{};
    ASSERT_EQ(0, KFS_RemoveKey(stream, 0, out.data()));
    EXPECT_EQ((std::array{16384, 49152}), out);
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
