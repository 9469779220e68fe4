#pragma once

#include "keystore/curvehooks_private.h"

// The rate of change at a time strictly between two keys, in value units a second, in place of the value that
// KFSp_Interpolate writes. A segment that is linear on both sides writes nothing as well. What KFS_GetDeriv asks.
[[nodiscard]] int KFSp_InterpDeriv(KFS_Stream const* stream, long refcon, int time, int keyIndex);
