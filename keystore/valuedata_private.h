#pragma once

#include "keystore/stream.h"

#include <cmath>
#include <cstddef>
#include <span>

// The one place that computes where a record's value data lies and what its runs are.

// Where a linear side has its handle, as a fraction of the segment, and the influence that a new key gets. Files and
// renders depend on this literal: it isn't one sixth as a double.
inline constexpr double KFSp_OneSixth = 0.16666666667;

inline bool KFSp_HasSpatialBlock(KFS_KeyScalar const* key)
{
    return (key->flags & KFS_KeyFlag_SpatialBlock) != 0;
}

inline int KFSp_ValueDataOffset(KFS_KeyScalar const* key)
{
    return KFSp_HasSpatialBlock(key) ? KFS_KeySpatialHeadSize : KFS_KeyHeadSize;
}

// The record's value data as bytes: what the item functions are handed.
inline void* KFSp_ValueData(KFS_KeyScalar* key)
{
    return reinterpret_cast<char*>(key) + KFSp_ValueDataOffset(key);
}

inline void const* KFSp_ValueData(KFS_KeyScalar const* key)
{
    return reinterpret_cast<char const*>(key) + KFSp_ValueDataOffset(key);
}

// The numbers of a plain stream's record.
inline double* KFSp_Numbers(KFS_KeyScalar* key)
{
    return static_cast<double*>(KFSp_ValueData(key));
}

inline double const* KFSp_Numbers(KFS_KeyScalar const* key)
{
    return static_cast<double const*>(KFSp_ValueData(key));
}

// The runs of a plain record that isn't spatial, `dimension` doubles each. `Number` is double or double const.
template <class Number>
struct KFSp_TemporalRuns {
    Number* value;
    Number* inSpeed;
    Number* inInfluence;
    Number* outSpeed;
    Number* outInfluence;

    KFSp_TemporalRuns(Number* numbers, int dimension)
        : value(numbers),
          inSpeed(numbers + dimension),
          inInfluence(numbers + 2 * dimension),
          outSpeed(numbers + 3 * dimension),
          outInfluence(numbers + 4 * dimension)
    {}
};

inline KFSp_TemporalRuns<double> KFSp_GetTemporalRuns(KFS_KeyScalar* key, int dimension)
{
    return {KFSp_Numbers(key), dimension};
}

inline KFSp_TemporalRuns<double const> KFSp_GetTemporalRuns(KFS_KeyScalar const* key, int dimension)
{
    return {KFSp_Numbers(key), dimension};
}

// The runs of a spatial record. A tangent is an offset from the value.
template <class Number>
struct KFSp_SpatialRuns {
    Number* value;
    Number* inTangent;
    Number* outTangent;

    KFSp_SpatialRuns(Number* numbers, int dimension)
        : value(numbers),
          inTangent(numbers + dimension),
          outTangent(numbers + 2 * dimension)
    {}
};

inline KFSp_SpatialRuns<double> KFSp_GetSpatialRuns(KFS_KeyScalar* key, int dimension)
{
    return {KFSp_Numbers(key), dimension};
}

inline KFSp_SpatialRuns<double const> KFSp_GetSpatialRuns(KFS_KeyScalar const* key, int dimension)
{
    return {KFSp_Numbers(key), dimension};
}

// Later minus earlier, as a signed 32-bit difference taken with wrap-around: how this library orders and measures key
// times.
inline int KFSp_TimeDifference(int later, int earlier)
{
    return static_cast<int>(static_cast<unsigned int>(later) - static_cast<unsigned int>(earlier));
}

// From one key time to another in seconds.
inline double KFSp_Seconds(int later, int earlier, unsigned int timeScale)
{
    return static_cast<double>(KFSp_TimeDifference(later, earlier)) / static_cast<double>(timeScale);
}

inline double KFSp_SquaredLength(std::span<double const> vector)
{
    double sum = 0.0;
    for (double const component : vector) sum += component * component;
    return sum;
}

inline bool KFSp_IsZero(std::span<double const> vector)
{
    for (double const component : vector)
        if (component != 0.0) return false;
    return true;
}

inline bool KFSp_CacheIsEmpty(KFS_KeyScalar const* cache)
{
    return cache->time == KFS_INVALID_INDEX;
}
