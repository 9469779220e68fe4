#include "keystore/edit.h"

#include "curves/segment_private.h"
#include "curves/tangents.h"
#include "keystore/attributes.h"
#include "keystore/edit_private.h"
#include "tests/support/listening.h"
#include "tests/support/streams.h"

#include <cmath>
#include <map>
#include <optional>
#include <random>

namespace {

constexpr char None = KFS_Interp_None;
constexpr char Linear = KFS_Interp_Linear;
constexpr char Spline = KFS_Interp_Spline;
constexpr char Hold = KFS_Interp_Hold;

char const* const OverwriteText = "attempt to overwrite an already existing time stream key value.";

std::string InterpText(int code)
{
    return "interpolation method not allowed for this stream (" + std::to_string(code) + ").";
}

std::string NoKeysText(std::string const& action)
{
    return "attempt to " + action + " a time stream with no key values.";
}

class Edit : public StreamTest {};

// Without a value, with one in external form, or with doubles.
int Insert(TestStream const& stream, int time, std::optional<double> value, char in, char out, bool replace = false)
{
    T_Time const at = stream.Time(time);
    return KFS_InsertKeyF(stream, &at, replace, value ? &*value : nullptr, in, out);
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
        if (row.allowed) {
            EXPECT_NO_REPORT(reports);
        } else {
            EXPECT_REPORT(reports, 13, InterpText(row.code));
        }
    }
}

TEST_F(Edit, ARefusedCodeChangesNothing)
{
    TestStream stream({.interpMask = KFS_InterpMask_Linear});
    stream.Key(10, {1});
    auto const before = stream.Bytes();
    for (auto const& [in, out] : {std::pair{Spline, Linear}, std::pair{Linear, Hold}}) {
        EXPECT_EQ(7431, Insert(stream, 20, 2.0, in, out));
        EXPECT_REPORT(reports, 13, InterpText(in == Linear ? out : in));
        EXPECT_EQ(7431, Insert(stream, 10, 2.0, in, out, true)) << "at the key, too";
        EXPECT_REPORT(reports, 13, InterpText(in == Linear ? out : in));
        EXPECT_EQ(7431, KFS_SetKey(stream, 0, nullptr, in, out));
        EXPECT_REPORT(reports, 13, InterpText(in == Linear ? out : in));
    }
    EXPECT_EQ(before, stream.Bytes());
}

// ---- what a new key takes from its neighbours

TEST_F(Edit, NeighboursProposeCodes)
{
    struct Row {
        char const* why;
        char aOut, bIn;  // keys at 10 and 20; the sides that face away are linear
        int time;
        char in, out;
    };
    Row const rows[] = {
        {"at the first key", Hold, Linear, 10, Linear, Hold},
        {"at the last key", Spline, Spline, 20, Spline, Linear},
        {"before the first", Spline, Hold, 5, Linear, Linear},
        {"after the last", Spline, Hold, 25, Linear, Linear},
        {"both linear", Linear, Linear, 15, Linear, Linear},
        {"both spline", Spline, Spline, 15, Spline, Spline},
        {"spline and linear", Spline, Linear, 15, Spline, Spline},
        {"linear and spline", Linear, Spline, 15, Spline, Spline},
        {"a hold, then linear", Hold, Linear, 15, Hold, Hold},
        {"linear, then a hold", Linear, Hold, 15, Linear, Hold},
        {"a hold, then a spline", Hold, Spline, 15, Spline, Spline},
        {"a spline, then a hold", Spline, Hold, 15, Spline, Spline},
        {"both hold", Hold, Hold, 15, Hold, Hold},
    };
    for (Row const& row : rows) {
        SCOPED_TRACE(row.why);
        TestStream stream;
        stream.Key(10, {1}, Linear, row.aOut).Key(20, {2}, row.bIn, Linear);
        // The question's scale makes no difference.
        for (unsigned int const finer : {1U, 7U}) {
            T_Time const at{row.time * static_cast<int>(finer), 600 * finer};
            char in = 77;
            char out = 77;
            EXPECT_EQ(0, KFS_ChooseInterps(stream, &at, &in, &out));
            EXPECT_EQ(row.in, in);
            EXPECT_EQ(row.out, out);
        }
        EXPECT_EQ(0, stream.Pins());
        if (row.time != 10 && row.time != 20) {
            ASSERT_EQ(0, Insert(stream, row.time, 5.0, None, None));
            int const index = row.time < 10 ? 0 : row.time > 20 ? 2 : 1;
            EXPECT_EQ((std::pair{row.in, row.out}), Codes(stream, index)) << "and an insertion takes them";
        }
    }
}

