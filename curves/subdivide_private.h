#pragma once

#include "keystore/curvehooks_private.h"

// The temporal half of KFSp_SubdivideSpline: splits the curves of `dimension` components between two keys.
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
[[nodiscard]] int KFSp_ComputeTempSubdivision(short dimension, double x, double dt, unsigned char nonDecreasing,
                                              bool prevLinear, bool nextLinear, double* prev, double* next,
                                              double* out);
