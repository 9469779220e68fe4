#include "curves/autotangents_private.h"

#include "tests/curves/threekeys.h"

namespace {

using AutoTangentsTest = StreamTest;
using Vec = std::vector<double>;

// ---- tangents in space

struct Vectors {
    char const* why;
    Vec prev, cur, next;  // empty: not given
    Vec out;
    Vec in;
};

constexpr double C = 0.16666666667;

Vectors const SpaceCases[] = {
    {"a sixth of the outer chord", {0, 0}, {3, 5}, {6, 12}, {6 * C, 12 * C}, {-6 * C, -12 * C}},
    {"the key itself has no say", {0, 0}, {-40, 7}, {6, 12}, {6 * C, 12 * C}, {-6 * C, -12 * C}},
    {"nor is it needed", {0, 0}, {}, {6, 12}, {6 * C, 12 * C}, {-6 * C, -12 * C}},
    {"last: from the one before", {1, 1}, {3, 0}, {}, {2 * C, -1 * C}, {-2 * C, 1 * C}},
    {"first: to the next", {}, {1, 1}, {3, 0}, {2 * C, -1 * C}, {-2 * C, 1 * C}},
    {"on the previous key: no handle back", {2, 2}, {2, 2}, {8, 2}, {6 * C, 0}, {0, 0}},
    {"on the next key: no handle forth", {2, 2}, {8, 2}, {8, 2}, {0, 0}, {-6 * C, 0}},
    {"near counts as on", {2, 2}, {8, 2 + 9e-13}, {8 - 9e-13, 2}, {0, 0}, {-6 * C, 0}},
    {"one far component is enough to be apart", {2, 2}, {8, 2 + 2e-12}, {8, 2}, {6 * C, 0}, {-6 * C, 0}},
    {"alone", {}, {1, 1}, {}, {0, 0}, {0, 0}},
    {"only the previous", {4, 4}, {}, {}, {0, 0}, {0, 0}},
    {"only the next", {}, {}, {4, 4}, {0, 0}, {0, 0}},
    {"three components", {0, 0, 0}, {1, 1, 1}, {6, 0, -6}, {6 * C, 0, -6 * C}, {-6 * C, 0, 6 * C}},
};

TEST_F(AutoTangentsTest, SpatialTangentsFollowTheChord)
{
    auto const pointer = [](Vec const& v) { return v.empty() ? nullptr : v.data(); };
    for (Vectors const& c : SpaceCases) {
        SCOPED_TRACE(c.why);
        Vec in(c.in.size() + 1, 55.0);
        Vec out(c.out.size() + 1, 55.0);
        EXPECT_EQ(0, KFSp_ComputeDefaultSpTangents(static_cast<short>(c.in.size()), pointer(c.prev), pointer(c.cur),
                                                   pointer(c.next), in.data(), out.data()));
        for (std::size_t i = 0; i < c.in.size(); ++i) {
            // A cleared handle is exactly zero, not a very short one.
            EXPECT_NEAR(c.in[i], in[i], c.in[i] == 0.0 ? 0.0 : 1e-12);
            EXPECT_NEAR(c.out[i], out[i], c.out[i] == 0.0 ? 0.0 : 1e-12);
        }
        EXPECT_EQ(55.0, in.back());
        EXPECT_EQ(55.0, out.back());
    }
}

// ---- temporal handles

struct Slope {
    char const* why;
    int index;
    int inInterp, outInterp;
    double plain;
    double spatial;
};

// Keys after 0, 1 and 3 seconds. Values 0, 10, 40; arcs of 5 and 20.
Slope const Slopes[] = {
    {"middle: from the previous key to the next", 1, S, S, 40.0 / 3.0, 25.0 / 3.0},
    {"first", 0, S, S, 10.0, 5.0},
    {"last", 2, S, S, 15.0, 10.0},
    {"both sides straight count as neither", 1, L, L, 40.0 / 3.0, 25.0 / 3.0},
    {"a hold isn't straight", 1, H, S, 40.0 / 3.0, 25.0 / 3.0},
    {"goes on straight", 1, L, S, 10.0, 0.0},
    {"arrives for a straight run", 1, S, L, 15.0, 0.0},
    {"first, nothing comes in straight", 0, L, S, 0.0, 0.0},
    {"first, goes out straight", 0, S, L, 10.0, 5.0},
    {"last, comes in straight", 2, L, S, 15.0, 10.0},
    {"last, nothing goes out straight", 2, S, L, 0.0, 0.0},
};

TEST_F(AutoTangentsTest, TheSlopeOfEveryKindOfKey)
{
    for (bool const spatial : {false, true}) {
        for (Slope const& c : Slopes) {
            SCOPED_TRACE(testing::Message() << c.why << ", spatial " << spatial);
            KeyedStream stream = MakeThree(spatial);
            stream.Codes(c.index, c.inInterp, c.outInterp).SetHandle(c.index, {-7, 0.5, -7, 0.5});
            KFS_KeyScalar* const key = stream.Record(c.index);
            ASSERT_EQ(0, KFSp_SetDefaultKeyframeTangents(stream, key->time, KFSp_Tangents_Temporal, key));
            Handle const handle = stream.GetHandle(c.index);
            EXPECT_DOUBLE_EQ(spatial ? c.spatial : c.plain, handle.inSpeed);
            EXPECT_EQ(handle.inSpeed, handle.outSpeed);
            EXPECT_EQ(0.16666666667, handle.inInfluence);
            EXPECT_EQ(0.16666666667, handle.outInfluence);
            EXPECT_TRUE(key->flags & KFS_KeyFlag_Continuous);
            EXPECT_EQ(0, stream.Pins());
        }
    }
}

// A record that isn't in the list yet.
struct Coming {
    char const* why;
    int time;
    int inInterp, outInterp;
    double speed;
};

Coming const Comings[] = {
    {"between two keys: their slope", 300, S, S, 10.0},
    {"between others", 1000, S, S, 15.0},
    {"with one straight side there is nothing to measure from", 300, L, S, 0.0},
    {"nor to", 300, S, L, 0.0},
    {"past the end", 2400, S, S, 0.0},
    {"before the start", -600, S, S, 0.0},
    {"where a key stands, that key is in the middle", 600, S, S, 40.0 / 3.0},
};

TEST_F(AutoTangentsTest, AKeyThatIsAboutToEnter)
{
    KeyedStream const stream = MakeThree();
    std::vector<unsigned char> const before = stream.Bytes();
    for (Coming const& c : Comings) {
        SCOPED_TRACE(c.why);
        KFS_KeyScalar* const record = stream.get()->GetCache();
        std::fill_n(KFSp_Numbers(record), 5, 123.0);
        record->flags = 0;
        record->inInterp = static_cast<signed char>(c.inInterp);
        record->outInterp = static_cast<signed char>(c.outInterp);
        ASSERT_EQ(0, KFSp_SetDefaultKeyframeTangents(stream, c.time, KFSp_Tangents_Temporal, record));
        KFSp_TemporalRuns<double> const runs = KFSp_GetTemporalRuns(record, 1);
        EXPECT_DOUBLE_EQ(c.speed, *runs.inSpeed);
        EXPECT_DOUBLE_EQ(c.speed, *runs.outSpeed);
        EXPECT_EQ(123.0, *runs.value);
        EXPECT_EQ(before, stream.Bytes());
    }
}

TEST_F(AutoTangentsTest, AnchorsMeasureOverFloatKeys)
{
    KeyedStream stream({.dimension = 2, .spatial = true});
    for (int i = 0; i < 5; ++i) stream.Key(600 * i, {1.0 * i, 0.5 * i * i}, S);
    stream.Settle();
    for (int i = 0; i < 5; ++i) stream.Record(i)->arcLength = i < 4 ? 3.0 + i : 0.0;  // 3 4 5 6
    stream.Flag(1, KFS_KeyFlag_Float).Flag(3, KFS_KeyFlag_Float);
    auto const speedOf = [&](int index) {
        KFS_KeyScalar* const key = stream.Record(index);
        EXPECT_EQ(0, KFSp_SetDefaultKeyframeTangents(stream, key->time, KFSp_Tangents_Temporal, key));
        return stream.GetHandle(index).inSpeed;
    };
    EXPECT_DOUBLE_EQ(7.0 / 2.0, speedOf(0));
    EXPECT_DOUBLE_EQ(18.0 / 4.0, speedOf(2));
    EXPECT_DOUBLE_EQ(11.0 / 2.0, speedOf(4));
    // Without arc-length parametrisation the neighbours are next door.
    stream.StreamFlag(KFS_StreamFlag_SParametrize, false);
    EXPECT_DOUBLE_EQ((4.0 + 5.0) / 2.0, speedOf(2));
}

// ---- the path

struct Path {
    char const* why;
    Vec prevIn, nextOut;
    bool modifiable;
    bool straight;
};

Path const Paths[] = {
    {"a straight run stays straight", {0, 0}, {0, 0}, false, true},
    {"unless its tangents are automatic", {0, 0}, {0, 0}, true, false},
    {"the previous key arrives bent", {0, 1}, {0, 0}, false, false},
    {"the next key leaves bent", {0, 0}, {-2, 0}, false, false},
    {"automatic among bent ones", {0, 1}, {1, 0}, true, false},
};

TEST_F(AutoTangentsTest, AStraightPathStaysStraight)
{
    for (Path const& c : Paths) {
        for (char const mode :
             {KFSp_Tangents_Spatial, static_cast<char>(KFSp_Tangents_Temporal | KFSp_Tangents_Spatial)}) {
            SCOPED_TRACE(testing::Message() << c.why << ", mode " << static_cast<int>(mode));
            KeyedStream stream = MakeThree(true);
            std::copy_n(c.prevIn.data(), 2, KFSp_GetSpatialRuns(stream.Record(0), 2).inTangent);
            std::copy_n(c.nextOut.data(), 2, KFSp_GetSpatialRuns(stream.Record(2), 2).outTangent);
            stream.SetHandle(1, {-7, 0.5, -7, 0.5}).Flag(1, KFS_KeyFlag_TangentsSet, false);
            KFS_KeyScalar* const key = stream.Record(1);
            key->spFlags = c.modifiable ? static_cast<unsigned int>(KFS_KeySpFlag_Modifiable) : 0U;
            KFSp_SpatialRuns<double> const runs = KFSp_GetSpatialRuns(key, 2);
            std::fill_n(runs.inTangent, 4, 66.0);
            ASSERT_EQ(0, KFSp_SetDefaultKeyframeTangents(stream, 600, mode, key));
            double const reach = c.straight ? 0.0 : 40.0 * C;
            for (int i = 0; i < 2; ++i) {
                EXPECT_DOUBLE_EQ(reach, runs.outTangent[i]);
                EXPECT_DOUBLE_EQ(-reach, runs.inTangent[i]);
                EXPECT_EQ(10.0, runs.value[i]);
            }
            EXPECT_TRUE(key->spFlags & KFS_KeySpFlag_Continuous);
            EXPECT_EQ(KFS_KeyFlag_TangentsSet, key->flags & KFS_KeyFlag_TangentsSet);
            EXPECT_EQ((mode & KFSp_Tangents_Temporal) ? 25.0 / 3.0 : -7.0, stream.GetHandle(1).inSpeed)
                << "only what the mode asks for";
        }
    }
}

TEST_F(AutoTangentsTest, ThePathBendsAtFloatKeysToo)
{
    KeyedStream stream({.dimension = 2, .spatial = true});
    for (int i = 0; i < 4; ++i) stream.Key(600 * i, {6.0 * i, 6.0 * i * i}, S);
    stream.Settle();
    stream.Flag(1, KFS_KeyFlag_Float).Flag(2, KFS_KeyFlag_Float);
    stream.Record(1)->spFlags = KFS_KeySpFlag_Modifiable;
    KFS_KeyScalar* const key = stream.Record(1);
    ASSERT_EQ(0, KFSp_SetDefaultKeyframeTangents(stream, 600, KFSp_Tangents_Spatial, key));
    EXPECT_DOUBLE_EQ(12.0 * C, KFSp_GetSpatialRuns(key, 2).outTangent[0]);  // from key 0 to key 2, not to the anchor
    EXPECT_DOUBLE_EQ(24.0 * C, KFSp_GetSpatialRuns(key, 2).outTangent[1]);
}

// ---- refusals

TEST_F(AutoTangentsTest, RefusesWhatHasNoKeys)
{
    StreamOptions constant;
    constant.noKeys = true;
    TestStream const empty;
    TestStream const single(constant);
    for (TestStream const* stream : {&empty, &single}) {
        EXPECT_EQ(KFS_Err_NoKeys, KFSp_SetDefaultKeyframeTangents(stream->get(), 0, 3, stream->get()->GetCache()));
        EXPECT_REPORT(reports, 86, NoKeysText("set tangents for a key in"));
    }
    DamagedStream const damaged;
    EXPECT_EQ(KFS_Err_DamagedStream, KFSp_SetDefaultKeyframeTangents(damaged.get(), 0, 3, nullptr));
    EXPECT_EQ(reports.Take(), std::vector<Reported>{DamagedReport(86, "set tangents for a key in")});
    EXPECT_TRUE(damaged.Untouched());
}

TEST_F(AutoTangentsTest, LeavesCustomValuesAlone)
{
    KeyedStream stream = MakeThree();
    std::vector<unsigned char> const before = stream.Bytes();
    stream.get()->MarkTemporarilyNonCustom(true);  // the records count as the client's meanwhile
    EXPECT_EQ(0, KFSp_SetDefaultKeyframeTangents(stream, 600, 3, stream.Record(1)));
    stream.get()->MarkTemporarilyNonCustom(false);
    stream.get()->GetValueDescForModify()->isCustom = 1;
    EXPECT_EQ(0, KFSp_SetDefaultKeyframeTangents(stream, 600, 3, stream.Record(1)));
    stream.get()->GetValueDescForModify()->isCustom = 0;
    EXPECT_EQ(before, stream.Bytes());
}

}  // namespace
