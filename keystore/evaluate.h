#pragma once

#include "keystore/stream.h"

// Reading a stream's value at a time.
//
// A read passes four stages: a stream whose dimensions are separated asks its followers; an active expression may
// supply the value; the render context's KFS_ExpState decides how to read the keys; and the keys, or the curve between
// them, give the value.
//
// Common to all: `time` is converted to the stream's scale, and null is value 0 there. `value` is the caller's buffer
// for one value, in external form (`dimension` elements of the data type, or a custom block) or as `dimension` doubles
// in the F forms; null asks only for `atKey` and the side effects. `atKey`, out or null, gets whether a key stands at
// the time. Where followers answer they answer `dimension` doubles whatever the data type: `atKey` stays untouched then,
// and so does the place of a missing follower, so initialise `value`. `bag` holds overrides, may be null. A value that
// owns memory goes to KFS_DisposeValue.
//
// Results: 0, or
//   2                        the stream is damaged
//   7427 KFS_Err_NoKeys      the stream has no key, or is a constant without a value (operation 36)
//   7441 KFS_Err_CustomValue an F form on a custom stream
//   the services', the expression's and the interpolation function's codes; a client's stream without such a function
//   answers KFS_Err_InterpNotAllowed between keys (a file can make one)
// On an error `value` is as the failing stage left it.
//
// Threads: any thread that has a render context, on its own key data: a read writes the cache record and may repair
// stale keys. On a temporary clone context that is the render's private copy. No lock, and no allocation without an
// expression.
// Cost: one binary search, or two compares while reads walk along the time line, and one curve solve a component;
// reading one time again costs a compare.

// Bit of `flags`: go straight to the keys. All other bits are handed on to the host.
inline constexpr int KFS_EvalFlag_NoExpression = 0x1;

// KFS_GetValuePlus with flags 0; the third argument is ignored.
[[nodiscard]] KFS_API int KFS_GetValue(KFS_Stream const* stream, T_Time const* time, unsigned char, void* value,
                                       unsigned char* atKey, KFS_ParamBag const* bag);
// Operation 113. The render context is the project's current one. `interpFunc`: null, or the address of a function to
// interpolate with in place of the stream's, which gets `refcon`.
[[nodiscard]] KFS_API int KFS_GetValuePlus(KFS_Stream const* stream, T_Time const* time, int flags, void* value,
                                           unsigned char* atKey, KFS_ParamBag const* bag, KFS_InterpFunc* interpFunc,
                                           long refcon);
// KFS_GetValueFPlus with flags 0; the third argument is ignored.
[[nodiscard]] KFS_API int KFS_GetValueF(KFS_Stream const* stream, T_Time const* time, unsigned char, double* value,
                                        unsigned char* atKey, KFS_ParamBag const* bag);
// Operation 113. The thread must have a current render context.
[[nodiscard]] KFS_API int KFS_GetValueFPlus(KFS_Stream const* stream, T_Time const* time, int flags, double* value,
                                            unsigned char* atKey, KFS_ParamBag const* bag);

// The end of every read, for the host's KFS_ExpState: the keys alone. `time` is in the stream's scale. Throws an int.
//   keyOnly  only a key at that time is wanted; between keys `value` stays untouched.
//   source   if not null, what is copied out in place of the cache record's value data, while the cache and `atKey`
//            still follow the keys: the value of an override.
// Operation 36.
KFS_API void KFS_GetValueNoExpr(KFS_Stream const* stream, int time, unsigned char keyOnly, void* value,
                                unsigned char* atKey, void const* source, KFS_InterpFunc* interpFunc, long refcon);
// The same as doubles, forced into the stream's limits on a float-based stream.
KFS_API void KFS_GetValueFNoExpr(KFS_Stream const* stream, int time, unsigned char keyOnly, double* value,
                                 unsigned char* atKey, void const* source);

// `count` values at `start`, `start` + `step`, ...: `values` receives a handle of `count` x `dimension` doubles, which
// the caller frees with Q_FreeHandle; it stays unset on an error. Code 3 for a null `values`, 4 when out of memory.
// Operation 115.
[[nodiscard]] KFS_API int KFS_GetValuesFPlus(KFS_Stream const* stream, T_Time const* start, T_Time const* step,
                                             int count, int flags, char*** values);

// Frees what a value owns, through the stream's dispose function. Operation 105.
[[nodiscard]] KFS_API int KFS_DisposeValue(KFS_Stream const* stream, void* value);

// Puts a vector that was produced for a stream into a caller's value buffer; a non-null `pointerValue` is stored as the
// value itself. The second argument isn't used. Throws an int.
KFS_API void KFS_PostCacheVector4Value(KFS_Stream const* stream, int, M_Vector4T<double> const& vector,
                                       void* pointerValue, void* value);
