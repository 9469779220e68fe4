#pragma once

#include "frame/export.h"
#include "keystore/stream.h"

// Many reads in a call: what a loop of KFS_GetValueFPlus without a bag and without `atKey` answers, to the last bit and with
// the same reports, in less time. Segments are solved side by side with the widest vectors of the machine; streams that
// lie apart in memory are fetched before they are needed. What isn't a plain read (an expression, separated
// dimensions, a value of a client's, a spatial stream, keys to be repaired, a state that wants to be asked) is read one
// by one among the others.
//
//   flags    as in KFS_GetValueFPlus, for all of them.
//   values   out, not null. A read that fails leaves what the single one would.
//   codes    out or null: each read's result. With it all are read. Without it the first failure ends the call, and the
//            places behind stay untouched.
//
// Result: 0, or the first code that a read had, those of KFS_GetValueFPlus. A `count` of 0 or less reads nothing.
// Threads: as single reads: the calling thread's key data, one thread a key data, and what is written is its own: cache
// records, and derived data of stale keys. `values` and `codes` must not overlap anything that is read.
// Cost: no allocation. Reads in ascending order of time go along the keys; others search.

// The stream at `count` times, in any order and scale, one time as often as one likes. `values`: one behind the other, as
// many doubles each as the stream has dimensions.
[[nodiscard]] KFS_API int KFS_ReadTimes(KFS_Stream const* stream, T_Time const* times, int count, int flags,
                                        double* values, int* codes);

// The streams, none of them null, at one time; a null `time` is value 0 in each stream's scale. A stream may be named
// more than once. `stride`: doubles from one stream's place in `values` to the next, at least the dimension of each.
[[nodiscard]] KFS_API int KFS_ReadStreams(KFS_Stream const* const* streams, int count, T_Time const* time, int flags,
                                          double* values, int stride, int* codes);
