#pragma once

#include "keystore/curvehooks_private.h"

// A spatial stream is a point on a path. The speed graph, one temporal curve between two anchors, gives the distance at
// a time; the path's arc tables give the place at a distance. An anchor is a key whose time is given: on a stream
// parametrised by arc length float keys are none, and the speed graph runs through them.
//
// KFSp_InterpolateSpatial (keystore/curvehooks_private.h) and two functions here are interpolation functions: they write
// the cache record's value data of the calling thread's key data. `refCon` isn't used; `keyIndex` is a hint, the key
// before the time, and any other number costs a search. Derived data must be up to date. The list service's and the curve
// kernel's codes come through.
//
// Behind the result stands the path parameter of the point, which the callers that work on the path read: at number
// `dimension` of the value data when the point is one of the path's curve, at number 2 * dimension when it was taken
// from the straight line between the anchors.

// Where the point of KFSp_InterpolateSpatial lies with automatic tangents: the keys around it on the path, float keys
// included, and the parameter between them. The results are the same, and nothing is written.
struct KFSp_PathPoint {
    KFS_KeyScalar const* first = nullptr;
    KFS_KeyScalar const* second = nullptr;
    double t = 0.0;
};
[[nodiscard]] int KFSp_FindOnPath(KFS_Stream const* stream, int time, KFSp_PathPoint* point);

// The speed along the path, distance a second, as number 0. Writes nothing on a segment that is linear on both sides or
// held. This and the next are for a stream's derivatives (curves/derivatives.h).
[[nodiscard]] int KFSp_InterpDerivSpatial(KFS_Stream const* stream, long refCon, int time, int keyIndex);

// The path's direction: a third of the derivative by the path's parameter, so that it is the size of a key's tangent.
// Streams that aren't parametrised by arc length answer the position on the straight line instead, unless they have
// automatic tangents and dimension 2.
[[nodiscard]] int KFSp_InterpTangentSpatial(KFS_Stream const* stream, long refCon, int time, int keyIndex);
