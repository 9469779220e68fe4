#pragma once

#include "frame/errors.h"
#include "frame/messages_private.h"

// Operation numbers: the low half of a report's id says which operation failed. They are part of the interface towards
// whoever reads the reports; numbers that no operation uses are free.
enum KFSp_Op : short {
    KFSp_Op_StreamDestroy = 4,
    KFSp_Op_StreamCopy = 5,
    KFSp_Op_Rescale = 7,
    KFSp_Op_Merge = 8,
    KFSp_Op_SetValueDesc = 9,
    KFSp_Op_SetConstant = 10,
    KFSp_Op_Write = 11,
    KFSp_Op_Read = 12,
    KFSp_Op_CanDoInterp = 13,
    KFSp_Op_CanDoSpInterp = 15,
    KFSp_Op_SetIMask = 16,
    KFSp_Op_InsertKey = 17,
    KFSp_Op_RemoveKey = 18,
    KFSp_Op_CopyKey = 19,
    KFSp_Op_CopyKeys = 21,
    KFSp_Op_FindKeyTime = 22,
    KFSp_Op_FindNearestKeyTime = 23,
    KFSp_Op_TimeToIndex = 24,
    KFSp_Op_IndexToTime = 25,
    KFSp_Op_GetKeyIndex = 26,
    KFSp_Op_SetKey = 27,
    KFSp_Op_GetKey = 28,
    KFSp_Op_SetKeyTangents = 29,
    KFSp_Op_GetKeyTangents = 30,
    KFSp_Op_SetKeySpaceTangents = 31,
    KFSp_Op_GetKeySpaceTangents = 32,
    KFSp_Op_SetKeyTime = 33,
    KFSp_Op_ForRange = 34,
    KFSp_Op_ForIndexRange = 35,
    KFSp_Op_GetValueNoExpr = 36,
    KFSp_Op_InsertKeyFromCache = 38,
    KFSp_Op_SetCustomFuncs = 39,
    KFSp_Op_ChooseInterps = 44,
    KFSp_Op_InterpolateSpatial = 45,
    KFSp_Op_SetSpIMask = 47,
    KFSp_Op_UpdateStream = 48,
    KFSp_Op_SetSpInterp = 49,
    KFSp_Op_SetSParametrize = 50,
    KFSp_Op_SetKeyVelocity = 51,
    KFSp_Op_GetKeyVelocity = 52,
    KFSp_Op_SetKeyInfluence = 53,
    KFSp_Op_GetKeyInfluence = 54,
    KFSp_Op_SetKeyVelocityF = 55,
    KFSp_Op_GetDeriv = 57,
    KFSp_Op_GetDerivs = 58,
    KFSp_Op_ForceUpdate = 59,
    KFSp_Op_KeyFlags = 72,
    KFSp_Op_SetKeyFlags = 73,
    KFSp_Op_SetKeySpaceFlags = 74,
    KFSp_Op_UnsetKeySpaceFlags = 75,
    KFSp_Op_SetKeySpFlags = 76,
    KFSp_Op_PredictInvalid = 77,
    KFSp_Op_GetValuesFRefusal = 78,
    KFSp_Op_ConvertFromFloat = 80,
    KFSp_Op_ConvertToFloat = 81,
    KFSp_Op_UpdateCache = 82,
    KFSp_Op_NeighborsFromIndex = 84,
    KFSp_Op_NeighborsFromTime = 85,
    KFSp_Op_SetDefaultTangents = 86,
    KFSp_Op_Subdivide = 87,
    KFSp_Op_SetAccuracy = 88,
    KFSp_Op_DisposeRemapTables = 89,
    KFSp_Op_SetKeySpaceTangentsF = 90,
    KFSp_Op_SetKeyF = 92,
    KFSp_Op_InsertKeyF = 94,
    KFSp_Op_GetTangent = 95,
    KFSp_Op_GetSpaceTangent = 97,
    KFSp_Op_DirectManipArc = 98,
    KFSp_Op_ConstructCurve = 100,
    KFSp_Op_GetClampedVelInfl = 101,
    KFSp_Op_SetMultiplier = 102,
    KFSp_Op_GetZeroVelocityPoints = 103,
    KFSp_Op_DisposeValue = 105,
    KFSp_Op_ConvertStreamDim = 106,
    KFSp_Op_GetValue = 113,
    KFSp_Op_GetValuesFHandle = 114,
    KFSp_Op_GetFloat = 115,
    KFSp_Op_GetAccuracy = 117,
    KFSp_Op_GetMultiplier = 118,
    KFSp_Op_InsertKeys = 119,
};

// Stands for this library in the ids of its reports, and in those of its memory.
inline constexpr int KFSp_ModuleId = 0x1D0000;

// The severity of every report of this library.
inline constexpr int KFSp_Severity = 8;

constexpr int KFSp_ReportId(int operation)
{
    return (operation & 0xFFFF) | KFSp_ModuleId;
}

// Reports `error` and returns it; 0 reports nothing. `argument` is the row that fills the sentence's `%s`, or for
// KFS_Err_InterpNotAllowed the refused code itself.
[[nodiscard]] int KFSp_ReportErr(int operation, int error, short argument);

// Reports a row whose `%d` takes `number`, and returns `error`.
[[nodiscard]] int KFSp_ReportNumber(int operation, int error, short row, int number);

// Reports a row that stands for itself, without formatting, and returns `error`.
[[nodiscard]] int KFSp_ReportRow(int operation, int error, short row);

// Reports "can't %s custom value" and returns KFS_Err_CustomValue. `what` is one of the rows 65, 66, 70 and 75.
[[nodiscard]] int KFSp_RefuseCustomValue(int operation, short what);

// The same with "stream uses custom interpolation function: %s."; `what` is row 63.
[[nodiscard]] int KFSp_RefuseCustomInterpolation(int operation, short what);
