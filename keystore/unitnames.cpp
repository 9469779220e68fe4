// Names of units and of components, as the parameter record of the stream says.

#include "frame/messages_private.h"
#include "keystore/stream.h"

#include <array>
#include <cstddef>

// Each name stands in the message table, where it can be translated, and here in English.

namespace {

struct Name {
    int row;
    char const* english;
};

constexpr Name NoName{-1, ""};
constexpr Name Pixels{86, "pixels"};
constexpr Name Degrees{87, "degrees"};
constexpr Name Percent{88, "percent"};
constexpr std::array<Name, 3> AxisNames{{{93, "X"}, {94, "Y"}, {95, "Z"}}};
constexpr std::array<Name, 4> ColorNames{{{96, "alpha"}, {97, "red"}, {98, "green"}, {99, "blue"}}};

constexpr unsigned short DisplayFlag_Percent = 0x1;
constexpr unsigned short DisplayFlag_Pixels = 0x4;

// Both slider kinds are asked for the float slider's flags. In the record of a fixed slider that word is the high half
// of validMin, so there an odd integer part of the minimum reads as percent and its bit 2 as pixels. Users see these
// units, so it stays.
Name SliderUnits(FX_ParamDef const& def)
{
    unsigned short const flags = def.value.floatSlider.displayFlags;
    if (flags & DisplayFlag_Percent) return Percent;
    return (flags & DisplayFlag_Pixels) != 0 ? Pixels : NoName;
}

Name Units(FX_ParamDef const& def)
{
    switch (def.paramType) {
    case FX_Param_FIXED_ANGLE: return Degrees;
    case FX_Param_POINT_2D:
    case FX_Param_POINT_3D: return Pixels;
    case FX_Param_FIXED_SLIDER:
        return (def.value.fixedSlider.displayFlags & DisplayFlag_Percent) != 0 ? Percent : SliderUnits(def);
    case FX_Param_FLOAT_SLIDER: return SliderUnits(def);
    default: return NoName;
    }
}

template <std::size_t Count>
Name NameAt(std::array<Name, Count> const& names, short index)
{
    return index >= 0 && static_cast<std::size_t>(index) < Count ? names[static_cast<std::size_t>(index)] : NoName;
}

Name Component(KFS_Stream const* stream, short component)
{
    switch (stream->GetParamDef().paramType) {
    case FX_Param_INT_SLIDER:
    case FX_Param_FIXED_SLIDER:
    case FX_Param_POINT_2D:
    case FX_Param_FLOAT_SLIDER:
    case FX_Param_POINT_3D: return stream->GetDimension() < 2 ? NoName : NameAt(AxisNames, component);
    case FX_Param_COLOR: return NameAt(ColorNames, component);
    default: return NoName;
    }
}

u16str Translated(Name const& name)
{
    return name.row < 0 ? u16str() : Q_MBToUTF16String(KFSp_MessageText(name.row));
}

// The stream whose units a separated component shares, or null.
KFS_Stream const* UnitsOwner(KFS_Stream const* stream)
{
    bool const isPlacedFollower = stream->IsSeparationFollower() && !stream->IsCanonical() && stream->GetParent();
    return isPlacedFollower ? stream->GetSeparationLeader() : nullptr;
}

}  // namespace

u16str KFS_Stream::GetUnitsName() const
{
    if (KFS_Stream const* const leader = UnitsOwner(this)) return leader->GetUnitsName();
    return Translated(Units(GetParamDef()));
}

u16str KFS_Stream::GetEnglishUnitsName() const
{
    if (KFS_Stream const* const leader = UnitsOwner(this)) return leader->GetEnglishUnitsName();
    return Q_MBToUTF16String(Units(GetParamDef()).english);
}

u16str KFS_Stream::GetDimensionName(short dimension) const
{
    return Translated(Component(this, dimension));
}

u16str KFS_Stream::GetEnglishDimensionName(short dimension) const
{
    return Q_MBToUTF16String(Component(this, dimension).english);
}
