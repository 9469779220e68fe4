#pragma once

#include "frame/export.h"
#include "frame/services/strings.h"

// Kinds of parameter.
enum FX_ParamKind : int {
    FX_Param_NotFilledIn = -1,
    FX_Param_LAYER = 0,
    FX_Param_INT_SLIDER = 1,
    FX_Param_FIXED_SLIDER = 2,
    FX_Param_FIXED_ANGLE = 3,
    FX_Param_BOOL = 4,
    FX_Param_COLOR = 5,
    FX_Param_POINT_2D = 6,
    FX_Param_CHOICE = 7,
    FX_Param_GROUP = 9,
    FX_Param_FLOAT_SLIDER = 10,
    FX_Param_ALWAYS_SAVED = 11,
    FX_Param_PATH = 12,
    FX_Param_LABEL = 15,
    FX_Param_POINT_3D = 18,
};

inline constexpr unsigned int FX_ParamFlag_CannotAnimate = 0x2;
inline constexpr unsigned int FX_ParamFlag_HoldOnly = 0x4;

// The record by which the host's effect interface describes a parameter: its kind, its name, its valid and slider
// range, its default. The kinds overlay one another in `value`. Numbers called 16.16 are signed, 65536 for 1.0.
//
// `paramName` of the kinds BOOL, CHOICE and LABEL is owned by the record: a byte copy must never be kept as an owner,
// every copy goes through FX_ParamDef_Copy, and KFS_DeleteParamDefInternalString frees it.
struct FX_ParamDef {
    struct LayerValue {
        void* reservedPointer;
        short layerSelector;
        int layerDefault;
    };
    struct IntSliderValue {
        int validMin, validMax, sliderMin, sliderMax, defaultValue;
    };
    struct FixedSliderValue {
        int validMin, validMax, sliderMin, sliderMax, defaultValue;  // 16.16
        short precision;
        unsigned short displayFlags;
    };
    struct FixedAngleValue {
        int defaultValue, validMin, validMax;  // 16.16 degrees
    };
    struct NamedValue {  // BOOL and LABEL
        unsigned char defaultValue;
        char* paramName;
    };
    struct ColorValue {
        unsigned char alpha, red, green, blue;
    };
    struct Point2DValue {
        int defaultX, defaultY;  // 16.16 times 100
    };
    struct ChoiceValue {
        short choiceCount;
        short defaultValue;
        char* paramName;
    };
    // precision and displayFlags stand first: they share their four bytes with validMin of the two integer sliders.
    struct FloatSliderValue {
        short precision;
        unsigned short displayFlags;  // bit 0 percent, bit 2 pixels
        float validMin, validMax, sliderMin, sliderMax, defaultValue;
        unsigned int floatFlags;
    };
    struct PathValue {
        unsigned int pathIdentifier, defaultPathIdentifier;
    };
    struct Point3DValue {
        double defaultX, defaultY, defaultZ;  // times 100
    };

    int reservedA;
    int reservedWord;
    int reservedB;
    int paramType;
    char name[32];  // NUL-terminated, UTF-8
    unsigned int paramFlags;
    union {
        LayerValue layer;
        IntSliderValue intSlider;
        FixedSliderValue fixedSlider;
        FixedAngleValue fixedAngle;
        NamedValue named;
        ColorValue color;
        Point2DValue point2d;
        ChoiceValue choice;
        FloatSliderValue floatSlider;
        PathValue path;
        Point3DValue point3d;
    } value;
};

// The record's name as text. Threads: reads the record only.
KFS_API u16str FX_ParamDef_GetName(FX_ParamDef const* def);
// Truncates to what fits 32 bytes with the closing NUL.
KFS_API void FX_ParamDef_SetName(FX_ParamDef* def, u16str const& name);
// True for the kinds that own a paramName: BOOL, CHOICE and LABEL.
KFS_API bool FX_ParamDef_HasParamName(FX_ParamDef const* def);
// Empty for the other kinds and for a null paramName.
KFS_API u16str FX_ParamDef_GetParamName(FX_ParamDef const* def);
// Replaces the owned text; an empty one leaves null unless `keepEmpty`. Does nothing for the other kinds. Throws the
// int 4 when out of memory; the field is then null.
KFS_API void FX_ParamDef_SetParamName(FX_ParamDef* def, u16str const& name, bool keepEmpty);
// Frees what `target` owns and makes it a deep copy of `source`. Throws the int 4 when out of memory.
KFS_API void FX_ParamDef_Copy(FX_ParamDef const& source, FX_ParamDef* target);
KFS_API void KFS_DeleteParamDefInternalString(FX_ParamDef* def);
