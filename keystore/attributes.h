#pragma once

#include "keystore/stream.h"

// Operations on a stream as a whole. All belong to the main thread. `stream` is not null; a damaged one is refused with
// code 2, reported, before anything else of it is read. The masks aren't validated. Notifications are sent only where a
// function says so.

// Expresses all key times in a new scale. Of two keys that meet on one tick, the one stays that was nearer to it; on a
// tie the earlier.
//
// The cost grows with the keys. On failure the scale stays, and the keys converted so far stay in the new one.
//
// Operation 7. The codes of the cache's disposal, of the list and of the time service (a time that doesn't fit the new
// scale).
[[nodiscard]] KFS_API int KFS_RescaleStream(KFS_Stream* stream, unsigned int newScale);

// Checks both streams under operation 8 and merges nothing.
[[nodiscard]] KFS_API int KFS_MergeStream(KFS_Stream* stream, T_Time const* time, KFS_Stream** other);

// The KFS_Interp codes that the stream allows, operation 16, and the spatial mask, operation 47. Keys aren't touched.
[[nodiscard]] KFS_API int KFS_SetStreamIMask(KFS_Stream* stream, unsigned short mask);
[[nodiscard]] KFS_API int KFS_SetStreamSpIMask(KFS_Stream* stream, unsigned short mask);

// The spatial interpolation setting; KFS_SpInterp_Auto has the update pass compute spatial tangents. Operation 49.
// Allowed by the temporal mask: KFS_Err_InterpNotAllowed, reported under operation 15, if its bit (value - 1) is clear.
[[nodiscard]] KFS_API int KFS_SetStreamSpInterp(KFS_Stream* stream, unsigned short spInterp);

// Whether spatial curves are parametrised by arc length. A change marks all keys stale. Notifies, also without a
// change.
//
// Operation 50. KFS_Err_NotSpatial, reported: the stream isn't spatial. A listener's exception becomes the result.
[[nodiscard]] KFS_API int KFS_SetStreamSParametrize(KFS_Stream* stream, unsigned char on);

// The client's item functions, either may be null, for the stream and its key list. Operation 39. Trap: a stream that is
// read from a file hands them the file's bytes, or null pointers, see KFS_Stream::IsCustomValuePointer.
[[nodiscard]] KFS_API int KFS_SetCustomFuncs(KFS_Stream* stream, KFS_CopyItemFunc copyItem,
                                             KFS_DisposeItemFunc disposeItem);

// The accuracy of sampling, 0.01 on a new stream. The stream holds its square: a negative one reads back positive.
// `accuracy` not null; either of `newValue` and `oldValue` may be. Operations 117 and 88.
[[nodiscard]] KFS_API int KFS_GetStreamAccuracy(KFS_Stream const* stream, double* accuracy);
[[nodiscard]] KFS_API int KFS_SetStreamAccuracy(KFS_Stream* stream, double const* newValue, double* oldValue);

// The factors of a spatial stream's components in the measure of its arcs, `dimension` numbers; dimensions past the
// fourth share the components from the first on. A new multiplier marks all keys stale and notifies.
//
// Operations 118 and 102. KFS_Err_NotSpatial, reported under operation 102 by both: the stream isn't spatial.
[[nodiscard]] KFS_API int KFS_GetStreamMultiplier(KFS_Stream const* stream, double* multiplier);
[[nodiscard]] KFS_API int KFS_SetStreamMultiplier(KFS_Stream* stream, double const* newValue, double* oldValue);
