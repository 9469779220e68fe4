#pragma once

#include "keystore/keytypes.h"

class KFS_Stream;

// Keys as they stand in a file: a list of records of one size, in the file's byte order, which lives only for the time
// of a save or a load. What a record looks like follows from the stream, not from the record.
//
//   plain            time  inInterp  outInterp  flags | five runs of `dimension` doubles
//   plain, spatial   the same                         | spatial block | three runs of `dimension` doubles
//   custom           the same                         | (spatial block |) itemSize bytes in the client's own order
//
// There is no arc-length table in it, so the value data of a spatial record begins 8 bytes before its place in memory.

// The head; its fields from spFlags on exist on spatial streams only.
struct KFS_KeyScalarDisk {
    int time;
    signed char inInterp;
    signed char outInterp;
    unsigned short flags;
    unsigned int spFlags;
    unsigned int reserved;  // zero
    double arcLength;
    double inSpeed;
    double inInfluence;
    double outSpeed;
    double outInfluence;
};

inline constexpr int KFSp_DiskHeadSize = 8;
inline constexpr int KFSp_DiskSpatialHeadSize = 56;
static_assert(offsetof(KFS_KeyScalarDisk, spFlags) == KFSp_DiskHeadSize);
static_assert(offsetof(KFS_KeyScalarDisk, arcLength) == 16);
static_assert(sizeof(KFS_KeyScalarDisk) == KFSp_DiskSpatialHeadSize);

// Makes an empty list of the stream's disk records. The caller disposes it. Answers the list service's code, and `list`
// is null then.
[[nodiscard]] int KFSp_CreateKeyDiskList(KFS_Stream* stream, SEQ_Head**& list);

// Fills the list from the stream's keys, in their order; a stream without a key list leaves it empty. Throws the list
// service's code.
void KFSp_ConvertToKeyDiskList(KFS_Stream const* stream, SEQ_Head** list);

// Replaces the stream's keys by those of a list that came from a file. The records are taken as they come: nobody sorts
// them. Records that hold more than the stream's keys can are cut, with a report. Throws the list service's code, or,
// if they hold less, 21 with a report and the stream as it was.
void KFSp_ConvertFromKeyDiskList(KFS_Stream* stream, SEQ_Head** list);

// Disposes the stream's key list, if it has one, arc tables included. The stream's flags stay.
void KFSp_DropKeyList(KFS_Stream* stream);

// Swaps a record in memory in place, in either direction: its value data, which is that of a spatial record where the
// stream is spatial. A client's bytes stay as they are. Always 0.
[[nodiscard]] int KFSp_KeyScalarDataSwap(KFS_Stream const* stream, KFS_KeyScalar* record);

// A list that is disposed at the end of the scope.
class KFSp_ScList {
public:
    KFSp_ScList() = default;
    ~KFSp_ScList()
    {
        if (list) static_cast<void>(SEQ_Dispose(list, 0));
    }
    KFSp_ScList(KFSp_ScList const&) = delete;
    KFSp_ScList& operator=(KFSp_ScList const&) = delete;

    SEQ_Head** list = nullptr;
};
