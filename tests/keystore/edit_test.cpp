#include "keystore/edit.h"

#include "keystore/edit_private.h"
#include "keystore/items_private.h"
#include "tests/support/dice.h"
#include "tests/support/listening.h"
#include "tests/support/streams.h"

#include <numeric>
#include <string>

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

// ---- the short ways of plain streams

int CopyBytes(void*, SEQ_Head const* const* list, void const* source, void* destination)
{
    std::memcpy(destination, source, static_cast<std::size_t>((*list)->itemSize));
    return 0;
}
int DisposeNothing(void*, SEQ_Head**, void*)
{
    return 0;
}

// A list with item functions of its own keeps edits from going the short ways: then both must leave the same bytes.
TEST_F(Edit, TheShortWaysLeaveWhatTheGeneralOneLeaves)
{
    SEQ_Funcs const slow{CopyBytes, DisposeNothing, nullptr};
    for (int seed = 0; seed < Rounds(60); ++seed) {
        SCOPED_TRACE(testing::Message() << "seed " << seed);
        Dice dice(static_cast<std::uint64_t>(seed));
        StreamOptions const options{.dimension = static_cast<short>(1 + seed % 3),
                                    .type = seed % 4 == 3 ? KFS_Type_Float : KFS_Type_Double};
        TestStream quick(options), general(options);
        ASSERT_EQ(0, KFSp_CreateKeyList(general));
        HeardRoot quickRoot, generalRoot;
        quickRoot.Store(quick), generalRoot.Store(general);
        ValueListener listener;
        auto const both = [&](auto&& edit) {
            ASSERT_EQ(edit(quick), edit(general));
            int const told = listener.Take();
            EXPECT_TRUE(told == 0 || told == 2);
            ASSERT_EQ(quick.Times(), general.Times());
            ASSERT_EQ(quick.Bytes(), general.Bytes());
            EXPECT_EQ(quick.Stale(), general.Stale());
            EXPECT_EQ(quick.ArcStale(), general.ArcStale());
            // Numbers between keys are read over what an edit leaves, and a list ends in what is there then.
            ASSERT_EQ(0, std::memcmp(quick->GetCache(), general->GetCache(), quick->GetCacheSize()));
            EXPECT_EQ(reports.Take().size() % 2, 0U);
        };
        int const origin = seed % 5 == 4 ? 2147483000 : -50;
        auto const code = [&] { return static_cast<char>(1 + dice.Below(3)); };
        for (int step = 0; step < 60; ++step) {
            EXPECT_EQ(0, SEQ_SetFuncs(general->GetKeys(), 3, &slow));
            int const what = dice.Below(10);
            int const last = general.Count() > 0 ? general.Times().back() : origin;
            bool const behind = dice.Below(3) != 0;
            auto const next = [&](int from) {
                return static_cast<int>(static_cast<unsigned>(behind ? last : origin) +
                                        static_cast<unsigned>(from + dice.Below(behind ? 9 : 300)));
            };
            double const value[] = {dice.Wild(3), dice.Wild(3), dice.Wild(3)};
            char const in = code(), out = code();
            if (what < 4) {
                T_Time const at = quick.Time(next(1));
                both([&](TestStream& s) {
                    return what == 0 ? KFS_InsertKeyF(s, &at, 1, value, in, out)
                                     : KFS_InsertKey(s, &at, 0, value, in, out);
                });
            } else if (what < 6) {
                int const index = behind ? general.Count() - 1 : dice.Below(9) - 1;
                both([&](TestStream& s) { return KFS_RemoveKey(s, index, nullptr); });
            } else if (what < 8) {
                int const count = dice.Below(6);
                std::vector<int> times;
                for (int i = 0; i < count; ++i) times.push_back(next(behind ? 10 * i + 1 : 0));
                std::vector<double> numbers(90);
                for (double& number : numbers) number = dice.Wild(1);
                std::string const codes{in, in, out, out, in, in};
                KFS_NewKeys keys{count, times.data(), 600, numbers.data(), codes.data(), codes.data() + 1};
                if (dice.Below(2)) keys.inSpeeds = &numbers[18], keys.inInfluences = &numbers[36];
                if (dice.Below(4)) keys.outSpeeds = &numbers[54], keys.outInfluences = &numbers[72];
                bool const replace = dice.Below(2) != 0;
                both([&](TestStream& s) { return KFS_InsertKeys(s, &keys, replace); });
            } else if (general.Count() > 0) {
                int const at = general.Times()[static_cast<std::size_t>(dice.Below(general.Count()))] + what - 8;
                both([&](TestStream& s) {
                    std::vector<double> const read = s.At(at);
                    return std::accumulate(read.begin(), read.end(), 0.0);
                });
            }
        }
    }
}

// These times are too far apart for the short way, which has made the list by then.
TEST_F(Edit, ABatchThatFailsLeavesNoList)
{
    int const times[] = {-1500000000, 0, 1500000000};
    double const values[3] = {};
    KFS_NewKeys const keys{3, times, 600, values, "\1\1\1", "\1\1\1"};
    int refused = 0;
    FailEveryAllocation([] { return std::make_unique<TestStream>(); },
                        [&](TestStream& stream) { return KFS_InsertKeys(stream, &keys, 0); },
                        [&](TestStream& stream, int code, Q_MemoryCount const&) {
                            refused += code != 0;
                            EXPECT_EQ(code != 0, stream->GetKeys() == nullptr);
                        });
    EXPECT_LT(2, refused);
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
