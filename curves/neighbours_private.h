#pragma once

#include "curves/segment_private.h"
#include "keystore/stream.h"

// Which keys bound a time or a key, and the curve between them.
//
// Float keys (f) of a spatial stream with arc-length parametrisation take their time from the anchors (A) around them,
// so they are no neighbours there unless all keys are asked for:
//
//      A ---- f ---- f ---- A            allKeys 0 answers the two A, at any time between them and at both f
//                 ^ time                 allKeys 1 answers the two f
//
// The path runs through the float keys: whoever works on it asks for all keys. On any other stream all keys are
// neighbours. The first and the last key of the list are anchors, whatever their flags say.
//
// The pointers go into the key list's storage and are good until the list changes; nothing is pinned here.

// The key at exactly `time` (in the stream's scale) in `at`, and the keys before and after the time in `prev` and
// `next`: never the key at that time itself. A missing key is null. Float keys at an end of the list, with no anchor
// beyond, answer the outermost of them.
//
//   prevIndex, nextIndex, atIndex   out or null; written only where the key was found.
//
// Operation 85. Errors: KFS_Err_NoKeys, reported, on a constant or an empty list; the list service's, with the answers
// as far as they got.
[[nodiscard]] int KFSp_GetNeighborsFromTime(KFS_Stream const* stream, int time, unsigned char allKeys,
                                            KFS_KeyScalar** at, KFS_KeyScalar** prev, KFS_KeyScalar** next,
                                            int* prevIndex, int* nextIndex, int* atIndex);

// The same around the key at `index`. Operation 84.
[[nodiscard]] int KFSp_GetNeighborsFromIndex(KFS_Stream const* stream, int index, unsigned char allKeys,
                                             KFS_KeyScalar** prev, KFS_KeyScalar** next, int* prevIndex,
                                             int* nextIndex);

// The answers of the two as one value: missing keys are null, and their indices mean nothing.
struct KFSp_Neighbours {
    KFS_KeyScalar* at = nullptr;
    KFS_KeyScalar* prev = nullptr;
    KFS_KeyScalar* next = nullptr;
    int atIndex = KFS_INVALID_INDEX;
    int prevIndex = KFS_INVALID_INDEX;
    int nextIndex = KFS_INVALID_INDEX;

    bool Both() const { return prev && next; }
};

[[nodiscard]] inline int KFSp_FindAround(KFS_Stream const* stream, int time, unsigned char allKeys,
                                         KFSp_Neighbours* around)
{
    return KFSp_GetNeighborsFromTime(stream, time, allKeys, &around->at, &around->prev, &around->next,
                                     &around->prevIndex, &around->nextIndex, &around->atIndex);
}

[[nodiscard]] inline int KFSp_FindAroundKey(KFS_Stream const* stream, int index, unsigned char allKeys,
                                            KFSp_Neighbours* around)
{
    return KFSp_GetNeighborsFromIndex(stream, index, allKeys, &around->prev, &around->next, &around->prevIndex,
                                      &around->nextIndex);
}

// Builds the curve of a segment.
//
//   keyIndex        the key at which the segment begins, or KFS_INVALID_INDEX: the segment around `time`, in the
//                   stream's scale. A temporal segment of a spatial stream that is asked for by a float key begins at
//                   the key before that, unless it is an end of the list.
//   dimensionIndex  component of the value; not looked at with `spatial`. -1 reads the word before each run: only x is
//                   meant then. A word that lies outside the record counts as 0.
//   relativeTime    non-zero: x begins at 0; zero: x in seconds of the stream. Temporal segments only.
//   spatial         non-zero: the path in space, through float keys. Zero: a temporal curve of one component.
//   isHold          out: 1 where a side is a hold, and `curve` is untouched then; else 0.
//   curve           comes with its dimension and four points of as many doubles, which are filled.
//
// Pins the list. Operation 100. Errors: KFS_Err_TimeOutsideKeys, reported, where there is no key on one side; the list
// service's; the kernel's.
[[nodiscard]] int KFSp_ConstructCurve(KFS_Stream const* stream, int keyIndex, int time, int dimensionIndex,
                                      unsigned char relativeTime, unsigned char spatial, unsigned char* isHold,
                                      CRV_Curve* curve);
