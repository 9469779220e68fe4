#pragma once

#include "frame/export.h"
#include "keystore/stream.h"

// A spatial key's tangents: two vectors in the value's coordinates, offsets from the value, that shape the path. And
// the key's spatial flags (KFS_KeySpFlag): whether the update pass may recompute the tangents, and whether the two stay
// in one line when one of them is edited.
//
// Common to all: `index` is a key; on a stream without keys it isn't looked at, and the one value's record takes the
// key's place.
// Results: 0, or
//   2                        the stream is damaged
//   7427 KFS_Err_NoKeys      no key, or a constant without a value
//   7434 KFS_Err_NotSpatial  the tangent functions on a stream that isn't spatial
//   7441 KFS_Err_CustomValue the tangent functions on a custom stream, whose values have no tangents
//   the list service's for an index outside the list; a copy function's; a listener's
// Setters belong to the main thread. They leave the cache record of a stream with keys empty. They bring nothing up to
// date and read nothing derived: what isn't given stays as it is stored.

// Gives a key its tangents, in the stream's external data type, `dimension` elements each; a null one stays as it is.
// From now on the update pass leaves the key's tangents alone.
//
// On a key with KFS_KeySpFlag_Continuous one tangent given alone turns the other one to the opposite direction, which
// keeps its length; a tangent of exactly zero turns nothing.
//
//   unused  not looked at
//
// Operation 31. Tangents and arcs around the key become stale; notifies. When copying a tangent fails the key counts as
// edited all the same.
[[nodiscard]] KFS_API int KFS_SetKeySpaceTangents(KFS_Stream* stream, int index, int unused, void const* inTangent,
                                                  void const* outTangent);
// The same with doubles, which are taken as they are. Operation 90. The stream's description is another one meanwhile.
[[nodiscard]] KFS_API int KFS_SetKeySpaceTangentsF(KFS_Stream* stream, int index, int unused, double const* inTangent,
                                                   double const* outTangent);
// A key's tangents, `dimension` doubles each; either may be null. Brings the stream up to date first, so it writes
// derived data of a const stream; while updates are disabled it answers what is stored. Operation 32.
[[nodiscard]] KFS_API int KFS_GetKeySpaceTangentsF(KFS_Stream const* stream, int index, int unused, double* inTangent,
                                                   double* outTangent);

// Lets the update pass recompute the key's tangents, beginning with the next update, or stops it from doing so. Turned
// on, it makes the arcs around the key stale, with the spatial tangents of the keys there; temporal handles and float
// times around aren't marked, though a changed arc may change them: they follow with the next edit or forced update.
// Turned off, it leaves everything derived as it is. Operation 74 or 75.
[[nodiscard]] KFS_API int KFS_SetKeySpModifiable(KFS_Stream* stream, unsigned char on, int index);
// Operation 74 or 75. Nothing becomes stale.
[[nodiscard]] KFS_API int KFS_SetKeySpContinuous(KFS_Stream* stream, unsigned char on, int index);

// The key's spatial flags. `flags` is not null. The trap: a stream without keys answers the record's key flags
// (KFS_KeyFlag) instead.
// Operation 75, without keys 72.
[[nodiscard]] KFS_API int KFS_GetKeySpFlags(KFS_Stream const* stream, int index, unsigned int* flags);
// Replaces the bits of `mask` by those of `values`. A mask with one of the two flags makes the arcs around the key
// stale, and only these, as KFS_SetKeySpModifiable does; the code of that mark is then the result. Operation 76.
[[nodiscard]] KFS_API int KFS_SetKeySpFlags(KFS_Stream* stream, int index, unsigned int mask, unsigned int values);