TEST_F(Edit, FlagsAreProposedWhereTheNeighboursAgree)
{
    TestStream stream({.dimension = 2, .spatial = true});
    stream.Key(10, {0, 0}).Key(20, {1, 1});
    constexpr unsigned short all = KFS_KeyFlag_Continuous | KFS_KeyFlag_Modifiable;
    stream.Record(0)->flags |= all;
    stream.Record(1)->flags |= KFS_KeyFlag_Modifiable;
    stream.Record(0)->spFlags = KFS_KeySpFlag_Continuous;
    stream.Record(1)->spFlags = KFS_KeySpFlag_Continuous | KFS_KeySpFlag_Modifiable;
    struct Row {
        int time;
        unsigned short flags;
        unsigned int spFlags;
    };
    for (Row const& row :
         {Row{10, all, KFS_KeySpFlag_Continuous}, Row{5, all, KFS_KeySpFlag_Continuous},
          Row{15, KFS_KeyFlag_Modifiable, KFS_KeySpFlag_Continuous}, Row{25, KFS_KeyFlag_Modifiable, 3}}) {
        T_Time const at = stream.Time(row.time);
        unsigned short flags = 0xFFFF;
        unsigned int spFlags = 77;
        EXPECT_EQ(0, KFSp_ChooseInterpsAndFlags(stream, &at, nullptr, nullptr, &flags, &spFlags));
        EXPECT_EQ(row.flags, flags & all) << row.time;
        EXPECT_EQ(row.spFlags, spFlags) << row.time;
    }
    TestStream empty({.dimension = 2, .spatial = true});
    unsigned short flags = 77;
    unsigned int spFlags = 77;
    char in = 77;
    char out = 77;
    EXPECT_EQ(0, KFSp_ChooseInterpsAndFlags(empty, nullptr, &in, &out, &flags, &spFlags));
    EXPECT_EQ(0, in + out + flags);
    EXPECT_EQ(77U, spFlags) << "no record was read";
    T_Time const unfit{1, 0};
    EXPECT_NE(0, KFSp_ChooseInterpsAndFlags(stream, &unfit, &in, &out, &flags, &spFlags));
    EXPECT_EQ(0, in + out + flags);
    EXPECT_EQ(77U, spFlags);
}

TEST_F(Edit, AConstantProposesItsOwnCodes)
{
    TestStream stream({.noKeys = true});
    char in = 77;
    char out = 77;
    EXPECT_EQ(0, KFS_ChooseInterps(stream, nullptr, &in, &out));
    EXPECT_EQ(0, in + out);
    ASSERT_EQ(0, Insert(stream, 0, 5.0, Linear, Hold));
    EXPECT_EQ(0, KFS_ChooseInterps(stream, nullptr, &in, &out));
    EXPECT_EQ(Linear, in);
    EXPECT_EQ(Hold, out);
}

// ---- inserting

TEST_F(Edit, ATimeIsTakenInTheStreamsScale)
{
    struct Row {
        T_Time time;
        int code;
        int at;
    };
    for (Row const& row : {Row{{1, 2}, 0, 300}, Row{{-1, 1}, 0, -600}, Row{{1, 24000}, 0, 0}, Row{{7, 600}, 0, 7}}) {
        TestStream stream;
        double const value = 4.0;
        EXPECT_EQ(row.code, KFS_InsertKeyF(stream, &row.time, 0, &value, Linear, Linear));
        EXPECT_EQ(std::vector<int>{row.at}, stream.Times());
    }
    TestStream stream;
    double const value = 4.0;
    T_Time const unfit{1, 0};
    EXPECT_NE(0, KFS_InsertKey(stream, &unfit, 0, &value, Linear, Linear));
    EXPECT_EQ(0, KFS_InsertKey(stream, nullptr, 0, &value, Linear, Linear));
    EXPECT_EQ(std::vector<int>{0}, stream.Times());
    // The sentinel isn't a time that a key could have.
    T_Time const sentinel{KFS_INVALID_INDEX, 600};
    EXPECT_EQ(7430, KFS_InsertKey(stream, &sentinel, 0, &value, Linear, Linear));
    EXPECT_REPORT(reports, 17,
                  "attempt to insert a key value into a time stream at a time position not representable in the "
                  "stream time scale.");
}

TEST_F(Edit, AKeyIsReplacedOnlyOnDemand)
{
    for (signed char const type : {KFS_Type_Double, KFS_Type_Float}) {
        TestStream stream({.type = type});
        stream.Key(10, {1}).Key(20, {2}, Spline).Key(30, {3});
        auto const before = stream.Bytes();
        EXPECT_EQ(7425, Insert(stream, 20, 9.0, Linear, Linear));
        EXPECT_REPORT(reports, 17, OverwriteText);
        EXPECT_EQ(before, stream.Bytes());
        EXPECT_EQ(0, Insert(stream, 20, 9.0, None, Hold, true));
        EXPECT_EQ((std::vector<int>{10, 20, 30}), stream.Times());
        EXPECT_EQ(9.0, stream.Numbers(1)[0]);
        EXPECT_EQ((std::pair{Spline, Hold}), Codes(stream, 1)) << "0 leaves a code";
        EXPECT_TRUE(stream.CacheIsEmpty());
        EXPECT_EQ(type, stream->GetValueDesc()->dataType) << "the description is itself again";
        EXPECT_EQ(nullptr, stream->GetCopyItemFunc());
    }
}

