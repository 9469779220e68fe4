// Limits and precision, as the parameter record of the stream says.

#include "keystore/paramnumbers_private.h"
#include "keystore/stream.h"

namespace {

constexpr double LeastFixed = -32768.0;
constexpr double GreatestFixed = 32767.99998474121;  // the greatest 16.16 number
constexpr double NoMinimum = -1e9;
constexpr double NoMaximum = 1e9;

}  // namespace

bool KFS_Stream::HasMinValue() const
{
    return false;
}

bool KFS_Stream::HasMaxValue() const
{
    return false;
}

double KFS_Stream::GetMinValue() const
{
    FX_ParamDef const& def = GetParamDef();
    switch (def.paramType) {
    case FX_Param_INT_SLIDER: return def.value.intSlider.validMin;
    case FX_Param_FIXED_SLIDER: return KFSp_FromFixed(def.value.fixedSlider.validMin);
    case FX_Param_FIXED_ANGLE: return HasMinValue() ? KFSp_FromFixed(def.value.fixedAngle.validMin) : LeastFixed;
    case FX_Param_BOOL: return 0.0;
    case FX_Param_CHOICE: return 1.0;
    case FX_Param_FLOAT_SLIDER: return static_cast<double>(def.value.floatSlider.validMin);
    default: return NoMinimum;
    }
}

double KFS_Stream::GetMaxValue() const
{
    FX_ParamDef const& def = GetParamDef();
    switch (def.paramType) {
    case FX_Param_INT_SLIDER: return def.value.intSlider.validMax;
    case FX_Param_FIXED_SLIDER: return KFSp_FromFixed(def.value.fixedSlider.validMax);
    case FX_Param_FIXED_ANGLE: return HasMaxValue() ? KFSp_FromFixed(def.value.fixedAngle.validMax) : GreatestFixed;
    case FX_Param_BOOL: return 1.0;
    case FX_Param_CHOICE: return def.value.choice.choiceCount;
    case FX_Param_FLOAT_SLIDER: return static_cast<double>(def.value.floatSlider.validMax);
    default: return NoMaximum;
    }
}

double KFS_Stream::GetUIMinValue() const
{
    FX_ParamDef const& def = GetParamDef();
    switch (def.paramType) {
    case FX_Param_INT_SLIDER: return def.value.intSlider.sliderMin;
    case FX_Param_FIXED_SLIDER: return KFSp_FromFixed(def.value.fixedSlider.sliderMin);
    case FX_Param_FLOAT_SLIDER: return static_cast<double>(def.value.floatSlider.sliderMin);
    case FX_Param_FIXED_ANGLE: return GetMinValue();  // the only kind whose class has a say
    default: return KFS_Stream::GetMinValue();
    }
}

double KFS_Stream::GetUIMaxValue() const
{
    FX_ParamDef const& def = GetParamDef();
    switch (def.paramType) {
    case FX_Param_INT_SLIDER: return def.value.intSlider.sliderMax;
    case FX_Param_FIXED_SLIDER: return KFSp_FromFixed(def.value.fixedSlider.sliderMax);
    case FX_Param_FLOAT_SLIDER: return static_cast<double>(def.value.floatSlider.sliderMax);
    case FX_Param_FIXED_ANGLE: return GetMaxValue();
    default: return KFS_Stream::GetMaxValue();
    }
}

void KFS_Stream::SetUIMinValue(double value)
{
    FX_ParamDef& def = GetParamDef();
    switch (def.paramType) {
    case FX_Param_INT_SLIDER: def.value.intSlider.sliderMin = KFSp_Truncate(value); break;
    case FX_Param_FIXED_SLIDER: def.value.fixedSlider.sliderMin = KFSp_ToFixed(value); break;
    case FX_Param_FLOAT_SLIDER: def.value.floatSlider.sliderMin = static_cast<float>(value); break;
    default: break;
    }
}

void KFS_Stream::SetUIMaxValue(double value)
{
    FX_ParamDef& def = GetParamDef();
    switch (def.paramType) {
    case FX_Param_INT_SLIDER: def.value.intSlider.sliderMax = KFSp_Truncate(value); break;
    case FX_Param_FIXED_SLIDER: def.value.fixedSlider.sliderMax = KFSp_ToFixed(value); break;
    case FX_Param_FLOAT_SLIDER: def.value.floatSlider.sliderMax = static_cast<float>(value); break;
    default: break;
    }
}

short KFS_Stream::GetPrecision() const
{
    FX_ParamDef const& def = GetParamDef();
    switch (def.paramType) {
    case FX_Param_FIXED_SLIDER: return def.value.fixedSlider.precision;
    case FX_Param_FLOAT_SLIDER: return def.value.floatSlider.precision;
    default: return 0;
    }
}

void KFS_Stream::LegalizeValue(double* values) const
{
    if (!CanLegalizeValue()) return;
    // The comparisons are such that a NaN becomes the limit.
    if (HasMinValue()) {
        double const least = GetMinValue();
        for (int i = 0; i < dimension_; ++i) values[i] = values[i] > least ? values[i] : least;
    }
    if (HasMaxValue()) {
        double const greatest = GetMaxValue();
        for (int i = 0; i < dimension_; ++i) values[i] = greatest > values[i] ? values[i] : greatest;
    }
}
