#include "keystore/attributes.h"

#include "keystore/attributes_private.h"
#include "tests/support/streams.h"

namespace {

class Attributes : public StreamTest {};

constexpr StreamOptions Spatial2D{.dimension = 2, .spatial = true};

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
            std::string const text =
                "spatial interpolation method not allowed for this stream (" + std::to_string(code) + ").";
            EXPECT_EQ(permitted ? std::vector<Reported>{} : std::vector{KfsReport(15, text)}, reports.Take());
        }
        EXPECT_EQ(7431, KFSp_CanDoSpInterp(stream, 0xFFFF));
        reports.Take();
    }
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
    double const accuracy = -0.5;
    ASSERT_EQ(0, KFS_SetStreamAccuracy(two, &accuracy, nullptr));
    EXPECT_EQ(0.25, two->GetAccuracy()) << "kept squared";
    ASSERT_EQ(0, KFS_GetStreamAccuracy(two, now));
    EXPECT_EQ(0.5, now[0]);
}

// A mark reaches back by a short; of a clone all keys are marked.
TEST_F(Attributes, ALongStreamIsMarkedFromEndToEnd)
{
    TestStream stream(Spatial2D);
    for (int i = 0; i < 70000; ++i) stream.Key(i, {1.0 * i, 0.0});
    stream->SetKFSFlags(stream->GetKFSFlags() & ~KFS_StreamFlag_SParametrize);  // chords: quick to repair
    ASSERT_EQ(0, stream->UpdateStream());
    EXPECT_EQ(0, KFS_SetStreamSParametrize(stream, 1));
    EXPECT_EQ((std::array{0, 69999}), stream.Stale());
    EXPECT_EQ((std::array{0, 69999}), stream.ArcStale());
    std::unique_ptr<KFS_Stream> const clone(stream->CloneLeaf({true, false}));
    for (int const* const range : {clone->GetInvalidKeyIndex(), clone->GetArcInvalidKeyIndex()})
        EXPECT_EQ((std::pair{0, 69999}), (std::pair{range[0], range[1]}));
}

}  // namespace
