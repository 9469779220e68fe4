#pragma once

#include "keystore/stream.h"

// The time of a float key follows from the speed graph between the anchors around it: the moment at which the point has
// come as far as the key. All here write key times in place and keep the order of the list; they belong to the update
// pass, which is their only writer.

// Gives all float keys from `first` to `last`, both included, their times, except the first and the last key of the
// list; other keys stay as they are. The arcs must be up to date. The speed graph is built once for a run of float keys,
// so this costs no more than the run's length.
//
// Ends at the first error: KFS_Err_Only2D3D (operation 45) on a stream parametrised by arc length of another dimension;
// the list's, the kernel's and the last lookup's codes come through.
[[nodiscard]] int KFSp_ComputeFloatTimes(KFS_Stream const* stream, int first, int last);
