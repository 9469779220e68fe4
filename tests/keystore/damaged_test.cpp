#include "keystore/attributes.h"
#include "keystore/copykeys.h"
#include "keystore/edit.h"
#include "keystore/evaluate.h"
#include "keystore/items.h"
#include "keystore/keyflags.h"
#include "keystore/lookup.h"
#include "tests/support/streams.h"

#include <functional>

namespace {

using Damaged = StreamTest;

TEST_F(Damaged, AStreamIsRefusedByEveryFunctionUntouched)
{
    DamagedStream const damaged;
    KFS_Stream* s = damaged.get();
    TestStream good;
    good.Key(0, {1.0});
    KFS_Stream* g = good;
    T_Time const at{5, 600};
    double number = 77.0;
    unsigned char atKey = 9;
    unsigned short flags = 77;
    char code = 77;
    int index = 77;
    T_Time time{};
    char** handle = nullptr;
    auto const never = [](KFS_Stream*, long, int, KFS_KeyScalar*) { return 99; };
    struct Row {
        int operation;
        char const* action;
        std::function<int()> call;
    };
    Row const rows[] = {
        {5, "duplicate", [&] { return KFSp_Boundary([&] {
                                   KFS_Stream(*s, KFS_CloneStreamParams{true, true});
                               }); }},
        {7, "time stream rescale", [&] { return KFS_RescaleStream(s, 30); }},
        {8, "merge", [&] { return KFS_MergeStream(s, nullptr, &g); }},
        {8, "merge", [&] { return KFS_MergeStream(g, nullptr, &s); }},
        {9, "set value description", [&] { return KFS_SetValueDescription(s, nullptr, nullptr); }},
        {10, "alter time-varyingness of", [&] { return s->SetConstant(1, 1); }},
        {16, "set imask", [&] { return KFS_SetStreamIMask(s, 1); }},
        {17, "insert a key value into", [&] { return KFS_InsertKey(s, nullptr, 0, &number, 0, 0); }},
        {18, "remove a key value from", [&] { return KFS_RemoveKey(s, 0, &number); }},
        {19, "copy a key value from", [&] { return KFS_CopyKey(s, 0, 0, nullptr, g, &index); }},
        {19, "copy a key value to", [&] { return KFS_CopyKey(g, 0, 0, nullptr, s, &index); }},
        {21, "copy a key value from", [&] { return KFS_CopyKeys(s, nullptr, g); }},
        {21, "copy a key value to", [&] { return KFS_CopyKeys(g, nullptr, s); }},
        {22, "get a key value from", [&] { return KFS_FindKeyTime(s, &at, 0, nullptr, &index, nullptr); }},
        {23, "inquire about a key value in", [&] { return KFS_FindNearestKeyTime(s, &at, &index, nullptr); }},
        {24, "inquire about a key value in", [&] { return KFS_TimeToIndex(s, &at, &index); }},
        {25, "inquire about a key value in", [&] { return KFS_IndexToTime(s, 0, &time); }},
        {26, "inquire about a key value in", [&] { return KFS_GetKeyIndex(s, &at, &index, nullptr); }},
        {27, "alter a key value in", [&] { return KFS_SetKey(s, 0, &number, 0, 0); }},
        {28, "get a value from", [&] { return KFS_GetKey(s, 0, &number, nullptr, nullptr); }},
        {28, "get a value from", [&] { return KFS_GetKeyF(s, 0, &number, nullptr, nullptr); }},
        {34, "iterate over", [&] { return KFS_ForRange(s, nullptr, nullptr, 0, never, nullptr); }},
        {35, "iterate over", [&] { return KFS_ForIndexRange(s, 0, 0, 0, never, nullptr); }},
        {36, "get a value from",
         [&] { return KFSp_Boundary([&] { KFS_GetValueNoExpr(s, 0, 0, &number, &atKey, nullptr, nullptr, 0); }); }},
        {36, "get a value from",
         [&] { return KFSp_Boundary([&] { KFS_GetValueFNoExpr(s, 0, 0, &number, &atKey, nullptr); }); }},
        {39, "set custom functions in", [&] { return KFS_SetCustomFuncs(s, nullptr, nullptr); }},
        {44, "inquire about a key value in", [&] { return KFS_ChooseInterps(s, nullptr, &code, &code); }},
        {47, "set spatial imask", [&] { return KFS_SetStreamSpIMask(s, 1); }},
        {49, "set spatial interp", [&] { return KFS_SetStreamSpInterp(s, 1); }},
        {50, "set spatial interp", [&] { return KFS_SetStreamSParametrize(s, 1); }},
        {72, "inquire about a key value in", [&] { return KFS_GetKeyFlags(s, 0, &flags); }},
        {73, "alter a key value in", [&] { return KFS_SetKeyFlags(s, 0, 1, 1); }},
        {88, "set value description", [&] { return KFS_SetStreamAccuracy(s, &number, &number); }},
        {89, "dispose", [&] { return KFS_DisposeRemapTables(s); }},
        {92, "alter a key value in", [&] { return KFS_SetKeyF(s, 0, &number, 0, 0); }},
        {94, "alter a key value in", [&] { return KFS_InsertKeyF(s, nullptr, 0, &number, 0, 0); }},
        {102, "set value description", [&] { return KFS_SetStreamMultiplier(s, &number, &number); }},
        {105, "dispose", [&] { return KFS_DisposeValue(s, &number); }},
        {113, "get a value from", [&] { return KFS_GetValue(s, &at, 0, &number, &atKey, nullptr); }},
        {113, "get a value from", [&] { return KFS_GetValuePlus(s, &at, 0, &number, &atKey, nullptr, nullptr, 0); }},
        {113, "get a value from", [&] { return KFS_GetValueF(s, &at, 0, &number, &atKey, nullptr); }},
        {113, "get a value from", [&] { return KFS_GetValueFPlus(s, &at, 0, &number, &atKey, nullptr); }},
        {115, "get a value from", [&] { return KFS_GetValuesFPlus(s, &at, &at, 1, 0, &handle); }},
        {117, "set value description", [&] { return KFS_GetStreamAccuracy(s, &number); }},
        {118, "set value description", [&] { return KFS_GetStreamMultiplier(s, &number); }},
    };
    for (Row const& row : rows) {
        SCOPED_TRACE(testing::Message() << row.operation << " " << row.action);
        index = KFS_INVALID_INDEX;
        EXPECT_EQ(2, row.call());
        EXPECT_EQ(std::vector{DamagedReport(row.operation, row.action)}, reports.Take());
        EXPECT_EQ(KFS_INVALID_INDEX, index);
    }
    EXPECT_TRUE(damaged.Untouched());
    EXPECT_EQ(1, good.Count());
    EXPECT_EQ(77.0, number);
    EXPECT_EQ(9, atKey);
    EXPECT_EQ(77, flags);
    EXPECT_EQ(0, code) << "nothing is proposed";
}

}  // namespace
