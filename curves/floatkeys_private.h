#pragma once

#include "keystore/stream.h"

// The time of a float key follows from the speed graph between the anchors around it: the moment at which the point has
// come as far as the key. All here write key times in place and keep the order of the list; they belong to the update
// pass, which is their only writer.

// Gives the key at `index` its time; a key that isn't float stays as it is. The arcs must be up to date.
// KFS_Err_Only2D3D (operation 45) on a stream parametrised by arc length of another dimension; the list's, the kernel's
// and the last lookup's codes come through.
int KFSp_ComputeFloatTime(KFS_Stream const* stream, int index);

// The same for all float keys from `first` to `last`, both included, except the first and the last key of the list. The
// speed graph is built once for a run of float keys, so this costs no more than the run's length. Ends at the first
// error.
int KFSp_ComputeFloatTimes(KFS_Stream const* stream, int first, int last);
