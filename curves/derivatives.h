#pragma once

#include "frame/export.h"
#include "frame/services/time.h"
#include "keystore/stream.h"

#include <boost/function.hpp>

// How fast a stream changes at a time, and which way a position moves.
//
// Common to all: `time` is converted to the stream's scale, and null is value 0 there. Flag KFS_EvalFlag_NoExpression of `flags`
// goes straight to the keys. `atKey`, out or null: whether a key stands at the time. `bag` holds overrides, may be null. A rate
// isn't a value: the stream's limits don't apply to it. The cache record is scratch here, so the next value read works anew.
//
// Results: 0, or
//   2                        the stream is damaged
//   7427 KFS_Err_NoKeys      the stream has no key, or is a constant without a value
//   7434 KFS_Err_NotSpatial  a plain stream has no directions
//   7441 KFS_Err_CustomValue a client's values have no rate
//   the services' codes, those of the curves, and what a filter answered
//
// Threads: as reads (keystore/evaluate.h).

// Called with each value that an expression gave, before differences are taken. Not 0: the result.
using KFS_DerivSampleFilter = boost::function<int(double* value)>;
// Called with a finished rate of an expression: one speed along the path (`isSpeed`), or one component.
using KFS_DerivFilter = boost::function<int(double* rate, bool isSpeed)>;

// What a derivative is wanted of.
inline constexpr char KFS_Deriv_Velocity = 0;  // units a second; of a spatial stream the speed along its path
inline constexpr char KFS_Deriv_SpaceTangent =
    1;  // spatial streams: the path's direction, of the size of a key's tangent

// `value`: out or null, `dimension` doubles, or one on a spatial stream with KFS_Deriv_Velocity.
//
// At a key the rate is that of its out side, at the last key that of its in side: tangents of the last key are turned to point
// forward in time. Before the first and after the last key, and beside a hold, the rate is 0. A constant's is 0. The rate of a
// curve is that of the curve, exactly; the rate of an expression is the difference to the value one time unit later.
//
//   keyOnly  only the rate at a key is wanted: between keys `value` stays untouched.
//
// The filters act on rates of expressions only. Operation 57.
[[nodiscard]] KFS_API int KFS_GetDeriv(KFS_Stream const* stream, T_Time const* time, char tangentMode,
                                       unsigned char keyOnly, int flags, double* value, unsigned char* atKey,
                                       KFS_ParamBag const* bag, KFS_DerivSampleFilter sampleFilter,
                                       KFS_DerivFilter filter);

// One velocity at `start`, whatever the step. Goes to the caller's `value`; with a null one `values` receives a handle of one
// sample, which the caller frees with Q_FreeHandle, and which stays unset on an error. Code 3, reported, if both are null; 4
// when out of memory. `step` isn't null, and one that can't be added to `start` is an error. Operation 58.
[[nodiscard]] KFS_API int KFS_GetDerivs(KFS_Stream const* stream, T_Time const* start, T_Time const* step, char unused,
                                        int flags, double* value, char*** values, KFS_ParamBag const* bag,
                                        KFS_DerivSampleFilter sampleFilter, KFS_DerivFilter filter);

// The direction of motion of a spatial stream, `dimension` doubles; also where the curve stands still: it then looks up to 29
// time units ahead (behind the last key, back) for the first value that differs, and answers the way there. Zeros with result
// 0 if there is none. A stream with separated dimensions answers its followers' rates, and `value` takes at least three
// doubles there. Its length means nothing.
//
//   keyOnly  as in KFS_GetDeriv. Between keys the caller's own zeros in `value` count as a stand-still, and are looked past.
//
// Operation 97.
[[nodiscard]] KFS_API int KFS_GetSpaceTangent(KFS_Stream const* stream, T_Time const* time, unsigned char keyOnly,
                                              int flags, double* value, unsigned char* atKey, KFS_ParamBag const* bag);
