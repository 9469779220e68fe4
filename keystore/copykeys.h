#pragma once

#include "frame/export.h"
#include "keystore/stream.h"

// Copying keys from stream to stream, with tangents and flags. An arc table never goes along. Streams of any two kinds
// go: a record's value data is taken byte by byte, as much as the destination's records hold, and zeros where it is
// shorter. Common to both: see keystore/edit.h for what an edit leaves behind.
//
// Results: 0, or
//   2                        a damaged stream; reported, the source's before the destination's
//   7425 KFS_Err_KeyValue    something stands at that time and `replace` is 0
//   7426 KFS_Err_Constant    keys for a destination that holds one value
//   7427 KFS_Err_NoKeys      the source has no value
//   the services' codes, the destination's PrepareForInsertOfForeignValue, an item function's, a listener's

// Copies one key, or a constant's value.
//
//   index     the key; not looked at on a source without a list
//   replace   a key at that time is replaced
//   time      in or null: null keeps the key's own
//   newIndex  out or null: where the copy stands; KFS_INVALID_INDEX on failure
//
// A destination that can only hold takes hold codes. A constant that is copied onto itself moves to the time asked for.
// Operation 19.
[[nodiscard]] KFS_API int KFS_CopyKey(KFS_Stream* source, int index, unsigned char replace, T_Time const* time,
                                      KFS_Stream* destination, int* newIndex);

// Copies keys at their own times, replacing what stands there. All or none are copied.
//
//   keys  a list of 32-bit indices of the source's keys, or null for all. An empty list is fine.
//
// A constant's value arrives at time 0. Operation 21. Cost: a search and an insertion a key.
[[nodiscard]] KFS_API int KFS_CopyKeys(KFS_Stream const* source, SEQ_Head** keys, KFS_Stream* destination);