TEST_F(Edit, ValuesComeInTheExternalType)
{
    TestStream stream({.dimension = 2, .type = KFS_Type_Fixed});
    int const halves[2] = {98304, -98304};
    T_Time const at = stream.Time(5);
    ASSERT_EQ(0, KFS_InsertKey(stream, &at, 0, halves, None, None));
    EXPECT_EQ(1.5, stream.Numbers(0)[0]);
    EXPECT_EQ(-1.5, stream.Numbers(0)[1]);
    EXPECT_EQ((std::pair{Linear, Linear}), Codes(stream, 0)) << "nothing to go by is linear";
    double const numbers[2] = {0.25, 0.75};
    ASSERT_EQ(0, KFS_SetKeyF(stream, 0, numbers, None, None));
    int out[2] = {};
    ASSERT_EQ(0, KFS_RemoveKey(stream, 0, out));
    EXPECT_EQ(16384, out[0]);
    EXPECT_EQ(49152, out[1]);
}

// A second edit must not find anything that the first left in the record.
TEST_F(Edit, ANewKeyTakesNothingFromTheRecordBefore)
{
    TestStream used;
    used.Key(0, {1}, Spline).Key(1200, {-7}, Spline).Key(600, {50}, Spline);
    ASSERT_NE(0.0, used.Numbers(1)[1]);
    used.At1(900);
    ASSERT_EQ(0, KFS_RemoveKey(used, 2, nullptr));
    ASSERT_EQ(0, KFS_RemoveKey(used, 1, nullptr));
    ASSERT_EQ(0, KFS_RemoveKey(used, 0, nullptr));
    used.Key(0, {3}, Spline);
    TestStream fresh;
    fresh.Key(0, {3}, Spline);
    EXPECT_EQ(fresh.Bytes(), used.Bytes());
    ASSERT_EQ(0, KFS_RemoveKey(used, 0, nullptr));
    ASSERT_EQ(0, Insert(used, 5, std::nullopt, None, None));
    EXPECT_EQ((std::vector<double>{0, 0, 0, 0, 0}), used.Numbers(0)) << "no value anywhere";
}

TEST_F(Edit, ASplineKeyWithAValueGetsDefaultHandles)
{
    TestStream stream;
    stream.Key(0, {0}).Key(1200, {10}).Key(600, {8}, Spline);
    EXPECT_EQ((std::vector<double>{8, 5, KFSp_OneSixth, 5, KFSp_OneSixth}), stream.Numbers(1))
        << "the slope from the key before to the key after, value units a second";
    EXPECT_NE(0, stream.Record(1)->flags & KFS_KeyFlag_Continuous);
    EXPECT_EQ((std::pair{Linear, Linear}), Codes(stream, 0)) << "the neighbours stay";
}

TEST_F(Edit, AKeyWithoutAValueKeepsTheCurve)
{
    struct Row {
        char const* why;
        char aOut, bIn;
        char in, out;  // asked for
    };
    Row const rows[] = {{"splines", Spline, Spline, None, None},
                        {"a spline and a line", Spline, Linear, None, None},
                        {"a line and a spline", Linear, Spline, None, None},
                        {"lines", Linear, Linear, None, None},
                        {"lines made splines", Linear, Linear, Spline, Spline},
                        {"holds", Hold, Hold, None, None}};
    for (Row const& row : rows) {
        SCOPED_TRACE(row.why);
        for (int const time : {150, 300, 601, 1199}) {
            TestStream stream({.dimension = 2});
            stream.Key(0, {0, 5}, Spline, row.aOut).Key(1200, {10, -3}, row.bIn, Spline).Key(1800, {4, 4}, Spline);
            std::map<int, std::vector<double>> before;
            for (int t = -60; t <= 1860; t += 60) {
                before[t] = stream.At(t);
            }
            before[time] = stream.At(time);
            T_Time const at = stream.Time(time);
            ASSERT_EQ(0, KFS_InsertKey(stream, &at, 0, nullptr, row.in, row.out));
            EXPECT_EQ(4, stream.Count());
            for (auto const& [t, value] : before) {
                for (std::size_t i = 0; i < 2; ++i) {
                    EXPECT_NEAR(value[i], stream.At(t)[i], 1e-6) << "component " << i << " at " << t;
                }
            }
            EXPECT_EQ(0, stream.Pins());
        }
    }
}

