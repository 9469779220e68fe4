#include "keystore/attributes.h"

#include "keystore/attributes_private.h"
#include "tests/support/listening.h"
#include "tests/support/streams.h"

#include <functional>
#include <stdexcept>

namespace {

class Attributes : public StreamTest {};

constexpr StreamOptions Spatial2D{.dimension = 2, .spatial = true};

void FillCurvedPath(TestStream& stream)
{
    stream.Key(0, {0.0, 0.0}).Key(100, {10.0, 40.0}).Key(200, {50.0, 0.0});
}

TEST_F(Attributes, MergingLeavesBothStreamsAlone)
{
    TestStream a, b;
    a.Key(0, {1.0});
    b.Key(5, {2.0}).Key(9, {3.0});
    auto const bytes = a.Bytes();
    T_Time const at{3, 600};
    KFS_Stream* other = b.get();
    EXPECT_EQ(0, KFS_MergeStream(a, &at, &other));
    EXPECT_EQ(b.get(), other);
    EXPECT_EQ(bytes, a.Bytes());
    EXPECT_EQ(2, b.Count());
}

TEST_F(Attributes, ASpatialSettingIsPermittedByTheTemporalMask)
{
    for (unsigned mask = 0; mask < 16; ++mask) {
        TestStream const stream(
            {.dimension = 2, .spatial = true, .interpMask = static_cast<unsigned short>(mask), .spInterpMask = 0});
        for (unsigned code = 0; code < 20; ++code) {
            SCOPED_TRACE(testing::Message() << "mask " << mask << " code " << code);
            ASSERT_EQ(0, KFS_SetStreamSpIMask(stream, code % 2 ? 0 : 0xFFFF)) << "which has no say";
            bool const permitted = code == 0 || ((mask << 1 >> code) & 1) != 0;
            unsigned const expected = permitted ? code : stream->GetSpInterp();
            EXPECT_EQ(permitted ? 0 : 7431, KFS_SetStreamSpInterp(stream, static_cast<unsigned short>(code)));
            EXPECT_EQ(expected, stream->GetSpInterp());
            if (!permitted) {
                EXPECT_REPORT(reports, 15,
                              "spatial interpolation method not allowed for this stream (" + std::to_string(code) +
                                  ").");
            }
        }
        EXPECT_EQ(7431, KFSp_CanDoSpInterp(stream, 0xFFFF));
        reports.Take();
    }
}

TEST_F(Attributes, AccuracyIsKeptSquared)
{
    TestStream const stream;
    double accuracy = 0.0;
    double const half = -0.5;
    EXPECT_EQ(0, KFS_SetStreamAccuracy(stream, &half, &accuracy));
    EXPECT_DOUBLE_EQ(0.01, accuracy);
    EXPECT_EQ(0, KFS_SetStreamAccuracy(stream, nullptr, nullptr));
    EXPECT_EQ(0.25, stream->GetAccuracy());
    EXPECT_EQ(0, KFS_GetStreamAccuracy(stream, &accuracy));
    EXPECT_EQ(0.5, accuracy);
}

TEST_F(Attributes, DimensionsShareTheFourComponentsOfTheMultiplier)
{
    TestStream const six({.dimension = 6, .spatial = true});
    double const first[6] = {2.0, 3.0, 4.0, 5.0, 6.0, 7.0};
    double old[7] = {77.0, 77.0, 77.0, 77.0, 77.0, 77.0, 77.0};
    ASSERT_EQ(0, KFS_SetStreamMultiplier(six, first, old));
    EXPECT_EQ((std::vector{1.0, 1.0, 1.0, 1.0, 2.0, 3.0, 77.0}), std::vector(old, old + 7))
        << "old and new go component by component";
    double now[6];
    ASSERT_EQ(0, KFS_GetStreamMultiplier(six, now));
    EXPECT_EQ((std::vector{6.0, 7.0, 4.0, 5.0, 6.0, 7.0}), std::vector(now, now + 6));
    TestStream const two(Spatial2D);
    ASSERT_EQ(0, KFS_SetStreamMultiplier(two, first, nullptr));
    EXPECT_EQ((M_Vector4T<double>{{2.0, 3.0, 1.0, 1.0}}), two->GetMultiplier());
}

TEST_F(Attributes, OnlyASpatialStreamHasAMultiplierAndArcs)
{
    TestStream const plain({.dimension = 2});
    double number = 77.0;
    EXPECT_EQ(7434, KFS_GetStreamMultiplier(plain, &number));
    EXPECT_REPORT(reports, 102, "attempt to set multiplier of a non-spatial stream.");
    EXPECT_EQ(7434, KFS_SetStreamMultiplier(plain, &number, &number));
    EXPECT_REPORT(reports, 102, "attempt to set multiplier of a non-spatial stream.");
    EXPECT_EQ(77.0, number);
    EXPECT_EQ(7434, KFS_SetStreamSParametrize(plain, 1));
    EXPECT_REPORT(reports, 50, "stream isn#{rsquo}t spatial");
    EXPECT_FALSE(plain->IsSParametrized());
}

// What a change must not leave behind: the value that was computed before it.
TEST_F(Attributes, AReadAfterAChangeIsThatOfAStreamThatAlwaysWasSo)
{
    double const multiplier[2] = {1.0, 20.0};
    const std::function<int(KFS_Stream*)> changes[] = {
        [&](KFS_Stream* stream) { return KFS_SetStreamMultiplier(stream, multiplier, nullptr); },
        [](KFS_Stream* stream) { return KFS_SetStreamSParametrize(stream, 0); },
        [](KFS_Stream* stream) { return KFS_RescaleStream(stream, 1200) + KFS_RescaleStream(stream, 600); },
    };
    for (auto const& change : changes) {
        TestStream changed(Spatial2D), fresh(Spatial2D);
        FillCurvedPath(changed);
        ASSERT_EQ(0, change(fresh));
        FillCurvedPath(fresh);
        for (int time = 5; time <= 195; time += 10) {
            changed.At(time);  // leaves a computed value behind
            ASSERT_EQ(0, change(changed));
            EXPECT_EQ(fresh.At(time), changed.At(time)) << "change " << &change - changes << " at " << time;
        }
    }
}

TEST_F(Attributes, AChangedParametrizationMarksAllKeysAndAlwaysNotifies)
{
    HeardRoot root;
    TestStream stream(Spatial2D);
    FillCurvedPath(stream);
    root.Store(stream);
    ValueListener listener;
    ASSERT_EQ(0, stream->UpdateStream());
    EXPECT_EQ(0, KFS_SetStreamSParametrize(stream, 1));
    EXPECT_EQ(TestStream::NotStale, stream.Stale());
    EXPECT_EQ(1, listener.Take()) << "no change, but heard";
    EXPECT_EQ(0, KFS_SetStreamSParametrize(stream, 0));
    EXPECT_FALSE(stream->IsSParametrized());
    EXPECT_EQ((std::array{0, 2}), stream.Stale());
    EXPECT_EQ((std::array{0, 2}), stream.ArcStale());
    EXPECT_EQ(1, listener.Take());
    ASSERT_EQ(0, stream->UpdateStream());
    double const multiplier[2] = {2.0, 2.0};
    EXPECT_EQ(0, KFS_SetStreamMultiplier(stream, nullptr, nullptr));
    EXPECT_EQ(TestStream::NotStale, stream.ArcStale());
    EXPECT_EQ(0, listener.Take()) << "nothing was set";
    EXPECT_EQ(0, KFS_SetStreamMultiplier(stream, multiplier, nullptr));
    EXPECT_EQ((std::array{0, 2}), stream.Stale());
    EXPECT_EQ((std::array{0, 2}), stream.ArcStale());
    EXPECT_EQ(1, listener.Take());
    EXPECT_EQ(0, KFS_SetStreamIMask(stream, 1));
    EXPECT_EQ(0, KFS_SetStreamSpIMask(stream, 1));
    EXPECT_EQ(0, KFS_SetStreamSpInterp(stream, 1));
    EXPECT_EQ(0, KFS_SetStreamAccuracy(stream, multiplier, nullptr));
    EXPECT_EQ(0, listener.Take()) << "masks, settings and accuracy are silent";
}

// A mark reaches back by a short.
TEST_F(Attributes, ALongStreamIsMarkedFromEndToEnd)
{
    TestStream stream(Spatial2D);
    for (int i = 0; i < 70000; ++i) stream.Key(i, {1.0 * i, 0.0});
    stream->SetKFSFlags(stream->GetKFSFlags() & ~KFS_StreamFlag_SParametrize);  // chords: quick to repair
    ASSERT_EQ(0, stream->UpdateStream());
    EXPECT_EQ(0, KFS_SetStreamSParametrize(stream, 1));
    EXPECT_EQ((std::array{0, 69999}), stream.Stale());
    EXPECT_EQ((std::array{0, 69999}), stream.ArcStale());
}

TEST_F(Attributes, AListenersExceptionBecomesTheResult)
{
    HeardRoot root;
    TestStream stream(Spatial2D);
    FillCurvedPath(stream);
    root.Store(stream);
    double const multiplier[2] = {2.0, 3.0};
    {
        ValueListener listener([] { throw 815; });
        EXPECT_EQ(815, KFS_SetStreamSParametrize(stream, 0));
        EXPECT_EQ(815, KFS_SetStreamMultiplier(stream, multiplier, nullptr));
        EXPECT_EQ(815, stream->SetConstant(1, 0));
    }
    EXPECT_FALSE(stream->IsSParametrized());
    EXPECT_EQ(3.0, stream->GetMultiplier()[1]);
    EXPECT_TRUE(stream->HasNoKeys());
    EXPECT_NO_REPORT(reports);
    ValueListener listener([] { throw std::runtime_error("a listener"); });
    EXPECT_EQ(Q_Err_Exception, KFS_SetStreamSParametrize(stream, 1));
    ASSERT_EQ(1u, reports.Take().size());
}

}  // namespace
