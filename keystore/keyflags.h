#pragma once

#include "frame/export.h"
#include "keystore/stream.h"

// Changes bits of a key's flag word (KFS_KeyFlag) to those of `value` where `mask` has them; on a stream without a list
// those of its value's record, and `index` isn't looked at.
//
// KFS_KeyFlag_SpatialBlock says how the record is laid out and is never changed. A change of KFS_KeyFlag_Float on a
// spatial stream: a key that stops floating gets handles that keep the speed graph as it is; the first and the last key
// can't start. KFS_KeyFlag_Continuous in `mask` and set, on any key but the first: the outgoing velocity becomes the
// incoming one.
//
// Operation 73 (no value: 72). Result: 0; 2; KFS_Err_NoKeys; the list service's for a bad index; what computing the
// handles answers, and then the key is as it was. Ends as every edit (keystore/edit.h).
[[nodiscard]] KFS_API int KFS_SetKeyFlags(KFS_Stream* stream, int index, unsigned short mask, unsigned short value);
// KFS_SetKeyFlags for KFS_KeyFlag_Continuous.
[[nodiscard]] KFS_API int KFS_SetKeyContinuous(KFS_Stream* stream, unsigned char on, int index);
// KFS_SetKeyFlags for KFS_KeyFlag_Modifiable. Turned off, it leaves the handles as they are stored, which KFS_GetKeyTangentsF
// would have brought up to date: what has been given stands.
[[nodiscard]] KFS_API int KFS_SetKeyModifiable(KFS_Stream* stream, unsigned char on, int index);