TEST_F(Edit, AKeyWithoutAValueTakesTheOneThatIsThere)
{
    struct Row {
        char const* why;
        char aOut, bIn;
        int time;
        char in, out;
        double value;
    };
    // Keys at 0 (value 10) and 1200 (value 20).
    Row const rows[] = {
        {"before the first", Linear, Linear, -100, None, None, 10},
        {"before the first, as a spline", Linear, Linear, -100, Spline, Spline, 10},
        {"after the last", Linear, Linear, 1300, None, None, 20},
        {"after the last, as a spline", Linear, Linear, 1300, Spline, Spline, 20},
        {"on a line", Linear, Linear, 600, Linear, Linear, 15},
        {"on a line, as a hold", Linear, Linear, 600, Hold, Hold, 15},
        {"under a hold", Hold, Linear, 600, None, None, 10},
        {"before a hold", Linear, Hold, 600, None, None, 20},
        {"under a hold, as a spline", Hold, Linear, 600, Spline, Spline, 10},
        {"between a hold and a spline", Hold, Spline, 600, None, None, 10},
        {"between a spline and a hold", Spline, Hold, 600, None, None, 20},
    };
    for (Row const& row : rows) {
        for (bool const warm : {false, true}) {
            SCOPED_TRACE(testing::Message() << row.why << (warm ? ", after a read" : ""));
            TestStream stream;
            stream.Key(0, {10}, Linear, row.aOut).Key(1200, {20}, row.bIn, Linear);
            if (warm) {
                stream.At1(1000);
            }
            EXPECT_EQ(0, Insert(stream, row.time, std::nullopt, row.in, row.out));
            int const index = row.time < 0 ? 0 : row.time > 1200 ? 2 : 1;
            EXPECT_NEAR(row.value, stream.Numbers(index)[0], 1e-9);
            EXPECT_TRUE(stream.CacheIsEmpty());
        }
    }
}

TEST_F(Edit, AKeyWithoutAValueStaysOnThePath)
{
    // With and without tangents of the stream's own making.
    for (unsigned short const spInterpMask : {0, 8}) {
        for (char const code : {Linear, Spline}) {
            for (int const time : {-100, 200, 700, 1700}) {
                SCOPED_TRACE(testing::Message() << "mask " << spInterpMask << " code " << int(code) << " at " << time);
                TestStream stream({.dimension = 2, .spatial = true, .spInterpMask = spInterpMask});
                stream.Key(0, {0, 0}, code).Key(600, {10, 0}, code).Key(1200, {10, 20}, code);
                std::vector<double> const there = stream.At(time);
                T_Time const at = stream.Time(time);
                ASSERT_EQ(0, KFS_InsertKey(stream, &at, 0, nullptr, None, None));
                int const index = time < 0 ? 0 : time / 600 + 1;
                EXPECT_NEAR(there[0], stream.Numbers(index)[0], 1e-6);
                EXPECT_NEAR(there[1], stream.Numbers(index)[1], 1e-6);
            }
        }
    }
}

TEST_F(Edit, InsertionMarksTheNeighbourhood)
{
    TestStream stream({.dimension = 2, .spatial = true});
    for (int i = 0; i < 8; ++i) {
        stream.Key(i * 100, {static_cast<double>(i), 0});
    }
    ASSERT_EQ(0, stream->UpdateStream());
    stream.Key(450, {4, 4});
    EXPECT_EQ((std::array<int, 2>{4, 6}), stream.Stale());
    EXPECT_EQ((std::array<int, 2>{3, 7}), stream.ArcStale());
    ASSERT_EQ(0, stream->UpdateStream());
    ASSERT_EQ(0, KFS_SetKey(stream, 4, nullptr, Hold, None));
    EXPECT_EQ((std::array<int, 2>{2, 5}), stream.Stale());
    EXPECT_EQ((std::array<int, 2>{2, 6}), stream.ArcStale());
    ASSERT_EQ(0, stream->UpdateStream());
    ASSERT_EQ(0, KFS_RemoveKey(stream, 4, nullptr));
    EXPECT_EQ((std::array<int, 2>{3, 4}), stream.Stale());
    EXPECT_EQ((std::array<int, 2>{2, 6}), stream.ArcStale());
    ASSERT_EQ(0, stream->UpdateStream());
    ASSERT_EQ(0, KFS_RemoveKey(stream, 7, nullptr));
    EXPECT_EQ(TestStream::NotStale, stream.Stale()) << "a mark past the end is dropped";
    EXPECT_EQ(6, stream.ArcStale()[1]) << "and no mark reaches past the end";
}

// ---- insertion from the cache record, the way in for everybody

