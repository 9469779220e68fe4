#pragma once

#include "frame/report_private.h"
#include "keystore/keylist_private.h"

// The length of the path from key `first` to key `last` of the list, summed in the order of the keys. When a key can't
// be read its code is the result, and `length` the sum so far.
[[nodiscard]] inline int KFSp_SumArcs(KFS_StreamKeyData const* data, int first, int last, double* length)
{
    *length = 0.0;
    for (int i = first; i < last; ++i) {
        KFS_KeyScalar const* key = nullptr;
        if (int const code = KFSp_GetConstKey(data, i, &key); code != 0) return code;
        *length += key->arcLength;
    }
    return 0;
}

// Whether a path can be curved in the stream's dimension.
inline bool KFSp_HasPathDimension(KFS_Stream const* stream)
{
    return stream->GetDimension() == 2 || stream->GetDimension() == 3;
}

[[nodiscard]] inline int KFSp_RefusePathDimension()
{
    return KFSp_ReportErr(KFSp_Op_InterpolateSpatial, KFS_Err_Only2D3D, 0);
}

// Arc lengths exist in two and three dimensions only. Operation 45.
[[nodiscard]] inline int KFSp_CheckPathDimension(KFS_Stream const* stream)
{
    if (KFSp_HasPathDimension(stream) || !stream->IsSpatial() || !stream->IsSParametrized()) return 0;
    return KFSp_RefusePathDimension();
}
