#pragma once

#include "keystore/stream.h"

// Puts a key on a curve without changing the curve: splits the segment at `time` and gives `key` the split point and
// the inner handles, and the two neighbours the outer ones.
//
//   time  in the stream's scale
//   mode  bit 1: temporal handles; bit 2: spatial tangents
//   key   the cache record, as a key about to be inserted with its codes and flags set; or a key of the list that
//         stands at `time` and is about to become an anchor: its own time then counts, and its value stays when `mode`
//         lacks bit 2
//
// The cache record always gets the value that the stream has at the time, also where no handle is computed; such
// handles are then at rest: speed 0, the default influence, tangents of zero.
//
// Neighbours are anchors. Changed keys are no longer automatic. Brings the stream up to date first, which may move
// float keys: whoever has searched the list before does so again.
//
// Operation 87. Result: 0; 2; 7427 KFS_Err_NoKeys; the codes of the update, the list, the interpolation and the curve
// kernel. When the kernel can't split the path the neighbours' tangents stay as absolute positions.
int KFSp_SubdivideSpline(KFS_Stream* stream, int time, char mode, KFS_KeyScalar* key);

// The temporal half: splits the curves of `dimension` components between two keys.
//
//   x            seconds from the earlier key
//   dt           duration of the segment in seconds
//   prevLinear   the earlier key's side is linear: its handle lies on the chord, whatever its numbers say
//   prev, next   the two keys' numbers in five runs (value, inSpeed, inInfluence, outSpeed, outInfluence); either may
//                be null. Their facing handles are shortened to fit the new segments.
//   out          the new key's numbers, five runs
//
// From arcLength on, the numbers of a spatial block have that form too, with dimension 1: the speed graph is split by
// the same function.
int KFSp_ComputeTempSubdivision(short dimension, double x, double dt, unsigned char nonDecreasing, bool prevLinear,
                                bool nextLinear, double* prev, double* next, double* out);
