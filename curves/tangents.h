// The temporal handles of keys: read and written as graph tangents, as speeds or as influences, and two questions about
// the curve.
//
// Traps first:
//   - The limits of influence differ between the doors, and that is meant: KFS_SetKeyInfluence keeps it in 0 to 1 on
//     every stream, KFS_SetKeyTangentsF in 0.0001 to 1 on plain streams and not at all on spatial ones.
//   - KFS_GetKeyVelocityF and KFS_GetKeyInfluence use the cache record as scratch: the next value read works anew.
//   - On spatial streams a key has one handle a side, and its speed is distance along the path a second. Only the first
//     element of the arrays counts there; on other streams they have `dimension` elements. Any pointer may be null
//     unless said otherwise, which means that this side or this answer isn't wanted.
//
// A graph tangent is relative to its key: x in seconds, at or below 0 on the in side and at or above 0 on the out side,
// y in value units. With the duration to the neighbouring key (0 where there is none):
//
//      in:   x = -influence * duration,  y = speed * x        out:   x = influence * duration,  y = speed * x
//
// A constant that has a value passes: its one record stands for the key, without neighbours. Keys of custom streams
// that aren't spatial hold no numbers: speeds and tangents of such a key are 0 and setting them stores nothing, except
// that KFS_SetKeyVelocity leaves it to the client's copy function.
//
// Errors of all: 2, a damaged stream; KFS_Err_NoKeys, the stream has no value or no key; both are reported with the
// operation named at the function. The list service's code for an index outside the list.
// Threads: setters belong to the main thread. Getters are reads of the calling thread's key data, and bring stale keys
// up to date first.
// Cost: constant, apart from that repair, and from sums of arcs over the float keys between two anchors.
//
// Setters that succeed call NotifyValueChanged; what a listener throws is their result. They leave the cache record of
// a stream with keys empty. They bring nothing up to date: what was given is stored and stands, and a side that wasn't
// given stays as it is stored, also when the key turns the user's before an automatic handle was ever read.
#pragma once

#include "frame/services/time.h"
#include "keystore/stream.h"

// Sets graph tangents. A side is set if both its pointers are given and a neighbouring key exists there. An x on the
// wrong side counts as 0; an x of 0 has speed 0. On a continuous key of which one side is given, the other side takes
// the speed; on plain streams its influence changes so that the handle keeps its length in a graph that draws a value
// unit `yScale` times as tall as a second is wide. Negative speeds become 0 on a spatial stream with
// KFS_StreamFlag_NonDecreasing. The key's flags stay: automatic tangents stay automatic.
// Operations 29 (damaged) and 30 (no keys).
[[nodiscard]] KFS_API int KFS_SetKeyTangentsF(KFS_Stream* stream, int index, double const* inX, double const* inY,
                                              double const* outX, double const* outY, double yScale);

// Graph tangents. Operation 30.
[[nodiscard]] KFS_API int KFS_GetKeyTangentsF(KFS_Stream const* stream, int index, double* inX, double* inY,
                                              double* outX, double* outY);

// Sets speeds, which makes the key's handles the user's (KFS_KeyFlag_Modifiable goes out). The values are in the
// stream's external type, on a spatial stream one double. On a continuous key of which one side is given, the other
// side takes the speed and keeps its influence. Negative speeds become 0 on a spatial stream with
// KFS_StreamFlag_NonDecreasing. A constant only notifies.
// Operation 51. Errors: also the copy function's or the conversion's.
[[nodiscard]] KFS_API int KFS_SetKeyVelocity(KFS_Stream* stream, int index, void const* inVelocity,
                                             void const* outVelocity);

// The same with doubles on any stream. The stream's description and copy function are exchanged for the length of the
// call.
// Operation 55 (damaged) and 51.
[[nodiscard]] KFS_API int KFS_SetKeyVelocityF(KFS_Stream* stream, int index, double const* inVelocity,
                                              double const* outVelocity);

// Speeds. A side that holds, or whose neighbour's facing side holds, has speed 0; a linear side has that of its
// straight segment. On spatial streams a spline side without influence has speed 0, `zeroAtEnds` asks for 0 at the
// first key's in side and the last key's out side, and a linear side there is otherwise left unanswered: nothing is
// written. On other streams these two are always 0. A first element below 1e-10 in magnitude is answered as 0.
// Operation 52. Errors: also KFS_Err_LegacyMismatch (3), unreported, where a straight run on a spatial stream takes no
// time.
[[nodiscard]] KFS_API int KFS_GetKeyVelocityF(KFS_Stream const* stream, int index, unsigned char zeroAtEnds,
                                              double* inVelocity, double* outVelocity);

// Sets influences, kept in 0 to 1, which makes the key's handles the user's. A constant only notifies; so does a custom
// stream that isn't spatial. Operation 53.
[[nodiscard]] KFS_API int KFS_SetKeyInfluence(KFS_Stream* stream, int index, double const* inInfluence,
                                              double const* outInfluence);

// Influences; 0.16666666667 for a side that isn't spline, whatever is stored.
// Operation 54. Errors: also KFS_Err_CustomNotAllowed, reported, on a custom stream that isn't spatial, unless its
// items have 8 bytes: such a stream answers 0.16666666667 in the first element.
[[nodiscard]] KFS_API int KFS_GetKeyInfluence(KFS_Stream const* stream, int index, double* inInfluence,
                                              double* outInfluence);

// How proposed handles would have to change so that they don't reach beyond the neighbouring key's value. Changes
// nothing in the stream. Answers streams that aren't spatial.
//
//   velocities, influences   in and out, `dimension` elements each: the proposal, of which a clamped component is
//                            replaced. A null one means the stored number. A side with both null isn't looked at.
//   unused                   not looked at.
//   clamped                  set to 1 if anything was clamped, else left alone.
//
// Operation 101.
[[nodiscard]] KFS_API int KFS_GetClampedVelInflF(KFS_Stream const* stream, int index, short unused, double* inVelocity,
                                                 double* inInfluence, double* outVelocity, double* outInfluence,
                                                 unsigned char* clamped);

// The times at which a component has slope zero between the key at `index` and the next one.
//
//   count              out, not null. 0 to 2; 0 for a hold.
//   times              out, not null, room for 2; in the stream's scale.
//   secondDerivatives  out or null, room for 2; positive at a minimum, negative at a maximum.
//
// Operation 103. Errors: also KFS_Err_TimeOutsideKeys, reported with operation 100, for the last key; the kernel's.
[[nodiscard]] KFS_API int KFS_GetZeroVelocityPoints(KFS_Stream const* stream, int index, int dimensionIndex, int* count,
                                                    T_Time* times, double* secondDerivatives);