TEST_F(Edit, OverwritingFromTheRecordKeepsWhatIsntGiven)
{
    TestStream stream;
    stream.Key(0, {1}).Key(100, {2}, Spline).Key(200, {3});
    KFS_KeyScalar* const cache = stream->GetCache();
    auto const put = [&](unsigned char overwrite, unsigned char valueGiven, char in, int* index) {
        double const numbers[5] = {77, 1, 0.25, 2, 0.5};
        std::memset(static_cast<void*>(cache), 0, 8);
        cache->time = 100;
        cache->inInterp = in;
        std::memcpy(KFSp_Numbers(cache), numbers, sizeof numbers);
        return KFSp_InsertKeyFromCache(overwrite, valueGiven, 1, 0, stream, index);
    };
    auto const before = stream.Bytes();
    int index = 77;
    EXPECT_EQ(7425, put(0, 1, Linear, &index));
    EXPECT_REPORT(reports, 38, OverwriteText);
    EXPECT_EQ(KFS_INVALID_INDEX, index);
    EXPECT_EQ(before, stream.Bytes());
    EXPECT_EQ(0, stream.Pins());
    EXPECT_TRUE(stream.CacheIsEmpty());

    EXPECT_EQ(0, put(1, 0, Linear, &index));
    EXPECT_EQ(1, index);
    EXPECT_EQ((std::vector<double>{2, 1, 0.25, 2, 0.5}), stream.Numbers(1)) << "the old value under the new handles";
    EXPECT_EQ((std::pair{Linear, Spline}), Codes(stream, 1));
    EXPECT_EQ(0, put(1, 1, None, nullptr));
    EXPECT_EQ(77.0, stream.Numbers(1)[0]);

    // Sides that nobody has ever decided.
    stream.Record(1)->inInterp = None;
    auto const undecided = stream.Bytes();
    EXPECT_EQ(7431, put(1, 0, None, &index));
    EXPECT_REPORT(reports, 38, InterpText(0));
    EXPECT_EQ(undecided, stream.Bytes());
    EXPECT_EQ(0, stream.Pins());
}

TEST_F(Edit, AnUnbalancedUnlockTakesTheCallersPin)
{
    TestStream stream;
    stream.Key(0, {1});
    ASSERT_EQ(0, SEQ_Lock(1, stream->GetKeys()));
    ASSERT_EQ(0, SEQ_Lock(1, stream->GetKeys()));
    stream->GetCache()->time = 0;
    EXPECT_EQ(7425, KFSp_InsertKeyFromCache(0, 1, 1, 0, stream, nullptr));
    EXPECT_REPORT(reports, 38, OverwriteText);
    EXPECT_EQ(1, stream.Pins());
    ASSERT_EQ(0, SEQ_Unlock(stream->GetKeys()));
}

TEST_F(Edit, AnOverwrittenKeyKeepsItsArcTable)
{
    TestStream stream({.dimension = 2, .spatial = true});
    stream.Key(0, {0, 0}).Key(100, {10, 0});
    ASSERT_EQ(0, stream->UpdateStream());
    if (!stream.Record(0)->remapTable) {
        ASSERT_EQ(0, SEQ_New(0, 8, 4, 1, &stream.Record(0)->remapTable));
    }
    SEQ_Head** const table = stream.Record(0)->remapTable;
    std::memcpy(static_cast<void*>(stream->GetCache()), stream.Record(0), KFS_KeySpatialHeadSize + 48);
    stream->GetCache()->remapTable = nullptr;
    EXPECT_EQ(0, KFSp_InsertKeyFromCache(1, 1, 1, 0, stream, nullptr));
    EXPECT_EQ(table, stream.Record(0)->remapTable);
}

// ---- setting and removing

TEST_F(Edit, SetKeyChangesWhatIsGiven)
{
    TestStream stream;
    stream.Key(0, {1}, Spline).Key(100, {2}, Spline);
    stream.Record(1)->flags |= KFS_KeyFlag_Continuous;
    double const value = 9.0;
    ASSERT_EQ(0, KFS_SetKey(stream, 1, &value, None, None));
    EXPECT_EQ(9.0, stream.Numbers(1)[0]);
    EXPECT_EQ((std::pair{Spline, Spline}), Codes(stream, 1));
    ASSERT_EQ(0, KFS_SetKey(stream, 1, nullptr, Linear, None));
    EXPECT_NE(0, stream.Record(1)->flags & KFS_KeyFlag_Continuous) << "one side is a spline still";
    ASSERT_EQ(0, KFS_SetKey(stream, 1, nullptr, None, Linear));
    EXPECT_EQ(0, stream.Record(1)->flags & KFS_KeyFlag_Continuous);
    EXPECT_EQ(9.0, stream.Numbers(1)[0]);
    // An edit empties the record, so the next read at the same time is right.
    EXPECT_EQ(9.0, stream.At1(100));
    ASSERT_EQ(0, Insert(stream, 100, 11.0, None, None, true));
    EXPECT_EQ(11.0, stream.At1(100));

    for (int const bad : {-1, 2, std::numeric_limits<int>::max(), std::numeric_limits<int>::min()}) {
        EXPECT_EQ(SEQ_Err_BadIndex, KFS_SetKey(stream, bad, &value, None, None));
        EXPECT_EQ(SEQ_Err_BadIndex, KFS_RemoveKey(stream, bad, nullptr));
    }
    EXPECT_EQ(2, stream.Count());
    EXPECT_EQ(0, stream.Pins());
}

