#pragma once

#include "keystore/stream.h"

// Whether any key of the data waits for KFS_Stream::UpdateStream.
inline bool KFSp_IsStale(KFS_StreamKeyData const* data)
{
    return data->invalidKeyIndex[0] != KFS_INVALID_INDEX || data->invalidKeyIndex[1] != KFS_INVALID_INDEX ||
           data->arcInvalidKeyIndex[0] != KFS_INVALID_INDEX || data->arcInvalidKeyIndex[1] != KFS_INVALID_INDEX;
}
