#pragma once

#include <cstddef>

// A double of a record in which nothing stands at a multiple of 8. Its bits are never read as a number before they are
// in the machine's order.
struct KFSp_DiskDouble {
    unsigned int words[2];

    void Set(double number);
    double Get() const;
    void Swap();
};

// The record of a leaf in a file, the atom "kfb4". What isn't filled in is zero.
struct KFSp_StreamDiskData {
    unsigned short stamp;
    short dimension;
    unsigned short kfsFlags;
    unsigned short spInterp;
    unsigned short spInterpMask;
    unsigned short interpMask;
    unsigned int timeScale;
    KFSp_DiskDouble accuracy;
    KFSp_DiskDouble multiplier[4];
    unsigned short isCustom;
    unsigned short itemSize;
    unsigned char dataType;  // 255 on a custom stream
    unsigned char reserved[7];
    unsigned char hasKeyList;  // the stream owns a list, maybe an empty one
    unsigned char reserved2[3];
    // Of the cache record; of a stream with keys all zero. The tangents are a spatial stream's.
    int cacheTime;
    signed char cacheInInterp;
    signed char cacheOutInterp;
    unsigned short cacheFlags;
    unsigned int cacheSpFlags;
    KFSp_DiskDouble cacheTangents[4];  // inSpeed, inInfluence, outSpeed, outInfluence
    unsigned int exprFlags;
    unsigned char hasExpression;
    unsigned char reserved3[3];
};

inline constexpr int KFSp_StreamDiskSize = 124;
static_assert(sizeof(KFSp_StreamDiskData) == KFSp_StreamDiskSize);
static_assert(offsetof(KFSp_StreamDiskData, timeScale) == 12);
static_assert(offsetof(KFSp_StreamDiskData, multiplier) == 24);
static_assert(offsetof(KFSp_StreamDiskData, dataType) == 60);
static_assert(offsetof(KFSp_StreamDiskData, hasKeyList) == 68);
static_assert(offsetof(KFSp_StreamDiskData, cacheTime) == 72);
static_assert(offsetof(KFSp_StreamDiskData, cacheFlags) == 78);
static_assert(offsetof(KFSp_StreamDiskData, cacheTangents) == 84);
static_assert(offsetof(KFSp_StreamDiskData, exprFlags) == 116);
static_assert(offsetof(KFSp_StreamDiskData, hasExpression) == 120);

// From the machine's byte order to the file's and back.
void KFSp_StreamSwap(KFSp_StreamDiskData* record);