TEST_F(Edit, NothingIsThereToChange)
{
    double value = 5.0;
    for (bool const noKeys : {false, true}) {
        TestStream stream({.noKeys = noKeys});
        EXPECT_EQ(7427, KFS_SetKey(stream, 0, &value, None, None));
        EXPECT_REPORT(reports, 27, NoKeysText("alter a key value in"));
        EXPECT_EQ(7427, KFS_RemoveKey(stream, 0, &value));
        EXPECT_REPORT(reports, 18, NoKeysText("remove a key value from"));
        EXPECT_EQ(5.0, value);
    }
}

TEST_F(Edit, AConstantIsEditedInPlace)
{
    TestStream stream({.noKeys = true});
    ASSERT_EQ(0, Insert(stream, 40, 5.0, Linear, Linear));
    EXPECT_EQ(5.0, stream.At1(9999));
    EXPECT_EQ(7425, Insert(stream, 40, 6.0, Linear, Linear));
    EXPECT_REPORT(reports, 17, OverwriteText);
    EXPECT_EQ(5.0, stream.At1(0));
    ASSERT_EQ(0, Insert(stream, 0, 6.0, Linear, Linear, true));
    EXPECT_EQ(6.0, stream.At1(0));
    ASSERT_EQ(0, Insert(stream, 0, std::nullopt, Hold, Hold, true));
    EXPECT_EQ(6.0, stream.At1(0)) << "without a value the old one stays";
    double value = 7.0;
    ASSERT_EQ(0, KFS_SetKey(stream, std::numeric_limits<int>::max(), &value, None, None))
        << "the index isn't looked at";
    EXPECT_EQ(7.0, stream.At1(0));
    EXPECT_EQ(TestStream::NotStale, stream.Stale());
    value = 0.0;
    ASSERT_EQ(0, KFS_RemoveKey(stream, 0, &value));
    EXPECT_EQ(7.0, value);
    T_Time const at{0, 600};
    EXPECT_EQ(7427, KFS_GetValueFPlus(stream, &at, 0, &value, nullptr, nullptr));
    EXPECT_REPORT(reports, 36, NoKeysText("get a value from"));
    ASSERT_EQ(0, Insert(stream, 0, 8.0, None, None));
    EXPECT_EQ(8.0, stream.At1(0));
    EXPECT_EQ(nullptr, stream->GetKeys());
}

TEST_F(Edit, ARemovedKeyIsHandedOut)
{
    TestStream stream({.dimension = 2});
    stream.Key(10, {1, 2}).Key(20, {3, 4}, Spline).Key(30, {5, 6});
    double value[2] = {};
    ASSERT_EQ(0, KFS_RemoveKey(stream, 1, value));
    EXPECT_EQ(3.0, value[0]);
    EXPECT_EQ(4.0, value[1]);
    EXPECT_EQ((std::vector<int>{10, 30}), stream.Times());
    EXPECT_TRUE(stream.CacheIsEmpty());
    // Kept in the record it has its time and its handles.
    ASSERT_EQ(0, stream->RemoveKey(1, 1));
    EXPECT_EQ(30, stream->GetCache()->time);
    EXPECT_EQ(6.0, KFSp_Numbers(stream->GetCache())[1]);
    ASSERT_EQ(0, stream->RemoveKey(0, 0));
    EXPECT_EQ(0, stream.Count());
    EXPECT_EQ(TestStream::NotStale, stream.Stale());
    TestStream never;
    EXPECT_EQ(7427, never->RemoveKey(0, 0));
}

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

// ---- notifications

