#include "curves/autotangents_private.h"

#include "tests/curves/threekeys.h"

namespace {

using AutoTangentsTest = StreamTest;
using Vec = std::vector<double>;

// ---- the path

struct Path {
    char const* why;
    Vec prevIn, nextOut;
    bool modifiable;
    bool straight;
};

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
