#pragma once

#include "frame/services/strings.h"

// Rows of the message table, by what they say. Callers of KFSp_CheckStream and KFSp_ReportErr name the action with one
// of these; it fills the `%s` of the error's own sentence.
enum KFSp_Row : short {
    KFSp_Row_Damaged = 0,
    KFSp_Row_UnknownError = 2,
    KFSp_Row_Dispose = 3,
    KFSp_Row_GetValue = 4,
    KFSp_Row_InsertKey = 5,
    KFSp_Row_KeyValue = 6,
    KFSp_Row_OverwriteKey = 7,
    KFSp_Row_RemoveKey = 8,
    KFSp_Row_AlterKey = 9,
    KFSp_Row_Constant = 12,
    KFSp_Row_GetKeyValue = 13,
    KFSp_Row_InquireKey = 14,
    KFSp_Row_NoKeys = 15,
    KFSp_Row_Duplicate = 17,
    KFSp_Row_TimeScale = 18,
    KFSp_Row_TimeOverflow = 21,
    KFSp_Row_Merge = 22,
    KFSp_Row_TimeNotRepresentable = 23,
    KFSp_Row_Rescale = 24,
    KFSp_Row_Write = 27,
    KFSp_Row_Read = 28,
    KFSp_Row_SetValueDesc = 33,
    KFSp_Row_SetConstant = 34,
    KFSp_Row_InterpNotAllowed = 35,
    KFSp_Row_CopyKeyFrom = 36,
    KFSp_Row_CopyKeyTo = 37,
    KFSp_Row_KeyDataSizeMismatch = 38,
    KFSp_Row_SetCustomFuncs = 39,
    KFSp_Row_IterateOver = 40,
    KFSp_Row_BadFileInfo = 42,
    KFSp_Row_UnrecognizedChunk = 44,
    KFSp_Row_InterpolationArray = 49,
    KFSp_Row_NotSpatial = 54,
    KFSp_Row_SpatialTangents = 55,
    KFSp_Row_ArcLength2D = 56,
    KFSp_Row_SpInterpNotAllowed = 57,
    KFSp_Row_SetIMask = 58,
    KFSp_Row_SetSpIMask = 59,
    KFSp_Row_SetSpInterp = 60,
    KFSp_Row_StreamIsntSpatial = 61,
    KFSp_Row_CustomInterpolation = 62,
    KFSp_Row_InquireDerivative = 63,
    KFSp_Row_CantCustomValue = 64,
    KFSp_Row_ConvertTo = 65,
    KFSp_Row_ConvertFrom = 66,
    KFSp_Row_NoInterpFunc = 67,
    KFSp_Row_NoControlPoint = 68,
    KFSp_Row_PredictInvalid = 69,
    KFSp_Row_ComputeFloatValues = 70,
    KFSp_Row_SetTangents = 71,
    KFSp_Row_Subdivide = 72,
    KFSp_Row_CantManipulate = 73,
    KFSp_Row_TimeOutsideKeys = 74,
    KFSp_Row_ComputeDerivative = 75,
    KFSp_Row_SetMultiplier = 76,
    KFSp_Row_Only2D3D = 79,
    KFSp_Row_CustomNotAllowed = 81,
    KFSp_Row_StreamValueCache = 83,
    KFSp_Row_UnknownStream = 84,
    KFSp_RowCount = 100,
};

// The handle of the message table: module name "KFS", one hundred rows and a closing null row.
extern Q_ZTable const* const* const KFS_G_zref;

// The text of a row, after its key. It stays valid for the life of the process.
char const* KFSp_MessageText(int row);
