#include "persist/oldstreamid.h"

#include "frame/services/byteorder.h"
#include "frame/services/chunkfile.h"

namespace {

constexpr int OldStreamIdAtom = CKF_Id("kfsi");

// Readers have always asked for three times as much as was written. The rest is dropped.
constexpr int WordsAskedFor = 6;

}  // namespace

int KFS_WriteOldStreamID(KFS_OldStreamID const* id, CKF_File* file)
{
    unsigned int const words[2] = {Q_LongSwap(id->words[0]), Q_LongSwap(id->words[1])};
    return CKF_WriteAtom(file, OldStreamIdAtom, sizeof words, words);
}

int KFS_ReadOldStreamID(CKF_File* file, CKF_ChunkInfo* parent, KFS_OldStreamID* id)
{
    unsigned int words[WordsAskedFor] = {};
    if (int const code = CKF_ReadAtom(file, OldStreamIdAtom, parent, sizeof words, words)) return code;
    id->words[0] = Q_LongSwap(words[0]);
    id->words[1] = Q_LongSwap(words[1]);
    return 0;
}
