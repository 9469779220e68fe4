#include "curves/spacetangents.h"

#include "curves/spacetangents_private.h"
#include "frame/errors.h"
#include "tests/curves/pathstream.h"

#include <limits>

namespace {

using SpaceTangents = StreamTest;
using SpatialFlags = StreamTest;

constexpr double Left = -100.0;  // what a tangent held before

struct TangentEdit {
    char const* why;
    bool continuous;
    Vector oldIn, oldOut;
    Vector in, out;  // empty: not given
    Vector newIn, newOut;
};

TangentEdit const TangentEdits[] = {
    {"both", false, {0, 10}, {1, 1}, {1, 2}, {3, 4}, {1, 2}, {3, 4}},
    {"the out side alone", false, {0, 10}, {1, 1}, {}, {3, 4}, {0, 10}, {3, 4}},
    {"the in side alone", false, {0, 10}, {1, 1}, {5, 6}, {}, {5, 6}, {1, 1}},
    {"nothing", false, {0, 10}, {1, 1}, {}, {}, {0, 10}, {1, 1}},
    {"the in side turns and keeps its length", true, {0, 10}, {1, 1}, {}, {3, 4}, {-6, -8}, {3, 4}},
    {"the out side turns and keeps its length", true, {0, 10}, {5, 0}, {0, -2}, {}, {0, -2}, {0, 5}},
    {"both given: none turns", true, {0, 10}, {1, 1}, {1, 2}, {3, 4}, {1, 2}, {3, 4}},
    {"no direction to turn to", true, {0, 10}, {1, 1}, {}, {0, 0}, {0, 10}, {0, 0}},
    {"no length to keep", true, {0, 0}, {1, 1}, {}, {3, 4}, {0, 0}, {3, 4}},
    {"too small to be squared: mirrored", true, {0, 10}, {1, 1}, {}, {1e-200, 0}, {-1e-200, 0}, {1e-200, 0}},
};

TEST_F(SpaceTangents, AreStoredAndKeptInLine)
{
    for (TangentEdit const& edit : TangentEdits) {
        for (bool const external : {true, false}) {
            SCOPED_TRACE(testing::Message() << edit.why << (external ? ", external type" : ", doubles"));
            PathStream stream({{0, {0, 0}}, {100, {5, 5}}, {200, {9, 0}}});
            stream.Record(1)->spFlags = KFS_KeySpFlag_Modifiable | (edit.continuous ? KFS_KeySpFlag_Continuous : 0U);
            stream.Flag(1, KFS_KeyFlag_TangentsSet, false);
            std::copy(edit.oldIn.begin(), edit.oldIn.end(), KFSp_GetSpatialRuns(stream.Record(1), 2).inTangent);
            std::copy(edit.oldOut.begin(), edit.oldOut.end(), KFSp_GetSpatialRuns(stream.Record(1), 2).outTangent);
            stream.At(50);

            double const* const in = edit.in.empty() ? nullptr : edit.in.data();
            double const* const out = edit.out.empty() ? nullptr : edit.out.data();
            ASSERT_EQ(0, external ? KFS_SetKeySpaceTangents(stream, 1, -1, in, out)
                                  : KFS_SetKeySpaceTangentsF(stream, 1, -1, in, out));
            EXPECT_EQ((std::array<int, 2>{0, 2}), stream.Stale());
            EXPECT_EQ((std::array<int, 2>{0, 2}), stream.ArcStale());
            EXPECT_TRUE(stream.CacheIsEmpty());
            EXPECT_EQ(KFS_KeyFlag_TangentsSet, stream.Record(1)->flags & KFS_KeyFlag_TangentsSet);
            EXPECT_EQ(edit.continuous ? KFS_KeySpFlag_Continuous : 0U, stream.Record(1)->spFlags);

            Vector newIn(2, Left);
            Vector newOut(2, Left);
            ASSERT_EQ(0, KFS_GetKeySpaceTangentsF(stream, 1, 0, newIn.data(), newOut.data()));
            for (std::size_t i = 0; i < 2; ++i) {
                EXPECT_NEAR(edit.newIn[i], newIn[i], 1e-14 * std::fabs(edit.newIn[i]));
                EXPECT_NEAR(edit.newOut[i], newOut[i], 1e-14 * std::fabs(edit.newOut[i]));
            }
            EXPECT_EQ(TestStream::NotStale, stream.ArcStale());  // the getter has repaired the stream
            EXPECT_EQ(0, stream.Pins());
        }
    }
}

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

TEST_F(SpaceTangents, OfAConstantAreThoseOfItsValue)
{
    TestStream stream({.dimension = 2, .noKeys = true, .spatial = true});
    stream.Key(0, {3, 4});
    double const given[2] = {1, 2};
    ASSERT_EQ(0, KFS_SetKeySpaceTangentsF(stream, std::numeric_limits<int>::max(), 0, nullptr, given));
    Vector out(2);
    ASSERT_EQ(0, KFS_GetKeySpaceTangentsF(stream, -5, 0, nullptr, out.data()));
    EXPECT_EQ((Vector{1, 2}), out);
    EXPECT_EQ((Vector{3, 4}), stream.At(0));
}

TEST_F(SpaceTangents, RefuseWhatHasNone)
{
    double tangent[4] = {1, 1, 1, 1};
    std::string const notSpatial = "attempt to inquire spatial tangents from a non-spatial stream.";
    KeyedStream plain = MakeKeyed({{0, 1}}, KFS_Interp_Linear);
    EXPECT_EQ(KFS_Err_NotSpatial, KFS_SetKeySpaceTangents(plain, 0, 0, tangent, tangent));
    EXPECT_REPORT(reports, 31, notSpatial);
    EXPECT_EQ(KFS_Err_NotSpatial, KFS_SetKeySpaceTangentsF(plain, 0, 0, tangent, tangent));
    EXPECT_REPORT(reports, 31, notSpatial);
    EXPECT_EQ(KFS_Err_NotSpatial, KFS_GetKeySpaceTangentsF(plain, 0, 0, tangent, tangent));
    EXPECT_REPORT(reports, 32, notSpatial);

    PathStream empty({});
    EXPECT_EQ(KFS_Err_NoKeys, KFS_SetKeySpaceTangentsF(empty, 0, 0, tangent, tangent));
    EXPECT_REPORT(reports, 31, NoKeysText("alter a key value in"));
    EXPECT_EQ(KFS_Err_NoKeys, KFS_GetKeySpaceTangentsF(empty, 0, 0, tangent, tangent));
    EXPECT_REPORT(reports, 32, NoKeysText("get a value from"));

    PathStream stream({{0, {0, 0}}, {100, {5, 5}}});
    for (int const index : {-1, 2, std::numeric_limits<int>::max() - 4}) {
        EXPECT_EQ(SEQ_Err_BadIndex, KFS_SetKeySpaceTangentsF(stream, index, 0, tangent, tangent));
        EXPECT_EQ(SEQ_Err_BadIndex, KFS_GetKeySpaceTangentsF(stream, index, 0, tangent, tangent));
        EXPECT_EQ(0, stream.Pins());
    }

    stream->GetValueDescForModify()->isCustom = 1;
    std::vector<unsigned char> const before = stream.Bytes();
    EXPECT_EQ(KFS_Err_CustomValue, KFS_SetKeySpaceTangents(stream, 0, 0, tangent, tangent));
    EXPECT_EQ(KFS_Err_CustomValue, KFS_GetKeySpaceTangentsF(stream, 0, 0, tangent, tangent));
    EXPECT_EQ(2U, reports.Take().size());
    EXPECT_EQ(before, stream.Bytes());
    stream->GetValueDescForModify()->isCustom = 0;

    DamagedStream damaged;
    EXPECT_EQ(2, KFS_SetKeySpaceTangents(damaged.get(), 0, 0, tangent, tangent));
    EXPECT_EQ(2, KFS_SetKeySpaceTangentsF(damaged.get(), 0, 0, tangent, tangent));
    EXPECT_EQ(2, KFS_GetKeySpaceTangentsF(damaged.get(), 0, 0, tangent, tangent));
    EXPECT_EQ((std::vector<Reported>{DamagedReport(31, "alter a key value in"),
                                     DamagedReport(90, "alter a key value in"), DamagedReport(32, "get a value from")}),
              reports.Take());
}

// Which arcs a change of the flags makes stale: those around key 2, or none.
struct FlagEdit {
    char const* why;
    unsigned int mask, values;
    unsigned int before, after;
    bool stale;
};

FlagEdit const FlagEdits[] = {
    {"nothing", 0, 3, 1, 1, false},       {"continuous on", 1, 1, 2, 3, true},
    {"continuous off", 1, 0, 3, 2, true}, {"automatic on", 2, 3, 0, 2, true},
    {"automatic off", 2, 0, 3, 1, true},  {"a bit that is neither", 4, 4, 1, 5, false},
};

TEST_F(SpatialFlags, ReplaceTheBitsOfTheMask)
{
    for (FlagEdit const& edit : FlagEdits) {
        SCOPED_TRACE(edit.why);
        PathStream stream({{0, {0, 0}}, {100, {1, 1}}, {200, {2, 0}}, {300, {3, 1}}, {400, {4, 0}}});
        stream.Record(2)->spFlags = edit.before;
        stream.At(50);
        ASSERT_EQ(0, KFS_SetKeySpFlags(stream, 2, edit.mask, edit.values));
        unsigned int flags = 99;
        ASSERT_EQ(0, KFS_GetKeySpFlags(stream, 2, &flags));
        EXPECT_EQ(edit.after, flags);
        EXPECT_EQ(edit.stale ? (std::array<int, 2>{1, 3}) : TestStream::NotStale, stream.ArcStale());
        EXPECT_EQ(TestStream::NotStale, stream.Stale());
        EXPECT_TRUE(stream.CacheIsEmpty());
    }
}

TEST_F(SpatialFlags, ShortFormsMarkOnlyWhatBecomesAutomatic)
{
    PathStream stream({{0, {0, 0}}, {100, {1, 1}}, {200, {2, 0}}});
    stream.Record(1)->spFlags = 0;
    ASSERT_EQ(0, KFS_SetKeySpContinuous(stream, 7, 1));
    EXPECT_EQ(1U, stream.Record(1)->spFlags);
    EXPECT_EQ(TestStream::NotStale, stream.ArcStale());
    ASSERT_EQ(0, KFS_SetKeySpModifiable(stream, 1, 1));
    EXPECT_EQ(3U, stream.Record(1)->spFlags);
    EXPECT_EQ((std::array<int, 2>{0, 2}), stream.ArcStale());
    ASSERT_EQ(0, stream->UpdateStream());
    ASSERT_EQ(0, KFS_SetKeySpModifiable(stream, 0, 1));
    ASSERT_EQ(0, KFS_SetKeySpContinuous(stream, 0, 1));
    EXPECT_EQ(0U, stream.Record(1)->spFlags);
    EXPECT_EQ(TestStream::NotStale, stream.ArcStale());
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

TEST_F(SpatialFlags, RefuseEmptyAndDamagedStreams)
{
    PathStream empty({});
    DamagedStream damaged;
    unsigned int flags = 0;
    struct Call {
        int damagedOperation, emptyOperation;
        char const* action;
        int (*run)(KFS_Stream*, unsigned int*);
    };
    Call const calls[] = {
        {75, 72, "inquire about a key value in",
         [](KFS_Stream* s, unsigned int* out) { return KFS_GetKeySpFlags(s, 0, out); }},
        {76, 76, "alter a key value in", [](KFS_Stream* s, unsigned int*) { return KFS_SetKeySpFlags(s, 0, 1, 1); }},
        {74, 72, "alter a key value in", [](KFS_Stream* s, unsigned int*) { return KFS_SetKeySpModifiable(s, 1, 0); }},
        {75, 72, "alter a key value in", [](KFS_Stream* s, unsigned int*) { return KFS_SetKeySpContinuous(s, 0, 0); }},
    };
    for (Call const& call : calls) {
        EXPECT_EQ(KFS_Err_NoKeys, call.run(empty, &flags));
        EXPECT_REPORT(reports, call.emptyOperation, NoKeysText("inquire about a key value in"));
        EXPECT_EQ(2, call.run(damaged.get(), &flags));
        EXPECT_EQ(reports.Take(), std::vector<Reported>{DamagedReport(call.damagedOperation, call.action)});
    }
    EXPECT_TRUE(damaged.Untouched());
}

}  // namespace
