// How a stream describes itself in its parameter record. Apart from limits.cpp, which reads that record.
#include "keystore/paramnumbers_private.h"
#include "keystore/stream.h"

#include <cstring>
#include <type_traits>
#include <utility>

namespace {

// The stream of this thread whose record is just being filled in: a default that is asked for meanwhile can't come from it.
thread_local KFS_Stream const* FillingIn = nullptr;

class ScFillingIn {
public:
    explicit ScFillingIn(KFS_Stream const* stream) : before_(std::exchange(FillingIn, stream)) {}
    ~ScFillingIn() { FillingIn = before_; }
    ScFillingIn(ScFillingIn const&) = delete;
    ScFillingIn& operator=(ScFillingIn const&) = delete;

private:
    KFS_Stream const* before_;
};

unsigned char LowByte(double number)
{
    return static_cast<unsigned char>(static_cast<unsigned int>(KFSp_Truncate(number)));
}

// 16.16 times 100, which wraps.
int Hundredfold(double number)
{
    return static_cast<int>(static_cast<unsigned int>(KFSp_ToFixed(number)) * 100U);
}

}  // namespace

bool KFS_Stream::IsFillingInParamDef() const
{
    return FillingIn == this;
}

void KFS_Stream::FillInParamDefDetails(int paramType, double validMin, double validMax, double sliderMin,
                                       double sliderMax, short precision, short displayFlags, unsigned int floatFlags,
                                       int reservedWord, int paramFlags) const
{
    ScFillingIn const filling(this);
    FX_ParamDef def;
    static_assert(std::is_trivially_copyable_v<FX_ParamDef>);
    std::memset(&def, 0, sizeof def);
    def.paramType = paramType;
    FX_ParamDef_SetName(&def, GetDisplayName());
    def.paramFlags = static_cast<unsigned int>(paramFlags);
    def.reservedWord = reservedWord;

    auto const standard = [this](int component) { return GetDefaultVector4()[component]; };
    switch (paramType) {
    case FX_Param_INT_SLIDER:
        def.value.intSlider = {KFSp_Truncate(validMin), KFSp_Truncate(validMax), KFSp_Truncate(sliderMin),
                               KFSp_Truncate(sliderMax), KFSp_Truncate(standard(0))};
        break;
    case FX_Param_FIXED_SLIDER:
        def.value.fixedSlider = {KFSp_ToFixed(validMin),
                                 KFSp_ToFixed(validMax),
                                 KFSp_ToFixed(sliderMin),
                                 KFSp_ToFixed(sliderMax),
                                 KFSp_ToFixed(standard(0)),
                                 precision,
                                 static_cast<unsigned short>(displayFlags)};
        break;
    case FX_Param_FIXED_ANGLE:
        def.value.fixedAngle = {KFSp_ToFixed(standard(0)),
                                HasMinValue() ? KFSp_ToFixed(validMin) : std::numeric_limits<int>::min(),
                                HasMaxValue() ? KFSp_ToFixed(validMax) : std::numeric_limits<int>::max()};
        break;
    case FX_Param_BOOL: def.value.named.defaultValue = LowByte(standard(0)); break;
    case FX_Param_COLOR:
        def.value.color = {LowByte(standard(0)), LowByte(standard(1)), LowByte(standard(2)), LowByte(standard(3))};
        break;
    case FX_Param_POINT_2D: def.value.point2d = {Hundredfold(standard(0)), Hundredfold(standard(1))}; break;
    case FX_Param_CHOICE:
        def.value.choice.defaultValue = static_cast<short>(static_cast<unsigned int>(KFSp_Truncate(standard(0))));
        break;
    case FX_Param_FLOAT_SLIDER:
        def.value.floatSlider = {precision,
                                 static_cast<unsigned short>(displayFlags),
                                 static_cast<float>(validMin),
                                 static_cast<float>(validMax),
                                 static_cast<float>(sliderMin),
                                 static_cast<float>(sliderMax),
                                 static_cast<float>(standard(0)),
                                 floatFlags};
        break;
    case FX_Param_POINT_3D: def.value.point3d = {standard(0) * 100.0, standard(1) * 100.0, standard(2) * 100.0}; break;
    default: break;  // the other kinds have no number of the stream's
    }
    pSetParamDef(def);
}
