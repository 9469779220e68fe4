#pragma once

#include "frame/export.h"
#include "keystore/stream.h"

// A float key's place on the path is fixed and its time isn't: it roves, so that the point passes it at the moment that
// the speed graph between the anchors around it dictates. Only keys of spatial streams between the first and the last
// one can float; where a float key comes to stand at an end, it is an anchor whatever its flag says.
//
// Without arc-length parametrisation float keys are neighbours of one another, each timed between the two keys beside
// it. Where several stand in a row every repair moves them a step further, and a read between keys runs one: their times
// depend on how often that has happened.

// KFS_SetKeyFlags for KFS_KeyFlag_Float, and its results. On the first or the last key turning it on changes nothing.
[[nodiscard]] KFS_API int KFS_SetKeyFloat(KFS_Stream* stream, unsigned char on, int index);

// Moves a key in time. A key that stands at the new time is replaced, but for a float key, which makes way where it can.
// Times stay sorted, and no two keys share one.
//
//   index         the key; on a stream without keys not looked at, and the value's record takes the time
//   newTime       in, any scale; null: `newTimeValue` in the stream's scale is meant
//   newIndex      out or null: the key's index after the move; KFS_INVALID_INDEX on an error. Without meaning on a
//                 stream without keys.
//   oldTime       out or null: where the key stood, in the stream's scale; value KFS_INVALID_INDEX when an error came
//                 before that was known
//
// The first and the last key get the default influence on the side that has no segment, and lose
// KFS_KeyFlag_Modifiable. Float keys between the anchors around the key, or around the new time if that lies past the
// only neighbour, get place-holding times, one tick apart, and their true times with the next update; also when the key
// stays where it is. Past the neighbour and onto another anchor, float keys keep to their own side of that anchor.
//
//      anchor  f  f    key        f  anchor      before
//      anchor f f      key         f anchor      float keys packed: the key may go to any tick in between
//
// Operation 33. Result: 0, or
//   2                    the stream is damaged
//   7427 KFS_Err_NoKeys  no key, or a constant without a value
//   7430 KFS_Err_TimeNotRepresentable  KFS_INVALID_INDEX as the new time, which says that there is no key
//   the time service's, the list service's, a listener's. A failure while the key is moved leaves it removed.
// Threads: main thread. Cost: a search, a removal and an insertion, and the float keys around.
[[nodiscard]] KFS_API int KFS_SetKeyTime(KFS_Stream* stream, int index, T_Time const* newTime, int newTimeValue,
                                         int* newIndex, T_Time* oldTime);
