#pragma once

#include "frame/export.h"

struct CKF_ChunkInfo;
struct CKF_File;

// How files of an earlier generation named a stream. The library has no use for it; hosts that read and write such
// files do.
struct KFS_OldStreamID {
    unsigned int words[2];
};

// An atom "kfsi" of eight bytes, the next one inside `parent`. What a shorter atom lacks is zero, and on failure `id`
// is untouched. They answer the chunk service's code.
[[nodiscard]] KFS_API int KFS_WriteOldStreamID(KFS_OldStreamID const* id, CKF_File* file);
[[nodiscard]] KFS_API int KFS_ReadOldStreamID(CKF_File* file, CKF_ChunkInfo* parent, KFS_OldStreamID* id);
