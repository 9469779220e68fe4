#pragma once

#include "keystore/stream.h"

// The cache record: a constant's value, the last value that was asked for with its time, and the scratch record in
// which a key is put together before it enters the list.

// Empties the cache record: disposes its value and sets its time to KFS_INVALID_INDEX, whatever the disposal returned,
// which is the result.
int KFSp_ClearCache(KFS_Stream const* stream);
// The same on a record at hand.
int KFSp_ClearCacheRecord(KFS_Stream const* stream, KFS_KeyScalar* cache);

// Fills the cache record as a key. `kind` KFS_Item_KeyValue: `value` is a value alone; KFS_Item_KeyWhole: a record's
// whole value data, whose tangents then count as set. `convert`: `value` is in external form. A null `value` leaves the
// value data as it is.
int KFSp_SetupCache(KFS_Stream const* stream, int time, void const* value, char inInterp, char outInterp, short kind,
                    unsigned char convert);

// Brings the cache record to a time in the stream's scale. Throws an int.
//
//   keyOnly     only keys are wanted: between keys the cache stays empty.
//   value       null: only `atKey` is wanted, the cache stands as it is.
//   atKey       out or null: whether a key stands at the time; always on a stream without a list.
//   interpFunc  null or the address of a function to interpolate with in place of the stream's; `refcon` goes with it.
void KFSp_UpdateStreamCacheToTime(KFS_Stream const* stream, int time, unsigned char keyOnly, void* value,
                                  unsigned char* atKey, KFS_InterpFunc* interpFunc, long refcon);

// The same on key data that the caller has at hand.
void KFSp_UpdateCacheToTime(KFS_Stream const* stream, KFS_StreamKeyData const* data, int time, unsigned char keyOnly,
                            void const* value, unsigned char* atKey, KFS_InterpFunc* interpFunc, long refcon);
// The same for a read that wants the value and nothing else.
void KFSp_UpdateCacheToTime(KFS_Stream const* stream, KFS_StreamKeyData const* data, int time);
