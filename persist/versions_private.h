#pragma once

#include "frame/services/chunkfile.h"

// What project files of older versions lack. A writer always writes the present form, but for the two gates that say
// so.

inline constexpr int KFSp_FirstVersion_BaseFlags = 56;
inline constexpr int KFSp_FirstVersion_DisplayName = 57;
inline constexpr int KFSp_FirstVersion_ParamAtoms = 61;
inline constexpr int KFSp_FirstVersion_NewParamKinds = 77;  // below it, labels and 3-D points aren't written either
inline constexpr int KFSp_LastVersion_ImplicitFollowers =
    81;  // up to it, separation followers are active whatever the flags say

// Layers have a selector since effective version 88.3, for readers and writers.
inline bool KFSp_HasLayerSelector(CKF_File const* file)
{
    int major = file->majorVersion;
    int minor = file->minorVersion;
    CKF_GetEffectiveProjectVersion(&major, &minor);
    return major >= 89 || (major == 88 && minor >= 3);
}
