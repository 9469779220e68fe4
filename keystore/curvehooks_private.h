#pragma once

#include "keystore/stream.h"

// What the key store needs of the curves between keys. This is declared here and implemented in curves/, which is above
// this folder: no file here includes a header of curves/. The update pass is implemented there as well, as operations of
// the class (KFS_Stream::UpdateStream and its like).

// The stream's value at a time strictly between two keys, each component by its own curve, into the numbers of the
// cache record. This is the interpolation function of plain streams that aren't spatial. A segment with a hold
// writes nothing; one with codes that have no shape takes the earlier key's value.
//
//   refcon    not looked at.
//   time      in the stream's scale; a key stands on both sides of it, which isn't checked.
//   keyIndex  a hint, the index of the key before the time. A wrong one costs a search and changes nothing.
//
// Errors: of the neighbour search; the kernel's, with the components before the failing one written.
// Cost: two item look-ups with a right hint, and one solve a component; nothing is allocated.
[[nodiscard]] int KFSp_Interpolate(KFS_Stream const* stream, long refcon, int time, int keyIndex);

// The same between two keys at hand, into `result`: what a read calls that has found the keys already. On a segment
// that holds, or whose codes have no shape, `a`'s value: a read never answers what the record held before.
[[nodiscard]] int KFSp_InterpolateBetween(KFS_Stream const* stream, KFS_KeyScalar const* a, KFS_KeyScalar const* b,
                                          int time, double* result);

// Segments to be solved side by side: of each one component between two spline sides, on a stream whose curves may fall.
struct KFSp_SplineLanes {
    static constexpr int Count = 32;

    // Of the segment: units from key to key and from the first key to the time, and the units of a second.
    double span[Count], part[Count], scale[Count];
    // Of the first key, and of the last.
    double value0[Count], outSpeed[Count], outInfluence[Count];
    double value3[Count], inSpeed[Count], inInfluence[Count];
    // What KFSp_InterpolateBetween answers, to the last bit; where `solved` is 0.0 it has to be asked.
    double result[Count], solved[Count];
};
// Solves the first `count` lanes, and may write the results of others.
void KFSp_SolveSplineLanes(KFSp_SplineLanes* lanes, int count);

// The interpolation function of spatial streams: the position on the path, see curves/spatial_private.h.
// KFS_Err_Only2D3D (operation 45) where arc-length parametrisation or automatic tangents meet another dimension;
// KFS_Err_InterpNotAllowed, unreported, for codes other than linear, spline and hold.
// A spatial stream that isn't parametrised by arc length has no arc tables, and runs a forced update each time.
[[nodiscard]] int KFSp_InterpolateSpatial(KFS_Stream const* stream, long refCon, int time, int keyIndex);

// What `mode` of the two below asks for.
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
[[nodiscard]] int KFSp_SetDefaultKeyframeTangents(KFS_Stream const* stream, int time, char mode, KFS_KeyScalar* key);

// The handles of the same for a key of a plain stream that isn't spatial, that is about to enter the list between two
// keys at hand.
void KFSp_SetHandlesBetween(KFS_Stream const* stream, KFS_KeyScalar* prev, KFS_KeyScalar* next, KFS_KeyScalar* key);

// Puts a key on a curve without changing the curve: splits the segment at `time` and gives `key` the split point and
// the inner handles, and the two neighbours the outer ones.
//
//   time  in the stream's scale
//   mode  bit 1: temporal handles; bit 2: spatial tangents
//   key   the cache record, as a key about to be inserted with its codes and flags set; or a key of the list that
//         stands at `time` and is about to become an anchor: its own time then counts, and its value stays when `mode`
//         lacks bit 2
//
// A new key always gets the value that the stream has at the time, also where no handle is computed; such handles are
// then at rest: speed 0, the default influence, tangents of zero.
//
// The neighbours of the temporal half are anchors; those of the path are the keys right beside, float or not, since the
// path runs through all of them. Where so many float keys crowd, or a hold passes over them, that the stream isn't
// between the keys beside at that time, the path isn't split, and bends to the new key. A path segment of which one side
// is linear in time changes its motion by the split: a spatial key's linear side stays linear, but it is one of a shorter
// segment then. Changed keys are no longer automatic. Brings the stream up to date first, which may move
// float keys: whoever has searched the list before does so again.
//
// Operation 87. Result: 0; 2; 7427 KFS_Err_NoKeys; the codes of the update, the list, the interpolation and the curve
// kernel. When the kernel can't split the path the neighbours' tangents stay as absolute positions.
[[nodiscard]] int KFSp_SubdivideSpline(KFS_Stream* stream, int time, char mode, KFS_KeyScalar* key);

// KFS_SetKeyVelocityF and KFS_SetKeyInfluence without the notification.
[[nodiscard]] int KFSp_SetKeySpeeds(KFS_Stream* stream, int index, double const* in, double const* out);
[[nodiscard]] int KFSp_SetKeyInfluences(KFS_Stream* stream, int index, double const* in, double const* out);

// The speed of a key's in side becomes that of its out side. The stream's results of reading and setting velocities come
// through.
[[nodiscard]] int KFSp_EqualizeSides(KFS_Stream* stream, int index);
