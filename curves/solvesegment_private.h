#pragma once

#include "curves/segment_private.h"
#include "keystore/shortcuts_private.h"

// What CRV_EvaluateYFromX answers for the curve of a temporal segment, at the share `u` of its time, without building the
// curve: influences are the handles of the unit cubic that is to be solved. False, and `value` untouched, where the
// segment isn't an ordinary one and the curve has to be asked.
[[gnu::always_inline]] inline bool KFSp_SolveSegment(KFSp_TemporalEnd const& a, KFSp_TemporalEnd const& b,
                                                     KFSp_TemporalHandles const& handles, double u, double* value)
{
    double const out = a.spline ? a.influence : KFSp_OneSixth;
    double const in = b.spline ? b.influence : KFSp_OneSixth;
    return KFSp_SolveUnitSegment(out, in, u, a.value, handles.y1, handles.y2, b.value, value);
}