TEST_F(Edit, EachChangeIsHeardOnceAndNoFailureIs)
{
    HeardRoot root;
    TestStream stream;
    root.Store(stream);
    ValueListener listener;
    double const value = 1.0;
    T_Time const at = stream.Time(10);
    auto const heard = [&](int code) { return std::pair{code, listener.Take()}; };
    using Heard = std::pair<int, int>;
    EXPECT_EQ(Heard(0, 1), heard(KFS_InsertKey(stream, &at, 0, &value, Linear, Linear)));
    EXPECT_EQ(Heard(7425, 0), heard(KFS_InsertKey(stream, &at, 0, &value, Linear, Linear)));
    reports.Take();
    EXPECT_EQ(Heard(0, 1), heard(KFS_InsertKey(stream, &at, 1, &value, Linear, Linear)));
    EXPECT_EQ(Heard(0, 1), heard(KFS_InsertKeyF(stream, &at, 1, &value, Linear, Linear)));
    EXPECT_EQ(Heard(0, 1), heard(KFS_SetKey(stream, 0, nullptr, Hold, Hold)));
    EXPECT_EQ(Heard(0, 1), heard(KFS_SetKeyF(stream, 0, &value, None, None)));
    EXPECT_EQ(Heard(SEQ_Err_BadIndex, 0), heard(KFS_SetKey(stream, 3, nullptr, Hold, Hold)));
    EXPECT_EQ(Heard(SEQ_Err_BadIndex, 0), heard(KFS_RemoveKey(stream, 3, nullptr)));
    EXPECT_EQ(Heard(0, 1), heard(KFS_RemoveKey(stream, 0, nullptr)));
    ASSERT_EQ(0, stream->SetConstant(1, 0));
    listener.Take();
    EXPECT_EQ(Heard(0, 1), heard(KFS_InsertKey(stream, &at, 0, &value, Linear, Linear)));
    EXPECT_EQ(Heard(0, 1), heard(KFS_RemoveKey(stream, 0, nullptr)));
}

TEST_F(Edit, AListenerSeesTheStreamItselfAndItsExceptionIsTheResult)
{
    HeardRoot root;
    TestStream stream({.type = KFS_Type_Float});
    root.Store(stream);
    T_Time const at = stream.Time(10);
    float seen[2] = {0.0F, 77.0F};
    {
        ValueListener listener([&] { EXPECT_EQ(0, KFS_GetValue(stream, &at, 0, seen, nullptr, nullptr)); });
        double const value = 2.5;
        ASSERT_EQ(0, KFS_InsertKeyF(stream, &at, 0, &value, Linear, Linear));
        EXPECT_EQ(2.5F, seen[0]) << "in the external type, also from a double form";
        EXPECT_EQ(77.0F, seen[1]);
    }
    {
        ValueListener listener([] { throw 4711; });
        EXPECT_EQ(4711, KFS_SetKey(stream, 0, nullptr, Hold, Hold));
        EXPECT_EQ(4711, KFS_RemoveKey(stream, 0, nullptr));
    }
    EXPECT_EQ(0, stream.Count()) << "the edit stays";
}

// ---- against a model

TEST_F(Edit, RandomEditsFollowAPlainMap)
{
    struct Key {
        double value;
        char in, out;
    };
    std::mt19937 random(5);
    auto const pick = [&](int count) { return static_cast<int>(random() % static_cast<unsigned>(count)); };
    char const codes[] = {Linear, Hold};
    for (int round = 0; round < 20; ++round) {
        TestStream stream;
        std::map<int, Key> model;
        for (int step = 0; step < 120; ++step) {
            int const time = (pick(40) - 20) * 30;
            double const value = pick(1000) / 8.0;
            char const in = codes[pick(2)];
            char const out = codes[pick(2)];
            bool const replace = pick(2) == 0;
            T_Time const at = stream.Time(time);
            switch (pick(4)) {
            case 0:
            case 1: {
                bool const there = model.contains(time);
                EXPECT_EQ(there && !replace ? 7425 : 0, KFS_InsertKeyF(stream, &at, replace, &value, in, out));
                if (!there || replace) {
                    model[time] = {value, in, out};
                }
                break;
            }
            case 2:
                if (!model.empty()) {
                    auto key = std::next(model.begin(), pick(static_cast<int>(model.size())));
                    int const index = static_cast<int>(std::distance(model.begin(), key));
                    ASSERT_EQ(0, KFS_SetKey(stream, index, replace ? &value : nullptr, None, out));
                    key->second.value = replace ? value : key->second.value;
                    key->second.out = out;
                }
                break;
            default:
                if (!model.empty()) {
                    auto const key = std::next(model.begin(), pick(static_cast<int>(model.size())));
                    double removed = -1.0;
                    ASSERT_EQ(0, KFS_RemoveKey(stream, static_cast<int>(std::distance(model.begin(), key)), &removed));
                    EXPECT_EQ(key->second.value, removed);
                    model.erase(key);
                }
                break;
            }
            reports.Take();
            if (model.empty()) {
                continue;
            }
            int const ask = pick(1400) - 700;
            auto const next = model.lower_bound(ask);
            double expected = 0.0;
            if (next == model.begin()) {
                expected = next->second.value;
            } else if (next == model.end()) {
                expected = model.rbegin()->second.value;
            } else if (next->first == ask) {
                expected = next->second.value;
            } else {
                auto const previous = std::prev(next);
                double const share = static_cast<double>(ask - previous->first) / (next->first - previous->first);
                expected = previous->second.out == Hold ? previous->second.value
                           : next->second.in == Hold
                               ? next->second.value
                               : previous->second.value + share * (next->second.value - previous->second.value);
            }
            ASSERT_NEAR(expected, stream.At1(ask), 1e-9) << "round " << round << " step " << step << " at " << ask;
            ASSERT_EQ(static_cast<int>(model.size()), stream.Count());
            int index = 0;
            for (auto const& [modelTime, key] : model) {
                ASSERT_EQ(modelTime, stream.Record(index)->time);
                ASSERT_EQ((std::pair{key.in, key.out}), Codes(stream, index));
                ++index;
            }
        }
        EXPECT_EQ(0, stream.Pins());
    }
}

