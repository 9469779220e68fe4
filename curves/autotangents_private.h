#pragma once

#include "keystore/curvehooks_private.h"

// Spatial tangents of a key at `cur` between `prev` and `next`, each `dimension` doubles or null: a sixth of the chord
// between the outermost two, in opposite directions. A key that coincides with a neighbour has no handle towards it.
// Answers 0.
[[nodiscard]] int KFSp_ComputeDefaultSpTangents(short dimension, double const* prev, double const* cur,
                                                double const* next, double* inTangent, double* outTangent);
