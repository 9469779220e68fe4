#pragma once

#include "frame/services/sequence.h"

#include <climits>
#include <cstddef>

class KFS_Stream;

// None: where a key index, a bound of a stale range or a time value is held. The 32-bit pattern 0x80000000.
inline constexpr int KFS_INVALID_INDEX = INT_MIN;

inline constexpr unsigned short KFS_StreamValidStamp = 56217;
inline constexpr unsigned short KFS_StreamDeadStamp = 56166;

// Interpolation codes, one signed byte on each side of a key.
enum KFS_Interp : signed char {
    KFS_Interp_None = 0,  // not given: an edit leaves the key's code as it is
    KFS_Interp_Linear = 1,
    KFS_Interp_Spline = 2,  // Bezier segment shaped by speed and influence
    KFS_Interp_Hold = 3,    // the earlier key's value holds until the next key
};

// Bits of a stream's interpolation mask.
inline constexpr unsigned short KFS_InterpMask_Linear = 0x1;
inline constexpr unsigned short KFS_InterpMask_Spline = 0x2;
inline constexpr unsigned short KFS_InterpMask_Hold = 0x4;
inline constexpr unsigned short KFS_InterpMask_Negative =
    0x8;  // permits negative codes; in the spatial mask: automatic tangents
inline constexpr unsigned short KFS_InterpMask_All =
    KFS_InterpMask_Linear | KFS_InterpMask_Spline | KFS_InterpMask_Hold;

// Spatial interpolation settings of a stream.
inline constexpr unsigned short KFS_SpInterp_None = 0;
inline constexpr unsigned short KFS_SpInterp_Auto = 3;  // the update pass computes default spatial tangents

enum KFS_KeyFlag : unsigned short {
    KFS_KeyFlag_SpatialBlock =
        0x0001,  // the record carries the spatial block, and its value data lies behind that block
    KFS_KeyFlag_TangentsSet = 0x0006,  // two bits, written together: tangents have been given or computed
    KFS_KeyFlag_Continuous = 0x0008,   // in and out temporal tangents move together
    KFS_KeyFlag_Modifiable = 0x0010,   // temporal tangents are still automatic
    KFS_KeyFlag_Float = 0x0020,  // the key's time follows from its neighbours; only meaningful on a spatial stream
};

enum KFS_KeySpFlag : unsigned int {
    KFS_KeySpFlag_Continuous = 0x00000001,
    KFS_KeySpFlag_Modifiable = 0x00000002,
};

enum KFS_StreamFlag : unsigned short {
    KFS_StreamFlag_NoKeys = 0x0001,         // no key list; the one value lives in the cache record
    KFS_StreamFlag_Spatial = 0x0002,        // key records carry the spatial block
    KFS_StreamFlag_NonDecreasing = 0x0004,  // temporal curves are forced non-decreasing before they are evaluated
    KFS_StreamFlag_SParametrize = 0x0008,   // spatial curves are parametrised by arc length
};

// What a block handed to an item function is.
enum KFS_Item : short {
    KFS_Item_CacheWhole = 0,  // the whole value data of the cache record
    KFS_Item_CacheValue = 1,  // the value alone, on a cache record or on a caller's buffer
    KFS_Item_KeyWhole = 2,    // the whole value data of a key, tangents included
    KFS_Item_KeyValue = 3,    // the value alone, of a key
    KFS_Item_Component = 4,
};

// External element types of a plain stream.
enum KFS_Type : signed char {
    KFS_Type_S8 = 0,
    KFS_Type_U8 = 1,
    KFS_Type_S16 = 2,
    KFS_Type_U16 = 3,
    KFS_Type_S32 = 4,
    KFS_Type_U32 = 5,
    KFS_Type_Fixed = 6,   // signed 16.16
    KFS_Type_UFixed = 7,  // unsigned 16.16
    KFS_Type_Float = 8,
    KFS_Type_Double = 9,
};

// Computes the stream's value at `time` (in the stream's scale), between two keys, into the cache record. `keyIndex` is
// the key at or before that time.
using KFS_InterpFunc = int (*)(KFS_Stream const* stream, long refcon, int time, int keyIndex);
// Copies a block of the given KFS_Item kind.
using KFS_CopyItemFunc = int (*)(KFS_Stream const* stream, long refcon, short kind, void const* source,
                                 void* destination);
// Frees what a block owns, not the block.
using KFS_DisposeItemFunc = int (*)(KFS_Stream const* stream, long refcon, short kind, void* block);

// What one value of a stream is.
struct KFS_ValueDesc {
    short isCustom = 0;           // non-zero: a client's type
    unsigned short itemSize = 0;  // custom: bytes of a value; plain: bytes of one element, derived from dataType
    long dataType =
        255;  // plain: the low byte is a KFS_Type; custom: the word handed to the item functions, must fit 32 bits
    KFS_InterpFunc interpFunc = nullptr;  // custom only
};

// One record of a stream's key list, and the layout of its cache record. The list is sorted by `time`. The fields from
// spFlags on exist only if KFS_KeyFlag_SpatialBlock is set; the value data follows at byte 64 then, else at byte 8. The
// record's own flag decides where, not the stream.
//
// Value data: custom streams hold the client's bytes. Plain streams hold doubles, whatever their data type, in runs of
// `dimension`: value, inSpeed, inInfluence, outSpeed, outInfluence; spatial ones value, in tangent, out tangent, each
// tangent an offset from the value.
struct KFS_KeyScalar {
    int time;               // in the stream's time scale; KFS_INVALID_INDEX in the cache record: the cache is empty
    signed char inInterp;   // of the segment that ends here
    signed char outInterp;  // of the segment that begins here
    unsigned short flags;
    unsigned int spFlags;
    // Arc-length table of the segment that begins here, or null. Owned by the key, never shared by a copy.
    SEQ_Head** remapTable;
    double arcLength;    // of the arc that begins here
    double inSpeed;      // distance along the path a second
    double inInfluence;  // fraction of the segment
    double outSpeed;
    double outInfluence;
};

inline constexpr int KFS_KeyHeadSize = 8;
inline constexpr int KFS_KeySpatialHeadSize = 64;
static_assert(offsetof(KFS_KeyScalar, spFlags) == KFS_KeyHeadSize);
static_assert(sizeof(KFS_KeyScalar) == KFS_KeySpatialHeadSize);
