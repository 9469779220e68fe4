#include "persist/streamdisk_private.h"

#include "frame/services/byteorder.h"

#include <bit>
#include <cstring>

void KFSp_DiskDouble::Set(double number)
{
    std::memcpy(words, &number, sizeof words);
}

double KFSp_DiskDouble::Get() const
{
    double number;
    std::memcpy(&number, words, sizeof number);
    return number;
}

void KFSp_DiskDouble::Swap()
{
    double bits;
    std::memcpy(&bits, words, sizeof bits);
    Q_FpLongSwap(&bits);
    std::memcpy(words, &bits, sizeof words);
}

void KFSp_StreamSwap(KFSp_StreamDiskData* record)
{
    record->stamp = Q_ShortSwap(record->stamp);
    record->dimension = std::bit_cast<short>(Q_ShortSwap(std::bit_cast<unsigned short>(record->dimension)));
    record->kfsFlags = Q_ShortSwap(record->kfsFlags);
    record->spInterp = Q_ShortSwap(record->spInterp);
    record->spInterpMask = Q_ShortSwap(record->spInterpMask);
    record->interpMask = Q_ShortSwap(record->interpMask);
    record->timeScale = Q_LongSwap(record->timeScale);
    record->accuracy.Swap();
    for (KFSp_DiskDouble& factor : record->multiplier) factor.Swap();
    record->isCustom = Q_ShortSwap(record->isCustom);
    record->itemSize = Q_ShortSwap(record->itemSize);
    record->cacheTime = std::bit_cast<int>(Q_LongSwap(std::bit_cast<unsigned int>(record->cacheTime)));
    record->cacheFlags = Q_ShortSwap(record->cacheFlags);
    record->cacheSpFlags = Q_LongSwap(record->cacheSpFlags);
    for (KFSp_DiskDouble& tangent : record->cacheTangents) tangent.Swap();
    record->exprFlags = Q_LongSwap(record->exprFlags);
}
