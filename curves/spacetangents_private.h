#pragma once

#include "keystore/stream.h"

// Set and clear `bits` of a key's spatial flags; of the cache record's on a stream without keys. Nothing is marked
// stale. A record without a spatial block has no such flags and stays as it is.
// Operations 74 and 75. Result: 0; 2; 7427 KFS_Err_NoKeys (operation 72); the list service's for an index outside the
// list.
[[nodiscard]] int KFSp_SetKeySpaceFlags(KFS_Stream* stream, unsigned int bits, int index);
[[nodiscard]] int KFSp_UnsetKeySpaceFlags(KFS_Stream* stream, unsigned int bits, int index);
