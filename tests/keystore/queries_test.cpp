#include "keystore/lookup.h"

#include "tests/support/listening.h"
#include "tests/support/streams.h"
#include "tests/support/text.h"

#include <cmath>
#include <limits>

namespace {

class Queries : public StreamTest {};

TEST_F(Queries, AnimatedMeansKeysOrAnExpressionThatRuns)
{
    TestStream const stream({.noKeys = true});
    struct Row {
        char const* why;
        char const* expression;
        unsigned flags;
        char const* error;
        bool active, any;
    } const rows[] = {
        {"nothing", "", 0, "", false, false},
        {"an expression", "time", 0, "", true, true},
        {"switched off", "time", KFS_ExprFlag_Disabled, "", false, true},
        {"with an error", "time", 0, "no such thing", false, true},
        {"an error alone", "", 0, "no such thing", false, false},
    };
    for (Row const& row : rows) {
        SCOPED_TRACE(row.why);
        stream->GetExprInfoForModify().SetExpression(Text(row.expression));
        stream->GetExprInfoForModify().SetFlags(row.flags);
        stream->GetExprInfoForModify().SetExpressionError(Text(row.error), -1, u16str());
        EXPECT_EQ(row.active, stream->IsAnimated(false));
        EXPECT_EQ(row.any, stream->IsAnimated(true));
        EXPECT_TRUE(stream->IsModified()) << "a leaf's value counts as modified";
    }
    stream->GetExprInfoForModify().clear();
    ASSERT_EQ(0, stream->SetConstant(0, 0));
    EXPECT_TRUE(stream->IsAnimated(false)) << "keys, though there is none yet";
    stream->SetCanonical(true);
    EXPECT_FALSE(stream->IsModified());
}

FX_ParamDef MakeDef(int kind, unsigned flags = 0)
{
    FX_ParamDef def{};
    def.paramType = kind;
    def.paramFlags = flags;
    switch (kind) {
    case FX_Param_INT_SLIDER: def.value.intSlider = {-5, 6, -2, 3, 0}; break;
    case FX_Param_FIXED_SLIDER: def.value.fixedSlider = {-98304, 98304, -65536, 32768, 0, 2, 0}; break;
    case FX_Param_FIXED_ANGLE: def.value.fixedAngle = {0, -65536, 131072}; break;
    case FX_Param_CHOICE: def.value.choice = {5, 1, nullptr}; break;
    case FX_Param_FLOAT_SLIDER: def.value.floatSlider = {3, 0, -0.5f, 8.25f, 0.0f, 1.0f, 0.0f, 0}; break;
    default: break;
    }
    return def;
}

TEST_F(Queries, MasksFlagsAndKindsSayHowItMayBeAnimated)
{
    for (unsigned short const mask : {0, 1, 4, 7}) {
        for (unsigned const flags : {0u, FX_ParamFlag_CannotAnimate, FX_ParamFlag_HoldOnly}) {
            SCOPED_TRACE(testing::Message() << "mask " << mask << " flags " << flags);
            TestStream const stream({.interpMask = mask});
            stream->SetParamDef(MakeDef(FX_Param_FLOAT_SLIDER, flags));
            EXPECT_EQ(mask != 0 && flags != FX_ParamFlag_CannotAnimate, stream->CanBeAnimated());
            EXPECT_EQ(mask == 4 || flags == FX_ParamFlag_HoldOnly, stream->IsHoldOnly());
        }
    }
    TestStream const stream, nameless;
    stream->SetMatchName(KFS_MatchName("a kind", true));
    for (int kind = -1; kind < 20; ++kind) {
        stream->SetParamDef(MakeDef(kind));
        nameless->SetParamDef(MakeDef(kind));
        bool const cannot = kind == 0 || kind == 8 || kind == 9 || (kind >= 12 && kind <= 14);
        EXPECT_EQ(!cannot, stream->CanHaveExpression()) << kind;
        EXPECT_TRUE(nameless->CanHaveExpression()) << kind;
    }
    stream->SetInterpMask(0);
    EXPECT_FALSE(stream->CanHaveExpression()) << "what can't be animated";
}

TEST_F(Queries, SameHoldSameValue)
{
    TestStream hold({.interpMask = KFS_InterpMask_Hold});
    hold.Key(10, {1.0}, KFS_Interp_Hold).Key(20, {1.0}, KFS_Interp_Hold).Key(30, {2.0}, KFS_Interp_Hold);
    struct Row {
        int a, b;
        bool same;
    } const rows[] = {{10, 19, true},  {19, 20, false}, {5, 10, true}, {-99, 5, true},
                      {30, 999, true}, {5, 25, false},  {20, 20, true}};
    TestStream curve;
    curve.Key(10, {1.0}).Key(20, {1.0});
    for (Row const& row : rows) {
        SCOPED_TRACE(testing::Message() << row.a << " and " << row.b);
        T_Time const finer{row.b * 3, 1800};
        EXPECT_EQ(row.same, hold->SameValueAtTimes(hold.Time(row.a), finer, nullptr));
        EXPECT_EQ(row.a == row.b, curve->SameValueAtTimes(curve.Time(row.a), finer, nullptr))
            << "a curve isn't looked at";
    }
    hold->GetExprInfoForModify().SetExpression(Text("time"));
    EXPECT_FALSE(hold->SameValueAtTimes(hold.Time(10), hold.Time(19), nullptr)) << "an expression may answer anything";
    EXPECT_TRUE(hold->SameValueAtTimes(hold.Time(10), hold.Time(10), nullptr));
    TestStream constant({.noKeys = true});
    constant.Key(0, {1.0});
    EXPECT_TRUE(constant->SameValueAtTimes(constant.Time(-5), constant.Time(5), nullptr));
    TestStream const empty({.interpMask = KFS_InterpMask_Hold});
    EXPECT_EQ(7427, KFSp_Boundary(
                        [&] { static_cast<void>(empty->SameValueAtTimes(empty.Time(1), empty.Time(2), nullptr)); }));
    EXPECT_EQ(1u, reports.Take().size());
}

// Remembers what it was asked to evaluate.
class EvaluatingRoot : public HeardRoot {
public:
    int EvaluateExpression(KFS_Stream const* stream, T_Time const* time, double* values, void**,
                           KFS_ParamBag const*) override
    {
        asked = stream;
        values[0] = time->value;
        return 4711;
    }
    KFS_Stream const* asked = nullptr;
};

TEST_F(Queries, AnExpressionIsEvaluatedAtTheRoot)
{
    EvaluatingRoot root;
    HeardRoot middle;
    TestStream const stream;
    T_Time const at = stream.Time(7);
    double value = 0.0;
    EXPECT_EQ(1, stream->EvaluateExpression(&at, &value, nullptr, nullptr)) << "no root, no value";
    middle.SetParent(&root);
    middle.Store(stream);
    EXPECT_EQ(4711, stream->EvaluateExpression(&at, &value, nullptr, nullptr));
    EXPECT_EQ(stream.get(), root.asked);
    EXPECT_EQ(7.0, value);
}

// A leaf whose limits are those of its parameter record.
class LimitedStream : public KFS_Stream {
public:
    LimitedStream(short dimension, bool hasMin, bool hasMax)
        : KFS_Stream(dimension, 600, 0, 0, KFS_InterpMask_All, 0, {0, 0, KFS_Type_Double, nullptr}, nullptr, nullptr,
                     false),
          hasMin_(hasMin),
          hasMax_(hasMax)
    {}
    bool HasMinValue() const override { return hasMin_; }
    bool HasMaxValue() const override { return hasMax_; }
    double GetMinValue() const override { return own != 0.0 ? -own : KFS_Stream::GetMinValue(); }
    double GetMaxValue() const override { return own != 0.0 ? own : KFS_Stream::GetMaxValue(); }

