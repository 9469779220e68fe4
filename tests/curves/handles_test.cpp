// Handles and tangents beyond what the leaf's twin holds: turns, numbers of any size, copies that fail, and streams of
// a client's type.

#include "curves/autotangents_private.h"
#include "curves/spacetangents.h"
#include "curves/spacetangents_private.h"
#include "curves/tangents.h"
#include "frame/errors.h"
#include "keystore/lookup.h"
#include "tests/curves/keyedstream.h"

#include <cmath>

namespace {

class Handles : public StreamTest {};

constexpr int L = KFS_Interp_Linear, S = KFS_Interp_Spline, H = KFS_Interp_Hold;

// ---- plain keys

struct Turn {
    char const* why;
    int out, in;
    Handle first, second;  // of the two keys; values 5 and 5 after 1 and 3 seconds
    std::vector<int> times;
    std::vector<int> signs;  // of the second derivatives
};

constexpr double Third = 1.0 / 3.0;

Turn const Turns[] = {
    {"a hump", S, S, {0, 0, 6, Third}, {-6, Third, 0, 0}, {1200}, {-1}},
    {"a dip", S, S, {0, 0, -6, Third}, {6, Third, 0, 0}, {1200}, {1}},
    {"up and down again", S, S, {0, 0, 6, Third}, {6, Third, 0, 0}, {854, 1546}, {-1, 1}},
    {"straight", L, L, {0, 0, 6, Third}, {6, Third, 0, 0}, {}, {}},
    {"level", S, S, {0, 0, 0, Third}, {0, Third, 0, 0}, {}, {}},
    {"held", H, S, {0, 0, 6, Third}, {-6, Third, 0, 0}, {}, {}},
};

TEST_F(Handles, FindWhereAComponentTurns)
{
    for (Turn const& c : Turns) {
        SCOPED_TRACE(c.why);
        KeyedStream stream = MakeKeyed({{600, 5.0}, {1800, 5.0}}, L, {.dimension = 2});
        stream.Codes(0, L, c.out).Codes(1, c.in, L).SetHandle(0, c.first, 1).SetHandle(1, c.second, 1);
        int count = 99;
        T_Time times[2] = {{-1, 1}, {-1, 1}};
        double bends[2] = {};
        ASSERT_EQ(0, KFS_GetZeroVelocityPoints(stream, 0, 1, &count, times, bends));
        ASSERT_EQ(static_cast<int>(c.times.size()), count);
        for (std::size_t i = 0; i < c.times.size(); ++i) {
            EXPECT_EQ(c.times[i], times[i].value);
            EXPECT_EQ(600U, times[i].scale);
            EXPECT_GT(bends[i] * c.signs[i], 1.0);
        }
        ASSERT_EQ(0, KFS_GetZeroVelocityPoints(stream, 0, 1, &count, times, nullptr));
        EXPECT_EQ(KFS_Err_TimeOutsideKeys, KFS_GetZeroVelocityPoints(stream, 1, 0, &count, times, nullptr));
        EXPECT_REPORT(reports, 100, "time is before first keyframe or after last");
        EXPECT_EQ(0, stream.Pins());
    }
}

TEST_F(Handles, OnlyTheFirstComponentsTinySpeedIsNone)
{
    KeyedStream stream = MakeKeyed({{0, 0.0}, {600, 10.0}, {1800, 40.0}}, S, {.dimension = 2});
    for (int i = 0; i < 2; ++i) stream.SetHandle(1, {-5e-11, 0.3, 1.5e-10, 0.3}, i);
    double in[2] = {}, out[2] = {};
    ASSERT_EQ(0, KFS_GetKeyVelocityF(stream, 1, 0, in, out));
    EXPECT_EQ((std::array{0.0, -5e-11, 1.5e-10}), (std::array{in[0], in[1], out[0]}));
}

// ---- tangents of a path

TEST_F(Handles, TangentsOfACurvedPathLieInOneLineHoweverLongTheyAre)
{
    struct Row {
        char const* why;
        Vector given, other, turned;
    } const rows[] = {
        {"its length stays", {3, 4}, {0, 5}, {-3, -4}},
        {"too long to be squared", {3e200, 4e200}, {0, 5}, {-3, -4}},
        {"all of it in the first component", {3e160, 0}, {6e160, 8e160}, {-1e161, 0}},
        {"the other too long", {0, -2}, {4e200, 3e200}, {0, 5e200}},
        {"more than a number holds", {1, 1}, {1.5e308, 1.5e308}, {-1.5e308, -1.5e308}},
        {"too short to be squared, so its own length", {3e-200, 4e-200}, {0, 5}, {-3e-200, -4e-200}},
    };
    for (Row const& row : rows) {
        for (bool const in : {false, true}) {
            SCOPED_TRACE(testing::Message() << row.why << in);
            PathStream stream({{0, {0, 0}}, {100, {5, 5}}, {200, {9, 0}}});
            stream.Tangents(1, row.other, row.other).Record(1)->spFlags = KFS_KeySpFlag_Continuous;
            double const* const given = row.given.data();
            ASSERT_EQ(0, KFS_SetKeySpaceTangentsF(stream, 1, 0, in ? given : nullptr, in ? nullptr : given));
            KFSp_SpatialRuns<double> const runs = KFSp_GetSpatialRuns(stream.Record(1), 2);
            for (std::size_t i = 0; i < 2; ++i) {
                EXPECT_EQ(row.given[i], (in ? runs.inTangent : runs.outTangent)[i]);
                double const turned = (in ? runs.outTangent : runs.inTangent)[i];
                EXPECT_NEAR(row.turned[i], turned, 1e-12 * std::fabs(row.turned[0] + row.turned[1]));
            }
        }
    }
}

TEST_F(Handles, TangentsCountAsEditedWhenTheCopyFails)
{
    PathStream stream({{0, {0, 0}}, {100, {5, 5}}, {200, {9, 0}}});
    stream.Flag(1, KFS_KeyFlag_TangentsSet, false).Record(1)->spFlags = KFS_KeySpFlag_Modifiable;
    stream->SetCopyItemFunc([](KFS_Stream const*, long, short, void const*, void*) { return 4711; });
    double const given[2] = {1, 2};
    EXPECT_EQ(4711, KFS_SetKeySpaceTangents(stream, 1, 0, given, given));
    stream->SetCopyItemFunc(nullptr);
    EXPECT_NE(0, stream.Record(1)->flags & KFS_KeyFlag_TangentsSet);
    EXPECT_EQ(0U, stream.Record(1)->spFlags);
    EXPECT_EQ((std::array{0, 2}), stream.ArcStale());
    EXPECT_EQ(0, stream.Pins());
}

TEST_F(Handles, SpatialFlagsOfARecordWithoutThemAreNone)
{
    KeyedStream plain = MakeKeyed({{0, 1}, {100, 2}}, L);
    std::vector<unsigned char> const before = plain.Bytes();
    EXPECT_EQ(0, KFSp_SetKeySpaceFlags(plain, 3, 0));
    EXPECT_EQ(0, KFS_SetKeySpFlags(plain, 0, 3, 3));
    EXPECT_EQ(SEQ_Err_BadIndex, KFSp_SetKeySpaceFlags(plain, 1, 9));
    EXPECT_EQ(before, plain.Bytes());
}

// ---- a client's values, which hold no handles and may have no room for any

int InterpolateCustom(KFS_Stream const*, long, int, int)
{
    return 0;
}

KFS_ValueDesc CustomValue(unsigned short size)
{
    return {1, size, 5, &InterpolateCustom};
}

TEST_F(Handles, CustomKeysHoldNone)
{
    for (unsigned short const size : {4, 8, 16}) {
        SCOPED_TRACE(size);
        KFS_Stream stream(1, 600, 0, 0, KFS_InterpMask_All, 0, CustomValue(size), nullptr, nullptr, false);
        auto const bytes = [&](int key) {
            std::vector<unsigned char> all(16);
            std::fill_n(all.begin(), size, static_cast<unsigned char>(key + 1));
            return all;
        };
        for (int k = 0; k < 3; ++k) {
            T_Time const time{600 * k, 600};
            ASSERT_EQ(0, KFS_InsertKey(&stream, &time, 1, bytes(k).data(), k == 0 ? L : S, k == 0 ? L : S));
        }
        double const number = 0.5, x = -0.5;
        EXPECT_EQ(0, KFS_SetKeyTangentsF(&stream, 1, &x, &x, &number, &number, 1.0));
        EXPECT_EQ(0, KFS_SetKeyVelocityF(&stream, 1, &number, &number));
        EXPECT_EQ(0, KFS_SetKeyVelocity(&stream, 1, bytes(1).data(), bytes(1).data()));
        EXPECT_EQ(0, KFS_SetKeyInfluence(&stream, 1, &number, &number));
        for (int k = 0; k < 3; ++k) {
            std::vector<unsigned char> stored(16);
            EXPECT_EQ(0, KFS_GetKey(&stream, k, stored.data(), nullptr, nullptr));
            EXPECT_EQ(bytes(k), stored);
        }
        EXPECT_TRUE(stream.IsCustom());
        double a = 9.0, b = 9.0, c = 9.0, d = 9.0, e = 9.0, f = 9.0;
        EXPECT_EQ(0, KFS_GetKeyTangentsF(&stream, 1, &a, &b, &c, &d));
        EXPECT_EQ(0, KFS_GetKeyVelocityF(&stream, 1, 0, &e, &f));
        for (double const answer : {a, b, c, d, e, f}) EXPECT_EQ(0.0, answer);
        unsigned char clamped = 0;
        a = b = 100.0;
        EXPECT_EQ(0, KFS_GetClampedVelInflF(&stream, 1, 0, &a, &b, &a, &b, &clamped));
        EXPECT_EQ(0, clamped);
        bool const fits = size == 8;
        a = b = 9.0;
        EXPECT_EQ(fits ? 0 : KFS_Err_CustomNotAllowed, KFS_GetKeyInfluence(&stream, 1, &a, &b));
        EXPECT_EQ(fits ? 0.16666666667 : 9.0, a);
        EXPECT_EQ(fits ? 0.16666666667 : 9.0, b);
        std::vector<Reported> const refused{
            KfsReport(54, "Attempting to get the key influence of a custon non-spatial stream.")};
        EXPECT_EQ(fits ? std::vector<Reported>{} : refused, reports.Take());
    }
    KeyedStream plain = MakeKeyed({{0, 0.0}, {600, 10.0}, {1800, 40.0}}, S);
    std::vector<unsigned char> const before = plain.Bytes();
    plain->MarkTemporarilyNonCustom(true);  // the records count as a client's meanwhile
    EXPECT_EQ(0, KFSp_SetDefaultKeyframeTangents(plain, 600, 3, plain.Record(1)));
    plain->MarkTemporarilyNonCustom(false);
    plain->GetValueDescForModify()->isCustom = 1;
    EXPECT_EQ(0, KFSp_SetDefaultKeyframeTangents(plain, 600, 3, plain.Record(1)));
    plain->GetValueDescForModify()->isCustom = 0;
    EXPECT_EQ(before, plain.Bytes());
}

// The doubles' description isn't what a cached custom value is disposed by.
TEST_F(Handles, ACachedCustomValueIsDisposedAsWhatItIs)
{
    KFS_Stream stream(1, 600, 0, 0, KFS_InterpMask_All, 0, CustomValue(8), nullptr, nullptr, false);
    long const value = 1;
    T_Time const time{0, 600};
    ASSERT_EQ(0, KFS_InsertKey(&stream, &time, 1, &value, L, L));
    ASSERT_EQ(0, SEQ_GetItemCopy(stream.GetKeys(), 0, 0, stream.GetCache()));
    static std::vector<long> disposedWith;
    disposedWith.clear();
    stream.SetDisposeItemFunc([](KFS_Stream const*, long refcon, short, void*) {
        disposedWith.push_back(refcon);
        return 0;
    });
    double const speed = 1.0;
    ASSERT_EQ(0, KFS_SetKeyVelocityF(&stream, 0, &speed, &speed));
    stream.SetDisposeItemFunc(nullptr);
    EXPECT_EQ(std::vector<long>{5}, disposedWith);
    EXPECT_TRUE(KFSp_CacheIsEmpty(stream.GetCache()));
}

}  // namespace
