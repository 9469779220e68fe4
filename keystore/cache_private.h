#pragma once

#include "keystore/stream.h"

// The cache record: a constant's value, the last value that was asked for with its time, and the scratch record in
// which a key is put together before it enters the list.

// Empties the cache record: disposes its value and sets its time to KFS_INVALID_INDEX, whatever the disposal returned,
// which is the result.
[[nodiscard]] int KFSp_ClearCache(KFS_Stream const* stream);
// The same on a record at hand.
[[nodiscard]] int KFSp_ClearCacheRecord(KFS_Stream const* stream, KFS_KeyScalar* cache);

// Fills the cache record as a key. `kind` KFS_Item_KeyValue: `value` is a value alone; KFS_Item_KeyWhole: a record's
// whole value data, whose tangents then count as set. `convert`: `value` is in external form. A null `value` leaves the
// value data as it is.
[[nodiscard]] int KFSp_SetupCache(KFS_Stream const* stream, int time, void const* value, char inInterp, char outInterp,
                                  short kind, unsigned char convert);

// What is asked of the cache record.
struct KFSp_CacheRequest {
    bool keyOnly = false;            // only keys are wanted: between keys the cache stays empty
    bool wantsValue = true;          // else only `atKey` is wanted, and the cache stands as it is
    unsigned char* atKey = nullptr;  // out or null: whether a key stands at the time; always on a stream without a list
    KFS_InterpFunc* interpFunc = nullptr;  // the address of a function to interpolate with in place of the stream's
    long refcon = 0;                       // goes with it
};

// Brings the cache record of the key data at hand to a time in the stream's scale; `stream` is the stream as that data's
// reader sees it. Throws an int.
void KFSp_UpdateCacheToTime(KFS_Stream const* stream, KFS_StreamKeyData const* data, int time,
                            KFSp_CacheRequest const& request);
// The same for a read that wants the value and nothing else.
void KFSp_UpdateCacheToTime(KFS_Stream const* stream, KFS_StreamKeyData const* data, int time);
