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

TEST_F(Edit, ARefusedCodeChangesNothing)
{
    TestStream stream({.interpMask = KFS_InterpMask_Linear});
    stream.Key(10, {1});
    auto const before = stream.Bytes();
    for (auto const& [in, out, refused] : {std::tuple{Spline, Linear, Spline}, std::tuple{Linear, Hold, Hold}}) {
        EXPECT_EQ(7431, Insert(stream, 20, 2.0, in, out));
        EXPECT_EQ(7431, Insert(stream, 10, 2.0, in, out, true)) << "at the key, too";
        EXPECT_EQ(7431, KFS_SetKey(stream, 0, nullptr, in, out));
        EXPECT_EQ(std::vector<Reported>(3, KfsReport(13, InterpText(refused))), reports.Take());
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
    TestStream const empty({.dimension = 2, .spatial = true});
    T_Time const unfit{1, 0};
    for (auto const& [nothing, time, code] :
         {std::tuple<TestStream const*, T_Time const*, int>{&empty, nullptr, 0}, {&stream, &unfit, T_Err_Scale}}) {
        unsigned short flags = 77;
        unsigned int spFlags = 77;
        char in = 77;
        char out = 77;
        EXPECT_EQ(code, KFSp_ChooseInterpsAndFlags(*nothing, time, &in, &out, &flags, &spFlags));
        EXPECT_EQ(0, in + out + flags);
        EXPECT_EQ(77U, spFlags) << "no record was read";
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
    EXPECT_EQ((std::vector{1.5, -1.5}), stream.At(5));
    EXPECT_EQ((std::pair{Linear, Linear}), Codes(stream, 0)) << "nothing to go by is linear";
    double const numbers[2] = {0.25, 0.75};
    ASSERT_EQ(0, KFS_SetKeyF(stream, 0, numbers, None, None));
    std::array<int, 2> out{};
    ASSERT_EQ(0, KFS_RemoveKey(stream, 0, out.data()));
    EXPECT_EQ((std::array{16384, 49152}), out);
}

// A second edit must not find anything that the first left in the record.
TEST_F(Edit, ANewKeyTakesNothingFromTheRecordBefore)
{
    TestStream used;
    used.Key(0, {1}, Spline).Key(1200, {-7}, Spline).Key(600, {50}, Spline);
    ASSERT_NE(0.0, used.Numbers(1)[1]);
    used.At1(900);
    for (int const index : {2, 1, 0}) ASSERT_EQ(0, KFS_RemoveKey(used, index, nullptr));
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

TEST_F(Edit, AKeyWithoutAValueTakesTheOneThatIsThereAndKeepsTheCurve)
{
    struct Row {
        char const* why;
        char aOut, bIn;
        char in, out;  // asked for
        bool keepsCurve;
    };
    Row const rows[] = {
        {"splines", Spline, Spline, None, None, true},
        {"a spline and a line", Spline, Linear, None, None, true},
        {"a line and a spline", Linear, Spline, None, None, true},
        {"lines", Linear, Linear, None, None, true},
        {"lines made splines", Linear, Linear, Spline, Spline, true},
        {"a line made a hold", Linear, Linear, Hold, Hold, false},
        {"holds", Hold, Hold, None, None, true},
        {"a hold and a line", Hold, Linear, None, None, false},
        {"a line and a hold", Linear, Hold, None, None, false},
        {"a hold made a spline", Hold, Linear, Spline, Spline, false},
        {"a hold and a spline", Hold, Spline, None, None, false},
        {"a spline and a hold", Spline, Hold, None, None, false},
    };
    // On a path with and without tangents of the stream's own making.
    StreamOptions const kinds[] = {
        {.dimension = 2}, {.dimension = 2, .spatial = true}, {.dimension = 2, .spatial = true, .spInterpMask = 0}};
    for (Row const& row : rows) {
        for (StreamOptions const& kind : kinds) {
            if (kind.spatial && (row.aOut != row.bIn || row.aOut == Hold || row.in != None)) continue;
            for (int const time : {-100, 150, 300, 601, 1199, 1900}) {
                SCOPED_TRACE(testing::Message() << row.why << " " << kind.spatial << kind.spInterpMask << " " << time);
                TestStream stream(kind), read(kind);
                for (TestStream* const each : {&stream, &read})
                    each->Key(0, {0, 5}, Spline, row.aOut).Key(1200, {10, -3}, row.bIn, Spline).Key(1800, {4, 4});
                std::vector<double> const there = read.At(time);
                if (time == 300) stream.At(1000);  // after a read
                T_Time const at = stream.Time(time);
                ASSERT_EQ(0, KFS_InsertKey(stream, &at, 0, nullptr, row.in, row.out));
                EXPECT_TRUE(stream.CacheIsEmpty());
                EXPECT_EQ(0, stream.Pins());
                double const* const stored = KFSp_Numbers(stream.Record(time < 0 ? 0 : time < 1200 ? 1 : 3));
                EXPECT_NEAR(there[0], stored[0], 1e-6);
                EXPECT_NEAR(there[1], stored[1], 1e-6);
                for (int t = -60; row.keepsCurve && !kind.spatial && t <= 1860; t += 60) {
                    EXPECT_NEAR(read.At(t)[0], stream.At(t)[0], 1e-6) << t;
                    EXPECT_NEAR(read.At(t)[1], stream.At(t)[1], 1e-6) << t;
                }
            }
        }
    }
}

TEST_F(Edit, AnEditMarksTheNeighbourhood)
{
    struct Row {
        char const* edit;
        std::function<int(TestStream const&)> act;
        std::array<int, 2> stale, arcStale;
    };
    Row const rows[] = {
        {"insert", [](TestStream const& s) { return Insert(s, 450, 4.0, Linear, Linear); }, {4, 6}, {3, 7}},
        {"set", [](TestStream const& s) { return KFS_SetKey(s, 4, nullptr, Hold, None); }, {2, 5}, {2, 6}},
        {"remove", [](TestStream const& s) { return KFS_RemoveKey(s, 4, nullptr); }, {3, 4}, {2, 6}},
        {"remove the last, whose mark falls on the one before",
         [](TestStream const& s) { return KFS_RemoveKey(s, 7, nullptr); },
         {6, 6},
         {5, 6}},
    };
    TestStream stream({.dimension = 2, .spatial = true});
    for (int i = 0; i < 8; ++i) stream.Key(i * 100, {i * 1.0, 0});
    for (Row const& row : rows) {
        SCOPED_TRACE(row.edit);
        ASSERT_EQ(0, stream->UpdateStream());
        ASSERT_EQ(0, row.act(stream));
        EXPECT_EQ(row.stale, stream.Stale());
        EXPECT_EQ(row.arcStale, stream.ArcStale());
    }
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
    ASSERT_EQ(0, SEQ_New(0, 8, 4, 1, &stream.Record(0)->remapTable));
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
    for (int const bad : {-1, 2, INT_MAX, INT_MIN}) {
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
    TestStream const stream({.noKeys = true});
    char in = 77;
    char out = 77;
    EXPECT_EQ(0, KFS_ChooseInterps(stream, nullptr, &in, &out));
    EXPECT_EQ((std::pair{None, None}), (std::pair{in, out}));
    ASSERT_EQ(0, Insert(stream, 40, 5.0, Linear, Hold));
    EXPECT_EQ(5.0, stream.At1(9999));
    EXPECT_EQ(0, KFS_ChooseInterps(stream, nullptr, &in, &out));
    EXPECT_EQ((std::pair{Linear, Hold}), (std::pair{in, out})) << "it proposes its own codes";
    EXPECT_EQ(7425, Insert(stream, 40, 6.0, Linear, Linear));
    EXPECT_REPORT(reports, 17, OverwriteText);
    EXPECT_EQ(5.0, stream.At1(0));
    ASSERT_EQ(0, Insert(stream, 0, 6.0, Linear, Linear, true));
    EXPECT_EQ(6.0, stream.At1(0));
    ASSERT_EQ(0, Insert(stream, 0, std::nullopt, Hold, Hold, true));
    EXPECT_EQ(6.0, stream.At1(0)) << "without a value the old one stays";
    double value = 7.0;
    ASSERT_EQ(0, KFS_SetKey(stream, INT_MAX, &value, None, None)) << "the index isn't looked at";
    EXPECT_EQ(TestStream::NotStale, stream.Stale());
    value = 0.0;
    ASSERT_EQ(0, KFS_RemoveKey(stream, 0, &value));
    EXPECT_EQ(7.0, value);
    EXPECT_EQ(7427, KFS_GetValueFPlus(stream, nullptr, 0, &value, nullptr, nullptr));
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
    EXPECT_EQ(7427, TestStream()->RemoveKey(0, 0));
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

struct ModelKey {
    double value;
    char in, out;
};

// The value of lines and holds.
double Evaluate(std::map<int, ModelKey> const& model, int time)
{
    auto const next = model.lower_bound(time);
    if (next == model.end()) return model.rbegin()->second.value;
    if (next == model.begin() || next->first == time) return next->second.value;
    auto const& [previousTime, previous] = *std::prev(next);
    if (previous.out == Hold) return previous.value;
    if (next->second.in == Hold) return next->second.value;
    double const share = static_cast<double>(time - previousTime) / (next->first - previousTime);
    return previous.value + share * (next->second.value - previous.value);
}

TEST_F(Edit, RandomEditsFollowAPlainMap)
{
    std::mt19937 random(5);
    auto const pick = [&](int count) { return static_cast<int>(random() % static_cast<unsigned>(count)); };
    char const codes[] = {Linear, Hold};
    for (int round = 0; round < 20; ++round) {
        TestStream const stream;
        std::map<int, ModelKey> model;
        for (int step = 0; step < 120; ++step) {
            int const time = (pick(40) - 20) * 30;
            double const value = pick(1000) / 8.0;
            char const in = codes[pick(2)];
            char const out = codes[pick(2)];
            bool const replace = pick(2) == 0;
            int const kind = pick(4);
            int const index = pick(std::max(1, static_cast<int>(model.size())));
            auto const key = std::next(model.begin(), model.empty() ? 0 : index);
            if (kind < 2) {
                bool const there = model.contains(time);
                EXPECT_EQ(there && !replace ? 7425 : 0, Insert(stream, time, value, in, out, replace));
                if (!there || replace) model[time] = {value, in, out};
            } else if (!model.empty() && kind == 2) {
                ASSERT_EQ(0, KFS_SetKey(stream, index, replace ? &value : nullptr, None, out));
                key->second = {replace ? value : key->second.value, key->second.in, out};
            } else if (!model.empty()) {
                double removed = -1.0;
                ASSERT_EQ(0, KFS_RemoveKey(stream, index, &removed));
                EXPECT_EQ(key->second.value, removed);
                model.erase(key);
            }
            reports.Take();
            if (model.empty()) continue;
            int const ask = pick(1400) - 700;
            ASSERT_NEAR(Evaluate(model, ask), stream.At1(ask), 1e-9) << "round " << round << " step " << step;
            ASSERT_EQ(static_cast<int>(model.size()), stream.Count());
            int position = 0;
            for (auto const& [modelTime, modelKey] : model) {
                ASSERT_EQ(modelTime, stream.Record(position)->time);
                ASSERT_EQ((std::pair{modelKey.in, modelKey.out}), Codes(stream, position++));
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
    std::function<int(Fixture&)> const edits[] = {
        [](Fixture& f) { return Insert(f.stream, 900, 2.5, None, None); },
        [](Fixture& f) { return Insert(f.stream, 900, std::nullopt, None, None); },
        [](Fixture& f) { return Insert(f.stream, 1200, 2.5, None, None, true); },
        [](Fixture& f) { return KFS_RemoveKey(f.stream, 3, nullptr); },
    };
    int failures = 0;
    for (auto const& [dimension, spatial] : {std::pair<short, bool>{1, false}, {2, true}, {14, false}}) {
        SCOPED_TRACE(testing::Message() << "dimension " << dimension << (spatial ? ", spatial" : ""));
        for (auto const& edit : edits) failures += FailEveryAllocation(make(dimension, spatial), edit, check);
    }
    EXPECT_LT(6, failures);
}

}  // namespace
