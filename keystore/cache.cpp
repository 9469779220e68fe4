// The cache record: made, emptied, filled, and brought to a time, which is the middle of every read.

#include "keystore/cache_private.h"

#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "frame/services/memory.h"
#include "keystore/curvehooks_private.h"
#include "keystore/items.h"
#include "keystore/items_private.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"
#include "keystore/shortread_private.h"
#include "keystore/valuedata_private.h"

#include <cstring>

namespace {

constexpr int CacheMemoryId = 0x1D0003;

// The whole key into the cache record, which never takes a share in its arc table. A copy that fails has written the
// head: the record is empty then, since its value is nobody's.
int CopyKeyToCache(KFS_StreamKeyData const* data, int index)
{
    int const code = SEQ_GetItemCopy(data->keys, 0, index, data->cache);
    if (code != 0)
        data->cache->time = KFS_INVALID_INDEX;
    else if (KFSp_HasSpatialBlock(data->cache))
        data->cache->remapTable = nullptr;
    return code;
}

// The common one asks for the value and nothing else. The compiler makes a shorter way of it.
struct PlainRequest {
    static constexpr bool keyOnly = false;
    static constexpr bool wantsValue = true;
    static constexpr unsigned char* atKey = nullptr;
    static constexpr KFS_InterpFunc* interpFunc = nullptr;
    static constexpr long refcon = 0;
};

int InterpolateToCache(KFS_Stream const* stream, KFS_StreamKeyData const* data, int time, int keyIndex,
                       KFS_InterpFunc* interpFunc, long refcon)
{
    KFS_InterpFunc const func = interpFunc ? *interpFunc : stream->GetInterpFunc();
    if (!func) {  // a file can say that a stream is a client's, and has none of the client's functions
        static_cast<void>(KFSp_ReportRow(KFSp_Op_UpdateCache, 0, KFSp_Row_NoInterpFunc));  // the code comes below
        data->cache->time = KFS_INVALID_INDEX;
        return KFS_Err_InterpNotAllowed;
    }
    bool const isOurs = func == KFSp_Interpolate || func == KFSp_InterpolateSpatial;
    int const code =
        func(isOurs ? stream : stream->GetOriginal(), interpFunc ? refcon : stream->GetItemRefcon(), time, keyIndex);
    data->cache->time = code == 0 ? time : KFS_INVALID_INDEX;
    return code;
}

// What needs no function that may call the list again while it holds a key. False, and nothing done, where one does.
[[gnu::always_inline]] inline bool FillFromPair(KFS_Stream const* stream, KFS_StreamKeyData const* data, int time,
                                                int next, KFS_InterpFunc* interpFunc, int* code)
{
    if (stream->IsSpatial()) return false;
    auto const [a, b] = KFSp_GetKeyPair(data, next - 1);
    if (!KFSp_HasShortcuts && !a) return false;
    // A hold on the far side takes the later key's value, and is meant to.
    if (a->outInterp == KFS_Interp_Hold)
        *code = CopyKeyToCache(data, next - 1);
    else if (b->inInterp == KFS_Interp_Hold)
        *code = CopyKeyToCache(data, next);
    else if ((interpFunc ? *interpFunc : stream->GetInterpFunc()) == KFSp_Interpolate) [[likely]] {
        *code = KFSp_InterpolateBetween(stream, a, b, time, KFSp_Numbers(data->cache));
        data->cache->time = *code == 0 ? time : KFS_INVALID_INDEX;
    } else {
        return false;
    }
    return true;
}

// The value between, before or after keys. `next` is the index of the first key after the time. The items of our own
// lists stand still while nobody calls the list, those of others while it is pinned.
inline int FillBetweenKeys(KFS_Stream const* stream, KFS_StreamKeyData const* data, int time, int next,
                           KFS_InterpFunc* interpFunc, long refcon)
{
    if (next == 0) return CopyKeyToCache(data, 0);
    if (next >= KFSp_ItemCount(data)) return CopyKeyToCache(data, next - 1);
    int code = 0;
    if (KFSp_HasShortcuts && FillFromPair(stream, data, time, next, interpFunc, &code)) return code;
    KFSp_FirstError error;
    {
        KFSp_ScConstPin const pin(data->keys, error);
        if (error.None()) {
            bool const filled = !KFSp_HasShortcuts && FillFromPair(stream, data, time, next, interpFunc, &code);
            error.Keep(filled ? code : InterpolateToCache(stream, data, time, next - 1, interpFunc, refcon));
        }
    }
    return error.Code();
}

}  // namespace

int KFS_Stream::GetCacheSize() const
{
    int const itemSize = KFSp_KeyItemSize(this);
    return IsCustom() && valueDesc_.itemSize < 8 ? itemSize + 4 : itemSize;
}

KFS_KeyScalar* KFS_Stream::AllocateCacheImpl() const
{
    auto* const cache = static_cast<KFS_KeyScalar*>(Q_AllocatePtrClear(
        CacheMemoryId, KFSp_MessageText(KFSp_Row_StreamValueCache), static_cast<std::size_t>(GetCacheSize())));
    if (!cache) throw int{KFS_Err_OutOfMemory};
    cache->time = KFS_INVALID_INDEX;
    return cache;
}

