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

TEST_F(KeyFlags, OnlyMaskedBitsChangeAndNeverTheLayout)
{
    struct Row {
        unsigned short before, mask, value, after;
    };
    Row const rows[] = {{M, M, 0, 0},     {0, M, M, M},      {0, M, 0xFFFF, M},           {M | T, T, 0, M},
                        {M, T, T, M | T}, {M, 0, 0xFFFF, M}, {0, 0x8000, 0xFFFF, 0x8000}, {M, 1, 1, M},
                        {M, M | 1, 1, 0}};
    for (Row const& row : rows) {
        for (bool const noKeys : {false, true}) {
            SCOPED_TRACE(testing::Message() << row.before << " mask " << row.mask << " value " << row.value);
            TestStream stream({.noKeys = noKeys});
            stream.Key(0, {1});
            KFS_KeyScalar* const record = noKeys ? stream->GetCache() : stream.Record(0);
            record->flags = row.before;
            ASSERT_EQ(0, KFS_SetKeyFlags(stream, 0, row.mask, row.value));
            EXPECT_EQ(row.after, record->flags);
            EXPECT_EQ(1.0, stream.At1(0)) << "a constant keeps its value";
        }
    }
    TestStream path({.dimension = 2, .spatial = true});
    path.Key(0, {3, 4});
    for (unsigned char const on : {1, 200, 0}) {
        ASSERT_EQ(0, KFS_SetKeyContinuous(path, on, 0));
        ASSERT_EQ(0, KFS_SetKeyModifiable(path, on, 0));
        EXPECT_EQ(on ? C | M : 0, path.Record(0)->flags & (C | M));
    }
    ASSERT_EQ(0, KFS_SetKeyFlags(path, 0, 0xFFFF, 0));
    EXPECT_EQ(KFS_KeyFlag_SpatialBlock, path.Record(0)->flags);
    EXPECT_EQ((std::vector<double>{3, 4}), path.At(0));
}

TEST_F(KeyFlags, AChangeThatShapesTheCurveMarksTheNeighbourhood)
{
    struct Row {
        char const* why;
        unsigned short before, mask, value;
        bool marks;
    };
    Row const rows[] = {{"a change", 0, M, M, true},
                        {"no change", M, M, M, false},
                        {"another bit changes with it", M, M | T, M | T, true},
                        {"a bit without shape", 0, T, T, false},
                        {"float without a path", 0, F, F, true}};
    for (Row const& row : rows) {
        SCOPED_TRACE(row.why);
        TestStream stream;
        for (int i = 0; i < 6; ++i) stream.Key(i * 100, {i * 1.0});
        ASSERT_EQ(0, stream->UpdateStream());
        stream.Record(3)->flags = row.before;
        ASSERT_EQ(0, KFS_SetKeyFlags(stream, 3, row.mask, row.value));
        EXPECT_EQ(row.marks ? (std::array<int, 2>{2, 4}) : TestStream::NotStale, stream.Stale());
        EXPECT_EQ(TestStream::NotStale, stream.ArcStale());
    }
}

TEST_F(KeyFlags, AContinuousKeyLeavesAsItArrives)
{
    struct Row {
        char const* why;
        int index;
        unsigned short mask, value;
        bool equal;
    };
    Row const rows[] = {{"set", 1, C, C, true},
                        {"set with others", 1, C | M, C, true},
                        {"not in the mask", 1, M, C, false},
                        {"cleared", 1, C, 0, false},
                        {"the first key has nothing before it", 0, C, C, false}};
    for (Row const& row : rows) {
        SCOPED_TRACE(row.why);
        TestStream stream({.dimension = 2});
        stream.Key(0, {0, 0}, KFS_Interp_Spline)
            .Key(600, {10, 5}, KFS_Interp_Spline)
            .Key(1200, {0, 0}, KFS_Interp_Spline);
        double const in[2] = {3, -2};
        double const out[2] = {-8, 6};
        for (int i = 0; i < 3; ++i) {
            stream.Record(i)->flags &= static_cast<unsigned short>(~(C | M));
            ASSERT_EQ(0, KFS_SetKeyVelocityF(stream, i, in, out));
        }
        ASSERT_EQ(0, KFS_SetKeyFlags(stream, row.index, row.mask, row.value));
        std::array<double, 2> velocity{};
        ASSERT_EQ(0, KFS_GetKeyVelocityF(stream, row.index, 0, nullptr, velocity.data()));
        EXPECT_EQ(row.equal ? (std::array{3.0, -2.0}) : (std::array{-8.0, 6.0}), velocity);
        EXPECT_EQ(3.0, stream.Numbers(row.index)[2]) << "the in side stays";
        EXPECT_EQ(0, stream.Pins());
    }
}

