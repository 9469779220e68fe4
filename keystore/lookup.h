#pragma once

#include "keystore/stream.h"

// Which key stands at or near a time, what a key holds, and walking over keys.
//
// What holds for all of them:
//   stream  not null. A damaged one is refused with code 2, reported, before anything else of it is read.
//   time    any scale, converted to the stream's; the time service's code, unreported, where it doesn't fit. Null:
//           value 0 in the stream's scale.
//   answers may be null unless a function says otherwise. An unanswered index is KFS_INVALID_INDEX, an unanswered time
//           {KFS_INVALID_INDEX, 0}. Times are answered in the stream's scale. A failure leaves all unanswered.
//   codes   of the list service pass through. "Constant" below is a stream with KFS_StreamFlag_NoKeys.
//
// Threads: no lock. They work on the calling thread's key data, one thread a key data.
// Cost: one binary search at most, no allocation, unless an update is mentioned: it repairs what is stale.

// Bits of KFS_FindKeyTime's direction.
inline constexpr short KFS_Find_Backward = 0x0001;  // toward earlier keys; clear: toward later ones
inline constexpr short KFS_Find_AtTime = 0x1000;    // a key exactly at the time is the answer; clear: it is passed over

// The next key from a time, in one direction. No key there is an answer (`found` 0, the rest unanswered), not an error.
//
//                10        20        30
//                 |         |         |
//   forward  20 ..|.........|-------->|      without KFS_Find_AtTime
//   backward 25 ..|.........|<---|....|
//
// Operation 22. KFS_Err_Constant: a constant stream; reported, nothing found.
[[nodiscard]] KFS_API int KFS_FindKeyTime(KFS_Stream const* stream, T_Time const* time, short direction,
                                          unsigned char* found, int* index, T_Time* keyTime);

// The key nearest to a time. A tie goes to the earlier key.
//
// A constant stream with a value answers index 0 and the time asked for, in the caller's own scale, and its value moves
// there. An empty list
// answers no index, which isn't an error, and a key time without a value but in the stream's scale.
//
// Operation 23. KFS_Err_NoKeys: a constant stream without a value; reported, unanswered.
[[nodiscard]] KFS_API int KFS_FindNearestKeyTime(KFS_Stream const* stream, T_Time const* time, int* index,
                                                 T_Time* keyTime);

// The index of the key exactly at a time, once the stream is up to date: an update can move a float key to or from that
// time. No key there is an answer. A float key that stands there already is taken as it is, without an update. Inside
// an update pass no second one is started.
//
// Operation 24. KFS_Err_Constant: a constant stream. KFS_Err_NoKeys: no key. Both reported. An error of the update is
// returned if no key stood at the time before it; otherwise that key is the answer.
[[nodiscard]] KFS_API int KFS_TimeToIndex(KFS_Stream const* stream, T_Time const* time, int* index);

// The key at or before a time. `found` tells whether it stands exactly there. No index where the time lies before the
// first key. A constant stream answers index 0, found, and its value moves to that time. No update.
//
// Operation 26. KFS_Err_NoKeys: no key, or a constant without a value; reported, unanswered.
[[nodiscard]] KFS_API int KFS_GetKeyIndex(KFS_Stream const* stream, T_Time const* time, int* index,
                                          unsigned char* found);

// The time of a key; `time` mustn't be null. Index -1 names the last key. An index outside the list, or no list, leaves
// the time unanswered and is no error. A float key whose time is stale is brought up to date first. A constant stream
// answers where its value stands, whatever the index.
//
// Operation 25. KFS_Err_Constant: a constant without a value; reported. An error of the update is returned.
[[nodiscard]] KFS_API int KFS_IndexToTime(KFS_Stream const* stream, int index, T_Time* time);

// The KFS_KeyFlag_ word of a key, or of a constant's value (any index). `flags` mustn't be null; it is untouched after
// a failure.
//
// Operation 72. KFS_Err_NoKeys: no key, or a constant without a value; reported.
[[nodiscard]] KFS_API int KFS_GetKeyFlags(KFS_Stream const* stream, int index, unsigned short* flags);

// The value of a key in the stream's external form, and its two interpolation codes, as they stand: no update. A
// constant answers its value, whatever the index; -1 names the last key. `value` takes `dimension` elements of the
// stream's data type, or what the copy function writes; a value that owns memory goes to KFS_DisposeValue. Unanswered
// codes are KFS_Interp_None, an unanswered value is untouched.
//
// Operation 28. KFS_Err_NoKeys as above. The copy function's code passes through, with the codes answered.
[[nodiscard]] KFS_API int KFS_GetKey(KFS_Stream const* stream, int index, void* value, char* inInterp, char* outInterp);

// The same with the value as `dimension` doubles, not limited and not converted. KFS_Err_CustomValue, reported under
// operation 115: a value is asked of a custom stream. That comes before all else but the check of the stream itself.
[[nodiscard]] KFS_API int KFS_GetKeyF(KFS_Stream const* stream, int index, double* value, char* inInterp,
                                      char* outInterp);

// Called with the stream, the caller's word, the key's index and its record, which stays where it is until the list
// changes. A result other than 0 ends the walk and is its result. It mustn't insert, remove or retime keys.
using KFS_KeyFunc = int (*)(KFS_Stream* stream, long refcon, int index, KFS_KeyScalar* key);

// Walks the keys from one time to another, both included, after an update. Backward if `first` lies after `last`. Null
// means the first key (`first`) and the last one (`last`). A range between two keys holds none and calls nothing. A
// constant stream calls once, with index KFS_INVALID_INDEX and the record of its value. `lastTime` is the time of the
// last key handed out, also where the function has ended the walk; its value is KFS_INVALID_INDEX, in the stream's
// scale, if there was none.
//
// Operation 34. KFS_Err_NoKeys: no key, or a constant without a value; reported. Main thread only.
[[nodiscard]] KFS_API int KFS_ForRange(KFS_Stream* stream, T_Time const* first, T_Time const* last, long refcon,
                                       KFS_KeyFunc func, T_Time* lastTime);

// Walks the keys from one index to another, both included, stepping down if `first` is above `last`, after an update.
// Both must be in the list, else the list service's code. `lastIndex` is that of the last key handed out. A constant
// stream calls once, with index KFS_INVALID_INDEX, and answers `lastIndex` 0.
//
// Operation 35. KFS_Err_NoKeys as above. Main thread only.
[[nodiscard]] KFS_API int KFS_ForIndexRange(KFS_Stream* stream, int first, int last, long refcon, KFS_KeyFunc func,
                                            int* lastIndex);
