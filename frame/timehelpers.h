#pragma once

#include "frame/export.h"
#include "frame/services/identifiers.h"
#include "frame/services/time.h"

// Arithmetic on times with a wanted scale. With `scale` 0 the result is the time service's, in a scale of its choice.
// Otherwise the result's value is converted into `scale`; when that fails, the result's scale is 0. They answer the
// code of the last step that ran. `result` may be one of the arguments. Pure functions.
[[nodiscard]] KFS_API int KFS_AddTime(T_Time const* a, T_Time const* b, unsigned int scale, T_Time* result);
[[nodiscard]] KFS_API int KFS_SubTime(T_Time const* a, T_Time const* b, unsigned int scale, T_Time* result);
[[nodiscard]] KFS_API int KFS_MulTime(T_Time const* a, M_Ratio const* ratio, unsigned int scale, T_Time* result);

// Mixes an instant into a hash: reduced value, then reduced scale, 4 bytes each, so that equal instants in different
// scales hash alike. Throws the time service's code.
KFS_API void KFS_MixInTime(hearth::utility::MixHashGuidT<hearth::utility::Murmur3MixerState>& hash, T_Time const& time);
