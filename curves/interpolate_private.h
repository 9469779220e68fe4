#pragma once

#include "keystore/keytypes.h"

// The stream's value at a time strictly between two keys, each component by its own curve, into the numbers of the
// cache record. This is the interpolation function of plain streams that aren't spatial. A segment with a hold, or with
// codes that have no shape, writes nothing.
//
//   refcon    not looked at.
//   time      in the stream's scale; a key stands on both sides of it, which isn't checked.
//   keyIndex  a hint, the index of the key before the time. A wrong one costs a search and changes nothing.
//
// Errors: of the neighbour search; the kernel's, with the components before the failing one written.
// Cost: two item look-ups with a right hint, and one solve a component; nothing is allocated.
int KFSp_Interpolate(KFS_Stream const* stream, long refcon, int time, int keyIndex);

// The rate of change there, in value units a second. A segment that is linear on both sides writes nothing as well.
int KFSp_InterpDeriv(KFS_Stream const* stream, long refcon, int time, int keyIndex);

// KFSp_Interpolate between two keys at hand, into `result`: what a read calls that has found the keys already.
int KFSp_InterpolateBetween(KFS_Stream const* stream, KFS_KeyScalar const* a, KFS_KeyScalar const* b, int time,
                            double* result);