// ---- out of memory, at every place where it may happen

TEST_F(Edit, EveryFailingAllocationLeavesTheListAsItWas)
{
    struct Fixture {
        TestStream stream;
        std::vector<unsigned char> before;
    };
    auto const make = [](short dimension, bool spatial) {
        return [dimension, spatial] {
            auto fixture =
                std::make_unique<Fixture>(Fixture{TestStream({.dimension = dimension, .spatial = spatial}), {}});
            std::vector<double> value(static_cast<std::size_t>(dimension));
            for (int i = 0; i < 8; ++i) {  // an even count, so that the next key needs room
                value[0] = i * i;
                value.back() = i % 3;
                fixture->stream.Key(i * 600, value, Spline);
            }
            SEQ_Compact(fixture->stream->GetKeys());
            EXPECT_EQ(0, fixture->stream->UpdateStream());
            fixture->before = fixture->stream.Bytes();
            return fixture;
        };
    };
    auto const check = [](Fixture& fixture, int code, Q_MemoryCount const&) {
        // Without memory for the packed times the edit gets through all the same.
        if (code != 0) {
            EXPECT_EQ(fixture.before, fixture.stream.Bytes());
        }
        EXPECT_EQ(0, fixture.stream.Pins());
        EXPECT_TRUE(fixture.stream.CacheIsEmpty());
    };
    std::vector<double> const value(40, 2.5);
    T_Time const between{900, 600};
    T_Time const at{1200, 600};
    int failures = 0;
    for (auto const& [dimension, spatial] : {std::pair<short, bool>{1, false}, {2, true}, {14, false}}) {
        SCOPED_TRACE(testing::Message() << "dimension " << dimension << (spatial ? ", spatial" : ""));
        failures += FailEveryAllocation(
            make(dimension, spatial),
            [&](Fixture& f) { return KFS_InsertKeyF(f.stream, &between, 0, value.data(), None, None); }, check);
        failures += FailEveryAllocation(
            make(dimension, spatial),
            [&](Fixture& f) { return KFS_InsertKey(f.stream, &between, 0, nullptr, None, None); }, check);
        failures += FailEveryAllocation(
            make(dimension, spatial),
            [&](Fixture& f) { return KFS_InsertKeyF(f.stream, &at, 1, value.data(), None, None); }, check);
        failures += FailEveryAllocation(
            make(dimension, spatial), [&](Fixture& f) { return KFS_RemoveKey(f.stream, 3, nullptr); }, check);
    }
    EXPECT_LT(6, failures);
}

// ---- damaged streams

TEST_F(Edit, ADamagedStreamIsRefusedUntouched)
{
    DamagedStream damaged;
    KFS_Stream* const stream = damaged.get();
    double value = 0.0;
    char code = 77;
    struct Row {
        int code;
        int operation;
        char const* action;
    };
    Row const rows[] = {
        {KFS_InsertKey(stream, nullptr, 0, &value, None, None), 17, "insert a key value into"},
        {KFS_InsertKeyF(stream, nullptr, 0, &value, None, None), 94, "alter a key value in"},
        {KFS_SetKey(stream, 0, &value, None, None), 27, "alter a key value in"},
        {KFS_SetKeyF(stream, 0, &value, None, None), 92, "alter a key value in"},
        {KFS_RemoveKey(stream, 0, &value), 18, "remove a key value from"},
        {KFS_ChooseInterps(stream, nullptr, &code, &code), 44, "inquire about a key value in"},
    };
    std::vector<Reported> expected;
    for (Row const& row : rows) {
        EXPECT_EQ(2, row.code) << row.action;
        expected.push_back(DamagedReport(row.operation, row.action));
    }
    EXPECT_EQ(expected, reports.Take());
    EXPECT_TRUE(damaged.Untouched());
    EXPECT_EQ(0, code);
}

}  // namespace