void KFS_Stream::AllocateCache()
{
    KFS_KeyScalar* const cache = AllocateCacheImpl();
    FreeCache();
    keyData_.cache = cache;
}

void KFS_Stream::FreeCache()
{
    Q_FreePtr(keyData_.cache);
    keyData_.cache = nullptr;
}

KFS_KeyScalar* KFS_Stream::CloneCache(KFS_KeyScalar const* source) const
{
    KFS_KeyScalar* const clone = AllocateCacheImpl();
    std::memcpy(static_cast<void*>(clone), source, static_cast<std::size_t>(GetCacheSize()));
    if (KFSp_HasSpatialBlock(clone)) clone->remapTable = nullptr;
    if (!KFSp_CacheIsEmpty(source) && copyItemFunc_) {
        int const code = KFSp_Boundary([&] {
            return copyItemFunc_(KFSp_HandedTo(copyItemFunc_, this), GetItemRefcon(), KFS_Item_CacheWhole,
                                 KFSp_ValueData(source), KFSp_ValueData(clone));
        });
        if (code != 0) {
            Q_FreePtr(clone);
            throw int{code};
        }
    }
    return clone;
}

int KFSp_ClearCacheRecord(KFS_Stream const* stream, KFS_KeyScalar* cache)
{
    if (KFSp_CacheIsEmpty(cache)) return 0;
    int code = 0;
    if (KFS_DisposeItemFunc const dispose = stream->GetDisposeItemFunc())
        code = dispose(stream->GetOriginal(), stream->GetItemRefcon(), KFS_Item_CacheWhole, KFSp_ValueData(cache));
    cache->time = KFS_INVALID_INDEX;
    return code;
}

int KFSp_ClearCache(KFS_Stream const* stream)
{
    return KFSp_ClearCacheRecord(stream, stream->GetCache());
}

int KFSp_SetupCache(KFS_Stream const* stream, int time, void const* value, char inInterp, char outInterp, short kind,
                    unsigned char convert)
{
    KFS_KeyScalar* const cache = stream->GetCache();
    cache->time = time;
    cache->inInterp = inInterp;
    cache->outInterp = outInterp;
    cache->flags = kind == KFS_Item_KeyValue ? 0 : KFS_KeyFlag_TangentsSet;
    if (stream->IsSpatial()) {
        cache->flags |= KFS_KeyFlag_SpatialBlock;
        cache->spFlags = 0;
        cache->remapTable = nullptr;
    }
    if (!value) return 0;
    KFS_CopyItemFunc const copy = !convert || stream->IsCustom() ? KFSp_FakeCopyItemFunc : KFSp_ConvertItemToFloat;
    return copy(stream, 0, kind, value, KFSp_ValueData(cache));
}

namespace {

template <class Request>
inline void UpdateCache(KFS_Stream const* stream, KFS_StreamKeyData const* data, int time, Request const& request)
{
    KFS_KeyScalar* const cache = data->cache;
    if (stream->HasNoKeys()) {
        KFSp_MoveConstant(data, time);
        if (request.atKey) *request.atKey = 1;
        return;
    }
    bool const stands = !request.wantsValue || (cache->time == time && !KFSp_CacheIsEmpty(cache));
    if (stands && !request.atKey) return;
    bool found = false;
    int index = 0;
    KFSp_ThrowIf(KFSp_SearchKeys(data, time, &found, &index));
    if (!stands) {
        KFSp_ThrowIf(KFSp_ClearCacheRecord(stream, cache));
        bool mayBeStale = KFSp_IsStale(data);
        if (mayBeStale && found) {
            KFS_KeyScalar const* key = nullptr;
            KFSp_ThrowIf(KFSp_GetConstKey(data, index, &key));
            mayBeStale = stream->IsSpatial() && KFSp_Floats(key);
        }
        if (mayBeStale) {
            KFSp_ThrowIf(stream->UpdateStream());
            KFSp_ThrowIf(KFSp_SearchKeys(data, time, &found, &index));  // float keys may have moved
        }
        if (found)
            KFSp_ThrowIf(CopyKeyToCache(data, index));
        else if (!request.keyOnly && KFSp_ItemCount(data) > 0)
            KFSp_ThrowIf(FillBetweenKeys(stream, data, time, index, request.interpFunc, request.refcon));
    }
    if (request.atKey) *request.atKey = found ? 1 : 0;
}

}  // namespace

void KFSp_UpdateCacheToTime(KFS_Stream const* stream, KFS_StreamKeyData const* data, int time,
                            KFSp_CacheRequest const& request)
{
    UpdateCache(stream, data, time, request);
}

void KFSp_UpdateCacheToTime(KFS_Stream const* stream, KFS_StreamKeyData const* data, int time)
{
    if (KFSp_IsPlain(stream) && stream->HasKeys() && KFSp_HasShortKeys(data)) [[likely]]
        KFSp_ThrowIf(KFSp_BringShort(stream, data, time));
    else
        UpdateCache(stream, data, time, PlainRequest{});
}
