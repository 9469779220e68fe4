#pragma once

#include "frame/export.h"
#include "keystore/stream.h"

// How much of an arc a point on a spatial stream has covered at a time, by the speed graph of one segment.
//
//   refCon    not used
//   time      in the stream's scale, from the one key's time to the next one's
//   keyIndex  the segment's first key; the second is the one behind it, float or not
//   first     out, not null: the segment's first key, inside the list's memory, good until the list changes
//   second    out, not null: its second key
//   t         out, not null: 0 to 1 of the arc's length, which isn't the path's parameter; not finite on an arc of
//             length 0
//
// The trap: handles are only kept inside the box of the segment here, not made non-decreasing as a read does, so a
// curve with long handles may answer another distance than a read has.
//
// The stream isn't checked, and nothing is reported. Result: 0; 7431 KFS_Err_InterpNotAllowed for interpolation codes
// other than linear, spline and hold; the list service's for an index outside the list; the curve kernel's.
// Threads: as any read of derived data; repairs stale keys first. Cost: one curve solve.
[[nodiscard]] KFS_API int KFS_CalculateTFromStream(KFS_Stream const* stream, long refCon, int time, int keyIndex,
                                                   KFS_KeyScalar** first, KFS_KeyScalar** second, double* t);
