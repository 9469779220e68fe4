#pragma once

#include "frame/export.h"
#include "keystore/stream.h"

// Adding, changing and removing keys.
//
// An edit that changed the stream ends with a notification of the listeners, whose exceptions become the result. One
// that failed leaves the key list as it was; only the interpolation codes that KFS_SetKey stored before a value was
// refused stay. Derived data of the neighbourhood is marked as stale, not computed. On a stream with keys the cache
// record is empty afterwards.
//
// On a stream with one value and no list (KFS_StreamFlag_NoKeys) the same functions work on that value.
//
// Common to all: `time` is in any scale and is converted to the stream's; null is value 0. An interpolation code of 0
// leaves a key's code as it is, or lets the system choose for a new key. `value` is one value in external form, or
// `dimension` doubles in the F forms.
//
// Results: 0, or
//   2                            the stream is damaged; reported with the operation of the function
//   7425 KFS_Err_KeyValue        a key (or a constant's value) is there and `replace` is 0
//   7427 KFS_Err_NoKeys          no value, or no key
//   7430 KFS_Err_TimeNotRepresentable  a time that comes to KFS_INVALID_INDEX in the stream's scale
//   7431 KFS_Err_InterpNotAllowed  a code that the stream's mask refuses; reported with operation 13
//   7441 KFS_Err_CustomValue     a value of doubles for a custom stream whose items have no room for them; reported
//                                with operation 81
//   the services' codes, an item function's, a listener's
//
// Threads: the main thread. Renders that have their copies may read meanwhile (keystore/cachestate.h). The F forms change
// the stream's description while they run, for who reads the stream itself; listeners hear of the edit afterwards.

// Puts a key at a time. A null `value` gives it the value that the stream has there; on a plain stream with splines the
// curve keeps its shape, for which the neighbours' handles are shortened. With a value, spline sides get default
// handles. A key that stands there already is changed as by KFS_SetKey if `replace` is set. A side without a code takes
// what KFS_ChooseInterps says and, where that has nothing to go by, linear: also on a stream that may only hold, whose
// mask is asked about given codes alone.
// Operation 17. Cost: one search, and moving the records behind the key.
[[nodiscard]] KFS_API int KFS_InsertKey(KFS_Stream* stream, T_Time const* time, unsigned char replace,
                                        void const* value, char inInterp, char outInterp);
// Operation 94 for the damaged stream, else KFS_InsertKey's.
[[nodiscard]] KFS_API int KFS_InsertKeyF(KFS_Stream* stream, T_Time const* time, unsigned char replace,
                                         double const* value, char inInterp, char outInterp);

// Keys for KFS_InsertKeys: `count` elements an array, or that many times `dimension` numbers, key by key.
struct KFS_NewKeys {
    int count = 0;
    int const* times = nullptr;  // in units of 1/timeScale seconds; not null, in any order
    unsigned int timeScale = 0;
    double const* values = nullptr;   // null: each key takes the value that the stream has there
    char const* inInterps = nullptr;  // null: as codes of 0
    char const* outInterps = nullptr;
    // The handles, which matter on sides that are splines; of a spatial stream one number a key. Null: as the insertion
    // has made them.
    double const* inSpeeds = nullptr;
    double const* inInfluences = nullptr;
    double const* outSpeeds = nullptr;
    double const* outInfluences = nullptr;
};

// Puts many keys into a stream, or none. What comes of it is what comes of one key after the other in the order of the
// arrays: KFS_InsertKeyF, then KFS_SetKeyVelocityF and KFS_SetKeyInfluence with what is given of the two. So a time that
// is given twice, or at which a key stands, is changed as by KFS_SetKey if `replace` is set and refused if not; and a
// spline side without handles of its own gets those that follow from the keys that are there when its turn comes.
// Listeners are told once, at the end; without a key nothing is done and nobody told.
//
// Whatever fails leaves the stream as it was before the first key, apart from the list's handle and the addresses of
// keys, which are to be asked for again. Operation 119 for the damaged stream, else those of the functions above.
// Cost: on a stream of numbers that isn't spatial, with values, codes and unique times, some nanoseconds a key where
// they ascend from the last key on, and one pass over the list elsewhere; spline sides want all four arrays of handles
// for that, or keys in the order of time behind all others. In all other cases that of the single calls, and of a copy
// of the keys.
[[nodiscard]] KFS_API int KFS_InsertKeys(KFS_Stream* stream, KFS_NewKeys const* keys, unsigned char replace);

// Changes a key's value, unless `value` is null, and codes. A key without a spline side is no longer continuous.
// Operation 27. A bad index answers the list service's code.
[[nodiscard]] KFS_API int KFS_SetKey(KFS_Stream* stream, int index, void const* value, char inInterp, char outInterp);
// Operation 92 for the damaged stream, else KFS_SetKey's.
[[nodiscard]] KFS_API int KFS_SetKeyF(KFS_Stream* stream, int index, double const* value, char inInterp,
                                      char outInterp);

// Removes a key. `value`, out or null, receives its value in external form, which belongs to the caller
// (KFS_DisposeValue); a failing conversion isn't told. On a stream without a list the value is gone, and reads answer
// KFS_Err_NoKeys until it gets a new one. Operation 18.
[[nodiscard]] KFS_API int KFS_RemoveKey(KFS_Stream* stream, int index, void* value);

// The codes that a key inserted at a time ought to take, after its neighbours; 0 where there is nothing to go by. Any
// result may be null.
//
//      at a key            that key's codes
//      before, after all   the facing code of the first, last key, for both
//      A --- t --- B       A's out code and B's in code; if just one of them is a spline, both are; a hold in makes a
//                          hold out
//
// Operation 44.
[[nodiscard]] KFS_API int KFS_ChooseInterps(KFS_Stream* stream, T_Time const* time, char* inInterp, char* outInterp);
