#include "frame/boundary_private.h"
#include "frame/services/byteorder.h"
#include "frame/services/chunkfile.h"
#include "persist/longs_private.h"

int KFSp_ReadLong(CKF_File* file, CKF_ChunkInfo const* parent, int id)
{
    unsigned int stored = 0;
    KFSp_ThrowIf(CKF_ReadAtom(file, id, parent, sizeof stored, &stored));
    return static_cast<int>(Q_LongSwap(stored));
}

void KFSp_WriteLong(CKF_File* file, int id, int value)
{
    unsigned int const stored = Q_LongSwap(static_cast<unsigned int>(value));
    KFSp_ThrowIf(CKF_WriteAtom(file, id, sizeof stored, &stored));
}