std::unique_ptr<TestStream> Path()
{
    auto stream = std::make_unique<TestStream>(StreamOptions{.dimension = 2, .spatial = true});
    stream->Key(0, {0, 0}).Key(300, {10, 0}, KFS_Interp_Spline).Key(700, {10, 10}).Key(1200, {0, 10});
    EXPECT_EQ(0, (*stream)->UpdateStream());
    return stream;
}

TEST_F(KeyFlags, EndKeysDontFloat)
{
    for (int const index : {0, 3}) {
        auto const stream = Path();
        ASSERT_EQ(0, KFS_SetKeyFlags(*stream, index, F, F));
        EXPECT_EQ(0, stream->Record(index)->flags & F);
        auto const marked = index == 0 ? std::array{0, 1} : std::array{2, 3};
        EXPECT_EQ(marked, stream->Stale()) << "the neighbourhood is marked all the same";
        EXPECT_EQ(marked, stream->ArcStale());
        EXPECT_EQ(0, KFS_SetKeyFlags(*stream, index, F | M, F | M));
        EXPECT_NE(0, stream->Record(index)->flags & M) << "the other bits are written";
    }
}

TEST_F(KeyFlags, AnAnchorComesBackWhereTheFloatKeyWas)
{
    auto const stream = Path();
    ASSERT_EQ(0, KFS_SetKeyFlags(*stream, 1, F, F));
    EXPECT_NE(0, stream->Record(1)->flags & F);
    ASSERT_EQ(0, (*stream)->UpdateStream());
    int const floating = stream->Record(1)->time;
    std::map<int, std::vector<double>> before;
    for (int t = 0; t <= 1200; t += 50) before[t] = stream->At(t);
    ASSERT_EQ(0, KFS_SetKeyFlags(*stream, 1, F, 0));
    EXPECT_EQ(0, stream->Record(1)->flags & F);
    EXPECT_EQ(floating, stream->Record(1)->time);
    EXPECT_EQ(0, stream->Pins());
    EXPECT_TRUE(stream->CacheIsEmpty());
    // The key's time is whole ticks, so the point may run a tick ahead.
    for (auto const& [t, value] : before) {
        EXPECT_NEAR(value[0], stream->At(t)[0], 0.2) << t;
        EXPECT_NEAR(value[1], stream->At(t)[1], 0.2) << t;
    }
}

TEST_F(KeyFlags, NothingIsThereToChange)
{
    for (bool const noKeys : {false, true}) {
        TestStream const stream({.noKeys = noKeys});
        EXPECT_EQ(7427, KFS_SetKeyFlags(stream, 0, M, M));
        EXPECT_REPORT(reports, 72, "attempt to inquire about a key value in a time stream with no key values.");
    }
    HeardRoot root;
    TestStream stream;
    stream.Key(0, {1});
    root.Store(stream);
    ValueListener listener;
    for (int const bad : {-1, 1, INT_MAX, INT_MIN}) EXPECT_EQ(SEQ_Err_BadIndex, KFS_SetKeyFlags(stream, bad, M, M));
    EXPECT_EQ(0, stream.Pins());
    EXPECT_EQ(0, listener.Take());
}

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

// A float key turned into an anchor; and a key so wide that its velocities need memory of their own, after the flags
// have been written.
TEST_F(KeyFlags, EveryFailingAllocationLeavesTheKeysAsTheyWere)
{
    struct Fixture {
        std::unique_ptr<TestStream> stream;
        std::vector<unsigned char> before;
    };
    for (bool const path : {true, false}) {
        auto const make = [path] {
            auto fixture = std::make_unique<Fixture>();
            fixture->stream = path ? Path() : std::make_unique<TestStream>(StreamOptions{.dimension = 40});
            for (int i = 0; !path && i < 3; ++i) {
                fixture->stream->Key(i * 600, std::vector<double>(40, i * i), KFS_Interp_Spline);
                fixture->stream->Record(i)->flags = 0;
            }
            if (path) EXPECT_EQ(0, KFS_SetKeyFlags(*fixture->stream, 1, F, F));
            EXPECT_EQ(0, (*fixture->stream)->UpdateStream());
            fixture->before = fixture->stream->Bytes();
            return fixture;
        };
        auto const edit = [path](Fixture& f) { return KFS_SetKeyFlags(*f.stream, 1, path ? F : C, path ? 0 : C); };
        auto const check = [path](Fixture& fixture, int code, Q_MemoryCount const&) {
            if (!path || code != 0) EXPECT_EQ(fixture.before, fixture.stream->Bytes());
            EXPECT_EQ(0, fixture.stream->Pins());
            EXPECT_TRUE(fixture.stream->CacheIsEmpty());
        };
        EXPECT_LE(path ? 1 : 2, FailEveryAllocation(make, edit, check));
    }
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
