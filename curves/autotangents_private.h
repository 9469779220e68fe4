#pragma once

#include "keystore/keytypes.h"

// What `mode` of KFSp_SetDefaultKeyframeTangents asks for.
inline constexpr char KFSp_Tangents_Temporal = 1;
inline constexpr char KFSp_Tangents_Spatial = 2;

// Derives the temporal handles, the spatial tangents or both of one key from the keys around it.
//
//   time   the key's, in the stream's scale.
//   key    the record to fill, an item of the list or the cache record of a key that is about to enter the list. Its
//          codes must be set, and on a spatial stream its spFlags. Written although the stream is const: what is
//          derived may be repaired by readers.
//
// Speed is the slope from the key before to the key after; next to one linear side it is the slope of that side, so
// that the curve leaves the straight part smoothly. Both sides get the same speed and the influence KFSp_OneSixth.
//
// Pins the list. Operation 86. Errors: 2; KFS_Err_NoKeys on a constant or an empty list; both reported; the list
// service's.
int KFSp_SetDefaultKeyframeTangents(KFS_Stream const* stream, int time, char mode, KFS_KeyScalar* key);

// Spatial tangents of a key at `cur` between `prev` and `next`, each `dimension` doubles or null: a sixth of the chord
// between the outermost two, in opposite directions. A key that coincides with a neighbour has no handle towards it.
// Answers 0.
int KFSp_ComputeDefaultSpTangents(short dimension, double const* prev, double const* cur, double const* next,
                                  double* inTangent, double* outTangent);
