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

TEST(ParamDef, ThreeKindsOwnANameAndCopiesAreDeep)
{
    const Q_MemoryCount before = Q_MemoryLive("paramdef name field");
    for (int kind = -1; kind < 40; ++kind) {
        SCOPED_TRACE(kind);
        bool const owns = kind == FX_Param_BOOL || kind == FX_Param_CHOICE || kind == FX_Param_LABEL;
        FX_ParamDef source = OfKind(kind), copy = OfKind(FX_Param_CHOICE);
        u16str const name = Text(owns ? "schön" : "");
        EXPECT_EQ(owns, FX_ParamDef_HasParamName(&source));
        FX_ParamDef_SetParamName(&copy, Text("to be replaced"), false);
        FX_ParamDef_SetParamName(&source, Text("schön"), false);
        FX_ParamDef_Copy(source, &copy);
        KFS_DeleteParamDefInternalString(&source);
        FX_ParamDef_Copy(copy, &copy);  // onto itself
        EXPECT_EQ(name, FX_ParamDef_GetParamName(&copy));
        EXPECT_TRUE(FX_ParamDef_GetParamName(&source).empty());
        // An empty name is kept where it is asked for.
        for (bool const keepEmpty : {true, false}) {
            FX_ParamDef_SetParamName(&copy, u16str(), keepEmpty);
            EXPECT_TRUE(FX_ParamDef_GetParamName(&copy).empty());
            EXPECT_EQ(before.blocks + (owns && keepEmpty ? 1 : 0), Q_MemoryLive("paramdef name field").blocks);
        }
    }
    EXPECT_EQ(before, Q_MemoryLive("paramdef name field"));
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
    EXPECT_TRUE(def.value.floatSlider.precision == 3 && def.value.floatSlider.displayFlags == 5);
}

}  // namespace
