#pragma once

#include "frame/export.h"
#include "keystore/stream.h"

// Derived data of keys (automatic tangents, arc lengths and their tables, times of float keys) isn't recomputed by
// edits. An edit marks a range of keys, and KFS_Stream::UpdateStream repairs that range when something reads it.

// Marks every key and repairs the stream, whether anything was stale or not.
//
// With a list of more than 32767 keys the count is narrowed to a short: from 32768 to 65536 keys nothing is marked, and
// only what was stale before is repaired.
//
// Operation 59. Result: 0; 2 for a damaged stream; the list service's, the curve kernel's or the tangents' first error.
// Threads: writes derived data of the calling thread's key data. Cost: linear in the keys, some microseconds a curved
// arc.
[[nodiscard]] KFS_API int KFS_ForceUpdateStream(KFS_Stream const* stream);

// Tells how far in time an edit at `time` would change the stream's curve.
//
//   action  1, 2  the key at the time itself (or one inserted there)
//           3, 5  the in side of the key at the time: temporal and spatial
//           4, 6  its out side: temporal and spatial
//           any other reaches nowhere
//   time    in, any scale; null is value 0. One that doesn't fit the stream's scale is taken by its bare value.
//   from    out, not null; in the stream's scale
//   to      out, not null; in the stream's scale
//
// Actions 1 and 2 reach the neighbours, and beyond one that is automatic (a), whose handles follow from both its own
// neighbours. A side alone reaches its neighbour; both neighbours if the key is continuous.
//
//      from                 to
//       k ---- a ---- K ---- k            K the edited key, k keys that aren't automatic
//
// A stream without keys answers the time itself, with the code of the time's conversion.
//
// Operation 77. Result: 0, or
//   2                           the stream is damaged
//   7434 KFS_Err_NotSpatial     action 5 or 6 on a stream that isn't spatial
//   7439 KFS_Err_NoControlPoint action 3 to 6 without a key at the time; `from` and `to` stay as they are
//   the list service's
// Threads: as any read of derived data; may repair stale keys of a spatial stream. Cost: one search.
[[nodiscard]] KFS_API int KFS_PredictInvalid(KFS_Stream const* stream, unsigned short action, T_Time const* time,
                                             T_Time* from, T_Time* to);