    double own = 0.0;  // not 0: the class has limits of its own

private:
    bool hasMin_;
    bool hasMax_;
};

TEST_F(Queries, LimitsComeFromTheParameterRecord)
{
    struct Row {
        int kind;
        double min, max, uiMin, uiMax;
        int precision;
    } const rows[] = {
        {FX_Param_INT_SLIDER, -5.0, 6.0, -2.0, 3.0, 0},  {FX_Param_FIXED_SLIDER, -1.5, 1.5, -1.0, 0.5, 2},
        {FX_Param_FIXED_ANGLE, -1.0, 2.0, -1.0, 2.0, 0}, {FX_Param_BOOL, 0.0, 1.0, 0.0, 1.0, 0},
        {FX_Param_CHOICE, 1.0, 5.0, 1.0, 5.0, 0},        {FX_Param_FLOAT_SLIDER, -0.5, 8.25, 0.0, 1.0, 3},
        {FX_Param_COLOR, -1e9, 1e9, -1e9, 1e9, 0},       {FX_Param_GROUP, -1e9, 1e9, -1e9, 1e9, 0},
        {FX_Param_NotFilledIn, -1e9, 1e9, -1e9, 1e9, 0},
    };
    LimitedStream limited(1, true, true);
    for (Row const& row : rows) {
        SCOPED_TRACE(row.kind);
        limited.SetParamDef(MakeDef(row.kind));
        EXPECT_EQ(row.min, limited.GetMinValue());
        EXPECT_EQ(row.max, limited.GetMaxValue());
        EXPECT_EQ(row.uiMin, limited.GetUIMinValue());
        EXPECT_EQ(row.uiMax, limited.GetUIMaxValue());
        EXPECT_EQ(row.precision, limited.GetPrecision());
        limited.own = 42.0;
        bool const asksTheClass = row.kind == FX_Param_FIXED_ANGLE;
        EXPECT_EQ(asksTheClass ? -42.0 : row.uiMin, limited.GetUIMinValue());
        EXPECT_EQ(asksTheClass ? 42.0 : row.uiMax, limited.GetUIMaxValue());
        limited.own = 0.0;
        bool const isSlider = row.uiMin != row.min;
        limited.SetUIMinValue(-4.0);
        limited.SetUIMaxValue(2.0);
        EXPECT_EQ(isSlider ? -4.0 : row.uiMin, limited.GetUIMinValue());
        EXPECT_EQ(isSlider ? 2.0 : row.uiMax, limited.GetUIMaxValue());
        EXPECT_EQ(row.min, limited.GetMinValue()) << "the valid range is another";
    }
    TestStream const plain;
    plain->SetParamDef(MakeDef(FX_Param_FIXED_ANGLE));
    EXPECT_EQ(-32768.0, plain->GetMinValue()) << "an angle without limits has those of its numbers";
    EXPECT_EQ(32767.99998474121, plain->GetMaxValue());
    plain->SetParamDef(MakeDef(FX_Param_FIXED_SLIDER));
    plain->SetUIMinValue(0.1);
    plain->SetUIMaxValue(-1.5);
    EXPECT_EQ(6554, plain->GetParamDef().value.fixedSlider.sliderMin);
    EXPECT_EQ(-98304, plain->GetParamDef().value.fixedSlider.sliderMax);
    plain->SetUIMaxValue(1e300);
    EXPECT_EQ(std::numeric_limits<int>::max(), plain->GetParamDef().value.fixedSlider.sliderMax);
}

TEST_F(Queries, ALegalValueLiesWithinTheLimitsThatThereAre)
{
    constexpr double nan = std::numeric_limits<double>::quiet_NaN();
    constexpr double infinity = std::numeric_limits<double>::infinity();
    for (int const limits : {0, 1, 2, 3}) {
        SCOPED_TRACE(limits);
        bool const hasMin = limits & 1, hasMax = limits & 2;
        LimitedStream stream(5, hasMin, hasMax);
        stream.SetParamDef(MakeDef(FX_Param_FLOAT_SLIDER));
        auto const legalized = [&](std::vector<double> values) {
            stream.LegalizeValue(values.data());
            return values;
        };
        std::vector<double> const values{-7.0, 2.0, 8.25, 99.0, infinity};
        EXPECT_EQ((std::vector{hasMin ? -0.5 : -7.0, 2.0, 8.25, hasMax ? 8.25 : 99.0, hasMax ? 8.25 : infinity}),
                  legalized(values));
        for (double const number : legalized(std::vector<double>(5, nan)))
            EXPECT_TRUE(limits != 0 ? number == (hasMin ? -0.5 : 8.25) : std::isnan(number)) << "a NaN is a limit";
        for (bool const disable : {true, true, false}) stream.DisableLegalizeValue(disable);
        EXPECT_EQ(values, legalized(values)) << "disabled twice, enabled once";
    }
}

// The flags of a fixed slider are looked for in two places, of which one is the integer part of its minimum.
TEST_F(Queries, UnitsAndComponentsHaveNames)
{
    struct Row {
        int kind;
        short dimension;
        int wholeMin;  // of a fixed slider
        unsigned short displayFlags;
        char const* units;
        std::vector<char const*> components;
    } const rows[] = {
        {FX_Param_FIXED_ANGLE, 1, 0, 0, "degrees", {"", ""}},
        {FX_Param_POINT_2D, 2, 0, 0, "pixels", {"X", "Y", "Z", "", ""}},
        {FX_Param_POINT_3D, 3, 0, 0, "pixels", {"X", "Y", "Z", ""}},
        {FX_Param_FLOAT_SLIDER, 1, 0, 0, "", {"", ""}},
        {FX_Param_FLOAT_SLIDER, 2, 0, 1, "percent", {"X", "Y"}},
        {FX_Param_FLOAT_SLIDER, 1, 0, 4, "pixels", {""}},
        {FX_Param_FLOAT_SLIDER, 1, 0, 5, "percent", {""}},
        {FX_Param_FIXED_SLIDER, 1, 0, 1, "percent", {""}},
        {FX_Param_FIXED_SLIDER, 1, 3, 0, "percent", {""}},
        {FX_Param_FIXED_SLIDER, 1, 4, 0, "pixels", {""}},
        {FX_Param_FIXED_SLIDER, 1, 2, 4, "", {""}},
        {FX_Param_FIXED_SLIDER, 1, -2, 0, "pixels", {""}},
        {FX_Param_COLOR, 4, 0, 0, "", {"alpha", "red", "green", "blue", ""}},
        {FX_Param_BOOL, 2, 0, 0, "", {"", ""}},
        {FX_Param_NotFilledIn, 2, 0, 0, "", {"", ""}},
    };
    for (Row const& row : rows) {
        SCOPED_TRACE(testing::Message() << row.kind << " min " << row.wholeMin << " flags " << row.displayFlags);
        TestStream const stream({.dimension = row.dimension});
        FX_ParamDef def{};
        def.paramType = row.kind;
        if (row.kind == FX_Param_FIXED_SLIDER) {
            def.value.fixedSlider.validMin = row.wholeMin * 65536;
            def.value.fixedSlider.displayFlags = row.displayFlags;
        } else {
            def.value.floatSlider.displayFlags = row.displayFlags;
        }
        stream->SetParamDef(def);
        EXPECT_EQ(Text(row.units), stream->GetUnitsName());
        EXPECT_EQ(Text(row.units), stream->GetEnglishUnitsName());
        for (short i = 0; i < static_cast<short>(row.components.size()); ++i) {
            u16str const name = Text(row.components[static_cast<std::size_t>(i)]);
            EXPECT_EQ(name, stream->GetDimensionName(i)) << i;
            EXPECT_EQ(name, stream->GetEnglishDimensionName(i)) << i;
        }
        EXPECT_EQ(u16str(), stream->GetDimensionName(-1));
    }
}

}  // namespace
