#include "tree/paramdef.h"

#include "frame/services/memory.h"
#include "tests/support/text.h"

#include <gtest/gtest.h>

namespace {

FX_ParamDef OfKind(int kind)
{
    FX_ParamDef def{};
    def.paramType = kind;
    return def;
}

TEST(ParamDef, OnlyThreeKindsOwnAName)
{
    for (int kind = -1; kind < 40; ++kind) {
        FX_ParamDef const def = OfKind(kind);
        bool const owns = kind == FX_Param_BOOL || kind == FX_Param_CHOICE || kind == FX_Param_LABEL;
        EXPECT_EQ(owns, FX_ParamDef_HasParamName(&def)) << kind;
    }
}

TEST(ParamDef, CopiesAreDeepAndLeaveNothingBehind)
{
    const Q_MemoryCount before = Q_MemoryLive("paramdef name field");
    for (int const kind : {FX_Param_BOOL, FX_Param_CHOICE, FX_Param_LABEL}) {
        FX_ParamDef source = OfKind(kind);
        FX_ParamDef copy = OfKind(FX_Param_CHOICE);
        FX_ParamDef_SetParamName(&copy, Text("to be replaced"), false);
        FX_ParamDef_SetParamName(&source, Text("schön"), false);
        FX_ParamDef_Copy(source, &copy);
        KFS_DeleteParamDefInternalString(&source);
        EXPECT_EQ(Text("schön"), FX_ParamDef_GetParamName(&copy)) << kind;
        EXPECT_TRUE(FX_ParamDef_GetParamName(&source).empty());
        FX_ParamDef_Copy(copy, &copy);
        EXPECT_EQ(Text("schön"), FX_ParamDef_GetParamName(&copy)) << "onto itself";
        KFS_DeleteParamDefInternalString(&copy);
    }
    EXPECT_EQ(before, Q_MemoryLive("paramdef name field"));
}

TEST(ParamDef, EmptyNamesAreKeptOnlyWhenAsked)
{
    FX_ParamDef def = OfKind(FX_Param_CHOICE);
    FX_ParamDef_SetParamName(&def, u16str(), false);
    EXPECT_EQ(nullptr, def.value.choice.paramName);
    FX_ParamDef_SetParamName(&def, u16str(), true);
    ASSERT_NE(nullptr, def.value.choice.paramName);
    EXPECT_STREQ("", def.value.choice.paramName);
    KFS_DeleteParamDefInternalString(&def);
    FX_ParamDef slider = OfKind(FX_Param_FLOAT_SLIDER);
    FX_ParamDef_SetParamName(&slider, Text("ignored"), true);
    EXPECT_TRUE(FX_ParamDef_GetParamName(&slider).empty());
}

TEST(ParamDef, WithoutMemoryTheFieldStaysNull)
{
    FX_ParamDef def = OfKind(FX_Param_LABEL);
    FX_ParamDef_SetParamName(&def, Text("a"), false);
    Q_FailAllocation(1);
    EXPECT_THROW(FX_ParamDef_SetParamName(&def, Text("b"), false), int);
    Q_FailAllocation(0);
    EXPECT_EQ(nullptr, def.value.named.paramName);
}

// The integer sliders' minimum and the float slider's precision and display flags share four bytes; unit names rely on
// it.
TEST(ParamDef, SlidersOverlayAndNamesAreCutToTheirPlace)
{
    FX_ParamDef def{};
    FX_ParamDef_SetName(&def, Text("0123456789012345678901234567890123456789"));
    EXPECT_EQ(Text("0123456789012345678901234567890"), FX_ParamDef_GetName(&def));
    def.value.fixedSlider.validMin = 0x00050003;
    EXPECT_EQ(3, def.value.floatSlider.precision);
    EXPECT_EQ(5, def.value.floatSlider.displayFlags);
}

}  // namespace
